#!/usr/bin/env python3
"""Reads the results of benchmark runs (JSON of Google Benchmark).

results.py check FLOORS RESULTS    compares the ratios of a run with the floors, and names those that fell
results.py compare BEFORE AFTER    prints two runs side by side

A floor is a ratio, never a time: what two kinds of work that took turns in one run have to do with one another hardly
depends on the machine. Each has a third of slack over what was measured.
"""
import json
import statistics
import sys

TIME_UNITS = {"ns": 1e-3, "us": 1, "ms": 1e3, "s": 1e6}


def load(path):
    """By name: the counters of each benchmark, with its time in microseconds; medians where it ran repeatedly."""
    with open(path, encoding="utf-8") as file:
        runs = json.load(file)["benchmarks"]
    values = {}
    for run in runs:
        if run.get("run_type") == "aggregate" or run.get("error_occurred"):
            continue
        counters = values.setdefault(run["name"], {})
        counters.setdefault("time_us", []).append(run["real_time"] * TIME_UNITS[run["time_unit"]])
        for key, value in run.items():
            known = ("real_time", "cpu_time", "iterations", "repetitions", "threads")
            if isinstance(value, (int, float)) and key not in known and not key.endswith("_index"):
                counters.setdefault(key, []).append(value)
    return {name: {key: statistics.median(found) for key, found in counters.items()}
            for name, counters in values.items()}


def find(results, name):
    """What Google Benchmark appends to a name, such as the number of iterations, is left out of floors."""
    if name in results:
        return results[name]
    for other, counters in results.items():
        if other.startswith(name + "/") and not any(c.isdigit() for c in other[len(name) + 1:].split(":")[0]):
            return counters
    return None


def measured(floor, results):
    counters = find(results, floor["benchmark"])
    if counters is None:
        return None
    value = counters.get(floor["counter"])
    if value is None or "over" not in floor:
        return value
    other = find(results, floor["over"])
    divisor = other and other.get(floor["counter"])
    return value / divisor if divisor else None


def check(floors_path, results_path):
    with open(floors_path, encoding="utf-8") as file:
        floors = json.load(file)["floors"]
    results = load(results_path)
    fell = 0
    compared = 0
    for floor in floors:
        name = floor["benchmark"] + (" over " + floor["over"] if "over" in floor else "")
        value = measured(floor, results)
        if value is None:
            print(f"not measured: {name} {floor['counter']}")
            fell += 1
            continue
        compared += 1
        too_low = "at_least" in floor and value < floor["at_least"]
        too_high = "at_most" in floor and value > floor["at_most"]
        bound = f"at least {floor['at_least']}" if "at_least" in floor else f"at most {floor['at_most']}"
        if too_low or too_high:
            fell += 1
        print(f"{'FELL' if too_low or too_high else 'ok  '}  {value:10.3f}  ({bound})  {name} {floor['counter']}")
    print(f"{compared} ratios compared, {fell} fell or were not measured")
    return 1 if fell or not compared else 0


def compare(before_path, after_path):
    before, after = load(before_path), load(after_path)
    for name in sorted(before.keys() | after.keys()):
        for key in sorted(before.get(name, {}).keys() | after.get(name, {}).keys()):
            old, new = before.get(name, {}).get(key), after.get(name, {}).get(key)
            texts = ["-" if value is None else f"{value:.4g}" for value in (old, new)]
            texts.append(f"{new / old:.2f} x" if old and new is not None else "-")
            print("".join(f"{text:>12}" for text in texts), "", name, key)
    return 0


def main(arguments):
    commands = {"check": check, "compare": compare}
    if len(arguments) != 3 or arguments[0] not in commands:
        print(__doc__, file=sys.stderr)
        return 2
    return commands[arguments[0]](*arguments[1:])


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
