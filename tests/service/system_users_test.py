"""Signing in with the users of the system: the program as the web server starts
it, pwauth and PAM as Debian has them, and users that exist in this test's own
mounts alone. Usage: system_users_test.py PROGRAM [RUNNER]"""

import html
import json
import os
import re
import subprocess
import sys
import tempfile
import unittest
from urllib.parse import urlencode

PROGRAM = sys.argv[2:] + [sys.argv[1]]
FOLDER = tempfile.mkdtemp(prefix="system-users.", dir="/tmp")
SETTINGS = os.path.join(FOLDER, "service.json")
PEER = "192.0.2.1"


def write(name, text, mode=0o600):
    path = os.path.join(FOLDER, name)
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)
    os.chmod(path, mode)
    return path


def cover(path, text, mode):
    """Lets this process and its children see `text` in place of a file."""
    subprocess.run(["mount", "-n", "--bind", write(os.path.basename(path), text, mode), path],
                   check=True)


def password_hash(password):
    return subprocess.run(["openssl", "passwd", "-6", "-stdin"], input=password, text=True,
                          capture_output=True, check=True).stdout.strip()


def set_up():
    users = [("carol", 4001, "pass word"), ("dave", 4002, ""), ("late", 4003, "old")]
    passwd = open("/etc/passwd", encoding="utf-8").read()
    shadow = "root:*:19000:0:99999:7:::\n"
    for name, number, password in users:
        passwd += f"{name}:x:{number}:{number}::/:/bin/sh\n"
        hashed = password_hash(password) if password else ""
        expires = "1" if name == "late" else ""
        shadow += f"{name}:{hashed}:19000:0:99999:7::{expires}:\n"
    cover("/etc/passwd", passwd, 0o644)
    cover("/etc/shadow", shadow, 0o600)
    write("service.keys.json", json.dumps({"form_key": "f" * 32, "session_key": "s" * 32}))
    write("service.json", json.dumps({
        "issuer": "https://box.example", "sign_in": "system", "administrators": ["carol"],
        "counters_file": os.path.join(FOLDER, "counters")}))


def cgi(method, path, query="", form=None, cookie=""):
    """Status, headers and body of an answer."""
    body = urlencode(form or {}).encode()
    environment = {
        "KELDOAUTH_SERVICE_SETTINGS": SETTINGS, "REQUEST_METHOD": method, "SCRIPT_NAME": path,
        "QUERY_STRING": query, "REMOTE_ADDR": PEER, "HTTPS": "on", "HTTP_COOKIE": cookie,
        "CONTENT_LENGTH": str(len(body)), "CONTENT_TYPE": "application/x-www-form-urlencoded",
        "LD_LIBRARY_PATH": os.environ.get("LD_LIBRARY_PATH", "")}
    answer = subprocess.run(PROGRAM, input=body, env=environment, capture_output=True,
                            check=True).stdout.decode()
    head, _, text = answer.partition("\r\n\r\n")
    lines = [line.split(": ", 1) for line in head.split("\r\n")]
    return int(lines[0][1].split()[0]), lines[1:], text


def cookies(headers):
    values = [value.split(";")[0] for name, value in headers if name == "Set-Cookie"]
    return "; ".join(value for value in values if not value.endswith("="))


def sign_in(user, password):
    _, headers, page = cgi("GET", "/oauth/sign-in", "next=%2Fadmin")
    fields = dict(re.findall(r'name="(next|form_token)" value="([^"]*)"', page))
    form = {name: html.unescape(value) for name, value in fields.items()}
    form.update(user=user, password=password)
    return cgi("POST", "/oauth/sign-in", form=form, cookie=cookies(headers))


class SystemUsers(unittest.TestCase):
    def test_the_right_password_signs_in(self):
        status, headers, _ = sign_in("carol", "pass word")
        self.assertEqual((status, dict(headers)["Location"]), (303, "/admin"))
        status, _, page = cgi("GET", "/admin", cookie=cookies(headers))
        self.assertEqual(status, 200)
        self.assertIn("carol", page)

    def test_a_wrong_password_does_not(self):
        self.assertEqual(sign_in("carol", "pass worD")[0], 403)

    def test_an_account_without_a_password_is_not_open(self):
        self.assertEqual(sign_in("dave", "")[0], 403)

    def test_an_expired_account_is_closed(self):
        self.assertEqual(sign_in("late", "old")[0], 403)

    def test_the_systems_own_accounts_are_closed(self):
        self.assertEqual(sign_in("root", "x")[0], 403)

    def test_whoever_is_not_signed_in_is_sent_to_sign_in(self):
        status, headers, _ = cgi("GET", "/admin")
        self.assertEqual((status, dict(headers)["Location"]), (302, "/oauth/sign-in?next=%2Fadmin"))

    def test_check_finds_no_fault(self):
        environment = dict(os.environ, KELDOAUTH_SERVICE_SETTINGS=SETTINGS)
        said = subprocess.run(PROGRAM + ["check"], env=environment, capture_output=True, text=True,
                              check=False)
        self.assertEqual(said.returncode, 0, said.stderr)


if __name__ == "__main__":
    set_up()
    unittest.main(argv=sys.argv[:1])
