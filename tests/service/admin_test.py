"""The administrator's page, without a browser: what its forms do and refuse."""

import html
import re
import sqlite3
import unittest

import service
from service import FORM, Form, as_user, encode, forms, register, send, whoami


def show(query="", user="admin"):
    return send("GET", "/admin" + query, headers=as_user(user))


def submit(action, token=None, **fields):
    token = Form(show("?view=register").text).fields["form_token"] if token is None else token
    return send("POST", "/admin", encode({"action": action, "form_token": token, **fields}),
                {**FORM, **as_user("admin")})


def follow(answer, user="admin"):
    assert answer.status == 303, (answer.status, answer.text)
    return send("GET", answer.location[len(service.BASE):], headers=as_user(user))


def pasted(page):
    """Identifier and secret, as the card for pasting has them."""
    return re.findall(r"<code[^>]*>([0-9a-f]{64})</code>", page.text)


def register_by_hand(name, **more):
    """An application that the administrator has registered, with two scopes."""
    answer = submit("register", name=name, redirect=service.CALLBACK,
                    **{"scope.profile": "1", "scope.files.read": "1"}, **more)
    return service.Client(*pasted(follow(answer)))


def about(client, word=None):
    """The path of an application's page; with the word for what was done."""
    path = "/admin?view=application&client=" + client.id
    return path + "&done=" + word if word else path


def fields_of(client, action):
    """Of the form that does this to an application."""
    page = send("GET", about(client), headers=as_user("admin"))
    return next(fields for fields in forms(page) if fields["action"] == action)


class Page(unittest.TestCase):
    def test_is_for_administrators_alone(self):
        self.assertEqual(send("GET", "/admin").status, 401)
        self.assertIn(show(user="alice").status, (401, 403))

    def test_policy_allows_no_script(self):
        client = register()
        for query in ("", "?view=access", "?view=log", "?view=storage", "?view=register",
                      about(client).removeprefix("/admin")):
            answer = show(query)
            self.assertEqual(answer.status, 200, query)
            policy = answer.headers["Content-Security-Policy"]
            self.assertIn("default-src 'none'", policy)
            self.assertNotIn("unsafe", policy)
            self.assertNotIn("<script", answer.text)
            self.assertEqual(answer.headers["Cache-Control"], "no-store")

    def test_page_that_is_none_is_told_to_people_as_a_page(self):
        answer = send("GET", "/accounts", headers={"Accept": "text/html,*/*"})
        self.assertEqual(answer.status, 404)
        self.assertIn('/account">Back</a>', answer.text)
        self.assertEqual(send("GET", "/accounts").text, "404 Not Found\n")

    def test_style_is_served(self):
        for name in ("service", "lists"):
            sheet = send("GET", f"/style/{name}.css")
            self.assertEqual((sheet.status, sheet.headers.get_content_type()), (200, "text/css"))
        self.assertEqual(send("GET", "/style/../http.cpp").status, 404)


