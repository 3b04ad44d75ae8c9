"""What one verification request costs, beside a program that does nothing, through
the same server and the same caller: from a cold start, where every request is a
process of its own, or by processes that stay, as the service was started. Prints
it, or writes it to the file that is named."""

import glob
import http.client
import os
import re
import subprocess
import sys
import threading
import time
import urllib.parse

import service

SECONDS = 5
CALLERS = 2  # as many as cores
STAYS = os.environ["SERVICE_MODE"] == "fastcgi"


def requests_per_second(path, headers):
    where = urllib.parse.urlsplit(service.ISSUER)
    counts, until = [0] * CALLERS, time.monotonic() + SECONDS

    def call(index):
        connection = http.client.HTTPConnection(where.hostname, where.port, timeout=30)
        while time.monotonic() < until:
            connection.request("GET", path, headers=headers)
            answer = connection.getresponse()
            answer.read()
            assert answer.status == 200, answer.status
            counts[index] += 1
        connection.close()

    callers = [threading.Thread(target=call, args=(index,)) for index in range(CALLERS)]
    for caller in callers:
        caller.start()
    for caller in callers:
        caller.join()
    return sum(counts) / SECONDS


def peak_of_those_that_stay(program):
    """Of the processes that answer by FastCGI."""
    path, peaks = os.path.join(os.environ["SERVICE_PROGRAMS"], program), []
    for folder in glob.glob("/proc/[0-9]*"):
        try:
            if os.readlink(folder + "/exe") == path:
                with open(folder + "/status", encoding="utf-8") as status:
                    peaks.append(int(re.search(r"VmHWM:\s+(\d+)", status.read())[1]))
        except OSError:
            pass  # It has ended meanwhile, or is not ours to see.
    return max(peaks)


def peak_kilobytes(program, path, headers):
    if STAYS:
        return peak_of_those_that_stay(program)
    environment = {"REQUEST_METHOD": "GET", "SCRIPT_NAME": path, "REMOTE_ADDR": "127.0.0.1",
                   "KELDOAUTH_SERVICE_SETTINGS": service.RUN + "/settings.json",
                   "HTTP_AUTHORIZATION": headers["Authorization"]}
    program = os.path.join(os.environ["SERVICE_PROGRAMS"], program)
    # A small parent: what it holds before it becomes the program counts as well.
    done = subprocess.run(["/usr/bin/time", "-f", "%M", program], env=environment, check=True,
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE)
    assert done.stdout.startswith(b"Status: 200"), done.stdout
    return int(done.stderr)


def main():
    headers = service.bearer(service.register().tokens()["access_token"])
    report = ""
    for title, path, program in (("verification (/api/whoami)", "/api/whoami", "keldoauth-service"),
                                 ("nothing (/api/nothing)", "/api/nothing",
                                  "nothing-fastcgi" if STAYS else "nothing")):
        rate = requests_per_second(path, headers)
        peak = peak_kilobytes(program, path, headers)
        report += (f"{title}: {rate:.0f} requests/s, {1000 * CALLERS / rate:.1f} ms each, "
                   f"peak {peak / 1024:.1f} MiB\n")
    if len(sys.argv) > 1:
        with open(sys.argv[1], "w", encoding="utf-8") as file:
            file.write(report)
    else:
        print(report, end="")


if __name__ == "__main__":
    main()
