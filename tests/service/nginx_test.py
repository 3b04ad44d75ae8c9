"""The service behind nginx, by the file that the package brings: where the web
server says who somebody is, nobody is believed whom it has not asked for a
password. Usage: nginx_test.py PROGRAM NGINX-FILE [RUNNER]"""

import base64
import http.client
import json
import os
import re
import shutil
import socket
import subprocess
import sys
import tempfile
import time
import unittest

PROGRAM, SNIPPET = sys.argv[3:] + [sys.argv[1]], sys.argv[2]
FOLDER = tempfile.mkdtemp(prefix="nginx.", dir="/tmp")
SOCKET = os.path.join(FOLDER, "service.socket")

CONFIGURATION = """
daemon off;
user root;
pid {folder}/pid;
error_log {folder}/error.log;
events {{}}
http {{
  access_log off;
  client_body_temp_path {folder}/body;
  fastcgi_temp_path {folder}/fastcgi;
  proxy_temp_path {folder}/proxy;
  scgi_temp_path {folder}/scgi;
  uwsgi_temp_path {folder}/uwsgi;
  server {{
    listen 127.0.0.1:{port};
    root {folder};
    include {folder}/keldoauth.conf;
    location = /asked {{
      auth_basic box;
      auth_basic_user_file {folder}/users;
{parameters}
      fastcgi_param SCRIPT_NAME /account;
      fastcgi_param REMOTE_USER $remote_user;
      fastcgi_pass unix:{folder}/service.socket;
    }}
  }}
}}
"""


def write(name, text):
    path = os.path.join(FOLDER, name)
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)
    os.chmod(path, 0o600)
    return path


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as listening:
        return listening.getsockname()[1]


PORT = free_port()


def ask(path, **headers):
    connection = http.client.HTTPConnection("127.0.0.1", PORT, timeout=60)
    connection.request("GET", path, headers={name.replace("_", "-"): value
                                             for name, value in headers.items()})
    answer = connection.getresponse()
    found = answer.status, answer.read().decode()
    connection.close()
    return found


def basic(user, password="anything"):
    return "Basic " + base64.b64encode(f"{user}:{password}".encode()).decode()


class BehindNginx(unittest.TestCase):
    def test_the_service_answers(self):
        status, text = ask("/.well-known/oauth-authorization-server")
        self.assertEqual((status, json.loads(text)["issuer"]), (200, f"http://127.0.0.1:{PORT}"))

    def test_a_name_that_nobody_asked_a_password_for_is_none(self):
        for path in ("/admin", "/account"):
            for headers in ({"Authorization": basic("admin")}, {"Remote_User": "admin"}):
                status, text = ask(path, **headers)
                self.assertEqual(status, 403, headers)
                self.assertIn("does not say who you are", text)

    def test_who_was_asked_for_a_password_is_believed_at_that_page_alone(self):
        status, text = ask("/asked", Authorization=basic("admin"))
        self.assertEqual(status, 401, "not with any password")
        status, text = ask("/asked", Authorization=basic("admin", "right"))
        self.assertEqual(status, 200)
        self.assertIn("admin", text)
        self.assertEqual(ask("/account", Authorization=basic("admin", "right"))[0], 403)

    def test_what_an_application_says_of_itself_arrives(self):
        status, text = ask("/oauth/userinfo", Authorization="Bearer x")
        self.assertEqual(status, 401, text)
        self.assertEqual(json.loads(text)["error"], "invalid_token")


def main():
    write("service.keys.json", json.dumps({"form_key": "f" * 32, "session_key": "s" * 32}))
    settings = write("service.json", json.dumps({
        "issuer": f"http://127.0.0.1:{PORT}", "administrators": ["admin"], "counters_file": ""}))
    with open(SNIPPET, encoding="utf-8") as file:
        snippet = file.read()
    write("keldoauth.conf", snippet.replace("/run/keldoauth-service.socket", SOCKET))
    write("users", "admin:{PLAIN}right\n")
    # The lines that the file tells its reader to take along.
    parameters = "".join(re.findall(r"^ *fastcgi_param (?!SCRIPT_NAME).*\n", snippet, re.M))
    configuration = write("nginx.conf", CONFIGURATION.format(
        folder=FOLDER, port=PORT, parameters=parameters))
    nginx = shutil.which("nginx", path=os.environ["PATH"] + ":/usr/sbin")
    with socket.socket(socket.AF_UNIX) as listening:
        listening.bind(SOCKET)
        listening.listen()
        service = subprocess.Popen(PROGRAM, stdin=listening, env=dict(
            os.environ, KELDOAUTH_SERVICE_SETTINGS=settings))
    front = subprocess.Popen([nginx, "-c", configuration, "-p", FOLDER,
                              "-e", os.path.join(FOLDER, "error.log")])
    try:
        while front.poll() is None:
            try:
                ask("/")
                break
            except ConnectionRefusedError:
                time.sleep(0.05)
        return unittest.main(argv=sys.argv[:1], exit=False).result.wasSuccessful()
    finally:
        for process in (front, service):
            process.terminate()
            process.wait()


if __name__ == "__main__":
    sys.exit(0 if main() else 1)