class Applications(unittest.TestCase):
    def test_registered_one_works_and_its_secret_is_shown_to_who_registered_it(self):
        answer = submit("register", name="O'Brien's <Viewer>", redirect=service.CALLBACK,
                        **{"scope.profile": "1"})
        page = follow(answer)
        client = service.Client(*pasted(page))
        for text in (service.ISSUER, service.CALLBACK, "Copy it now"):
            self.assertIn(html.escape(text), page.text)
        self.assertEqual(whoami(client.tokens()["access_token"]).status, 200)
        self.assertIn(html.escape("O'Brien's <Viewer>").replace("&#x27;", "&#39;"), show().text)
        for path in ("/admin", about(client), about(client) + "&secret_token=9999999999.x"):
            page = send("GET", path, headers=as_user("admin")).text
            self.assertNotIn(client.secret, page)

    def test_secret_is_not_shown_a_quarter_of_an_hour_later(self):
        answer = submit("register", name="Slow", redirect=service.CALLBACK,
                        **{"scope.profile": "1"})
        self.assertIn("Copy it now", follow(answer).text)
        with service.later(15 * 60 + 1):
            page = follow(answer)
        self.assertEqual(page.status, 200)
        self.assertNotIn("Copy it now", page.text)

    def test_form_that_is_sent_twice_registers_one(self):
        form = Form(show("?view=register").text).fields
        fields = {**form, "name": "Twice", "redirect": service.CALLBACK, "scope.profile": "1"}
        first, second = [submit(form["action"], form["form_token"], **{
            name: value for name, value in fields.items() if name not in ("action", "form_token")})
            for _ in range(2)]
        pages = [follow(first), follow(second)]
        self.assertEqual(pasted(pages[0]), pasted(pages[1]))
        self.assertEqual(len(pasted(pages[0])), 2)
        self.assertEqual(show("?contains=Twice").text.count("<bdi>Twice</bdi>"), 1)
        fields.update(name="Another", action="register")
        again = send("POST", "/admin", encode(fields), {**FORM, **as_user("admin")})
        self.assertIn("done=again", again.location)
        self.assertIn("had been sent before", follow(again).text)
        self.assertNotIn("Another", show("?contains=Another").text.split("</form>")[-1])

    def test_secret_is_renewed_once_by_two_clicks(self):
        client = register_by_hand("Renewed")
        fields = fields_of(client, "renew")
        answers = [send("POST", "/admin", encode(fields), {**FORM, **as_user("admin")})
                   for _ in range(2)]
        secrets = [pasted(follow(answer)) for answer in answers]
        self.assertEqual(secrets[0], secrets[1])
        self.assertNotEqual(secrets[0][1], client.secret)
        renewed = service.Client(*secrets[0])
        self.assertEqual(client.post("token", grant_type="client_credentials").status, 401)
        self.assertEqual(renewed.post("token", grant_type="client_credentials").status, 200)

    def test_public_one_has_no_secret_and_its_own_scheme(self):
        answer = submit("register", name="Pocket", kind="public",
                        redirect="http://127.0.0.1/back\r\ncom.example.pocket:/back",
                        **{"scope.profile": "1"})
        page = follow(answer)
        self.assertEqual(len(pasted(page)), 1)
        for text in ("It is a public application", "com.example.pocket:/back", "“none”"):
            self.assertIn(text, page.text)
        self.assertNotIn("Renew", page.text)
        self.assertNotIn("without_pkce", page.text)

    def test_addresses_scopes_and_name_are_changed(self):
        client = register_by_hand("Before")
        fields = {**fields_of(client, "change"), "name": "After <b>",
                  "redirect": "https://a.example/x https://b.example/y",
                  "logout": "https://a.example/bye", "without_pkce": "1", "scope.files.read": "1"}
        fields.pop("scope.profile", None)
        for _ in range(2):
            answer = send("POST", "/admin", encode(fields), {**FORM, **as_user("admin")})
            self.assertEqual(answer.location, service.BASE + about(client, "changed"))
        page = follow(answer).text
        for text in ("<bdi>After &lt;b&gt;</bdi>", "https://b.example/y", "https://a.example/bye",
                     "<code>files.read</code>"):
            self.assertIn(text, page)
        self.assertEqual(client.ask("", redirect_uri="https://b.example/y", scope="files.read",
                                    code_challenge=None, code_challenge_method=None).status, 200)
        log = show("?view=log&filter=" + client.id[:8]).text
        self.assertEqual(log.count("Application changed"), 1, log)

    def test_faulty_change_changes_nothing(self):
        client = register_by_hand("Steady")
        for change in ({"redirect": "http://evil.example/"}, {"name": " "}, {"logout": "x:y"},
                       {"scope.profile": None}):
            fields = {**fields_of(client, "change"), "name": "Steady", "scope.profile": "1",
                      "redirect": service.CALLBACK, **change}
            answer = send("POST", "/admin", encode(fields), {**FORM, **as_user("admin")})
            self.assertEqual(answer.status, 400, change)
            self.assertIn('role="alert"', answer.text)
        self.assertEqual(client.ask("x" * 43, scope="files.read").status, 200)

    def test_they_are_shown_by_fifties_and_found(self):
        token = Form(show("?view=register").text).fields["form_token"]
        made = [submit("register", token, name=f"Many {i:03}", redirect=service.CALLBACK,
                       **{"scope.profile": "1"}) for i in range(101)]
        seen, path = [], "?contains=many"
        while path:
            page = show(path).text
            found = re.findall(r"<bdi>(Many \d+)</bdi>", page)
            self.assertLessEqual(len(found), 50)
            seen += found
            following = re.search(r'href="[^"]*/admin([^"]+)">Next', page)
            path = following and html.unescape(following[1])
        self.assertEqual(seen, [f"Many {i:03}" for i in range(101)])
        self.assertIn("<bdi>Many 007</bdi>", show("?contains=" + made[7].returned["client"]).text)
        self.assertIn("No application is registered that fits", show("?contains=zzz").text)

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
        self.assertEqual(submit("disable", client=client.id).location,
                         service.BASE + about(client, "disabled"))
        self.assertEqual(client.ask("x" * 43).status, 403)
        self.assertEqual(client.refresh(pair["refresh_token"]).json["error"], "invalid_client")
        self.assertEqual(whoami(pair["access_token"]).status, 401)
        self.assertEqual(submit("enable", client=client.id).location,
                         service.BASE + about(client, "enabled"))
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
            self.assertEqual(submit("remove", client=client.id).location,
                             service.BASE + "/admin?done=removed")
            self.assertEqual((left("oauth_token"), left("oauth_grantCode")), (0, 0))
        self.assertEqual(whoami(access).status, 401)
        self.assertNotIn(client.id, show().text)
        self.assertEqual(submit("remove", client=client.id).location,
                         service.BASE + "/admin?done=gone")
        self.assertEqual(submit("enable", client=client.id).location,
                         service.BASE + "/admin?done=gone")


