"""The programs that the benches put beside each other: ours, a private instance, and recoll. Each is made for a scratch
folder, indexes one folder, and is asked; the caller closes it."""

import ctypes
import os
import re
import resource
import shutil
import subprocess
import threading
import time

PR_SET_CHILD_SUBREAPER = 36


def folder_bytes(path):
    return sum(os.lstat(os.path.join(where, name)).st_blocks * 512
               for where, _, names in os.walk(path) for name in names)


def read_text(path):
    with open(path, encoding="utf-8", errors="replace") as file:
        return file.read()


class Descendants:
    """Looks at all processes below this one while the block runs. Then `cpu_s` is what they used, those included that
    ended unseen; `peak_MiB` the most that all together held in two looks one after the other (pages that several share
    count once, but not when they are shared just while one looks); and `each` the most that each program's largest
    process held, in MiB."""

    PERIOD_S = 0.2  # a look holds up a large process for some milliseconds

    def __enter__(self):
        # What a daemon's starter leaves behind becomes ours, and its time is counted when it ends.
        ctypes.CDLL(None).prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0)
        self.begin, self.peak, self.each = resource.getrusage(resource.RUSAGE_CHILDREN), 0, {}
        self.over = threading.Event()
        self.thread = threading.Thread(target=self._watch)
        self.thread.start()
        return self

    def __exit__(self, *_):
        self.over.set()
        self.thread.join()
        self._reap()
        end = resource.getrusage(resource.RUSAGE_CHILDREN)
        self.cpu_s = end.ru_utime + end.ru_stime - self.begin.ru_utime - self.begin.ru_stime
        self.peak_MiB = self.peak / 1024

    @staticmethod
    def _reap():
        """What does not end by itself is not counted."""
        end = time.monotonic() + 10
        try:
            while time.monotonic() < end:
                if os.waitpid(-1, os.WNOHANG)[0] == 0:
                    time.sleep(0.01)
        except ChildProcessError:
            pass

    @staticmethod
    def _below(pid):
        found = []
        try:
            for task in os.listdir(f"/proc/{pid}/task"):
                for child in map(int, read_text(f"/proc/{pid}/task/{task}/children").split()):
                    found += [child] + Descendants._below(child)
        except OSError:
            pass  # it has just ended
        return found

    def _watch(self):
        before = 0
        while not self.over.wait(self.PERIOD_S):
            now = sum(map(self._look, self._below(os.getpid())))
            self.peak, before = max(self.peak, min(now, before)), now

    def _look(self, pid):
        try:
            name = os.path.basename(os.readlink(f"/proc/{pid}/exe"))
            sizes = read_text(f"/proc/{pid}/smaps_rollup")
            if os.path.basename(os.readlink(f"/proc/{pid}/exe")) != name:
                return 0
        except OSError:
            return 0
        kib = {key: int(size) for key, size in re.findall(r"^(Rss|Pss):\s+(\d+)", sizes, re.M)}
        self.each[name] = max(self.each.get(name, 0), kib.get("Rss", 0) / 1024)
        return kib.get("Pss", 0)


class Ours:
    """A private instance, driven by the tool."""

    name = "ours"

    def __init__(self, build, scratch):
        self.tool = os.path.join(build, "bin", "fileindexctl")
        self.root = os.path.join(scratch, "root")
        os.mkdir(self.root)

    def ctl(self, *arguments):
        return subprocess.run([self.tool, "--root", self.root, *arguments], check=True, capture_output=True, text=True)

    def index(self, folder):
        """Wall seconds run from the first daemon's start until all is searchable; processor time and memory are of all
        processes from their start to their end."""
        with Descendants() as used:
            start = time.monotonic()
            self.ctl("up")
            self.ctl("share", "add", folder)
            self.ctl("index", os.path.basename(folder), "--wait")
            wall = time.monotonic() - start
            self.ctl("down")  # closing folds the write-ahead log into the index, so that its size is the real one
        return {"wall_s": wall, "cpu_s": used.cpu_s, "peak_MiB": used.peak_MiB, "each_MiB": used.each,
                "index_MB": folder_bytes(f"{self.root}/var/lib/kova/fileindex/db") / 1e6}

    def socket(self, daemon):
        return f"{self.root}/var/run/{daemon}.sock"

    def close(self):
        subprocess.run([self.tool, "--root", self.root, "down"], check=False, capture_output=True)


class Recoll:
    """recollindex with its own defaults, except that it does not step back for other programs: on a busy machine it would
    have no processor time. It reads as many formats as it finds helpers for."""

    name = "recoll"
    settings = ""  # further lines of its configuration

    def __init__(self, scratch):
        self.config = os.path.join(scratch, "recoll")
        os.mkdir(self.config)

    @staticmethod
    def problem():
        """Why it cannot be measured; "" when it can."""
        missing = [program for program in ("recollindex", "recollq") if not shutil.which(program)]
        if missing:
            return f"{' and '.join(missing)} not found; install Debian's recollcmd, and its helpers for more formats"
        return ""

    @staticmethod
    def run(*command, check=True):
        """Its helpers are Python programs, which need the packages of the system's Python."""
        path = "/usr/bin:/bin:" + os.environ.get("PATH", "")
        return subprocess.run(command, env=dict(os.environ, PATH=path), check=check, capture_output=True)

    def index(self, folder):
        with open(f"{self.config}/recoll.conf", "w", encoding="utf-8") as file:
            file.write(f"topdirs = {folder}\nloglevel = 2\nidxniceprio = 0\n{self.settings}")
        with Descendants() as used:
            start = time.monotonic()
            self.run("recollindex", "-c", self.config)
            wall = time.monotonic() - start
        return {"wall_s": wall, "cpu_s": used.cpu_s, "peak_MiB": used.peak_MiB, "each_MiB": used.each,
                "index_MB": folder_bytes(f"{self.config}/xapiandb") / 1e6}

    def close(self):
        pass
