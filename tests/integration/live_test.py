"""Changes on the disk are found by the next fresh search, whatever way of watching there is, and whatever stands in the
way of the daemons meanwhile."""

import contextlib
import json
import mmap
import os
import shutil
import signal
import struct
import subprocess
import sys
import tempfile
import threading
import time
import unittest

from instance import RENAME, differences, wait_for, write
from live import WAYS, LiveInstance, disk

NOBODY = 65534


class Changes:
    """What happens to files that the model's operations (live_model_test.py) do not do, a step after the other. `docs` and
    `media` are shares, `outside` is a folder that nobody watches."""

    def __init__(self, docs, media, outside):
        self.docs, self.media, self.outside = docs, media, outside
        self.open_files = []

    @classmethod
    def steps(cls):
        return [name for name in vars(cls) if name.startswith("step_")]

    def step_append_while_open(self):
        os.makedirs(f"{self.media}/empty")
        file = open(f"{self.docs}/log.txt", "a", encoding="utf-8")
        for line in ("first ", "second ", "third "):
            file.write(line)
            file.flush()
        self.open_files.append(file)

    def step_append_more(self):
        self.open_files[0].write("fourth ")
        self.open_files[0].flush()

    def step_close(self):
        self.open_files.pop().close()

    def step_mmap(self):
        with open(f"{self.docs}/log.txt", "r+b") as file:
            with mmap.mmap(file.fileno(), 0) as view:
                view[0:4] = b"MULE"

    def step_two_change_names(self):
        write(f"{self.docs}/x/1.txt", "one")
        write(f"{self.docs}/y/2.txt", "two")
        os.rename(f"{self.docs}/x", f"{self.docs}/z")
        os.rename(f"{self.docs}/y", f"{self.docs}/x")
        os.rename(f"{self.docs}/z", f"{self.docs}/y")

    def step_folder_created_full(self):
        for number in range(60):
            write(f"{self.docs}/full/{number % 5}/{number % 3}/f{number}.txt", f"full{number}")

    def step_folder_with_a_folder_moved_over_an_empty_one(self):
        os.rename(f"{self.docs}/full/1", f"{self.media}/empty")

    def step_folder_moved_in_in_full(self):
        shutil.copytree(f"{self.docs}/full", f"{self.outside}/full")
        os.rename(f"{self.outside}/full", f"{self.docs}/again")

    def step_rights(self):
        os.chmod(self.docs, 0o711)
        os.chmod(f"{self.docs}/full/2", 0o2750)
        for number, path in enumerate(f"{self.docs}/full/{number % 5}/0/f{number}.txt" for number in range(0, 60, 15)):
            os.chmod(path, 0o604 + number)
            if os.geteuid() == 0:
                os.chown(path, 1000 + number, NOBODY)
        entries = ((1, 6, -1), (2, 4, 5001), (4, 0, -1), (8, 6, 200), (16, 4, -1), (32, 0, -1))
        acl = struct.pack("<I", 2) + b"".join(struct.pack("<HHi", *entry) for entry in entries)
        with contextlib.suppress(OSError):  # no ACLs here
            os.setxattr(f"{self.docs}/full/0/0/f0.txt", "system.posix_acl_access", acl)

    def step_file_becomes_folder_and_back(self):
        write(f"{self.docs}/turn", "file")
        os.remove(f"{self.docs}/turn")
        write(f"{self.docs}/turn/in.txt", "folder")
        write(f"{self.docs}/turn2/in.txt", "folder")
        shutil.rmtree(f"{self.docs}/turn2")
        write(f"{self.docs}/turn2", "file")

    def step_odd_names(self):
        folder = os.fsencode(self.docs) + b"/new\nline \xff\xfe"
        for name in (b"a\nb.txt", b"\xc3\x28.txt", b'quo"te\\.txt', b" ", b"x" * 255, b"\x01.txt"):
            write(folder + b"/" + name, "needle")
        os.rename(folder, folder + b"\n")

    def step_short_lived(self):
        for number in range(50):
            write(f"{self.docs}/tmp{number}.txt", "gone soon")
            os.remove(f"{self.docs}/tmp{number}.txt")

    def step_delete(self):
        os.remove(f"{self.docs}/log.txt")
        shutil.rmtree(f"{self.docs}/full")


