"""Fills the store with a thousand applications and ten thousand logins, as copies of
those that are there; so many that nobody would wait for them to be made."""

import sqlite3

import service

APPLICATIONS = 1000
LOGINS = 10_000


def copy(file, table, key, count, makes):
    """Rows that differ from the first in their keys alone."""
    columns = [row[1] for row in file.execute(f"PRAGMA table_info({table})")]
    others = ", ".join(name for name in columns if name not in ("id", *key))
    marks = ", ".join("?" for _ in key)
    file.executemany(
        f"INSERT INTO {table}({', '.join(key)}, {others}) SELECT {marks}, {others} "
        f"FROM {table} ORDER BY id LIMIT 1", [makes(i) for i in range(count)])


def rows(file, table):
    return file.execute(f"SELECT count(*) FROM {table}").fetchone()[0]


def gather():
    with sqlite3.connect(service.DATABASE, timeout=30) as file:
        copy(file, "oauth_clientInfo", ["client_id"],
             APPLICATIONS - rows(file, "oauth_clientInfo"), lambda i: [f"{i:064}"])
        copy(file, "oauth_token", ["refresh_token", "access_token"],
             LOGINS - rows(file, "oauth_token"), lambda i: [f"{i:064}", f"{i:063}z"])


if __name__ == "__main__":
    gather()
