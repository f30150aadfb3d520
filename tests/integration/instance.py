"""A private instance with its real daemons, for the tests of this folder."""

import fcntl
import json
import os
import shutil
import signal
import socket
import struct
import subprocess
import tempfile
import time
import unittest

BIN = os.environ.get("FERROX_BIN", "")
TIMEOUT = 120
# Only an instance of root's checks what users may open.
DAEMONS = ("kovaelasticd", *(["kova-access"] if os.geteuid() == 0 else []), "kovacontentextractd", "kovanotifyd", "fileindexd", "kovawebd")

CREATE, MODIFY, DELETE, RENAME = 0x40, 0x2, 0x80, 0x100


class Instance:
    """Starts with no daemon; stop() ends what runs and removes the folder."""

    def __init__(self, root=None):
        self.root = root or tempfile.mkdtemp(prefix="fi-")
        self.env = dict(os.environ, FERROX_ROOT=self.root, LC_ALL="C.UTF-8")
        self.pids = set()

    def stop(self):
        self.note_pids()
        subprocess.run([os.path.join(BIN, "fileindexctl"), "down"], env=self.env, stdout=subprocess.DEVNULL,
                       stderr=subprocess.DEVNULL, timeout=TIMEOUT, check=False)
        left = [pid for pid in self.pids if os.path.exists(f"/proc/{pid}/exe") and self.is_ours(pid)]
        for pid in left:
            os.kill(pid, signal.SIGKILL)
        shutil.rmtree(self.root, ignore_errors=True)
        return left

    @staticmethod
    def is_ours(pid):
        try:
            return os.path.dirname(os.readlink(f"/proc/{pid}/exe")) == os.path.realpath(BIN)
        except OSError:
            return False

    # The tool.

    def run(self, *words):
        """Without a supervisor: what a test kills stays down."""
        words += ("--no-supervisor",) if words == ("up",) else ()
        return subprocess.run([os.path.join(BIN, "fileindexctl"), *words], env=self.env, capture_output=True,
                              timeout=TIMEOUT, check=False)

    def ctl(self, *words, code=0):
        done = self.run(*words)
        assert done.returncode == code, f"{words}: exit code {done.returncode}, {done.stderr.decode(errors='replace')}"
        self.note_pids()
        return done.stdout

    def status(self):
        """The tool gives each daemon 5 s; an index daemon that takes longer on a busy machine is asked again."""
        end = time.monotonic() + TIMEOUT
        while True:
            done = self.run("status", "--json")
            assert done.returncode in (0, 3), done.stderr  # 3: a daemon has just been killed
            self.note_pids()
            status = json.loads(done.stdout)
            if "problem" not in (status["index_daemon"] or {}) or time.monotonic() > end:
                return status

    def share_status(self, name):
        return next(s for s in self.status()["index_daemon"]["shares"] if s["share"] == name)

    def search(self, *words, left_out=()):
        """The paths found, as bytes, in order; just these shares must have been left out."""
        done = self.run("search", "--json", "--limit", "1000", *words)
        assert done.returncode in ((4,) if left_out else (0, 1)), done.stderr
        result = json.loads(done.stdout)
        assert [entry["share"] for entry in result["left_out"]] == list(left_out), done.stderr
        hits = result["hits"]
        return [hit["doc_id"].encode("utf-8", "surrogateescape") for hit in hits]

    # The daemons.

    def pid(self, program):
        with open(f"{self.root}/var/run/{program}.pid", encoding="ascii") as file:
            return int(file.read())

    def note_pids(self):
        for program in (*DAEMONS, "fileindex-supervisor"):
            try:
                self.pids.add(self.pid(program))
            except (OSError, ValueError):
                pass

    def kill(self, program, number=signal.SIGKILL):
        pid = self.pid(program)
        os.kill(pid, number)
        wait_for(lambda: is_free(f"{self.root}/var/run/{program}.pid"), f"the end of {program}")

    def ask(self, daemon, request, end=b"", seconds=TIMEOUT):
        with socket.socket(socket.AF_UNIX) as connection:
            connection.settimeout(seconds)
            connection.connect(f"{self.root}/var/run/{daemon}.sock")
            body = to_bytes(request) + end
            connection.sendall(struct.pack("=I", len(body)) + body)
            with connection.makefile("rb") as stream:
                (length,) = struct.unpack("=I", stream.read(4))
                return json.loads(stream.read(length).decode("utf-8", "surrogateescape"))

    def entries(self, share, folder, *fields):
        """The named fields of all documents below a folder ("": of all), in the index's order."""
        query = {"qsl": {"prefix": {"KOVAMDPath": folder + "/"}}, "load_field": fields}
        reply = self.ask("kovaelasticd", {"command": "document_get_by_query",
                                          "data": {"id": "fileindex_" + share, "query": query}})
        assert reply["success"], reply
        return reply["data"]

    def documents(self, share, folder):
        """The paths of all documents below a folder, as bytes, in the index's order."""
        return [entry["KOVAMDPath"].encode("utf-8", "surrogateescape")
                for entry in self.entries(share, folder, "KOVAMDPath")]

    # Shares and queues.

    def add_share(self, name, *options):
        folder = f"{os.path.realpath(self.root)}/vol/{name}"
        os.makedirs(folder)
        self.ctl("share", "add", folder, *options)
        return folder

    def folders(self):
        """The list of indexed folders, as the file holds it."""
        try:
            with open(f"{self.root}/var/packages/Ferrox/etc/fileindex.folders", encoding="utf-8") as file:
                return json.load(file)
        except FileNotFoundError:
            return []

    @staticmethod
    def make_volume(test, folder):
        """Makes a folder a mount point until the test ends."""
        done = subprocess.run(["mount", "--bind", folder, folder], capture_output=True, text=True, check=False)
        if done.returncode != 0:
            test.skipTest(f"mount: {done.stderr.strip()}")
        test.addCleanup(subprocess.run, ["umount", "-l", folder], capture_output=True, check=False)

    def queue_path(self, folder):
        name = folder.strip("/").replace("/", "+")
        return f"{self.root}/var/lib/kova/fileindex/queue/{name}.queue"

    def queue(self, folder, *lines):
        """Appends lines as the notification daemon does: under the lock of the file that is still the queue."""
        path = self.queue_path(folder)
        while True:
            with open(path, "ab") as file:
                fcntl.flock(file, fcntl.LOCK_EX)
                try:
                    if os.stat(path).st_ino != os.fstat(file.fileno()).st_ino:
                        continue
                except FileNotFoundError:
                    continue
                file.write(b"".join(to_bytes(line) + b"\n" for line in lines))
                return

    def wait_idle(self, share, folder):
        def holds_lines(path):
            try:
                return os.path.getsize(path) > 0
            except FileNotFoundError:
                return False

        def idle():
            states = [s["state"] for s in self.status()["index_daemon"]["shares"] if s["share"] == share]
            return states == ["idle"] and not any(map(holds_lines, (self.queue_path(folder), self.queue_path(folder) + ".tmp")))
        wait_for(idle, f"share {share} to be idle")


