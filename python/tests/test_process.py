"""What can be seen from outside of a process only: how it ends, Ctrl-C, and which library it loads."""
import os
import pathlib
import shutil
import signal
import subprocess
import sys
import threading
import time

import pytest

import kral

OPEN = """
import ctypes, sys, time, kral
phone = kral.connect(int(sys.argv[1]))
phone.text_log(line=lambda text: None)
events = phone.events()
next(events)
"""
# A program of its own that uses the C interface, with callbacks on the library's threads, and disconnects nothing. The
# callbacks' code stays, as the interface wants it: the interpreter would free it at its end.
BARE = """
import ctypes, sys, time
from kral import _api
from kral._library import load
api = load()
handle = api.KRAL_ConnectServer(int(sys.argv[1]))
seen = []
packet = _api.KRAL_RAW_PACKET_CALLBACK(lambda length, data, value: seen.append(length))
event = _api.KRAL_EVENT_CALLBACK(lambda event, value: seen.append(1))
for callback in (packet, event): ctypes.pythonapi.Py_IncRef(ctypes.py_object(callback))
api.KRAL_ConfigureCollectionCallBacks(handle, packet, event, 0)
api.KRAL_DIAG_SetEntireEventMaskState(handle, 1)
while len(seen) < 20: time.sleep(0.01)
"""


def run(handset, source, *words, **more):
    return subprocess.run([sys.executable, "-c", source, str(handset.port), *words], capture_output=True, text=True,
                          timeout=60, **more)


@pytest.mark.handset("--events", "500")
@pytest.mark.parametrize("source, code, told", [
    (OPEN, 0, ""), (OPEN + "sys.exit(3)", 3, ""), (OPEN + "raise RuntimeError('x')", 1, "RuntimeError: x"),
    (OPEN + "phone = None\nsys.exit(0)", 0, ""), (BARE, 0, "")],
    ids=["end", "exit", "exception", "forgotten", "bare"])
def test_a_program_that_leaves_connections_open_ends_quietly(handset, source, code, told):
    for _ in range(3):
        done = run(handset, source)
        assert (done.returncode, done.stderr.strip().rpartition("\n")[2], done.stdout) == (code, told, "")


SLOW = """
import sys, kral
phone = kral.connect(int(sys.argv[1]))
print("begun", flush=True)
try:
    phone.backup(sys.argv[2])
except KeyboardInterrupt:
    print("interrupted", flush=True)
print(phone.identity.serial)
"""


@pytest.mark.handset(faults=["delay=100,of=26"])
def test_an_interrupt_ends_work_within_the_request_under_way(handset, tmp_path):
    file = tmp_path / "x.pkv"
    with subprocess.Popen([sys.executable, "-c", SLOW, str(handset.port), str(file)], stdout=subprocess.PIPE,
                          text=True) as process:
        watchdog = threading.Timer(20, process.kill)
        watchdog.start()
        assert process.stdout.readline() == "begun\n"
        time.sleep(0.5)
        start = time.monotonic()
        process.send_signal(signal.SIGINT)
        assert process.stdout.readline() == "interrupted\n"
        assert time.monotonic() - start < 2
        assert int(process.stdout.readline()) and process.wait(10) == 0
        watchdog.cancel()
    assert not file.exists()


SAY = "import kral; print(kral.library_path())"


def say(environment, folder):
    clean = {name: value for name, value in os.environ.items() if name not in ("KRAL_LIBRARY", "LD_LIBRARY_PATH")}
    return subprocess.run([sys.executable, "-c", SAY], env={**clean, **environment}, cwd=folder, capture_output=True,
                          text=True)


def test_the_library_is_the_named_one_then_the_one_beside_then_the_installed_one(tmp_path):
    library = pathlib.Path(kral.library_path())
    package = pathlib.Path(kral.__file__).parent
    copy = tmp_path / "beside" / "kral"
    shutil.copytree(package, copy, ignore=shutil.ignore_patterns("__pycache__", "libkral*"))
    shutil.copy(library, copy / "libkral.so.6")
    installed = tmp_path / "installed"
    installed.mkdir()
    shutil.copy(library, installed / "libkral.so.6")
    named = {"KRAL_LIBRARY": str(library)}
    loader = {"LD_LIBRARY_PATH": str(installed)}
    beside = {"PYTHONPATH": str(copy.parent)}
    unpacked = {}
    for package_folder, library_folder in (("python", "bin"), ("lib/python3/dist-packages", "lib")):
        archive = tmp_path / library_folder
        shutil.copytree(package, archive / package_folder / "kral", ignore=shutil.ignore_patterns("lib*"))
        (archive / library_folder).mkdir(exist_ok=True)
        unpacked[archive / package_folder] = archive / library_folder / "libkral.so.6"
        shutil.copy(library, unpacked[archive / package_folder])
    for name, environment, expected in [("named", {**named, **loader, **beside}, library),
                                        ("beside", {**loader, **beside}, copy / "libkral.so.6"),
                                        ("installed", {**loader, "PYTHONPATH": str(package.parent)},
                                         installed / "libkral.so.6"),
                                        *[("unpacked", {**loader, "PYTHONPATH": str(folder)}, beside_it)
                                          for folder, beside_it in unpacked.items()]]:
        done = say(environment, tmp_path)
        assert done.stdout.strip() == os.path.realpath(expected), (name, done.stderr)
    missing = say({"KRAL_LIBRARY": "/none/libkral.so", "PYTHONPATH": str(package.parent)}, tmp_path)
    assert "LibraryNotFound" in missing.stderr and "/none/libkral.so" in missing.stderr
