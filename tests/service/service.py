"""The service under test, as plain HTTP: no client library in between.

Started by service/serve, which says in the environment where the service
is and who may log in.
"""

import base64
import contextlib
import hashlib
import html.parser
import http.client
import io
import json
import os
import re
import secrets
import sqlite3
import subprocess
import urllib.parse

ISSUER = os.environ["SERVICE_ISSUER"]
BASE = urllib.parse.urlsplit(ISSUER).path
INITIAL_TOKEN = os.environ["SERVICE_INITIAL_TOKEN"]
USERS = dict(pair.split(":", 1) for pair in os.environ["SERVICE_USERS"].split())
RUN = os.environ["SERVICE_RUN"]
CALLBACK = "http://127.0.0.1:9/callback"
DATABASE = "/var/packages/Corvane/target/etc/oauth.db"
SETTINGS = "/var/packages/Corvane/target/etc/oauth.cfg"

# What must never reach a log file.
SEEN_SECRETS = {INITIAL_TOKEN, *USERS.values()}

FORM = {"Content-Type": "application/x-www-form-urlencoded"}


def stored(statement):
    """One statement on the store, past the service: the first column's texts."""
    server = os.environ.get("KELDOAUTH_TEST_SERVER")
    if server is None:
        with sqlite3.connect(DATABASE) as file:
            return [row[0] for row in file.execute(statement)]
    done = subprocess.run(
        ["psql", "-X", "-q", "-A", "-t", "-v", "ON_ERROR_STOP=1", "-d", server, "-c", statement],
        env={**os.environ, "PGOPTIONS": "-c search_path=keldoauth"},
        check=True, capture_output=True, text=True)
    return done.stdout.splitlines()


class Answer:
    def __init__(self, status, headers, body):
        self.status, self.headers, self.body = status, headers, body

    @property
    def text(self):
        return self.body.decode()

    @property
    def json(self):
        return json.loads(self.body)

    @property
    def location(self):
        return self.headers["Location"]

    @property
    def returned(self):
        """The parameters that the application receives."""
        pairs = urllib.parse.parse_qsl(urllib.parse.urlsplit(self.location).query)
        assert len(dict(pairs)) == len(pairs), f"doubled parameters in {self.location}"
        return dict(pairs)


class Killed(Exception):
    """The program did not live to answer."""


_moment = {}
_carrier = None


def carry(carrier):
    """Requests from now on go to this function; None: to the web server."""
    global _carrier
    _carrier = carrier


@contextlib.contextmanager
def moment(**variables):
    """Requests meanwhile go to the programs themselves, without the web server,
    each in this moment: see steps.cpp."""
    _moment.update(variables, LD_PRELOAD=os.environ["SERVICE_STEPS"])
    try:
        yield
    finally:
        _moment.clear()


def later(seconds):
    """Requests meanwhile are answered so many seconds later."""
    return moment(SERVICE_LATER=str(seconds))


def killed_at(step):
    """Requests meanwhile are killed before they change a file the N-th time."""
    return moment(SERVICE_KILL_AT=str(step))


def variables(method, path, body, headers):
    """What a web server says of a request (RFC 3875)."""
    path, _, query = path.partition("?")
    authorization = headers.get("Authorization", "")
    said = {"GATEWAY_INTERFACE": "CGI/1.1", "SCRIPT_NAME": BASE + path, "QUERY_STRING": query,
            "REQUEST_METHOD": method, "CONTENT_LENGTH": str(len(body)),
            "CONTENT_TYPE": headers.get("Content-Type", ""), "REMOTE_ADDR": "127.0.0.1",
            "HTTP_AUTHORIZATION": authorization}
    if path in ("/oauth/authorize", "/account", "/admin"):
        login = base64.b64decode(authorization.partition(" ")[2]).decode()
        said["REMOTE_USER"] = login.partition(":")[0]
    return said


