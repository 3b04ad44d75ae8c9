"""What one verification request costs, from a cold start: every request is a
process of its own. Beside it, a CGI program that does nothing, through the same
server and the same caller. Prints it, or writes it to the file that is named."""

import http.client
import os
import subprocess
import sys
import threading
import time
import urllib.parse

import service

SECONDS = 5
CALLERS = 2  # as many as cores


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


def peak_kilobytes(program, path, headers):
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
                                 ("nothing (/api/nothing)", "/api/nothing", "nothing")):
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
