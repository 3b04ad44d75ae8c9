"""Clients from the Debian archive, unchanged, do with the service what they can.

What a library has no call for is tried with the nearest one it has, or left
out; record() says which.
"""

import importlib.metadata
import os
import unittest

os.environ["OAUTHLIB_INSECURE_TRANSPORT"] = "1"
os.environ["AUTHLIB_INSECURE_TRANSPORT"] = "1"

import requests
from authlib.common.security import generate_token
from authlib.integrations.requests_client import OAuth2Session
from authlib.oauth2.rfc7636 import create_s256_code_challenge
from authlib.oauth2.rfc8414 import AuthorizationServerMetadata
from oauthlib.oauth2 import BackendApplicationClient, WebApplicationClient
from requests_oauthlib import OAuth2Session as RequestsSession

import service
from service import CALLBACK, ISSUER, consent, record

WELL_KNOWN = service.well_known("oauth-authorization-server")


def metadata():
    return requests.get(WELL_KNOWN, timeout=30).json()


class Authlib(unittest.TestCase):
    NAME = "authlib " + importlib.metadata.version("authlib")

    @classmethod
    def setUpClass(cls):
        cls.server = AuthorizationServerMetadata(metadata())
        cls.client = service.register(scope="profile files.read")

    def session(self, **more):
        return OAuth2Session(self.client.id, self.client.secret, redirect_uri=CALLBACK,
                             scope="profile", **more)

    def log_in(self, method="client_secret_basic"):
        session = self.session(code_challenge_method="S256", token_endpoint_auth_method=method)
        verifier = generate_token(48)
        address, state = session.create_authorization_url(
            self.server["authorization_endpoint"], code_verifier=verifier)
        token = session.fetch_token(self.server["token_endpoint"], state=state,
                                    authorization_response=consent(address),
                                    code_verifier=verifier)
        return session, token

    def test_metadata_is_valid(self):
        self.server.validate()
        record(self.NAME, "metadata")

    def test_code_with_pkce(self):
        session, _ = self.log_in()
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], "alice")
        record(self.NAME, "code with PKCE")
        record(self.NAME, "secret in the header")

    def test_secret_in_the_body(self):
        _, token = self.log_in("client_secret_post")
        self.assertEqual(token["scope"], "profile")
        record(self.NAME, "secret in the body")

    def test_refresh(self):
        session, old = self.log_in()
        new = session.refresh_token(self.server["token_endpoint"],
                                    refresh_token=old["refresh_token"])
        self.assertNotEqual(new["access_token"], old["access_token"])
        self.assertEqual(session.get(ISSUER + "/api/whoami").status_code, 200)
        record(self.NAME, "refresh")

    def test_client_credentials(self):
        session = self.session()
        session.fetch_token(self.server["token_endpoint"], grant_type="client_credentials")
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], self.client.id)
        record(self.NAME, "client credentials")

    def test_introspection(self):
        session, token = self.log_in()
        seen = session.introspect_token(self.server["introspection_endpoint"],
                                        token=token["access_token"])
        self.assertIs(seen.json()["active"], True)
        record(self.NAME, "introspection")

    def test_revocation(self):
        session, token = self.log_in()
        answer = session.revoke_token(self.server["revocation_endpoint"],
                                      token=token["access_token"])
        self.assertEqual(answer.status_code, 200)
        self.assertEqual(service.whoami(token["access_token"]).status, 401)
        record(self.NAME, "revocation")


class WithoutASecret(unittest.TestCase):
    """As a native application: public, at whatever port its system gave it."""

    REDIRECT = "http://127.0.0.1:51004/cb"

    @classmethod
    def setUpClass(cls):
        cls.server = metadata()
        cls.client = service.register(token_endpoint_auth_method="none",
                                      redirect_uris=["http://127.0.0.1/cb"])

    def test_authlib(self):
        session = OAuth2Session(self.client.id, redirect_uri=self.REDIRECT, scope="profile",
                                code_challenge_method="S256", token_endpoint_auth_method="none")
        verifier = generate_token(48)
        address, state = session.create_authorization_url(
            self.server["authorization_endpoint"], code_verifier=verifier)
        old = session.fetch_token(self.server["token_endpoint"], state=state,
                                  authorization_response=consent(address),
                                  code_verifier=verifier)
        session.refresh_token(self.server["token_endpoint"], refresh_token=old["refresh_token"])
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], "alice")
        record(Authlib.NAME, "public, any port")

    def test_requests_oauthlib(self):
        session = RequestsSession(self.client.id, redirect_uri=self.REDIRECT, scope=["profile"])
        verifier = generate_token(48)
        address, _ = session.authorization_url(
            self.server["authorization_endpoint"], code_challenge_method="S256",
            code_challenge=create_s256_code_challenge(verifier))
        session.fetch_token(self.server["token_endpoint"], code_verifier=verifier,
                            authorization_response=consent(address), include_client_id=True)
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], "alice")
        record(RequestsOauthlib.NAME, "public, any port")


class RequestsOauthlib(unittest.TestCase):
    NAME = "requests-oauthlib " + importlib.metadata.version("requests-oauthlib")

    @classmethod
    def setUpClass(cls):
        cls.server = metadata()
        cls.client = service.register(scope="profile files.read")

    def log_in(self, **how):
        session = RequestsSession(self.client.id, redirect_uri=CALLBACK, scope=["profile"])
        verifier = generate_token(48)
        address, _ = session.authorization_url(
            self.server["authorization_endpoint"], code_challenge_method="S256",
            code_challenge=create_s256_code_challenge(verifier))
        token = session.fetch_token(self.server["token_endpoint"], code_verifier=verifier,
                                    authorization_response=consent(address),
                                    client_secret=self.client.secret, **how)
        return session, token

    def test_code_with_pkce(self):
        session, _ = self.log_in()
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], "alice")
        record(self.NAME, "code with PKCE", "yes, the challenge made by hand")
        record(self.NAME, "secret in the header")

    def test_secret_in_the_body(self):
        _, token = self.log_in(include_client_id=True)
        self.assertEqual(token["scope"], ["profile"])
        record(self.NAME, "secret in the body")

    def test_refresh(self):
        session, old = self.log_in()
        new = session.refresh_token(self.server["token_endpoint"],
                                    auth=(self.client.id, self.client.secret))
        self.assertNotEqual(new["access_token"], old["access_token"])
        record(self.NAME, "refresh")

    def test_client_credentials(self):
        session = RequestsSession(client=BackendApplicationClient(self.client.id,
                                                                  scope=["profile"]))
        session.fetch_token(self.server["token_endpoint"], client_secret=self.client.secret)
        self.assertEqual(session.get(ISSUER + "/api/whoami").json()["sub"], self.client.id)
        record(self.NAME, "client credentials")

    def test_revocation(self):
        _, token = self.log_in()
        # The library insists on https where it only composes a request.
        address, headers, body = WebApplicationClient(
            self.client.id).prepare_token_revocation_request(
                self.server["revocation_endpoint"].replace("http:", "https:"),
                token["refresh_token"], "refresh_token")
        answer = requests.post(address.replace("https:", "http:"), headers=headers, data=body,
                               auth=(self.client.id, self.client.secret), timeout=30)
        self.assertEqual(answer.status_code, 200)
        self.assertEqual(service.whoami(token["access_token"]).status, 401)
        record(self.NAME, "revocation", "yes, through oauthlib")


if __name__ == "__main__":
    unittest.main(warnings="ignore")
