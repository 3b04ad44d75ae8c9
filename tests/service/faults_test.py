"""What once went wrong with services on these stores, and must not: a login lost
in a crash, a name that grows, everybody logged out by one, a thief who is never
found out. SERVICE_LIMIT says how many rows the tables have while they are flooded."""

import ctypes
import json
import os
import sqlite3
import struct
import unittest

import service
from service import (FORM, Form, Killed, as_user, challenge_of, encode, introspect, killed_at,
                     later, register, send, whoami)
from trouble_test import limits

MOST_STEPS = 200


def rows(table):
    with sqlite3.connect(service.DATABASE) as file:
        return file.execute(f"SELECT count(*) FROM {table}").fetchone()[0]


def empty(*tables):
    with sqlite3.connect(service.DATABASE) as file:
        for table in tables:
            file.execute(f"DELETE FROM {table}")


def submit(action, **fields):
    page = send("GET", "/admin?view=register", headers=as_user("admin"))
    form = {"action": action, "form_token": Form(page.text).fields["form_token"], **fields}
    return send("POST", "/admin", encode(form), {**FORM, **as_user("admin")})


def setUpModule():
    """Floods that nothing slows down: what keeps others safe holds on its own."""
    path = service.RUN + "/settings.json"
    with open(path, encoding="utf-8") as file:
        settings = json.load(file)
    with open(path, "w", encoding="utf-8") as file:
        json.dump({**settings, "counters_file": ""}, file)


class Crashes(unittest.TestCase):
    """The token program is killed before each change that it makes to a file, and
    the client tries again."""

    def setUp(self):
        self.client = register()

    def at_each_step(self, prepare, request, check):
        """How many steps there are. `check` gets what was prepared and whether the
        request had its effect."""
        for step in range(1, MOST_STEPS):
            empty("oauth_token", "oauth_grantCode")
            prepared = prepare()
            try:
                with killed_at(step):
                    answer = request(prepared)
                self.assertEqual(answer.status, 200)
                return step - 1
            except Killed:
                with self.subTest(step=step):
                    check(prepared)
        self.fail("there is no end to the steps")

    def test_a_code_is_redeemed_whole_or_not_at_all(self):
        effects = set()

        def check(login):
            effect = rows("oauth_token")
            effects.add(effect)
            again = self.client.redeem(*login)
            if effect == 0:
                self.assertEqual(again.status, 200, again.text)
                self.assertEqual(whoami(again.json["access_token"]).status, 200)
            else:
                self.assertEqual(again.json["error"], "invalid_grant")
            self.assertEqual(rows("oauth_token"), 1)

        steps = self.at_each_step(self.client.log_in, lambda login: self.client.redeem(*login),
                                  check)
        self.assertGreater(steps, 3)
        self.assertIn(0, effects)

    def test_a_login_is_refreshed_whole_or_not_at_all(self):
        old_is_good = set()

        def check(pair):
            good = whoami(pair["access_token"]).status == 200
            old_is_good.add(good)
            again = self.client.refresh(pair["refresh_token"])
            if good:
                self.assertEqual(again.status, 200, again.text)
                self.assertEqual(whoami(again.json["access_token"]).status, 200)
            else:
                self.assertEqual(again.json["error"], "invalid_grant")
            self.assertEqual(rows("oauth_token"), 1)

        steps = self.at_each_step(self.client.tokens,
                                  lambda pair: self.client.refresh(pair["refresh_token"]), check)
        self.assertGreater(steps, 3)
        self.assertIn(True, old_is_good)

    def test_an_application_is_removed_with_all_it_has_or_not_at_all(self):
        def prepare():
            client = register()
            client.log_in("bob")
            return client, client.tokens("bob")

        def check(prepared):
            client, pair = prepared
            there = client.ask("x" * 43).status == 200
            self.assertEqual(rows("oauth_token"), 1 if there else 0)
            self.assertEqual(rows("oauth_grantCode"), 2 if there else 0)
            self.assertEqual(whoami(pair["access_token"]).status, 200 if there else 401)

        def request(prepared):
            page = send("GET", "/admin?view=register", headers=as_user("admin"))
            form = {"action": "remove", "form_token": Form(page.text).fields["form_token"],
                    "client": prepared[0].id}
            answer = send("POST", "/admin", encode(form), {**FORM, **as_user("admin")})
            answer.status = {303: 200}.get(answer.status, answer.status)
            return answer

        self.assertGreater(self.at_each_step(prepare, request, check), 3)


