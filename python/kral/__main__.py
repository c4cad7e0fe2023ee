"""python3 -m kral: says which library is in use, and which ports there are."""
import kral

print(f"package {kral.__version__}, library {kral.library_version()} from {kral.library_path()}")
print("ports: " + (", ".join(str(port) for port in kral.ports()) or "none"))
