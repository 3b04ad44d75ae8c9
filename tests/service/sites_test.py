"""Web sites that let people in with the service, by clients from the Debian archive,
unchanged."""

import json
import pathlib
import subprocess
import unittest
import urllib.parse

from social_core.backends.open_id_connect import OpenIdConnectAuth
from social_core.storage import AssociationMixin, BaseStorage
from social_core.strategy import BaseStrategy

import service
from machine import version_of
from person import Person, register_without_pkce
from service import ISSUER, record

HERE = pathlib.Path(__file__).resolve().parent
HOME = "http://127.0.0.1:9"  # where nobody listens
WITHOUT_PKCE = "no, this version has none: the owner allowed it to do without"


class Storage(BaseStorage):
    """Of the nonces that the visitor has been sent with."""

    class association(AssociationMixin):
        kept = []

        @classmethod
        def store(cls, server_url, association):
            association.id, association.server_url = len(cls.kept), server_url
            cls.kept.append(association)

        @classmethod
        def get(cls, server_url, handle):
            return [one for one in cls.kept
                    if one and (one.server_url, one.handle) == (server_url, handle)]

        @classmethod
        def remove(cls, ids_to_delete):
            for index in ids_to_delete:
                cls.kept[index] = None


class Site(BaseStrategy):
    """What a web framework does for social-auth: the settings, and one visitor."""

    def __init__(self, **settings):
        super().__init__(Storage)
        self.settings, self.session, self.request = settings, {}, {}

    def get_setting(self, name):
        return self.settings[name]

    def session_get(self, name, default=None):
        return self.session.get(name, default)

    def session_set(self, name, value):
        self.session[name] = value

    def session_pop(self, name):
        return self.session.pop(name, None)

    def request_data(self, merge=True):
        return self.request

    def redirect(self, url):
        return url

    def build_absolute_uri(self, path=None):
        return urllib.parse.urljoin(HOME, path)

    def authenticate(self, backend, *args, **kwargs):
        """Who came: the steps after that are the framework's."""
        return kwargs["response"]


class SocialAuth(unittest.TestCase):
    """It does not know PKCE: the owner has to allow that."""
    NAME = "social-auth-core " + version_of("python3-social-auth-core")

    @classmethod
    def setUpClass(cls):
        cls.client = register_without_pkce("social-auth", HOME + "/complete/oidc/",
                                           "openid profile")

    def log_in(self, **settings):
        site = Site(SOCIAL_AUTH_OIDC_KEY=self.client.id, SOCIAL_AUTH_OIDC_SECRET=self.client.secret,
                    SOCIAL_AUTH_OIDC_OIDC_ENDPOINT=ISSUER, **settings)
        backend = OpenIdConnectAuth(site, redirect_uri=HOME + "/complete/oidc/")
        address = backend.start()
        self.assertNotIn("code_challenge", address)
        back, _ = Person().go(address, until=HOME)
        site.request = backend.data = dict(
            urllib.parse.parse_qsl(urllib.parse.urlsplit(back).query))
        return backend, backend.auth_complete()

    def test_discovery_and_login(self):
        backend, _ = self.log_in()
        self.assertEqual(backend.id_token["sub"], "alice")
        self.assertEqual(backend.id_token["aud"], self.client.id)
        record(self.NAME, "OpenID Connect: discovery")
        record(self.NAME, "OpenID Connect: login")
        record(self.NAME, "code with PKCE", WITHOUT_PKCE)
        record(self.NAME, "secret in the header")

    def test_secret_in_the_body(self):
        backend, _ = self.log_in(SOCIAL_AUTH_OIDC_TOKEN_ENDPOINT_AUTH_METHOD="client_secret_post")
        self.assertEqual(backend.id_token["sub"], "alice")
        record(self.NAME, "secret in the body")

    def test_userinfo(self):
        backend, came = self.log_in()
        self.assertEqual(backend.get_user_details(came)["username"], "alice")
        record(self.NAME, "OpenID Connect: userinfo")

    def test_refresh(self):
        backend, came = self.log_in()
        new = backend.refresh_token(came["refresh_token"])
        self.assertEqual(service.whoami(new["access_token"]).json["sub"], "alice")
        record(self.NAME, "refresh")


class Omniauth(unittest.TestCase):
    """Debian has the branch of it that GitLab keeps. It does not know PKCE either."""
    NAME = "omniauth-openid-connect (GitLab's) " + version_of("ruby-omniauth-openid-connect")

    @classmethod
    def setUpClass(cls):
        cls.client = register_without_pkce("omniauth", HOME + "/auth/box/callback",
                                           "openid profile")

    def setUp(self):
        self.person = Person()

    def log_in(self, *method):
        """Who came, as the site has it, and where it leads who leaves."""
        site = subprocess.Popen(
            ["ruby", str(HERE / "clients" / "omniauth.rb"), HOME, self.client.id,
             self.client.secret, *method],
            stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)

        def visit(path):
            site.stdin.write(path + "\n")
            site.stdin.flush()
            return json.loads(site.stdout.readline() or "null")

        try:
            _, address, _ = visit("/auth/box")
            self.assertNotIn("code_challenge", address)
            back, _ = self.person.go(address, until=HOME)
            _, failed, body = visit(back.removeprefix(HOME))
            self.assertIsNone(failed)
            _, leaving, _ = visit("/auth/box/logout")
            return json.loads(body), leaving
        finally:
            _, complaints = site.communicate(timeout=30)
            print(complaints, end="")

    def test_discovery_and_login(self):
        came, _ = self.log_in()
        self.assertEqual(came["uid"], "alice")
        record(self.NAME, "OpenID Connect: discovery")
        record(self.NAME, "OpenID Connect: login")
        record(self.NAME, "code with PKCE", WITHOUT_PKCE)
        record(self.NAME, "secret in the header")
        self.assertEqual(came["info"]["nickname"], "alice")
        record(self.NAME, "OpenID Connect: userinfo")

    def test_secret_in_the_body(self):
        came, _ = self.log_in("client_secret_post")
        self.assertEqual(came["uid"], "alice")
        record(self.NAME, "secret in the body")

    def test_logout(self):
        _, leaving = self.log_in()
        _, page = self.person.go(leaving)
        self.assertIn("You are signed out", page.text)
        record(self.NAME, "OpenID Connect: sign-out", "yes, without an address to return to")


if __name__ == "__main__":
    unittest.main(warnings="ignore")
