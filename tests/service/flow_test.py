"""The service does what its standards say when everybody behaves."""

import json
import time
import unittest

import service
from service import CALLBACK, Client, challenge_of, introspect, register, send, whoami


class Metadata(unittest.TestCase):
    def test_issuer_is_exactly_the_configured_one(self):
        answer = send("GET", "/.well-known/oauth-authorization-server")
        self.assertEqual(answer.status, 200)
        self.assertEqual(answer.headers.get_content_type(), "application/json")
        self.assertEqual(answer.json["issuer"], service.ISSUER)

    def test_both_forms_of_its_address_answer(self):
        below = send("GET", "/.well-known/oauth-authorization-server")
        before = send("GET", service.well_known("oauth-authorization-server"))
        self.assertEqual((before.status, before.json), (200, below.json))

    def test_every_endpoint_named_is_there(self):
        document = send("GET", "/.well-known/oauth-authorization-server").json
        endpoints = [v for k, v in document.items() if k.endswith("_endpoint")]
        self.assertGreaterEqual(len(endpoints), 6)
        for address in endpoints:
            self.assertTrue(address.startswith(service.ISSUER + "/"))
            answer = send("DELETE", address[len(service.ISSUER):], headers=service.as_user("alice"))
            self.assertEqual(answer.status, 405, address)
            self.assertTrue(answer.headers["Allow"])


class OtherOrigins(unittest.TestCase):
    """Scripts in other pages (CORS)."""

    ORIGIN = {"Origin": "https://script.example"}
    PREFLIGHT = {**ORIGIN, "Access-Control-Request-Method": "POST",
                 "Access-Control-Request-Headers": "authorization"}

    def test_may_read_what_needs_no_login_of_the_browser(self):
        for method, path in (("GET", "/.well-known/oauth-authorization-server"),
                             ("POST", "/oauth/token"), ("POST", "/oauth/revoke"),
                             ("POST", "/oauth/par")):
            answer = send(method, path, "", {**service.FORM, **self.ORIGIN})
            self.assertEqual(answer.headers["Access-Control-Allow-Origin"], "*", path)
            self.assertIsNone(answer.headers["Access-Control-Allow-Credentials"])
            self.assertEqual(answer.status, 200 if method == "GET" else 401)

    def test_are_told_so_beforehand(self):
        for path in ("/oauth/token", "/oauth/revoke", "/oauth/par"):
            answer = send("OPTIONS", path, headers=self.PREFLIGHT)
            self.assertEqual((answer.status, answer.body), (204, b""))
            self.assertEqual(answer.headers["Access-Control-Allow-Origin"], "*")
            self.assertEqual(answer.headers["Access-Control-Allow-Methods"], "POST")
            self.assertIn("Authorization", answer.headers["Access-Control-Allow-Headers"])

    def test_may_read_nothing_else(self):
        for path in ("/oauth/authorize", "/admin", "/oauth/register", "/oauth/introspect",
                     "/oauth/register/" + "x" * 64, "/api/whoami", "/nowhere"):
            for method in ("GET", "POST", "OPTIONS"):
                answer = send(method, path, None, {**self.PREFLIGHT, **service.as_user("admin")})
                self.assertIsNone(answer.headers["Access-Control-Allow-Origin"], (method, path))


class PublicClient(unittest.TestCase):
    """A native application: no secret, and a port of its system's choice."""

    @classmethod
    def setUpClass(cls):
        cls.client = register(token_endpoint_auth_method="none",
                              redirect_uris=["http://127.0.0.1/cb", "com.example.app:/cb"])

    def test_logs_in_on_any_port_and_by_its_scheme(self):
        for address in ("http://127.0.0.1:51004/cb", "http://127.0.0.1:51005/cb",
                        "com.example.app:/cb"):
            self.client.redirect = address
            code, verifier = self.client.log_in()
            answer = self.client.redeem(code, verifier)
            self.assertEqual(answer.status, 200, answer.text)
            self.assertEqual(whoami(answer.json["access_token"]).json["sub"], "alice")
            answer = self.client.refresh(answer.json["refresh_token"])
            self.assertEqual(answer.status, 200, answer.text)
            self.assertEqual(self.client.post("revoke", token=answer.json["access_token"]).status,
                             200)

    def test_is_asked_about_each_time(self):
        self.client.redirect = "http://127.0.0.1:51004/cb"
        self.client.tokens()
        self.assertEqual(self.client.ask(challenge_of("v" * 43), prompt=None).status, 200)


