"""The administrator's page, without a browser: what its forms do and refuse."""

import html
import re
import sqlite3
import unittest

import service
from service import FORM, Form, as_user, encode, register, send, whoami


def show(query="", user="admin"):
    return send("GET", "/admin" + query, headers=as_user(user))


def submit(action, token=None, **fields):
    token = Form(show().text).fields["form_token"] if token is None else token
    return send("POST", "/admin", encode({"action": action, "form_token": token, **fields}),
                {**FORM, **as_user("admin")})


def register_by_hand(name):
    """An application that the administrator has registered, with two scopes."""
    answer = submit("register", name=name, redirect=service.CALLBACK,
                    **{"scope.profile": "1", "scope.files.read": "1"})
    identifier, secret = re.findall(r"<code[^>]*>([0-9a-f]{64})</code>", answer.text)
    return service.Client(identifier, secret)


class Page(unittest.TestCase):
    def test_is_for_administrators_alone(self):
        self.assertEqual(send("GET", "/admin").status, 401)
        self.assertIn(show(user="alice").status, (401, 403))

    def test_policy_allows_no_script(self):
        for query in ("", "?view=access", "?view=log", "?view=storage"):
            answer = show(query)
            self.assertEqual(answer.status, 200, query)
            policy = answer.headers["Content-Security-Policy"]
            self.assertIn("default-src 'none'", policy)
            self.assertNotIn("unsafe", policy)
            self.assertNotIn("<script", answer.text)
            self.assertEqual(answer.headers["Cache-Control"], "no-store")

    def test_style_is_served(self):
        self.assertEqual(send("GET", "/style/service.css").headers.get_content_type(), "text/css")
        self.assertEqual(send("GET", "/style/../http.cpp").status, 404)


class Applications(unittest.TestCase):
    def test_registered_one_works_and_its_secret_is_shown_once(self):
        answer = submit("register", name="O'Brien's <Viewer>", redirect=service.CALLBACK,
                        **{"scope.profile": "1"})
        self.assertEqual(answer.status, 200)
        identifier, secret = re.findall(r"<code[^>]*>([0-9a-f]{64})</code>", answer.text)
        client = service.Client(identifier, secret)
        self.assertEqual(whoami(client.tokens()["access_token"]).status, 200)
        page = show().text
        self.assertNotIn(secret, page)
        self.assertIn(html.escape("O'Brien's <Viewer>").replace("&#x27;", "&#39;"), page)

    def test_faulty_draft_comes_back_with_what_was_typed(self):
        for redirect in ("http://evil.example/", "javascript:alert(1)", "https://a.example/#x"):
            answer = submit("register", name="My <app>", redirect=redirect,
                            **{"scope.profile": "1"})
            self.assertEqual(answer.status, 400)
            self.assertIn('role="alert"', answer.text)
            self.assertIn('value="My &lt;app&gt;"', answer.text)

    def test_name_that_nobody_could_see_is_refused(self):
        for name in ("  ", "a\nb", "x" * 65, "a" * 64):
            answer = submit("register", name=name, redirect=service.CALLBACK,
                            **{"scope.profile": "1"})
            self.assertEqual(answer.status, 400, name)

    def test_disabled_one_gets_nothing_until_enabled(self):
        client = register()
        pair = client.tokens()
        self.assertEqual(submit("disable", client=client.id).location, "/admin?done=disabled")
        self.assertEqual(client.ask("x" * 43).status, 403)
        self.assertEqual(client.refresh(pair["refresh_token"]).json["error"], "invalid_client")
        self.assertEqual(whoami(pair["access_token"]).status, 401)
        self.assertEqual(submit("enable", client=client.id).location, "/admin?done=enabled")
        self.assertEqual(whoami(pair["access_token"]).status, 200)

    def test_one_with_many_tokens_is_removed_in_one_go(self):
        client = register()
        client.tokens()
        with sqlite3.connect(service.DATABASE) as file:
            file.executemany(
                "INSERT INTO oauth_token(username, client_id, scope, refresh_token, access_token,"
                " expired_time, flow_type, state, ip) SELECT username, client_id, scope, ?, ?,"
                " expired_time, flow_type, state, ip FROM oauth_token ORDER BY id DESC LIMIT 1",
                [(f"{i:064}", f"{i:064x}z") for i in range(2000)])
        submit("remove", client=client.id)
        with sqlite3.connect(service.DATABASE) as file:
            left = file.execute("SELECT count(*) FROM oauth_token WHERE access_token LIKE '0000%'")
            self.assertEqual(left.fetchone(), (0,))

    def test_removed_one_leaves_no_token_behind(self):
        client = register()
        access = client.tokens()["access_token"]
        client.log_in()
        with sqlite3.connect(service.DATABASE) as file:
            sealed = file.execute("SELECT client_id FROM oauth_token ORDER BY id DESC").fetchone()

            def left(table):
                return file.execute(f"SELECT count(*) FROM {table} WHERE client_id=?",
                                    sealed).fetchone()[0]

            self.assertEqual((left("oauth_token"), left("oauth_grantCode")), (1, 2))
            self.assertEqual(submit("remove", client=client.id).location, "/admin?done=removed")
            self.assertEqual((left("oauth_token"), left("oauth_grantCode")), (0, 0))
        self.assertEqual(whoami(access).status, 401)
        self.assertNotIn(client.id, show().text)
        self.assertEqual(submit("remove", client=client.id).location, "/admin?done=gone")
        self.assertEqual(submit("enable", client=client.id).location, "/admin?done=gone")


