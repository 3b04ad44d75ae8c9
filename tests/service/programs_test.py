"""Programs from the Debian archive that open a browser and wait for it on a port of
their own, unchanged."""

import base64
import json
import os
import pathlib
import re
import subprocess
import tempfile
import unittest
import urllib.parse

import service
from machine import free_port, version_of
from service import ISSUER, record

HERE = pathlib.Path(__file__).resolve().parent
BROWSER = str(HERE / "clients" / "browser")


class Program(unittest.TestCase):
    def setUp(self):
        home = tempfile.TemporaryDirectory()
        self.addCleanup(home.cleanup)
        # xdg-open asks a desktop first, where there is one.
        self.environment = {**os.environ, "HOME": home.name, "BROWSER": BROWSER, "DISPLAY": ""}

    def run_program(self, *words, said=""):
        try:
            done = subprocess.run(words, input=said, env=self.environment, timeout=60,
                                  capture_output=True, text=True, check=True)
        except (subprocess.CalledProcessError, subprocess.TimeoutExpired) as fault:
            with open(service.RUN + "/browser.log", "a+", encoding="utf-8") as log:
                log.seek(0)
                self.fail(f"{fault}\n{fault.stdout}\n{fault.stderr}\n{log.read()}")
        return done.stdout


class GitCredentialOauth(Program):
    """It asks for a token of OAuth, nothing of OpenID Connect."""
    NAME = "git-credential-oauth " + version_of("git-credential-oauth")

    def token_for(self, client):
        settings = {"oauthClientId": client.id, "oauthClientSecret": client.secret,
                    "oauthScopes": "profile", "oauthAuthURL": service.BASE + "/oauth/authorize",
                    "oauthTokenURL": service.BASE + "/oauth/token"}
        where = urllib.parse.urlsplit(ISSUER)
        host = f"{where.scheme}://{where.netloc}"
        for name, value in settings.items():
            if value:
                self.run_program("git", "config", "--global", f"credential.{host}.{name}", value)
        said = self.run_program("git-credential-oauth", "get",
                                said=f"protocol={where.scheme}\nhost={where.netloc}\n\n")
        return dict(line.split("=", 1) for line in said.splitlines())["password"]

    def test_public_at_a_port_that_it_was_given(self):
        client = service.register(redirect_uris=["http://127.0.0.1"],
                                  token_endpoint_auth_method="none")
        self.assertEqual(service.whoami(self.token_for(client)).json["sub"], "alice")
        record(self.NAME, "public, any port")
        record(self.NAME, "code with PKCE")

    def test_with_a_secret(self):
        client = service.register(redirect_uris=["http://127.0.0.1"])
        self.assertEqual(service.whoami(self.token_for(client)).json["sub"], "alice")
        record(self.NAME, "secret in the header")


