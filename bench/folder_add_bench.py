#!/usr/bin/python3
"""Adds 100 folders in 10 shares to a live instance, end to end: by one call of 'fileindexctl folder add' with all of them,
and, as the reference, by 100 calls with one each; and makes 10 indices by asking the engine alone.

Workload: 10 shares of 10 folders with --files text files each (default 20, 2,000 in all), of 200 words drawn at random
with a fixed seed. Each round has a fresh instance for each way; engine and index daemon run before the clock does. "call"
is the wall time until the last call has returned, "found" until a search finds every file, from the same start. Medians
over --rounds rounds, in which the ways take turns, and how far they spread.

Needs: a build (--build).
"""

import argparse
import os
import random
import statistics
import sys
import time

SOURCE = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..")
SHARES, FOLDERS = 10, 10


def fill(folder, files, rng):
    for number in range(files):
        with open(f"{folder}/file{number}.txt", "w", encoding="ascii") as file:
            file.write("everywhere " + " ".join(f"w{rng.randrange(5000)}" for _ in range(200)))


def make_instance(instance_class, files):
    """An instance with its shares and files, and the paths of the folders."""
    instance = instance_class()
    rng = random.Random(1)
    instance.ctl("up")
    paths = []
    for share in range(SHARES):
        folder = instance.add_share(f"share{share}", "--no-index")
        for number in range(FOLDERS):
            os.makedirs(f"{folder}/f{number}")
            fill(f"{folder}/f{number}", files, rng)
            paths.append(f"/share{share}/f{number}")
    return instance, paths


def total_found(instance):
    request = {"command": "search", "data": {"query": "everywhere", "limit": 1}}
    return instance.ask("kovaelasticd", request)["data"]["total"]


def add(instance, calls, files):
    """Seconds until the last call has returned, and until everything is found."""
    begin = time.monotonic()
    for paths in calls:
        instance.ctl("folder", "add", *paths)
    called = time.monotonic() - begin
    while total_found(instance) < SHARES * FOLDERS * files:
        time.sleep(0.005)
    return called, time.monotonic() - begin


def create_indices(instance):
    """Seconds until the engine alone has made as many indices as there are shares."""
    begin = time.monotonic()
    for number in range(SHARES):
        reply = instance.ask("kovaelasticd", {"command": "index_create", "data": {
            "id": f"bench{number}", "path": f"{instance.root}/bench{number}", "settings": {},
            "mappings": {"KOVAMDPath": {"type": "string"}}}})
        assert reply["success"], reply
    return time.monotonic() - begin


def show(name, seconds):
    median = statistics.median(seconds)
    print(f"{name:34} {median * 1000:9.1f} ms   ({min(seconds) * 1000:.1f} to {max(seconds) * 1000:.1f})", flush=True)
    return median


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default=f"{SOURCE}/build/release")
    parser.add_argument("--files", type=int, default=20, help="files in each folder")
    parser.add_argument("--rounds", type=int, default=5)
    options = parser.parse_args()
    os.environ["FERROX_BIN"] = os.path.realpath(f"{options.build}/bin")
    sys.path.insert(0, f"{SOURCE}/tests/integration")
    from instance import Instance  # pylint: disable=import-outside-toplevel

    one, single, indices = [], [], []
    for round_number in range(options.rounds):
        for results, at_once in ((one, True), (single, False))[::1 if round_number % 2 else -1]:
            instance, paths = make_instance(Instance, options.files)
            try:
                results.append(add(instance, [paths] if at_once else [[path] for path in paths], options.files))
                if at_once:
                    indices.append(create_indices(instance))
            finally:
                instance.stop()

    print(f"{SHARES * FOLDERS} folders in {SHARES} shares, {SHARES * FOLDERS * options.files} files, "
          f"{options.rounds} rounds: medians (least to most)")
    call = show("one call, until it returns", [called for called, _ in one])
    found = show("one call, until all is found", [found for _, found in one])
    calls = show("100 calls, until the last returns", [called for called, _ in single])
    all_found = show("100 calls, until all is found", [found for _, found in single])
    raw = show("10 indices, the engine alone", indices)
    print(f"one call takes {call / raw:.1f} times the engine's own time for the indices; 100 calls take "
          f"{calls / call:.1f} times as long as one, and {all_found / found:.1f} times until all is found")


if __name__ == "__main__":
    main()
