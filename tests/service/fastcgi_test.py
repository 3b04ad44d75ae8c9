"""A process that stays: it answers as one that is started for each request does,
whatever happens to the file, the medium, its peers, or on the line."""

import contextlib
import os
import random
import shutil
import signal
import sqlite3
import struct
import subprocess
import tempfile
import threading
import time
import unittest

import fastcgi
import service
from fastcgi import BEGIN, KEEP, PARAMS, RESPONDER, STDIN, Gone, Process, one_process, record
from faults_test import Opens, rows
from service import Killed, killed_at, register, whoami
from trouble_test import locked

FOLDER = os.path.dirname(service.DATABASE)
TOOL = os.path.join(os.path.dirname(os.environ["SERVICE_PROGRAMS"]), "keldoauth")


def good_request(flags=0):
    said = service.variables("GET", "/.well-known/oauth-authorization-server", b"", {})
    return fastcgi.request_records(said, flags=flags)


class Staying(unittest.TestCase):
    def test_the_database_is_opened_once_for_many_requests(self):
        with one_process():
            client = register()
            with Opens() as opens:
                for _ in range(5):
                    pair = client.tokens()
                    self.assertEqual(whoami(pair["access_token"]).status, 200)
            self.assertEqual(opens.count, 0)

    def test_it_sees_what_other_processes_change(self):
        client = register()
        pair = client.tokens()
        with one_process() as process:
            self.assertEqual(whoami(pair["access_token"]).status, 200)
            service.carry(None)
            self.assertEqual(client.post("revoke", token=pair["access_token"]).status, 200)
            service.carry(process.request)
            self.assertEqual(whoami(pair["access_token"]).status, 401)

    def test_a_connection_can_bring_several_requests(self):
        with one_process() as process, process.connect() as connection:
            for _ in range(3):
                connection.sendall(good_request(KEEP))
                self.assertEqual(fastcgi.read_answer(connection).status, 200)

    def test_changed_settings_hold_from_the_next_request_on(self):
        with tempfile.TemporaryDirectory() as folder:
            for name in ("settings.json", "service.keys.json"):
                shutil.copy(os.path.join(service.RUN, name), folder)
            path = os.path.join(folder, "settings.json")
            with one_process(settings=path):
                metadata = "/.well-known/oauth-authorization-server"
                self.assertEqual(service.send("GET", metadata).json["issuer"], service.ISSUER)
                with open(path, encoding="utf-8") as file:
                    text = file.read()
                with open(path, "w", encoding="utf-8") as file:
                    file.write(text.replace("127.0.0.1", "localhost"))
                self.assertIn("localhost", service.send("GET", metadata).json["issuer"])
                os.rename(path, path + ".away")
                self.assertEqual(service.send("GET", metadata).status, 500)
                os.rename(path + ".away", path)
                self.assertEqual(service.send("GET", metadata).status, 200)


class Replaced(unittest.TestCase):
    """The file under the name is another one from some moment on."""

    def setUp(self):
        self.client = register()
        self.before = self.client.tokens()
        self.copy = service.DATABASE + ".copy"
        with contextlib.closing(sqlite3.connect(service.DATABASE)) as file, \
                contextlib.closing(sqlite3.connect(self.copy)) as copy:
            file.backup(copy)

    def tearDown(self):
        with contextlib.suppress(FileNotFoundError):
            os.remove(self.copy)

    def check(self, replace):
        with one_process():
            after = self.client.tokens()
            self.assertEqual(whoami(after["access_token"]).status, 200)
            replace()
            self.assertEqual(whoami(after["access_token"]).status, 401)
            self.assertEqual(whoami(self.before["access_token"]).status, 200)
            answer = self.client.refresh(self.before["refresh_token"])
            self.assertEqual(answer.status, 200, answer.text)
        self.assertEqual(whoami(answer.json["access_token"]).status, 200)

    def test_by_a_copy_under_its_name(self):
        self.check(lambda: os.rename(self.copy, service.DATABASE))

    def test_by_the_command_that_restores(self):
        restore = [TOOL, "restore", self.copy, "--yes"]
        runner = [os.environ["SERVICE_RUNNER"]] if os.environ.get("SERVICE_RUNNER") else []
        self.check(lambda: subprocess.run([*runner, *restore], check=True,
                                          stdout=subprocess.DEVNULL))

    def test_while_a_request_is_changing_it(self):
        # Before each of the changes that the request makes; the last round makes them all.
        for step in range(1, 40):
            self.setUp()
            code, verifier = self.client.log_in()
            with contextlib.closing(sqlite3.connect(service.DATABASE)) as file, \
                    contextlib.closing(sqlite3.connect(self.copy)) as copy:
                file.backup(copy)
            with one_process(LD_PRELOAD=os.environ["SERVICE_STEPS"],
                             SERVICE_REPLACE_AT=str(step), SERVICE_REPLACE_BY=self.copy,
                             SERVICE_REPLACED=service.DATABASE):
                answer = self.client.redeem(code, verifier)
            with self.subTest(step=step):
                self.assertEqual(answer.status, 200, answer.text)
                self.assertEqual(whoami(answer.json["access_token"]).status, 200)
            if os.path.exists(self.copy):
                self.assertGreater(step, 3)
                return
        self.fail("there is no end to the changes")

    def test_by_nothing_and_by_a_folder(self):
        with one_process():
            self.assertEqual(whoami(self.before["access_token"]).status, 200)
            os.rename(service.DATABASE, self.copy)
            self.assertEqual(whoami(self.before["access_token"]).status, 401)
            os.remove(service.DATABASE)
            os.mkdir(service.DATABASE)
            self.assertEqual(whoami(self.before["access_token"]).status, 500)
            os.rmdir(service.DATABASE)
            os.rename(self.copy, service.DATABASE)
            self.assertEqual(whoami(self.before["access_token"]).status, 200)