class Remembered(unittest.TestCase):
    def test_what_was_agreed_to_is_not_asked_again(self):
        client = register()
        client.tokens(scope="profile")
        answer = client.ask(challenge_of("v" * 43), prompt=None)
        self.assertEqual(answer.status, 302)
        self.assertEqual(client.redeem(answer.returned["code"], "v" * 43).status, 200)
        answer = client.ask(challenge_of("v" * 43), prompt=None, scope="profile files.read")
        self.assertEqual(answer.status, 200)


class Pushed(unittest.TestCase):
    def test_request_that_was_pushed_logs_in_once(self):
        client, verifier = register(), "v" * 43
        answer = client.post("par", **client.question(challenge_of(verifier)))
        self.assertEqual((answer.status, answer.json["expires_in"]), (201, 60))
        question = service.encode({"client_id": client.id,
                                   "request_uri": answer.json["request_uri"]})
        page = send("GET", "/oauth/authorize?" + question, headers=service.as_user("alice"))
        self.assertEqual(page.status, 200)
        code = client.decide(page).returned["code"]
        self.assertEqual(client.redeem(code, verifier).status, 200)
        page = send("GET", "/oauth/authorize?" + question, headers=service.as_user("alice"))
        self.assertEqual((page.status, page.location), (400, None))


class Managing(unittest.TestCase):
    def test_client_reads_replaces_and_removes_itself(self):
        made = service.register_raw({"redirect_uris": [CALLBACK]}).json
        address, token = made["registration_client_uri"], made["registration_access_token"]
        self.assertTrue(address.startswith(service.ISSUER + "/"))
        headers = {"Content-Type": "application/json", **service.bearer(token)}
        read = send("GET", address, headers=headers)
        self.assertEqual((read.status, read.json["client_secret"]), (200, made["client_secret"]))
        changed = send("PUT", address, json.dumps({
            "client_id": made["client_id"], "redirect_uris": ["https://new.example/cb"]}), headers)
        self.assertEqual((changed.status, changed.json["redirect_uris"]),
                         (200, ["https://new.example/cb"]))
        gone = send("DELETE", address, headers=headers)
        self.assertEqual((gone.status, gone.body), (204, b""))
        self.assertEqual(send("GET", address, headers=headers).status, 401)


class Registration(unittest.TestCase):
    def test_answer_holds_what_was_registered(self):
        answer = service.register_raw({"redirect_uris": ["https://a.example/cb?x=1"],
                                       "client_name": "Ökö", "scope": "profile unknown",
                                       "token_endpoint_auth_method": "client_secret_post"})
        self.assertEqual(answer.status, 201)
        made = answer.json
        self.assertEqual(made["redirect_uris"], ["https://a.example/cb?x=1"])
        self.assertEqual(made["client_name"], "Ökö")
        self.assertEqual(made["scope"], "profile")
        self.assertEqual(made["token_endpoint_auth_method"], "client_secret_post")
        self.assertEqual(made["client_secret_expires_at"], 0)
        self.assertEqual(answer.headers["Cache-Control"], "no-store")

    def test_row_holds_the_address_with_its_scheme(self):
        register(redirect_uris=["https://with-scheme.example/cb"])
        rows = service.stored("SELECT redirect_uri FROM oauth_clientInfo")
        self.assertIn("https://with-scheme.example/cb", [row.split()[0] for row in rows if row])

    def test_several_addresses_serve_each(self):
        addresses = ["https://one.example/cb", "https://two.example/cb"]
        client = register(redirect_uris=addresses)
        for address in addresses:
            client.redirect = address
            code, verifier = client.log_in()
            self.assertEqual(client.redeem(code, verifier).status, 200)

    def test_client_without_address_has_its_own_flow_only(self):
        client = register(redirect_uris=[], grant_types=["client_credentials"])
        self.assertEqual(client.post("token", grant_type="client_credentials").status, 200)
        client.redirect = "https://(none)"
        self.assertEqual(client.ask("x" * 43).status, 400)

    def test_client_that_asks_for_its_own_flow_has_no_other(self):
        answer = service.register_raw({"redirect_uris": [CALLBACK],
                                       "grant_types": ["client_credentials"]})
        self.assertEqual(answer.json["grant_types"], ["client_credentials"])
        self.assertNotIn("redirect_uris", answer.json)
        client = Client(answer.json["client_id"], answer.json["client_secret"])
        self.assertEqual(client.ask("x" * 43).status, 400)
        self.assertEqual(client.post("token", grant_type="client_credentials").status, 200)

    def test_empty_scope_is_the_default_one(self):
        answer = service.register_raw({"redirect_uris": [CALLBACK], "scope": ""})
        self.assertEqual((answer.status, answer.json.get("scope")), (201, "openid profile"))

    def test_host_may_have_an_underscore(self):
        client = register(redirect_uris=["https://my_app.lan:8443/cb"])
        self.assertEqual(client.redeem(*client.log_in()).status, 200)


