"""Requests that nobody well-meaning sends: each gets the answer that its
standard has for it, and what was refused has changed nothing."""

import sqlite3
import unittest

import service
from service import (CALLBACK, FORM, as_user, basic, bearer, challenge_of, encode, introspect,
                     later, register, send, whoami)

VERIFIER = "v" * 43
CHALLENGE = challenge_of(VERIFIER)
MARKUP = "\"><script>alert('x')</script>&lt;"
SQL = "x'; DROP TABLE oauth_token; --"


def setUpModule():
    global CLIENT
    CLIENT = register(scope="profile files.read")


class OpenRedirect(unittest.TestCase):
    def test_unknown_client_is_not_redirected(self):
        for identifier in ("", "x", "x" * 64, SQL, MARKUP, "x" * 5000):
            answer = CLIENT.ask(CHALLENGE, client_id=identifier)
            self.assertEqual(answer.status, 400, identifier)
            self.assertIsNone(answer.location)
            self.assertNotIn("<script", answer.text)

    def test_address_is_compared_exactly(self):
        for address in ("https://evil.example/", CALLBACK + "/", CALLBACK + "?x=1",
                        CALLBACK.replace("callback", "Callback"), CALLBACK + "#f",
                        CALLBACK.replace("http:", "HTTP:"), CALLBACK.replace(":9", ":0"),
                        CALLBACK.replace(":9", ":"), CALLBACK.replace(":9", ":65536"),
                        CALLBACK.replace("127.0.0.1", "localhost"),
                        CALLBACK.replace("127.0.0.1", "[::1]"),
                        CALLBACK.replace("127.0.0.1", "127.0.0.2"),
                        CALLBACK.replace("http:", "https:"),
                        CALLBACK.replace("127.0.0.1", "127.0.0.1@evil.example"),
                        CALLBACK.replace("http://", "http:/"), CALLBACK.replace("http://", ""),
                        CALLBACK.replace("http://", "//"), "http://http://127.0.0.1:9/callback",
                        "javascript:alert(1)", "ftp://127.0.0.1:9/callback", CALLBACK + "\r\nX: y",
                        CALLBACK + " https://evil.example", "127.0.0.1:9/callback"):
            answer = CLIENT.ask(CHALLENGE, redirect_uri=address)
            self.assertEqual(answer.status, 400, address)
            self.assertIsNone(answer.location, address)

    def test_plain_http_to_another_machine_is_not_the_https_address(self):
        client = register(redirect_uris=["https://app.example/cb"])
        answer = client.ask(CHALLENGE, redirect_uri="http://app.example/cb")
        self.assertEqual(answer.status, 400)
        self.assertIsNone(answer.location)

    def test_several_addresses_have_no_default(self):
        client = register(redirect_uris=["https://one.example/", "https://two.example/"])
        for address in (None, "https://one.example/ two.example/"):
            self.assertEqual(client.ask(CHALLENGE, redirect_uri=address).status, 400)

    def test_doubled_client_or_address_is_not_redirected(self):
        for name in ("client_id", "redirect_uri"):
            question = CLIENT.question(CHALLENGE)
            pairs = [*question.items(), (name, question[name])]
            answer = send("GET", "/oauth/authorize?" + encode(pairs), headers=as_user("alice"))
            self.assertEqual(answer.status, 400, name)
            self.assertIsNone(answer.location)


