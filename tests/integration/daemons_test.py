"""The daemons and the tool together, as a person meets them."""

import json
import os
import struct
import time
import unittest

from instance import ATTR, CREATE, DELETE, MODIFY, RENAME, Instance, event, on_disk, wait_for


def write(path, text):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "wb") as file:
        file.write(text.encode() if isinstance(text, str) else text)


class DaemonsTest(unittest.TestCase):
    def setUp(self):
        self.instance = Instance()
        self.addCleanup(self.stop)

    def stop(self):
        left = self.instance.stop()
        self.assertEqual([], left, "processes that 'down' left running")

    def up_with_share(self, name="docs"):
        self.instance.ctl("up")
        return self.instance.add_share(name)

    def expect_index_is_disk(self, share, folder):
        self.assertEqual(on_disk(folder), self.instance.documents(share, folder))

    def fill(self, folder, files):
        for i in range(files):
            write(f"{folder}/d{i % 50}/file{i}.txt", f"number{i} " + "some words to read " * 50)

    # The main road.

    def test_changes_become_searchable(self):
        folder = self.up_with_share()
        write(f"{folder}/letters/anna.txt", "dear anna, the zeppelin arrives tomorrow")
        write(f"{folder}/old.txt", "walrus")
        self.instance.ctl("index", "docs", "--wait")
        self.assertEqual([os.fsencode(f"{folder}/letters/anna.txt")], self.instance.search("zeppelin", "anna"))
        self.assertIn(b"[zeppelin]", self.instance.ctl("search", "zeppelin"))
        self.instance.ctl("search", "nosuchword", code=1)

        os.rename(f"{folder}/letters", f"{folder}/post")
        write(f"{folder}/old.txt", "penguin")
        write(f"{folder}/new.txt", "ostrich")
        self.instance.queue(folder, event(RENAME, f"{folder}/post", f"{folder}/letters", True),
                            event(MODIFY, f"{folder}/old.txt"), event(CREATE, f"{folder}/new.txt"))
        self.instance.wait_idle("docs", folder)
        self.assertEqual([os.fsencode(f"{folder}/post/anna.txt")], self.instance.search("zeppelin"))
        self.assertEqual([], self.instance.search("walrus"))
        self.assertEqual([os.fsencode(f"{folder}/old.txt")], self.instance.search("penguin"))
        self.assertEqual([os.fsencode(f"{folder}/new.txt")], self.instance.search("ostrich"))

        os.remove(f"{folder}/new.txt")
        os.chmod(f"{folder}/old.txt", 0o600)
        self.instance.queue(folder, event(DELETE, f"{folder}/new.txt"), event(ATTR, f"{folder}/old.txt"))
        self.instance.wait_idle("docs", folder)
        self.assertEqual([], self.instance.search("ostrich"))
        self.assertEqual([os.fsencode(f"{folder}/old.txt")], self.instance.search("penguin"))
        self.expect_index_is_disk("docs", folder)

        written = self.instance.share_status("docs")["written"]
        self.instance.ctl("index", "docs", "--wait")
        self.assertEqual(written, self.instance.share_status("docs")["written"], "nothing differed")

    def test_odd_names_and_files_are_found_and_stop_nothing(self):
        folder = self.up_with_share()
        names = [b"line\nbreak.txt", b'quo"te\'s.txt', b"\xff\xfe bytes.txt", b"\x1b[31mred.txt", "日本語.txt".encode(),
                 b" ", b"-rf", b"x" * 255]
        for name in names:
            with open(os.fsencode(folder) + b"/" + name, "wb") as file:
                file.write(b"needle")
        os.mkfifo(f"{folder}/pipe.txt")
        os.symlink("/etc/passwd", f"{folder}/link.txt")
        write(f"{folder}/image.txt", bytes(range(256)) * 100)
        write(f"{folder}/empty.txt", "")
        write(f"{folder}/locked.txt", "needle")
        os.chmod(f"{folder}/locked.txt", 0)
        self.instance.ctl("index", "docs", "--wait")
        self.expect_index_is_disk("docs", folder)
        found = set(self.instance.search("needle"))
        for name in names:
            self.assertIn(os.fsencode(folder) + b"/" + name, found)
        shown = self.instance.ctl("search", "--limit", "100", "needle")
        self.assertNotIn(b"\x1b", shown)
        self.assertNotIn(b"\xff", shown)
        self.assertIn(b"\\xFF\\xFE bytes.txt", shown)
        self.assertIn(b"line\\x0Abreak.txt", shown)
        reasons = self.instance.share_status("docs")["index"]["extract_errors"]
        self.assertEqual(1, reasons.get("not a regular file"), reasons)
        self.assertEqual(1, reasons.get("not text"), reasons)
        if os.geteuid() != 0:
            self.assertEqual(1, reasons.get("Permission denied"), reasons)

    def test_bad_queue_lines_are_skipped(self):
        folder = self.up_with_share()
        write(f"{folder}/a.txt", "elephant")
        self.instance.wait_idle("docs", folder)
        self.instance.queue(folder, b"not json", b'{"event":64,"path":', b"[" * 100000, b"\0" * 1000, b"x" * 300000,
                            b'{"event":"x","path":3}', event(CREATE, f"{folder}/a.txt"))
        self.instance.wait_idle("docs", folder)
        self.assertEqual(1, len(self.instance.search("elephant")))

    # Interruptions.

    def test_killed_daemons_take_up_where_they_were(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.fill(folder, 3000)
        for program in ("fileindexd", "kovaelasticd", "fileindexd"):
            before = self.instance.share_status("docs")["index"]["documents"]
            self.instance.ctl("index", "docs")
            wait_for(lambda: self.instance.share_status("docs")["index"]["documents"] != before or
                     self.instance.share_status("docs")["state"] == "idle", "the index to grow")
            self.instance.kill(program)
            self.instance.ctl("up")
            wait_for(lambda: self.instance.share_status("docs")["state"] != "starting", "the daemon to work")
        self.instance.ctl("index", "docs", "--wait")
        self.expect_index_is_disk("docs", folder)
        self.assertEqual(1, len(self.instance.search("number2999")))

    def test_pause_stops_at_once_and_resume_goes_on(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.fill(folder, 4000)
        self.instance.ctl("index", "docs")
        wait_for(lambda: self.instance.share_status("docs")["written"] > 100, "indexing to begin")
        self.instance.ctl("pause", "1")
        wait_for(lambda: self.instance.share_status("docs")["state"] == "paused", "the pause", seconds=1)
        written = self.instance.share_status("docs")["written"]
        self.assertLess(written, 4000)
        self.instance.ctl("down")
        self.instance.ctl("up")
        wait_for(lambda: self.instance.share_status("docs")["state"] == "paused", "the pause after a restart")
        self.instance.ctl("resume")
        self.instance.ctl("index", "docs", "--wait")
        self.expect_index_is_disk("docs", folder)

    def test_reindex_asked_for_during_another_is_not_lost(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.fill(folder, 4000)
        self.instance.ctl("index", "docs")
        wait_for(lambda: self.instance.share_status("docs")["written"] > 100, "indexing to begin")
        with open(f"{folder}/!passed by already.txt", "w", encoding="ascii") as file:
            file.write("late")
        self.instance.ctl("folder", "reindex", "/docs")
        self.instance.wait_idle("docs", folder)
        self.expect_index_is_disk("docs", folder)

    def test_paused_share_stops_at_once_and_goes_on_where_it_was(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.fill(folder, 4000)
        self.instance.ctl("index", "docs")
        wait_for(lambda: self.instance.share_status("docs")["written"] > 100, "indexing to begin")
        begin = time.monotonic()
        self.instance.ctl("share", "pause", "docs")
        self.assertLess(time.monotonic() - begin, 1)
        self.assertEqual([], self.instance.status()["index_daemon"]["shares"])
        self.instance.ctl("share", "resume", "docs")
        done = self.instance.share_status("docs")["index"]["documents"]
        self.assertTrue(100 < done < 4050, done)
        self.instance.wait_idle("docs", folder)
        self.expect_index_is_disk("docs", folder)
        self.assertLess(self.instance.share_status("docs")["written"], 4100 - done)

    def test_switched_kind_touches_its_files_alone(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.fill(folder, 10000)
        for i in range(10):
            write(f"{folder}/d{i}/view.jpg", "no real picture")
        self.instance.ctl("index", "docs", "--wait")
        written = self.instance.share_status("docs")["written"]
        self.instance.ctl("folder", "set", "/docs", "--kinds", "document,audio,video")
        self.instance.wait_idle("docs", folder)
        status = self.instance.share_status("docs")
        self.assertEqual(10, status["written"] - written)
        self.assertEqual(10060, status["comparison"]["examined"], "all were looked at")

    def test_bad_clients_cost_their_own_connection(self):
        self.up_with_share()
        for daemon in ("kovaelasticd", "fileindexd"):
            silent = [self.instance.connect(daemon) for _ in range(10)]
            for bad in (struct.pack("=I", 0xFFFFFFFF) + b"x", struct.pack("=I", 100) + b"cut", b"\1"):
                with self.instance.connect(daemon) as connection:
                    connection.sendall(bad)
            begin = time.monotonic()
            self.instance.status()
            self.assertLess(time.monotonic() - begin, 5)
            for connection in silent:
                connection.close()
        for request in ({"type": "nonsense"}, {"type": 3}, [], "x", {"type": "pause", "data": {}}):
            reply = self.instance.ask("fileindexd", request, b"\0")
            self.assertFalse(reply["success"])
            self.assertTrue(reply["error"]["msg"])

    def test_corrupt_status_file_is_named_and_recovered_from(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        path = f"{self.instance.root}/var/packages/Ferrox/etc/fileindex.status"
        write(path, "{broken")
        done = self.instance.run("pause")
        self.assertEqual(3, done.returncode)
        self.assertIn(f"Cannot load json: {path}".encode(), done.stderr)
        write(f"{folder}/a.txt", "heron")
        self.instance.queue(folder, event(CREATE, f"{folder}/a.txt"))
        wait_for(lambda: path in self.instance.share_status("docs").get("detail", ""), "the error in the status")
        os.remove(path)
        self.instance.wait_idle("docs", folder)
        self.assertEqual(1, len(self.instance.search("heron")))

    # The tool.

    def test_up_and_down_may_be_repeated(self):
        for _ in range(2):
            self.instance.ctl("up")
        pids = {self.instance.pid(program) for program in ("kovaelasticd", "fileindexd")}
        for _ in range(2):
            self.instance.ctl("down")
        self.assertFalse([pid for pid in pids if os.path.exists(f"/proc/{pid}/exe")])

    def test_queue_show_prints_what_would_be_done(self):
        path = f"{self.instance.root}/some.queue"
        lines = [event(MODIFY, "/v/s/f"), event(CREATE, "/v/s/a\nb"), event(RENAME, "/v/s/g", "/v/s/f"),
                 {"event": 0x20000, "path": "/v/s/d", "data": {"audio": True}}, {"event": 0x40, "path": "/v/s/\udcff"}]
        text = b"".join(json.dumps(line, ensure_ascii=False).encode("utf-8", "surrogateescape") + b"\n"
                        for line in lines)
        write(path, text + b"bad line\n")
        done = self.instance.run("queue", "show", path)
        self.assertEqual(b"[02] /v/s/a\\x0Ab\n[05] /v/s/f -> /v/s/g\n[02] /v/s/g\n"
                         b'[04] /v/s/d, data={"audio":true}\n[02] /v/s/\xff\n', done.stdout)
        self.assertEqual((0, b"6\n"), (done.returncode, done.stderr))
        shown = [json.loads(line) for line in self.instance.ctl("queue", "show", "--json", path).splitlines()]
        self.assertEqual({"op": 2, "node": "/v/s/a\nb", "path": "", "data": None}, shown[0])
        self.assertEqual({"op": 5, "node": "/v/s/g", "path": "/v/s/f", "data": None}, shown[1])
        self.assertEqual("/v/s/\udcff", shown[4]["node"])
        with open(path, "rb") as file:
            self.assertEqual(text + b"bad line\n", file.read(), "the queue is only read")

    def test_exit_codes_and_remedies(self):
        rows = [
            (2, "Try", []),
            (2, "no command", ["nonsense"]),
            (2, "unknown option", ["search", "--nonsense", "x"]),
            (2, "--limit", ["search", "--limit", "0", "x"]),
            (2, "missing", ["index"]),
            (3, "fileindexctl up", ["search", "x"]),
            (3, "share list", ["search", "--share", "nonexistent", "x"]),
            (3, "No such file", ["queue", "show", "/nonexistent"]),
            (3, "share list", ["index", "nonexistent"]),
            (3, "no such folder", ["share", "add", "/nonexistent"]),
            (3, "mount --bind", ["share", "add", "/usr/share", "--name", "other"]),
            (3, "too long", ["--root", "/tmp/" + "x" * 100, "status"]),
            (3, "share list", ["share", "remove", "nonexistent"]),
            (1, "share add", ["share", "list"]),
        ]
        for code, text, words in rows:
            with self.subTest(words=words):
                done = self.instance.run(*words)
                self.assertEqual(code, done.returncode, done.stderr)
                self.assertIn(text, done.stderr.decode())
        for words in (["--help"], ["--version"], ["search", "--help"], ["share", "add", "--help"]):
            self.assertTrue(self.instance.ctl(*words))

    def test_removed_share_is_gone_and_can_come_back(self):
        folder = self.up_with_share()
        write(f"{folder}/a.txt", "buzzard")
        self.instance.ctl("index", "docs", "--wait")
        self.instance.ctl("share", "remove", "docs")
        self.instance.ctl("search", "buzzard", code=1)
        self.instance.ctl("share", "add", folder)
        self.instance.wait_idle("docs", folder)
        self.assertEqual([os.fsencode(f"{folder}/a.txt")], self.instance.search("buzzard"))


if __name__ == "__main__":
    unittest.main()
