"""Runs the programs of the promises, each in a process of its own, and prints the table."""
from __future__ import annotations

import argparse
import concurrent.futures
import faulthandler
import importlib
import json
import os
import pathlib
import pkgutil
import random
import subprocess
import sys
import tempfile
import time
import traceback
from typing import Any, Dict, List, Optional

import torture.promises
from torture import soak
from torture.bench import LINUX, WINDOWS, Bench, Broken, platform

# A program that has not ended by then hangs; it is killed, and what it had not run counts as failed.
_LONGEST_S = 3600.0
_LONGEST_SHORT_S = 300.0
_SHOWN_FAILURES = 20


def promises() -> Dict[int, Any]:
    names = [module.name for module in pkgutil.iter_modules(torture.promises.__path__)]
    modules = [importlib.import_module(f"torture.promises.{name}") for name in names]
    return {module.NUMBER: module for module in sorted(modules, key=lambda module: int(module.NUMBER))
            if platform() in getattr(module, "PLATFORMS", (LINUX,))}


def _repeat(number: int, seed: int, case: str = "") -> str:
    where = f" --platform {platform()}" if platform() != LINUX else ""
    return f"scripts/torture {number} --seed {seed}{where}" + (f" --case '{case}'" if case else "")


def _run_case(module: Any, bench: Bench, case: str) -> Optional[str]:
    """What was wrong; None when nothing was."""
    try:
        module.run(bench, case)
    except Broken as broken:
        return str(broken)
    except Exception:  # pylint: disable=broad-except
        return traceback.format_exc()
    return None


def _chosen(module: Any, bench: Bench, only: Optional[str]) -> List[str]:
    cases: List[str] = module.cases(bench)
    if only is not None:
        return [only]
    some = module.SHORT if platform() == LINUX else getattr(module, "SHORT_WINDOWS", module.SHORT)
    if not bench.short or len(cases) <= some:
        return cases
    return random.Random(bench.seed).sample(cases, some)


def run_here(number: int, seed: int, short: bool, only: Optional[str], folder: pathlib.Path) -> Dict[str, Any]:
    """One run of one promise in this process."""
    module = promises()[number]
    bench = Bench(number, seed, folder, short)
    chosen = _chosen(module, bench, only)
    failures: List[str] = []
    ran = 0
    with concurrent.futures.ThreadPoolExecutor(module.AT_ONCE) as pool:
        runs = {pool.submit(_run_case, module, bench, case): case for case in chosen}
        for done in concurrent.futures.as_completed(runs):
            ran += 1
            wrong = done.result()
            if wrong is not None:
                failures.append(f"{runs[done]}: {wrong}")
                print(f"FAILED: promise {number}, {runs[done]} (seed {seed}): {wrong}\n"
                      f"    again: {_repeat(number, seed, runs[done])}", file=sys.stderr, flush=True)
    bench.close()
    sanitizer = getattr(module, "SANITIZER", "")
    if sanitizer:
        with_it = f"lib{sanitizer}" in os.environ.get("LD_PRELOAD", "")
        bench.count(f"cases {'with' if with_it else 'without'} {sanitizer}", ran)
    return {"cases": len(chosen), "ran": ran, "failed": len(failures), "figures": dict(bench.figures),
            "worst": dict(bench.worst)}


def _child(arguments: argparse.Namespace) -> int:
    faulthandler.enable()
    with tempfile.TemporaryDirectory(prefix="torture") as folder:
        os.chdir(folder)
        result = run_here(arguments.promises[0], arguments.seed, arguments.short, arguments.case, pathlib.Path(folder))
        print(json.dumps(result), flush=True)
    # Threads of a call that hangs must not keep the process.
    sys.stderr.flush()
    os._exit(1 if result["failed"] or result["ran"] != result["cases"] else 0)


def _environment(module: Any, folder: pathlib.Path) -> Dict[str, str]:
    """What a promise has preloaded; where a sanitized library is at hand, the promises that say so run on it."""
    environment = dict(os.environ)
    if hasattr(module, "preload") and platform() == LINUX:
        environment["LD_PRELOAD"] = module.preload(folder)
    sanitizer = getattr(module, "SANITIZER", "")
    library = environment.get(f"KRAL_{sanitizer.upper()}_LIBRARY") if sanitizer else None
    if library:
        # The run time of C++ as well: the sanitizer looks for what throws exceptions when it is loaded, and only then.
        run_times = [subprocess.run(["gcc", f"-print-file-name={name}"], stdout=subprocess.PIPE, text=True,
                                    check=True).stdout.strip() for name in (f"lib{sanitizer}.so", "libstdc++.so.6")]
        # Leaks are not for a Python process to be searched for.
        environment.update(KRAL_LIBRARY=library, LD_PRELOAD=" ".join(run_times), TSAN_OPTIONS="halt_on_error=1",
                           ASAN_OPTIONS="detect_leaks=0:halt_on_error=1", UBSAN_OPTIONS="print_stacktrace=1")
    return environment


