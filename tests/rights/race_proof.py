#!/usr/bin/python3
"""Nothing is shown of a file that the asker may not read while they ask, whatever happens to rights and names meanwhile.

Rounds of --batch each: files with a token of their own are made and indexed; then, while --askers processes of an ordinary
user search for the tokens, rights are revoked, files and folders are moved, swapped and overwritten, and the index follows.
Each token has the times at which the user could not read it; a reply that holds the token is a leak when the request began
and the reply had come within such a time.

    FERROX_BIN=build/release/bin python3 -B tests/rights/race_proof.py --rounds 10000"""

import collections
import mmap
import os
import random
import re
import shutil
import time

from asking import Child, SharedInstance, User, arguments, end, parse
from instance import write
from race_rounds import ROUNDS, Ground

ASKER = User(50001, [60001])
TOKEN = re.compile(rb"zk\d{7}q")
EXPECTED_ERRORS = {1404, 1405, 1414}  # the last: too slow, on a machine that is busy


class Asker:
    """A process of the user's that asks until the flag is set, and says when which reply held which tokens."""

    def __init__(self, instance, seed, ground, flag):
        self.instance, self.random, self.flag = instance, random.Random(seed), flag
        self.tokens, self.paths, self.share = ground.tokens(), ground.paths(), ground.share
        self.seen, self.asked, self.errors = [], [], collections.Counter()

    def run(self):
        engine = self.instance.connect()
        while not self.flag[0]:
            token = self.random.choice(self.tokens)
            command, data = self.request(token)
            begin = time.monotonic()
            reply = engine.ask(command, data)
            ended = time.monotonic()
            self.asked.append((begin, ended, token))
            found = {item.decode() for item in TOKEN.findall(reply)}
            if found:
                self.seen.append((begin, ended, found, command, data))
            else:
                result = parse(reply)
                self.errors[0 if result["success"] else result["error"]["code"]] += 1
        return self.seen, self.asked, self.errors

    def request(self, token):
        kind = self.random.random()
        if kind < 0.25:
            return "show", {"path": self.random.choice(self.paths), "text": True}
        query = token if kind < 0.5 else token[:-2] + "*" if kind < 0.6 else "passage"
        data = {"shares": ["docs"], "query": query, "offset": self.random.choice((0, 0, 0, 7)),
                "limit": self.random.choice((5, 20, 200)), "sort": self.random.choice(("relevance", "date", "name"))}
        return "search", data


class Proof:
    def __init__(self, instance, seed, askers):
        self.instance, self.random, self.askers = instance, random.Random(seed), askers
        self.share = instance.share("docs")
        self.rounds, self.leaks, self.counts, self.errors = 0, [], collections.Counter(), collections.Counter()
        self.flag = mmap.mmap(-1, 1)

    def run_batch(self, size):
        ground = Ground(self.share, self.random)
        rounds = [self.random.choice(ROUNDS)(ground, self.rounds + number) for number in range(size)]
        self.instance.sync()
        self.flag[0] = 0
        askers = [Asker(self.instance, self.random.random(), ground, self.flag) for _ in range(self.askers)]
        children = [Child(ASKER, asker.run) for asker in askers]
        self.random.shuffle(rounds)
        for one in rounds:
            one.act()
            time.sleep(self.random.choice((0, 0, 0.001, 0.004)))
        self.instance.sync()
        time.sleep(0.03)
        self.flag[0] = 1
        for child in children:
            self.judge(ground, *child.result())
        self.rounds += size
        for name in os.listdir(self.share):
            shutil.rmtree(f"{self.share}/{name}")

    def judge(self, ground, seen, asked, errors):
        self.errors += errors
        self.counts["requests"] += len(asked)
        self.counts["of hidden tokens"] += sum(ground.hidden(token, begin, ended) for begin, ended, token in asked)
        for begin, ended, tokens, command, data in seen:
            for token in tokens:
                if ground.hidden(token, begin, ended):
                    self.leaks.append(token)
                    print(f"leaked: {ground.story(token)}, {begin:.4f} to {ended:.4f}: {command} {data}", flush=True)
                else:
                    self.counts["readable tokens shown"] += 1


def main():
    given = arguments(__doc__, rounds=10000, batch=50, askers=4, seed=1)
    begin, instance = time.monotonic(), SharedInstance()
    try:
        proof = Proof(instance, given.seed, given.askers)
        while proof.rounds < given.rounds and len(proof.leaks) < 10:
            proof.run_batch(min(given.batch, given.rounds - proof.rounds))
    finally:
        instance.stop()
    refused = {code: number for code, number in proof.errors.items() if code and code not in EXPECTED_ERRORS}
    end(f"{proof.rounds} rounds, " + ", ".join(f"{number} {what}" for what, number in proof.counts.items())
        + f", refusals {dict(proof.errors)}; {len(proof.leaks)} leaked; {time.monotonic() - begin:.0f} s",
        proof.leaks or refused or not proof.counts["readable tokens shown"])


if __name__ == "__main__":
    main()
