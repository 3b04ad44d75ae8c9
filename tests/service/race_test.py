"""Many at once: whatever may happen only once happens once, and nobody is sent
away. SERVICE_ROUNDS says how often each race is run."""

import os
import threading
import unittest

import service
from service import FORM, Form, as_user, encode, register, send, whoami

ROUNDS = int(os.environ.get("SERVICE_ROUNDS", "12"))
RUNNERS = 16
# Fifty emulated programs would take longer than each may wait for the database.
LOGINS = 10 if os.environ.get("SERVICE_RUNNER") else 50


def together(count, work):
    """The results of `count` threads that start at the same moment."""
    start, results = threading.Barrier(count), [None] * count

    def run(index):
        start.wait()
        try:
            results[index] = work(index)
        except Exception as error:  # pylint: disable=broad-except
            results[index] = error

    threads = [threading.Thread(target=run, args=(index,)) for index in range(count)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    failed = [result for result in results if isinstance(result, Exception)]
    assert not failed, failed
    return results


class Races(unittest.TestCase):
    def assertOneWins(self, answers):
        won = [answer for answer in answers if answer.status == 200]
        lost = [answer for answer in answers if answer.status != 200]
        self.assertEqual(len(won), 1, [answer.status for answer in answers])
        self.assertEqual({(answer.status, answer.json["error"]) for answer in lost},
                         {(400, "invalid_grant")})
        return won[0].json

    def tidy(self, client, pair):
        self.assertEqual(client.post("revoke", token=pair["access_token"]).status, 200)

    def test_one_code_gives_one_token(self):
        client = register()
        for _ in range(ROUNDS):
            code, verifier = client.log_in()
            pair = self.assertOneWins(together(RUNNERS, lambda _: client.redeem(code, verifier)))
            self.assertEqual(whoami(pair["access_token"]).status, 200)
            self.tidy(client, pair)

    def test_one_refresh_token_gives_one_pair(self):
        client = register()
        for _ in range(ROUNDS):
            old = client.tokens()
            pair = self.assertOneWins(
                together(RUNNERS, lambda _: client.refresh(old["refresh_token"])))
            self.assertEqual(whoami(pair["access_token"]).status, 200)
            self.assertEqual(whoami(old["access_token"]).status, 401)
            self.tidy(client, pair)

    def test_what_was_revoked_while_it_was_refreshed_is_gone(self):
        client = register()
        for _ in range(ROUNDS):
            old = client.tokens()["refresh_token"]
            refreshed, revoked = together(
                2, lambda i: (client.post("revoke", token=old) if i else client.refresh(old)))
            self.assertEqual(revoked.status, 200)
            self.assertGone(client, refreshed)

    def test_what_the_administrator_ended_while_it_was_refreshed_is_gone(self):
        client = register()
        page = send("GET", "/admin?view=register", headers=as_user("admin"))
        form = {**Form(page.text).fields, "action": "revoke", "client": client.id, "user": "alice"}
        for _ in range(ROUNDS):
            old = client.tokens()["refresh_token"]
            refreshed, revoked = together(
                2, lambda i: (send("POST", "/admin", encode(form), {**FORM, **as_user("admin")})
                              if i else client.refresh(old)))
            self.assertIn("done=revoked", revoked.location)
            self.assertGone(client, refreshed)

    def assertGone(self, client, refreshed):
        if refreshed.status == 200:
            pair = refreshed.json
            self.assertEqual(whoami(pair["access_token"]).status, 401)
            self.assertEqual(client.refresh(pair["refresh_token"]).status, 400)
        else:
            self.assertEqual((refreshed.status, refreshed.json["error"]), (400, "invalid_grant"))

    def test_many_log_in_at_once(self):
        clients = [register() for _ in range(LOGINS)]
        tokens = together(LOGINS, lambda i: clients[i].tokens())
        self.assertEqual(len({pair["access_token"] for pair in tokens}), LOGINS)
        answers = together(LOGINS, lambda i: whoami(tokens[i]["access_token"]))
        self.assertEqual({answer.status for answer in answers}, {200})

    def tearDown(self):
        self.assertEqual(service.secrets_in_error_log(), [])


if __name__ == "__main__":
    unittest.main()
