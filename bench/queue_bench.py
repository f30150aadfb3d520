#!/usr/bin/python3
"""How fast the index daemon turns the lines of a queue into search results, with real daemons and without a notification
daemon: the lines are appended here, as it would, and fileindexd's "sync" tells when they are in the index.

Workload: small text files of 40 words in a fresh share, 100 a folder. "single": a file is rewritten, its line appended,
and the index searched until the new word is found, one after the other, with pauses. "burst": so many modified files,
one line each. "rename of each file": likewise. "delete": so many deleted files, one line each (rm -rf). "rename of their folder": one line. Wall
seconds, and CPU seconds of fileindexd and kovaelasticd from /proc.
"""

import argparse
import os
import random
import shutil
import statistics
import sys
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "tests", "integration"))
import instance  # noqa: E402  pylint: disable=wrong-import-position

CREATE, MODIFY, DELETE, RENAME = instance.CREATE, instance.MODIFY, instance.DELETE, instance.RENAME
PER_FOLDER = 100
WORDS = [f"{a}{b}{c}" for a in "bdfgkl" for b in "aeiou" for c in ("rn", "st", "lm", "x", "nt")]


def cpu_seconds(pid):
    with open(f"/proc/{pid}/stat", encoding="ascii") as file:
        fields = file.read().rpartition(")")[2].split()
    return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")


def memory_mb(pid):
    with open(f"/proc/{pid}/status", encoding="ascii") as file:
        return next(int(line.split()[1]) / 1024 for line in file if line.startswith("VmHWM"))


def renamed(path):
    return os.path.join(os.path.dirname(path), "g" + os.path.basename(path))


class Bench:
    def __init__(self):
        self.host = instance.Instance()
        self.random = random.Random(1)
        self.host.ctl("up")
        self.host.kill("kovanotifyd")
        self.folder = self.host.add_share("bench")
        self.host.wait_idle("bench", self.folder)
        self.pids = {name: self.host.pid(name) for name in ("fileindexd", "kovaelasticd")}

    def text(self):
        return " ".join(self.random.choices(WORDS, k=40)) + "\n"

    def make(self, count, below):
        paths = [f"{self.folder}/{below}/{i // PER_FOLDER}/f{i}.txt" for i in range(count)]
        folders = sorted({os.path.dirname(path) for path in paths})
        for folder in folders:
            os.makedirs(folder)
        self.host.queue(self.folder, instance.event(CREATE, f"{self.folder}/{below}", "", True))
        self.sync()
        for path in paths:
            instance.write(path, self.text())
        return paths

    def sync(self):
        reply = self.host.ask("fileindexd", {"type": "sync", "data": {"timeout_ms": 600000}}, b"\0")
        assert reply["success"], reply

    def timed(self, name, count, lines):
        before = {program: cpu_seconds(pid) for program, pid in self.pids.items()}
        begin = time.monotonic()
        self.host.queue(self.folder, *lines)
        self.sync()
        seconds = time.monotonic() - begin
        cpu = ", ".join(f"{program} {cpu_seconds(pid) - before[program]:.2f} s (peak {memory_mb(pid):.0f} MB)"
                        for program, pid in self.pids.items())
        print(f"{name}: {count} in {seconds:.2f} s, {count / seconds:.0f} a second; CPU {cpu}", flush=True)

    def single(self, rounds):
        path = f"{self.folder}/single.txt"
        times = []
        for i in range(rounds):
            time.sleep(0.05 + 0.1 * self.random.random())
            word = f"zq{i}zq"
            begin = time.monotonic()
            instance.write(path, f"{word} {self.text()}")
            self.host.queue(self.folder, instance.event(MODIFY if i else CREATE, path))
            while not self.host.ask("kovaelasticd", {"command": "search", "data": {"query": word}})["data"]["total"]:
                time.sleep(0.001)
            times.append(1000 * (time.monotonic() - begin))
        times.sort()
        print(f"single: {rounds} changes, {statistics.median(times):.0f} ms at the median, "
              f"{times[int(rounds * 0.99)]:.0f} ms at p99, {times[-1]:.0f} ms at most", flush=True)

    def run(self, rounds, count):
        self.single(rounds)
        paths = self.make(count, "burst")
        self.timed("burst of new files", count, [instance.event(CREATE, path) for path in paths])
        for path in paths:
            instance.write(path, self.text())
        self.timed("burst of modified files", count, [instance.event(MODIFY, path) for path in paths])
        renames = []
        for path in paths:
            os.rename(path, renamed(path))
            renames.append(instance.event(RENAME, renamed(path), path))
        self.timed("rename of each file", count, renames)
        paths = [renamed(path) for path in paths]
        os.rename(f"{self.folder}/burst", f"{self.folder}/moved")
        self.timed("rename of their folder", count,
                   [instance.event(RENAME, f"{self.folder}/moved", f"{self.folder}/burst", True)])
        shutil.rmtree(f"{self.folder}/moved")
        moved = [path.replace("/burst/", "/moved/") for path in paths]
        folders = sorted({os.path.dirname(path) for path in moved}) + [f"{self.folder}/moved"]
        self.timed("rm -rf", count, [instance.event(DELETE, path) for path in moved] +
                   [instance.event(DELETE, path, "", True) for path in folders])
        left = self.host.documents("bench", self.folder)
        assert left == [f"{self.folder}/single.txt".encode()], left[:3]


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n", maxsplit=1)[0])
    parser.add_argument("--build", default="build/release")
    parser.add_argument("--rounds", type=int, default=100, help="changes one after the other")
    parser.add_argument("--files", type=int, default=10000)
    arguments = parser.parse_args()
    instance.BIN = os.path.join(os.path.abspath(arguments.build), "bin")
    bench = Bench()
    try:
        bench.run(arguments.rounds, arguments.files)
    finally:
        bench.host.stop()


if __name__ == "__main__":
    main()
