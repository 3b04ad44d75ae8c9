"""What this machine has: versions of Debian's packages, ports that nobody uses."""

import re
import socket
import subprocess


def version_of(package):
    """Of the software itself: 1.8.0 for 2:1.8.0-1+deb12u1."""
    said = subprocess.run(["dpkg-query", "-W", "-f", "${Version}", package], check=True,
                          capture_output=True, text=True).stdout
    return re.match(r"(?:\d+:)?([^-+]+)", said)[1]


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as taken:
        return taken.getsockname()[1]
