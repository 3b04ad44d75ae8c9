"""The two protected resources of examples/protected/ say the same of every token:
the one that stands on the library, and the one that asks the service."""

import http.client
import io
import os
import subprocess
import sys
import unittest

import service
from service import Answer, bearer, register
from trouble_test import locked

SOURCE = os.path.join(os.path.dirname(__file__), "../../examples/protected")
BUILD = os.path.dirname(os.environ["SERVICE_PROGRAMS"])
RUNNER = [os.environ["SERVICE_RUNNER"]] if os.environ.get("SERVICE_RUNNER") else []


def by_library(headers):
    environment = {"REQUEST_METHOD": "GET", "LD_LIBRARY_PATH": BUILD}
    if "Authorization" in headers:
        environment["HTTP_AUTHORIZATION"] = headers["Authorization"]
    done = subprocess.run([*RUNNER, os.path.join(BUILD, "albums")], env=environment, check=True,
                          stdout=subprocess.PIPE)
    output = io.BytesIO(done.stdout)
    status = int(output.readline().split()[1])
    return Answer(status, http.client.parse_headers(output), output.read())


class Protected(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register(scope="profile photos.read")
        own = register(scope="profile")
        path = os.path.join(service.RUN, "credentials")
        with open(path, "w", encoding="utf-8") as file:
            file.write(f"{own.id}:{own.secret}\n")
        # pylint: disable-next=consider-using-with
        cls.server = subprocess.Popen(
            [sys.executable, os.path.join(SOURCE, "introspected.py"), "0", service.ISSUER, path],
            stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        cls.port = int(cls.server.stdout.readline())

    @classmethod
    def tearDownClass(cls):
        cls.server.kill()
        cls.server.wait()
        cls.server.stdout.close()

    def by_introspection(self, headers):
        connection = http.client.HTTPConnection("127.0.0.1", self.port, timeout=60)
        try:
            connection.request("GET", "/albums", headers=headers)
            answer = connection.getresponse()
            return Answer(answer.status, answer.headers, answer.read())
        finally:
            connection.close()

    def assertBoth(self, headers, status, said=""):
        for ask in (by_library, self.by_introspection):
            answer = ask(headers)
            self.assertEqual(answer.status, status, ask)
            self.assertIn(said, answer.text + answer.headers.get("WWW-Authenticate", ""), ask)

    def test_a_token_with_the_scope_opens_it(self):
        pair = self.client.tokens("o'neil", scope="photos.read")
        self.assertBoth(bearer(pair["access_token"]), 200, "The albums of o'neil\n")

    def test_without_a_token_it_asks_for_one(self):
        self.assertBoth({}, 401, "Bearer realm=")
        self.assertBoth({"Authorization": "Basic eDp5"}, 401, "Bearer realm=")

    def test_another_token_does_not_open_it(self):
        pair = self.client.tokens(scope="photos.read")
        for text in ("x", "x" * 64, pair["refresh_token"], pair["access_token"] + "x"):
            self.assertBoth(bearer(text), 401, 'error="invalid_token"')

    def test_another_scope_does_not_open_it(self):
        pair = self.client.tokens(scope="profile")
        self.assertBoth(bearer(pair["access_token"]), 403, 'error="insufficient_scope"')

    def test_an_application_has_no_albums(self):
        own = self.client.post("token", grant_type="client_credentials", scope="photos.read").json
        self.assertBoth(bearer(own["access_token"]), 403, 'error="insufficient_scope"')

    def test_a_revoked_token_does_not_open_it_any_more(self):
        pair = self.client.tokens(scope="photos.read")
        self.assertBoth(bearer(pair["access_token"]), 200)
        self.client.post("revoke", token=pair["access_token"])
        self.assertBoth(bearer(pair["access_token"]), 401, 'error="invalid_token"')

    def test_nobody_is_told_that_a_token_is_bad_when_nobody_could_look(self):
        pair = self.client.tokens(scope="photos.read")
        with locked():
            self.assertBoth(bearer(pair["access_token"]), 503)
        self.assertBoth(bearer(pair["access_token"]), 200)


if __name__ == "__main__":
    unittest.main()
