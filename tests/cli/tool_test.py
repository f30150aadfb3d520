"""The tool on an instance without daemons: usage, remedies, paths, completion."""

import contextlib
import fcntl
import json
import os
import re
import shutil
import socket
import struct
import subprocess
import tempfile
import termios
import threading
import time
import unittest

BIN = os.environ.get("FERROX_BIN", "")
SOURCE = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..")
TOOL = os.path.join(BIN, "fileindexctl")


def write_json(path, value):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "w", encoding="utf-8") as file:
        json.dump(value, file)


class FakeDaemon:
    """Answers each command by what `answers` has for it, and notes what it was asked."""

    def __init__(self, root, name, answers):
        self.answers, self.asked = answers, []
        os.makedirs(f"{root}/var/run", exist_ok=True)
        self.path = f"{root}/var/run/{name}.sock"
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.bind(self.path)
        self.socket.listen()
        threading.Thread(target=self.serve, daemon=True).start()

    def serve(self):
        while True:
            try:
                connection, _ = self.socket.accept()
            except OSError:
                return
            with contextlib.suppress(ConnectionError), connection, connection.makefile("rwb") as stream:
                header = stream.read(4)
                if not header:
                    continue  # who only looks whether it is there
                request = json.loads(stream.read(struct.unpack("=I", header)[0]).rstrip(b"\0"))
                command = request.get("type") or request["command"]
                self.asked.append((command, request["data"]))
                answer = self.answers[command]
                reply = json.dumps(answer(request["data"]) if callable(answer) else answer).encode()
                stream.write(struct.pack("=I", len(reply)) + reply)

    def close(self):
        self.socket.shutdown(socket.SHUT_RDWR)
        self.socket.close()
        os.unlink(self.path)


class HungDaemon(FakeDaemon):
    def serve(self):
        pass


def success(data):
    return {"success": True, "data": data}


def failure(message):
    return {"success": False, "error": {"code": 502, "msg": message}}


class ToolCase(unittest.TestCase):
    """An instance with two shares and three indexed folders, of which one is in a share that is gone."""

    def setUp(self):
        self.root = os.path.realpath(tempfile.mkdtemp(prefix="fi-"))
        self.addCleanup(shutil.rmtree, self.root)
        self.env = dict(os.environ, FERROX_ROOT=self.root, LC_ALL="C.UTF-8")
        for folder in ("photo/trip", "photo/tree/deep", "photos/a b"):
            os.makedirs(f"{self.root}/vol/{folder}")
        self.write_shares("photo", "photos")
        kinds = {"document": True, "audio": False, "video": False, "photo": True}
        write_json(f"{self.root}/var/packages/Ferrox/etc/fileindex.folders",
                   [{"path": path, "name": "n", **kinds} for path in ("/photo/trip", "/photos/a b", "/gone/x")])

    def write_shares(self, *names):
        write_json(f"{self.root}/etc/kova/shares.json", [{"name": name, "path": f"{self.root}/vol/{name}"} for name in names])

    def run_tool(self, *words, cwd="/"):
        return subprocess.run([TOOL, *words], env=self.env, cwd=cwd, capture_output=True, timeout=60, check=False)

    def daemon(self, name, **answers):
        daemon = FakeDaemon(self.root, name, answers)
        self.addCleanup(daemon.close)
        return daemon


