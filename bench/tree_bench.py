#!/usr/bin/python3
"""What a large tree of folders costs the search engine: 1,000,000 small documents in 100,000 folders (9 shares of 100
parts of 10 groups of 10 folders, and a document for each folder), unless told otherwise, sent to a kovaelasticd of its
own through its socket. Measured are its start, its resident memory, queries with and without `path:` on parts of the tree
of different size, and the listing of 100,000 unread documents in pages. With --folder the index is kept there, and used
again by the next run.
  tree_bench.py --build build/release [--documents N] [--folder DIR] [--rounds N]
"""

import argparse
import json
import os
import random
import shutil
import signal
import socket
import struct
import subprocess
import tempfile
import time

ID = "fileindex_tree"
TOP = "/volume1/tree"
LEVELS = (("s", 9), ("p", 100), ("g", 10), ("f", 10))  # 9 + 900 + 9,000 + 90,000 folders
BATCH = 2000
UNREAD_EVERY = 10
# In one of so many documents.
WORDS = {"often": 2, "common": 10, "some": 100, "seldom": 1000, "rare": 50000}
QUERIES = (*WORDS, "often common", "some OR seldom", "often -common", "ext:pdf", "kind:document size:>90k", "name:report",
           "comm*")


class Engine:
    """A daemon on the folder `root`, and one connection to it."""

    def __init__(self, build, root):
        os.makedirs(root + "/var/run", exist_ok=True)
        self.daemon = subprocess.Popen([os.path.join(build, "bin", "kovaelasticd")], env=dict(os.environ, FERROX_ROOT=root))
        self.connection = socket.socket(socket.AF_UNIX)
        for _ in range(10000):
            try:
                self.connection.connect(root + "/var/run/kovaelasticd.sock")
                break
            except OSError:
                time.sleep(0.001)
        self.stream = self.connection.makefile("rb")

    def send(self, request):
        body = json.dumps(request).encode()
        self.connection.sendall(struct.pack("=I", len(body)) + body)
        reply = json.loads(self.stream.read(struct.unpack("=I", self.stream.read(4))[0]))
        assert reply["success"] and not reply.get("has_fail"), str(reply)[:500]
        return reply.get("data")

    def call(self, command, **data):
        return self.send({"command": command, "data": {"id": ID, **data}})

    def memory_mb(self):
        with open(f"/proc/{self.daemon.pid}/status", encoding="ascii") as file:
            return next(int(line.split()[1]) / 1024 for line in file if line.startswith("VmRSS"))

    def cpu_ms(self):
        """What its threads have taken; unlike times, it hardly depends on what else the machine does."""
        total = 0
        for thread in os.listdir(f"/proc/{self.daemon.pid}/task"):
            with open(f"/proc/{self.daemon.pid}/task/{thread}/schedstat", encoding="ascii") as file:
                total += int(file.read().split()[0])
        return total / 1e6

    def stop(self):
        self.daemon.send_signal(signal.SIGTERM)
        self.daemon.wait()


def folders():
    """By level, those above first."""
    levels = [[TOP]]
    for name, count in LEVELS:
        levels.append([f"{above}/{name}{i}" for above in levels[-1] for i in range(count)])
    return levels


def document(path, number, choose):
    """`number` below 0: of a folder."""
    parent, _, name = path.rpartition("/")
    fields = {"KOVAMDPath": path, "KOVAMDParent": parent, "KOVAMDFSName": name, "KOVAMDSearchFileName": name,
              "KOVAMDDisplayName": name, "KOVAMDIsDir": number < 0, "KOVAMDOwnerUserID": "1000", "KOVAMDOwnerGroupID": "100",
              "KOVAMDFSContentChangeDate": 1500000000 + number * 7919 % 200000000}
    if number < 0:
        return fields
    fields["KOVAMDExtension"] = fields["KOVAMDKind"] = name.rpartition(".")[2]
    fields["KOVAMDFSSize"] = number * 31 % 100000
    fields["_KOVAStamp"] = f"{number}.1700000000.1700000000.{number + 1}"
    if number % UNREAD_EVERY == 0:
        fields["_KOVAExtractError"] = "not text"
    else:
        words = [word for word, of in WORDS.items() if choose.random() * of < 1]
        fields["KOVAMDTextContent"] = " ".join(words + [f"word{choose.randrange(20000)}" for _ in range(4)])
    return fields


