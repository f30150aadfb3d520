#!/usr/bin/python3
"""Asks queries with known answers, and tells how well libfileindex finds them beside plain SQLite FTS5 and Recoll.

The set (bench/quality/debian_set.py): manual pages and docs of some 130 Debian packages, downloaded once into --debs by
apt-get (about 150 MB), unpacked and never installed; without a network nothing is measured. Queries are derived by rule
and --seed: lines of description, which are taken out of the indexed copy; names with one more word; words with a wrong
letter. Other documents may answer a query as well and count as misses: compare programs, not levels.

Figures by kind of query: MRR@10 (the mean of 1 / rank of the first right answer, 0 behind the tenth), found@10 (how often
one is among ten), p50 and p99 of the time until the ten paths are there. Programs:
    ours      a private instance of --build, asked by its socket
    FTS5      a table of name, title and text, stemmed by porter; any of the words, by bm25 with weights 2, 4, 1
    recoll    its own defaults; all words, and any of them; needs Debian's recollcmd and python3-recoll
"""

import argparse
import json
import os
import re
import shutil
import socket
import sqlite3
import statistics
import struct
import sys
import tempfile
import time

import indexers
from quality import debian_set

SKIPPED = 77


class Ours(indexers.Ours):
    def __init__(self, build, scratch, corpus):
        super().__init__(build, scratch)
        self.corpus = corpus
        self.figures = self.index(corpus)
        self.ctl("up")
        self.stream = socket.socket(socket.AF_UNIX)  # for as long as the questions: the engine closes idle ones
        self.stream.connect(self.socket("kovaelasticd"))

    def ask(self, text):
        request = json.dumps({"command": "search", "data": {"id": "fileindex_corpus", "query": text, "limit": 10,
                                                            "snippet": False}}).encode()
        self.stream.sendall(struct.pack("=I", len(request)) + request)
        reply = json.loads(self._take(struct.unpack("=I", self._take(4))[0]))
        return [hit["doc_id"] for hit in reply["data"]["hits"]] if reply["success"] else []

    def _take(self, size):
        taken = b""
        while len(taken) < size:
            piece = self.stream.recv(size - len(taken))
            if not piece:
                raise RuntimeError("the engine closed the connection")
            taken += piece
        return taken


class Fts5:
    """A few lines, such as everybody can write."""

    def __init__(self, scratch, corpus):
        self.db = sqlite3.connect(f"{scratch}/fts5.sqlite")
        self.db.execute("CREATE VIRTUAL TABLE t USING fts5(path UNINDEXED, name, title, body, tokenize='porter unicode61')")
        for where, _, names in os.walk(corpus):
            for name in names:
                path = os.path.join(where, name)
                self.db.execute("INSERT INTO t VALUES(?, ?, ?, ?)", (path, name, *self._title_and_text(path)))
        self.db.commit()

    @staticmethod
    def _title_and_text(path):
        data = debian_set.read(path)
        if b"\0" in data:
            return "", ""
        page = debian_set.parse_page(path, data) if "/man/" in path else None
        text = data.decode("utf-8", "replace")
        if "/man/" in path:
            text = debian_set.plain(re.sub(r"(?m)^[.'](?:\\\".*|[A-Za-z]{1,2}\b)", "", text))
        elif ".htm" in path:
            text = re.sub(r"<[^>]*>", " ", text)
        if page is not None:
            return " ".join(page.names) + " " + page.description, text
        return next((line.strip()[:200] for line in text.split("\n") if line.strip()), ""), text

    def ask(self, text):
        words = " OR ".join(f'"{word}"' for word in re.findall(r"\w+", text))
        rows = self.db.execute("SELECT path FROM t WHERE t MATCH ? ORDER BY bm25(t, 0, 2, 4, 1) LIMIT 10", (words,))
        return [row[0] for row in rows]

    def close(self):
        self.db.close()


class Recoll(indexers.Recoll):
    """Asked through its Python module. It is told that the corpus has manual pages where /usr/share/man has them."""

    MIMEMAP = "/usr/share/recoll/examples/mimemap"
    settings = "noaspell = 1\n"

    def __init__(self, scratch, corpus):
        super().__init__(scratch)
        with open(self.MIMEMAP, encoding="utf-8") as file:
            pages = re.search(r"^\[/usr/share/man\]\n([^\[]*)", file.read(), re.M)
        with open(f"{self.config}/mimemap", "w", encoding="utf-8") as file:
            file.write(f"[{corpus}/usr/share/man]\n{pages[1] if pages else ''}")
        self.figures = self.index(corpus)
        from recoll import recoll  # pylint: disable=import-outside-toplevel
        self.db = recoll.connect(confdir=self.config)

    @staticmethod
    def problem():
        try:
            from recoll import recoll  # noqa: F401 pylint: disable=import-outside-toplevel,unused-import
        except ImportError:
            return "no Python module recoll; install Debian's python3-recoll"
        return indexers.Recoll.problem()

    def ask(self, text, joined_by=" "):
        asked = self.db.query()
        asked.execute(joined_by.join(re.findall(r"\w+", text.lower())), stemming=1)
        return [document.url.removeprefix("file://") for document in asked.fetchmany(10)]

    def ask_any(self, text):
        return self.ask(text, " OR ")

    def close(self):
        self.db = None