class Access(unittest.TestCase):
    def test_revoking_ends_every_grant_to_the_application(self):
        client = register_by_hand("Revoked")
        pairs = [client.tokens("bob"), client.tokens("bob", scope="profile files.read")]
        code, verifier = client.log_in("bob")
        page = show("?view=access&user=bob").text
        self.assertEqual(page.count("<h3>Revoked</h3>"), 1)
        self.assertIn("<dt>Grants</dt><dd>3</dd>", page)
        self.assertIn("<li>files.read</li>", page)
        fields = Form(page[page.index('method="post"') - 6:]).fields
        answer = submit("revoke", **{k: fields[k] for k in ("client", "user")})
        self.assertEqual(answer.location, "/admin?done=revoked&view=access&user=bob")
        for pair in pairs:
            self.assertEqual(whoami(pair["access_token"]).status, 401)
            self.assertEqual(client.refresh(pair["refresh_token"]).status, 400)
        self.assertEqual(client.redeem(code, verifier).status, 400)
        self.assertIn(f"Access ended[Revoked {client.id[:8]}] for [bob] by [admin]",
                      show("?view=log").text)

    def test_those_that_registered_themselves_share_an_entry_for_a_user(self):
        for _ in range(2):
            client = register()
            client.tokens("o'neil")
            submit("revoke", client=client.id, user="o'neil")
        entry = "Access ended of one that registered itself for [o&#39;neil] by [admin]"
        page = show("?view=log&filter=neil").text
        self.assertEqual(page.count(entry), 1)

    def test_access_of_another_user_or_application_is_not_touched(self):
        client = register()
        kept = [client.tokens("alice"), register().tokens("bob")]
        client.tokens("bob")
        self.assertIn("done=revoked", submit("revoke", client=client.id, user="bob").location)
        self.assertIn("done=gone", submit("revoke", client=client.id, user="bob").location)
        self.assertIn("done=gone", submit("revoke", client="", user="alice").location)
        for pair in kept:
            self.assertEqual(whoami(pair["access_token"]).status, 200)

    def test_access_of_a_user_with_a_quote_is_revoked(self):
        client = register()
        access = client.tokens("o'neil")["access_token"]
        self.assertIn("done=revoked", submit("revoke", client=client.id, user="o'neil").location)
        self.assertEqual(whoami(access).status, 401)

    def test_everything_of_a_user_is_revoked_at_once(self):
        clients = [register(), register()]
        pairs = [client.tokens("o'neil") for client in clients]
        code, verifier = clients[0].log_in("o'neil")
        kept = clients[0].tokens("bob")
        page = show("?view=access&user=o%27neil").text
        fields = Form(page[page.index("Revoke everything"):]).fields
        self.assertEqual((fields["action"], fields["user"]), ("revoke-all", "o'neil"))
        answer = submit("revoke-all", user="o'neil")
        self.assertEqual(answer.location, "/admin?done=revoked&view=access&user=o%27neil")
        for client, pair in zip(clients, pairs):
            self.assertEqual(whoami(pair["access_token"]).status, 401)
            self.assertEqual(client.refresh(pair["refresh_token"]).status, 400)
        self.assertEqual(clients[0].redeem(code, verifier).status, 400)
        self.assertEqual(whoami(kept["access_token"]).status, 200)
        self.assertIn("No application has access", show("?view=access&user=o%27neil").text)
        self.assertIn("done=gone", submit("revoke-all", user="o'neil").location)
        self.assertIn("done=gone", submit("revoke-all", user="").location)
        self.assertEqual(whoami(kept["access_token"]).status, 200)

    def test_what_an_application_has_for_itself_is_revoked(self):
        client = register(client_name="Own <self>")
        own = client.post("token", grant_type="client_credentials").json["access_token"]
        pair = client.tokens("bob")
        self.assertIn(f'application={client.id}"><bdi>Own &lt;self&gt;', show("?view=access").text)
        page = show("?view=access&application=" + client.id).text
        self.assertIn("<h3>Own &lt;self&gt;</h3>", page)
        self.assertIn("<dt>Grants</dt><dd>1</dd>", page)
        answer = submit("revoke", client=client.id, user="")
        self.assertEqual(answer.location,
                         "/admin?done=revoked&view=access&application=" + client.id)
        self.assertEqual(whoami(own).status, 401)
        self.assertEqual(whoami(pair["access_token"]).status, 200, "of a user")
        self.assertIn("done=gone", submit("revoke", client=client.id, user="").location)

    def test_user_with_a_quote_is_found(self):
        register(client_name="Quoted").tokens("o'neil")
        self.assertIn("Quoted", show("?view=access&user=o%27neil").text)
        self.assertIn("o&#39;neil", show("?view=access").text)


    def test_only_what_still_lets_in_is_shown(self):
        client = register(client_name="Fading")
        client.tokens("o'neil")
        client.log_in("o'neil")
        client.post("token", grant_type="client_credentials")
        with sqlite3.connect(service.DATABASE) as file:
            for table in ("oauth_token", "oauth_grantCode"):
                file.execute(f"UPDATE {table} SET expired_time=CAST(unixepoch()-60 AS text)")
        users = show("?view=access").text
        self.assertIn("<bdi>o&#39;neil</bdi>", users)
        self.assertNotIn("Fading", users)
        shown = show("?view=access&user=o%27neil").text
        self.assertIn("Can be renewed", shown)
        self.assertNotIn("not signed in yet", shown)


