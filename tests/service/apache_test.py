"""Apache's modules from the Debian archive, unchanged: one lets people in to a web
site, the other looks after a resource that takes tokens."""

import json
import pathlib
import secrets
import shutil
import socket
import subprocess
import tempfile
import time
import unittest
import urllib.parse

import requests

import service
from machine import free_port, version_of
from person import Person
from service import ISSUER, record

CONF = """
ServerRoot {folder}
ServerName 127.0.0.1
Listen 127.0.0.1:{port}
PidFile {folder}/pid
Mutex file:{folder}
ErrorLog {folder}/error.log
DocumentRoot {folder}/site
LoadModule mpm_prefork_module /usr/lib/apache2/modules/mod_mpm_prefork.so
LoadModule authn_core_module /usr/lib/apache2/modules/mod_authn_core.so
LoadModule authz_core_module /usr/lib/apache2/modules/mod_authz_core.so
LoadModule authz_user_module /usr/lib/apache2/modules/mod_authz_user.so
LoadModule headers_module /usr/lib/apache2/modules/mod_headers.so
LoadModule auth_openidc_module /usr/lib/apache2/modules/mod_auth_openidc.so
LoadModule oauth2_module /usr/lib/apache2/modules/mod_oauth2.so
StartServers 1
MinSpareServers 1
MaxRequestWorkers 4
# Who came, for the test to see.
Header set X-User "expr=%{{REMOTE_USER}}"
{rest}
"""

SITE = """
OIDCProviderMetadataURL {issuer}/.well-known/openid-configuration
OIDCClientID {client.id}
OIDCClientSecret {client.secret}
OIDCProviderTokenEndpointAuth {method}
OIDCPKCEMethod S256
OIDCScope "openid profile email"
OIDCRedirectURI {home}/private/back
OIDCCryptoPassphrase 0123456789abcdef
OIDCRemoteUserClaim preferred_username
OIDCPassClaimsAs environment
OIDCPassUserInfoAs claims json
OIDCCacheShmMax 16
Header set X-Userinfo "expr=%{{reqenv:OIDC_userinfo_json}}"
<Location /private>
  AuthType openid-connect
  Require valid-user
</Location>
"""

RESOURCE = """
<Location /introspected>
  AuthType oauth2
  OAuth2TokenVerify introspect {issuer}/oauth/introspect {ask}
  OAuth2TargetPass remote_user_claim=username
  Require oauth2_claim scope:photos.read
</Location>
<Location /described>
  AuthType oauth2
  OAuth2TokenVerify metadata {issuer}/.well-known/openid-configuration {described}
  OAuth2TargetPass remote_user_claim=username
  Require oauth2_claim scope:photos.read
</Location>
"""


class Apache:
    """A server of its own, in the foreground, as nobody in particular."""

    def __init__(self, port, rest):
        self.folder = pathlib.Path(tempfile.mkdtemp())
        site = self.folder / "site"
        for page in ("private", "introspected", "described"):
            (site / page).mkdir(parents=True)
            (site / page / "index").write_text("the page", encoding="utf-8")
        conf = self.folder / "apache.conf"
        conf.write_text(CONF.format(folder=self.folder, port=port, rest=rest), encoding="utf-8")
        self.home = f"http://127.0.0.1:{port}"
        self.server = subprocess.Popen(
            ["unshare", "--user", "--map-user=33", "--map-group=33",
             "setpriv", "--pdeathsig", "TERM", "/usr/sbin/apache2", "-f", str(conf),
             "-DFOREGROUND"],
            start_new_session=True)  # it ends its whole process group with itself
        self.wait(port)

    def wait(self, port):
        for _ in range(300):
            assert self.server.poll() is None, self.log()
            try:
                return socket.create_connection(("127.0.0.1", port)).close()
            except ConnectionRefusedError:
                time.sleep(0.1)
        raise AssertionError(self.log())

    def log(self):
        log = self.folder / "error.log"
        return log.read_text(encoding="utf-8", errors="replace") if log.exists() else ""

    def stop(self):
        self.server.terminate()
        self.server.wait(30)
        shutil.rmtree(self.folder)