def build_index(engine, root, count):
    choose = random.Random(1)
    places = [folder for level in folders()[1:] for folder in level]
    each = max(1, (count - len(places)) // len(places))
    parts = []
    before, begin = engine.cpu_ms(), time.monotonic()

    def put(path, number):
        parts.append({"command": "document_upsert_by_id",
                      "data": {"id": ID, "doc_id": path, "data": document(path, number, choose)}})
        if len(parts) >= BATCH:
            engine.send({"compound": parts})
            parts.clear()

    engine.call("index_create", path=root + "/index")
    for i, folder in enumerate(places):
        put(folder, -1)
        for n in range(each):
            number = i * each + n
            put(f"{folder}/{('report', 'letter', 'photo')[n % 3]}_{number}.{('txt', 'pdf', 'jpg')[number % 3]}", number)
    if parts:
        engine.send({"compound": parts})
    engine.call("commit")
    print(f"build: {engine.call('index_stat')['documents']} documents in {len(places)} folders, "
          f"{time.monotonic() - begin:.0f} s, {(engine.cpu_ms() - before) / 1000:.1f} s of CPU of the engine", flush=True)


def timed(engine, query):
    """Milliseconds, those of the engine's processor time, and how many were found."""
    cpu, begin = engine.cpu_ms(), time.monotonic()
    total = engine.call("search", query=query)["total"]
    return 1000 * (time.monotonic() - begin), engine.cpu_ms() - cpu, total


def show(name, times):
    def percentiles(values):
        values = sorted(values)
        return f"{values[len(values) // 2]:.1f} / {values[int(len(values) * 0.99)]:.1f}"
    return f"{name} {percentiles(wall for wall, _, _ in times)} ({percentiles(cpu for _, cpu, _ in times)})"


def measure_queries(engine, rounds):
    choose = random.Random(2)
    levels = folders()
    for query in QUERIES:
        timed(engine, query)
    print(f"memory after queries without path: {engine.memory_mb():.0f} MB", flush=True)
    first, cpu, total = timed(engine, f"often path:{levels[1][0]}")
    print(f"first query with path:, of a share: {first:.0f} ms, {cpu:.0f} of processor time, "
          f"{total} found; memory {engine.memory_mb():.0f} MB")
    names = ("all", "share", "part", "group", "folder")
    every = {name: [] for name in ("without", *names)}
    print(f"p50 / p99 in ms of {rounds} queries (of their processor time)")
    for query in (*QUERIES, ""):
        line = []
        for name, level in (("without", None), *zip(names, levels)):
            if name == "without" and not query:
                continue
            times = [timed(engine, query if level is None else f"{query} path:{choose.choice(level)}")
                     for _ in range(rounds)]
            every[name] += times if query else []
            line.append(show(name, times))
        print(f"  {query or 'path: alone':24}", ", ".join(line), flush=True)
    print("  all queries             ", ", ".join(show(name, times) for name, times in every.items()))
    print(f"memory after these: {engine.memory_mb():.0f} MB", flush=True)


def measure_changes(engine, rounds):
    """One new document and its commit, without and with queries that use the tree between them."""
    choose = random.Random(3)
    leaves = folders()[-1]
    for name, query in (("", None), (", a query with path: before each", f"often path:{leaves[0].rsplit('/', 3)[0]}")):
        changes, searches = [], []
        for i in range(rounds):
            if query is not None:
                searches.append(timed(engine, query))
            path = f"{choose.choice(leaves)}/new_{i}{len(name)}.txt"
            cpu, begin = engine.cpu_ms(), time.monotonic()
            engine.call("document_upsert_by_id", doc_id=path, data=document(path, 10000001 + i, choose))
            engine.call("commit")
            changes.append((1000 * (time.monotonic() - begin), engine.cpu_ms() - cpu, 1))
        print(show("change 1 + commit" + name, changes) + (show(", the query", searches) if query else ""), flush=True)


def measure_listing(engine):
    count, after, begin = 0, "", time.monotonic()
    while True:
        page = engine.call("document_get_by_query",
                           query={"qsl": {"unread": True}, "load_field": ["KOVAMDPath"], "after": after, "limit": 1000})
        paths = [entry["KOVAMDPath"] for entry in page]
        assert paths == sorted(paths) and (not paths or paths[0] > after)
        count += len(paths)
        if len(paths) < 1000:
            break
        after = paths[-1]
    print(f"unread documents listed in pages of 1,000: {count} in {time.monotonic() - begin:.1f} s", flush=True)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", required=True)
    parser.add_argument("--documents", type=int, default=1000000)
    parser.add_argument("--folder")
    parser.add_argument("--rounds", type=int, default=40)
    options = parser.parse_args()
    root = options.folder or tempfile.mkdtemp(prefix="tree-")
    if not os.path.exists(root + "/index"):
        engine = Engine(options.build, root)
        build_index(engine, root, options.documents)
        engine.stop()
    begin = time.monotonic()
    engine = Engine(options.build, root)
    answering = time.monotonic() - begin
    engine.call("index_stat")
    print(f"start: answers after {answering:.2f} s, the index is open after {time.monotonic() - begin:.2f} s; "
          f"memory {engine.memory_mb():.0f} MB", flush=True)
    try:
        measure_queries(engine, options.rounds)
        measure_changes(engine, options.rounds)
        measure_listing(engine)
    finally:
        engine.stop()
        if options.folder is None:
            shutil.rmtree(root)


if __name__ == "__main__":
    main()
