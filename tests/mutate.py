#!/usr/bin/env python3
"""Says which small faults the tests do not catch: makes one at a time in the sources, builds, and runs commands.

usage: mutate.py --target TARGET... --run COMMAND... [--build FOLDER] [--sample N] [--seed S] [--results FILE]
                 SOURCE[:FIRST-LAST]...

A fault ("mutant") is one changed token: a comparison or condition turned round, a number one higher, + for -, true for
false, a statement left out, a return at once. It is killed by a command that fails or takes over --seconds. Each command
is run and counted for itself, so that the tests before and after a cut are compared by the same mutants. What does not
compile is no mutant. Results are kept by line in FILE: those that are in it are not tried again. Sources are put back,
also after an interrupt; use a worktree in which nothing else is built meanwhile.

tests/mutate.py --target engine_tests --run 'build/release/bin/engine_tests'
    --sample 30 services/kovaelasticd/text/words.cpp
"""
import argparse
import json
import os
import pathlib
import random
import re
import signal
import subprocess
import sys

SWAPS = {" == ": " != ", " != ": " == ", " < ": " <= ", " <= ": " < ", " > ": " >= ", " >= ": " > ", " && ": " || ",
         " || ": " && ", " + ": " - ", " - ": " + ", "true": "false", "false": "true", "++": "--", " += ": " -= "}
SWAP = re.compile("|".join(rf"\b{word}\b" if word.isalpha() else re.escape(word) for word in SWAPS))
HIDDEN = re.compile(r'//.*|"(?:\\.|[^"\\])*"|\'(?:\\.|[^\'\\])\'|^\s*#.*|^\s*template.*')
STATEMENT = re.compile(r"^\s+(?!return|break|continue|using|static|const|auto|}|case|throw)[\w:.>()*\[\]-]+(\(.*\)| [-+|&]?= .*);$")
FUNCTION_BEGIN = re.compile(r"^(?!namespace|class|struct|enum|union)\S.*\) (const )?{$")


def condition_end(line, begin):
    depth = 0
    for at in range(begin, len(line)):
        depth += {"(": 1, ")": -1}.get(line[at], 0)
        if depth == 0:
            return at
    return None


def mutants_of(line):
    """(what is changed, the changed line) for each mutant of a line."""
    seen = HIDDEN.sub(lambda match: " " * len(match.group()), line)
    for match in SWAP.finditer(seen):
        yield f"{match.group().strip()} at {match.start()}", line[:match.start()] + SWAPS[match.group()] + line[match.end():]
    for match in re.finditer(r"(?<![\w.'])\d+(?![\w.'])", seen):
        yield f"{match.group()} + 1 at {match.start()}", f"{line[:match.start()]}{int(match.group()) + 1}{line[match.end():]}"
    for match in re.finditer(r"\b(?:if|while) (?=\()", seen):
        end = condition_end(seen, match.end())
        if end and ";" not in seen[match.end():end] and not re.match(r"\((?:const |auto )", seen[match.end():]):
            yield f"negated at {match.start()}", f"{line[:match.end()]}(!{line[match.end():end + 1]}){line[end + 1:]}"
    if STATEMENT.match(seen.rstrip()):
        yield "left out", line[:len(line) - len(line.lstrip())] + ";"
    if FUNCTION_BEGIN.match(seen):
        yield "returns at once", line + (" return;" if line.startswith("void ") or "::~" in line else " return {};")


def all_mutants(places):
    for place in places:
        name, _, span = place.partition(":")
        first, _, last = span.partition("-")
        lines = pathlib.Path(name).read_text(encoding="utf-8").split("\n")
        for number in range(int(first or 1), min(len(lines), int(last or first or len(lines))) + 1):
            for what, changed in mutants_of(lines[number - 1]):
                yield {"file": name, "line": number, "what": what, "was": lines[number - 1].strip()}, changed


def passes(command, seconds):
    """Whether it ends in time, with success; it and all that it started are gone then."""
    with subprocess.Popen(["bash", "-c", command], stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
                          start_new_session=True) as process:
        try:
            return process.wait(seconds) == 0
        except subprocess.TimeoutExpired:
            return False
        finally:
            if process.poll() is None:
                os.killpg(process.pid, signal.SIGKILL)


def judge(mutant, changed, options):
    """Adds to the mutant by which commands it is killed; whether it could be built."""
    source = pathlib.Path(mutant["file"])
    whole = source.read_text(encoding="utf-8")
    lines = whole.split("\n")
    lines[mutant["line"] - 1] = changed
    try:
        source.write_text("\n".join(lines), encoding="utf-8")
        if not build(options):
            return False
        mutant["killed by"] = [command for command in options.run if not passes(command, options.seconds)]
        return True
    finally:
        source.write_text(whole, encoding="utf-8")


def build(options):
    words = ["ninja", "-C", options.build, *options.target]
    return subprocess.run(words, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, check=False).returncode == 0


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("places", nargs="+")
    parser.add_argument("--target", nargs="+", required=True)
    parser.add_argument("--run", action="append", required=True)
    parser.add_argument("--build", default="build/release")
    parser.add_argument("--sample", type=int, default=30)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--seconds", type=int, default=60)
    parser.add_argument("--results", default="build/mutants.jsonl")
    options = parser.parse_args()
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(1))
    if not build(options) or not all(passes(command, options.seconds) for command in options.run):
        sys.exit("the tests must pass before there is a fault")
    results = pathlib.Path(options.results)
    tried = [json.loads(line) for line in results.read_text().splitlines()] if results.is_file() else []
    known = {(mutant["file"], mutant["line"], mutant["what"], *mutant["commands"]): mutant for mutant in tried}
    chosen = list(all_mutants(options.places))
    random.Random(options.seed).shuffle(chosen)
    done = []
    for mutant, changed in chosen:
        if len(done) == options.sample:
            break
        key = (mutant["file"], mutant["line"], mutant["what"], *options.run)
        if key not in known:
            mutant["commands"] = options.run
            judge(mutant, changed, options)
            with results.open("a", encoding="utf-8") as file:
                file.write(json.dumps(mutant) + "\n")
        mutant = known.get(key, mutant)
        if "killed by" in mutant:
            done.append(mutant)
            print(f"{len(mutant['killed by'])} of {len(options.run)} kill {mutant['file']}:{mutant['line']} {mutant['what']}", flush=True)
    build(options)
    for command in options.run:
        print(f"{sum(command in mutant['killed by'] for mutant in done)} of {len(done)} killed by: {command}")
    survivors = [mutant for mutant in done if not mutant["killed by"]]
    print(*(f"survives: {mutant['file']}:{mutant['line']} {mutant['what']}: {mutant['was']}" for mutant in survivors), sep="\n")


if __name__ == "__main__":
    main()
