#!/usr/bin/python3
"""Indexes one folder with libfileindex and with recollindex, and asks both the same 50 ranked queries.

Workload: the regular files of --folder (default /usr/share/doc) that are text, compressed ones unpacked, at most 1 MiB
each (more of a file is not indexed by ours, and would flatter it), copied once into a scratch folder that both index. Everything runs in one go on one machine; figures are wall and CPU seconds, peak
memory, index size on disk, and the latency of each query (ten best hits with their snippets) over a warm index.

Needs: a build (--build), and Debian's recollcmd and python3-recoll. Without them, or with --no-recoll, ours alone.
"""

import argparse
import gzip
import json
import os
import random
import re
import shutil
import socket
import statistics
import struct
import sys
import tempfile
import time

import indexers

WORD = re.compile(rb"(?<![\w.-])[a-z]{4,20}(?![\w-]|\.\w)")
TEXT_MAX_BYTES = 1 << 20
QUERY_KINDS = ("frequent", "rare", "and", "phrase", "prefix")


def text_of(path):
    """The file's text, unpacked; None when it is none."""
    try:
        data = gzip.open(path).read() if path.endswith(".gz") else open(path, "rb").read()
    except (OSError, EOFError):
        return None
    return data if 0 < len(data) <= TEXT_MAX_BYTES and b"\0" not in data[:65536] else None


def make_corpus(folder, target):
    """Copies the text files below `folder`; returns their number and bytes, and each file's words in order."""
    files, size, words = 0, 0, []
    for where, _, names in os.walk(folder):
        for name in names:
            path = os.path.join(where, name)
            data = text_of(path) if os.path.isfile(path) and not os.path.islink(path) else None
            if data is None:
                continue
            copy = os.path.join(target, os.path.relpath(path, folder)).removesuffix(".gz")
            os.makedirs(os.path.dirname(copy), exist_ok=True)
            with open(copy, "wb") as out:
                out.write(data)
            files, size = files + 1, size + len(data)
            words.append(WORD.findall(data.lower()))
    return files, size, words


def choose_queries(words, seed):
    """Ten queries of each kind, from the words that the corpus really holds."""
    rng = random.Random(seed)
    in_files = {}
    for document in words:
        for word in set(document):
            in_files[word] = in_files.get(word, 0) + 1
    by_count = sorted(in_files, key=lambda word: (-in_files[word], word))
    frequent = [word.decode() for word in by_count[:200]]
    rare = [word.decode() for word in by_count if 2 <= in_files[word] <= 5]
    long_documents = [document for document in words if len(document) > 50]
    phrases = []
    for document in rng.sample(long_documents, 10):
        at = rng.randrange(len(document) - 2)
        phrases.append('"%s %s"' % (document[at].decode(), document[at + 1].decode()))
    return {
        "frequent": rng.sample(frequent, 10),
        "rare": rng.sample(rare, 10),
        "and": ["%s %s" % tuple(rng.sample(frequent, 2)) for _ in range(10)],
        "phrase": phrases,
        "prefix": [word[:4] + "*" for word in rng.sample(frequent, 10)],
    }


def percentile(values, part):
    return sorted(values)[min(len(values) - 1, int(len(values) * part))]


class Ours(indexers.Ours):
    """Asked over the engine's socket."""

    def index(self, folder):
        figures = super().index(folder)
        self.ctl("up")
        return figures

    def ask(self, query):
        request = json.dumps({"command": "search", "data": {"id": "fileindex_corpus", "query": query, "limit": 10,
                                                            "sort": "relevance", "snippet": True}}).encode()
        with socket.socket(socket.AF_UNIX) as connection:
            connection.connect(self.socket("kovaelasticd"))
            connection.sendall(struct.pack("=I", len(request)) + request)
            stream = connection.makefile("rb")
            reply = json.loads(stream.read(struct.unpack("=I", stream.read(4))[0]))
        if not reply["success"]:
            raise RuntimeError(f"{query}: {reply['error']}")
        return reply["data"]["total"]


class Recoll(indexers.Recoll):
    """Asked through its Python module."""

    db = None

    def ask(self, query):
        from recoll import recoll  # pylint: disable=import-outside-toplevel
        if self.db is None:
            self.db = recoll.connect(confdir=self.config)
        asked = self.db.query()
        total = asked.execute(query, stemming=0)
        for document in asked.fetchmany(10):
            asked.makedocabstract(document)
        return total

    def close(self):
        self.db = None


def measure_queries(program, queries, rounds):
    """Latencies in ms by kind; each query once before, so that caches are warm, then `rounds` times."""
    latencies, answered = {}, {}
    for kind in QUERY_KINDS:
        latencies[kind], answered[kind] = [], 0
        for query in queries[kind]:
            answered[kind] += program.ask(query) > 0
            for _ in range(rounds):
                start = time.perf_counter()
                program.ask(query)
                latencies[kind].append((time.perf_counter() - start) * 1e3)
    latencies["all"] = [value for kind in QUERY_KINDS for value in latencies[kind]]
    answered["all"] = sum(answered.values())
    return {kind: {"answered": answered[kind], "p50_ms": statistics.median(values), "p99_ms": percentile(values, 0.99)}
            for kind, values in latencies.items()}


def report(name, files, index, queries):
    print(f"{name}: {index['wall_s']:.1f} s wall, {index['cpu_s']:.1f} s CPU, {files / index['wall_s']:.0f} files/s, "
          f"peak {index['peak_MiB']:.0f} MiB, index {index['index_MB']:.1f} MB")
    for kind, figures in queries.items():
        print(f"  {kind:9} p50 {figures['p50_ms']:7.2f} ms   p99 {figures['p99_ms']:7.2f} ms   "
              f"{figures['answered']} queries with hits")


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default="build/release", help="build folder (default %(default)s)")
    parser.add_argument("--folder", default="/usr/share/doc", help="where the text comes from (default %(default)s)")
    parser.add_argument("--rounds", type=int, default=5, help="times each query is asked (default %(default)s)")
    parser.add_argument("--seed", type=int, default=1, help="seed of the choice of queries (default %(default)s)")
    parser.add_argument("--no-recoll", action="store_true", help="measure ours alone")
    parser.add_argument("--json", action="store_true", help="print the figures as JSON")
    options = parser.parse_args()

    scratch = tempfile.mkdtemp(prefix="fi-bench-")
    programs = {}
    try:
        corpus = os.path.join(scratch, "corpus")
        files, size, words = make_corpus(options.folder, corpus)
        queries = choose_queries(words, options.seed)
        del words
        programs["ours"] = Ours(options.build, scratch)
        if not options.no_recoll and shutil.which("recollindex"):
            programs["recoll"] = Recoll(scratch)
        figures = {"files": files, "text_MB": size / 1e6}
        for name, program in programs.items():
            index = program.index(corpus)
            figures[name] = {"index": index, "queries": measure_queries(program, queries, options.rounds)}
        if options.json:
            print(json.dumps(figures, indent=1))
            return 0
        print(f"{files} files, {size / 1e6:.1f} MB of text, seed {options.seed}")
        for name in programs:
            report(name, files, figures[name]["index"], figures[name]["queries"])
        if "recoll" in figures:
            ours, other = figures["ours"]["index"], figures["recoll"]["index"]
            print(f"CPU: recoll / ours = {other['cpu_s'] / ours['cpu_s']:.1f}   "
                  f"index size: ours / recoll = {ours['index_MB'] / other['index_MB']:.2f}")
        return 0
    finally:
        for program in programs.values():
            program.close()
        shutil.rmtree(scratch, ignore_errors=True)


if __name__ == "__main__":
    sys.exit(main())