class InstanceTestCase(unittest.TestCase):
    """Each case has an instance of its own, and leaves no process behind."""

    def setUp(self):
        self.instance = Instance()
        self.ctl = self.instance.ctl
        self.addCleanup(self.stop)

    def stop(self):
        left = self.instance.stop()
        self.assertEqual([], left, "processes that 'down' left running")


def children(pid):
    found = []
    try:
        for task in os.listdir(f"/proc/{pid}/task"):
            with open(f"/proc/{pid}/task/{task}/children", encoding="ascii") as file:
                found += [int(child) for child in file.read().split()]
    except OSError:
        pass
    return found


def process_facts(pid):
    with open(f"/proc/{pid}/status", encoding="utf-8") as file:
        return dict(line.split(":\t", 1) for line in file.read().splitlines() if ":\t" in line)


def workers_of(daemon):
    """Its children that have closed their sandbox, which makes them nicer; the others are what they are forked from."""
    found = []
    for child in children(daemon):
        try:
            nicer = os.getpriority(os.PRIO_PROCESS, child) > os.getpriority(os.PRIO_PROCESS, daemon)
        except ProcessLookupError:
            continue
        found += [child] if nicer else []
    return found


def write(path, text):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "wb") as file:
        file.write(text.encode() if isinstance(text, str) else text)


def to_bytes(value):
    """One line of JSON; names keep the bytes that are no UTF-8."""
    return json.dumps(value, ensure_ascii=False).encode("utf-8", "surrogateescape")


def event(bits, path, path_old="", is_dir=False):
    return {"event": bits, "path": path, "path_old": path_old, "is_dir": is_dir}


def is_free(path):
    """Whether nobody holds the lock on a pid file: all threads of the process that had it are gone."""
    with open(path, "rb") as file:
        try:
            fcntl.flock(file, fcntl.LOCK_SH | fcntl.LOCK_NB)
        except BlockingIOError:
            return False
    return True


def wait_for(condition, what, seconds=TIMEOUT):
    end = time.monotonic() + seconds
    while not condition():
        assert time.monotonic() < end, f"waited in vain for {what}"
        time.sleep(0.02)


def differences(expected, found):
    """Per path, what should be there and what is, each without what both have."""
    def without(entry, other):
        return entry and {field: value for field, value in entry.items() if not other or other.get(field) != value}
    pairs = {path: (expected.get(path), found.get(path)) for path in expected.keys() | found.keys()}
    return {path: (without(a, b), without(b, a)) for path, (a, b) in pairs.items() if a != b}


def on_disk(folder):
    """What the index must hold: all below the folder but links, in the order of the bytes of the paths."""
    found = []
    for parent, folders, files in os.walk(os.fsencode(folder)):
        found += [os.path.join(parent, name) for name in folders + files
                  if not os.path.islink(os.path.join(parent, name))]
    return sorted(found)
