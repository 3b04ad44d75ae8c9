"""The page of a user's own applications, without a browser: what its forms do and
refuse."""

import sqlite3
import unittest

import service
from service import FORM, as_user, encode, forms, register, send, whoami

def account(user="alice", query=""):
    return send("GET", "/account" + query, headers=as_user(user))


def take_back(fields, user="alice"):
    return send("POST", "/account", encode(fields), {**FORM, **as_user(user)})


class Account(unittest.TestCase):
    def setUp(self):
        account()  # the store is made by who first needs it
        with sqlite3.connect(service.DATABASE) as file:
            for table in ("oauth_token", "oauth_grantCode"):
                file.execute(f"DELETE FROM {table}")

    def test_says_what_each_application_can_do_in_words(self):
        register(client_name="My <reader>").tokens(scope="profile files.read")
        page = account().text
        for text in ("<bdi>My &lt;reader&gt;</bdi>", "See and download your files", "127.0.0.1",
                     "Since", "Last used", "Can renew until", "In use"):
            self.assertIn(text, page)
        self.assertNotIn("xpired", page)
        self.assertNotIn("/admin", page)
        self.assertIn("/admin", account("admin").text)
        self.assertIn("No application has access in your name", account("bob").text)

    def test_access_is_taken_back_once(self):
        client, other = register(client_name="A"), register(client_name="B")
        pair, kept = client.tokens(), other.tokens()
        bobs = client.tokens("bob")
        fields = forms(account())[0]
        self.assertEqual(fields["what"], "application." + client.id)
        self.assertIn("done=ended", take_back(fields).location)
        self.assertIn("taken back", account(query="?done=ended").text)
        self.assertIn("done=gone", take_back(fields).location)
        self.assertEqual(whoami(pair["access_token"]).status, 401)
        for other_pair in (kept, bobs):
            self.assertEqual(whoami(other_pair["access_token"]).status, 200)

    def test_one_sign_in_of_several_is_ended(self):
        client = register(client_name="Devices")
        pairs = [client.tokens() for _ in range(3)]
        ends = [fields for fields in forms(account()) if fields["what"].startswith("login.")]
        self.assertEqual(len(ends), 3)
        self.assertIn("done=ended", take_back(ends[0]).location)
        self.assertEqual(sorted(whoami(pair["access_token"]).status for pair in pairs),
                         [200, 200, 401])
        self.assertIn("done=gone", take_back(ends[0]).location)

    def test_sign_in_that_was_renewed_since_the_page_was_shown_is_ended(self):
        client = register()
        pairs = [client.tokens() for _ in range(2)]
        ends = [fields for fields in forms(account()) if fields["what"].startswith("login.")]
        pairs = [client.refresh(pair["refresh_token"]).json for pair in pairs]
        self.assertIn("done=ended", take_back(ends[0]).location)
        self.assertEqual(sorted(whoami(pair["access_token"]).status for pair in pairs),
                         [200, 401])

    def test_everything_is_taken_back(self):
        pairs = [register().tokens() for _ in range(2)]
        bobs = register().tokens("bob")
        self.assertIn("done=ended", take_back(forms(account())[-1]).location)
        for pair in pairs:
            self.assertEqual(whoami(pair["access_token"]).status, 401)
        self.assertEqual(whoami(bobs["access_token"]).status, 200)

    def test_nobody_takes_back_what_is_anothers(self):
        client = register()
        pairs = [client.tokens() for _ in range(2)]
        for fields in forms(account()):
            answer = take_back(fields, "bob")
            self.assertEqual(answer.status, 403)
            self.assertIn('/account">Back</a>', answer.text)
        # The tokens of bob's own forms cover what these are about.
        client.tokens("bob")
        bobs = forms(account("bob"))[0]
        for fields in forms(account()):
            self.assertEqual(take_back({**bobs, "what": fields["what"]}, "bob").status,
                             303 if fields["what"] == bobs["what"] else 403)
        for pair in pairs:
            self.assertEqual(whoami(pair["access_token"]).status, 200)


if __name__ == "__main__":
    unittest.main()
