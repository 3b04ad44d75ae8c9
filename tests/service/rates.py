"""Requests a second of one way to serve, by number of callers, the processor's time
that one takes, web server included, and the peak memory of one process; added to a file of JSON, in which every round is one figure more.

usage: rates.py FILE WAY PATH          within service/serve
       rates.py FILE WAY --provider    oidc-provider on Node, which it starts
"""

import json
import os
import pathlib
import re
import signal
import socket
import subprocess
import sys

CALLERS = tuple(map(int, os.environ.get("SERVICE_CALLERS", "1,2,4,8").split(",")))
SECONDS = os.environ.get("SERVICE_SECONDS", "3")
PEER = pathlib.Path(__file__).parent / "peer" / "provider.mjs"


def rate(address, token, callers):
    """ApacheBench, one process that keeps its connections: requests a second, and how
    many there were."""
    said = subprocess.run(
        ["ab", "-q", "-k", "-l", "-t", SECONDS, "-n", "10000000", "-c", str(callers),
         "-H", f"Authorization: Bearer {token}", address],
        check=True, capture_output=True, text=True).stdout
    assert "Non-2xx responses" not in said, said
    assert re.search(r"Failed requests: +0\n", said), said
    return (float(re.search(r"Requests per second: +([\d.]+)", said)[1]),
            int(re.search(r"Complete requests: +(\d+)", said)[1]))


def peak_of(pid):
    status = pathlib.Path(f"/proc/{pid}/status").read_text()
    return int(re.search(r"VmHWM:\s+(\d+) kB", status)[1])


def seconds_of(pids):
    """Of the processor, for processes and for those children that they waited for."""
    ticks = 0
    for pid in pids:
        fields = pathlib.Path(f"/proc/{pid}/stat").read_text().rpartition(")")[2].split()
        ticks += sum(int(field) for field in fields[11:15])
    return ticks / os.sysconf("SC_CLK_TCK")


def web_server():
    return pathlib.Path(os.environ["SERVICE_RUN"], "lighttpd.pid").read_text().strip()


def residents(program):
    """The processes that stay, which are the web server's children."""
    server = web_server()
    children = pathlib.Path(f"/proc/{server}/task/{server}/children").read_text().split()
    return [pid for pid in children if os.readlink(f"/proc/{pid}/exe") == program]


def peak_of_one(program, path, token):
    """Of a process for one request. A small parent: what it holds before it becomes
    the program counts as well."""
    environment = {"REQUEST_METHOD": "GET", "SCRIPT_NAME": path, "REMOTE_ADDR": "127.0.0.1",
                   "KELDOAUTH_SERVICE_SETTINGS": os.environ["SERVICE_RUN"] + "/settings.json",
                   "HTTP_AUTHORIZATION": f"Bearer {token}"}
    done = subprocess.run(["/usr/bin/time", "-f", "%M", program], env=environment, check=True,
                          capture_output=True)
    assert done.stdout.startswith(b"Status: 200"), done.stdout
    return int(done.stderr)


def measure(address, token, processes, peak):
    rates, requests, before = {}, 0, seconds_of(processes)
    for callers in CALLERS:
        rates[str(callers)], complete = rate(address, token, callers)
        requests += complete
    return rates, (seconds_of(processes) - before) * 1000 / requests, peak()


def measure_service(path):
    import service  # needs what service/serve says in the environment

    token = service.register().tokens()["access_token"]
    name = "nothing" if path.endswith("nothing") else "keldoauth-service"
    is_resident = os.environ["SERVICE_MODE"] == "fastcgi"
    if is_resident and name == "nothing":
        name = "nothing-fastcgi"
    program = os.path.realpath(os.path.join(os.environ["SERVICE_PROGRAMS"], name))
    stay = residents(program) if is_resident else []
    return measure(service.ISSUER + path, token, [web_server(), *stay],
                   lambda: max(map(peak_of, stay)) if is_resident
                   else peak_of_one(program, path, token))


def measure_provider():
    with socket.create_server(("127.0.0.1", 0)) as free:
        port = free.getsockname()[1]
    node = subprocess.Popen(["node", str(PEER), str(port)], stdout=subprocess.PIPE,
                            stderr=subprocess.DEVNULL, text=True,
                            env={**os.environ, "NODE_ENV": "production"})
    try:
        # Its warnings come first, on the same stream.
        token = next(line.split()[1] for line in node.stdout if line.startswith("token "))
        return measure(f"http://127.0.0.1:{port}/me", token, [node.pid],
                       lambda: peak_of(node.pid))
    finally:
        node.send_signal(signal.SIGTERM)
        node.wait()


def main():
    file, way, path = pathlib.Path(sys.argv[1]), sys.argv[2], sys.argv[3]
    rates, milliseconds, peak = (
        measure_provider() if path == "--provider" else measure_service(path))
    found = json.loads(file.read_text()) if file.exists() else {}
    known = found.setdefault(way, {"rates": {}, "processor_ms": [], "peak_kib": 0})
    for callers, figure in rates.items():
        known["rates"].setdefault(callers, []).append(figure)
    known["processor_ms"].append(milliseconds)
    known["peak_kib"] = max(known["peak_kib"], peak)
    file.write_text(json.dumps(found, indent=2))


if __name__ == "__main__":
    main()