class AuthorizationRequest(unittest.TestCase):
    def returned(self, pairs):
        answer = send("GET", "/oauth/authorize?" + encode(pairs), headers=as_user("alice"))
        self.assertEqual(answer.status, 302)
        self.assertTrue(answer.location.startswith(CALLBACK + "?error="), answer.location)
        self.assertEqual(answer.returned["iss"], service.ISSUER)
        return answer.returned

    def test_faults_return_to_the_client_with_its_state(self):
        for change, error in (({"response_type": None}, "invalid_request"),
                              ({"response_type": "token"}, "unsupported_response_type"),
                              ({"response_type": "code token"}, "unsupported_response_type"),
                              ({"response_mode": "fragment"}, "invalid_request"),
                              ({"scope": "files.write"}, "invalid_scope"),
                              ({"scope": "profile " + MARKUP}, "invalid_scope"),
                              ({"scope": " "}, "invalid_scope")):
            returned = self.returned(CLIENT.question(CHALLENGE, **change))
            self.assertEqual(returned["error"], error, change)
            self.assertEqual(returned["state"], "a state", change)

    def test_pkce_cannot_be_left_out_or_weakened(self):
        for change in ({"code_challenge": None}, {"code_challenge_method": None},
                       {"code_challenge_method": "plain"}, {"code_challenge_method": "s256"},
                       {"code_challenge": None, "code_challenge_method": None},
                       {"code_challenge": CHALLENGE[:-1]}, {"code_challenge": CHALLENGE + "A"},
                       {"code_challenge": CHALLENGE[:-1] + "="}):
            returned = self.returned(CLIENT.question(CHALLENGE, **change))
            self.assertEqual(returned["error"], "invalid_request", change)

    def test_doubled_parameters_are_refused(self):
        for name in ("state", "scope", "response_type", "code_challenge", "code_challenge_method"):
            question = CLIENT.question(CHALLENGE)
            returned = self.returned([*question.items(), (name, question[name])])
            self.assertEqual(returned["error"], "invalid_request", name)
            self.assertEqual("state" in returned, name != "state")

    def test_long_state_comes_back_whole(self):
        page = CLIENT.ask(CHALLENGE, state="s" * 7000)
        self.assertEqual(CLIENT.decide(page).returned["state"], "s" * 7000)

    def test_broken_encoding_is_answered_with_a_page(self):
        for query in ("client_id=%", "client_id=%4", "client_id=%zz", "%00=1", "state=%00",
                      "&".join(f"a{i}=1" for i in range(65))):
            answer = send("GET", "/oauth/authorize?" + query, headers=as_user("alice"))
            self.assertEqual(answer.status, 400, query)
            self.assertIsNone(answer.location)

    def test_oversized_query_is_refused(self):
        answer = send("GET", "/oauth/authorize?state=" + "s" * 9000, headers=as_user("alice"))
        self.assertIn(answer.status, (400, 414))

    def test_nobody_unknown_gets_in(self):
        query = "/oauth/authorize?" + encode(CLIENT.question(CHALLENGE))
        self.assertEqual(send("GET", query).status, 401)
        self.assertEqual(send("GET", query, headers=basic("alice", "wrong")).status, 401)

    def test_markup_and_sql_are_shown_as_text(self):
        client = register(client_name=MARKUP)
        page = client.ask(CHALLENGE, state=MARKUP + SQL)
        self.assertEqual(page.status, 200)
        self.assertNotIn("<script", page.text)
        self.assertIn("&lt;script&gt;", page.text)
        self.assertEqual(client.decide(page).returned["state"], MARKUP + SQL)
        self.assertNotIn("<script", send("GET", "/admin", headers=as_user("admin")).text)


class ConsentForgery(unittest.TestCase):
    def setUp(self):
        self.page = CLIENT.ask(CHALLENGE)

    def assertRefused(self, answer):
        self.assertEqual(answer.status, 403)
        self.assertIsNone(answer.location)

    def test_form_needs_its_token(self):
        for token in ("", "x", "9999999999.x"):
            self.assertRefused(CLIENT.decide(self.page, form_token=token))

    def test_token_of_another_user_does_not_fit(self):
        self.assertRefused(CLIENT.decide(self.page, user="bob"))

    def test_nothing_can_be_changed_behind_the_users_back(self):
        for change in ({"scope": "profile files.read"}, {"state": "other"},
                       {"code_challenge": challenge_of("w" * 43)}):
            self.assertRefused(CLIENT.decide(self.page, **change))

    def test_decision_must_be_one_of_two(self):
        self.assertEqual(CLIENT.decide(self.page, "maybe").status, 400)
        self.assertEqual(CLIENT.decide(self.page, "").status, 400)

    def test_page_cannot_be_framed_and_runs_no_script(self):
        policy = self.page.headers["Content-Security-Policy"]
        self.assertIn("frame-ancestors 'none'", policy)
        self.assertIn("default-src 'none'", policy)
        self.assertEqual(self.page.headers["X-Frame-Options"], "DENY")


