"""Searching by HTTP: who gets what, and that requests of whatever kind change nothing. Needs root."""

import contextlib
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