class LiveTest(unittest.TestCase):
    maxDiff = 4000

    def setUp(self):
        self.instance = self.make()

    @staticmethod
    def unmount(point):
        """Waits for those who look at something below it."""
        wait_for(lambda: subprocess.run(["umount", point], capture_output=True, check=False).returncode == 0, "umount")

    def mount(self, *words):
        done = subprocess.run(["mount", *words], capture_output=True, text=True, check=False)
        if done.returncode != 0:
            self.skipTest(f"mount: {done.stderr.strip()}")
        self.addCleanup(subprocess.run, ["umount", "-l", words[-1]], capture_output=True, check=False)

    def scratch(self):
        folder = os.path.realpath(tempfile.mkdtemp(prefix="fi-"))
        self.addCleanup(shutil.rmtree, folder, ignore_errors=True)
        return folder

    def make(self, root=None):
        instance = LiveInstance(root)
        self.addCleanup(self.stop, instance)
        return instance

    def stop(self, instance):
        self.assertEqual([], instance.stop(), "processes that 'down' left running")

    def up(self, *shares):
        """The folders of the shares, which are watched."""
        self.instance.ctl("up")
        folders = [self.instance.share(name) for name in shares]
        self.expect_index_is_disk()
        return folders

    def expect_index_is_disk(self, behind=""):
        problems = self.instance.sync(may_lack=True)
        found = self.instance.differences()
        self.assertEqual({}, found, f"what is on the disk, and in the index, {behind}; the daemons say: {problems}")

    def wait_until_watched(self, *folders):
        for folder in folders:
            wait_for(lambda path=folder: self.instance.watches().get(path, {}).get("watch") in WAYS, "it is watched")

    # Ways of watching.

    def use_way(self, way):
        """The folders docs, media (each a share) and outside; skips where the machine does not permit the way."""
        self.instance.watch_by(way, scan_interval=3600)
        docs, media = self.up("docs", "media")
        watch = self.instance.watches()[docs]
        if watch["watch"] != way:
            self.skipTest(f"{way}: {watch['reason']}")
        outside = f"{self.instance.root}/vol/outside"
        os.makedirs(outside)
        return docs, media, outside

    def check_way(self, way):
        changes = Changes(*self.use_way(way))
        for step in Changes.steps():
            getattr(changes, step)()
            self.expect_index_is_disk(step)
        self.assertEqual([f"{changes.docs}/turn/in.txt"], [os.fsdecode(path) for path in
                         self.instance.search("--fresh", "folder", "path:" + changes.docs)])
        self.assertEqual(0, self.instance.notifyd()["lost"])

    def test_changes_by_fanotify(self):
        self.check_way("fanotify")

    def test_changes_by_inode_marks(self):
        self.check_way("fanotify inode marks")

    def test_changes_by_inotify(self):
        self.check_way("inotify")

    def test_changes_by_periodic_scan(self):
        self.check_way("periodic scan")

    def test_changes_seen_by_an_ordinary_user(self):
        if os.geteuid() != 0:
            self.skipTest("the other cases are those of an ordinary user")
        cases = ["LiveTest.test_changes_by_inode_marks", "LiveTest.test_default_way_is_the_best_there_is",
                 "LiveTest.test_unreadable_folder_is_watched_again_when_it_can_be_read"]
        python = shutil.which("python3", path="/usr/bin:/bin") or sys.executable
        with tempfile.TemporaryDirectory() as folder:  # the programs, where such a user can reach them
            os.chmod(folder, 0o755)
            programs = os.environ["FERROX_BIN"]
            for program in ("fileindexctl", "kovaelasticd", "kovanotifyd", "fileindexd", "kovacontentextractd",
                            "kovacontentworker", "kovawebd"):
                shutil.copy(f"{programs}/{program}", folder)
            shutil.copytree(f"{programs}/../lib", f"{folder}/lib", ignore=shutil.ignore_patterns("*.a"))
            for script in ("instance.py", "live.py", "live_test.py"):
                shutil.copy(os.path.join(os.path.dirname(os.path.abspath(__file__)), script), folder)
            environment = dict(os.environ, FERROX_BIN=folder, LD_LIBRARY_PATH=f"{folder}/lib")
            done = subprocess.run([python, "-B", f"{folder}/live_test.py", *cases], user=NOBODY, group=NOBODY,
                                  extra_groups=[], env=environment, cwd="/", timeout=280, capture_output=True,
                                  check=False)
        self.assertEqual(0, done.returncode, done.stderr.decode(errors="replace"))

    def test_default_way_is_the_best_there_is(self):
        docs, = self.up("docs")
        watch = self.instance.watches()[docs]
        self.assertIn(watch["watch"], WAYS[:3], watch)
        self.assertTrue(watch["covered"])
        if os.geteuid() != 0:
            self.assertNotEqual("fanotify", watch["watch"])
            self.assertTrue(watch["reason"])

    # What is written into the queue.

    def queued(self, folder):
        """The lines of its queue, but for those of files with several names, which may be anywhere on the file system."""
        with open(self.instance.queue_path(folder), encoding="utf-8") as file:
            return [line for line in map(json.loads, file) if line["event"] != 0]

    def test_renamed_folder_is_one_line(self):
        docs, = self.up("docs")
        for number in range(200):
            write(f"{docs}/old/{number % 7}/{number}.txt", f"word{number}")
        self.expect_index_is_disk()
        self.instance.kill("fileindexd", signal.SIGTERM)
        os.rename(f"{docs}/old", f"{docs}/new")
        self.instance.notifyd("sync", timeout_ms=100000)
        lines = self.queued(docs)
        self.assertEqual([(RENAME, True, f"{docs}/new", f"{docs}/old")],
                         [(line["event"], line["is_dir"], line["path"], line["path_old"]) for line in lines])
        self.instance.ctl("up")
        self.expect_index_is_disk()

    def test_written_file_is_one_line(self):
        docs, = self.up("docs")
        self.instance.kill("fileindexd", signal.SIGTERM)
        with open(f"{docs}/big.txt", "wb", buffering=0) as file:
            for number in range(2000):
                file.write(b"word%d " % number)
        self.instance.notifyd("sync", timeout_ms=100000)
        lines = self.queued(docs)
        self.assertLess(len(lines), 100, "a line for each pause of the writer at most")
        self.instance.ctl("up")
        self.expect_index_is_disk()

    def test_writes_through_names_that_say_nothing_of_the_others(self):
        self.check_other_names("fanotify", ("docs", "media", "outside"), True)

    def test_writes_through_names_that_say_nothing_of_the_others_by_inode_marks(self):
        self.check_other_names("fanotify inode marks", ("docs", "media"), True)

    def test_writes_through_names_that_say_nothing_of_the_others_by_inotify(self):
        self.check_other_names("inotify", ("docs", "media"), False)

    def check_other_names(self, way, folders, names_go):
        docs, _, outside = self.use_way(way)
        names = [f"{os.path.dirname(docs)}/{folder}/b.txt" for folder in folders]
        write(f"{docs}/a.txt", "begin")
        for number in range(50):
            write(f"{docs}/other{number}.txt", "other")
        self.expect_index_is_disk()

        def written():
            return sum(share["written"] for share in self.instance.status()["index_daemon"]["shares"])
        leave = (os.remove, lambda name: os.rename(name, f"{outside}/c.txt"), lambda name: None)[0 if names_go else 2:]
        for name, go in ((name, go) for name in names for go in leave):
            for turn in range(3):
                before = written()
                os.kill(self.instance.pid("kovanotifyd"), signal.SIGSTOP)
                os.link(f"{docs}/a.txt", name)
                write(name, f"turn {turn} of {name}")
                os.chmod(name, 0o640 + turn)
                go(name)
                os.kill(self.instance.pid("kovanotifyd"), signal.SIGCONT)
                if turn == 2:  # what was queued is not lost
                    os.kill(self.instance.pid("fileindexd"), signal.SIGSTOP)
                    self.instance.notifyd("sync", timeout_ms=100000)
                    self.instance.kill("fileindexd", signal.SIGKILL)
                    self.instance.ctl("up")
                    before = 0
                self.expect_index_is_disk(f"after {name}")
                self.assertLess(written() - before, 40, "only documents of the file are written")
                for gone in (name, f"{outside}/c.txt"):
                    with contextlib.suppress(FileNotFoundError):
                        os.remove(gone)
        self.assertEqual(0, self.instance.notifyd()["lost"])

    # What lies below a share and is not its own.

    def check_mounts(self, way):
        self.instance.watch_by(way, scan_interval=3600)
        docs, = self.up("docs")
        if self.instance.watches()[docs]["watch"] != way:
            self.skipTest(f"no {way} here")
        point = f"{docs}/sub/point"
        write(f"{point}/hidden.txt", "hidden")
        write(f"{docs}/sub/a.txt", "adder")
        self.expect_index_is_disk()
        for turn in range(3):
            self.mount("-t", "tmpfs", "none", point)
            if turn == 2:  # watched for the first time while it is hidden
                self.instance.kill("kovanotifyd")
                self.instance.ctl("up")
            write(f"{point}/on_volume.txt", "mounted")
            self.instance.sync()
            self.assertEqual({f"{docs}/sub", f"{docs}/sub/a.txt"}, set(self.instance.indexed("docs")))
            for words in (["status"], ["unread"], ["unread", "--json"]):
                told = self.instance.ctl(*words).decode()
                self.assertRegex(told, rf"(?s){point}\W.*another file system is mounted there", words)
            self.unmount(point)
            self.expect_index_is_disk(f"unmounted, turn {turn}")
            self.assertNotIn("mounted there", self.instance.ctl("status").decode())
            write(f"{point}/hidden.txt", f"to light again {turn}")
            self.expect_index_is_disk(f"written, turn {turn}")

    def test_mounts_below_a_share_by_fanotify(self):
        self.check_mounts("fanotify")

    def test_mounts_below_a_share_by_inotify(self):
        self.check_mounts("inotify")

    def test_a_file_is_in_the_deepest_share_alone(self):
        self.instance.ctl("up")
        outer = f"{self.scratch()}/outer"
        inner, deep = f"{outer}/inner", f"{outer}/inner/below/deep"
        for number in range(20):
            write(f"{outer}/o{number}.txt", "osprey")
            write(f"{inner}/i{number}.txt", "ibis")
            write(f"{deep}/d{number}.txt", "duck")

        def expect(paused="", **shares):
            self.instance.shares = shares
            self.instance.sync()
            for name, folder in shares.items():
                owners = sorted([paused, *shares.values()])
                within = next((other for other in owners if other.startswith(folder + "/")), "none")
                want = {path for path in disk(folder) if not (path + "/").startswith(within + "/")}
                self.assertEqual(want, set(self.instance.indexed(name)), name)
                self.assertEqual([within][:within != "none"], [entry["path"] for entry in
                                                               self.instance.share_status(name)["left_out"]])

        def ctl(*words):
            return self.instance.ctl(*words).decode()
        ctl("share", "add", inner)  # first the inner one
        self.assertIn("share inner lies in it", ctl("share", "add", outer))
        expect(outer=outer, inner=inner)
        self.assertIn("it lies in share inner, which leaves it out", ctl("share", "add", deep))
        expect(outer=outer, inner=inner, deep=deep)
        self.assertIn("its files are those of share deep", ctl("status"))
        write(f"{deep}/new.txt", "duck")
        os.rename(f"{outer}/o1.txt", f"{inner}/o1.txt")
        os.rename(f"{deep}/d1.txt", f"{outer}/d1.txt")
        expect(outer=outer, inner=inner, deep=deep)
        ctl("share", "pause", "deep")  # still the owner
        expect(deep, outer=outer, inner=inner)
        ctl("share", "resume", "deep")
        read = [self.instance.share_status(name)["read"] for name in ("outer", "inner")]
        for number in range(6):
            ctl("share", "rename", os.path.basename(deep), f"deep{number}")
            deep = f"{inner}/below/deep{number}"
            expect(**{"outer": outer, "inner": inner, f"deep{number}": deep})
        self.assertEqual(read[1], self.instance.share_status("inner")["read"])
        ctl("share", "remove", "inner")
        expect(outer=outer, deep5=deep)
        self.assertEqual(read[0] + 21, self.instance.share_status("outer")["read"], "what came to it alone is read")
        self.assertEqual(21, len(self.instance.search("--fresh", "duck")))
        self.assertIn("are found in share outer", ctl("share", "remove", "deep5"))
        expect(outer=outer)

    def test_idle_instance_does_nothing(self):
        if os.geteuid() == 0:  # a file system of its own, since a mark on one tells of all that happens there
            state = self.scratch()
            self.mount("-t", "tmpfs", "none", state)
            self.instance = self.make(state)
        docs, = self.up("docs")
        write(f"{docs}/a.txt", "word")
        self.expect_index_is_disk()
        wait_for(lambda: not os.path.exists(self.instance.queue_path(docs) + ".tmp"), "the queue to be gone")

        def figures():
            files = {path: os.lstat(path)[6:9] for path in walk(self.instance.root) if not path.startswith(docs)}
            return files, [queue["written"] for queue in self.instance.notifyd()["queues"]]

        def is_quiet():
            """For 3 s; what is told above may have left work to do, but not for long."""
            before = figures()
            switches = {program: context_switches(self.instance.pid(program)) for program in ("kovanotifyd", "fileindexd")}
            time.sleep(3)
            woken = {program: context_switches(self.instance.pid(program)) - count for program, count in switches.items()}
            return max(woken.values()) <= 12 and before == figures()
        wait_for(is_quiet, "nothing to be done in 3 s", 30)

    # What happens while nobody looks.

    def test_registrations_come_and_go_while_others_change(self):
        docs, = self.up("docs")
        end = threading.Event()

        def change():
            for number in range(100000):
                if end.is_set():
                    return
                write(f"{docs}/{number % 10}/{number % 100}.txt", f"word{number}")
                if number % 50 == 0:
                    shutil.rmtree(f"{docs}/{number // 50 % 10}", ignore_errors=True)
                time.sleep(0.002)
        thread = threading.Thread(target=change)
        thread.start()
        try:
            for number in range(4):
                media = self.instance.share("media")
                write(f"{media}/{number}/x.txt", f"media{number}")
                wait_for(lambda: media in self.instance.watches(), "the registration")
                if number < 3:
                    self.instance.ctl("share", "remove", "media")
                    del self.instance.shares["media"]
                    wait_for(lambda: media not in self.instance.watches(), "the end of the registration")
        finally:
            end.set()
            thread.join()
        self.expect_index_is_disk()

    def test_overflow_of_the_kernels_queue(self):
        docs, media, outside = self.use_way("inotify")  # each way's own overflow is its watcher's unit test
        for number in range(100):
            write(f"{docs}/{number % 10}/{number}.txt", f"word{number}")
        self.expect_index_is_disk()
        reader = self.instance.pid("kovanotifyd")
        os.kill(reader, signal.SIGSTOP)
        try:
            for number in range(3):
                os.rename(f"{docs}/{number}", f"{docs}/before{number}")
            for number in range(6000):
                write(f"{docs}/churn{number % 7}.txt", "x")
                os.remove(f"{docs}/churn{number % 7}.txt")
            for number in range(3, 6):
                os.rename(f"{docs}/{number}", f"{(docs, media, outside)[number - 3]}/after{number}")
            for number in range(50):
                write(f"{docs}/new{number % 4}/{number}.txt", f"new{number}")
            shutil.rmtree(f"{docs}/6")
        finally:
            os.kill(reader, signal.SIGCONT)
        self.expect_index_is_disk()
        write(f"{docs}/new1/behind it.txt", "watched again")
        os.rename(f"{docs}/before1", f"{docs}/behind it")
        self.expect_index_is_disk()

    # Volumes and folders.

    def test_full_disk_holds_changes_until_there_is_space(self):
        state, files = self.scratch(), self.scratch()
        self.mount("-t", "tmpfs", "-o", "size=300m", "none", state)
        self.instance = self.make(state)
        self.instance.ctl("up")
        docs = self.instance.share("docs", f"{files}/docs")
        self.expect_index_is_disk()
        self.instance.kill("fileindexd", signal.SIGTERM)
        begin = int(time.time())
        with open(f"{state}/filler", "wb", buffering=0) as file:
            with self.assertRaises(OSError):
                while True:
                    file.write(bytes(1 << 20 if os.statvfs(state).f_bavail > 512 else 4096))
        for number in range(300):
            write(f"{docs}/{number % 9}/{number}.txt", f"word{number}")
        os.rename(f"{docs}/1", f"{docs}/one")
        self.assertTrue(self.instance.notifyd("sync", timeout_ms=100000)["problems"], "it must say what it holds")
        queue = self.instance.notifyd()["queues"][0]
        self.assertGreater(queue["held"], 0, queue)
        self.assertTrue(queue["held_reason"], queue)
        self.assertTrue(begin <= queue["held_since"] <= time.time(), queue)
        os.remove(f"{state}/filler")
        self.instance.ctl("up")
        self.expect_index_is_disk()
        self.assertEqual(0, self.instance.notifyd()["queues"][0]["held"])

    def test_unmounted_volume_is_no_deletion(self):
        volume, elsewhere = self.scratch(), self.scratch()
        self.mount("-t", "tmpfs", "none", elsewhere)
        for share in ("whole", "volume/part"):
            os.makedirs(f"{elsewhere}/{share}")
            os.makedirs(f"{volume}/{os.path.dirname(share) or share}", exist_ok=True)
        mounts = [(f"{elsewhere}/whole", f"{volume}/whole"), (f"{elsewhere}/volume", f"{volume}/volume")]
        for old, new in mounts:
            self.mount("--bind", old, new)
        self.instance.ctl("up")
        whole = self.instance.share("whole", f"{volume}/whole")
        part = self.instance.share("part", f"{volume}/volume/part")
        for folder in (whole, part):
            for number in range(20):
                write(f"{folder}/{number % 3}/{number}.txt", f"word{number}")
        self.expect_index_is_disk()
        before = {share: self.instance.indexed(share) for share in self.instance.shares}
        for round_number in range(2):
            for _, new in mounts:
                self.unmount(new)
            if round_number == 1:
                self.instance.kill("kovanotifyd")
                self.instance.kill("fileindexd")
                self.instance.ctl("up")
            self.instance.notifyd("sync", timeout_ms=100000)
            time.sleep(0.5)
            for share, documents in before.items():
                self.assertEqual({}, differences(documents, self.instance.indexed(share)), share)
            write(f"{elsewhere}/whole/1/changed.txt", f"meanwhile{round_number}")
            write(f"{elsewhere}/volume/part/1/changed.txt", f"meanwhile{round_number}")
            os.rename(f"{elsewhere}/volume/part/2", f"{elsewhere}/volume/part/two{round_number}")
            os.makedirs(f"{elsewhere}/volume/part/2")
            for old, new in mounts:
                subprocess.run(["mount", "--bind", old, new], check=True)
            self.wait_until_watched(whole, part)
            self.expect_index_is_disk()
            write(f"{whole}/2/behind it.txt", "watched again")
            write(f"{part}/2/behind it.txt", "watched again")
            self.expect_index_is_disk()
            before = {share: self.instance.indexed(share) for share in self.instance.shares}

    def test_folder_of_a_share_goes_and_comes_back(self):
        docs, = self.up("docs")
        write(f"{docs}/sub/a.txt", "word")
        self.expect_index_is_disk()
        for come_back in (lambda: os.rename(f"{docs}.away", docs),
                          lambda: shutil.copytree(f"{docs}.away", docs)):
            os.rename(docs, f"{docs}.away")
            self.instance.notifyd("sync", timeout_ms=100000)
            os.symlink(f"{docs}.away", docs)
            write(f"{docs}.away/sub/meanwhile.txt", f"{time.time()}")
            self.instance.notifyd("sync", timeout_ms=100000)
            os.remove(docs)
            come_back()
            self.wait_until_watched(docs)
            self.expect_index_is_disk()
            write(f"{docs}/sub/behind it.txt", f"watched again, {time.time()}")
            self.expect_index_is_disk()

    def test_unreadable_folder_is_watched_again_when_it_can_be_read(self):
        docs, = self.up("docs")
        write(f"{docs}/sub/deep/a.txt", "word")
        self.expect_index_is_disk()
        os.chmod(f"{docs}/sub", 0)
        self.addCleanup(os.chmod, f"{docs}/sub", 0o755)
        write(f"{docs}/beside.txt", "meanwhile")
        self.instance.sync(may_lack=True)
        os.chmod(f"{docs}/sub", 0o755)
        for name in ("b", "c"):
            write(f"{docs}/sub/deep/{name}.txt", name)
            self.expect_index_is_disk()

    def test_folder_is_covered_by_a_mount_and_uncovered(self):
        docs, = self.up("docs")
        write(f"{docs}/sub/deep/a.txt", "word")
        self.expect_index_is_disk()
        self.mount("-t", "tmpfs", "none", f"{docs}/sub")
        write(f"{docs}/sub/other.txt", "on another file system")
        write(f"{docs}/beside.txt", "meanwhile")
        self.instance.sync()
        self.unmount(f"{docs}/sub")
        for name in ("b", "c"):
            write(f"{docs}/sub/deep/{name}.txt", name)
            self.expect_index_is_disk()

    def test_indexed_folder_in_a_share_goes_and_comes_back(self):
        self.instance.ctl("up")
        docs = self.instance.add_share("docs", "--no-index")
        sub = f"{docs}/a/sub"
        write(f"{sub}/f.txt", "word")
        self.instance.ctl("folder", "add", "/docs/a/sub")
        self.instance.shares = {"docs": sub}
        self.expect_index_is_disk()
        os.rename(f"{docs}/a", f"{docs}/b")
        self.instance.sync(may_lack=True)
        write(f"{docs}/b/sub/g.txt", "while it is not indexed")
        os.rename(f"{docs}/b", f"{docs}/a")
        self.expect_index_is_disk()
        write(f"{sub}/h.txt", "watched again")
        self.expect_index_is_disk()
        shutil.rmtree(f"{docs}/a")
        self.instance.sync(may_lack=True)
        self.assertEqual({}, self.instance.indexed("docs"))
        write(f"{sub}/new.txt", "made anew")
        self.expect_index_is_disk()
        write(f"{sub}/newer.txt", "and watched")
        self.expect_index_is_disk()

    def test_wrong_registrations_do_not_disturb_others(self):
        docs, = self.up("docs")
        registry = f"{self.instance.root}/var/lib/kova/notifyd/queues"
        os.makedirs(f"{registry}/folder.json")
        queue = f"{self.instance.root}/stale.queue"
        stale = {"application": "test", "type": 1, "queue": queue, "config": [
            {"path": f"{self.instance.root}/never there", "mask": 65478, "ignore": []}]}
        good = ("/test/1" + queue).replace("+", "%2B").strip("/").replace("/", "+") + ".json"
        for name, content in {"broken.json": "{", "empty.json": "", "huge.json": "[" * 3000000, "list.json": "[1,2]",
                              "other+1+name.json": json.dumps(stale), "half.json": json.dumps(stale)[:60],
                              "\udcff.json": "\0\0", good: json.dumps(stale)}.items():
            write(f"{registry}/.beside", content)
            os.rename(f"{registry}/.beside", f"{registry}/{name}")
            write(f"{docs}/{len(name)}.txt", f"beside {len(content)}")
            self.expect_index_is_disk()
        os.symlink("/dev/zero", f"{registry}/zero.json")
        self.instance.kill("kovanotifyd")
        write(f"{docs}/down.txt", "while it was down")
        self.instance.ctl("up")
        self.expect_index_is_disk()
        self.assertTrue(self.instance.notifyd()["problems"])
        self.assertFalse(os.path.exists(queue), "there is nothing to tell")


def walk(folder):
    return [os.path.join(parent, name) for parent, folders, files in os.walk(folder) for name in folders + files]


def context_switches(pid):
    """Of all threads of a process, how often they were woken or interrupted."""
    count = 0
    for task in os.listdir(f"/proc/{pid}/task"):
        with open(f"/proc/{pid}/task/{task}/status", encoding="ascii") as file:
            count += sum(int(line.split()[1]) for line in file if "ctxt_switches" in line)
    return count


if __name__ == "__main__":
    unittest.main()
