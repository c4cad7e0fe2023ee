"""Runs the fuzz targets that scripts/fuzz has built, keeps what they found, and tells how far that reaches."""
import argparse
import collections
import json
import os
import re
import shutil
import subprocess
import sys

# What each target is for: the files below these paths read what it gives them.
READERS = {
    "boot": ["download/boot/"],
    "capture": ["transport/collection/capture_blocks", "transport/collection/capture_reader",
                "transport/collection/capture_seek"],
    "commands": ["commands/defined/decode", "commands/defined/definition", "commands/defined/field_xml",
                 "platform/posix/xml_", "platform/xml_"],
    "deframer": ["transport/line/hdlc_deframer", "transport/line/fcs16"],
    "efs": ["storage/efs/"],
    "hex": ["download/images/hex_"],
    "loader": ["download/kova/", "download/link/", "download/stream/"],
    "name_table": ["transport/collection/name_table"],
    "nv_xml": ["storage/nv/nv_data_type", "storage/nv/nv_definition", "storage/nv/nv_filter", "storage/nv/nv_source",
               "storage/nv/nv_value", "platform/posix/xml_", "platform/xml_"],
    "pcapng": ["transport/trace/pcapng_reader", "transport/trace/capture_conversion"],
    "pkv": ["platform/compound_", "storage/pkv/"],
    "replies": ["commands/core/", "commands/ftm/ftm_", "commands/ftm/rf_nv", "commands/logs/event_mask",
                "commands/logs/log_mask.", "commands/nv/nv_", "storage/items/", "storage/nv/nv_mobile"],
    "sorter": ["transport/collection/event_report", "transport/collection/kral_event_listener",
               "transport/line/chunk_splitter", "transport/line/hdlc_deframer"],
    "stream_reply": ["download/stream/download_agent", "download/stream/reply_receiver"],
    "traffic": ["transport/trace/traffic_splitter", "transport/trace/trace_file", "transport/trace/pcapng_"],
}

# What a run may add to the tree, for each target: small inputs reach what large ones do, and every build replays them.
LARGEST_UNIT = 2048
MOST_ADDED = 12 * 1024

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
BUILD = os.path.join(ROOT, "build", "fuzz")
WORK = os.path.join(BUILD, "work")
LLVM_VERSION = "14"

Outcome = collections.namedtuple("Outcome", "target runs rate added reader crashes")


def program(target):
    return os.path.join(BUILD, "fuzz", f"{target}_fuzzer")


def corpus(target):
    return os.path.join(ROOT, "fuzz", "corpus", target)


def folder(kind, target):
    path = os.path.join(WORK, kind, target)
    os.makedirs(path, exist_ok=True)
    return path


def fuzzer(target, log, *arguments, profile="/dev/null"):
    """Runs it; what it prints is added to the log, and given."""
    environment = dict(os.environ, LLVM_PROFILE_FILE=profile, TMPDIR=folder("tmp", target))
    run = subprocess.run([program(target), *arguments], env=environment, stdin=subprocess.DEVNULL,
                         stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, errors="replace")
    with open(log, "a", encoding="utf-8") as out:
        out.write(run.stdout)
    return run


def search(target, seconds, log):
    """Gives the number of runs and, where there is one, the input that breaks the target."""
    crashes = folder("crashes", target)
    before = set(os.listdir(crashes))
    run = fuzzer(target, log, f"-max_total_time={seconds}", "-timeout=30", "-print_final_stats=1",
                 f"-artifact_prefix={crashes}/", folder("found", target), corpus(target))
    number = (re.findall(r"stat::number_of_executed_units: (\d+)", run.stdout) or
              re.findall(r"^#(\d+)", run.stdout, re.M))
    found = [os.path.join(crashes, name) for name in sorted(set(os.listdir(crashes)) - before)
             if not name.startswith("slow-unit")]
    if run.returncode != 0 and not found:
        found = [f"exit code {run.returncode}, see {log}"]
    return int(number[-1]) if number else 0, found


def keep(target, log):
    """Adds to the corpus what reaches more than it does: the smallest first, and not too many bytes."""
    known = {open(os.path.join(corpus(target), name), "rb").read() for name in os.listdir(corpus(target))}
    merged = os.path.join(WORK, "merged", target)
    shutil.rmtree(merged, ignore_errors=True)
    shutil.copytree(corpus(target), merged)
    # By edges: how often one is passed makes a unit interesting to the search, but not to whoever replays it.
    run = fuzzer(target, log, "-set_cover_merge=1", "-use_counters=0", "-timeout=30", merged, folder("found", target))
    if run.returncode != 0:
        return 0
    units = {open(os.path.join(merged, name), "rb").read(): name for name in os.listdir(merged)}
    added = room = 0
    for unit in sorted((unit for unit in units if unit not in known), key=len):
        room += len(unit)
        if len(unit) > LARGEST_UNIT or room > MOST_ADDED:
            break
        shutil.copyfile(os.path.join(merged, units[unit]), os.path.join(corpus(target), "found_" + units[unit][:12]))
        added += 1
    return added