class Access(unittest.TestCase):
    def test_revoking_ends_every_grant_to_the_application(self):
        client = register_by_hand("Revoked")
        pairs = [client.tokens("bob"), client.tokens("bob", scope="profile files.read")]
        code, verifier = client.log_in("bob")
        page = show("?view=access&user=bob").text
        self.assertEqual(page.count("<bdi>Revoked</bdi></h3>"), 1)
        self.assertIn("<dt>Sign-ins</dt><dd>3</dd>", page)
        self.assertIn("<li>files.read</li>", page)
        fields = Form(page[page.index('method="post"') - 6:]).fields
        answer = submit("revoke", **{k: fields[k] for k in ("client", "user")})
        self.assertEqual(answer.location, service.BASE + "/admin?done=revoked&view=access&user=bob")
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
        self.assertEqual(answer.location,
                         service.BASE + "/admin?done=revoked&view=access&user=o%27neil")
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
        self.assertIn(f'application={client.id}">for itself',
                      show("?view=access&contains=own+%3Cself").text)
        page = show("?view=access&application=" + client.id).text
        self.assertIn("<h3><bdi>Own &lt;self&gt;</bdi></h3>", page)
        self.assertIn("<dt>Sign-ins</dt><dd>1</dd>", page)
        answer = submit("revoke", client=client.id, user="")
        self.assertEqual(answer.location,
                         service.BASE + "/admin?done=revoked&view=access&application=" + client.id)
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
        users = show("?view=access&with=" + client.id).text
        self.assertEqual(users.count("<tr><td"), 1, users)
        self.assertIn("<bdi>o&#39;neil</bdi>", users)
        shown = show("?view=access&user=o%27neil").text
        self.assertIn("Idle, can renew", shown)
        self.assertIn("Can renew until", shown)
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
            older = re.search(r'href="[^"]*/admin([^"]+)"[^>]*>Older', page)
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
    def test_room_that_is_left_is_said(self):
        with sqlite3.connect(service.DATABASE) as file:
            count = file.execute("SELECT count(*) FROM oauth_clientInfo").fetchone()[0]
        page = show("?view=storage").text
        self.assertIn(f"Room for <strong>{1000 - count}</strong> more", page)
        self.assertIn(f"{count} of 1000<", page)

    def test_what_gives_way_is_counted(self):
        with sqlite3.connect(service.DATABASE) as file:
            for table in ("oauth_token", "oauth_grantCode"):
                file.execute(f"DELETE FROM {table}")
        client = register()
        client.log_in()
        self.assertNotIn("give way", show("?view=storage").text)
        client.tokens()
        self.assertIn("1 give way when others need the room</p>", show("?view=storage").text)

    def test_full_is_said_with_what_to_do(self):
        with sqlite3.connect(service.DATABASE) as file:
            most = 1000 - file.execute("SELECT count(*) FROM oauth_clientInfo").fetchone()[0]
            columns = [row[1] for row in file.execute("PRAGMA table_info(oauth_clientInfo)")
                       if row[1] not in ("id", "client_id")]
            names = ", ".join(columns)
            file.executemany(
                f"INSERT INTO oauth_clientInfo(client_id, {names}) SELECT ?, {names} "
                "FROM oauth_clientInfo ORDER BY id LIMIT 1", [(f"full{i}",) for i in range(most)])
        try:
            page = show("?view=storage").text
            self.assertIn('<strong class="full">Full</strong>', page)
            self.assertIn("remove those that nobody uses", page)
            answer = submit("register", name="One more", redirect=service.CALLBACK,
                            **{"scope.profile": "1"})
            self.assertEqual(answer.status, 400)
            self.assertIn("There is no room for another application", answer.text)
        finally:
            with sqlite3.connect(service.DATABASE) as file:
                file.execute("DELETE FROM oauth_clientInfo WHERE client_id LIKE 'full%'")


class Forgery(unittest.TestCase):
    def test_form_without_a_token_of_ours_changes_nothing(self):
        client = register()
        genuine = Form(show("?view=register").text).fields["form_token"]
        consent = Form(client.ask("x" * 43, "admin").text).fields["form_token"]
        late = "1" + genuine[10:] if genuine[10] == "." else "1." + genuine.split(".")[1]
        for token in ("", "x", genuine[:-1], "9" + genuine, consent, late):
            answer = submit("disable", token, client=client.id)
            self.assertEqual(answer.status, 403, token)
            self.assertIn('/admin">Back</a>', answer.text)
        self.assertEqual(client.ask("x" * 43).status, 200)

    def test_query_does_not_change_anything(self):
        client = register()
        genuine = Form(show("?view=register").text).fields["form_token"]
        show(f"?action=disable&client={client.id}&form_token={genuine}")
        self.assertEqual(client.ask("x" * 43).status, 200)


if __name__ == "__main__":
    unittest.main()
