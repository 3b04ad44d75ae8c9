"""OpenID Connect by HTTP: by hand where that shows more, and with authlib,
unchanged, which checks every token against the published keys.
"""

import base64
import hashlib
import importlib.metadata
import json
import os
import subprocess
import time
import unittest

os.environ["AUTHLIB_INSECURE_TRANSPORT"] = "1"

import requests
from authlib.common.security import generate_token
from authlib.integrations.requests_client import OAuth2Session
from authlib.jose import JsonWebKey, jwt
from authlib.oidc.core import CodeIDToken
from authlib.oidc.discovery import OpenIDProviderMetadata

import service
from service import CALLBACK, ISSUER, consent, record, send

GOODBYE = "https://goodbye.example/done"


def configuration():
    return requests.get(ISSUER + "/.well-known/openid-configuration", timeout=30).json()


def register(**metadata):
    return service.register(scope="openid profile", post_logout_redirect_uris=[GOODBYE],
                            **metadata)


def keys(*words):
    """The command of the owner of the box."""
    command = [*os.environ["SERVICE_COMMAND"].split(), "--settings", service.RUN + "/settings.json",
               "keys", *words]
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


class ByHand(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register()

    def test_without_registration_of_a_scope_there_is_who_somebody_is(self):
        answer = service.register_raw({"redirect_uris": [CALLBACK]})
        self.assertEqual(answer.json["scope"], "openid profile")
        self.assertEqual(answer.json["id_token_signed_response_alg"], "RS256")

    def test_addresses_to_return_to_are_registered_and_answered(self):
        answer = service.register_raw({"redirect_uris": [CALLBACK],
                                       "post_logout_redirect_uris": [GOODBYE]})
        self.assertEqual(answer.json["post_logout_redirect_uris"], [GOODBYE])
        bad = service.register_raw({"redirect_uris": [CALLBACK],
                                    "post_logout_redirect_uris": ["javascript:alert(1)"]})
        self.assertEqual(bad.status, 400)

    def test_signature_is_the_one_that_was_registered(self):
        for asked, got in ((None, "RS256"), ("RS256", "RS256"), ("ES256", "ES256")):
            client = service.register(scope="openid", **(
                {
  "id_token_signed_response_alg" : asked} if asked else {}))
            head = client.tokens(scope="openid")["id_token"].split(".")[0]
            self.assertEqual(json.loads(base64.urlsafe_b64decode(head + "=="))["alg"], got)
        for bad in ("none", "HS256", "es256", 1):
            answer = service.register_raw({"redirect_uris": [CALLBACK],
                                           "id_token_signed_response_alg": bad})
            self.assertEqual((answer.status, answer.json["error"]),
                             (400, "invalid_client_metadata"), bad)

    def test_key_set_is_readable_by_scripts_of_any_origin(self):
        answer = send("GET", "/oauth/jwks", headers={"Origin": "https://app.example"})
        self.assertEqual(answer.headers["Access-Control-Allow-Origin"], "*")
        self.assertEqual({key["alg"] for key in answer.json["keys"]}, {"RS256", "ES256"})
        secret = {"d", "p", "q", "dp", "dq", "qi"}
        self.assertFalse(any(secret & set(key) for key in answer.json["keys"]))

    def test_names_that_the_box_does_not_know_are_left_out(self):
        tokens = self.client.tokens(scope="openid profile email offline_access")
        self.assertEqual(tokens["scope"], "openid profile")
        self.assertIn("id_token", tokens)

    def test_plain_login_is_signed_nothing(self):
        for scope in ("profile", None):
            self.assertNotIn("id_token", self.client.tokens(scope=scope))

    def test_code_that_comes_again_ends_what_userinfo_said(self):
        code, verifier = self.client.log_in(scope="openid")
        first = self.client.redeem(code, verifier).json
        self.assertEqual(send("GET", "/oauth/userinfo",
                              headers=service.bearer(first["access_token"])).json,
                         {"sub": "alice"})
        self.client.post("revoke", token=first["refresh_token"])
        self.assertEqual(send("GET", "/oauth/userinfo",
                              headers=service.bearer(first["access_token"])).status, 401)

    def test_signing_out_leads_back_to_a_registered_address_alone(self):
        tokens = self.client.tokens(scope="openid")
        query = {"id_token_hint": tokens["id_token"], "state": "s"}
        good = send("GET", "/oauth/logout?" + service.encode(
            {**query, "post_logout_redirect_uri": GOODBYE}))
        self.assertEqual(good.location, GOODBYE + "?state=s")
        bad = send("GET", "/oauth/logout?" + service.encode(
            {**query, "post_logout_redirect_uri": "https://evil.example/"}))
        self.assertEqual(bad.status, 400)


class Authlib(unittest.TestCase):
    NAME = "authlib " + importlib.metadata.version("authlib")

    @classmethod
    def setUpClass(cls):
        cls.client = register()
        cls.server = configuration()

    def log_in(self):
        session = OAuth2Session(self.client.id, self.client.secret, redirect_uri=CALLBACK,
                                scope="openid profile", code_challenge_method="S256")
        verifier, nonce = generate_token(48), generate_token(20)
        address, state = session.create_authorization_url(
            self.server["authorization_endpoint"], code_verifier=verifier, nonce=nonce)
        token = session.fetch_token(self.server["token_endpoint"], state=state,
                                    authorization_response=consent(address),
                                    code_verifier=verifier)
        return session, token, nonce

    def claims(self, token, nonce=None):
        published = requests.get(self.server["jwks_uri"], timeout=30).json()
        options = {"iss": {"values": [ISSUER]}, "aud": {"values": [self.client.id]}}
        claims = jwt.decode(token["id_token"], JsonWebKey.import_key_set(published),
                            claims_cls=CodeIDToken, claims_options=options,
                            claims_params={"nonce": nonce, "client_id": self.client.id,
                                           "access_token": token["access_token"]})
        claims.validate()
        return claims

    def test_discovery_is_valid(self):
        metadata = OpenIDProviderMetadata(self.server)
#The library wants the TLS that the tests do without.
        for name in ("issuer", "authorization_endpoint", "token_endpoint", "jwks_uri",
                     "registration_endpoint"):
            if name in metadata:
                metadata[name] = metadata[name].replace("http://", "https://")
        metadata.validate()
        record(self.NAME, "OpenID Connect: discovery")

    def test_login_with_a_token_that_says_who_it_is(self):
        _, token, nonce = self.log_in()
        claims = self.claims(token, nonce)
        self.assertEqual(claims["sub"], "alice")
        self.assertAlmostEqual(claims["auth_time"], time.time(), delta=60)
        record(self.NAME, "OpenID Connect: login")

    def test_userinfo(self):
        session, _, _ = self.log_in()
        self.assertEqual(session.get(self.server["userinfo_endpoint"]).json(),
                         {"sub": "alice", "preferred_username": "alice"})
        record(self.NAME, "OpenID Connect: userinfo")

    def test_refresh_says_it_again(self):
        session, old, _ = self.log_in()
        new = session.refresh_token(self.server["token_endpoint"],
                                    refresh_token=old["refresh_token"])
        self.assertEqual(self.claims(new)["sub"], "alice")

    def test_rotation_disturbs_nobody(self):
        _, before, nonce = self.log_in()
        keys("rotate")
        self.assertIn(" next,", keys("show"))
        self.assertEqual(self.claims(before, nonce)["sub"], "alice")
        _, after, nonce = self.log_in()
        self.assertEqual(self.claims(after, nonce)["sub"], "alice")
        head = [json.loads(base64.urlsafe_b64decode(token["id_token"].split(".")[0] + "=="))
                for token in (before, after)]
        self.assertEqual(head[0]["kid"], head[1]["kid"])

    def test_token_names_its_access_token(self):
        _, token, nonce = self.log_in()
        half = hashlib.sha256(token["access_token"].encode()).digest()[:16]
        self.assertEqual(self.claims(token, nonce)["at_hash"],
                         base64.urlsafe_b64encode(half).rstrip(b"=").decode())


if __name__ == "__main__":
    unittest.main()