def measure(ask, queries, corpus):
    """Figures by kind. Each query is asked once before the time is taken, so that caches are warm for all alike."""
    rows = {}
    for query in queries:
        ask(query.text)
        start = time.perf_counter()
        paths = ask(query.text)
        took = (time.perf_counter() - start) * 1e3
        hits = [os.path.relpath(path, corpus) for path in paths]
        rank = next((i + 1 for i, hit in enumerate(hits) if hit in query.relevant), 0)
        rows.setdefault(query.kind, []).append((rank, took))
    figures = {}
    for kind, values in rows.items():
        times = sorted(took for _, took in values)
        figures[kind] = {"n": len(values), "mrr": statistics.mean(1 / rank if rank else 0 for rank, _ in values),
                         "found": statistics.mean(rank > 0 for rank, _ in values),
                         "p50_ms": statistics.median(times), "p99_ms": times[min(len(times) - 1, int(len(times) * 0.99))]}
    return figures


def report(figures):
    kinds = list(next(iter(figures.values())))
    print("| MRR@10 (found@10), p50 / p99 ms | " + " | ".join(f"{kind}, {figures['ours'][kind]['n']}" for kind in kinds) + " |")
    print("|---" * (len(kinds) + 1) + "|")
    for name, by_kind in figures.items():
        print(f"| {name} | " + " | ".join(f"{row['mrr']:.3f} ({row['found']:.2f}), {row['p50_ms']:.1f} / {row['p99_ms']:.1f}"
                                          for row in by_kind.values()) + " |", flush=True)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default="build/release", help="build folder (default %(default)s)")
    parser.add_argument("--debs", help="where packages are kept (default: downloaded anew)")
    parser.add_argument("--packages", type=int, default=len(debian_set.PACKAGES), help="use the first N alone")
    parser.add_argument("--queries", type=int, default=300, help="at most so many of a kind (default %(default)s)")
    parser.add_argument("--seed", type=int, default=1, help="of the choice of queries (default %(default)s)")
    parser.add_argument("--no-recoll", action="store_true", help="measure ours and FTS5 alone")
    parser.add_argument("--misses", metavar="KIND", help="print ours' queries of this kind that find nothing among ten")
    parser.add_argument("--json", action="store_true", help="print the figures as JSON")
    options = parser.parse_args()

    scratch = tempfile.mkdtemp(prefix="fi-quality-")
    programs, figures, misses = [], {}, []
    try:
        debs = debian_set.download(os.path.abspath(options.debs or f"{scratch}/debs"), options.packages)
        if len(debs) < options.packages / 2:
            print(f"skipped: apt-get downloads {len(debs)} of {options.packages} packages; is there a network?")
            return SKIPPED
        corpus = f"{scratch}/corpus"
        queries = debian_set.make_set(debs, corpus, options.queries, options.seed)
        programs.append(Ours(options.build, scratch, corpus))
        figures["ours"] = measure(programs[-1].ask, queries, corpus)
        if options.misses:
            misses = [query for query in queries if query.kind == options.misses and not query.relevant
                      & {os.path.relpath(hit, corpus) for hit in programs[-1].ask(query.text)}]
        programs.append(Fts5(scratch, corpus))
        figures["FTS5"] = measure(programs[-1].ask, queries, corpus)
        problem = "told so" if options.no_recoll else Recoll.problem()
        if problem:
            print(f"recoll is not measured: {problem}", file=sys.stderr)
        else:
            programs.append(Recoll(scratch, corpus))
            figures["recoll, all words"] = measure(programs[-1].ask, queries, corpus)
            figures["recoll, any"] = measure(programs[-1].ask_any, queries, corpus)
        if options.json:
            print(json.dumps(figures, indent=1))
        else:
            files = sum(len(names) for _, _, names in os.walk(corpus))
            print(f"{files} files of {len(debs)} packages, {len(queries)} queries, seed {options.seed}")
            report(figures)
        for query in misses:
            print(f"{query.text}\t{'|'.join(sorted(query.relevant))}")
        return 0
    finally:
        for program in programs:
            program.close()
        shutil.rmtree(scratch, ignore_errors=True)


if __name__ == "__main__":
    sys.exit(main())