class OidcAgent(Program):
    NAME = "oidc-agent " + version_of("oidc-agent-cli")

    def setUp(self):
        super().setUp()
        said = self.run_program("oidc-agent", "--always-allow-idtoken")
        self.environment.update(re.findall(r"^(\w+)=([^;]+);", said, re.MULTILINE))
        self.addCleanup(self.run_program, "oidc-agent", "--kill")

    def make(self, *more):
        return self.run_program(
            "oidc-gen", "box", "--iss", ISSUER, "--redirect-uri",
            f"http://localhost:{free_port()}", "--scope", "openid profile", "--flow", "code",
            "--pw-cmd", "echo password", "--confirm-default", "--prompt", "none", *more)

    def token(self, *more):
        return self.run_program("oidc-token", "box", *more).strip()

    def test_with_a_secret(self):
        client = service.register(redirect_uris=["http://localhost"], scope="openid profile")
        self.make("--client-id", client.id, "--client-secret", client.secret)
        self.assertEqual(service.whoami(self.token()).json["sub"], "alice")
        record(self.NAME, "code with PKCE")
        record(self.NAME, "OpenID Connect: discovery")

    def test_public_at_a_port_that_was_not_registered(self):
        client = service.register(redirect_uris=["http://localhost"], scope="openid profile",
                                  token_endpoint_auth_method="none")
        self.make("--client-id", client.id, "--client-secret", "")
        self.assertEqual(service.whoami(self.token()).json["sub"], "alice")
        record(self.NAME, "public, any port")

    def test_wants_a_scope_that_the_box_need_not_know(self):
        """Who may refresh is no matter of scope here."""
        with self.assertRaisesRegex(AssertionError, "Could not register the necessary scopes"):
            self.make("--at", service.INITIAL_TOKEN)

    def test_registers_itself(self):
        settings = pathlib.Path(service.RUN, "settings.json")
        before = settings.read_text(encoding="utf-8")
        known = json.loads(before)
        known["scopes"]["offline_access"] = "Stay logged in"
        settings.write_text(json.dumps(known), encoding="utf-8")
        self.addCleanup(settings.write_text, before, encoding="utf-8")
        self.make("--at", service.INITIAL_TOKEN)
        self.assertEqual(service.whoami(self.token()).json["sub"], "alice")
        record(self.NAME, "registration", "yes, where the box has the scope offline_access")

    def test_refresh(self):
        client = service.register(redirect_uris=["http://localhost"], scope="openid profile")
        self.make("--client-id", client.id, "--client-secret", client.secret)
        old = self.token()
        new = self.token("--force-new")
        self.assertNotEqual(new, old)
        self.assertEqual(service.whoami(new).json["sub"], "alice")
        record(self.NAME, "refresh")

    def test_id_token(self):
        client = service.register(redirect_uris=["http://localhost"], scope="openid profile")
        self.make("--client-id", client.id, "--client-secret", client.secret)
        claims = self.token("--id-token").split(".")[1]
        claims = json.loads(base64.urlsafe_b64decode(claims + "=" * (-len(claims) % 4)))
        self.assertEqual((claims["iss"], claims["sub"]), (ISSUER, "alice"))
        record(self.NAME, "OpenID Connect: login", "yes, the token handed on unread")

    def test_revocation(self):
        client = service.register(redirect_uris=["http://localhost"], scope="openid profile")
        self.make("--client-id", client.id, "--client-secret", client.secret)
        token = self.token()
        self.run_program("oidc-gen", "--delete", "box", "--pw-cmd", "echo password",
                         "--confirm-yes")
        self.assertEqual(service.whoami(token).status, 401)
        record(self.NAME, "revocation")


class Httr2(Program):
    """One run of R for all: it takes long to start."""
    NAME = "httr2 " + version_of("r-cran-httr2")

    @classmethod
    def setUpClass(cls):
        client = service.register(redirect_uris=["http://127.0.0.1/"])
        public = service.register(redirect_uris=["http://127.0.0.1/"],
                                  token_endpoint_auth_method="none")
        said = cls("run_program").in_r("httr2.R", client.id, client.secret, public.id)
        # With what it says to the person who waits in between.
        cls.got = dict(re.findall(r"^(\w+) (\S+) $", said, re.MULTILINE))
        cls.client = client

    def in_r(self, *words):
        self.setUp()
        try:
            return self.run_program("Rscript", "--vanilla", str(HERE / "clients" / words[0]),
                                    *words[1:])
        finally:
            self.doCleanups()

    def assert_is(self, way, user, feature):
        self.assertEqual(service.whoami(self.got[way]).json["sub"], user)
        record(self.NAME, feature)

    def test_secret_in_the_header(self):
        self.assert_is("header", "alice", "code with PKCE")
        self.assert_is("header", "alice", "secret in the header")

    def test_secret_in_the_body(self):
        self.assert_is("body", "alice", "secret in the body")

    def test_refresh(self):
        self.assertIn("Refresh_token_has_changed", self.got["oauth_flow_refresh"])
        self.assertEqual(service.whoami(self.got["refresh"]).json["sub"], "alice")
        record(self.NAME, "refresh", "yes, as req_oauth_auth_code() does it; oauth_flow_refresh() "
               "fails at a new refresh token, which RFC 6749, 6 allows")

    def test_public_on_the_port_that_it_draws(self):
        self.assert_is("public", "alice", "public, any port")

    def test_client_credentials(self):
        self.assert_is("credentials", self.client.id, "client credentials")

    def test_protected_resource(self):
        self.assertEqual(self.got["resource"], "alice")


if __name__ == "__main__":
    unittest.main(warnings="ignore")
