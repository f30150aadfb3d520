#!/usr/bin/python3
"""What one user's flood costs others, on a live instance of root's with --files text files that everybody may read.

One process of user 50001 keeps --connections connections open to the engine, each with one of the costliest queries, and
sends the next one, or connects again, as soon as it is answered, refused or thrown out. Meanwhile user 50002 and root ask
--samples ordinary queries, one after the other on a connection each; root also on a new connection each. That is done
--rounds times in turn with the flood stopped and let go on, so that what else the machine does is in both. Printed are the
medians and the 99th percentiles of all rounds, and what became of the flood's requests.

Needs: root, a build (--build). On a machine that is busy otherwise, its work is in the times, too; so is the flood's own.
"""

import argparse
import collections
import os
import random
import selectors
import signal
import sys
import time

BENCH = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(BENCH, "..", "tests", "rights"))

VICTIM_UID, FLOOD_UID = 50002, 50001
WORDS = 5000


def fill(folder, files):
    rng = random.Random(1)
    for number in range(files):
        parent = f"{folder}/{number // 1000}/{number // 16 % 63}"
        os.makedirs(parent, exist_ok=True)
        with open(f"{parent}/file{number}.txt", "w", encoding="ascii") as file:
            file.write(" ".join(f"w{rng.randrange(WORDS)}" for _ in range(50)))


def costly(rng):
    """Each word of these begins very many; then all that is found is put in order."""
    words = " OR ".join(f"w{rng.randrange(1, 10)}*" for _ in range(40))
    return {"query": words, "limit": 1000, "offset": rng.randrange(90000)}


def usual(rng):
    words = rng.sample(range(WORDS), rng.choice((1, 1, 2)))
    return {"query": " ".join(f"w{word}" for word in words), "limit": 20}


def percentile(values, part):
    return sorted(values)[min(len(values) - 1, int(len(values) * part))]


def times_of(asking, instance, samples, connects):
    rng, times = random.Random(2), []
    engine = instance.connect()
    for _ in range(samples):
        body = asking.request("search", usual(rng))
        begin = time.monotonic()
        if connects:
            engine.close()
            engine = instance.connect()
        reply = asking.parse(engine.ask_bytes(body))
        times.append(time.monotonic() - begin)
        assert reply["success"], reply
    return times


def flood(asking, instance, connections, ready):
    """Until it is told to stop. @return how often each came: "found", a code, "closed"."""
    rng, outcomes, running = random.Random(3), collections.Counter(), [True]
    signal.signal(signal.SIGTERM, lambda *_: running.clear())
    selector = selectors.DefaultSelector()

    def connect():
        try:
            engine = instance.connect()
            engine.send(asking.request("search", costly(rng)))
            selector.register(engine.socket, selectors.EVENT_READ, engine)
        except OSError:
            outcomes["closed"] += 1

    while running:
        while running and len(selector.get_map()) < connections:
            connect()
        if ready:
            os.write(ready.pop(), b".")
        for key, _ in selector.select(0.1):
            engine = key.data
            outcome = outcome_of(asking, engine)
            outcomes[outcome] += 1
            if outcome == "closed" or not send_next(asking, engine, rng):
                selector.unregister(engine.socket)
                engine.close()
    return dict(outcomes)


def outcome_of(asking, engine):
    """A newer connection may take this one's place also in the middle of a reply."""
    try:
        answer = asking.parse(engine.receive_or_nothing())
    except ValueError:
        return "closed"
    return "found" if answer["success"] else answer["error"]["code"]


def send_next(asking, engine, rng):
    try:
        engine.send(asking.request("search", costly(rng)))
    except OSError:
        return False
    return True


def measure(asking, instance, samples):
    """The times of each who asks, in one round."""
    def ask(connects=False):
        return times_of(asking, instance, samples, connects)
    return {"another user": asking.Child(asking.User(VICTIM_UID, [VICTIM_UID]), ask).result(), "root": ask(),
            "root, connecting": ask(True)}


def measure_in_turn(asking, instance, options, attacker):
    """The times of each who asks, without and with the flood."""
    times = collections.defaultdict(list)
    for _ in range(options.rounds):
        for name, do, settle in (("alone", signal.SIGSTOP, 3), ("with the flood", signal.SIGCONT, 1)):
            os.kill(attacker, do)
            time.sleep(settle)  # what the engine works on ends within its 2 s
            for who, taken in measure(asking, instance, options.samples).items():
                times[name, who] += taken
    for (name, who), taken in times.items():
        print(f"{name:16} {who:17} p50 {percentile(taken, 0.5) * 1000:7.1f} ms  p99 {percentile(taken, 0.99) * 1000:7.1f} ms  "
              f"slowest {max(taken) * 1000:7.1f} ms", flush=True)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default=os.path.join(BENCH, "..", "build", "release"))
    for name, default in (("files", 20000), ("connections", 200), ("samples", 200), ("rounds", 5)):
        parser.add_argument("--" + name, type=int, default=default)
    options = parser.parse_args()
    os.environ["FERROX_BIN"] = os.path.realpath(os.path.join(options.build, "bin"))
    import asking  # pylint: disable=import-outside-toplevel

    instance = asking.SharedInstance()
    try:
        fill(f"{instance.root}/vol/docs", options.files)
        instance.share("docs")
        instance.sync()
        os.chmod(f"{instance.root}/var/run/kovaelasticd.sock", 0o666)
        begun, ready = os.pipe()
        attack = asking.Child(asking.User(FLOOD_UID, [FLOOD_UID]),
                              lambda: flood(asking, instance, options.connections, [ready]))
        os.read(begun, 1)
        measure_in_turn(asking, instance, options, attack.pid)
        os.kill(attack.pid, signal.SIGTERM)
        print("the flood:", ", ".join(f"{what} {count}" for what, count in attack.result().items()))
    finally:
        instance.stop()


if __name__ == "__main__":
    main()
