"""Searching by HTTP: who gets what, and that requests of whatever kind change nothing. Needs root."""

import contextlib
import hashlib
import http.client
import json
import os
import socket
import subprocess
import sys
import time
import unittest

from instance import BIN, InstanceTestCase, process_facts, wait_for, write

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "rights"))

from asking import Child, User  # noqa: E402

ANN, BOB, ROOT = User(50001, [50001]), User(50002, [50002]), User(0, [0])
ENGINE, WEB = 50009, 50008
ACCOUNTS = """#!/bin/sh
case $2 in
  50001|50002) user=$2; shift 2; echo '{"uid":'$user',"gids":['$user'],"may_log_in":true,"rules":['$(
    for rule; do printf '%s"no"' "$comma"; comma=,; done)']}';;
  *) exec """ + BIN + """/kova-accounts "$@";;
esac
"""


class LocalConnection(http.client.HTTPConnection):
    def __init__(self, path):
        super().__init__("localhost", timeout=60)
        self.path = path

    def connect(self):
        self.sock = socket.socket(socket.AF_UNIX)
        self.sock.settimeout(60)
        self.sock.connect(self.path)


def ask(connection, target, method="GET", body=None, headers=None):
    """The status and the answer, which is JSON. On a busy machine an account may not be found out in time."""
    end = time.monotonic() + 60
    while True:
        with contextlib.closing(connection):
            connection.request(method, target, body and json.dumps(body), headers or {})
            reply = connection.getresponse()
            assert (reply.getheader("Cache-Control"), reply.getheader("X-Content-Type-Options")) == ("no-store", "nosniff")
            if reply.status != 429 or time.monotonic() > end:
                return reply.status, json.loads(reply.read().decode("utf-8"))
        time.sleep(0.5)


