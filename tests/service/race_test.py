"""Many at once: whatever may happen only once happens once, and nobody is sent
away. SERVICE_ROUNDS says how often each race is run."""

import os
import threading
import unittest

import service
from service import register, whoami

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

    def test_many_log_in_at_once(self):
        client = register()
        tokens = together(LOGINS, lambda _: client.tokens())
        self.assertEqual(len({pair["access_token"] for pair in tokens}), LOGINS)
        answers = together(LOGINS, lambda i: whoami(tokens[i]["access_token"]))
        self.assertEqual({answer.status for answer in answers}, {200})

    def tearDown(self):
        self.assertEqual(service.secrets_in_error_log(), [])


if __name__ == "__main__":
    unittest.main()