class TokenRequest(unittest.TestCase):
    def assertError(self, answer, status, error):
        self.assertEqual((answer.status, answer.json["error"]), (status, error))
        self.assertEqual(answer.headers["Cache-Control"], "no-store")

    def test_code_works_once(self):
        code, verifier = CLIENT.log_in()
        self.assertEqual(CLIENT.redeem(code, verifier).status, 200)
        self.assertError(CLIENT.redeem(code, verifier), 400, "invalid_grant")

    def test_code_of_another_client_is_refused_and_stays(self):
        code, verifier = CLIENT.log_in()
        self.assertError(register().redeem(code, verifier), 400, "invalid_grant")
        self.assertEqual(CLIENT.redeem(code, verifier).status, 200)

    def test_expired_code_is_refused(self):
        code, verifier = CLIENT.log_in()
        with later(3600):
            self.assertError(CLIENT.redeem(code, verifier), 400, "invalid_grant")
        self.assertEqual(CLIENT.redeem(code, verifier).status, 200)

    def test_verifier_must_fit(self):
        code, _ = CLIENT.log_in()
        for verifier in ("w" * 43, "v" * 42, "v" * 129, challenge_of("w"), SQL):
            self.assertError(CLIENT.redeem(code, verifier), 400, "invalid_grant")
        self.assertError(CLIENT.redeem(code, None), 400, "invalid_request")

    def test_redirect_address_must_be_repeated(self):
        code, verifier = CLIENT.log_in()
        for address in (None, CALLBACK + "/", "https://evil.example/"):
            self.assertError(CLIENT.redeem(code, verifier, redirect_uri=address), 400,
                             "invalid_grant")

    def test_unknown_codes_and_tokens_are_invalid_grants(self):
        for text in ("x", "x" * 64, SQL, MARKUP, "x" * 3000):
            self.assertError(CLIENT.redeem(text, VERIFIER), 400, "invalid_grant")
            self.assertError(CLIENT.refresh(text), 400, "invalid_grant")

    def test_refresh_token_of_another_client_is_refused_and_stays(self):
        token = CLIENT.tokens()["refresh_token"]
        self.assertError(register().refresh(token), 400, "invalid_grant")
        self.assertEqual(CLIENT.refresh(token).status, 200)

    def test_access_token_is_no_refresh_token(self):
        self.assertError(CLIENT.refresh(CLIENT.tokens()["access_token"]), 400, "invalid_grant")

    def test_missing_parameters_are_named(self):
        for form in ({}, {"grant_type": "authorization_code"}, {"grant_type": "refresh_token"},
                     {"grant_type": ""}):
            self.assertError(CLIENT.post("token", **form), 400, "invalid_request")

    def test_unknown_grant_type_is_refused(self):
        for kind in ("password", MARKUP, "urn:ietf:params:oauth:grant-type:device_code"):
            self.assertError(CLIENT.post("token", grant_type=kind), 400, "unsupported_grant_type")

    def test_scope_beyond_the_registration_is_refused(self):
        for scope in ("files.write", "profile files.write", SQL):
            self.assertError(CLIENT.post("token", grant_type="client_credentials", scope=scope),
                             400, "invalid_scope")

    def test_doubled_parameters_are_refused(self):
        login = {"client_id": CLIENT.id, "client_secret": CLIENT.secret}
        form = {"grant_type": "client_credentials", "scope": "profile", **login}
        for name, value in form.items():
            answer = send("POST", "/oauth/token", encode([*form.items(), (name, value)]), FORM)
            self.assertError(answer, 400, "invalid_request")

    def test_wrong_credentials_are_an_invalid_client(self):
        body = "grant_type=client_credentials"
        for name, secret in ((CLIENT.id, "wrong"), (CLIENT.id, ""), ("x" * 64, CLIENT.secret),
                             ("", ""), (SQL, SQL), (CLIENT.id, CLIENT.secret[:-1])):
            answer = send("POST", "/oauth/token", body, {**FORM, **basic(name, secret)})
            self.assertError(answer, 401, "invalid_client")
            self.assertTrue(answer.headers["WWW-Authenticate"].startswith("Basic "))

    def test_broken_authorization_headers_are_an_invalid_client(self):
        for header in ("Basic", "Basic ", "Basic !!!", "Basic eA==", "Bearer x", "Digest x", "x"):
            answer = send("POST", "/oauth/token", "grant_type=client_credentials",
                          {**FORM, "Authorization": header})
            self.assertError(answer, 401, "invalid_client")

    def test_two_ways_of_authentication_are_refused(self):
        answer = CLIENT.post("token", grant_type="client_credentials", client_id=CLIENT.id,
                             client_secret=CLIENT.secret)
        self.assertError(answer, 400, "invalid_request")

    def test_nothing_is_read_from_the_query(self):
        query = encode({"grant_type": "client_credentials", "client_id": CLIENT.id,
                        "client_secret": CLIENT.secret})
        self.assertError(send("POST", "/oauth/token?" + query, "", FORM), 401, "invalid_client")

    def test_only_forms_are_read(self):
        for kind in ("application/json", "text/plain", "multipart/form-data; boundary=x"):
            answer = send("POST", "/oauth/token", "{}",
                          {"Content-Type": kind, **basic(CLIENT.id, CLIENT.secret)})
            self.assertError(answer, 400, "invalid_request")

    def test_broken_encoding_is_refused(self):
        for body in ("grant_type=%", "grant_type=%zz", "grant_type=%00", "x=1&" * 65):
            answer = send("POST", "/oauth/token", body,
                          {**FORM, **basic(CLIENT.id, CLIENT.secret)})
            self.assertError(answer, 400, "invalid_request")


