"""The versions of clients that are packages of Debian."""

import re
import subprocess


def version_of(package):
    """Of the software itself: 1.8.0 for 2:1.8.0-1+deb12u1."""
    said = subprocess.run(["dpkg-query", "-W", "-f", "${Version}", package], check=True,
                          capture_output=True, text=True).stdout
    return re.match(r"(?:\d+:)?([^-+]+)", said)[1]
