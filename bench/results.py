"""What scripts/bench has measured, as Google Benchmark wrote it."""

import json
import pathlib
import re
import statistics

SIDES = ("library", "static", "bare at FULL", "bare, no start-up", "bare", "links only", "nothing")
NAME = re.compile(rf"(.*?)/({'|'.join(SIDES)})(/\d+)?$")


class Medium:
    """One medium's measurements: by name and side, a list of one figure per round."""

    def __init__(self, folder, medium):
        self.times, self.processor, self.peaks, self.failures = {}, {}, {}, []
        for path in sorted(pathlib.Path(folder).glob(f"*-{medium}.json")):
            for run in json.loads(path.read_text())["benchmarks"]:
                if run["run_type"] == "iteration":
                    self._take(run)

    def _take(self, run):
        name = re.sub(r"/(iterations:\d+|real_time|manual_time|repeats:\d+)", "", run["run_name"])
        match = NAME.match(name)
        key = (match[1] + (match[3] or ""), match[2])
        if run.get("error_occurred"):
            self.failures.append(f"{key[0]} ({key[1]}): {run['error_message']}")
            return
        self.times.setdefault(key, []).append(run["real_time"])
        self.processor.setdefault(key, []).append(run.get("cpu_us", run["cpu_time"]))
        if "peak_kib" in run:
            self.peaks[key] = max(self.peaks.get(key, 0), run["peak_kib"])

    def has(self, name, *sides):
        return all((name, side) in self.times for side in sides)

    def names(self):
        return sorted({name for name, _ in self.times}, key=sort_key)

    def median(self, name, side):
        return statistics.median(self.times[(name, side)])

    def ratio(self, name, side="library", to="bare"):
        """Of the medians; the lowest and the highest of a round beside it."""
        ours, theirs = self.times[(name, side)], self.times[(name, to)]
        rounds = sorted(a / b for a, b in zip(ours, theirs))
        return statistics.median(ours) / statistics.median(theirs), rounds[0], rounds[-1]

    def processor_ratio(self, name, side="library", to="bare"):
        return (statistics.median(self.processor[(name, side)]) /
                statistics.median(self.processor[(name, to)]))


def sort_key(name):
    return [int(part) if part.isdigit() else part for part in re.split(r"(\d+)", name)]


def instructions(path):
    """{(machine, side, work): instructions}"""
    counts = {}
    for line in pathlib.Path(path).read_text().splitlines():
        machine, side, work, count = line.split()
        counts[(machine, side, work)] = int(count)
    return counts


def duration(microseconds):
    if microseconds >= 10000:
        return f"{microseconds / 1000:.1f} ms"
    return f"{microseconds:.1f} µs"
