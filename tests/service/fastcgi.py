"""One process of the service that answers by FastCGI, and the web server's side of
the protocol by hand, so that a test can send what no web server would."""

import contextlib
import http.client
import io
import os
import signal
import socket
import struct
import subprocess
import tempfile

import service
from service import Answer

BEGIN, ABORT, END, PARAMS, STDIN, STDOUT, STDERR, GET_VALUES, UNKNOWN = 1, 2, 3, 4, 5, 6, 7, 9, 11
HEADER = struct.Struct("!BBHHBx")
RESPONDER, KEEP = 1, 1
REQUEST = 1  # the number that all of ours have


class Gone(Exception):
    """The connection ended before the answer did."""


def record(kind, content=b"", request=REQUEST, padding=0):
    return HEADER.pack(1, kind, request, len(content), padding) + content + b"\0" * padding


def size_of(text):
    return bytes([len(text)]) if len(text) < 128 else struct.pack("!I", len(text) | 1 << 31)


def pairs_of(variables):
    """The variables as the protocol wants them."""
    pieces = [(name.encode(), value.encode()) for name, value in variables.items()]
    return b"".join(size_of(name) + size_of(value) + name + value for name, value in pieces)


def request_records(variables, body=b"", flags=0):
    """A whole request, in pieces of the usual size."""
    begin = record(BEGIN, struct.pack("!HB5x", RESPONDER, flags))
    params = pairs_of(variables)
    chunks = [params[i:i + 8192] for i in range(0, len(params), 8192)]
    bodies = [body[i:i + 8192] for i in range(0, len(body), 8192)]
    return begin + b"".join([record(PARAMS, chunk) for chunk in chunks] + [record(PARAMS)] +
                            [record(STDIN, chunk) for chunk in bodies] + [record(STDIN)])


def read_exactly(connection, count):
    data = b""
    while len(data) < count:
        piece = connection.recv(count - len(data))
        if not piece:
            raise Gone
        data += piece
    return data


def read_answer(connection):
    output = b""
    while True:
        _, kind, _, length, padding = HEADER.unpack(read_exactly(connection, HEADER.size))
        content = read_exactly(connection, length)
        read_exactly(connection, padding)
        if kind == STDOUT:
            output += content
        if kind == END:
            break
    stream = io.BytesIO(output)
    line = stream.readline()
    assert line.startswith(b"Status: "), output
    return Answer(int(line.split()[1]), http.client.parse_headers(stream), stream.read())


class Process:
    """It waits at a socket that is its standard input."""

    def __init__(self, settings=None, **variables):
        self.folder = tempfile.TemporaryDirectory()
        self.path = os.path.join(self.folder.name, "socket")
        waiting = socket.socket(socket.AF_UNIX)
        waiting.bind(self.path)
        waiting.listen(64)
        runner = [os.environ["SERVICE_RUNNER"]] if os.environ.get("SERVICE_RUNNER") else []
        program = os.path.join(os.environ["SERVICE_PROGRAMS"], "keldoauth-service")
        environment = {"KELDOAUTH_SERVICE_SETTINGS": settings or service.RUN + "/settings.json",
                       "ASAN_OPTIONS": "verify_asan_link_order=0", **variables}
        # pylint: disable-next=consider-using-with
        self.child = subprocess.Popen([*runner, program], stdin=waiting, env=environment,
                                      stderr=subprocess.PIPE)
        waiting.close()

    def connect(self):
        connection = socket.socket(socket.AF_UNIX)
        connection.settimeout(60)
        try:
            connection.connect(self.path)
        except OSError:
            connection.close()
            raise
        return connection

    def raw(self, data):
        """Whatever comes back until the other side, which hears the end, ends."""
        with self.connect() as connection:
            with contextlib.suppress(BrokenPipeError, ConnectionResetError):
                connection.sendall(data)
                connection.shutdown(socket.SHUT_WR)
            output = b""
            with contextlib.suppress(ConnectionResetError):
                while piece := connection.recv(65536):
                    output += piece
            return output

    def request(self, method, path, body, headers):
        body = body.encode() if isinstance(body, str) else body or b""
        with self.connect() as connection:
            connection.sendall(request_records(service.variables(method, path, body, headers),
                                               body))
            return read_answer(connection)

    def is_alive(self):
        return self.child.poll() is None

    def end(self, how=signal.SIGTERM):
        """The exit status."""
        if self.is_alive():
            self.child.send_signal(how)
        status = self.child.wait(timeout=60)
        self.said = self.child.stderr.read().decode()
        self.child.stderr.close()
        self.folder.cleanup()
        return status


@contextlib.contextmanager
def one_process(**variables):
    """Requests meanwhile go to one process, which must live through them."""
    process = Process(**variables)
    service.carry(process.request)
    try:
        yield process
        assert process.is_alive(), "it died"
    finally:
        service.carry(None)
        status = process.end()
    assert status == 0, (status, process.said)