def run(method, path, body, headers):
    """One request to the program, as the web server starts it for CGI."""
    body = body.encode() if isinstance(body, str) else body or b""
    environment = {**_moment, "KELDOAUTH_SERVICE_SETTINGS": RUN + "/settings.json",
                   **variables(method, path, body, headers),
                   # Of a program under a sanitizer: steps.cpp is loaded before it.
                   "ASAN_OPTIONS": "verify_asan_link_order=0"}
    runner = [os.environ["SERVICE_RUNNER"]] if os.environ.get("SERVICE_RUNNER") else []
    program = os.path.join(os.environ["SERVICE_PROGRAMS"], "keldoauth-service")
    done = subprocess.run([*runner, program], env=environment, input=body, check=False,
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE)
    if done.returncode == -9:
        raise Killed
    assert done.returncode == 0, (done.returncode, done.stderr)
    output = io.BytesIO(done.stdout)
    status = int(output.readline().split()[1])
    return Answer(status, http.client.parse_headers(output), output.read())


def well_known(name):
    """The address that is made of the issuer's by RFC 8414, 3.1."""
    return ISSUER.removesuffix(BASE) + "/.well-known/" + name + BASE


def send(method, path, body=None, headers=None):
    """One request on a connection of its own; redirects are not followed. The path
    is below the issuer's, or a whole address."""
    if _moment:
        return run(method, path, body, headers or {})
    if _carrier:
        return _carrier(method, path, body, headers or {})
    where = urllib.parse.urlsplit(ISSUER)
    path = path.removeprefix(f"http://{where.netloc}") if path[0] != "/" else BASE + path
    connection = http.client.HTTPConnection(where.hostname, where.port, timeout=60)
    try:
        try:
            connection.request(method, path, body=body, headers=headers or {})
        except (BrokenPipeError, ConnectionResetError):
            pass  # A server need not read to the end what it refuses.
        response = connection.getresponse()
        return Answer(response.status, response.headers, response.read())
    finally:
        connection.close()


def basic(name, password):
    return {"Authorization": "Basic " + base64.b64encode(f"{name}:{password}".encode()).decode()}


def as_user(name):
    return basic(name, USERS[name])


def bearer(token):
    return {"Authorization": f"Bearer {token}"}


def encode(parameters):
    """A dictionary, or pairs where one is to occur twice; None leaves it out."""
    pairs = parameters.items() if isinstance(parameters, dict) else parameters
    return urllib.parse.urlencode([(k, v) for k, v in pairs if v is not None])


class Form(html.parser.HTMLParser):
    """Where the first form of a page goes, and its hidden fields."""

    def __init__(self, page):
        super().__init__()
        self.action = None
        self.fields = {}
        self.done = False
        self.feed(page)

    def handle_starttag(self, tag, attributes):
        values = dict(attributes)
        if tag == "form" and not self.done:
            self.action = values.get("action")
        if tag == "input" and values.get("type") == "hidden" and not self.done:
            self.fields[values["name"]] = values["value"]

    def handle_endtag(self, tag):
        self.done = self.done or tag == "form"


def forms(page):
    """The hidden fields of each form of a page that changes something."""
    return [Form(part).fields
            for part in re.findall(r'<form method="post".*?</form>', page.text, re.DOTALL)]


