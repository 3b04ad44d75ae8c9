#!/usr/bin/env python3
"""Turns what was measured into tables and the data of the plots.

usage: report.py FOLDER

FOLDER holds Google Benchmark's PROGRAM-MEDIUM.json. Prints Markdown tables; writes
FOLDER/growth.csv for the plot.
"""

import csv
import pathlib
import re
import sys

from results import Medium, duration

MEDIA = ("disk", "tmpfs")


def work_lines(medium, measured):
    for name in measured.names():
        if name.startswith("P") or not measured.has(name, "library", "bare"):
            continue
        ratio, low, high = measured.ratio(name)
        yield (f"| {name} | {medium} | {duration(measured.median(name, 'library'))} | "
               f"{duration(measured.median(name, 'bare'))} | {ratio:.2f} ({low:.2f}–{high:.2f}) | "
               f"{measured.processor_ratio(name):.2f} | {at_full(measured, name)} |")


def at_full(measured, name):
    """The baseline that syncs what SQLite syncs by default, where there is one."""
    side = "bare at FULL"
    if not measured.has(name, side):
        return "–"
    return f"{duration(measured.median(name, side))}, {measured.ratio(name, to=side)[0]:.2f}"


def process_lines(medium, measured):
    for name, side in sorted(measured.times):
        if not name.startswith("P"):
            continue
        ratio, low, high = measured.ratio(name, side)
        peak = measured.peaks.get((name, side))
        yield (f"| {name} | {medium} | {side} | {duration(measured.median(name, side))} | "
               f"{ratio:.2f} ({low:.2f}–{high:.2f}) | {measured.processor_ratio(name, side):.2f} | "
               f"{f'{peak / 1024:.1f} MiB' if peak else '–'} |")


def write_growth(path, media):
    with path.open("w", newline="") as file:
        table = csv.writer(file, delimiter="\t")
        table.writerow(["operation", "medium", "rows", "library", "bare", "ratio", "processor"])
        for medium, measured in media.items():
            for name in measured.names():
                match = re.match(r"([BL]\d+ [^/]*)/(\d+)$", name)
                if match and measured.has(name, "library", "bare"):
                    table.writerow([match[1], medium, match[2], measured.median(name, "library"),
                                    measured.median(name, "bare"), measured.ratio(name)[0],
                                    measured.processor_ratio(name)])


def main():
    folder = pathlib.Path(sys.argv[1])
    media = {medium: Medium(folder, medium) for medium in MEDIA}
    print("| Work | Medium | Library | Baseline | Ratio (lowest–highest round) | "
          "Processor's ratio | Baseline at FULL, ratio |")
    print("|---|---|---|---|---|---|---|")
    for medium, measured in media.items():
        for line in work_lines(medium, measured):
            print(line)
    print("\n| Processes | Medium | Side | Time | Ratio to bare (lowest–highest round) | "
          "Processor's ratio | Peak memory |")
    print("|---|---|---|---|---|---|---|")
    for medium, measured in media.items():
        for line in process_lines(medium, measured):
            print(line)
    for medium, measured in media.items():
        for failure in measured.failures:
            print(f"\n**Failed on {medium}: {failure}.**")
    write_growth(folder / "growth.csv", media)


if __name__ == "__main__":
    main()
