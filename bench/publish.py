#!/usr/bin/env python3
"""Puts a fresh table, with the machine that it comes from, into bench/README.md.

usage: publish.py TABLE README
"""

import datetime
import pathlib
import platform
import re
import subprocess
import sys


def first_line(*command):
    return subprocess.run(command, capture_output=True, text=True, check=True).stdout.splitlines()[0]


def processor():
    for line in pathlib.Path("/proc/cpuinfo").read_text().splitlines():
        if line.startswith("model name"):
            return line.split(":", 1)[1].strip()
    return platform.machine()


def version(package):
    return first_line("dpkg-query", "-W", "-f=${Version}", package)


def main():
    table, readme = (pathlib.Path(name) for name in sys.argv[1:3])
    machine = (f"{datetime.date.today()}, {processor()}, Linux {platform.release()}, "
               f"SQLite {version('libsqlite3-0')}, JsonCpp {version('libjsoncpp25')}, "
               f"{first_line('g++', '--version')}; a shared virtual machine.")
    text = readme.read_text()
    block = f"<!-- figures -->\n{machine}\n\n{table.read_text().strip()}\n<!-- end of figures -->"
    readme.write_text(re.sub(r"<!-- figures -->.*<!-- end of figures -->", lambda _: block, text,
                             flags=re.DOTALL))


if __name__ == "__main__":
    main()