@contextlib.contextmanager
def small_medium():
    """The state folder on a medium that holds a few hundred pages, and a function
    that fills it."""
    mount = ["mount", "-n", "-t", "tmpfs", "-o", "size=512k,mode=700", "small", FOLDER]
    subprocess.run(mount, check=True)
    filler = os.path.join(FOLDER, "filler")

    def fill():
        with contextlib.suppress(OSError), open(filler, "wb", buffering=0) as file:
            while file.write(bytes(4096)) == 4096:
                pass

    try:
        yield fill, lambda: os.remove(filler)
    finally:
        subprocess.run(["umount", "-n", "-l", FOLDER], check=True)


class Media(unittest.TestCase):
    def test_a_full_one_is_survived(self):
        with one_process():
            register()
            with small_medium() as (fill, empty):
                client = register()
                pair = client.tokens()
                code, verifier = client.log_in()
                fill()
                for answer in (client.redeem(code, verifier),
                               client.refresh(pair["refresh_token"])):
                    self.assertEqual(answer.status, 500, answer.text)
                    self.assertIn("administrator", answer.text)
                self.assertEqual(whoami(pair["access_token"]).status, 200)
                empty()
                self.assertEqual(client.redeem(code, verifier).status, 200)
                self.assertEqual(client.refresh(pair["refresh_token"]).status, 200)
            register()

    def test_a_locked_file_is_waited_for_and_told(self):
        with one_process():
            pair = register().tokens()
            with locked():
                answer = whoami(pair["access_token"])
                self.assertEqual((answer.status, answer.headers["Retry-After"]), (503, "5"))
            self.assertEqual(whoami(pair["access_token"]).status, 200)


class Peers(unittest.TestCase):
    def test_one_that_was_killed_leaves_everything_as_it_was_or_done(self):
        client = register()
        hot = 0
        with one_process():
            for step in range(1, 40):
                pair = client.tokens()
                try:
                    with killed_at(step):
                        client.refresh(pair["refresh_token"])
                    break
                except Killed:
                    hot += os.path.exists(service.DATABASE + "-journal")
                with self.subTest(step=step):
                    good = whoami(pair["access_token"]).status == 200
                    again = client.refresh(pair["refresh_token"])
                    self.assertEqual(again.status, 200 if good else 400, again.text)
                client.post("revoke", token=pair["refresh_token"])
            else:
                self.fail("there is no end to the steps")
        self.assertGreater(hot, 3)

    def test_one_that_is_killed_itself_leaves_a_sound_file(self):
        process = Process()
        service.carry(process.request)
        try:
            client = register()
            pair = client.tokens()
        finally:
            service.carry(None)
        self.assertEqual(process.end(signal.SIGKILL), -signal.SIGKILL)
        self.assertEqual(whoami(pair["access_token"]).status, 200)
        self.assertGreater(rows("oauth_token"), 0)


