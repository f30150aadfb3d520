#!/usr/bin/python3
"""What an ordinary user is answered does not depend on files that they may not read.

The same tree is made three times in instances at the same place, with the same files that the user may read, byte for byte and
second for second, and with other ones that the user may not: none, few, and many, which hold the user's words too. Each
reply to some hundred requests of all kinds must be the same, byte for byte, but for the inode's times of birth and change,
which nothing can set.

    FERROX_BIN=build/release/bin python3 -B tests/rights/leak_proof.py

--files N and --secrets N are how many files the user may read, and how many they may not where there are many; --every N
asks only every N-th request."""

import os
import random
import re
import shutil
import tempfile
import time

from asking import ACCESS, Child, SharedInstance, User, acl_bytes, arguments, end
from instance import write
from leak_requests import requests

ASKER = User(50001, [60001, 60002])
OWN = [f"{a}{b}" for a in ("ba", "ko", "lu", "me", "ri", "sta", "tor", "vi") for b in ("ran", "dex", "nolt", "pim", "sur", "gel")]
THEIRS = [f"{a}{b}" for a in ("qua", "xen", "zor", "wyn") for b in ("bral", "timo", "keth", "uria")]
GERMAN = "Das ist ein Brief an den Vermieter, in dem von {} und {} die Rede ist, und den wir noch nicht beantwortet haben."
# Some are made of words of other files of the user's, some of words that only files have which the user may not read.
COMPOUNDS = (("Kündigungsfrist", "Mietvertrag"), ("Kündigung", "Kautionskonto"), ("Fristverlängerung", "Vertragskonto"))
SYNONYMS = f"{OWN[1]}, {THEIRS[0]}, {OWN[7]}\n{THEIRS[1]} => {OWN[2]}, {THEIRS[2]}\n{OWN[3]} => {OWN[4]} {OWN[5]}\n"
INODE_TIMES = re.compile(rb'"KOVAMD(AttributeChangeDate|FSCreationDate)":\d+')
DAY = 86400


def text(rng, words, length):
    """Frequent words and rare ones."""
    return " ".join(words[int(len(words) * rng.random() ** 2)] for _ in range(length))