class RelyingParty(unittest.TestCase):
    NAME = "mod_auth_openidc " + version_of("libapache2-mod-auth-openidc")

    def site(self, method="client_secret_basic", **more):
        port = free_port()
        home = f"http://127.0.0.1:{port}"
        client = service.register(redirect_uris=[home + "/private/back"], scope="openid profile",
                                  post_logout_redirect_uris=[home + "/bye"], **more)
        apache = Apache(port, SITE.format(issuer=ISSUER, home=home, client=client, method=method))
        self.addCleanup(apache.stop)
        return apache

    def assert_in(self, apache, person):
        address, answer = person.go(apache.home + "/private/index")
        self.assertEqual((answer.status_code, answer.text), (200, "the page"),
                         (address, answer.text, apache.log()))
        self.assertEqual(answer.headers["X-User"], "alice")
        self.assertEqual(json.loads(answer.headers["X-Userinfo"])["sub"], "alice")

    def test_login(self):
        apache, person = self.site(), Person()
        self.assert_in(apache, person)
        self.assert_in(apache, person)
        for feature in ("OpenID Connect: discovery", "OpenID Connect: login", "code with PKCE",
                        "secret in the header", "issuer in the response",
                        "OpenID Connect: userinfo"):
            record(self.NAME, feature)

    def test_secret_in_the_body(self):
        self.assert_in(self.site("client_secret_post"), Person())
        record(self.NAME, "secret in the body")

    def test_logout(self):
        apache, person = self.site(), Person()
        self.assert_in(apache, person)
        back = urllib.parse.quote(apache.home + "/bye", safe="")
        address, answer = person.go(f"{apache.home}/private/back?logout={back}",
                                    until=apache.home + "/bye")
        self.assertTrue(address.startswith(apache.home + "/bye"), (address, answer.text))
        again = person.get(apache.home + "/private/index", allow_redirects=False)
        self.assertTrue(again.headers["location"].startswith(ISSUER))
        record(self.NAME, "OpenID Connect: sign-out")


class ProtectedResource(unittest.TestCase):
    NAME = "mod_oauth2 " + version_of("libapache2-mod-oauth2")

    @classmethod
    def setUpClass(cls):
        cls.client = service.register(scope="photos.read profile")
        cls.resource = service.register(redirect_uris=[], grant_types=["client_credentials"])
        secret = {"client_id": cls.resource.id, "client_secret": cls.resource.secret}
        ask = service.encode({"introspect.auth": "client_secret_basic", **secret})
        cls.apache = Apache(free_port(), RESOURCE.format(issuer=ISSUER, ask=ask, described=ask))
        cls.addClassCleanup(cls.apache.stop)

    def token(self, scope):
        verifier = secrets.token_urlsafe(48)
        question = self.client.question(service.challenge_of(verifier), scope=scope)
        back, _ = Person().go(f"{ISSUER}/oauth/authorize?{service.encode(question)}",
                              until=service.CALLBACK)
        code = urllib.parse.parse_qs(urllib.parse.urlsplit(back).query)["code"][0]
        return self.client.redeem(code, verifier).json["access_token"]

    def ask(self, path, token):
        return requests.get(f"{self.apache.home}/{path}/index", timeout=30,
                            headers=service.bearer(token))

    def test_introspection(self):
        for path in ("introspected", "described"):
            with self.subTest(path):
                good = self.token("photos.read")
                answer = self.ask(path, good)
                self.assertEqual((answer.status_code, answer.text), (200, "the page"),
                                 self.apache.log())
                self.assertEqual(answer.headers["X-User"], "alice")
                narrow = self.token("profile")
                self.assertIn(self.ask(path, narrow).status_code, (401, 403))
                self.assertEqual(self.ask(path, "nothing").status_code, 401)
        record(self.NAME, "introspection")


if __name__ == "__main__":
    unittest.main(warnings="ignore")
