"""The table of clients and features, from the cells that a run recorded."""

import sys

FEATURES = ["metadata", "registration", "code with PKCE", "issuer in the response",
            "secret in the header", "secret in the body", "refresh", "client credentials",
            "introspection", "revocation", "bearer challenge", "OpenID Connect: discovery",
            "OpenID Connect: login", "OpenID Connect: userinfo", "OpenID Connect: sign-out"]


def main():
    cells = {}
    with open(sys.argv[1], encoding="utf-8") as report:
        for line in report:
            client, feature, how = line.rstrip("\n").split("\t")
            assert feature in FEATURES, feature
            cells[client, feature] = how
    clients = sorted({client for client, _ in cells})
    notes = []

    def cell(client, feature):
        how = cells.get((client, feature), "–")
        if how in ("yes", "–"):
            return how
        if how not in notes:
            notes.append(how)
        return f"yes ({notes.index(how) + 1})"

    print("| | " + " | ".join(clients) + " |")
    print("|---|" + "---|" * len(clients))
    for feature in FEATURES:
        print(f"| {feature} | " + " | ".join(cell(client, feature) for client in clients) + " |")
    print("\n–: the library has no call for it." +
          "".join(f" ({i + 1}): {note}." for i, note in enumerate(notes)))


if __name__ == "__main__":
    main()
