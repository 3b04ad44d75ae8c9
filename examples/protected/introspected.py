#!/usr/bin/env python3
"""The same resource without the library, in any place that can reach the service:
it asks about each token that it is shown (RFC 7662). A web server with TLS stands
in front of it and hands requests on.

  introspected.py PORT ISSUER CREDENTIALS-FILE

The file holds the identifier and the secret of an application that was registered
for this, "identifier:secret", and is nobody else's to read."""

import base64
import http.server
import json
import sys
import urllib.error
import urllib.parse
import urllib.request

SCOPE = "photos.read"


def ask(issuer, credentials, token):
    """What the service says of the token. Raises OSError when it says nothing."""
    form = urllib.parse.urlencode({"token": token}).encode()
    login = base64.b64encode(credentials.encode()).decode()
    request = urllib.request.Request(issuer + "/oauth/introspect", form,
                                     {"Authorization": "Basic " + login})
    with urllib.request.urlopen(request, timeout=30) as answer:
        return json.load(answer)


class Albums(http.server.BaseHTTPRequestHandler):
    issuer = credentials = None

    def do_GET(self):  # pylint: disable=invalid-name
        scheme, _, token = self.headers.get("Authorization", "").partition(" ")
        if scheme.lower() != "bearer" or not token:
            return self.refuse(401, "")
        try:
            said = ask(self.issuer, self.credentials, token.strip())
        except (OSError, ValueError):  # Not "invalid_token": nobody could look.
            return self.answer(503, {"Retry-After": "5"})
        # A refresh token is active, too, and no key to anything; a token without a
        # user is an application's own.
        if not said.get("active") or said.get("token_type") != "Bearer":
            return self.refuse(401, ', error="invalid_token"')
        if "username" not in said or SCOPE not in said.get("scope", "").split():
            return self.refuse(403, f', error="insufficient_scope", scope="{SCOPE}"')
        return self.answer(200, {"Content-Type": "text/plain; charset=utf-8"},
                           f"The albums of {said['username']}\n")

    def refuse(self, status, error):
        self.answer(status, {"WWW-Authenticate": 'Bearer realm="albums"' + error})

    def answer(self, status, headers, body=""):
        self.send_response(status)
        for name, value in {"Cache-Control": "no-store", **headers}.items():
            self.send_header(name, value)
        self.send_header("Content-Length", str(len(body.encode())))
        self.end_headers()
        self.wfile.write(body.encode())


def main(port, issuer, path):
    Albums.issuer = issuer
    with open(path, encoding="utf-8") as file:
        Albums.credentials = file.read().strip()
    with http.server.ThreadingHTTPServer(("127.0.0.1", int(port)), Albums) as server:
        print(server.server_address[1], flush=True)
        server.serve_forever()


if __name__ == "__main__":
    main(*sys.argv[1:])
