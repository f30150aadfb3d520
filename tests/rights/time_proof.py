#!/usr/bin/python3
"""How long an answer takes does not tell an ordinary user whether a word stands in files that they may not read.

Asked by an ordinary user, in turn: a word that one unreadable file holds, one that --files unreadable files hold, and one that
nothing holds, --queries times each. The medians may differ by 0.2 ms; --any 1 takes every difference. On a machine that
others keep busy, --realtime 1 has the kernel run the asker, the engine and kova-access before all others.

    FERROX_BIN=build/release/bin python3 -B tests/rights/time_proof.py"""

import os
import random
import statistics
import time

from asking import Child, SharedInstance, User, arguments, end, parse
from instance import write

ASKER = User(50001, [60001])
WORDS = {"in no file": "nowhereword", "in one": "onceword", "in many": "manyword"}
DIFFERENCE_MAX_MS = 0.2


def fill(share, files):
    for number in range(200):
        write(f"{share}/open/{number % 20}/f{number}.txt", f"everyone reads this, number {number}")
    for number in range(files):
        shut = number % 2  # the file itself, or a folder above it
        path = f"{share}/{'open' if shut else 'shut'}/{number % 100}/s{number}.txt"
        write(path, f"manyword and more of it, number {number} " + "onceword" * (number == files // 2))
        os.chmod(path, 0o600 if shut else 0o644)
    os.chmod(f"{share}/shut", 0o700)


def ask(instance, queries):
    """Milliseconds of each answer, by the kind of word."""
    engine, times = instance.connect(), {kind: [] for kind in WORDS}
    turns = [kind for kind in WORDS for _ in range(queries)]
    random.Random(1).shuffle(turns)
    for kind in [*WORDS] * 20 + turns:  # the first ones are not counted
        begin = time.perf_counter()
        reply = engine.ask("search", {"shares": ["docs"], "query": WORDS[kind]})
        times[kind].append((time.perf_counter() - begin) * 1000)
        result = parse(reply)
        assert result["success"] and result["data"]["total"] == 0, reply
    return {kind: taken[20:] for kind, taken in times.items()}


def before_others(*pids):
    for pid in pids:
        for thread in os.listdir(f"/proc/{pid}/task"):
            os.sched_setscheduler(int(thread), os.SCHED_FIFO, os.sched_param(10))


def main():
    given = arguments(__doc__, queries=1000, files=10000, any=0, realtime=0)
    instance = SharedInstance()
    try:
        share = instance.share("docs")
        fill(share, given.files)
        instance.sync()
        assert len(instance.search("manyword", "--limit", "1000")) == min(given.files, 1000), "root does not find them"
        if given.realtime:
            before_others(os.getpid(), *(instance.pid(program) for program in ("kovaelasticd", "kova-access")))
        times = Child(ASKER, lambda: ask(instance, given.queries)).result()
    finally:
        instance.stop()
    medians = {kind: statistics.median(taken) for kind, taken in times.items()}
    difference = max(medians.values()) - min(medians.values())
    end(f"medians of {given.queries} each, many being {given.files} files: "
        + ", ".join(f"{kind} {median:.3f} ms" for kind, median in medians.items()) + f"; they differ by {difference:.3f} ms",
        not given.any and difference > DIFFERENCE_MAX_MS)


if __name__ == "__main__":
    main()
