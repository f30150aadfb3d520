#!/usr/bin/python3
"""How soon a change on the disk is searchable, on a live instance with all daemons.

Workloads, each in an instance of its own, with text files of 50 words drawn at random with a fixed seed:
  latency  --samples files with a word of their own, written one after the other; the clock runs from before the file is
           opened until a search has it as a hit. Searches go to the engine's open socket, one after the other with a pause
           of 2 ms, so a time is too long by at most such a pause and one search ("polling"). Once on an idle instance and
           once while another process changes --busy files a second (rewrites, new files, renames, deletes).
  return   --files files indexed; the notification daemon and the index daemon end; 1,000 changes (400 rewritten, 200 new,
           200 deleted, 150 renamed, 50 moved by renaming their folder); the clock runs from the start of the daemons until
           both have answered "sync".
  slow     the same on an instance that indexes 200 PDFs beside, each of which takes a reader some seconds.
  bulk     a tree of --bulk files in folders of 16, three deep, copied into the share; a folder with --files files renamed,
           and removed: seconds that the operation itself took, and until both daemons have answered "sync" behind it.
  folder   a folder with --files files renamed 20 times: seconds until a word in it is found below the new name, and the
           processor time of index daemon and engine until both have verified it on the disk. Then it leaves the share: until
           nothing is found, and the processor time until its words are out of the index.
  rights   chmod -R of --files files: seconds until both daemons have answered "sync" behind it, and the processor time of
           index daemon and engine. Then a share of as many files is indexed for the first time, and single files that it has
           already, one of them under a name outside of the share, have their mode changed: the clock runs until the index
           has the new one.
Behind each clock the index is compared with the disk, every path, size, time and text; a difference ends the program.

Needs: a build (--build).
"""

import argparse
import json
import os
import random
import re
import shutil
import signal
import socket
import struct
import subprocess
import sys
import time

from mixed import documents

SOURCE = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..")
WAY = {"fan": "fanotify", "marks": "fanotify inode marks", "inotify": "inotify", "scan": "periodic scan", "": ""}


def fill(path, rng, word=""):
    with open(path, "w", encoding="ascii") as file:
        file.write(word + " " + " ".join(f"w{rng.randrange(5000)}" for _ in range(50)))


def make_tree(folder, files, rng, in_folder=16):
    for number in range(files):
        place = number // in_folder
        parent = f"{folder}/{place // 100}/{place % 100}"
        if number % in_folder == 0:
            os.makedirs(parent, exist_ok=True)
        fill(f"{parent}/file{number}.txt", rng)


def percentile(values, part):
    return sorted(values)[min(len(values) - 1, int(len(values) * part))]


class Engine:
    """An open connection to the engine."""

    def __init__(self, instance):
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.connect(f"{instance.root}/var/run/kovaelasticd.sock")
        self.stream = self.socket.makefile("rb")

    def found(self, word):
        body = json.dumps({"command": "search", "data": {"query": word, "limit": 1, "snippet": False}}).encode()
        self.socket.sendall(struct.pack("=I", len(body)) + body)
        reply = json.loads(self.stream.read(struct.unpack("=I", self.stream.read(4))[0]))
        return reply["data"]["total"]


def change_all_the_time(folder, rate):
    """Runs until it is ended."""
    rng, number, begin = random.Random(2), 0, time.monotonic()
    for place in range(20):
        os.makedirs(f"{folder}/{place}", exist_ok=True)
    while True:
        path = f"{folder}/{number % 20}/{rng.randrange(100)}.txt"
        kind = rng.random()
        if kind < 0.8 or not os.path.exists(path):
            fill(path, rng)
        elif kind < 0.9:
            os.rename(path, f"{folder}/{rng.randrange(20)}/{rng.randrange(100)}.txt")
        else:
            os.remove(path)
        number += 1
        ahead = begin + number / rate - time.monotonic()
        if ahead > 0:
            time.sleep(ahead)


