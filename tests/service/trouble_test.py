"""When the store cannot say, nobody is told that their token is bad: 503, with
Retry-After, and afterwards everything is as it was."""

import contextlib
import json
import os
import sqlite3
import threading
import unittest

import service
from service import as_user, challenge_of, register, send, whoami


@contextlib.contextmanager
def locked():
    file = sqlite3.connect(service.DATABASE, isolation_level=None, check_same_thread=False)
    file.execute("BEGIN EXCLUSIVE")
    try:
        yield
    finally:
        file.execute("ROLLBACK")
        file.close()


@contextlib.contextmanager
def limits(**values):
    with open(service.SETTINGS, "w", encoding="utf-8") as settings:
        json.dump(values, settings)
    try:
        yield
    finally:
        os.remove(service.SETTINGS)


@contextlib.contextmanager
def without_database():
    os.rename(service.DATABASE, service.DATABASE + ".away")
    os.mkdir(service.DATABASE)
    try:
        yield
    finally:
        os.rmdir(service.DATABASE)
        os.rename(service.DATABASE + ".away", service.DATABASE)


class Trouble(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register(scope="profile")

    def assertBusy(self, answer):
        self.assertEqual(answer.status, 503, answer.text)
        self.assertGreater(int(answer.headers["Retry-After"]), 0)
        self.assertNotIn("invalid", answer.text)

    def all_endpoints(self, pair, code, verifier):
        """Every request that needs the store, at the same time: each waits."""
        requests = [lambda: whoami(pair["access_token"]),
                    lambda: self.client.redeem(code, verifier),
                    lambda: self.client.refresh(pair["refresh_token"]),
                    lambda: self.client.post("introspect", token=pair["access_token"]),
                    lambda: self.client.post("revoke", token=pair["access_token"]),
                    lambda: self.client.post("token", grant_type="client_credentials"),
                    lambda: self.client.ask(challenge_of(verifier)),
                    lambda: send("GET", "/admin", headers=as_user("admin")),
                    lambda: service.register_raw({"redirect_uris": [service.CALLBACK]})]
        answers = [None] * len(requests)

        def run(index):
            answers[index] = requests[index]()

        threads = [threading.Thread(target=run, args=(i,)) for i in range(len(requests))]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()
        return answers

    def check_trouble(self, trouble):
        pair = self.client.tokens()
        code, verifier = self.client.log_in()
        with trouble():
            for answer in self.all_endpoints(pair, code, verifier):
                self.assertBusy(answer)
        self.assertEqual(whoami(pair["access_token"]).status, 200)
        self.assertEqual(self.client.redeem(code, verifier).status, 200)
        self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_locked_database(self):
        self.check_trouble(locked)

    def test_database_that_cannot_be_opened(self):
        self.check_trouble(without_database)

    def test_full_token_table_keeps_the_code(self):
        code, verifier = self.client.log_in()
        self.client.tokens()
        with limits(token_max=1):
            self.assertBusy(self.client.redeem(code, verifier))
            self.assertBusy(self.client.post("token", grant_type="client_credentials"))
        self.assertEqual(self.client.redeem(code, verifier).status, 200)

    def test_full_token_table_still_refreshes_within_it(self):
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("DELETE FROM oauth_token")
        pair = self.client.tokens()
        with limits(token_max=1):
            self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_overfull_token_table_keeps_the_refresh_token(self):
        pair = self.client.tokens()
        self.client.tokens()
        with limits(token_max=1):
            self.assertBusy(self.client.refresh(pair["refresh_token"]))
        self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_expired_tokens_make_room(self):
        code, verifier = self.client.log_in()
        self.client.tokens()
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("UPDATE oauth_token SET expired_time='1'")
        with limits(token_max=1):
            self.assertEqual(self.client.redeem(code, verifier).status, 200)

    def test_worthless_tokens_go_before_those_that_can_be_renewed(self):
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("DELETE FROM oauth_token")
        idle = self.client.tokens()
        forgotten = self.client.tokens()
        self.client.post("token", grant_type="client_credentials")
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("UPDATE oauth_token SET expired_time=CAST(unixepoch()-60 AS text)")
            file.execute("UPDATE oauth_token SET expired_time='1' WHERE access_token=?",
                         (forgotten["access_token"],))
        with limits(token_max=3):
            live = [self.client.tokens(), self.client.tokens()]
        for pair in (idle, *live):
            self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_full_code_table_is_said_to_the_user(self):
        page = self.client.ask(challenge_of("v" * 43))
        self.client.log_in()
        with limits(grantcode_max=1):
            self.assertBusy(self.client.decide(page))
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("UPDATE oauth_grantCode SET expired_time='1'")
        with limits(grantcode_max=1):
            self.assertEqual(self.client.decide(page).status, 303)

    def test_full_registry_refuses_registration(self):
        with limits(client_info_max=1):
            self.assertBusy(service.register_raw({"redirect_uris": [service.CALLBACK]}))

    def tearDown(self):
        self.assertEqual(service.secrets_in_error_log(), [])


if __name__ == "__main__":
    unittest.main()
