"""kovacontentextractd survives whatever it is given: files made to break readers, damaged ones, bad clients.

FERROX_SEED and FERROX_MUTATIONS choose the random damage; FERROX_CORPUS is a folder of good files to damage, besides the
small ones made here. A file that breaks something is copied to FERROX_FAILED (a folder; the temporary one unless given).
"""

import concurrent.futures
import json
import os
import random
import shutil
import signal
import socket
import struct
import subprocess
import sys
import tempfile
import threading
import time
import unittest

from instance import InstanceTestCase, children, process_facts, wait_for, workers_of

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "corpus"))
import hostile  # noqa: E402

DAEMON = "kovacontentextractd"
SEED = int(os.environ.get("FERROX_SEED", "20240301"))
MUTATIONS = int(os.environ.get("FERROX_MUTATIONS", "1000"))
TRUNCATIONS = int(os.environ.get("FERROX_TRUNCATIONS", "8"))
CORPUS = os.environ.get("FERROX_CORPUS", "")
SANITIZED = os.environ.get("FERROX_SANITIZED", "") != ""
MEMORY_GROWTH_KIB = 10 * 1024
ADDRESS_SPACE_KIB = 256 * 1024
DESCRIPTORS_MAX = 16
BLAMES = ("crashed the reader", "took too long", "confused the reader")
ANY_BLAME = BLAMES + ("needs too much memory",)  # a reader may say this by itself as well


def framed(body):
    return struct.pack("=I", len(body)) + body


class Extractor:
    """One connection to the daemon. Paths are bytes."""

    def __init__(self, instance):
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.settimeout(100)
        self.socket.connect(f"{instance.root}/var/run/{DAEMON}.sock")
        self.reader = self.socket.makefile("rb")

    def close(self):
        self.reader.close()
        self.socket.close()

    def ask(self, kind, data=None):
        """The reply's "data", and the text behind it."""
        body = json.dumps({"type": kind, "data": data}, ensure_ascii=False).encode("utf-8", "surrogateescape")
        self.socket.sendall(framed(body + b"\0"))
        (length,) = struct.unpack("=I", self.reader.read(4))
        head, _, text = self.reader.read(length).partition(b"\0")
        reply = json.loads(head.decode("utf-8", "surrogateescape"))
        assert reply["success"], reply
        return reply["data"], text

    def extract(self, path, root):
        found, text = self.ask("extract", {"path": os.fsdecode(path), "root": os.fsdecode(root)})
        return found, text


class Watch:
    """Looks at the workers again and again, from a thread: what they have at most."""

    def __init__(self, pid):
        self.pid = pid
        self.peak_kib, self.descriptors, self.threads, self.most = 0, 0, 0, 0
        self.starved = 0  # seconds in which there was no processor for a worker
        self.stopped = threading.Event()
        self.thread = threading.Thread(target=self.run)
        self.thread.start()

    def stop(self):
        self.stopped.set()
        self.thread.join()

    def run(self):
        while not self.stopped.wait(0.05):
            workers = workers_of(self.pid)
            self.most = max(self.most, len(workers))
            for worker in workers:
                try:
                    facts = process_facts(worker)
                    self.peak_kib = max(self.peak_kib, int(facts["VmPeak"].split()[0]))
                    self.threads = max(self.threads, int(facts["Threads"]))
                    self.descriptors = max(self.descriptors, len(os.listdir(f"/proc/{worker}/fd")))
                    with open(f"/proc/{worker}/schedstat", encoding="ascii") as file:
                        self.starved = max(self.starved, int(file.read().split()[1]) / 1e9)
                except (OSError, KeyError):
                    continue  # it has ended


class HostileTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        self.ctl("up")
        self.pid = self.instance.pid(DAEMON)
        self.folder = os.path.realpath(tempfile.mkdtemp(prefix="fi-hostile-")).encode()
        self.addCleanup(shutil.rmtree, self.folder, True)
        self.failed = os.environ.get("FERROX_FAILED") or os.path.join(self.instance.root, "failed")
        self.threads = concurrent.futures.ThreadPoolExecutor(2 * (os.cpu_count() or 4))
        self.addCleanup(self.threads.shutdown)
        self.local = threading.local()
        self.opened = []
        self.addCleanup(self.at_rest)
        self.lock = threading.Lock()
        self.faults, self.certain, self.possible, self.slow = [], 0, 0, []
        print(f"FERROX_SEED={SEED} FERROX_MUTATIONS={MUTATIONS}", flush=True)

    def stop(self):
        workers = children(self.pid)
        super().stop()
        self.assertEqual([], [worker for worker in workers if self.instance.is_ours(worker)], "workers outlive the daemon")

    def status(self):
        connection = Extractor(self.instance)
        try:
            return connection.ask("status")[0]
        finally:
            connection.close()

    # One file.

    def extract(self, path, root=None):
        """Through the connection of this thread."""
        if getattr(self.local, "connection", None) is None:
            self.local.connection = Extractor(self.instance)
            self.opened.append(self.local.connection)
        try:
            return self.local.connection.extract(path, root or self.folder)
        except BaseException:
            self.local.connection = None
            raise

    def keep(self, path, reason):
        """Writes down which file it was; a copy is kept unless it is nearly all holes."""
        os.makedirs(self.failed, exist_ok=True)
        name = os.path.join(os.fsencode(self.failed), b"%d-" % len(self.faults) + os.path.basename(path)[-100:])
        if os.path.isfile(path) and os.path.getsize(path) < 100 << 20:
            shutil.copyfile(path, name)
        with self.lock:
            self.faults.append(f"{reason}: {path!r}, kept as {name!r}")

    def check(self, path, root=None):
        """Has one file read; whatever it is, there is an answer that makes sense."""
        begin = time.monotonic()
        try:
            found, text = self.extract(path, root)
        except (OSError, ValueError, AssertionError, struct.error) as error:
            return self.keep(path, f"no answer ({error!r})")
        seconds = time.monotonic() - begin
        document = found.get("document", {})
        error = document.get("_KOVAExtractError", "")
        with self.lock:
            self.certain += error in BLAMES
            self.possible += error in ANY_BLAME
            self.slow.append((seconds, error, path))
        if os.environ.get("FERROX_FAILED") and error in BLAMES:
            self.keep(path, error)
        if not found.get("gone") and "document" not in found:
            self.keep(path, "no document")
        elif error in ANY_BLAME and "_KOVAExtractVersion" not in document:
            self.keep(path, "blamed without the version of its reader")
        elif b"root:x:0" in text or "root:x:0" in json.dumps(document):
            self.keep(path, "tells of another file")
        return None

    def check_good_file(self):
        path = os.path.join(self.folder, b"good%d.txt" % threading.get_ident())
        if not os.path.exists(path):
            with open(path, "wb") as file:
                file.write(b"zeppelin " * 1000)
        found, text = self.extract(path)
        if "_KOVAExtractError" in found["document"] or text.count(b"zeppelin") != 1000:
            self.keep(path, f"a good file is not read: {found}")

    # All of them.

    def run_all(self, jobs):
        """Each job is called on a thread of its own choice, and a good file is read behind it."""
        def one(job):
            job()
            self.check_good_file()
        for done in self.threads.map(one, jobs):
            self.assertIsNone(done)

    def damaged(self):
        """Jobs that damage the good files and have them read."""
        good = [(name, content) for name, content in hostile.seeds().items()]
        files = [("seed." + name, content) for name, content in good]
        for parent, _, names in os.walk(os.path.join(CORPUS, "files") if CORPUS else "/nonexistent"):
            for name in names:
                with open(os.path.join(parent, name), "rb") as file:
                    files.append((name, file.read()))
        files.sort()
        jobs = [lambda i=i, file=file: self.check_truncations(i, *file) for i, file in enumerate(files)]
        return jobs + [lambda i=i: self.check_mutation(i, files) for i in range(MUTATIONS)]

    def write(self, folder, name, content):
        path = os.path.join(self.folder, folder, os.fsencode(name))
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "wb") as file:
            file.write(content)
        return path

    def check_truncations(self, number, name, content):
        path = self.write(b"cut%d" % number, name, content)
        for i in range(TRUNCATIONS - 1, -1, -1):
            os.truncate(path, len(content) * i // TRUNCATIONS)
            self.check(path)
        os.remove(path)

    def check_mutation(self, number, files):
        chance = random.Random(f"{SEED}:{number}")
        name, content = chance.choice(files)
        path = self.write(b"changed%d" % number, name, mutated(content, chance.choice(files)[1], chance))
        self.check(path)
        shutil.rmtree(os.path.dirname(path))

    def check_changing(self, name, content):
        """A file that shrinks and grows again while it is read."""
        path = self.write(b"changing", name, content)
        done = threading.Event()

        def change():
            while not done.is_set():
                os.truncate(path, 0)
                with open(path, "r+b") as file:
                    file.write(content)
        thread = threading.Thread(target=change)
        thread.start()
        for _ in range(30):
            self.check(path)
        done.set()
        thread.join()

    # What holds before and after.

    def has_open(self, path):
        for number in os.listdir(f"/proc/{self.pid}/fd"):
            try:
                if os.fsencode(os.readlink(f"/proc/{self.pid}/fd/{number}")) == path:
                    return True
            except OSError:
                continue
        return False

    def own_descriptors(self):
        """Of the daemon, but for the socket of each child and the memory that it shares with each worker."""
        return len(os.listdir(f"/proc/{self.pid}/fd")) - len(children(self.pid)) - len(workers_of(self.pid))

    def at_rest(self):
        """The daemon's descriptors and memory once all connections have ended."""
        for connection in self.opened:
            connection.close()
        self.opened, self.local = [], threading.local()
        wait_for(lambda: not self.connections(), "connections to end")
        return self.own_descriptors(), int(process_facts(self.pid)["VmRSS"].split()[0])

    def connections(self):
        with open("/proc/net/unix", encoding="ascii", errors="replace") as file:
            ours = [line for line in file if line.rstrip().endswith(f"{self.instance.root}/var/run/{DAEMON}.sock")]
        return len(ours) - 1

    def survives(self, jobs):
        """Runs the jobs, twice the good files before them, and compares the daemon before and after."""
        warm = [lambda content=b"zeppelin " * (200000 + i): self.check(self.write(b"warm%d" % len(content), "a.txt", content))
                for i in range(4 * (os.cpu_count() or 4))]
        self.run_all(warm)
        descriptors, memory = self.at_rest()
        blamed = self.status()["blamed"]
        watch = Watch(self.pid)
        try:
            self.run_all(jobs)
        finally:
            watch.stop()
        self.threads.shutdown()
        self.starved = watch.starved
        descriptors_after, memory_after = self.at_rest()
        status = self.status()
        grown = memory_after - memory
        slowest = sorted(self.slow, reverse=True)[:5]
        print(f"{len(self.slow)} files, {status['blamed'] - blamed} blamed; memory {memory} KiB, {grown} more at the end; slowest:",
              *(f"{seconds:.1f} s {path!r} {error}" for seconds, error, path in slowest), sep="\n  ", flush=True)
        self.assertEqual([], self.faults)
        self.assertEqual(self.pid, self.instance.pid(DAEMON))
        self.assertTrue(self.certain <= status["blamed"] - blamed <= self.possible,
                        f"{self.certain} to {self.possible} files broke a worker, {status['blamed'] - blamed} were blamed")
        self.assertEqual(descriptors, descriptors_after)
        self.assertLessEqual(status["workers"], status["workers_max"])
        self.assertEqual(status["workers"], len(workers_of(self.pid)))
        self.assertLessEqual(watch.descriptors, DESCRIPTORS_MAX)
        self.assertLessEqual(watch.most, status["workers_max"])
        if not SANITIZED:
            self.assertLessEqual(watch.threads, 1)
            self.assertLessEqual(watch.peak_kib, ADDRESS_SPACE_KIB)
            self.assertLess(grown, MEMORY_GROWTH_KIB)

    # The cases.

    def test_hostile_files(self):
        paths = hostile.make_all(os.fsdecode(self.folder))
        jobs = [lambda path=path: self.check(path) for path in paths]
        jobs += [lambda name=name, content=content: self.check_changing("seed." + name, content * 20)
                 for name, content in hostile.seeds().items() if name in ("pdf", "jpg", "docx", "eml", "mp3", "mp4", "xls", "zip")]
        jobs.sort(key=lambda job: b"endless" not in (job.__defaults__[0] if len(job.__defaults__) == 1 else b""))
        self.survives(jobs)
        endless = [path for seconds, error, path in self.slow if error == "took too long"]
        names = {os.path.basename(path) for path in endless}
        self.assertIn(b"endless.mp4", names)
        if not SANITIZED and self.starved < 15:  # else readers that end in time may not
            self.assertEqual(1, len(names), names)

    def test_damaged_files(self):
        self.survives(self.damaged())

    def error_when_workers_get(self, number, path):
        """What is said of a file that is being read when a signal ends its worker, which has read another file before."""
        self.check_good_file()
        workers = workers_of(self.pid)
        for worker in workers:
            os.kill(worker, signal.SIGSTOP)
        answer = self.threads.submit(self.extract, path)
        wait_for(lambda: self.has_open(path), "the file to be opened")
        for worker in workers:
            os.kill(worker, number)
            if number != signal.SIGKILL:
                os.kill(worker, signal.SIGCONT)
        return answer.result()[0]["document"].get("_KOVAExtractError")

    def test_end_of_a_worker_is_the_fault_of_one_file_at_most(self):
        path = self.write(b"", "fatal.txt", b"zeppelin")
        blamed = self.status()["blamed"]
        for _ in range(100):  # until it is killed behind the request; where that comes later, another worker reads it
            error = self.error_when_workers_get(signal.SIGKILL, path)
            if error is not None:
                break
        self.assertEqual("needs too much memory", error)
        self.assertEqual(blamed + 1, self.status()["blamed"])
        # A crash may be the earlier file's doing.
        self.assertIsNone(self.error_when_workers_get(signal.SIGSEGV, path))
        self.assertEqual(blamed + 1, self.status()["blamed"])

    def test_nothing_of_an_indexed_share_is_read_twice(self):
        share = self.instance.add_share("docs", "--no-index")
        hostile.make_all(share)
        for subject in ("special", "sizes", "sound"):  # the first is not for a share, the others take minutes
            shutil.rmtree(f"{share}/set/{subject}")
        self.ctl("folder", "add", "/docs")
        queue = self.instance.queue_path(share)
        wait_for(lambda: self.instance.share_status("docs")["state"] == "idle" and not os.path.exists(queue),
                 "the share to be indexed", 500)
        written, files = self.instance.share_status("docs")["written"], self.status()["files"]
        self.assertGreater(files, 400)
        found = [entry.get("_KOVAExtractError") for entry in self.instance.entries("docs", share, "_KOVAExtractError")]
        self.assertIn("took too long", found)
        self.ctl("index", "docs", "--wait")
        self.assertEqual((written, files), (self.instance.share_status("docs")["written"], self.status()["files"]))
        self.assertEqual([], self.instance.search('"root x 0 0"'))
        self.assertEqual(self.pid, self.instance.pid(DAEMON))

    def test_bad_clients_cost_their_own_connection(self):
        path = os.fsdecode(self.write(b"", "good.txt", b"zeppelin " * 100000))
        good = framed(json.dumps({"type": "extract", "data": {"path": path, "root": os.fsdecode(self.folder)}}).encode() + b"\0")
        descriptors, _ = self.at_rest()
        clients = []
        for i in range(200):
            client = socket.socket(socket.AF_UNIX)
            client.connect(f"{self.instance.root}/var/run/{DAEMON}.sock")
            clients.append(client)
            client.setblocking(False)
            try:
                client.send((good[:i], good * 100, b"\xff\xff\xff\xff", framed(b"[" * 100000), framed(b""), framed(b"{}\0"),
                             framed(b'{"type":"extract","data":{"path":[],"root":1}}\0'), os.urandom(4096))[i % 8])
            except BlockingIOError:
                pass
        self.check_good_file()
        for client in clients:
            client.close()
        self.assertEqual([], self.faults)
        self.assertEqual(descriptors, self.at_rest()[0])
        self.assertEqual(self.pid, self.instance.pid(DAEMON))

    def test_only_what_lies_below_the_root_is_read(self):
        below = os.path.join(self.folder, b"share")
        os.makedirs(below + b"/inside")
        self.write(b"", "secret.txt", b"secret")
        os.symlink("../secret.txt", below + b"/link.txt")
        os.symlink("..", below + b"/folder")
        os.link(self.folder + b"/secret.txt", below + b"/inside/hard.txt")
        outside = ("/etc/passwd", "../secret.txt", "inside/../../secret.txt", "link.txt", "folder/secret.txt", "/proc/self/mem",
                   "inside/./../../secret.txt", "//../secret.txt", "secret.txt\0x", "", ".", "..", "inside")
        for name in outside:
            path = os.path.join(os.fsdecode(below), name) if not name.startswith("/") or name.startswith("//") else name
            for asked in (path, os.fsdecode(below) + "/" + name):
                found, text = self.extract(os.fsencode(asked), below)
                self.assertEqual(b"", text, asked)
                self.assertTrue(found.get("gone") or found["document"].get("_KOVAExtractError"), asked)
        self.assertEqual(b"secret", self.extract(below + b"/inside/hard.txt", below)[1])

    @unittest.skipUnless(os.geteuid() == 0, "needs another user")
    def test_others_are_not_answered(self):
        path = f"{self.instance.root}/var/run/{DAEMON}.sock"
        self.assertEqual(0o600, os.stat(path).st_mode & 0o777)
        ask = f"""import os, socket
os.setgroups([]); os.setgid(65534); os.setuid(65534)
client = socket.socket(socket.AF_UNIX)
client.connect({path!r})
client.sendall({framed(b'{"type":"extract","data":{"path":"/etc/passwd","root":"/etc"}}' + bytes(1))!r})
print(client.recv(65536)[4:].decode())"""
        os.chmod(self.instance.root, 0o755)

        def answer():
            return subprocess.run([sys.executable, "-c", ask], capture_output=True, check=False, text=True)
        self.assertIn("PermissionError", answer().stderr)
        os.chmod(path, 0o666)
        self.assertRegex(answer().stdout, '"code":1406')


def mutated(content, other, chance):
    """Flipped bits, runs of bytes, pieces of this and another file elsewhere, numbers that may be lengths."""
    out = bytearray(content[:1 << 20])
    for _ in range(chance.randint(1, 12)):
        at = chance.randrange(len(out) + 1)
        if chance.random() < 0.3:
            at = min(at, chance.randrange(512))
        length = min(chance.randint(1, 1 << chance.randint(0, 9)), len(out) - at)
        kind = chance.randrange(6)
        if kind == 0 and at < len(out):
            out[at] ^= 1 << chance.randrange(8)
        elif kind == 1:
            out[at:at + length] = bytes([chance.choice((0, 0xFF, 0x80, 0x7F, chance.randrange(256)))]) * length
        elif kind == 2:
            begin = chance.randrange(len(out) + 1)
            out[at:at] = out[begin:begin + length]
        elif kind == 3:
            begin = chance.randrange(len(other) + 1)
            out[at:at + chance.choice((0, length))] = other[begin:begin + length]
        elif kind == 4:
            number = chance.choice((0, 1, 0x7F, 0x7FFF, 0xFFFF, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF, 0xFFFFFFFFFFFFFFFF, len(out)))
            size = chance.choice((1, 2, 4, 8))
            out[at:at + size] = (number & ((1 << 8 * size) - 1)).to_bytes(size, chance.choice(("little", "big")))
        else:
            del out[at:at + length]
    return bytes(out)


if __name__ == "__main__":
    unittest.main()