def make_own(share, part, files):
    """The part of the files that the user may read, with times of their own; equal in all instances."""
    rng = random.Random(part)
    write(f"{share}/{OWN[0]}/known.txt", "known " + " ".join(OWN))
    os.utime(f"{share}/{OWN[0]}/known.txt", (0, 1_400_000_000))
    write(f"{share}/{OWN[0]}/Brief{part}.txt", GERMAN.format(*COMPOUNDS[part]))
    os.utime(f"{share}/{OWN[0]}/Brief{part}.txt", (0, 1_400_000_000))
    for number in range(part, files, 3):
        stem = f"{share}/{OWN[number % 11]}/{OWN[number % 5]}/{OWN[rng.randrange(len(OWN))]}{number}"
        body = text(rng, OWN, rng.choice((0, 8, 8, 40, 400)))
        if number % 7 == 0:
            path = stem + ".html"
            write(path, f"<html><head><title>{text(rng, OWN, 3)}</title></head><body>{body}</body></html>")
        elif number % 11 == 0:
            path = stem + ".eml"
            write(path, f"From: ada@example.org\nTo: bob@example.org\nSubject: {text(rng, OWN, 2)}\n\n{body}\n")
        else:
            path = stem + rng.choice((".txt", ".txt", ".md", ".csv"))
            write(path, body)
        os.chown(path, rng.choice((0, 50001, 50002)), 60002)
        os.chmod(path, 0o644)
        os.utime(path, (0, 1_500_000_000 + number // 4 * DAY))


def make_secrets(share, part, secrets, rng):
    """Files that are shut, in folders of their own that can be read, only entered, or not even that, and among the user's."""
    for number in range(part, secrets, 3):
        words = rng.choice((OWN, THEIRS + ["frist", "vertrag", "Mietvertrag"], OWN + THEIRS + ["konto", "Kautionsfrist"]))
        kind = number % 8
        folder = (f"secret{number % 3}/{number % 17}", f"dark/{rng.choice(OWN)}", f"{OWN[number % 11]}/{OWN[number % 5]}")[
            0 if kind < 4 else 1 if kind < 7 or number > 200 else 2]
        path = f"{share}/{folder}/{rng.choice(words)}{number}s.txt"
        write(path, text(rng, words, rng.choice((5, 50, 500))))
        if folder.startswith("dark"):
            continue
        if number % 2:
            os.chmod(path, 0o600)
        else:
            os.setxattr(path, ACCESS, acl_bytes(6, 4, 4, {ASKER.uid: 0}, mask=4))
    for folder, mode in (("secret0", 0o700), ("secret1", 0o711), ("secret2", 0o750), ("dark", 0o700)):
        if os.path.isdir(f"{share}/{folder}"):
            os.chmod(f"{share}/{folder}", mode)
            for below in os.scandir(f"{share}/{folder}"):
                os.chmod(below.path, 0o711 if folder != "dark" else 0o755)


def make_past(instance, share, secrets):
    """What was deleted, and what the user could read once."""
    for number in range(secrets // 4):
        write(f"{share}/past/p{number}.txt", " ".join(OWN + THEIRS))
    write(f"{share}/{OWN[0]}/once.txt", "onceopen " + " ".join(OWN))
    instance.sync()
    shutil.rmtree(f"{share}/past", ignore_errors=True)
    os.chmod(f"{share}/{OWN[0]}/once.txt", 0o600)


def answers(root, files, secrets, asked):
    """Of an instance with so many secrets: for each request the user's reply, and root's for what the user would be told."""
    os.makedirs(root)
    instance = SharedInstance(root)
    try:
        write(f"{root}/etc/kova/synonyms.conf", SYNONYMS)
        share = instance.share("docs")
        instance.share("other")
        if secrets:
            os.chmod(instance.share("hidden"), 0o700)
            write(f"{instance.shares['hidden']}/{OWN[0]}.txt", " ".join(OWN))
        rng = random.Random(secrets)
        for part in range(3):
            make_secrets(share, part, secrets, rng)
            instance.sync()
            make_own(share, part, files)
            instance.sync()
        if secrets:
            make_past(instance, share, secrets)
        settle(instance, share)
        theirs = Child(ASKER, lambda: ask_all(instance, asked)).result()
        return theirs, ask_all(instance, asked, root=True, user=ASKER), ask_all(instance, asked, root=True)
    finally:
        instance.stop()


def settle(instance, share):
    """Folders have the same times everywhere; a change of rights lets the index see them."""
    for parent, folders, _ in os.walk(share, topdown=False):
        for folder in folders:
            os.utime(f"{parent}/{folder}", (0, 1_400_000_000))
            mode = os.stat(f"{parent}/{folder}").st_mode & 0o7777
            os.chmod(f"{parent}/{folder}", mode ^ 0o1000)
            os.chmod(f"{parent}/{folder}", mode)
    instance.sync()
    for name in instance.shares:
        data = {"doc_id_field": "KOVAMDPath", "db_name": "fileindex_" + name}
        assert instance.ask("kovaelasticd", {"command": "update_term_suggestion", "data": data})["success"]


def ask_all(instance, asked, root=False, user=None):
    """The replies' bytes; root is not to carry out what the user is refused."""
    engine = instance.connect()
    return [engine.ask(*item, user) if not root or item[0] in ("search", "show", "complete") else b"" for item in asked]


def differences(asked, replies, others, at):
    """The requests that are answered otherwise, with both replies."""
    pairs = [(item, INODE_TIMES.sub(b"", a), INODE_TIMES.sub(b"", b)) for item, a, b in zip(asked, replies, others)]
    return [(at, item, a, b) for item, a, b in pairs if a != b]


def main():
    given = arguments(__doc__, files=900, secrets=1500, every=1)
    begin = time.monotonic()
    place = tempfile.mkdtemp(prefix="fi-")
    os.chmod(place, 0o755)
    root = f"{os.path.realpath(place)}/root"
    asked = requests(f"{root}/vol/docs", OWN, THEIRS)[::given.every]
    failures, tested = [], {}
    try:
        for secrets in (0, 60, given.secrets):
            tested[secrets] = answers(root, given.files, secrets, asked)
    finally:
        shutil.rmtree(place, ignore_errors=True)
    none, none_as_them, none_root = tested[0]
    for secrets, (theirs, as_them, _) in tested.items():
        failures += differences(asked, none, theirs, f"{secrets} secrets, asked by the user")
        failures += differences(asked, none_as_them, as_them, f"{secrets} secrets, asked by root in the user's place")
    failures += differences(*zip(*(row for row in zip(asked, none, none_as_them) if row[2])), "asked by root in their place")
    for at, item, a, b in failures[:10]:
        begins = len(os.path.commonprefix([a, b])) - 150
        print(f"{at}: {item!r}\n  without {a[max(0, begins):][:400]!r}\n  with    {b[max(0, begins):][:400]!r}")
    found = sum(b'"doc_id"' in reply for reply in none)
    differ = len(differences(asked, none_root, tested[given.secrets][2], ""))
    end(f"{len(asked)} requests to trees with 0, 60 and {given.secrets} secrets, {found} of them find something, "
        f"{differ} are answered otherwise to root; {len(failures)} differences; {time.monotonic() - begin:.0f} s",
        failures or min(found, differ) < len(asked) // 3)


if __name__ == "__main__":
    main()
