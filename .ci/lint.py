#!/usr/bin/env python3
"""Runs clang-tidy over sources, several at a time, and only over those that changed since it last found nothing in them.

usage: lint.py BUILD_FOLDER SOURCE...     from the top folder; BUILD_FOLDER holds compile_commands.json

A source counts as changed when it, a header of ours that it includes by any way, .clang-tidy or its compile command
differs. What was found clean is noted in BUILD_FOLDER/lint, by a digest of all that.
"""
import concurrent.futures
import functools
import hashlib
import json
import os
import pathlib
import re
import subprocess
import sys

INCLUDE = re.compile(rb'^\s*#\s*include\s+(?:"([^"]+)"|<(kova/[^>]+)>)', re.M)


@functools.cache
def includes(path):
    """The headers of ours that a file includes itself."""
    found = (ours.decode() or "platform/include/" + interface.decode()
             for ours, interface in INCLUDE.findall(pathlib.Path(path).read_bytes()))
    return [header for header in found if pathlib.Path(header).is_file()]


def with_headers(source):
    seen, waiting = {source}, [source]
    while waiting:
        new = set(includes(waiting.pop())) - seen
        seen |= new
        waiting += new
    return sorted(seen)


def digest(source, command):
    texts = [command.encode(), pathlib.Path(".clang-tidy").read_bytes()]
    texts += [pathlib.Path(path).read_bytes() for path in with_headers(source)]
    return hashlib.sha256(b"\0".join(texts)).hexdigest()


def check(source, note, build_folder):
    result = subprocess.run(["clang-tidy-14", "--quiet", "-p", build_folder, source], capture_output=True, text=True)
    if result.returncode == 0:
        note.touch()
        return True
    print(result.stdout + result.stderr, flush=True)
    return False


def main(build_folder, *sources):
    top = os.getcwd() + "/"
    entries = json.loads(pathlib.Path(build_folder, "compile_commands.json").read_text())
    commands = {entry["file"].removeprefix(top): entry["command"] for entry in entries}
    notes = pathlib.Path(build_folder, "lint")
    notes.mkdir(exist_ok=True)
    changed = {s: notes / digest(s, commands[s]) for s in sources if s in commands}
    changed = {s: note for s, note in changed.items() if not note.exists()}
    print(f"clang-tidy: {len(changed)} of {len(sources)} sources", flush=True)
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        clean = list(pool.map(lambda item: check(*item, build_folder), changed.items()))
    return 0 if all(clean) else 1


sys.exit(main(*sys.argv[1:]))
