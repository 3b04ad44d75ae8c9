"""Tables of clients and features, from the cells that a run recorded. A cell is "yes",
or says in words what happened instead."""

import sys

TABLES = (
    ("metadata", "registration", "code with PKCE", "issuer in the response",
     "secret in the header", "secret in the body", "public, any port", "pushed request", "refresh",
     "client credentials", "introspection", "revocation", "bearer challenge"),
    ("OpenID Connect: discovery", "OpenID Connect: login", "OpenID Connect: userinfo",
     "OpenID Connect: sign-out"),
)


def read_cells(path):
    cells = {}
    with open(path, encoding="utf-8") as report:
        for line in report:
            client, feature, how = line.rstrip("\n").split("\t")
            assert any(feature in features for features in TABLES), feature
            cells[client, feature] = how
    return cells


def main():
    cells, notes = read_cells(sys.argv[1]), []

    def cell(client, feature):
        how = cells.get((client, feature), "–")
        if how in ("yes", "–"):
            return how
        if how not in notes:
            notes.append(how)
        return f"{how.partition(',')[0]} ({notes.index(how) + 1})"

    for features in TABLES:
        clients = sorted({client for client, feature in cells if feature in features})
        print("| | " + " | ".join(features) + " |")
        print("|---|" + "---|" * len(features))
        for client in clients:
            print(f"| {client} | " +
                  " | ".join(cell(client, feature) for feature in features) + " |")
        print()
    print("–: the client has no call for it, or it was not tried." +
          "".join(f" ({i + 1}): {note}." for i, note in enumerate(notes)))


if __name__ == "__main__":
    main()