def resident(instance):
    """KiB of each daemon."""
    found = {}
    for program in ("kovanotifyd", "fileindexd", "kovaelasticd"):
        with open(f"/proc/{instance.pid(program)}/status", encoding="ascii") as file:
            found[program] = int(re.search(r"VmRSS:\s+(\d+)", file.read()).group(1))
    return found


def lost(instance):
    return instance.notifyd()["lost"]


def check(instance):
    problems, found = instance.sync(), instance.differences()
    if found:
        sys.exit(f"NOT EQUAL: {len(found)} paths, such as {list(found.items())[:3]}; {problems}")


def samples(engine, folder, count, rng):
    """Seconds of each, and the mean seconds of one search with the pause before it."""
    waits, polls, polling = [], 0, 0.0
    for number in range(count):
        word = f"sample{rng.getrandbits(40):x}"
        begin = time.monotonic()
        fill(f"{folder}/sample{number}.txt", rng, word)
        written = time.monotonic()
        while not engine.found(word):
            polls += 1
            time.sleep(0.002)
            if time.monotonic() - begin > 60:
                sys.exit(f"a change was not found in 60 s: {folder}/sample{number}.txt")
        waits.append(time.monotonic() - begin)
        polling += time.monotonic() - written
        time.sleep(rng.random() * 0.1)
    return waits, polling / max(1, polls)


def show(name, waits, polling):
    print(f"{name:24} p50 {percentile(waits, 0.5) * 1000:6.0f} ms  p99 {percentile(waits, 0.99) * 1000:6.0f} ms  "
          f"slowest {max(waits) * 1000:6.0f} ms   ({len(waits)} samples, polling {polling * 1000:.1f} ms)", flush=True)


def bench_latency(instance, options, rng):
    docs = instance.share("docs")
    make_tree(docs, 2000, rng)
    check(instance)
    print("watched by:", instance.watches()[docs]["watch"], "  resident, KiB:", resident(instance), flush=True)
    engine = Engine(instance)
    show("idle", *samples(engine, docs, options.samples, rng))
    busy = os.fork()
    if busy == 0:
        change_all_the_time(f"{docs}/busy", options.busy)
    try:
        time.sleep(3)
        before, begin = instance.notifyd()["changes"], time.monotonic()
        waits = samples(engine, f"{docs}/busy", options.samples, rng)
        rate = (instance.notifyd()["changes"] - before) / (time.monotonic() - begin)
    finally:
        os.kill(busy, signal.SIGKILL)
        os.waitpid(busy, 0)
    show(f"{options.busy} changes a second", *waits)
    print(f"kernel's reports beside: {rate:.0f} a second; lost: {lost(instance)} times", flush=True)
    check(instance)