class Names(unittest.TestCase):
    """Whoever has a quote in their name stays who they are."""

    USER = "o'neil"

    def check(self, client, pair):
        holder = whoami(pair["access_token"]).json
        self.assertEqual((holder["sub"], holder["client_id"]), (self.USER, client.id))
        self.assertEqual(introspect(client, pair["refresh_token"]).json["username"], self.USER)

    def test_names_stay_as_they_are_through_ten_refreshes(self):
        client = register(client_name="O'Brien''s \\ app")
        pair = client.tokens(self.USER, scope="profile files.read")
        self.check(client, pair)
        for scope in ("profile", None) * 5:
            answer = client.refresh(pair["refresh_token"], scope=scope)
            self.assertEqual(answer.status, 200, answer.text)
            pair = answer.json
            self.check(client, pair)
        shown = send("GET", "/admin?view=access&user=o%27neil", headers=as_user("admin")).text
        self.assertIn("<bdi>O&#39;Brien&#39;&#39;s \\ app</bdi></h3>", shown)
        self.assertIn("Access for <bdi>o&#39;neil<", shown)

    def test_logged_out_everywhere_is_logged_out(self):
        clients = [register(), register()]
        pairs = []
        for client in clients:
            pair = client.tokens(self.USER)
            pairs += [client.refresh(pair["refresh_token"]).json, client.tokens(self.USER)]
        code, verifier = clients[0].log_in(self.USER)
        self.assertIn("done=revoked", submit("revoke-all", user=self.USER).location)
        for index, pair in enumerate(pairs):
            self.assertEqual(whoami(pair["access_token"]).status, 401)
            self.assertEqual(clients[index // 2].refresh(pair["refresh_token"]).status, 400)
        self.assertEqual(clients[0].redeem(code, verifier).status, 400)


class Floods(unittest.TestCase):
    """Nobody is logged out by what somebody else does, and everybody can log in."""

    LIMIT = int(os.environ.get("SERVICE_LIMIT", "24"))
    FLOOD = 3 * LIMIT

    def setUp(self):
        self.client = register()
        empty("oauth_token", "oauth_grantCode")
        # Good only for refreshing any more: what a purge would take first.
        self.idle = self.client.tokens("bob")

    def flooded(self, flood):
        """The flood is over by the time that the idle login's token has expired."""
        with limits(token_max=self.LIMIT, grantcode_max=self.LIMIT):
            with later(3600):
                flood()
                self.assertLessEqual(rows("oauth_token"), self.LIMIT)
                self.assertEqual(whoami(self.idle["access_token"]).status, 401)
                answer = self.client.refresh(self.idle["refresh_token"])
                self.assertEqual(answer.status, 200, answer.text)
                self.assertEqual(whoami(answer.json["access_token"]).status, 200)
                self.assertEqual(self.client.tokens("o'neil")["scope"], "profile")
                register().tokens("bob")

    def test_by_an_application_that_fetches_tokens_without_end(self):
        robot = register()

        def flood():
            for _ in range(self.FLOOD):
                answer = robot.post("token", grant_type="client_credentials")
                self.assertEqual(answer.status, 200, answer.text)
            self.assertEqual(whoami(answer.json["access_token"]).status, 200)

        self.flooded(flood)

    def test_by_a_user_who_logs_in_without_end(self):
        def flood():
            for _ in range(self.FLOOD):
                last = self.client.tokens("alice")
            self.assertEqual(whoami(last["access_token"]).status, 200)

        self.flooded(flood)

    def test_by_a_user_with_many_applications(self):
        clients = [register() for _ in range(self.LIMIT)]

        def flood():
            for client in clients:
                for _ in range(2):
                    last = client.tokens("alice")
            self.assertEqual(whoami(last["access_token"]).status, 200)

        self.flooded(flood)

    def test_by_a_user_who_allows_without_end(self):
        page = self.client.ask(challenge_of("v" * 43))

        def flood():
            fresh = self.client.ask(challenge_of("v" * 43))
            for _ in range(self.FLOOD):
                self.assertEqual(self.client.decide(fresh).status, 303)

        self.flooded(flood)
        self.assertEqual(self.client.decide(page).status, 303)

    def test_the_ninth_login_ends_the_one_renewed_longest_ago(self):
        pairs = [self.client.tokens("alice") for _ in range(8)]
        with later(60):
            pairs.append(self.client.refresh(pairs.pop(0)["refresh_token"]).json)
            self.assertEqual({whoami(pair["access_token"]).status for pair in pairs}, {200})
        with later(120):
            pairs.append(self.client.tokens("alice"))
            ended = pairs.pop(0)
            self.assertEqual(whoami(ended["access_token"]).status, 401)
            self.assertEqual(self.client.refresh(ended["refresh_token"]).status, 400)
            self.assertEqual({whoami(pair["access_token"]).status for pair in pairs}, {200})
            self.assertEqual(self.client.refresh(self.idle["refresh_token"]).status, 200)

    def test_by_applications_that_register_themselves(self):
        self.client.tokens("alice")
        with sqlite3.connect(service.DATABASE) as file:
            file.execute("DELETE FROM oauth_clientInfo WHERE client_id NOT IN"
                         " (SELECT client_id FROM oauth_token)")
        with limits(client_info_max=self.LIMIT):
            for _ in range(self.FLOOD):
                register()
            self.assertLessEqual(rows("oauth_clientInfo"), self.LIMIT // 2 + 1)
            self.assertEqual(self.client.refresh(self.idle["refresh_token"]).status, 200)
            answer = submit("register", name="By hand", redirect=service.CALLBACK,
                            **{"scope.profile": "1"})
            self.assertEqual(answer.status, 303)


class Thieves(unittest.TestCase):
    """A stolen refresh token is found out as soon as both have used it."""

    def setUp(self):
        self.client = register()

    def test_who_refreshes_every_seven_seconds_is_found_out(self):
        first = self.client.tokens()
        stolen = first["refresh_token"]
        for turn in range(1, 6):
            with later(7 * turn):
                answer = self.client.refresh(stolen)
                self.assertEqual(answer.status, 200)
                stolen, access = answer.json["refresh_token"], answer.json["access_token"]
        with later(7 * 5 + 3):
            self.assertEqual(whoami(access).status, 200)
            answer = self.client.refresh(first["refresh_token"])
            self.assertEqual((answer.status, answer.json["error"]), (400, "invalid_grant"))
            self.assertEqual(whoami(access).status, 401)
            self.assertEqual(self.client.refresh(stolen).status, 400)
        log = send("GET", "/admin?view=log&filter=replay", headers=as_user("admin")).text
        self.assertIn("for [alice] after a replay[Test client ", log)

    def test_who_redeems_and_refreshes_is_found_out_when_the_code_comes_again(self):
        code, verifier = self.client.log_in()
        pair = self.client.redeem(code, verifier).json
        with later(7):
            pair = self.client.refresh(pair["refresh_token"]).json
        with later(14):
            self.assertEqual(self.client.redeem(code, verifier).status, 400)
            self.assertEqual(whoami(pair["access_token"]).status, 401)

    def test_trying_twice_within_ten_seconds_is_no_theft(self):
        old = self.client.tokens()
        with later(100):
            new = self.client.refresh(old["refresh_token"]).json
        with later(109):
            self.assertEqual(self.client.refresh(old["refresh_token"]).status, 400)
            self.assertEqual(self.client.refresh(new["refresh_token"]).status, 200)

    def test_a_clock_that_was_set_back_gives_no_grace(self):
        old = self.client.tokens()
        with later(3600):
            new = self.client.refresh(old["refresh_token"]).json
        self.assertEqual(self.client.refresh(old["refresh_token"]).status, 400)
        self.assertEqual(self.client.refresh(new["refresh_token"]).status, 400)

    def test_the_file_holds_nothing_that_opens_anything(self):
        code, verifier = self.client.log_in()
        pair = self.client.redeem(code, verifier).json
        own = self.client.post("token", grant_type="client_credentials").json["access_token"]
        unused, _ = self.client.log_in()
        with open(service.DATABASE, "rb") as file:
            content = file.read()
        for text in (code, unused, own, pair["access_token"], pair["refresh_token"],
                     self.client.id, self.client.secret):
            self.assertNotIn(text.encode(), content)
        with sqlite3.connect(service.DATABASE) as file:
            stored = [text for row in file.execute(
                "SELECT access_token, refresh_token FROM oauth_token") for text in row]
            codes = [text for text, in file.execute("SELECT code FROM oauth_grantCode")]
        for text in stored:
            self.assertEqual(whoami(text).status, 401)
            self.assertEqual(self.client.refresh(text).status, 400)
            self.assertEqual(introspect(self.client, text).json, {"active": False})
        for text in codes:
            self.assertEqual(self.client.redeem(text, verifier).status, 400)
        self.assertEqual(whoami(pair["access_token"]).status, 200)


class Opens:
    """How often the database file is opened meanwhile, by whomever (inotify)."""

    IN_OPEN, NONBLOCK = 0x20, 0o4000
    EVENT = struct.Struct("iIII")

    def __enter__(self):
        libc = ctypes.CDLL(None, use_errno=True)
        self.watch = libc.inotify_init1(self.NONBLOCK)
        path = service.DATABASE.encode()
        assert self.watch >= 0 and libc.inotify_add_watch(self.watch, path, self.IN_OPEN) >= 0
        return self

    def __exit__(self, *_):
        try:
            events = os.read(self.watch, 65536)
        except BlockingIOError:
            events = b""
        os.close(self.watch)
        self.count = len(events) // self.EVENT.size


class Costs(unittest.TestCase):
    """A request that needs the database opens it once; another one not at all."""

    def setUp(self):
        self.client = register()

    def assertOpens(self, expected, request, status=200):
        with Opens() as opens:
            answer = request()
        self.assertEqual((answer.status, opens.count), (status, expected))
        return answer

    def test_each_request_opens_the_database_once(self):
        client, verifier = self.client, "v" * 43
        page = self.assertOpens(1, lambda: client.ask(challenge_of(verifier)))
        code = self.assertOpens(1, lambda: client.decide(page), 303).returned["code"]
        pair = self.assertOpens(1, lambda: client.redeem(code, verifier)).json
        pair = self.assertOpens(1, lambda: client.refresh(pair["refresh_token"])).json
        self.assertOpens(1, lambda: client.post("token", grant_type="client_credentials"))
        self.assertOpens(1, lambda: whoami(pair["access_token"]))
        self.assertOpens(1, lambda: introspect(client, pair["access_token"]))
        self.assertOpens(1, lambda: client.post("revoke", token=pair["access_token"]))
        self.assertOpens(1, lambda: service.register_raw({"redirect_uris": [service.CALLBACK]}),
                         201)
        for path in ("/account", "/admin", "/admin?view=access", "/admin?view=log",
                     "/admin?view=storage", "/admin?view=application&client=" + client.id):
            self.assertOpens(
                1, lambda: send("GET", path, headers=as_user("admin")))  # pylint: disable=cell-var-from-loop

    def test_a_request_that_is_refused_for_its_form_does_not_open_it(self):
        self.assertOpens(0, lambda: send("GET", "/.well-known/oauth-authorization-server"))
        self.assertOpens(0, lambda: send("GET", "/api/whoami"), 401)
        self.assertOpens(0, lambda: send("POST", "/oauth/token", "x=%", FORM), 400)
        self.assertOpens(0, lambda: send("POST", "/oauth/token", "x=1", FORM), 401)
        self.assertOpens(0, lambda: service.register_raw("{"), 400)
        self.assertOpens(0, lambda: send("POST", "/admin", "action=remove",
                                         {**FORM, **as_user("admin")}), 403)


if __name__ == "__main__":
    unittest.main()