class CodeFlow(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register(client_name="Photo <Frame> & 'Co'", scope="profile files.read")

    def test_consent_page_names_client_address_and_scopes(self):
        page = self.client.ask(challenge_of("v" * 43), scope="profile files.read")
        self.assertEqual(page.status, 200)
        self.assertIn("Photo &lt;Frame&gt; &amp; &#39;Co&#39;", page.text)
        self.assertIn("http://127.0.0.1:9", page.text)
        self.assertIn("See and download your files", page.text)
        self.assertIn("alice", page.text)

    def test_code_arrives_with_state_and_issuer(self):
        page = self.client.ask(challenge_of("v" * 43), state="a b&c=d'\"é")
        answer = self.client.decide(page)
        self.assertEqual(answer.status, 303)
        self.assertTrue(answer.location.startswith(CALLBACK + "?"))
        self.assertEqual(answer.returned["state"], "a b&c=d'\"é")
        self.assertEqual(answer.returned["iss"], service.ISSUER)
        self.assertEqual(len(answer.returned["code"]), 64)

    def test_refusal_arrives_with_state_and_issuer(self):
        page = self.client.ask(challenge_of("v" * 43))
        answer = self.client.decide(page, "refuse")
        self.assertEqual(answer.returned["error"], "access_denied")
        self.assertEqual(answer.returned["state"], "a state")
        self.assertEqual(answer.returned["iss"], service.ISSUER)

    def test_code_gives_a_token_that_works(self):
        answer = self.client.redeem(*self.client.log_in(scope="profile"))
        self.assertEqual(answer.status, 200)
        self.assertEqual(answer.headers["Cache-Control"], "no-store")
        self.assertEqual(answer.json["token_type"], "Bearer")
        self.assertEqual(answer.json["expires_in"], 600)
        self.assertEqual(answer.json["scope"], "profile")
        holder = whoami(answer.json["access_token"])
        self.assertEqual(holder.status, 200)
        self.assertEqual(holder.json["sub"], "alice")
        self.assertEqual(holder.json["client_id"], self.client.id)

    def test_user_with_a_quote_is_named_as_they_are(self):
        token = self.client.tokens("o'neil")["access_token"]
        self.assertEqual(whoami(token).json["sub"], "o'neil")

    def test_query_of_the_redirect_address_stays(self):
        client = register(redirect_uris=["https://a.example/cb?tenant=1"])
        answer = client.decide(client.ask(challenge_of("v" * 43)))
        self.assertEqual(answer.returned["tenant"], "1")

    def test_only_address_is_the_default(self):
        client = register(redirect_uris=["https://default.example/cb"])
        verifier = "v" * 43
        answer = client.decide(client.ask(challenge_of(verifier), redirect_uri=None))
        self.assertTrue(answer.location.startswith("https://default.example/cb?code="))
        again = client.redeem(answer.returned["code"], verifier, redirect_uri=None)
        self.assertEqual(again.status, 200)

    def test_loopback_address_may_be_https(self):
        client = register(redirect_uris=["https://localhost:8443/cb"])
        for address in (client.redirect, None):
            answer = client.decide(client.ask(challenge_of("v" * 43), redirect_uri=address))
            self.assertTrue(answer.location.startswith("https://localhost:8443/cb?"))

    def test_secret_may_be_in_the_body(self):
        code, verifier = self.client.log_in()
        form = {"grant_type": "authorization_code", "code": code, "code_verifier": verifier,
                "redirect_uri": CALLBACK, "client_id": self.client.id,
                "client_secret": self.client.secret}
        self.assertEqual(send("POST", "/oauth/token", service.encode(form), service.FORM).status,
                         200)


class OlderAddresses(unittest.TestCase):
    """Rows that were registered by other means have lost the scheme of their
    address: it may have been either."""

    def without_scheme(self, address, stored):
        client = register(redirect_uris=[address])
        where = f"WHERE redirect_uri LIKE '{address}%'"
        rows = service.stored(f"SELECT redirect_uri FROM oauth_clientInfo {where}")
        self.assertEqual(len(rows), 1)
        service.stored(f"UPDATE oauth_clientInfo SET redirect_uri='{stored}' {where}")
        return client

    def returns_to(self, client, address):
        verifier = "v" * 43
        page = client.ask(challenge_of(verifier), redirect_uri=address)
        if page.status != 200:
            self.assertIsNone(page.location)
            return None
        answer = client.decide(page)
        again = client.redeem(answer.returned["code"], verifier, redirect_uri=address)
        self.assertEqual(again.status, 200)
        return answer.location.partition("?")[0]

    def test_https_is_meant_everywhere(self):
        client = self.without_scheme("https://older.example/cb", "older.example/cb")
        for address in ("https://older.example/cb", None):
            self.assertEqual(self.returns_to(client, address), "https://older.example/cb")
        for address in ("http://older.example/cb", "older.example/cb", "https://older.example/cb/"):
            self.assertIsNone(self.returns_to(client, address))

    def test_http_is_meant_on_the_loopback_interface_as_well(self):
        client = self.without_scheme("http://127.0.0.1:7/older", "127.0.0.1:7/older")
        for address in ("http://127.0.0.1:7/older", "https://127.0.0.1:7/older"):
            self.assertEqual(self.returns_to(client, address), address)
        self.assertEqual(self.returns_to(client, None), "http://127.0.0.1:7/older")
        self.assertIsNone(self.returns_to(client, "127.0.0.1:7/older"))

    def test_an_address_with_its_scheme_has_no_other(self):
        client = self.without_scheme("http://127.0.0.1:7/newer", "http://127.0.0.1:7/newer")
        self.assertEqual(self.returns_to(client, None), "http://127.0.0.1:7/newer")
        self.assertIsNone(self.returns_to(client, "https://127.0.0.1:7/newer"))

    def test_of_several_each_serves_and_none_is_the_default(self):
        client = self.without_scheme("https://both.example/1",
                                     "both.example/1 https://both.example/2")
        for address in ("https://both.example/1", "https://both.example/2"):
            self.assertEqual(self.returns_to(client, address), address)
        for address in (None, "https://both.example/1 https://both.example/2"):
            self.assertIsNone(self.returns_to(client, address))

    def test_plain_http_to_another_machine_is_no_address_however_it_stands_there(self):
        client = self.without_scheme("https://plain.example/cb", "http://plain.example/cb")
        for address in ("http://plain.example/cb", "https://plain.example/cb", None,
                        "https://http://plain.example/cb"):
            self.assertIsNone(self.returns_to(client, address))

    def test_a_scheme_of_an_applications_own_is_no_host(self):
        client = self.without_scheme("https://app.example/own", "my.app:/cb")
        for address in ("my.app:/cb", "https://my.app:/cb", None):
            self.assertIsNone(self.returns_to(client, address))


class Refreshing(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register()

    def test_new_pair_works_and_the_old_is_gone(self):
        old = self.client.tokens()
        new = self.client.refresh(old["refresh_token"])
        self.assertEqual(new.status, 200)
        self.assertEqual(whoami(new.json["access_token"]).status, 200)
        self.assertEqual(whoami(old["access_token"]).status, 401)
        again = self.client.refresh(old["refresh_token"])
        self.assertEqual((again.status, again.json["error"]), (400, "invalid_grant"))

    def test_narrowed_scope_does_not_narrow_the_grant(self):
        old = self.client.tokens(scope="profile files.read")
        narrow = self.client.refresh(old["refresh_token"], scope="profile").json
        self.assertEqual(narrow["scope"], "profile")
        wide = self.client.refresh(narrow["refresh_token"]).json
        self.assertEqual(wide["scope"], "profile files.read")

    def test_wider_scope_is_refused_and_the_token_stays(self):
        old = self.client.tokens(scope="profile")
        answer = self.client.refresh(old["refresh_token"], scope="profile files.read")
        self.assertEqual((answer.status, answer.json["error"]), (400, "invalid_scope"))
        self.assertEqual(self.client.refresh(old["refresh_token"]).status, 200)


    def test_scope_is_answered_tidily(self):
        old = self.client.tokens(scope=" files.read  profile files.read ")
        self.assertEqual(old["scope"], "files.read profile")
        new = self.client.refresh(old["refresh_token"], scope=" profile  profile")
        self.assertEqual(new.json["scope"], "profile")


class ClientCredentials(unittest.TestCase):
    def test_token_stands_for_the_client_and_cannot_be_refreshed(self):
        client = register(scope="profile files.read")
        answer = client.post("token", grant_type="client_credentials", scope="profile")
        self.assertEqual(answer.status, 200)
        self.assertNotIn("refresh_token", answer.json)
        self.assertEqual(answer.json["scope"], "profile")
        self.assertEqual(whoami(answer.json["access_token"]).json["sub"], client.id)


class Introspection(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client, cls.other = register(), register()

    def test_live_token_is_described(self):
        token = self.client.tokens(scope="profile")["access_token"]
        seen = introspect(self.other, token).json
        self.assertIs(seen["active"], True)
        self.assertEqual(seen["scope"], "profile")
        self.assertEqual(seen["username"], "alice")
        self.assertEqual(seen["client_id"], self.client.id)
        self.assertEqual(seen["iss"], service.ISSUER)
        self.assertAlmostEqual(seen["exp"], time.time() + 600, delta=30)

    def test_unusable_tokens_are_inactive_and_no_more(self):
        gone = self.client.tokens()["access_token"]
        self.client.post("revoke", token=gone)
        for text in (gone, "short", "x" * 64, "' OR 1=1 --"):
            self.assertEqual(introspect(self.client, text).json, {"active": False}, text)

    def test_refresh_token_is_for_its_holder_alone(self):
        token = self.client.tokens()["refresh_token"]
        self.assertIs(introspect(self.client, token).json["active"], True)
        self.assertEqual(introspect(self.other, token).json, {"active": False})

    def test_nobody_asks_without_authentication(self):
        answer = send("POST", "/oauth/introspect", "token=x", service.FORM)
        self.assertEqual((answer.status, answer.json["error"]), (401, "invalid_client"))


class Revocation(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.client = register()

    def test_either_token_ends_the_pair(self):
        for name in ("access_token", "refresh_token"):
            pair = self.client.tokens()
            hint = {"token_type_hint": name}
            self.assertEqual(self.client.post("revoke", token=pair[name], **hint).status, 200)
            self.assertEqual(whoami(pair["access_token"]).status, 401, name)
            self.assertEqual(self.client.refresh(pair["refresh_token"]).status, 400, name)

    def test_unknown_token_is_a_success(self):
        for text in ("x" * 64, "short"):
            self.assertEqual(self.client.post("revoke", token=text).status, 200)

    def test_token_of_another_client_stays(self):
        other = register()
        token = other.tokens()["access_token"]
        self.assertEqual(self.client.post("revoke", token=token).status, 400)
        self.assertEqual(whoami(token).status, 200)


class Resource(unittest.TestCase):
    def test_scope_is_required(self):
        token = register().tokens(scope="files.read")["access_token"]
        answer = whoami(token)
        self.assertEqual(answer.status, 403)
        self.assertIn('error="insufficient_scope"', answer.headers["WWW-Authenticate"])
        self.assertIn('scope="profile"', answer.headers["WWW-Authenticate"])

    def test_without_token_no_error_is_named(self):
        answer = send("GET", "/api/whoami")
        self.assertEqual(answer.status, 401)
        self.assertTrue(answer.headers["WWW-Authenticate"].startswith("Bearer "))
        self.assertNotIn("error", answer.headers["WWW-Authenticate"])

    def test_unknown_token_is_invalid(self):
        for text in ("short", "x" * 64):
            answer = whoami(text)
            self.assertEqual(answer.status, 401)
            self.assertIn('error="invalid_token"', answer.headers["WWW-Authenticate"])


if __name__ == "__main__":
    unittest.main()