class Lines(unittest.TestCase):
    """What no web server sends; afterwards the same process answers as before."""

    def assertSurvives(self, *pieces):
        with one_process() as process:
            for data in pieces:
                process.raw(data)
                with process.connect() as connection:
                    connection.sendall(good_request())
                    self.assertEqual(fastcgi.read_answer(connection).status, 200, data[:80])

    def test_a_request_that_ends_anywhere(self):
        body = b"grant_type=x"
        said = service.variables("POST", "/oauth/token", body, service.FORM)
        whole = fastcgi.request_records(said, body)
        self.assertSurvives(*(whole[:length] for length in range(0, len(whole), 7)))

    def test_noise(self):
        noise = random.Random(12)
        self.assertSurvives(*(noise.randbytes(noise.randrange(1, 400)) for _ in range(60)))

    def test_a_request_with_bytes_changed(self):
        noise = random.Random(7)
        whole = good_request()
        changed = []
        for _ in range(120):
            data = bytearray(whole)
            for _ in range(noise.randrange(1, 4)):
                data[noise.randrange(len(data))] = noise.randrange(256)
            changed.append(bytes(data))
        self.assertSurvives(*changed)

    def test_variables_that_are_longer_than_they_say(self):
        begin = record(BEGIN, struct.pack("!HB5x", RESPONDER, 0))
        for params in (b"\xff\xff\xff\xff\xff\xff\xff\xffx", b"\x7f\x7fx", b"\x80\0\0\x01\x80\0\0\x01",
                       b"\0\0" * 1000, b"\x01"):
            self.assertSurvives(begin + record(PARAMS, params) + record(PARAMS) + record(STDIN))

    def test_a_body_that_is_not_as_long_as_it_says(self):
        with one_process() as process:
            for length, status in (("50", 400), ("-1", 400), ("99999999999999999999", 413),
                                   ("16385", 413), ("", 401), ("1", 401)):
                said = service.variables("POST", "/oauth/token", b"", service.FORM)
                said["CONTENT_LENGTH"] = length
                with process.connect() as connection:
                    connection.sendall(fastcgi.request_records(said, b"a=%"))
                    answer = fastcgi.read_answer(connection)
                self.assertEqual(answer.status, status, length)

    def test_other_roles_and_aborted_requests(self):
        begin = record(BEGIN, struct.pack("!HB5x", 3, 0))
        aborted = record(BEGIN, struct.pack("!HB5x", RESPONDER, 0)) + record(fastcgi.ABORT)
        self.assertSurvives(begin + record(PARAMS) + record(STDIN), aborted,
                            record(fastcgi.GET_VALUES, b"\x0e\0FCGI_MAX_CONNS", request=0),
                            record(99, b"x", request=0))

    def test_a_web_server_that_does_not_wait_for_the_answer(self):
        with one_process() as process:
            for _ in range(20):
                with process.connect() as connection:
                    connection.sendall(good_request())
            with process.connect() as connection:
                connection.sendall(good_request())
                self.assertEqual(fastcgi.read_answer(connection).status, 200)


class Ending(unittest.TestCase):
    def test_between_requests_it_ends_at_once(self):
        process = Process()
        with process.connect() as connection:
            connection.sendall(good_request())
            fastcgi.read_answer(connection)
        self.assertEqual(process.end(), 0)

    def test_before_its_first_request_as_well(self):
        process = Process()
        while not os.path.exists(f"/proc/{process.child.pid}/exe"):
            time.sleep(0.01)
        self.assertIn(process.end(), (0, -signal.SIGTERM))

    def test_a_request_under_way_is_answered_first(self):
        pair = register().tokens()
        process = Process()
        answers = []

        def ask():
            service.carry(process.request)
            answers.append(whoami(pair["access_token"]))
            service.carry(None)

        with locked():
            asking = threading.Thread(target=ask)
            asking.start()
            self.wait_for_lock(process)
            process.child.send_signal(signal.SIGTERM)
            self.assertTrue(process.is_alive())
        asking.join()
        self.assertEqual([answer.status for answer in answers], [200])
        self.assertEqual(process.end(signal.SIGCONT), 0)
        with self.assertRaises((Gone, ConnectionError, FileNotFoundError)):
            process.request("GET", "/api/whoami", "", {})

    def wait_for_lock(self, process):
        """Until it has the file open, which it does to ask for the lock."""
        folder = f"/proc/{process.child.pid}/fd"
        while not any(self.leads_to(os.path.join(folder, name)) for name in os.listdir(folder)):
            time.sleep(0.01)

    @staticmethod
    def leads_to(link):
        with contextlib.suppress(OSError):
            return os.readlink(link) == service.DATABASE
        return False


if __name__ == "__main__":
    unittest.main()