def bench_slow(instance, options, rng):
    docs = instance.share("docs")
    make_tree(docs, 2000, rng)
    check(instance)
    os.makedirs(f"{instance.root}/vol/slow")
    page = documents.pdf("slow", "nobody", ["slow " * 10] * 300, drawing=500000)
    for number in range(200):
        with open(f"{instance.root}/vol/slow/{number}.pdf", "wb") as file:
            file.write(page)
    os.rename(f"{instance.root}/vol/slow", f"{docs}/slow")
    time.sleep(2)
    begin, engine = instance.share_status("docs"), Engine(instance)
    show("beside slow documents", *samples(engine, docs, options.samples // 3, rng))
    end = instance.share_status("docs")
    read = end["written"] - begin["written"] - options.samples // 3
    print(f"slow documents read meanwhile: {read}; it was {begin['state']} and is {end['state']}", flush=True)


def timed(instance, name, operation, behind=lambda: None):
    before, begin = lost(instance), time.monotonic()
    operation()
    done = time.monotonic() - begin
    problems = instance.sync()
    equal = time.monotonic() - begin
    print(f"{name:44} {done:7.1f} s, until all is searchable {equal:7.1f} s; lost {lost(instance) - before} times"
          f"{'; ' + str(problems) if problems else ''}", flush=True)
    behind()
    check(instance)


def bench_return(instance, options, rng):
    docs = instance.share("docs")
    begin = time.monotonic()
    make_tree(docs, options.files, rng)
    check(instance)
    print(f"{options.files} files made and indexed in {time.monotonic() - begin:.1f} s; resident, KiB: "
          f"{resident(instance)}", flush=True)
    instance.kill("kovanotifyd", signal.SIGTERM)
    instance.kill("fileindexd", signal.SIGTERM)
    chosen = rng.sample([f"{docs}/{number // 1600}/{number // 16 % 100}/file{number}.txt"
                         for number in range(1600, options.files)], 750)
    for path in chosen[:400]:
        fill(path, rng)
    for path in chosen[400:600]:
        os.remove(path)
        fill(f"{os.path.dirname(path)}/new{rng.random()}.txt", rng)
    for path in chosen[600:]:
        os.rename(path, path + ".renamed.txt")
    for number in range(3):
        os.rename(f"{docs}/0/{number}", f"{docs}/0/renamed{number}")
    begin = time.monotonic()
    instance.ctl("up")
    up = time.monotonic() - begin
    instance.sync()
    print(f"{'1,000 changes while the daemons were down':44} {up:7.1f} s until they run, until equal "
          f"{time.monotonic() - begin:7.1f} s", flush=True)
    check(instance)


def bench_bulk(instance, options, rng):
    docs = instance.share("docs")
    made = f"{instance.root}/vol/made"
    make_tree(made, options.bulk, rng)
    timed(instance, f"{options.bulk} files copied in", lambda: shutil.copytree(made, f"{docs}/unpacked"))
    shutil.rmtree(f"{docs}/unpacked")
    shutil.rmtree(made)
    check(instance)
    make_tree(f"{docs}/many", options.files, rng)
    check(instance)
    timed(instance, f"folder of {options.files} files renamed", lambda: os.rename(f"{docs}/many", f"{docs}/renamed"))
    timed(instance, f"rm -rf of {options.files} files",
          lambda: subprocess.run(["rm", "-rf", f"{docs}/renamed"], check=True))


def cpu_seconds(instance, *programs):
    """Of each program, in user and system mode, since it started."""
    seconds = []
    for program in programs:
        with open(f"/proc/{instance.pid(program)}/stat", encoding="ascii") as file:
            times = file.read().rsplit(")", 1)[1].split()[11:13]
        seconds.append(sum(map(int, times)) / os.sysconf("SC_CLK_TCK"))
    return seconds


def until(found, begin):
    """Seconds since `begin`, once found() is true."""
    while not found():
        time.sleep(0.002)
    return time.monotonic() - begin


def bench_folder(instance, options, rng):
    docs, daemons = instance.share("docs"), ("fileindexd", "kovaelasticd")
    make_tree(f"{docs}/folder", options.files, rng)
    fill(f"{docs}/folder/0/0/some.txt", rng, "inthefolder")
    check(instance)
    engine, path, waits, before = Engine(instance), f"{docs}/folder", [], cpu_seconds(instance, *daemons)
    for number in range(20):
        new_path, begin = f"{docs}/folder{number}", time.monotonic()
        os.rename(path, new_path)
        waits.append(until(lambda new_path=new_path: engine.found(f'inthefolder path:"{new_path}"'), begin))
        instance.sync()
        path = new_path
    cpu = [(after - start) / len(waits) for start, after in zip(before, cpu_seconds(instance, *daemons))]
    print(f"folder of {options.files} files renamed: found after p50 {percentile(waits, 0.5) * 1000:.0f} ms, slowest "
          f"{max(waits) * 1000:.0f} ms; processor time {cpu[0]:.2f} + {cpu[1]:.2f} s each", flush=True)
    check(instance)
    before, begin = cpu_seconds(instance, *daemons), time.monotonic()
    os.rename(path, f"{instance.root}/vol/left")
    gone = until(lambda: not engine.found("inthefolder"), begin)
    instance.sync()
    stat = {"command": "index_stat", "data": {"id": "fileindex_docs"}}
    cleared = until(lambda: "clearing" not in instance.ask("kovaelasticd", stat)["data"], begin)
    cpu = [after - start for start, after in zip(before, cpu_seconds(instance, *daemons))]
    print(f"the same leaves the share: not found after {gone * 1000:.0f} ms, cleared after {cleared:.1f} s; processor time "
          f"{cpu[0]:.2f} + {cpu[1]:.2f} s", flush=True)
    check(instance)


def indexed_access(instance, share, path):
    query = {"qsl": {"term": {"KOVAMDPath": path}}, "load_field": ["_KOVAAccess"]}
    reply = instance.ask("kovaelasticd", {"command": "document_get_by_query",
                                          "data": {"id": "fileindex_" + share, "query": query}})
    return reply["data"][0]["_KOVAAccess"] if reply["success"] and reply["data"] else None


def bench_rights(instance, options, rng):
    docs, daemons = instance.share("docs"), ("fileindexd", "kovaelasticd")
    make_tree(docs, options.files, rng)
    check(instance)
    for mode in ("u=rwX,g=rX,o=", "u=rwX,g=rX,o=rX", "u=rwX,g=rwX,o="):
        before = cpu_seconds(instance, *daemons)
        timed(instance, f"chmod -R of {options.files} files",
              lambda mode=mode: subprocess.run(["chmod", "-R", mode, docs], check=True),
              lambda: print("processor time:", ", ".join(
                  f"{name} {after - begin:.2f} s" for name, begin, after in
                  zip(daemons, before, cpu_seconds(instance, *daemons)))))
    first, outside = f"{instance.root}/vol/first", f"{instance.root}/vol/outside.txt"
    make_tree(first, options.files, rng)
    paths = [f"{os.path.realpath(first)}/0/{number}/file{number * 16}.txt" for number in range(10)]
    os.link(paths[0], outside)
    instance.share("first", os.path.realpath(first))
    while indexed_access(instance, "first", paths[-1]) is None:
        time.sleep(0.05)
    waits, number = [], 0
    while instance.share_status("first")["state"] == "indexing" and len(waits) < options.samples:
        path = paths[number % len(paths)]
        mode = 0o600 + number // len(paths) % 0o100
        begin = time.monotonic()
        os.chmod(outside if path == paths[0] else path, mode)
        while not indexed_access(instance, "first", path).endswith(f":{mode:04o}"):
            time.sleep(0.005)
        waits.append(time.monotonic() - begin)
        number += 1
        time.sleep(rng.random() * 0.1)
    show("beside a first index", waits, 0.005)
    check(instance)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("workloads", nargs="*", help="latency, slow, return, bulk, folder, rights; absent: all")
    parser.add_argument("--build", default=f"{SOURCE}/build/release")
    parser.add_argument("--way", default="", choices=sorted(WAY), help="of watching; absent: the daemon's choice")
    parser.add_argument("--samples", type=int, default=300)
    parser.add_argument("--busy", type=int, default=1000, help="changes a second")
    parser.add_argument("--files", type=int, default=100000)
    parser.add_argument("--bulk", type=int, default=80000)
    options = parser.parse_args()
    os.environ["FERROX_BIN"] = os.path.realpath(f"{options.build}/bin")
    sys.path.insert(0, f"{SOURCE}/tests/integration")
    from live import LiveInstance  # pylint: disable=import-outside-toplevel

    for name, bench in (("latency", bench_latency), ("slow", bench_slow), ("return", bench_return), ("bulk", bench_bulk),
                        ("folder", bench_folder), ("rights", bench_rights)):
        if options.workloads and name not in options.workloads:
            continue
        instance = LiveInstance()
        instance.sync_seconds = 600
        try:
            if options.way:
                instance.watch_by(WAY[options.way], scan_interval=1)
            instance.ctl("up")
            bench(instance, options, random.Random(1))
        finally:
            instance.stop()


if __name__ == "__main__":
    main()
