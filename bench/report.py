#!/usr/bin/env python3
"""Turns Google Benchmark's JSON into the table and the data of the plot.

usage: report.py FOLDER

FOLDER holds stores-MEDIUM.json and process-MEDIUM.json for each medium (disk,
tmpfs). Prints the Markdown table; writes FOLDER/growth.csv for the plot.
"""

import csv
import json
import pathlib
import re
import statistics
import sys

# (name, medium): the highest ratio that we accept.
MARKS = {
    ("B1 register a client", "disk"): 1.10,
    ("B1 register a client", "tmpfs"): 1.6,
    ("B2 issue a token pair/900", "disk"): 1.10,
    ("B2 issue a token pair/900", "tmpfs"): 1.5,
    ("B2 issue a token pair/9900", "disk"): 1.10,
    ("B2 issue a token pair/9900", "tmpfs"): 1.5,
    ("B3 verify an access token/1000", "tmpfs"): 1.5,
    ("B3 verify an access token/10000", "tmpfs"): 1.5,
    ("B3 verify an access token/1000", "disk"): 1.5,
    ("B3 verify an access token/10000", "disk"): 1.5,
    ("B4 look up a refresh token/10000", "tmpfs"): 1.1,
    ("B4 look up a refresh token/10000", "disk"): 1.1,
    ("B5 purge half of the rows/2000", "disk"): 6,
    ("B5 purge half of the rows/2000", "tmpfs"): 6,
    ("B5 purge half of the rows/10000", "disk"): 6,
    ("B5 purge half of the rows/10000", "tmpfs"): 6,
    ("B5 purge, beside row by row/2000", "disk"): 0.05,
    ("B6 audit entry with rotation/1000", "disk"): 1.10,
    ("B6 audit entry with rotation/10000", "disk"): 1.10,
    ("B7 getRandomStr(64)", "tmpfs"): 1.3,
    ("B8 construct and destroy", "disk"): 1.15,
    ("B8 construct and destroy", "tmpfs"): 1.15,
    ("B9 cold verification", "disk"): 2.0,
    ("B9 cold verification", "tmpfs"): 2.0,
    ("B10 eight writers of 100 tokens", "disk"): 1.15,
}

# How an operation's own time may grow: (medium, small, large): highest ratio.
GROWTH = {
    ("B2 issue a token pair", "900", "9900"): 1.3,
    ("B3 verify an access token", "1000", "10000"): 1.3,
}


def load(path):
    """{(name, side): [microseconds, one per repetition]}, {name: peak KiB}, failures."""
    times, peaks, failures = {}, {}, []
    for run in json.loads(path.read_text())["benchmarks"]:
        if run["run_type"] != "iteration":
            continue
        name = re.sub(r"/(iterations:\d+|real_time|manual_time|repeats:\d+)", "", run["run_name"])
        match = re.match(r"(.*?)/(library|bare at FULL|bare|links only)(/\d+)?$", name)
        key = match[1] + (match[3] or "")
        if run.get("error_occurred"):
            failures.append(f"{key} ({match[2]}): {run['error_message']}")
            continue
        times.setdefault((key, match[2]), []).append(run["real_time"])
        if "peak_kib" in run:
            peaks[(key, match[2])] = max(peaks.get((key, match[2]), 0), run["peak_kib"])
    return times, peaks, failures


def ratio_of(times, name, side="bare"):
    ours, theirs = times[(name, "library")], times[(name, side)]
    rounds = sorted(a / b for a, b in zip(ours, theirs))
    return statistics.median(ours) / statistics.median(theirs), rounds[0], rounds[-1]


def duration(microseconds):
    if microseconds >= 10000:
        return f"{microseconds / 1000:.1f} ms"
    return f"{microseconds:.1f} µs"


def verdict(value, mark):
    if mark is None:
        return "–"
    return f"≤ {mark:g}" + ("" if value <= mark else " **missed**")


def rows(times, medium):
    for name in sorted({key for key, _ in times}, key=sort_key):
        ratio, low, high = ratio_of(times, name)
        ours = statistics.median(times[(name, "library")])
        theirs = statistics.median(times[(name, "bare")])
        mark = MARKS.get((name, medium))
        yield (f"| {name} | {medium} | {duration(ours)} | {duration(theirs)} | "
               f"{ratio:.2f} ({low:.2f}–{high:.2f}) | {verdict(ratio, mark)} | {at_full(times, name)} |")


def at_full(times, name):
    """The baseline that syncs what SQLite syncs by default, where there is one."""
    side = "bare at FULL"
    if (name, side) not in times:
        return "–"
    return f"{duration(statistics.median(times[(name, side)]))}, {ratio_of(times, name, side)[0]:.2f}"


def sort_key(name):
    return [int(part) if part.isdigit() else part for part in re.split(r"(\d+)", name)]


def growth_lines(times, medium):
    for (name, small, large), mark in GROWTH.items():
        if (f"{name}/{small}", "library") not in times:
            continue
        grown = [statistics.median(times[(f"{name}/{large}", side)]) /
                 statistics.median(times[(f"{name}/{small}", side)]) for side in ("library", "bare")]
        yield (f"| {name}: {large} rows against {small} | {medium} | {grown[0]:.2f} × | "
               f"{grown[1]:.2f} × | | {verdict(grown[0], mark)} | |")


def write_growth(path, media):
    with path.open("w", newline="") as file:
        table = csv.writer(file, delimiter="\t")
        table.writerow(["operation", "medium", "rows", "library", "bare"])
        for medium, times in media.items():
            for name in sorted({key for key, _ in times}, key=sort_key):
                match = re.match(r"(B[2-5][^/,]*)/(\d+)$", name)
                if match:
                    table.writerow([match[1], medium, match[2],
                                    statistics.median(times[(name, "library")]),
                                    statistics.median(times[(name, "bare")])])


def main():
    folder = pathlib.Path(sys.argv[1])
    print("| Work | Medium | Library | Baseline | Ratio (lowest–highest round) | Mark | "
          "Baseline at FULL, ratio |")
    print("|---|---|---|---|---|---|---|")
    media, notes = {}, []
    for medium in ("disk", "tmpfs"):
        for kind in ("stores", "process"):
            path = folder / f"{kind}-{medium}.json"
            if not path.exists():
                continue
            times, peaks, failures = load(path)
            media.setdefault(medium, {}).update(times)
            notes += [f"Failed on {medium}: {failure}." for failure in failures]
            for (name, side), peak in peaks.items():
                if name.startswith("B9"):
                    notes.append(f"Peak memory of a cold verification on {medium}, {side}: "
                                 f"{peak / 1024:.1f} MiB.")
            links = times.get(("B9 cold verification", "links only"))
            if links:
                notes.append(f"A process that only links what the library links, on {medium}: "
                             f"{duration(statistics.median(links))}.")
        for line in [*rows(media.get(medium, {}), medium),
                     *growth_lines(media.get(medium, {}), medium)]:
            print(line)
    print()
    for note in notes:
        print(f"- {note}")
    write_growth(folder / "growth.csv", media)


if __name__ == "__main__":
    main()
