"""Random operations on files in several shares while the notification daemon is stopped and continued, and daemons are
killed and started again; at each checkpoint the index must be the tree on the disk: no change lost, nothing stale.

Catches changes that one way of watching misses, and what is lost or told wrongly when a daemon ends in between.

FERROX_OPERATIONS (default 1000), FERROX_SEED (default 1) and FERROX_WAY (default: any, chosen anew after each restart)
make the long form:
FERROX_OPERATIONS=100000 FERROX_SEED=7 FERROX_BIN=build/release/bin python3 -B tests/integration/live_model_test.py"""

import collections
import errno
import itertools
import os
import random
import shutil
import signal
import sys
import tempfile
import time
import unittest

from live import WAYS, LiveInstance, disk

OPERATIONS = int(os.environ.get("FERROX_OPERATIONS", "1000"))
SEEDS = [int(seed) for seed in os.environ.get("FERROX_SEED", "1").split()]
CHECK_EVERY = min(2000, OPERATIONS)
ENTRIES_MAX = 1500
REMEMBERED = 100000
NAMES = ["a.txt", "b.txt", "letter.txt", "log.txt", "x", "y", "notes", "old", "new\nline", "\udcff\udcfe.txt", "ü.txt"]


class World:
    """Three shares (one on another file system, where there is one), a folder that nobody watches, and the daemons."""

    def __init__(self, seed):
        self.random, self.number, self.stopped = random.Random(seed), 0, None
        self.linked = set()  # numbers of files that got another name since the last checkpoint
        self.log = collections.deque(maxlen=REMEMBERED)
        self.instance = LiveInstance()
        shared_memory = "/dev/shm" if os.access("/dev/shm", os.W_OK) else None
        self.other_volume = os.path.realpath(tempfile.mkdtemp(prefix="fi-", dir=shared_memory))
        self.choose_ways()
        self.instance.ctl("up")
        for name, folder in (("docs", None), ("media", None), ("far", f"{self.other_volume}/far")):
            self.instance.share(name, folder)
        self.outside = f"{os.path.realpath(self.instance.root)}/vol/outside"
        os.makedirs(self.outside)
        self.roots = list(self.instance.shares.values())
        self.instance.sync()

    def stop(self):
        self.continue_reader()
        self.instance.stop()
        shutil.rmtree(self.other_volume, ignore_errors=True)

    # What there is to choose from.

    def folder(self):
        """Any folder, the deeper the rarer."""
        path = self.random.choice(self.roots * 4 + [self.outside])
        while self.random.random() < 0.6:
            below = [entry.path for entry in os.scandir(path) if entry.is_dir(follow_symlinks=False)]
            if not below:
                break
            path = self.random.choice(sorted(below))
        return path

    def entry(self, wanted):
        """Any entry for which `wanted` holds; None when the folder that was looked into has none."""
        entries = sorted(entry.path for entry in os.scandir(self.folder()) if wanted(entry))
        return self.random.choice(entries) if entries else None

    def file(self):
        return self.entry(lambda entry: entry.is_file(follow_symlinks=False))

    def subfolder(self):
        return self.entry(lambda entry: entry.is_dir(follow_symlinks=False))

    def root_of(self, path):
        return next(root for root in [*self.roots, self.outside] if is_at_or_below(path, root))

    def new_path(self):
        name = self.random.choice(NAMES) if self.random.random() < 0.6 else f"f{self.next()}.txt"
        return f"{self.folder()}/{name}"

    def next(self):
        self.number += 1
        return self.number

    def text(self):
        return f"word{self.next()} " + "some more to read " * self.random.choice((0, 0, 1, 30))

    # Operations. Those that make no sense where they hit (a folder into itself, a file where a folder is) fail as they
    # would for anybody, and that is an operation, too.

    def write(self):
        self.fill(self.random.choice([self.new_path(), self.file() or self.new_path()]), "w")

    def append(self):
        self.fill(self.file() or self.new_path(), "a")

    def fill(self, path, mode):
        with open(path, mode, encoding="utf-8") as file:
            file.write(self.text())
            if self.random.random() < 0.1:
                file.flush()
                file.write(self.text())
        self.note("write", path)

    def truncate(self):
        path = self.file()
        if path:
            os.truncate(path, min(os.stat(path).st_size, self.random.choice((0, 4, 40))))
            self.note("truncate", path)

    def change_attributes(self):
        path = self.random.choice([self.file, self.file, self.subfolder])()
        if path and self.random.random() < 0.5:
            os.utime(path, (self.number, self.random.randrange(2 * 10**9)))
            self.note("utime", path)
        elif path:
            os.chmod(path, self.random.choice((0o700, 0o750, 0o755)))
            self.note("chmod", path)

    def make_folder(self):
        path = self.new_path()
        for _ in range(self.random.randrange(1, 4)):
            os.mkdir(path)
            self.note("mkdir", path)
            for _ in range(self.random.randrange(4)):
                self.fill(f"{path}/{self.random.choice(NAMES)}", "w")
            path = f"{path}/{self.random.choice(NAMES)}"

    def rename_file(self):
        self.move(self.file(), self.random.choice([self.new_path(), self.file()]))

    def rename_folder(self):
        self.move(self.subfolder(), self.random.choice([self.new_path(), self.new_path(), self.subfolder()]))

    def rename_often(self):
        """Before a reader that lags behind has looked at the first."""
        path = self.subfolder()
        for _ in range(self.random.randrange(2, 6)):
            target = self.new_path()
            if path and not os.path.lexists(target) and self.move(path, target):
                path = target
                self.fill(f"{path}/{self.random.choice(NAMES)}", "w")

    def move(self, old, new):
        if not old or not new or self.would_part_links(old, new) or self.has_new_name(new):
            return False
        try:
            os.rename(old, new)
            self.note("rename", old, new)
        except OSError as error:
            if error.errno != errno.EXDEV or os.path.lexists(new):
                raise
            self.note("copy and remove", old, new)
            shutil.move(old, new)
        return True

    def has_new_name(self, path):
        """Whether a file at or below the path got another name that may not have been seen yet. Nothing tells what happens
        through a name that comes and goes before anybody looks, so such names stay until the next checkpoint."""
        if not self.linked:
            return False
        files = [path] + [os.path.join(parent, name) for parent, _, names in os.walk(path) for name in names]
        return any(os.path.lexists(file) and os.lstat(file).st_ino in self.linked for file in files)

    def would_part_links(self, old, new):
        """A change through one name is told of the names in the same share, not in others or outside."""
        if self.root_of(old) == self.root_of(new):
            return False
        files = [old] + [os.path.join(parent, name) for parent, _, names in os.walk(old) for name in names]
        return any(os.lstat(path).st_nlink > 1 for path in files if not os.path.isdir(path))

    def replace(self):
        path = self.file() or self.new_path()
        self.fill(f"{os.path.dirname(path)}/.saved", "w")
        self.move(f"{os.path.dirname(path)}/.saved", path)

    def link(self):
        old, new = self.file(), self.new_path()
        if old and self.root_of(old) == self.root_of(new):
            os.link(old, new)
            self.linked.add(os.stat(old).st_ino)
            self.note("link", old, new)

    def symlink(self):
        path = self.new_path()
        os.symlink(self.random.choice(NAMES), path)
        self.note("symlink", path)

    def delete(self):
        path = self.entry(lambda entry: not entry.is_dir(follow_symlinks=False))
        if path and not self.has_new_name(path):
            os.remove(path)
            self.note("delete", path)

    def remove_folder(self):
        path = self.subfolder()
        if path and not self.has_new_name(path):
            self.note("rmtree", path)
            shutil.rmtree(path)

    def note(self, *words):
        self.log.append((time.monotonic(), *words))

    def history(self, path):
        """What happened to the path, and to what it was called before, the last first."""
        for entry in reversed(self.log):
            _, what, *paths = entry
            touched = [other for other in paths if is_at_or_below(path, other)]
            if touched or not paths or what in ("kill", "watch by"):
                yield entry
            if what in ("rename", "copy and remove") and is_at_or_below(path, paths[1]):
                path = paths[0] + path[len(paths[1]):]

    WEIGHTS = {write: 22, append: 8, truncate: 4, change_attributes: 6, make_folder: 10, rename_file: 14,
               rename_folder: 14, rename_often: 3, replace: 5, link: 4, symlink: 2, delete: 8, remove_folder: 3}

    def operate(self):
        operation, = self.random.choices(list(self.WEIGHTS), self.WEIGHTS.values())
        try:
            operation(self)
        except OSError:
            pass

    def keep_small(self):
        """Much goes until the tree is small enough to be compared often."""
        for _ in range(20):
            if sum(len(disk(root)) for root in [*self.roots, self.outside]) <= ENTRIES_MAX:
                return
            for _ in range(50):
                try:
                    self.random.choice([self.remove_folder, self.delete])()
                except OSError:
                    pass

    # Disturbances.

    def disturb(self):
        kind = self.random.random()
        if kind < 0.35:
            self.stop_reader()
        elif kind < 0.7:
            self.continue_reader()
        elif kind < 0.8:
            time.sleep(self.random.random() * 0.3)
        else:
            program = self.random.choice(["kovanotifyd", "kovanotifyd", "fileindexd", "kovaelasticd"])
            self.note("kill", program)
            if program == "kovanotifyd":
                self.continue_reader()
                self.choose_ways()
            number = self.random.choice([signal.SIGKILL, signal.SIGKILL, signal.SIGTERM])
            self.instance.kill(program, signal.SIGKILL if self.stopped else number)
            for _ in range(self.random.randrange(30)):
                self.operate()
            self.continue_reader()
            self.instance.ctl("up")

    def stop_reader(self):
        if not self.stopped:
            self.note("stop")
            self.stopped = self.instance.pid("kovanotifyd")
            os.kill(self.stopped, signal.SIGSTOP)

    def continue_reader(self):
        if self.stopped:
            self.note("continue")
            os.kill(self.stopped, signal.SIGCONT)
            self.stopped = None

    def choose_ways(self):
        """Each way of watching has its turn; whatever it is, a scan catches what is not permitted here."""
        way = os.environ.get("FERROX_WAY") or self.random.choices(WAYS, (3, 3, 3, 1))[0]
        self.note("watch by", way)
        self.instance.watch_by(*{way: None, "periodic scan": None}, scan_interval=self.random.choice((1, 3600)))

    # Checkpoints.

    def check(self):
        """What differs between disk and index, and all that is known of it; "" when nothing does."""
        self.continue_reader()
        self.instance.ctl("up")
        self.note("sync")
        problems = self.instance.sync(may_lack=True)
        found = self.instance.differences()
        if not found:
            self.linked.clear()
            return ""
        lines = [f"the daemons say: {problems}", f"notification daemon: {self.instance.notifyd()}"]
        for path, (expected, indexed) in sorted(found.items())[:20]:
            lines.append(f"{path!r}\n  disk  {expected}\n  index {indexed}")
            lines += [f"    {at:.3f} {words}" for at, *words in itertools.islice(self.history(path), 25)]
        time.sleep(2)
        later = self.instance.differences()
        lines.append(f"{len(found)} paths differ, {len(later)} two seconds later")
        return "\n".join(lines)


def is_at_or_below(path, folder):
    return path == folder or path.startswith(folder + "/")


class LiveModelTest(unittest.TestCase):
    def test_index_ends_as_the_tree(self):
        for seed in SEEDS:
            with self.subTest(seed=seed):
                print(f"seed {seed}, {OPERATIONS} operations", file=sys.stderr)
                world = World(seed)
                try:
                    self.run_operations(world, seed)
                finally:
                    world.stop()

    def run_operations(self, world, seed):
        begin = time.monotonic()
        for done in range(1, OPERATIONS + 1):
            world.operate()
            if world.random.random() < 0.004:
                world.disturb()
            if world.random.random() < 0.01:
                time.sleep(world.random.random() * 0.02)
            if done % 500 == 0:
                world.keep_small()
            if done % CHECK_EVERY == 0 or done == OPERATIONS:
                report = world.check()
                if report:
                    self.fail(f"seed {seed}, after {done} operations:\n{report}")
                entries = sum(len(disk(root)) for root in world.roots)
                print(f"{done} operations, {entries} documents, {time.monotonic() - begin:.1f} s", file=sys.stderr)


if __name__ == "__main__":
    unittest.main()
