"""Somebody in front of a browser, whom a client sends to the service: signs in
where it asks, allows what is asked for, and goes where that leads."""

import os
import re
import urllib.parse

import requests

import service
from service import ISSUER, Form

MOST_PAGES = 20


def form_with(page, text):
    """Where the form that has this text in it goes, and its hidden fields; None
    when the page has no such form."""
    parts = re.findall(r"<form\b.*?</form>", page.text, re.DOTALL)
    return next((Form(part) for part in parts if text in part), None)


class Person(requests.Session):
    def __init__(self, name="alice"):
        super().__init__()
        self.name = name
        self.trust_env = False

    def go(self, address, until=None):
        """Where this leads to: (address, answer). Who is sent to an address that
        starts with `until` does not open it."""
        answer = None
        for _ in range(MOST_PAGES):
            if until and address.startswith(until):
                return address, answer
            answer = self.answered(self.browse("GET", address))
            if "location" not in answer.headers:
                return address, answer
            address = urllib.parse.urljoin(answer.url, answer.headers["location"])
        raise AssertionError(f"no end of redirects at {address}")

    def browse(self, method, address, **more):
        is_ours = address.startswith(ISSUER + "/")
        login = (self.name, service.USERS[self.name])
        if not is_ours or os.environ["SERVICE_SIGN_IN"] != "web-server":
            login = None
        return self.request(method, address, auth=login, allow_redirects=False, timeout=60, **more)

    def answered(self, page):
        """What comes of a page of the service that asks for something."""
        if not page.url.startswith(ISSUER + "/"):
            return page
        for text, given in (('name="password"', {"user": self.name,
                                                 "password": service.USERS[self.name]}),
                            ('name="decision"', {"decision": "allow"}),
                            ('<button class="primary">Sign out', {})):
            form = form_with(page, text)
            if form:
                return self.submit(page, form, given)
        return page

    def submit(self, page, form, given):
        return self.browse("POST", urllib.parse.urljoin(page.url, form.action or page.url),
                           data={**form.fields, **given})


def register_without_pkce(name, redirect, scope):
    """An application that does not know PKCE: its owner has to say so."""
    owner = Person("admin")
    _, page = owner.go(ISSUER + "/admin?view=register")
    chosen = {"scope." + word: "1" for word in scope.split()}
    answer = owner.submit(page, form_with(page, "without_pkce"),
                          {"name": name, "redirect": redirect, "without_pkce": "1", **chosen})
    _, page = owner.go(urllib.parse.urljoin(page.url, answer.headers["location"]))
    return service.Client(*re.findall(r"<code[^>]*>([0-9a-f]{64})</code>", page.text), redirect)
