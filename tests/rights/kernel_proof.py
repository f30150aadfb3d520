#!/usr/bin/python3
"""Everyone finds exactly what the kernel lets them open.

Random trees below a share, random users; after every random change of rights, names or files the set that each user finds
is compared with what open(O_RDONLY) allows a process with that user's ids, from "/" on.

    FERROX_BIN=build/release/bin python3 -B tests/rights/kernel_proof.py --seeds 200

--first N begins with another seed than 1, --changes N makes another number of changes for each seed."""

import functools
import os
import stat
import time

from asking import Child, SharedInstance, arguments, end, opens, to_path
from live import access, stamp
from rights_world import USERS, World

QUERIES = ("size:>=0", "-absentword", "path", "kind:folder", "everyone")
USERS_A_CHECK = 4


class Proof:
    def __init__(self, instance, share, outside):
        self.instance, self.share, self.outside = instance, share, outside
        self.engine = instance.connect()
        self.failures, self.checks, self.changes, self.readable, self.documents = [], 0, 0, 0, 0

    def run_seed(self, seed, changes):
        world = World(seed, os.fsencode(self.share), os.fsencode(self.outside))
        world.make()
        self.check(world, seed, 0, USERS)
        for number in range(1, changes + 1):
            world.change()
            self.changes += 1
            self.check(world, seed, number, world.random.sample(USERS, USERS_A_CHECK))
        self.check(world, seed, changes, USERS)
        world.clear()

    def check(self, world, seed, number, users):
        self.instance.sync()
        entries = world.entries()
        cases = [(user, world.random.choice(QUERIES), world.random.choice((3, 40, 1000))) for user in users]
        children = [Child(case[0], functools.partial(self.look, entries, *case[1:])) for case in cases]
        for case, child in zip(cases, children):
            user, query, limit = case
            enters, opened, themselves = child.result()
            expected = [path for path in opened if wanted(query, entries[path])] if enters else None
            place = f"seed {seed}, after change {number} ({world.log[-1]!r}), {case}"
            self.compare(seed, place, entries, expected, themselves)
            as_user = self.engine.pages("docs", self.query(query), limit, user)
            self.compare(seed, place + ", asked by root", entries, expected, as_user)
            self.documents += len(entries)
            self.readable += len(opened)
        self.checks += 1

    def query(self, query):
        return f'path:"{self.share}"' if query == "path" else query

    def look(self, entries, query, limit):
        """In a process of the user's: whether it enters the share, what it can open, and what the engine finds."""
        opened = [path for path in entries if opens(path)]
        return can_enter(self.share), opened, self.instance.connect().pages("docs", self.query(query), limit)

    def compare(self, seed, place, entries, opened, found):
        problems = []
        if opened is None or found is None:
            if opened is not found:
                problems.append(f"can enter the share: {opened is not None}, is told of it: {found is not None}")
        else:
            expected = {path for path in opened if is_shown(entries[path])}
            paths, total = found
            for what, wrong in (("may not be shown", set(paths) - expected), ("is missing", expected - set(paths))):
                problems += [f"{what}: {path!r}\n{self.way(path)}" for path in sorted(wrong)[:3]]
            if len(paths) != len(set(paths)) or total != len(expected):
                problems.append(f"{len(paths)} hits of {len(set(paths))} documents, total {total}, "
                                f"expected {len(expected)}")
        if problems:
            self.failures.append(seed)
            print(place, *problems, sep="\n  ", flush=True)

    def way(self, path):
        """What disk and index say of a path, and of each folder on the way to it."""
        fields = ("KOVAMDPath", "_KOVAAccess", "_KOVAStamp")
        known = {to_path(entry["KOVAMDPath"]): " ".join(entry.get(field, "-") for field in fields[1:])
                 for entry in self.instance.entries("docs", self.share, *fields)}
        lines, share = [], os.fsencode(self.share)
        while len(path) >= len(share):
            status = os.lstat(path) if os.path.lexists(path) else None
            on_disk = status and f"{access(path, status)} {stamp(status)}, {status.st_nlink} names"
            lines.append(f"    {path!r}\n      disk  {on_disk}\n      index {known.get(path)}")
            path = os.path.dirname(path)
        return "\n".join(lines)


def is_shown(status):
    return stat.S_ISREG(status.st_mode) or stat.S_ISDIR(status.st_mode)


def wanted(query, status):
    """What a query is after, of all that can be opened."""
    if query == "kind:folder":
        return stat.S_ISDIR(status.st_mode)
    return query != "everyone" or stat.S_ISREG(status.st_mode)


def can_enter(folder):
    try:
        os.close(os.open(folder + "/.", os.O_PATH))
    except OSError:
        return False
    return True


def main():
    given = arguments(__doc__, seeds=200, first=1, changes=30)
    begin, instance = time.monotonic(), SharedInstance()
    try:
        share = instance.share("docs")
        outside = f"{os.path.dirname(share)}/outside"
        os.makedirs(outside)
        proof = Proof(instance, share, outside)
        for seed in range(given.first, given.first + given.seeds):
            proof.run_seed(seed, given.changes)
            if len(proof.failures) >= 10:
                break
    finally:
        instance.stop()
    if proof.failures:
        print("to repeat: --seeds 1 --first", *sorted(set(proof.failures)))
    end(f"{given.seeds} seeds, {proof.changes} changes, {proof.checks} checks, {proof.documents} answers about a document, "
        f"{proof.readable} of them yes, each for the user and for root in their place; {len(proof.failures)} failures; "
        f"{time.monotonic() - begin:.0f} s", proof.failures)


if __name__ == "__main__":
    main()
