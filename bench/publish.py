#!/usr/bin/env python3
"""Puts fresh tables, with the machine that they come from, into bench/README.md.

usage: publish.py REPORT-FOLDER README
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
    report, readme = (pathlib.Path(name) for name in sys.argv[1:3])
    machine = (f"{datetime.date.today()}, {processor()}, Linux {platform.release()}, "
               f"SQLite {version('libsqlite3-0')}, JsonCpp {version('libjsoncpp25')}, "
               f"{first_line('g++', '--version')}; a shared virtual machine.")
    text = readme.read_text()
    for name, lead in (("marks", ""), ("table", f"{machine}\n\n")):
        block = (f"<!-- {name} -->\n{lead}{(report / f'{name}.md').read_text().strip()}\n"
                 f"<!-- end of {name} -->")
        text = re.sub(rf"<!-- {name} -->.*<!-- end of {name} -->", lambda _, block=block: block,
                      text, flags=re.DOTALL)
    readme.write_text(text)


if __name__ == "__main__":
    main()