class ToolTest(ToolCase):
    def complete(self, *words):
        return self.run_tool("complete-words", *words).stdout.decode().splitlines()

    def commands(self):
        for first in self.complete(""):
            if not first.startswith("-") and first != "help":
                of_two = b"COMMAND ..." in self.run_tool(first, "--help").stdout
                seconds = self.complete(first, "") if of_two else []
                yield from [[first, second] for second in seconds] or [[first]]

    def test_folder_is_named_as_people_would(self):
        os.symlink(f"{self.root}/vol/photo", f"{self.root}/link")
        os.symlink("/etc", f"{self.root}/etc-link")
        os.makedirs(f"{self.root}/vol/photo/photos/a b")  # looks like a share path from inside of share photo
        vol, trip, blank = f"{self.root}/vol", "/photo/trip", "/photos/a b"
        rows = [
            ("/photo/trip", "/", trip), ("/photo/trip/", "/", trip), ("//photo/.//trip", "/", trip),
            (f"{vol}/photo/trip", "/", trip), (f"{vol}/photos/../photo/trip/.", "/", trip),
            ("trip", f"{vol}/photo", trip), (".", f"{vol}/photo/trip", trip), ("../trip", f"{vol}/photo/tree", trip),
            (blank, f"{vol}/photo", blank), ("./a b", f"{vol}/photos", blank), ("/gone/x", "/", "/gone/x"),
            ("/photo/../photo/trip", "/", b"(error 902)"), ("/photo", "/", b"(error 902)"),
            (f"{self.root}/link/trip", "/", b"is, without links"), (f"{self.root}/etc-link", "/", b"share add"),
            ("/etc", "/", b"lies in no share"), ("/phot", "/", b"neither"), ("/photosx", "/", b"neither"),
        ]
        for word, cwd, expected in rows:
            with self.subTest(word=word, cwd=cwd):
                done = self.run_tool("folder", "get", "--json", word, cwd=cwd)
                if isinstance(expected, bytes):
                    self.assertEqual(3, done.returncode)
                    self.assertIn(expected, done.stderr)
                else:
                    self.assertEqual(0, done.returncode, done.stderr)
                    self.assertEqual(expected, json.loads(done.stdout)["path"])

    def test_list_shows_pages_and_order(self):
        listed = json.loads(self.run_tool("folder", "list", "--json", "--sort", "path", "--desc", "--offset", "1",
                                          "--limit", "1").stdout)
        self.assertEqual((["/photo/trip"], 3), ([folder["path"] for folder in listed["folder"]], listed["total"]))
        shown = self.run_tool("folder", "list").stdout.decode()
        self.assertIn("/photos/a b\n    document, photo, \"n\"\n", shown)
        self.assertEqual(3, len(re.findall("document, photo", shown)))

    def given(self, command, words, otherwise):
        """What the usage of a command asks for, each from `words` by its name."""
        usage = self.run_tool(*command.split(), "--help").stdout.decode().splitlines()[0].split(command, 1)[1]
        required = re.sub(r"\[--\w.*?\]+ ?", "", usage)
        named = re.findall(r"(?<!\S)[A-Z]\w+", required.replace("--kinds KINDS", ""))
        return [words.get(word, otherwise) for word in named] + ["--kinds", "all"] * ("--kinds" in required)

    def test_damaged_table_of_shares_is_named_by_every_command(self):
        path = f"{self.root}/etc/kova/shares.json"
        with open(path, "w", encoding="utf-8") as file:
            file.write("[{")
        words = {"SHARE": "photo", "PATH": "/photo/trip", "NEW_NAME": "new", "MOUNT_POINT": "/"}
        for command in map(" ".join, self.commands()):
            if command not in ("up", "down", "prepare", "queue show") and "token" not in command:  # these need no shares
                with self.subTest(command=command):
                    done = self.run_tool(*command.split(), *self.given(command, words, f"{self.root}/vol/photo"))
                    self.assertIn(f"the share table {path} is not JSON: Line", done.stderr.decode())
                    self.assertEqual(0 if command in ("config show", "folder list", "pause", "resume") else 3, done.returncode, done.stderr)

    def test_damaged_list_is_named_and_hides_nothing_else(self):
        with open(f"{self.root}/var/packages/Ferrox/etc/fileindex.folders", "w", encoding="utf-8") as file:
            file.write("[{")
        for words in (["folder", "list"], ["folder", "get", "/photo/trip"], ["index", "photo"]):
            done = self.run_tool(*words)
            self.assertEqual(3, done.returncode)
            self.assertIn(b"fileindex.folders is not JSON; correct the file, or move it away", done.stderr)
        status = json.loads(self.run_tool("status", "--json").stdout)
        self.assertIn("(error 504)", status["problem"])

    def test_exit_codes_and_remedies(self):
        rows = [
            (2, "Try", []),
            (2, "no command", ["nonsense", "add"]),
            (2, r"unknown option --\x1B[2J\xE2\x80\xAE", ["search", "--\x1b[2J\u202e"]),
            (2, "add, set, delete", ["folder", "nonsense"]),
            (2, "--kinds takes", ["folder", "add", "--kinds", "music", "/photo"]),
            (2, "--kinds is missing", ["folder", "set", "/photo"]),
            (2, "--name goes with one", ["folder", "add", "/photo", "/photos", "--name", "x"]),
            (2, "--sort takes one of", ["folder", "list", "--sort", "size"]),
            (2, "missing", ["share", "rename", "a"]),
            (2, "too many", ["share", "rename", "a", "b", "c"]),
            (2, "too many", ["prepare", "x"]),
            (2, "missing", ["folder", "delete"]),
            (2, "cannot be a share's name", ["share", "rename", "photo", "a/b"]),
            (2, "--accounts takes", ["home", "enable", "--accounts", "x"]),
            (2, "--limit", ["search", "--limit", "0", "x"]),
            (3, "fileindexctl up", ["search", "x"]),
            (3, "share list", ["search", "--share", "nonexistent", "x"]),
            (3, "share list", ["index", "nonexistent"]),
            (3, "share list", ["share", "remove", "nonexistent"]),
            (3, "No such file", ["queue", "show", "/nonexistent"]),
            (3, "/etc/passwd is no queue file", ["queue", "show", "/etc/passwd"]),
            (3, "no such folder", ["share", "add", "/nonexistent"]),
            (3, "/proc is the system's own", ["share", "add", "--no-index", "/proc"]),
            (3, "mount --bind", ["share", "add", "--no-index", "/usr/share", "--name", "other"]),
            (3, "too long", ["--root", "/tmp/" + "x" * 100, "status"]),
            (1, "share add", ["--root", f"{self.root}/none", "share", "list"]),
            (0, "", ["--help"]),
            (0, "", ["--version"]),
        ]
        for code, text, words in rows:
            with self.subTest(words=words):
                done = self.run_tool(*words)
                self.assertEqual(code, done.returncode, done.stderr)
                self.assertIn(text, done.stderr.decode())

    def test_fresh_search_asks_both_daemons_first_or_shows_nothing(self):
        engine = self.daemon("kovaelasticd", search=success({"total": 1, "hits": [{"doc_id": "/v/f", "fields": {}}]}))
        synced = success(None)
        rows = [
            ("notification daemon does not run", None, None),
            ("the queue of photo is held", success({"problems": ["the queue of photo is held"]}), synced),
            ("its root is away", failure("its root is away"), synced),
            ("index daemon does not run", success({"problems": []}), None),
            ("share photo: paused", success({"problems": []}), failure("share photo: paused")),
            ("", success({"problems": []}), synced),
        ]
        for reason, noticed, indexed in rows:
            daemons = [FakeDaemon(self.root, name, {"sync": answer}) if answer else None
                       for name, answer in (("kovanotifyd", noticed), ("fileindexd", indexed))]
            done = self.run_tool("search", "--fresh=7", "--share", "photo", "x")
            for daemon in daemons:
                if daemon:
                    daemon.close()
            with self.subTest(reason=reason):
                self.assertEqual((4, b"") if reason else (0, done.stdout), (done.returncode, done.stdout), done.stderr)
                self.assertIn(reason, done.stderr.decode())
                self.assertEqual(bool(reason), b"Without --fresh" in done.stderr)
                self.assertEqual([] if reason else ["search"], [command for command, _ in engine.asked])
        (_, waited), (_, left) = daemons[0].asked + daemons[1].asked
        self.assertEqual(7000, waited["timeout_ms"])
        self.assertEqual(["photo"], left["shares"])
        self.assertLessEqual(left["timeout_ms"], 7000)
        self.assertEqual(2, self.run_tool("search", "--fresh=soon", "x").returncode)

    def test_what_was_left_out_is_told_whatever_was_found(self):
        hit = {"doc_id": "/v/f", "fields": {}}
        out = [{"id": "fileindex_photo", "code": 1409, "reason": "paused"}, {"id": "fileindex_gone", "code": 1404, "reason": "?"},
               {"id": "fileindex_photos", "code": 1407, "reason": "photos.sqlite is damaged"}]
        told = ["share photo: .*'fileindexctl share resume photo'", "share gone: .*has no index yet", "share photos: photos.sqlite"]
        for hits, left_out, partial, code in (([hit], [], [], 0), ([hit], out, [], 4), ([], out, [], 4), ([], [], [], 1),
                                              ([hit], out, ["--partial"], 0), ([], out, ["--partial"], 1)):
            engine = FakeDaemon(self.root, "kovaelasticd", {"search": success(
                {"total": len(hits), "hits": hits, "left_out": left_out, "took_us": 1})})
            with self.subTest(hits=hits, left_out=left_out, partial=partial):
                shown, json_shown = self.run_tool("search", *partial, "x"), self.run_tool("search", *partial, "--json", "x")
                engine.close()
                self.assertEqual([code, code], [shown.returncode, json_shown.returncode])
                self.assertEqual({"fileindex_gone", "fileindex_photo", "fileindex_photos"}, set(engine.asked[0][1]["ids"]))
                for line in told if left_out else []:
                    self.assertRegex(shown.stderr.decode(), line)
                self.assertEqual(not hits and not left_out, b"nothing found" in shown.stderr)
                self.assertEqual([entry["id"] for entry in left_out],
                                 [entry["id"] for entry in json.loads(json_shown.stdout)["left_out"]])
        # One share is behind: the others are searched, and with --partial that one too.
        self.daemon("kovanotifyd", sync=success({"problems": []}))
        for partial, code, asked in (([], 4, 2), (["--partial"], 0, 3)):
            indexd = FakeDaemon(self.root, "fileindexd", {"sync": lambda data: failure("share gone: it is paused")
                                                          if "gone" in data["shares"] else success(None)})
            engine = FakeDaemon(self.root, "kovaelasticd", {"search": success({"total": 1, "hits": [hit], "left_out": []})})
            done = self.run_tool("search", "--fresh", *partial, "x")
            engine.close()
            indexd.close()
            self.assertEqual((code, asked), (done.returncode, len(engine.asked[0][1]["ids"])), done.stderr)
            self.assertIn(b"share gone: it is paused", done.stderr)
            self.assertIn(b"/v/f", done.stdout)

    def test_others_tell_what_they_left_out(self):
        os.mkdir(f"{self.root}/vol/gone")
        self.write_shares("gone", "photo", "photos")
        paused = {"success": False, "error": {"code": 1409, "msg": "paused"}}
        self.daemon("kovaelasticd", ping=success({}), index_stat=success({}), document_get_by_query=lambda data: paused
                    if data["id"] == "fileindex_photo" else success([{"KOVAMDPath": "/v/bad", "_KOVAExtractError": "torn"}]))
        for words, found in ((["unread"], b"/v/bad"), (["show", "/photo/trip/a", "/photos/a b/c"], b"/v/bad")):
            done = self.run_tool(*words)
            self.assertEqual(4, done.returncode, done.stderr)
            self.assertIn(found, done.stdout)
            self.assertRegex(done.stderr.decode(), "left out: share photo: .*'fileindexctl share resume photo'")

    def test_hung_daemons_cost_seconds_and_hide_nothing_of_the_others(self):
        shares = [{"share": "photo", "path": "/v/photo", "state": "idle", "failures": {}}]
        answering = {"kovaelasticd": {"ping": success({"pid": 4})}, "kovanotifyd": {"status": success({"pid": 6, "queues": []})},
                     "fileindexd": {"status": success({"pid": 5, "workers": 2, "paused": False, "shares": shares})},
                     "kovacontentextractd": {"status": success({"pid": 7})}, "kova-access": {"status": success({"pid": 8})}}
        places = {"kovaelasticd": ("engine", "search engine"), "fileindexd": ("index_daemon", "index daemon"),
                  "kovanotifyd": ("notification_daemon", "notification daemon"),
                  "kovacontentextractd": ("content_extraction", "content extraction")}
        if os.geteuid() == 0:
            places["kova-access"] = ("access_check", "access check")
        for hung_names in (["kovanotifyd"], list(places)):
            daemons = [HungDaemon(self.root, name, {}) if name in hung_names else FakeDaemon(self.root, name, answers)
                       for name, answers in answering.items()]
            began = time.monotonic()
            runs = [subprocess.Popen([TOOL, *words], env=self.env, stdout=subprocess.PIPE, stderr=subprocess.PIPE)
                    for words in (["status"], ["status", "--json"])]
            (shown, _), (json_shown, _) = [run.communicate(timeout=60) for run in runs]
            self.assertLess(time.monotonic() - began, 24, "less than 5 s for each, one after the other")
            for daemon in daemons:
                daemon.close()
            for name, (key, title) in places.items():
                with self.subTest(hung=hung_names, name=name):
                    hangs = name in hung_names
                    line = re.search(f"^{title}: (.*)$", shown.decode(), re.M).group(1)
                    self.assertRegex(line, "^does not answer; .*'fileindexctl down'" if hangs else "^runs, process ")
                    self.assertEqual(hangs, "problem" in json.loads(json_shown)[key])
            self.assertEqual([3, 3], [run.returncode for run in runs])
            self.assertIn("the notification daemon does not answer" if len(hung_names) == 1 else "is not known", shown.decode())

    def test_root_volume_is_paused_and_resumed_share_by_share(self):
        engine = self.daemon("kovaelasticd", **dict.fromkeys(("ping", "index_pause", "index_resume"), success({})))
        self.daemon("fileindexd", **dict.fromkeys(("status", "worker_delete", "worker_create"), success({})))
        volume = self.root
        while not os.path.ismount(volume):
            volume = os.path.dirname(volume)
        if volume != "/":
            self.skipTest("the temporary folder is a volume of its own")
        for verb, told in (("pause", "paused"), ("resume", "resumed")):
            done = self.run_tool("volume", verb, "/")
            self.assertEqual((0, f"/photo/trip: {told}\n/photos/a b: {told}\n"), (done.returncode, done.stdout.decode()))
        self.assertEqual(["index_pause"] * 2 + ["index_resume"] * 2, [name for name, _ in engine.asked if name != "ping"])
        self.assertIn(b"no folder was paused with the volume /;", self.run_tool("volume", "forget", "/").stderr)

    def test_what_a_daemon_says_makes_the_exit_code(self):
        refusal = {"success": False, "error": {"code": 1403, "msg": "query, character 1: no"}}
        engine = self.daemon("kovaelasticd", ping=success({"pid": 4}), search=refusal)
        self.daemon("kova-access", status=success({"pid": 8}))
        self.assertEqual((2, True), ((done := self.run_tool("search", "(")).returncode, b"character 1" in done.stderr))
        for folder in ("var/lib/kova/fileindex/queue", "tmp"):
            os.makedirs(f"{self.root}/{folder}")
        for state, detail, text in (("paused", "", "indexing is paused; share photo is compared afterwards"),
                                    ("error", "no", "share photo: no; the index daemon tries again")):
            share = {"share": "photo", "path": "/v", "state": state, "detail": detail, "queued": 1, "failures": {}}
            daemon = FakeDaemon(self.root, "fileindexd", {"notify_setting_changed": success({}), "status": success(
                {"pid": 5, "workers": 1, "paused": False, "shares": [share]})})
            done = self.run_tool("index", "--wait", "photo")
            self.assertEqual((3, True), (done.returncode, text in done.stderr.decode()), done.stderr)
            watching = FakeDaemon(self.root, "kovanotifyd", {"status": success({"pid": 6, "queues": []})})
            codes = [self.run_tool("status").returncode]
            watching.close()
            codes.append(self.run_tool("status").returncode)
            daemon.close()
            self.assertEqual([0, 3, 3], codes + [self.run_tool("status").returncode])

    def test_search_of_a_hung_engine_ends(self):
        daemon = HungDaemon(self.root, "kovaelasticd", {})
        self.addCleanup(daemon.close)
        done = self.run_tool("search", "x")
        self.assertEqual(3, done.returncode)
        self.assertIn(b"the search engine does not answer; see its log, or restart it", done.stderr)

    def test_search_says_when_not_all_was_ranked(self):
        for bounded in (True, False):
            daemon = FakeDaemon(self.root, "kovaelasticd", {"search": success(
                {"total": 300000, "ranking_bounded": bounded, "hits": [{"doc_id": "/v/f", "fields": {}}]})})
            shown = self.run_tool("search", "x").stdout
            daemon.close()
            self.assertEqual(bounded, b"so many match that only a part was ranked" in shown)

    def test_search_says_how_words_were_taken(self):
        hits = [{"doc_id": "/v/a.txt", "title": "The Licence\x1b", "score": 2.5, "fields": {},
                 "explain": [{"what": "license", "where": "title", "adds": 2.25}, {"what": "recent", "adds": 0.25}]},
                {"doc_id": "/v/Notes.txt", "title": "notes", "fields": {}}]
        repaired = [{"from": "lincense", "to": "license"}, {"from": "lincense", "to": "licence"},
                    {"from": "bok", "to": "book", "also": True}]
        answer = {"total": 1340, "total_all": 12, "ignored": ["how", "do"], "repaired": repaired, "hits": hits}
        engine = self.daemon("kovaelasticd", search=lambda data: success(answer))
        shown = self.run_tool("search", "--all-words", "--explain", "x").stdout.decode()
        self.assertTrue(engine.asked[0][1]["all_words"] and engine.asked[0][1]["explain"])
        self.assertTrue(shown.startswith(
            'searched for "license" or "licence" instead of "lincense"\nalso searched for "book" beside "bok"\n'
            "too common to find files by themselves: how, do\n12 with all words, 1,340 with some of them\n"
            "/v/a.txt\n    The Licence\\x1B\n    document, "), shown)
        self.assertIn("\n    score 2.50\n      +2.25  license in title\n      +0.25  recent\n/v/Notes.txt\n    doc", shown)
        self.assertLessEqual(answer.items(), json.loads(self.run_tool("search", "--json", "x").stdout).items())
        for total_all, none_has_all, line in ((0, False, "no file has all words; 1,340 have some of them"),
                                              (None, True, "no file has all words; these have some of them")):
            answer = {"total": 1340, "hits": hits, "none_has_all": none_has_all}
            answer |= {} if total_all is None else {"total_all": total_all}
            self.assertTrue(self.run_tool("search", "x").stdout.decode().startswith(line + "\n/v/a"))
        answer = {"total": 0, "hits": [], "suggestions": ["runs"]}
        self.assertIn(b"nothing found. Did you mean: runs?\n", self.run_tool("search", "x").stderr)
        answer["repaired"] = repaired
        self.assertIn('nothing found, nor for "license" or "licence" instead of "lincense", nor for "book" beside "bok". Did',
                      self.run_tool("search", "x").stderr.decode())

    def on_terminal(self, *words, **env):
        """What the tool writes to a terminal of 60 columns."""
        terminal, output = os.openpty()
        fcntl.ioctl(output, termios.TIOCSWINSZ, struct.pack("HHHH", 24, 60, 0, 0))
        with subprocess.Popen([TOOL, *words], env=dict(self.env, **env), stdout=output, stderr=output) as tool:
            os.close(output)
            shown = b""
            try:
                while piece := os.read(terminal, 65536):
                    shown += piece
            except OSError:
                pass  # how a terminal ends that nobody has open any more
            tool.wait(60)
        os.close(terminal)
        return shown.decode().replace("\r\n", "\n")

    def test_hits_on_a_terminal(self):
        model = {"KOVAMDAcquisitionMake": "NIKON", "KOVAMDAcquisitionModel": "NIKON D750\x1b"}
        passage = "a long \x02pas\u202esage\x03 that goes on until it needs a line more, with \u65e5\u672c\u8a9e wider than it is long"
        hits = [{"doc_id": "/v/trips/a b\x1b.jpg", "title": "Lisbon", "snippet": passage, "fields": model},
                {"doc_id": "/v/trips/b.jpg", "fields": {}}]
        engine = self.daemon("kovaelasticd", search=success({"total": 2, "hits": hits, "left_out": [], "asked": [
            {"name": "camera", "fields": list(model)}]}))
        plain = self.on_terminal("search", "camera:nikon", TERM="xterm", VTE_VERSION="7000", NO_COLOR="1")
        self.assertTrue(engine.asked[0][1]["tell_fields"])
        self.assertTrue(plain.startswith(
            "Lisbon\n    /v/trips/a b\\x1B.jpg\n    a long [pas\\xE2\\x80\\xAEsage] that goes on until it needs\n"
            "    a line more, with \u65e5\u672c\u8a9e wider than it is long\n"
            "    camera: NIKON, NIKON D750\\x1B\n    image, 0 B, -\n\nb.jpg\n    /v/trips\n    image, "), plain)
        styled = self.on_terminal("search", "camera:nikon", TERM="xterm", VTE_VERSION="7000", TMUX="", NO_COLOR="")
        self.assertRegex(styled, "\033]8;;file://[^/]+/v/trips/a%20b%1B.jpg\033.\033\\[1;36mLisbon\033\\[0m\033]8;;\033")
        self.assertNotIn("\033]8", self.on_terminal("search", "x", TERM="linux", VTE_VERSION=""))
        self.assertNotIn("tell_fields", (self.run_tool("search", "x"), engine.asked)[1][-1][1])

    def test_show_says_why_a_file_is_not_indexed(self):
        trip = f"{self.root}/vol/photo/trip"
        for name in (".DS_Store", "odd", "fine", "../tree/x"):
            with open(f"{trip}/{name}", "w", encoding="utf-8"):
                pass
        os.symlink("fine", f"{trip}/link")
        share = {"share": "photo", "state": "idle", "failures": {"too odd": {"count": 1, "examples": [f"{trip}/odd"]}}}
        self.daemon("kovaelasticd", document_get_by_query=success([]), index_stat=success({}))
        indexd = FakeDaemon(self.root, "fileindexd", {"status": success({"paused": False, "shares": [share]})})
        rows = [("none", "there is no such file"), ("link", "a link to fine"), (".DS_Store", "a name that systems"),
                ("../tree/x", f"no indexed folder; 'fileindexctl folder add {self.root}/vol/photo/tree'"),
                ("odd", "failed: too odd"), ("fine", "'fileindexctl index photo' finds it")]
        for name, text in rows:
            done = self.run_tool("show", name, cwd=trip)
            self.assertEqual(1, done.returncode)
            self.assertRegex(done.stderr.decode(), f"is not in the index: .*{re.escape(text)}")
        indexd.close()
        self.assertIn(b"index daemon does not run", self.run_tool("show", f"{trip}/fine").stderr)
        self.assertIn(b"'fileindexctl share add /etc' makes its folder one", self.run_tool("show", "/etc/passwd").stderr)

    def test_dry_run_counts_and_changes_nothing(self):
        folder = f"{self.root}/vol/photo"
        for name, size in (("a.txt", 3), ("tree/b.mp3", 4), ("tree/deep/c.jpg", 5), ("trip/d.txt", 6), ("tree/.DS_Store", 7),
                           ("node_modules/e.js", 8), ("tree/f.log", 9)):
            os.makedirs(os.path.dirname(f"{folder}/{name}"), exist_ok=True)
            with open(f"{folder}/{name}", "w", encoding="utf-8") as file:
                file.write("x" * size)
        os.symlink("a.txt", f"{folder}/link")

        def files():
            return sorted((place, names) for place, _, names in os.walk(self.root))

        before = files()
        done = self.run_tool("folder", "add", "/photo", "--kinds", "document", "--dry-run", "--json", "--exclude", "*.log")
        counted = json.loads(done.stdout)
        self.assertEqual((3, 12, 2, {"files": 1, "bytes": 3}, 1), (
            counted["files"], counted["bytes"], counted["folders"], counted["content"], counted["links"]), done.stderr)
        self.assertEqual({"document": {"files": 1, "bytes": 3}, "audio": {"files": 1, "bytes": 4},
                          "photo": {"files": 1, "bytes": 5}}, counted["kinds"])
        self.assertEqual({"files": 1, "bytes": 9}, counted["excluded"])
        left_out = {entry["path"]: entry["reason"] for entry in counted["left_out"]}
        self.assertEqual({f"{folder}/trip", f"{folder}/node_modules"}, set(left_out))
        self.assertEqual("it is indexed already", left_out[f"{folder}/trip"])
        self.assertIn('"node_modules/" (default)', left_out[f"{folder}/node_modules"])
        shown = self.run_tool("share", "add", f"{self.root}/vol/photo/tree", "--dry-run").stdout.decode()
        self.assertTrue(shown.startswith(f"{folder}/tree: 3 files, 18 B, in 2 folders\n"), shown)
        self.assertEqual(before, files())
        self.assertEqual(3, self.run_tool("folder", "add", "/photo/trip", "--dry-run").returncode)

    def test_status_tells_how_changes_are_noticed(self):
        shares = [{"share": name, "path": "/v/" + name, "queue": "/q/" + name, "state": "idle", "oldest_change": 2000,
                   "failures": {}, "index": {"error": {"code": 1407, "msg": name + " is torn"}}}
                  for name in ("same", "differ", "none")]
        self.daemon("fileindexd", status=success({"pid": 5, "workers": 2, "paused": False, "shares": shares}))
        self.assertIn(b"notification daemon: does not run, so that", self.run_tool("status").stdout)
        folder = {"path": "/v/a", "watch": "inotify", "reason": "fanotify is missing", "covered": True}
        other = {"path": "/v/b", "watch": "fanotify", "reason": "", "covered": False}
        queues = [
            {"queue": "/q/same", "application": "fileindex", "watches": [folder, dict(folder, path="/v/c")], "held": 3,
             "held_since": 1000, "held_reason": "the disk is full"},
            {"queue": "/q/differ", "application": "fileindex", "watches": [folder, other], "held": 0, "held_since": 0},
            {"queue": "/q/none", "application": "another", "watches": [folder], "held": 0, "held_since": 0}]
        self.daemon("kovanotifyd", status=success({"pid": 6, "queues": queues, "lost": 0, "changes": 9,
                                                   "problems": ["/x cannot be read"]}))
        shown = self.run_tool("status").stdout.decode()
        for expected in ("notification daemon: runs, process 6, 9 changes noticed\n    /x cannot be read\n",
                         "    changes by inotify (fanotify is missing)\n    held in memory: 3, the oldest for ",
                         ": the disk is full\n", "index: cannot be searched: none is torn\n",
                         "    changes in /v/a by inotify (fanotify is missing)\n"
                         "    changes in /v/b by fanotify, not yet everywhere\n",
                         "    changes are not noticed, 'fileindexctl index' looks for them: its folders are not registered"):
            self.assertIn(expected, shown)
        status = json.loads(self.run_tool("status", "--json").stdout)
        self.assertEqual(6, status["notification_daemon"]["pid"])
        self.assertEqual([(queues[0], 1000), (queues[1], 2000), (None, 2000)],
                         [(share["watch"], share["oldest_change"]) for share in status["index_daemon"]["shares"]])

    def test_every_command_has_help_and_stands_in_the_manual(self):
        with open(f"{SOURCE}/docs/man/fileindexctl.1", encoding="utf-8") as file:
            manual = re.sub(r"\\f.|^\.\w+ |\"", "", file.read().replace("\\-", "-"), flags=re.M)
        commands = list(self.commands())
        self.assertGreater(len(commands), 25)
        for command in commands:
            with self.subTest(command=command):
                self.assertIn(b"Usage: fileindexctl " + " ".join(command).encode(), self.run_tool(*command, "--help").stdout)
                place = re.search("^" + " ".join(command) + r"( |$)(.*)", manual, re.M)
                self.assertTrue(place, "not in the manual")
                for option in self.complete(*command, "--"):
                    self.assertIn(option, place.group(2) + " --help", "not in the manual")

    @unittest.skipUnless(os.geteuid() == 0, "root's service is refused to others; needs root")
    def test_other_users_are_told_what_is_not_permitted(self):
        def contents():
            return sorted((folder, names, [os.stat(f"{folder}/{name}").st_mtime_ns for name in names])
                          for folder, _, names in os.walk(self.root))

        run = self.run_as_nobody
        queue, words = f"{self.root}/queue", {"SHARE": "photo", "PATH": "/photo/trip", "NEW_NAME": "new"}
        write_json(queue, {})
        os.chmod(queue, 0o600)
        for name in ("kovaelasticd", "kovanotifyd", "fileindexd", "kovacontentextractd", "kova-access"):
            os.chmod(self.daemon(name).path, 0o600)
        before = contents()
        for mode in (0o755, 0o700):
            os.chmod(self.root, mode)
            for command in (" ".join(name) for name in self.commands() if "token" not in name):  # which are for users
                given = ["/photo/trip"] if command == "show" else self.given(command, words, queue)
                done = run(*command.split(), *given)
                with self.subTest(command=command, given=given, mode=mode):
                    self.assertEqual(5, done.returncode, done.stderr)
                    self.assertRegex(done.stderr.decode(), rf"^fileindexctl: user \w+ may not \w+ {self.root}\S*, which "
                                     rf"belongs to root; run 'sudo fileindexctl --root {self.root}' .*'--root'")
        self.assertEqual(5, run("search", "--fresh", "x").returncode)
        self.assertEqual(5, run("folder", "list", "--status").returncode)
        self.assertEqual(before, contents())

    def run_as_nobody(self, *words):
        return subprocess.run([TOOL, *words], env=self.env, cwd="/", capture_output=True, timeout=60, check=False,
                              user=65534, group=65534, extra_groups=[])

    @unittest.skipUnless(os.geteuid() == 0, "takes on another user; needs root")
    def test_other_users_get_what_the_engine_gives_them_and_read_no_file(self):
        os.chmod(self.root, 0o755)
        for closed in ("etc/kova", "var/packages/Ferrox/etc"):
            os.chmod(f"{self.root}/{closed}", 0o700)

        def refused(code, sentence):
            return {"success": False, "error": {"code": code, "msg": sentence}}

        def engine(**answers):
            daemon = FakeDaemon(self.root, "kovaelasticd", answers)
            os.chmod(daemon.path, 0o666)
            return daemon

        hit = {"doc_id": "/v/photo/f", "share": "photo", "fields": {"KOVAMDFSSize": 5}}
        out = {"share": "photos", "code": 1412, "reason": "62 %", "searched": False}
        found = {"total": 3, "hits": [hit], "left_out": [], "next_offset": 2}
        shares = success([{"share": "photo", "state": "ready"}, {"share": "photos", "state": "preparing", "percent": 62}])
        rows = [  # words, the engine's answers, exit code, what is shown, the shares that the search was for
            (["search", "x"], {"search": success(found)}, 0, "/v/photo/f\n.*3 found, 1 to 1 shown; more: --offset 2\n$", None),
            (["search", "x"], {"search": success(dict(found, left_out=[out]))}, 4, "left out: share photos: 62 %", None),
            (["search", "--share", "a", "--share", "b", "x"], {"search": success(found)}, 0, "", ["a", "b"]),
            (["search", "--share", "phot", "x"], {"search": refused(1404, 'there is no share "phot" here'), "shares": shares},
             3, 'no share "phot" here. Did you mean: photo', ["phot"]),
            (["search", "--share", "photos", "x"], {"search": refused(1412, "it is being prepared, 62 %")}, 4, "62 %", ["photos"]),
            (["search", "x"], {"search": refused(1406, "this is an instance of user ann")}, 5, "ctl: this is an instance", None),
            (["search", "x"], {"search": refused(1414, "too many at work")}, 3, "too many at work", None),
            (["search", "("], {"search": refused(1403, "character 1")}, 2, "character 1", None),
            (["search", "--as", "bin", "x"], {}, 5, "only root and the owner", None),
            (["search", "--fresh", "x"], {"fresh": success({"behind": ["photos"]}), "shares": shares, "search": success(found)},
             4, "left out: share photos: its latest changes", ["photo"]),
            (["search", "--fresh", "--partial", "x"], {"fresh": success({"behind": ["photos"]}), "search": success(found)},
             0, "only what has been indexed so far: share photos", None),
            (["search", "--fresh", "x"], {"fresh": refused(502, "gone")}, 4, "gone\nWithout --fresh", None),
            (["show", "/v/f"], {"show": success({"document": {"KOVAMDPath": "/v/f", "KOVAMDTextContent": "deep"}})}, 0,
             "^/v/f\n    size: 0 B\n    text: 4 B\n        deep\n$", None),
            (["show", "/v/f"], {"show": refused(1405, '"/v/f" is not')}, 1, '^"/v/f" is not\n$', None),
            (["status"], {"shares": shares}, 0, "share photo: can be searched\nshare photos: is being prepared, 62 %\n", None),
        ]
        for words, answers, code, text, asked_for in rows:
            with self.subTest(words=words):
                daemon = engine(**answers)
                done = self.run_as_nobody(*words)
                daemon.close()
                self.assertEqual(code, done.returncode, done.stderr)
                self.assertRegex((done.stdout + done.stderr).decode(), re.compile(text, re.S))
                searches = [data for command, data in daemon.asked if command == "search"]
                self.assertTrue(all("ids" not in data and data.get("shares") == asked_for for data in searches), searches)

    def test_completion_knows_commands_shares_folders_and_kinds(self):
        rows = [
            (["fol"], ["folder"]), (["--root", self.root, "share", "ren"], ["rename"]), (["folder", "r"], ["reindex"]),
            (["index", "ph"], ["photo", "photos"]), (["search", "--share", "photos"], ["photos"]),
            (["search", "--sort", "s"], ["size"]), (["folder", "list", "--st"], ["--status"]),
            (["folder", "add", "x", "--kinds", "document,v"], [":open", "document,video"]),
            (["folder", "add", "x", "--kinds=document,v"], [":open", "--kinds=document,video"]),
            (["folder", "delete", "/photos"], [":open", "/photos/a b", "/photos"]),
            (["folder", "add", "/photo/tr"], [":open", "/photo/tree", "/photo/trip"]),
            (["search", "--as", ""], [":users"]), (["share", "add", ""], [":folders"]), (["queue", "show", ""], [":files"]), (["share", "forget", "photo", ""], [":folders"]),
            (["--root", self.root[:4]], [":folders"]), (["index", "photo", ""], []), (["nonsense", ""], []),
        ]
        for words, expected in rows:
            with self.subTest(words=words):
                self.assertEqual(sorted(expected), self.complete(*words))

    def test_the_engine_completes_words_of_a_search(self):
        self.assertEqual([], self.complete("search", "re"))
        daemon = FakeDaemon(self.root, "kovaelasticd", {"complete": success({"completions": [{"text": "report"}, {"text": "rental"}]})})
        end = time.monotonic() + 60
        while not (words := self.complete("search", "--limit", "3", "x", "re")) and time.monotonic() < end:
            pass  # the engine is given a second
        self.assertEqual(["rental", "report"], words)
        daemon.close()
        self.assertEqual({"text": "re"}, daemon.asked[0][1])

    def test_bash_completes(self):
        script = f"""
            . {SOURCE}/packaging/completions/fileindexctl.bash
            compopt() {{ :; }}
            COMP_WORDS=({TOOL} "$@"); COMP_CWORD=$#
            _fileindexctl; printf '%s\\n' "${{COMPREPLY[@]}}" """
        rows = [(["folder", "a"], ["add"]), (["folder", "add", "x", "--kinds", "=", "au"], ["audio"]),
                (["folder", "set", "/photos/a\\ "], ["/photos/a\\ b"]), (["search", "--sort", "="], ["date", "name", "relevance", "size"]),
                (["share", "add", f"{self.root}/vo"], [f"{self.root}/vol"]), (["index", "ph"], ["photo", "photos"])]
        for words, expected in rows:
            with self.subTest(words=words):
                done = subprocess.run(["bash", "-c", script, "bash", *words], env=self.env, capture_output=True, timeout=60,
                                      check=True)
                self.assertEqual(expected, done.stdout.decode().split("\n")[:-1], done.stderr)

    @unittest.skipUnless(shutil.which("zsh"), "zsh is not installed")
    def test_zsh_reads_the_completion(self):
        subprocess.run(["zsh", "-n", f"{SOURCE}/packaging/completions/_fileindexctl"], check=True, timeout=60)


if __name__ == "__main__":
    unittest.main()
