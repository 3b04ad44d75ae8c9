"""When the store cannot do it, nobody is told that their token is bad: 503, with
Retry-After when it is busy, 500 when somebody has to look after it; and afterwards
everything is as it was."""

import contextlib
import json
import os
import sqlite3
import threading
import unittest

import service
from service import FORM, Form, as_user, challenge_of, encode, later, register, send, whoami


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


def admin_registers():
    page = send("GET", "/admin?view=register", headers=as_user("admin"))
    form = {"action": "register", "form_token": Form(page.text).fields["form_token"],
            "name": "One more", "redirect": service.CALLBACK, "scope.profile": "1"}
    return send("POST", "/admin", encode(form), {**FORM, **as_user("admin")})


class Trouble(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register(scope="profile")

    def assertBusy(self, answer):
        self.assertEqual(answer.status, 503, answer.text)
        self.assertGreater(int(answer.headers["Retry-After"]), 0)
        self.assertIn("busy", answer.text)
        self.assertNotIn("invalid", answer.text)

    def assertFull(self, answer):
        self.assertEqual(answer.status, 503, answer.text)
        self.assertIn("no room", answer.text)
        self.assertNotIn("busy", answer.text)
        self.assertNotIn("Retry-After", answer.headers)

    def assertBroken(self, answer):
        self.assertEqual(answer.status, 500, answer.text)
        self.assertIn("administrator has to look after it", answer.text)
        self.assertNotIn("invalid", answer.text)
        self.assertNotIn("Retry-After", answer.headers)

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

    def check_trouble(self, trouble, check):
        pair = self.client.tokens()
        code, verifier = self.client.log_in()
        with trouble():
            for answer in self.all_endpoints(pair, code, verifier):
                check(answer)
        self.assertEqual(whoami(pair["access_token"]).status, 200)
        self.assertEqual(self.client.redeem(code, verifier).status, 200)
        self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_locked_database(self):
        self.check_trouble(locked, self.assertBusy)

    def test_database_that_cannot_be_opened(self):
        self.check_trouble(without_database, self.assertBroken)

    def empty(self, table):
        with sqlite3.connect(service.DATABASE) as file:
            file.execute(f"DELETE FROM {table}")

    def test_table_full_of_others_tokens_keeps_the_code(self):
        self.empty("oauth_token")
        code, verifier = self.client.log_in()
        others = [(client, client.tokens("bob")) for client in (register(), register())]
        with limits(token_max=2):
            self.assertFull(self.client.redeem(code, verifier))
            self.assertFull(self.client.post("token", grant_type="client_credentials"))
        self.assertEqual(self.client.redeem(code, verifier).status, 200)
        for client, pair in others:
            self.assertEqual(client.refresh(pair["refresh_token"]).status, 200)

    def test_refreshing_needs_no_room(self):
        self.empty("oauth_token")
        pairs = [self.client.tokens(), self.client.tokens()]
        with limits(token_max=1):
            for pair in pairs:
                self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 200)

    def test_dead_tokens_make_room(self):
        self.empty("oauth_token")
        others = [register().tokens("bob"), register().tokens("bob")]
        year = 365 * 24 * 60 * 60
        with limits(token_max=2), later(year + 60):
            self.assertEqual(self.client.redeem(*self.client.log_in()).status, 200)
        for pair in others:
            self.assertEqual(whoami(pair["access_token"]).status, 401)

    def test_worthless_tokens_go_and_those_that_can_be_renewed_stay(self):
        self.empty("oauth_token")
        robot, idle_client = register(), register()
        robot.post("token", grant_type="client_credentials")
        idle = idle_client.tokens("bob")
        with limits(token_max=2), later(3600):
            live = self.client.tokens()
            self.assertFull(register().post("token", grant_type="client_credentials"))
            for client, pair in ((idle_client, idle), (self.client, live)):
                self.assertEqual(client.refresh(pair["refresh_token"]).status, 200)

    def test_full_code_table_is_said_to_the_user(self):
        self.empty("oauth_grantCode")
        page = self.client.ask(challenge_of("v" * 43))
        register().log_in("bob")
        with limits(grantcode_max=1):
            self.assertFull(self.client.decide(page))
            with later(700):
                page = self.client.ask(challenge_of("v" * 43))
                self.assertEqual(self.client.decide(page).status, 303)

    def test_full_registry_says_that_it_is_full(self):
        for _ in range(2):
            register().tokens()
        with limits(client_info_max=1):
            self.assertFull(service.register_raw({"redirect_uris": [service.CALLBACK]}))
            answer = admin_registers()
            self.assertEqual(answer.status, 400)
            self.assertIn("There is no room for another application", answer.text)

    def tearDown(self):
        self.assertEqual(service.secrets_in_error_log(), [])


if __name__ == "__main__":
    unittest.main()
