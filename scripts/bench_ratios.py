#!/usr/bin/env python3
"""Prints one table of ratios from Google Benchmark's JSON files.

Benchmarks come in pairs in one program, `<topic>/ours[/args]` and `<topic>/yardstick[/args]`. A row has the medians of
both in nanoseconds and their ratio; user counters follow, those of the yardstick marked as such. A benchmark without
its pair has a row without a ratio.

    bench_ratios.py FILE...                          the table
    bench_ratios.py --compare BASELINE FILE...       then what became worse than the baseline says, and ends with 1 if
                                                     anything did
    bench_ratios.py --write BASELINE FILE...         then puts the ratios into the baseline, beside those of others
"""

import argparse
import json
import pathlib
import re

NANOSECONDS = {"ns": 1.0, "us": 1e3, "ms": 1e6, "s": 1e9}
OWN_FIELDS = {
    "name", "family_index", "per_family_instance_index", "run_name", "run_type", "repetitions", "repetition_index",
    "threads", "aggregate_name", "aggregate_unit", "iterations", "real_time", "cpu_time", "time_unit", "label",
}
SIDES = ("ours", "yardstick")
WORSE = 1.15  # times the baseline's ratio: less is noise


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


def entries(files):
    """{(file, topic, args): times of both sides and notes} of all benchmarks."""
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
    return table


def ratio_of(entry):
    ours, yardstick = (entry["times"].get(side) for side in SIDES)
    return ours / yardstick if ours is not None and yardstick else None


def print_table(table):
    lines = [("topic", "args", "ours ns", "yardstick ns", "ratio", "counters")]
    for (_, topic, args), entry in sorted(table.items(), key=lambda item: item[0]):
        ratio = ratio_of(entry)
        times = (time_text(entry["times"].get(side)) for side in SIDES)
        lines.append((topic, args, *times, "" if ratio is None else f"{ratio:.2f}", "  ".join(sorted(entry["notes"]))))
    widths = [max(len(line[column]) for line in lines) for column in range(5)]
    for line in lines:
        cells = [text.ljust(width) if column < 2 else text.rjust(width)
                 for column, (text, width) in enumerate(zip(line, widths))]
        print("  ".join([*cells, line[5]]).rstrip())


def compare(ratios, baseline):
    """Prints what became worse; whether anything did."""
    worse = [(now / then, name, then, now) for name, now in ratios.items()
             if (then := baseline.get(name)) is not None and now > then * WORSE]
    for change, name, then, now in sorted(worse, reverse=True):
        print(f"worse by {100 * (change - 1):.0f} %: {name}, {then:.2f} -> {now:.2f}")
    known = len(ratios.keys() & baseline.keys())
    print(f"{known} of {len(ratios)} ratios are in the baseline; {len(worse)} became worse by more than "
          f"{100 * (WORSE - 1):.0f} %.")
    return bool(worse)


def main():
    parser = argparse.ArgumentParser(usage=__doc__.split("\n\n", 2)[2])
    parser.add_argument("--compare", type=pathlib.Path)
    parser.add_argument("--write", type=pathlib.Path)
    parser.add_argument("files", nargs="+")
    options = parser.parse_args()
    table = entries(options.files)
    print_table(table)
    ratios = {f"{topic}/{args}".rstrip("/"): ratio for (_, topic, args), entry in table.items()
              if (ratio := ratio_of(entry)) is not None}
    if options.write:
        kept = json.loads(options.write.read_text(encoding="utf-8")) if options.write.exists() else {}
        kept.update({name: round(ratio, 3) for name, ratio in ratios.items()})
        options.write.write_text(json.dumps(kept, indent=2, sort_keys=True) + "\n", encoding="utf-8")
    if options.compare:
        print()
        if compare(ratios, json.loads(options.compare.read_text(encoding="utf-8"))):
            raise SystemExit(1)


if __name__ == "__main__":
    main()
