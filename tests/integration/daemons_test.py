"""The daemons and the tool together, as a person meets them."""

import fcntl
import glob
import json
import os
import pathlib
import signal
import subprocess
import time
import unittest

from instance import BIN, CREATE, DAEMONS, MODIFY, RENAME, InstanceTestCase, event, on_disk, to_bytes, wait_for, write


class DaemonsTest(InstanceTestCase):
    def up_with_share(self, files=0):
        """The folder of the share docs, which is being indexed, with so many files."""
        self.ctl("up")
        folder = self.instance.add_share("docs", "--no-index")
        for i in range(files):
            write(f"{folder}/d{i % 50}/file{i}.txt", f"number{i} " + "some words to read " * 50)
        self.ctl("folder", "add", "/docs")
        return folder

    def up_in_the_middle_of_indexing(self):
        folder = self.up_with_share(4000)
        wait_for(lambda: self.docs()["written"] > 100, "indexing to begin")
        return folder

    def docs(self):
        return self.instance.share_status("docs")

    def expect_index_is_disk(self, folder):
        self.assertEqual(on_disk(folder), self.instance.documents("docs", folder))

    # The main road.

    def test_share_is_searchable_until_it_is_removed_and_when_it_comes_back(self):
        folder = self.up_with_share()
        write(f"{folder}/letters/anna.txt", "dear anna, the zeppelin arrives tomorrow")
        self.ctl("index", "docs", "--wait")
        self.assertIn(b"[zeppelin]", self.ctl("search", "zeppelin", "anna"))
        self.ctl("share", "remove", "docs")
        self.ctl("search", "zeppelin", code=1)
        self.ctl("share", "add", folder)
        self.instance.wait_idle("docs", folder)
        self.assertEqual([os.fsencode(f"{folder}/letters/anna.txt")], self.instance.search("zeppelin"))

    def test_odd_names_and_files_are_found_and_stop_nothing(self):
        folder = self.up_with_share()
        names = [b"line\nbreak.txt", b'quo"te\'s.txt', b"\xff\xfe bytes.txt", b"\x1b[31mred.txt", "日本語.txt".encode(),
                 b" ", b"-rf", b"x" * 255]
        for name in names:
            write(os.fsencode(folder) + b"/" + name, "needle")
        os.mkfifo(f"{folder}/pipe.txt")
        os.symlink("/etc/passwd", f"{folder}/link.txt")
        write(f"{folder}/image.txt", bytes(range(256)) * 100)
        write(f"{folder}/empty.txt", "")
        write(f"{folder}/locked.txt", "needle")
        os.chmod(f"{folder}/locked.txt", 0)
        self.ctl("index", "docs", "--wait")
        self.expect_index_is_disk(folder)
        self.assertLessEqual({os.fsencode(folder) + b"/" + name for name in names}, set(self.instance.search("needle")))
        shown = self.ctl("search", "--limit", "100", "needle")
        self.assertNotIn(b"\x1b", shown)
        self.assertNotIn(b"\xff", shown)
        self.assertIn(b"\\xFF\\xFE bytes.txt", shown)
        self.assertIn(b"line\\x0Abreak.txt", shown)
        reasons = self.docs()["index"]["extract_errors"]
        self.assertEqual(1, reasons.get("not a regular file"), reasons)
        self.assertEqual(1, reasons.get("not text"), reasons)
        if os.geteuid() != 0:
            self.assertEqual(1, reasons.get("Permission denied"), reasons)

    # Interruptions.

    def test_killed_daemons_take_up_where_they_were(self):
        folder = self.up_with_share(3000)
        for program in ("fileindexd", "kovaelasticd", "fileindexd"):
            before = self.docs()["index"]["documents"]
            self.ctl("index", "docs")
            wait_for(lambda: self.docs()["index"]["documents"] != before or self.docs()["state"] == "idle",
                     "the index to grow")
            self.instance.kill(program)
            self.ctl("up")
            wait_for(lambda: self.docs()["state"] != "starting", "the daemon to work")
        self.ctl("index", "docs", "--wait")
        self.expect_index_is_disk(folder)
        self.assertEqual(1, len(self.instance.search("number2999")))

    def test_damaged_or_lost_index_is_filled_again_and_the_list_of_indices_reads_nothing(self):
        folder = self.up_with_share(300)
        self.ctl("folder", "set", "/docs", "--kinds", "document,photo")
        self.ctl("index", "docs", "--wait")
        (index,) = glob.glob(f"{self.instance.root}/var/lib/kova/fileindex/db/*/index.sqlite")
        folders = self.instance.folders()

        def expect_healed():
            wait_for(lambda: self.instance.run("search", "number7").returncode == 0, "the index to be complete")
            self.expect_index_is_disk(folder)
            self.assertEqual([], glob.glob(index + ".damaged-*"))
            self.assertEqual(folders, self.instance.folders())

        os.unlink(index)
        self.assertEqual([], self.instance.search("number7", left_out=["docs"]))
        expect_healed()
        self.ctl("down")
        write(index, b"garbage" * 10000)
        self.ctl("up")
        expect_healed()
        self.ctl("rebuild", "docs", "--wait")
        expect_healed()
        indices = f"{self.instance.root}/var/lib/kova/kovaelasticd/indices.json"
        for damaged in ([indices], [indices, indices + ".copy"]):
            self.ctl("share", "pause", "docs")
            self.ctl("down")
            for path in damaged:
                os.truncate(path, 20)
            self.ctl("up")
            self.ctl("share", "resume", "docs")
            expect_healed()
            self.assertEqual(0, self.instance.status()["index_daemon"]["read"])

    def test_pause_stops_at_once_and_resume_goes_on(self):
        folder = self.up_in_the_middle_of_indexing()
        self.ctl("pause", "1")
        wait_for(lambda: self.docs()["state"] == "paused", "the pause")
        written = self.docs()["written"]
        self.assertLess(written, 4000)
        for command in ("down", "down", "up", "up"):  # each may be repeated
            self.ctl(command)
        wait_for(lambda: self.docs()["state"] == "paused", "the pause after a restart")
        self.ctl("resume")
        self.ctl("index", "docs", "--wait")
        self.expect_index_is_disk(folder)

    def test_reindex_asked_for_during_another_is_not_lost(self):
        folder = self.up_in_the_middle_of_indexing()
        write(f"{folder}/!passed by already.txt", "late")
        self.ctl("folder", "reindex", "/docs")
        self.instance.wait_idle("docs", folder)
        self.expect_index_is_disk(folder)

    def test_paused_share_stops_at_once_and_goes_on_where_it_was(self):
        folder = self.up_in_the_middle_of_indexing()
        self.ctl("share", "pause", "docs")
        daemon = self.instance.status()["index_daemon"]
        self.assertEqual([], daemon["shares"])
        self.assertTrue(50 < daemon["read"] < 4000, daemon)
        self.ctl("share", "resume", "docs")
        self.instance.wait_idle("docs", folder)
        self.expect_index_is_disk(folder)
        self.assertLess(self.instance.status()["index_daemon"]["read"], 4000 + daemon["read"], "it began anew")

    def test_hung_engine_hides_no_share(self):
        self.ctl("up")
        folders = [self.instance.add_share(name) for name in ("a", "b", "c")]
        for name, folder in zip("abc", folders):
            self.instance.wait_idle(name, folder)
        pid = self.instance.pid("kovaelasticd")
        os.kill(pid, signal.SIGSTOP)
        try:
            for folder in folders:  # each worker asks the engine, and more
                self.instance.queue(folder, *(event(MODIFY, f"{folder}/{i}") for i in range(30)))
            wait_for(lambda: self.instance.share_status("a")["state"] == "indexing", "a to ask the engine")
            done = self.instance.run("status", "--json")
            self.instance.ask("fileindexd", {"type": "worker_delete", "data": {"share_name": "a"}})
            left = [share["share"] for share in self.instance.status()["index_daemon"]["shares"]]
            self.instance.kill("fileindexd", signal.SIGTERM)
        finally:
            os.kill(pid, signal.SIGCONT)
        self.assertEqual(["b", "c"], left)
        status = json.loads(done.stdout)
        self.assertEqual(3, done.returncode)
        self.assertIn("does not answer", status["engine"]["problem"])
        self.assertEqual(["a", "b", "c"], [share["share"] for share in status["index_daemon"]["shares"]])

    def test_killed_daemons_start_again(self):
        self.up_with_share()
        root = self.instance.root
        for i in range(20):  # at once, while the process is still going
            program = ("kovanotifyd", "fileindexd", "kovaelasticd")[i % 3]
            pid = self.instance.pid(program)
            os.kill(pid, signal.SIGKILL)
            self.ctl("up")
            self.assertNotEqual(pid, self.instance.pid(program))
        self.assertIsNone(self.instance.status()["supervisor"])
        pid = self.instance.pid("kovanotifyd")
        for program, name in (("kovanotifyd", b"notification"), ("fileindexd", b"index")):
            self.instance.kill(program)
            done = self.instance.run("search", "--json", "nothing")
            self.assertIn(name + b" daemon does not run", done.stderr)
            self.assertIn("does not run", json.loads(done.stdout)["not_noticed"])
            self.ctl("up", "--no-supervisor")
        for supervisor in (None, "fileindex-supervisor"):  # killed itself, it is missed, and is started by the next "up"
            if supervisor is not None:
                self.instance.kill(supervisor)
                self.assertIsNone(self.instance.status()["supervisor"])
                self.assertIn(b"supervisor: does not run", self.ctl("status"))
            ups = [subprocess.Popen([os.path.join(BIN, "fileindexctl"), "up"], env=self.instance.env,
                                    stdout=subprocess.DEVNULL) for _ in range(3)]
            self.assertEqual([0, 0, 0], [up.wait() for up in ups])
            pids = {program: self.instance.pid(program) for program in DAEMONS}
            for program in DAEMONS:
                os.kill(pids[program], signal.SIGKILL)
            wait_for(lambda: all(self.status_of(program) not in (None, pids[program]) for program in DAEMONS),
                     "the daemons to be started again")
        self.assertEqual(self.instance.pid("fileindex-supervisor"), self.instance.status()["supervisor"]["pid"])
        log = open(f"{root}/var/log/kova/fileindex-supervisor.log", encoding="utf-8").read()
        self.assertIn("kovanotifyd ended without having been stopped, and is started again", log)
        self.ctl("folder", "delete", "/docs")  # stops the index daemon
        time.sleep(2.5)
        self.assertIsNone(self.status_of("fileindexd"))
        pid = self.instance.pid("fileindex-supervisor")
        os.unlink(f"{root}/var/run/fileindex-supervisor.pid")
        wait_for(lambda: not os.path.exists(f"/proc/{pid}/exe"), "the supervisor of nothing to end")

    def status_of(self, program):
        """The process that the daemon says it is."""
        names = {"kovaelasticd": "engine", "kova-access": "access_check", "fileindexd": "index_daemon", "kovanotifyd": "notification_daemon",
                 "kovawebd": "web"}
        state = self.instance.status().get(names.get(program, "content_extraction"))
        return state and state.get("pid")

    def holder(self, paths, user):
        """A process that holds shared locks on those of the files that the user may open; and how many these are."""
        answer, question = os.pipe()
        pid = os.fork()
        if pid == 0:
            os.setresuid(user, user, user)
            held = []
            for path in paths:
                try:
                    held.append(os.open(path, os.O_RDONLY))
                    fcntl.flock(held[-1], fcntl.LOCK_SH)
                except PermissionError:
                    pass
            os.write(question, bytes([len(held)]))
            signal.pause()
        self.addCleanup(os.waitpid, pid, 0)
        self.addCleanup(os.kill, pid, signal.SIGKILL)
        return pid, os.read(answer, 1)[0]

    @unittest.skipIf(os.geteuid() != 0, "only root can become somebody else")
    def test_locks_of_others_stop_nothing(self):
        root, nobody = self.instance.root, 65534
        os.chmod(root, 0o755)
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        self.ctl("folder", "reindex", "/docs")
        locks = [f"{root}/{name}" for name in ("etc/kova/shares.json.lock", "tmp/ferrox_cfg_folder.lock",
                                               "tmp/ferrox_cfg_fi_status.lock",
                                               *(f"var/run/{program}.pid" for program in DAEMONS))]
        self.assertTrue(all(map(os.path.isfile, locks)), locks)
        self.assertEqual(0, self.holder(locks + [self.instance.queue_path(folder)], nobody)[1])
        self.ctl("down")
        # What an earlier version left behind, in the hands of somebody else.
        for path in locks:
            os.chmod(path, 0o644)
        os.chmod(f"{root}/etc/kova", 0o755)
        self.assertEqual(len(locks), self.holder(locks, nobody)[1])
        os.chmod(locks[1], 0o600)
        self.ctl("up")  # who waits for a lock in vain fails
        self.instance.add_share("more")
        self.ctl("folder", "delete", "/docs")
        self.assertEqual(0, self.holder(locks, nobody)[1])
        # Who may open them is waited for, and told.
        pid, held = self.holder(locks[:1], 0)
        self.assertEqual(1, held)
        self.assertRegex(self.instance.run("share", "remove", "more").stderr.decode(),
                         f"shares.json.lock: process {pid} .python.* of user 0 holds the lock; end it")

    def test_bad_requests_are_answered(self):
        self.up_with_share()
        for request in ({"type": "nonsense"}, {"type": 3}, [], "x", {"type": "pause", "data": {}}):
            reply = self.instance.ask("fileindexd", request, b"\0")
            self.assertFalse(reply["success"])
            self.assertTrue(reply["error"]["msg"])

    def test_damaged_settings_are_named_and_recovered_from(self):
        folder = self.up_with_share()
        self.instance.wait_idle("docs", folder)
        root, etc = self.instance.root, f"{self.instance.root}/var/packages/Ferrox/etc"
        log = pathlib.Path(f"{root}/var/log/kova/fileindexd.log")
        self.ctl("pause")
        self.ctl("resume")
        rows = [(f"{etc}/fileindex.status", "{broken", "pause", "; correct the file, or move it away"),
                (f"{etc}/fileindex.folders", '[{"path": "/docs", "name": "d", "document": "yes"}]', "folder list",
                 ': entry 1 (/docs) has a "document" that is neither true nor false; correct the file'),
                (f"{root}/etc/kova/shares.json", "[{", "index docs", " is not JSON: Line 1, Column 3 Missing")]
        for path, damage, command, text in rows:
            with open(path, encoding="utf-8") as file:
                good = file.read()
            write(path, damage)
            for words in [command.split()] + [["status"]] * (command != "pause"):
                done = self.instance.run(*words)
                told = (done.stderr + done.stdout).decode()
                self.assertEqual((3, True), (done.returncode, path + text in told), told)
                self.assertNotRegex(told, "data=|x0A|KLIB")
            name = f"{folder}/{os.path.basename(path)}.txt"
            write(name, "heron")
            self.instance.queue(folder, event(CREATE, name))
            wait_for(lambda: path + text in log.read_text("utf-8"), "the line in the log")
            write(path, good)
            self.instance.wait_idle("docs", folder)
            self.assertIn(os.fsencode(name), self.instance.search("heron"))

    # The tool.

    def test_queue_show_prints_what_would_be_done(self):
        path = f"{self.instance.root}/some.queue"
        lines = [event(MODIFY, "/v/s/f"), event(CREATE, "/v/s/a\nb"), event(RENAME, "/v/s/g", "/v/s/f"),
                 {"event": 0x20000, "path": "/v/s/d", "data": {"audio": True}}, {"event": 0x40, "path": "/v/s/\udcff"}]
        text = b"".join(to_bytes(line) + b"\n" for line in lines)
        write(path, text + b"bad line\n")
        done = self.instance.run("queue", "show", path)
        self.assertEqual(b"[02] /v/s/a\\x0Ab\n[05] /v/s/f -> /v/s/g\n[02] /v/s/g\n"
                         b'[04] /v/s/d, data={"audio":true}\n[02] /v/s/\\xFF\n', done.stdout)
        self.assertEqual((0, b"6\n"), (done.returncode, done.stderr))
        shown = [json.loads(line) for line in self.ctl("queue", "show", "--json", path).splitlines()]
        self.assertEqual({"op": 2, "node": "/v/s/a\nb", "path": "", "data": None}, shown[0])
        self.assertEqual({"op": 5, "node": "/v/s/g", "path": "/v/s/f", "data": None}, shown[1])
        self.assertEqual("/v/s/\udcff", shown[4]["node"])
        with open(path, "rb") as file:
            self.assertEqual(text + b"bad line\n", file.read(), "the queue is only read")


if __name__ == "__main__":
    unittest.main()