def llvm(tool):
    return shutil.which(f"{tool}-{LLVM_VERSION}") or tool


def lines_reached(targets, profile):
    """The covered and all lines of each source file."""
    objects = [program(targets[0])]
    for target in targets[1:]:
        objects += ["-object", program(target)]
    told = subprocess.run([llvm("llvm-cov"), "export", "-summary-only", f"-instr-profile={profile}", *objects],
                          check=True, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True).stdout
    files = {os.path.relpath(file["filename"], ROOT): file["summary"]["lines"]
             for file in json.loads(told)["data"][0]["files"]}
    return {path: (lines["covered"], lines["count"]) for path, lines in files.items() if not path.startswith("..")}


def replay(target, log):
    """Gives the profile of the corpus."""
    raw = os.path.join(folder("profiles", target), "raw")
    merged = os.path.join(folder("profiles", target), "merged")
    fuzzer(target, log, "-runs=0", corpus(target), profile=raw).check_returncode()
    subprocess.run([llvm("llvm-profdata"), "merge", "-sparse", raw, "-o", merged], check=True)
    return merged


def share(files, paths):
    covered, count = (sum(counts) for counts in zip((0, 0), *(lines for path, lines in files.items()
                                                              if path.startswith(tuple(paths)))))
    return f"{100 * covered / count:.1f} % of {count}" if count else "its reader is not told in fuzz/run.py"


def fuzz(target, seconds):
    log = os.path.join(folder("logs", target), "log")
    open(log, "w", encoding="utf-8").close()
    runs, crashes = search(target, seconds, log)
    added = keep(target, log)
    reader = "" if crashes else share(lines_reached([target], replay(target, log)), READERS.get(target, []))
    return Outcome(target, runs, runs / seconds, added, reader, crashes)


def print_folders(targets):
    profiles = [os.path.join(folder("profiles", target), "merged") for target in targets]
    together = os.path.join(WORK, "profiles", "all")
    subprocess.run([llvm("llvm-profdata"), "merge", "-sparse", *filter(os.path.exists, profiles), "-o", together],
                   check=True)
    files = lines_reached(targets, together)
    readers = tuple(path for target in targets for path in READERS.get(target, []))
    wanted = {os.path.dirname(path) for path in files if path.startswith(readers)}
    print("\nLines of whole folders, by all of these together:")
    for name in sorted(wanted):
        print(f"  {name:24} {share({p: n for p, n in files.items() if os.path.dirname(p) == name}, [name])}")


def main():
    parser = argparse.ArgumentParser(prog="fuzz")
    parser.add_argument("--minutes", type=float, default=1, help="for each target")
    parser.add_argument("targets", nargs="*", metavar="TARGET")
    arguments = parser.parse_args()
    there = sorted(name[:-len("_fuzzer.cpp")] for name in os.listdir(os.path.join(ROOT, "fuzz"))
                   if name.endswith("_fuzzer.cpp"))
    targets = arguments.targets or there
    if unknown := [target for target in targets if target not in there]:
        parser.error(f"there is no target {unknown[0]}: {' '.join(there)}")
    seconds = max(1, round(arguments.minutes * 60))

    print(f"{'target':14} {'runs':>9} {'runs/s':>7} {'new units':>9}  lines of the reader", flush=True)
    outcomes = []
    for target in targets:
        outcomes.append(outcome := fuzz(target, seconds))
        told = "CRASHED" if outcome.crashes else outcome.reader
        print(f"{target:14} {outcome.runs:9} {outcome.rate:7.0f} {outcome.added:9}  {told}", flush=True)
    whole = [outcome.target for outcome in outcomes if not outcome.crashes]
    if whole:
        print_folders(whole)
    crashes = [(outcome.target, crash) for outcome in outcomes for crash in outcome.crashes]
    for target, crash in crashes:
        print(f"\n{target}: repeat with\n  {os.path.relpath(program(target), ROOT)} {os.path.relpath(crash, ROOT)}")
    print(f"\nfuzz: {sum(outcome.runs for outcome in outcomes)} runs of {len(outcomes)} targets, "
          f"{sum(outcome.added for outcome in outcomes)} new units, {len(crashes)} crashes")
    return 1 if crashes else 0


if __name__ == "__main__":
    sys.exit(main())