class Client:
    """A registered application that speaks the protocol by hand."""

    def __init__(self, identifier, secret, redirect=CALLBACK, **metadata):
        self.id, self.secret, self.redirect = identifier, secret, redirect
        self.metadata = metadata

    def question(self, challenge, **changes):
        """Of an application that wants the page each time."""
        return {"response_type": "code", "client_id": self.id, "redirect_uri": self.redirect,
                "scope": "profile", "state": "a state", "code_challenge": challenge,
                "code_challenge_method": "S256", "prompt": "consent", **changes}

    def ask(self, challenge, user="alice", **changes):
        """The answer to the authorization request: the consent page, at best."""
        query = encode(self.question(challenge, **changes))
        return send("GET", "/oauth/authorize?" + query, headers=as_user(user))

    def decide(self, page, decision="allow", user="alice", **changes):
        fields = {**Form(page.text).fields, "decision": decision, **changes}
        return send("POST", "/oauth/authorize", encode(fields), {**FORM, **as_user(user)})

    def log_in(self, user="alice", **changes):
        """A fresh code and the verifier that goes with it."""
        verifier = secrets.token_urlsafe(48)
        page = self.ask(challenge_of(verifier), user, **changes)
        assert page.status == 200, (page.status, page.text)
        answer = self.decide(page, user=user)
        assert answer.status == 303, (answer.status, answer.text)
        SEEN_SECRETS.update((answer.returned["code"], verifier))
        return answer.returned["code"], verifier

    def post(self, endpoint, **parameters):
        headers = FORM
        if self.secret:
            headers = {**FORM, **basic(*map(urllib.parse.quote_plus, (self.id, self.secret)))}
        else:
            parameters = {"client_id": self.id, **parameters}
        return send("POST", "/oauth/" + endpoint, encode(parameters), headers)

    def redeem(self, code, verifier, **changes):
        return self.post("token", **{"grant_type": "authorization_code", "code": code,
                                     "redirect_uri": self.redirect, "code_verifier": verifier,
                                     **changes})

    def tokens(self, user="alice", **changes):
        answer = self.redeem(*self.log_in(user, **changes))
        assert answer.status == 200, (answer.status, answer.text)
        SEEN_SECRETS.update((answer.json["access_token"], answer.json["refresh_token"]))
        return answer.json

    def refresh(self, token, **changes):
        return self.post("token", grant_type="refresh_token", refresh_token=token, **changes)


def challenge_of(verifier):
    digest = hashlib.sha256(verifier.encode()).digest()
    return base64.urlsafe_b64encode(digest).rstrip(b"=").decode()


def register_raw(metadata, token=INITIAL_TOKEN):
    body = metadata if isinstance(metadata, (bytes, str)) else json.dumps(metadata)
    return send("POST", "/oauth/register", body,
                {"Content-Type": "application/json", **bearer(token)})


def register(**metadata):
    metadata = {"redirect_uris": [CALLBACK], "client_name": "Test client",
                "scope": "profile files.read", **metadata}
    answer = register_raw(metadata)
    assert answer.status == 201, (answer.status, answer.text)
    made = answer.json
    SEEN_SECRETS.add(made["registration_access_token"])
    if "client_secret" in made:
        SEEN_SECRETS.add(made["client_secret"])
    redirects = metadata["redirect_uris"]
    return Client(made["client_id"], made.get("client_secret"), redirects[0] if redirects else None)


def whoami(token):
    return send("GET", "/api/whoami", headers=bearer(token))


def introspect(client, token, **more):
    return client.post("introspect", token=token, **more)


def error_log():
    with open(RUN + "/error.log", encoding="utf-8", errors="replace") as log:
        return log.read()


def secrets_in_error_log():
    log = error_log()
    return [secret for secret in SEEN_SECRETS if secret in log]


def consent(address, user="alice", decision="allow"):
    """What a person does whom a client sent to `address`: where they end up."""
    assert address.startswith(ISSUER), address
    page = send("GET", address[len(ISSUER):], headers=as_user(user))
    if page.status == 302:
        return page.location  # They have agreed before.
    assert page.status == 200, (page.status, page.text)
    fields = {**Form(page.text).fields, "decision": decision}
    return send("POST", "/oauth/authorize", encode(fields), {**FORM, **as_user(user)}).location


def record(client, feature, how="yes"):
    """One cell of the table of clients and features."""
    path = os.environ.get("SERVICE_REPORT")
    if path:
        with open(path, "a", encoding="utf-8") as report:
            report.write(f"{client}\t{feature}\t{how}\n")