class Sizes(unittest.TestCase):
    ENDPOINTS = ("/oauth/token", "/oauth/register", "/oauth/introspect", "/oauth/revoke")

    def test_large_bodies_are_refused(self):
        for size in (20_000, 10_000_000):
            for endpoint in self.ENDPOINTS:
                self.assertEqual(send("POST", endpoint, b"a" * size, FORM).status, 413, endpoint)

    def test_wrong_methods_are_refused(self):
        for method in ("GET", "PUT", "DELETE"):
            for endpoint in self.ENDPOINTS:
                answer = send(method, endpoint)
                self.assertEqual((answer.status, answer.headers["Allow"]), (405, "POST"), endpoint)

    def test_nothing_lies_beside_the_endpoints(self):
        for path in ("/oauth", "/oauth/token/", "/oauth/token/x", "/admin/",
                     "/oauth/authorizeX", "/token", "/cgi-bin/token", "/oauth/../settings.json"):
            self.assertEqual(send("GET", path, headers=as_user("admin")).status, 404, path)


class RegistrationRequest(unittest.TestCase):
    def assertError(self, metadata, error):
        answer = service.register_raw(metadata)
        self.assertEqual((answer.status, answer.json["error"]), (400, error), metadata)

    def test_initial_token_is_required(self):
        for headers in ({}, bearer(""), bearer("wrong"), basic("x", service.INITIAL_TOKEN)):
            answer = send("POST", "/oauth/register", "{}",
                          {"Content-Type": "application/json", **headers})
            self.assertEqual(answer.status, 401, headers)
            self.assertTrue(answer.headers["WWW-Authenticate"].startswith("Bearer "))

    def test_unsafe_addresses_are_refused(self):
        for address in ("http://app.example/cb", "javascript:alert(1)", "https://", "https:///cb",
                        "https://a.example/#", "https://u@a.example/", "https://a b/", 1, None,
                        "https://a.example/\r\nX:", "https://[::1", "https://a.example:x/",
                        "https://http://a.example/", "https://é.example/",
                        "https://" + "a" * 2100 + ".example/", "app:/callback", MARKUP, SQL):
            self.assertError({"redirect_uris": [address]}, "invalid_redirect_uri")
        for addresses in (None, [], "https://a.example/", {}):
            self.assertError({"redirect_uris": addresses}, "invalid_redirect_uri")

    def test_metadata_of_the_wrong_kind_is_refused(self):
        for change in ({"client_name": 1}, {"client_name": ""}, {"client_name": "x" * 65},
                       {"client_name": "a\0b"}, {"client_name": "x" * 64 + "é"}, {"scope": ["profile"]}, {"scope": "unknown"},
                       {"grant_types": ["implicit"]}, {"grant_types": "authorization_code"},
                       {"response_types": ["token"]}, {"token_endpoint_auth_method": "private_key_jwt"},
                       {"token_endpoint_auth_method": "none",
                        "grant_types": ["authorization_code", "client_credentials"]},
                       {"token_endpoint_auth_method": "none", "grant_types": ["refresh_token"]}):
            self.assertError({"redirect_uris": [CALLBACK], **change}, "invalid_client_metadata")

    def test_name_that_cannot_be_shown_is_refused(self):
        for name in (b"  ", b"a\\nb", b"\\u007f", b"a\xff", b"\xc3", b"\xed\xa0\x80", b"\xc0\xaf"):
            self.assertError(b'{"redirect_uris":["https://a.example/"],"client_name":"' + name +
                             b'"}', "invalid_client_metadata")

    def test_address_that_no_code_could_remember_is_refused(self):
        longest = "https://a.example/" + "x" * 1382
        client = register(redirect_uris=[longest])
        code, verifier = client.log_in()
        self.assertEqual(client.redeem(code, verifier).status, 200)
        self.assertError({"redirect_uris": [longest + "x"]}, "invalid_redirect_uri")

    def test_bodies_that_are_no_object_are_refused(self):
        for body in ("", "x", "[]", "1", "{", "[" * 5000, '{"a":1}x', b"\xff\xfe"):
            self.assertError(body, "invalid_client_metadata")