class AuditLog(unittest.TestCase):
    def test_older_entries_are_pages_away(self):
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("DELETE FROM oauth_log")
            file.executemany("INSERT INTO oauth_log(msg, timestamp) VALUES(?, ?)",
                             [(f"Entry {i} of ''many''", 1_700_000_000 + i) for i in range(450)])
        seen, address = [], "?view=log&filter=of+%27many"
        while address:
            page = show(address).text
            seen += re.findall(r"Entry (\d+) of", page)
            older = re.search(r'href="/admin([^"]+)"[^>]*>Older', page)
            address = older and html.unescape(older[1])
        self.assertEqual(seen, [str(i) for i in reversed(range(450))])
        self.assertIn("Newer", page)

    def test_page_beyond_the_log_is_empty(self):
        for number in ("0", "-1", "99", "9" * 30, "x"):
            self.assertEqual(show("?view=log&page=" + number).status, 200, number)

    def test_filter_finds_quotes_and_shows_them_undoubled(self):
        for name in ("Joe's app", "Another"):
            submit("register", name=name, redirect=service.CALLBACK, **{"scope.profile": "1"})
        page = show("?view=log&filter=Joe%27s").text
        self.assertIn("Application registered[Joe&#39;s app ", page)
        self.assertNotIn("[Another", page)

    def test_changes_leave_an_entry(self):
        client = register(client_name="Traced")
        client.tokens()
        submit("disable", client=client.id)
        # One entry for all that register themselves: their names are anybody's.
        self.assertIn("Application registered itself[",
                      show("?view=log&filter=registered+itself").text)
        page = show("?view=log&filter=Traced").text
        self.assertIn(f"Application disabled[Traced {client.id[:8]}] by [admin]", page)

    def test_name_cannot_stand_for_another_entry(self):
        client = register(client_name="x] by [bob] Secret renewed[y")
        submit("disable", client=client.id)
        page = show("?view=log&filter=Application+disabled").text
        self.assertIn(f"[x) by (bob) Secret renewed(y {client.id[:8]}] by [admin]", page)


class Storage(unittest.TestCase):
    def test_rows_stand_beside_their_limits(self):
        with sqlite3.connect(service.DATABASE) as file:
            count = file.execute("SELECT count(*) FROM oauth_clientInfo").fetchone()[0]
        self.assertIn(f"<strong>{count}</strong> of 1000 rows", show("?view=storage").text)

    def test_what_gives_way_is_counted(self):
        with sqlite3.connect(service.DATABASE) as file:
            for table in ("oauth_token", "oauth_grantCode"):
                file.execute(f"DELETE FROM {table}")
        client = register()
        client.log_in()
        self.assertNotIn("would give way", show("?view=storage").text)
        client.tokens()
        self.assertIn("1 would give way to new rows</p>", show("?view=storage").text)


class Forgery(unittest.TestCase):
    def test_form_without_a_token_of_ours_changes_nothing(self):
        client = register()
        genuine = Form(show().text).fields["form_token"]
        consent = Form(client.ask("x" * 43, "admin").text).fields["form_token"]
        late = "1" + genuine[10:] if genuine[10] == "." else "1." + genuine.split(".")[1]
        for token in ("", "x", genuine[:-1], "9" + genuine, consent, late):
            answer = submit("disable", token, client=client.id)
            self.assertEqual(answer.status, 403, token)
            self.assertIn('href="/admin">Back</a>', answer.text)
        self.assertEqual(client.ask("x" * 43).status, 200)

    def test_query_does_not_change_anything(self):
        client = register()
        genuine = Form(show().text).fields["form_token"]
        show(f"?action=disable&client={client.id}&form_token={genuine}")
        self.assertEqual(client.ask("x" * 43).status, 200)


if __name__ == "__main__":
    unittest.main()
