#!/usr/bin/env python3
"""Prints one table of ratios from Google Benchmark's JSON files.

Benchmarks come in pairs in one program, `<topic>/ours[/args]` and `<topic>/yardstick[/args]`. A row has the medians of
both in nanoseconds and their ratio; user counters follow, those of the yardstick marked as such. A benchmark without
its pair has a row without a ratio.
"""

import json
import re
import sys

NANOSECONDS = {"ns": 1.0, "us": 1e3, "ms": 1e6, "s": 1e9}
OWN_FIELDS = {
    "name", "family_index", "per_family_instance_index", "run_name", "run_type", "repetitions", "repetition_index",
    "threads", "aggregate_name", "aggregate_unit", "iterations", "real_time", "cpu_time", "time_unit", "label",
}
SIDES = ("ours", "yardstick")


def medians(report):
    """Yields (run name, nanoseconds, counters) of each benchmark: its median, or its only run."""
    for run in report["benchmarks"]:
        if run.get("error_occurred"):
            raise SystemExit(f"{run['name']}: {run.get('error_message', 'failed')}")
        if run.get("aggregate_name", "median") != "median":
            continue
        name = run["run_name"]
        on_the_wall = "/real_time" in name or "/manual_time" in name
        time = run["real_time" if on_the_wall else "cpu_time"] * NANOSECONDS[run["time_unit"]]
        counters = {key: value for key, value in run.items() if key not in OWN_FIELDS}
        yield re.sub(r"/(repeats:\d+|real_time|manual_time|process_time|min_time:[\d.]+)", "", name), time, counters


def split(name):
    """(topic, side, args) of a run name; the side is None where it isn't one of a pair."""
    parts = name.split("/")
    for side in SIDES:
        if side in parts:
            at = parts.index(side)
            return "/".join(parts[:at]), side, "/".join(parts[at + 1:])
    return name, None, ""


def number(value):
    return f"{value:.4g}" if isinstance(value, (int, float)) else str(value)


def time_text(nanoseconds):
    if nanoseconds is None:
        return ""
    return f"{nanoseconds:,.2f}" if nanoseconds < 100 else f"{nanoseconds:,.0f}"


def rows(files):
    table = {}
    for file in files:
        with open(file, encoding="utf-8") as stream:
            report = json.load(stream)
        for name, time, counters in medians(report):
            topic, side, args = split(name)
            entry = table.setdefault((file, topic, args), {"times": {}, "notes": []})
            entry["times"][side or "ours"] = time
            mark = "yardstick " if side == "yardstick" else ""
            entry["notes"] += [f"{mark}{key}={number(value)}" for key, value in counters.items()]
    for (_, topic, args), entry in table.items():
        ours, yardstick = (entry["times"].get(side) for side in SIDES)
        ratio = f"{ours / yardstick:.2f}" if ours is not None and yardstick else ""
        yield topic, args, time_text(ours), time_text(yardstick), ratio, "  ".join(sorted(entry["notes"]))


def main(files):
    table = [("topic", "args", "ours ns", "yardstick ns", "ratio", "counters"), *rows(files)]
    widths = [max(len(row[column]) for row in table) for column in range(5)]
    for row in table:
        cells = [text.ljust(width) if column < 2 else text.rjust(width)
                 for column, (text, width) in enumerate(zip(row, widths))]
        print("  ".join([*cells, row[5]]).rstrip())


if __name__ == "__main__":
    main(sys.argv[1:])