class Bearers(unittest.TestCase):
    def test_token_in_the_query_is_not_read(self):
        token = CLIENT.tokens()["access_token"]
        answer = send("GET", "/api/whoami?access_token=" + token)
        self.assertEqual(answer.status, 401)
        self.assertNotIn("error", answer.headers["WWW-Authenticate"])
        self.assertEqual(send("POST", "/oauth/introspect?token=" + token, "",
                              {**FORM, **basic(CLIENT.id, CLIENT.secret)}).status, 400)

    def test_odd_headers_are_answered(self):
        for header, status in (("Bearer", 400), ("Bearer ", 400), ("Bearer x y", 401),
                               ("Bearer " + "x" * 8000, 401), ("Bearer " + SQL, 401),
                               ("bearer " + "x" * 64, 401), ("Basic eDp4", 401)):
            answer = send("GET", "/api/whoami", headers={"Authorization": header})
            self.assertEqual(answer.status, status, header)
            self.assertIn("WWW-Authenticate", answer.headers)

    def test_expired_token_is_invalid_and_inactive(self):
        token = CLIENT.tokens()["access_token"]
        with later(3600):
            self.assertIn('error="invalid_token"', whoami(token).headers["WWW-Authenticate"])
            self.assertEqual(introspect(CLIENT, token).json, {"active": False})
        self.assertEqual(whoami(token).status, 200)

    def test_refresh_token_is_no_access_token(self):
        self.assertEqual(whoami(CLIENT.tokens()["refresh_token"]).status, 401)

    def test_replayed_code_ends_what_it_gave(self):
        code, verifier = CLIENT.log_in()
        token = CLIENT.redeem(code, verifier).json["access_token"]
        self.assertEqual(CLIENT.redeem(code, verifier).status, 400)
        self.assertEqual(whoami(token).status, 200, "a client may try twice at once")
        with later(3600):
            self.assertEqual(CLIENT.redeem(code, verifier).status, 400)
        self.assertEqual(whoami(token).status, 401)

    def test_replayed_refresh_token_ends_what_came_of_it(self):
        first = CLIENT.tokens()
        second = CLIENT.refresh(first["refresh_token"]).json
        third = CLIENT.refresh(second["refresh_token"]).json
        other = CLIENT.tokens()
        with later(60):
            self.assertEqual(register().refresh(first["refresh_token"]).status, 400)
            self.assertEqual(whoami(third["access_token"]).status, 200, "another client tried")
            self.assertEqual(CLIENT.refresh(first["refresh_token"]).json["error"],
                             "invalid_grant")
        self.assertEqual(whoami(third["access_token"]).status, 401)
        self.assertEqual(CLIENT.refresh(third["refresh_token"]).status, 400)
        self.assertEqual(whoami(other["access_token"]).status, 200, "another grant")

    def test_refresh_token_sent_twice_at_once_is_no_replay(self):
        old = CLIENT.tokens()
        new = CLIENT.refresh(old["refresh_token"]).json
        self.assertEqual(CLIENT.refresh(old["refresh_token"]).status, 400)
        self.assertEqual(whoami(new["access_token"]).status, 200)


class Afterwards(unittest.TestCase):
    """Named so that it runs on the log of the cases before; see load_tests."""

    def test_error_log_holds_no_secret(self):
        CLIENT.tokens()
        self.assertGreater(len(service.SEEN_SECRETS), 10)
        self.assertEqual(service.secrets_in_error_log(), [])

    def test_tables_are_still_there(self):
        with sqlite3.connect(service.DATABASE) as file:
            tables = file.execute("SELECT count(*) FROM sqlite_master WHERE type='table'")
            self.assertEqual(tables.fetchone(), (5,))


def load_tests(loader, _tests, _pattern):
    kinds = [kind for kind in globals().values()
             if isinstance(kind, type) and issubclass(kind, unittest.TestCase)]
    kinds.sort(key=lambda kind: kind is Afterwards)
    return unittest.TestSuite(loader.loadTestsFromTestCase(kind) for kind in kinds)


if __name__ == "__main__":
    unittest.main()