def _run_child(number: int, seed: int, arguments: argparse.Namespace) -> Dict[str, Any]:
    command = [sys.executable, "-m", "torture", "--child", str(number), "--seed", str(seed)]
    command += ["--short"] if arguments.short else []
    command += ["--case", arguments.case] if arguments.case is not None else []
    limit = _LONGEST_SHORT_S if arguments.short else _LONGEST_S
    try:
        with tempfile.TemporaryDirectory(prefix="torture") as folder:
            environment = _environment(promises()[number], pathlib.Path(folder))
            done = subprocess.run(command, stdout=subprocess.PIPE, timeout=limit, check=False, env=environment)
        how = f"exit code {done.returncode}"
        if done.stdout.strip():
            result: Dict[str, Any] = json.loads(done.stdout.splitlines()[-1])
            return result
    except subprocess.TimeoutExpired:
        how = f"it had not ended after {limit:.0f} s"
    print(f"FAILED: promise {number}: {how} and no result (seed {seed})\n"
          f"    again: {_repeat(number, seed)}", file=sys.stderr, flush=True)
    return {"cases": 1, "ran": 0, "failed": 0, "figures": {}, "worst": {}}


def _add(total: Dict[str, Any], one: Dict[str, Any]) -> None:
    for name in ("cases", "ran", "failed"):
        total[name] = total.get(name, 0) + one[name]
    for name, value in one["figures"].items():
        total.setdefault("figures", {})[name] = total.get("figures", {}).get(name, 0) + value
    for name, value in one["worst"].items():
        total.setdefault("worst", {})[name] = max(total.get("worst", {}).get(name, value), value)


def _run_promise(number: int, arguments: argparse.Namespace) -> Dict[str, Any]:
    """Once, or with one seed after the other until the time is over."""
    total: Dict[str, Any] = {}
    begin = time.monotonic()
    seed = arguments.seed
    while True:
        _add(total, _run_child(number, seed, arguments))
        seed += 1
        if time.monotonic() - begin >= arguments.minutes * 60:
            break
    total["seconds"] = time.monotonic() - begin
    return total


def _row(number: int, title: str, total: Dict[str, Any]) -> str:
    bad = total["failed"] + total["cases"] - total["ran"]
    figures = [f"{value:,} {name}" for name, value in total.get("figures", {}).items()]
    figures += [f"{name}: {value:,}" for name, value in total.get("worst", {}).items()]
    return (f"| {number} {title} | {total['cases']:,} | {'kept' if bad == 0 else f'{bad:,} BROKEN'} | "
            f"{'; '.join(figures) or '-'} | {total['seconds']:.0f} s |")


def _soak(arguments: argparse.Namespace) -> int:
    with tempfile.TemporaryDirectory(prefix="torture") as folder:
        os.chdir(folder)
        bench = Bench(soak.NUMBER, arguments.seed, pathlib.Path(folder), False)
        wrong = soak.run(bench, arguments.soak)
        bench.close()
        for text in wrong:
            print(f"FAILED: the soak: {text}\n    again: scripts/torture --soak {arguments.soak:g} "
                  f"--seed {arguments.seed}", file=sys.stderr)
        total = {"failed": len(wrong), "ran": 1, "cases": 1, "figures": dict(bench.figures), "worst": dict(bench.worst),
                 "seconds": arguments.soak * 60}
        print(_row(soak.NUMBER, "A mixed station of 8 handsets", total), flush=True)
        print(f"torture: {0 if wrong else 1} passed, {len(wrong)} failed", flush=True)
    sys.stderr.flush()
    os._exit(1 if wrong else 0)


def main(words: List[str]) -> int:
    parser = argparse.ArgumentParser(prog="torture", description=__doc__)
    parser.add_argument("promises", nargs="*", type=int, metavar="PROMISE", help="numbers; all without")
    parser.add_argument("--minutes", type=float, default=0, help="each, with one seed after the other; 0: once")
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--short", action="store_true", help="a sample of the cases of each")
    parser.add_argument("--case", help="only this one")
    parser.add_argument("--soak", type=float, metavar="MINUTES", help="a mixed station instead, for so long")
    parser.add_argument("--platform", choices=(LINUX, WINDOWS), default=platform(),
                        help="as scripts/torture has chosen the library for it")
    parser.add_argument("--child", action="store_true", help=argparse.SUPPRESS)
    arguments = parser.parse_args(words)
    if arguments.child:
        return _child(arguments)
    if arguments.soak:
        return _soak(arguments)
    known = promises()
    chosen = arguments.promises or list(known)
    unknown = [number for number in chosen if number not in known]
    if unknown:
        parser.error(f"there is no program for promise {unknown[0]}")
    rows, bad, good = [], 0, 0
    for number in chosen:
        total = _run_promise(number, arguments)
        broken = total["failed"] + total["cases"] - total["ran"]
        bad, good = bad + broken, good + total["cases"] - broken
        rows.append(_row(number, known[number].TITLE, total))
        print(rows[-1], file=sys.stderr, flush=True)
    print("| Promise | Cases | Outcome | Figures | Time |\n|---|---|---|---|---|")
    print("\n".join(rows))
    print(f"torture: {good} passed, {bad} failed")
    return 1 if bad or not good else 0