@unittest.skipUnless(os.geteuid() == 0, "takes on other users; needs root")
class WebTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        root = self.instance.root
        os.chmod(root, 0o755)
        for daemon, user in (("kovaelasticd", ENGINE), ("kovawebd", WEB)):
            subprocess.run([os.path.join(BIN, daemon), "--prepare", str(user)], env=self.instance.env, check=True)
        write(f"{root}/bin/kova-accounts", ACCOUNTS)
        os.chmod(f"{root}/bin/kova-accounts", 0o755)
        self.instance.env["FERROX_LIBEXEC"] = f"{root}/bin"
        self.ctl("up")
        self.folder = f"{root}/vol/plans"
        for name, user in (("ann", ANN), ("bob", BOB)):
            write(f"{self.folder}/{name}.txt", f"lantern of {name}")
            os.chown(f"{self.folder}/{name}.txt", user.uid, user.groups[0])
            os.chmod(f"{self.folder}/{name}.txt", 0o600)
        self.ctl("share", "add", self.folder)
        wait_for(lambda: len(self.instance.search("lantern")) == 2, "the files")

    def local(self, user, *words, **more):
        """As a process of the user, on the Unix socket."""
        path = f"{self.instance.root}/var/run/kovawebd/sock"
        return Child(user, lambda: ask(LocalConnection(path), *words, **more)).result()

    def by_token(self, token, target="/api/v1/search?q=lantern", **headers):
        address = self.instance.status()["web"]["addresses"][0].removeprefix("http://")
        if token:
            headers["Authorization"] = "Bearer " + token
        return ask(http.client.HTTPConnection(address, timeout=60), target, headers=headers)

    def tool(self, user, *words, code=0):
        done = subprocess.run([os.path.join(BIN, "fileindexctl"), "token", *words], env=self.instance.env, cwd="/", text=True,
                              capture_output=True, timeout=120, check=False, user=user.uid, group=user.groups[0], extra_groups=[])
        self.assertEqual(code, done.returncode, done.stderr)
        return done.stdout

    def names(self, user, target="/api/v1/search?q=lantern"):
        status, answer = self.local(user, target)
        self.assertEqual((200, []), (status, answer["left_out"]), answer)
        return sorted(os.path.basename(hit["path"]) for hit in answer["hits"])

    def test_each_user_finds_their_own(self):
        self.assertEqual((["ann.txt"], ["bob.txt"]), (self.names(ANN), self.names(BOB)))
        self.assertEqual({str(WEB)}, set(process_facts(self.instance.pid("kovawebd"))["Uid"].split()))
        for i in range(3):
            write(f"{self.folder}/new{i}.txt", f"lantern beacon{i}")
            self.assertEqual([f"new{i}.txt"], self.names(BOB, f"/api/v1/search?q=beacon{i}&fresh=30&share=plans"))
        pages, cursor = [], ""
        while cursor is not None:
            status, page = self.local(ANN, f"/api/v1/search?q=lantern&sort=name&limit=3{cursor}")
            self.assertEqual((200, 4), (status, page["total"]))
            pages.append([os.path.basename(hit["path"]) for hit in page["hits"]])
            cursor = "&cursor=" + page["cursor"] if "cursor" in page else None
        self.assertEqual([["ann.txt", "new0.txt", "new1.txt"], ["new2.txt"]], pages)
        # What is told of a file, of words and of shares.
        shown = self.local(ANN, "/api/v1/file?text=true&path=/plans/ann.txt")
        self.assertEqual((200, "lantern of ann"), (shown[0], shown[1].get("document", {}).get("KOVAMDTextContent")))
        self.assertEqual(404, self.local(BOB, "/api/v1/file?path=/plans/ann.txt")[0])
        self.assertEqual("lantern", self.local(BOB, "/api/v1/complete?q=lan")[1]["completions"][0]["word"])
        ready = (200, {"shares": [{"share": "plans", "state": "ready"}]})
        wait_for(lambda: self.local(BOB, "/api/v1/shares") == ready, "the share's state")
        # Neither root nor who has no account is one of those who are asked for.
        self.assertEqual([403, 403], [self.local(user, "/api/v1/search?q=lantern")[0] for user in (ROOT, User(50003, [50003]))])
        self.ctl("pause")
        write(f"{self.folder}/later.txt", "lantern later")
        self.assertEqual(504, self.local(ANN, "/api/v1/search?q=lantern&fresh=1")[0])

    def test_a_token_is_its_user_until_it_ends(self):
        self.assertEqual(401, self.by_token("")[0])
        token = self.tool(ANN, "create", "script").strip()
        status, answer = self.by_token(token)
        self.assertEqual((200, ["ann.txt"]), (status, [os.path.basename(hit["path"]) for hit in answer["hits"]]))
        self.assertEqual(200, self.by_token(token, "/api/v1/status")[0])
        self.assertEqual([401] * 3, [self.by_token(other)[0] for other in (token[:-1], token + "0", "kova_" + "0" * 64)])
        self.assertEqual(403, self.by_token(token, "/api/v1/tokens")[0])
        # Kept as a hash, for the daemon's user alone.
        path = f"{self.instance.root}/var/lib/kova/kovawebd/tokens.json"
        with open(path, encoding="utf-8") as file:
            (kept,) = json.load(file)
        self.assertEqual((hashlib.sha256(token.encode()).hexdigest(), ANN.uid, "script", 365 * 86400),
                         (kept["sha256"], kept["user"], kept["name"], kept["expires"] - kept["created"]))
        self.assertEqual((WEB, 0o600), (os.stat(path).st_uid, os.stat(path).st_mode & 0o777))
        # Others neither see nor end it; neither root nor who has no account has any.
        his = self.tool(BOB, "create", "his", "--days", "7").strip()
        listed = json.loads(self.tool(BOB, "list", "--json"))["tokens"]
        self.assertEqual([("his", BOB.uid, 7 * 86400)], [(t["name"], t["user"], t["expires"] - t["created"]) for t in listed])
        self.tool(BOB, "revoke", kept["id"], code=3)
        self.tool(ANN, "create", "script", code=2)
        for user in (ROOT, User(50003, [50003])):
            self.tool(user, "create", "none", code=5)
        # It outlives the daemon, but not its time, its user's account or its end.
        self.instance.kill("kovawebd")
        with open(path, encoding="utf-8") as file:
            entries = json.load(file)
        expired = [dict(entry, expires=int(time.time()) - 1) if entry["name"] == "his" else entry for entry in entries]
        write(path, json.dumps(expired))
        self.ctl("up")
        self.assertEqual((200, 401), (self.by_token(token)[0], self.by_token(his)[0]))
        write(f"{self.instance.root}/bin/kova-accounts", ACCOUNTS.replace("50001|", ""))
        self.instance.kill("kovaelasticd")  # which keeps what it knows of accounts for a minute
        self.ctl("up")
        self.assertEqual([403, 403], [self.by_token(token, target)[0] for target in ("/api/v1/search?q=lantern", "/api/v1/status")])
        self.tool(ROOT, "revoke", kept["id"])
        self.assertEqual(401, self.by_token(token)[0])

    def test_hostile_requests_end_in_refusals_and_change_nothing(self):
        token = self.tool(ANN, "create", "script").strip()
        host, port = self.instance.status()["web"]["addresses"][0].removeprefix("http://").split(":")
        rows = [  # what stands in the place of the good request's, and the answer
            (dict(target="/"), 404), (dict(target="/api/v1/searc"), 404), (dict(target="/api/v1/search/"), 404),
            (dict(target="//api/v1/search?q=a"), 404), (dict(target="/api/v1/../v1/search?q=a"), 404),
            (dict(target="http://localhost/api/v1/search?q=a"), 400), (dict(target="*"), 400),
            (dict(method="POST"), 405), (dict(method="DELETE"), 405), (dict(method="BREW"), 405),
            (dict(target="/api/v1/tokens", method="POST", body=b'{"name": "mine"}'), 403),
            (dict(target="/api/v1/tokens/1", method="DELETE"), 403), (dict(target="/api/v1/tokens", method="PUT"), 405),
            (dict(headers=[]), 400), (dict(headers=["Host: localhost", "Host: localhost"]), 400),
            (dict(headers=["Host: evil.example"]), 421), (dict(headers=["Host: localhost.evil.example"]), 421),
            (dict(headers=["Host: 127.0.0.1.evil.example:80"]), 421), (dict(headers=["Host: [::1]"]), 421),
            (dict(headers=["Host: localhost", "Origin: http://evil.example"]), 421),
            (dict(headers=["Host: localhost", "Origin: null"]), 421), (dict(headers=["Host: localhost:80x"]), 421),
            (dict(token="Basic YTpi"), 401), (dict(token="Bearer"), 401), (dict(token="Bearer ' OR 1=1"), 401),
            *((dict(target="/api/v1/search" + query), 400) for query in (
                "", "?q=", "?q=%", "?q=%0", "?q=%zz", "?q=%00", "?q=a&q=b", "?q=a&admin=1", "?q=a&limit=0", "?q=a&limit=2001",
                "?q=a&limit=1e3", "?q=a&limit=99999999999999999999", "?q=a&cursor=-1", "?q=a&fresh=61", "?q=a&sort=owner",
                "?q=%ff", "?q=a&share=", "?q=" + "a" * 5000, "?q=" + "(" * 500, "?q=%22open", "?q=a&as=0", "?" + "a&" * 100)),
            (dict(target="/api/v1/search?q=a&share=vault"), 404), (dict(target="/api/v1/file?path=..%2f..%2fetc%2fpasswd"), 400),
            (dict(target="/api/v1/file?path=/plans/bob.txt"), 404), (dict(target="/api/v1/file?path=%ff"), 400),
            (dict(headers=["Host: localhost", "X: " + "a" * 20000]), 431), (dict(body=b"a" * 70000), 413),
        ]
        before = self.local(ANN, "/api/v1/tokens")
        for change, wanted in rows:
            with self.subTest(**{name: str(value)[:80] for name, value in change.items()}):
                row = dict({"method": "GET", "target": "/api/v1/search?q=a", "headers": ["Host: localhost"], "body": b"",
                            "token": "Bearer " + token}, **change)
                lines = [f"{row['method']} {row['target']} HTTP/1.1", *row["headers"], "Authorization: " + row["token"],
                         f"Content-Length: {len(row['body'])}", "Connection: close"]
                self.assertEqual(wanted, self.raw((host, int(port)), "\r\n".join(lines).encode() + b"\r\n\r\n" + row["body"]))
        for text in (b"\x00" * 64 + b"\r\n\r\n", b"GET\r\n\r\n", b"\x16\x03\x01" * 20 + b"\r\n\r\n", b"GET / HTTP/9.9\r\n\r\n"):
            self.assertIn(self.raw((host, int(port)), text), (None, 400, 505))
        silent = [socket.create_connection((host, int(port))) for _ in range(20)]
        silent[0].sendall(b"GET /api/v1/sta")
        self.assertEqual((200, before), (self.by_token(token)[0], self.local(ANN, "/api/v1/tokens")))
        for connection in silent:
            connection.close()
        # The description is that of the routes; a page of this host may ask.
        api = self.by_token("", "/api/v1/openapi.json", Origin="http://localhost:8080")[1]
        self.assertEqual({"search", "complete", "file", "shares", "status", "openapi", "createToken", "listTokens", "revokeToken"},
                         {operation["operationId"] for path in api["paths"].values() for operation in path.values()})
        for path, operations in api["paths"].items():
            for method in operations:  # what is described is there
                status = self.by_token("", path) if method == "get" else (401,)
                self.assertIn(status[0], (200, 401), path)
        with open(f"{self.instance.root}/var/log/kova/kovawebd.log", encoding="utf-8") as file:
            self.assertEqual("", file.read())

    @staticmethod
    def raw(address, text):
        """The status of the answer; None where the connection was closed without one."""
        with socket.create_connection(address, timeout=60) as connection:
            try:
                connection.sendall(text)
                line = connection.makefile("rb").readline().split()
            except ConnectionError:
                return None
        return int(line[1]) if len(line) > 1 else None
