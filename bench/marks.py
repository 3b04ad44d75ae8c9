#!/usr/bin/env python3
"""Prints every mark, what was measured, and whether it is met.

usage: marks.py RESULTS-FOLDER INSTRUCTIONS SERVICE

RESULTS-FOLDER holds what scripts/bench has measured, INSTRUCTIONS is the record,
SERVICE the file of scripts/service --cost. A mark that nothing was measured for says so.
"""

import json
import pathlib
import statistics
import sys
from functools import partial

from results import Medium, instructions

VERIFICATION = "P1 cold verification"
WRITERS = "P2 eight writers of 100 tokens"


class Marks:
    def __init__(self, folder, counts, service):
        self.disk, self.tmpfs = (Medium(folder, medium) for medium in ("disk", "tmpfs"))
        self.counts = instructions(counts)
        service = pathlib.Path(service)
        self.service = json.loads(service.read_text()) if service.exists() else {}

    def counted(self, machine):
        return (self.counts[(machine, "stores-static", "verify")] /
                self.counts[(machine, "bare", "verify")])

    def rate(self, way):
        """The most requests a second that it has for any number of callers."""
        return max(statistics.median(rounds) for rounds in self.service[way]["rates"].values())

    def rates(self, way, other):
        """The ratio of the two, and that of the processor's time that a request leaves
        for others."""
        took = [statistics.median(self.service[name]["processor_ms"]) for name in (other, way)]
        return self.rate(way) / self.rate(other), took[0] / took[1]

    def lines(self):
        """(mark, what, bound, whether it is the least, how to find the figure and, of a
        time, the ratio of the processor's time)"""
        disk, tmpfs = self.disk, self.tmpfs
        yield "M1", "cold verification, static, time on tmpfs", 1.10, False, \
            lambda: times(tmpfs, VERIFICATION, "static")
        yield "M1", "cold verification, static, instructions, amd64", 0.65, False, \
            lambda: (self.counted("amd64"),)
        yield "M2", "cold verification, static, instructions, armhf", 0.70, False, \
            lambda: (self.counted("armhf"),)
        yield "M3", "cold verification, shared library, time on tmpfs", 1.55, False, \
            lambda: times(tmpfs, VERIFICATION)
        for rows in (900, 9900):
            for medium, measured, bound in (("disk", disk, 1.08), ("tmpfs", tmpfs, 1.7)):
                yield "M4", f"issue a pair among {rows}, {medium}", bound, False, \
                    partial(times, measured, f"B2 issue a token pair/{rows}")
        for how in ("L1 login whole, kept open", "L2 login whole, opened twice"):
            for rows in (100, 1000, 9000):
                yield "M5", f"{how[3:]}, among {rows}, disk", 1.10, False, \
                    partial(times, disk, f"{how}/{rows}")
        yield "M6", "refresh among 9,900, of the same by primary key, disk", 1.3, False, \
            lambda: times(disk, "L3 refresh/9900")
        yield "M6", "look-up of a refresh token among 9,900, tmpfs", 1.3, False, \
            lambda: times(tmpfs, "L4 look-up of a refresh token/9900")
        for medium, measured in (("disk", disk), ("tmpfs", tmpfs)):
            yield "M7", f"purge of grants/, 5,000 of 10,000, {medium}", 1.3, False, \
                partial(times, measured, "L5 purge of half of the rows/10000")
        yield "M8", "/api/whoami, static CGI, of the rate of a program that does nothing", 0.75, \
            True, partial(self.rates, "static CGI", "nothing, static CGI")
        yield "M9", "/api/whoami by FastCGI, of the rate of the static CGI", 8, True, \
            partial(self.rates, "FastCGI", "static CGI")
        yield "M9", "/api/whoami by FastCGI, of the rate of oidc-provider on Node", 2, True, \
            partial(self.rates, "FastCGI", "oidc-provider on Node")
        yield "M10", "peak memory of a static CGI verification, MiB", 4, False, \
            lambda: (self.service["static CGI"]["peak_kib"] / 1024,)
        for side in ("library", "static"):
            yield "M11", f"eight writers, {side}, tmpfs", 1.6, False, \
                partial(times, tmpfs, WRITERS, side)


def times(measured, name, side="library"):
    return measured.ratio(name, side)[0], measured.processor_ratio(name, side)


def main():
    print("| Mark | What | Bound | Measured | Processor's ratio | |")
    print("|---|---|---|---|---|---|")
    for mark, what, bound, is_least, find in Marks(*sys.argv[1:4]).lines():
        line = f"| {mark} | {what} | {'≥' if is_least else '≤'} {bound:g} |"
        try:
            figure, *processor = find()
        except KeyError:
            print(f"{line} – | – | not measured |")
            continue
        met = figure >= bound if is_least else figure <= bound
        print(f"{line} {figure:.2f} | {f'{processor[0]:.2f}' if processor else '–'} | "
              f"{'met' if met else '**missed**'} |")


if __name__ == "__main__":
    main()
