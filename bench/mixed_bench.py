#!/usr/bin/python3
"""Indexes a folder as people have it on a file server with libfileindex and with recollindex, and looks in both for the
words that it planted there.

Workload (bench/mixed): text, source, Markdown, CSV, HTML, PDF, office files, OpenDocument, RTF, EPUB, mail, photos with
EXIF and XMP, MP3 and FLAC with tags, archives, all generated from --seed, documents of /usr/share/doc, and with --corpus
the files of the tests' corpus. Each generated file holds words that stand nowhere else, one for each place: its text, also
in other languages and encodings, its title, the artist, the camera's model, the name of an attachment ...

Both programs index it --rounds times in turn, each time from nothing; figures are medians, and ranges in brackets: wall
seconds; processor seconds of all processes, from their start to their end; the most memory that all held together; bytes
of the index. Then both are asked for --words words of each kind and place: found is a word whose file is a hit.

Needs: a build (--build), Debian's recollcmd and what it reads formats with: python3-lxml, xsltproc, poppler-utils,
antiword, catdoc, unrtf, python3-mutagen, libimage-exiftool-perl. Without recoll, or with --no-recoll, ours alone.
"""

import argparse
import json
import os
import random
import shutil
import statistics
import subprocess
import sys
import tempfile
from urllib.parse import unquote

import indexers
from mixed.folder import make_folder

HITS_MAX = 1000
FIGURES = (("wall_s", "wall time, s", "{:.1f}"), ("cpu_s", "processor time, s", "{:.1f}"),
           ("peak_MiB", "peak memory of all processes, MiB", "{:.0f}"), ("index_MB", "index, MB", "{:.1f}"))


class Ours(indexers.Ours):
    def begin_questions(self):
        self.ctl("up")

    def hits(self, word):
        done = subprocess.run([self.tool, "--root", self.root, "search", "--json", "--limit", str(HITS_MAX), word],
                              capture_output=True, check=False)
        if done.returncode not in (0, 1):
            raise RuntimeError(done.stderr.decode())
        return {hit["doc_id"] for hit in json.loads(done.stdout)["hits"]}


class Recoll(indexers.Recoll):
    def begin_questions(self):
        pass

    def hits(self, word):
        # A word that it cannot read is an error for it.
        done = self.run("recollq", "-c", self.config, "-b", "-n", f"0-{HITS_MAX}", word, check=False)
        return {unquote(line.removeprefix("file://")) for line in done.stdout.decode(errors="replace").splitlines()}


def choose(planted, words, seed):
    """At most so many of each kind and place."""
    groups = {}
    for one in planted:
        groups.setdefault((one.kind, one.place), []).append(one)
    rng = random.Random(seed)
    return {group: rng.sample(found, min(words, len(found))) for group, found in groups.items()}


def found_words(program, questions):
    program.begin_questions()
    return {group: sum(one.path in program.hits(one.word) for one in asked) for group, asked in questions.items()}


def spread(rounds, figure, form):
    values = [one[figure] for one in rounds]
    return form.format(statistics.median(values)) + f" ({form.format(min(values))} to {form.format(max(values))})"


def show_figures(rounds):
    names = list(rounds)
    print("| | " + " | ".join(names) + " |\n|---|" + "---|" * len(names))
    for figure, title, form in FIGURES:
        print(f"| {title} | " + " | ".join(spread(rounds[name], figure, form) for name in names) + " |")
    for name in names:
        each = {program: max(one["each_MiB"].get(program, 0) for one in rounds[name])
                for program in sorted({program for one in rounds[name] for program in one["each_MiB"]})}
        largest = sorted(each.items(), key=lambda item: -item[1])[:10]
        print(f"{name}, the largest process of each program, MiB: " + ", ".join(f"{a} {b:.0f}" for a, b in largest))


def show_words(questions, found):
    names = list(found)
    print("\n| kind | words in | asked | " + " | ".join(f"{name} found" for name in names) + " |")
    print("|---|---|---|" + "---|" * len(names))
    for (kind, place), asked in questions.items():
        print(f"| {kind} | {place} | {len(asked)} | " +
              " | ".join(str(found[name][kind, place]) for name in names) + " |")
    total = sum(map(len, questions.values()))
    print(f"| all | | {total} | " + " | ".join(str(sum(found[name].values())) for name in names) + " |")


def measure(programs, folder, options):
    """Every program indexes in a scratch folder of its own; the last one's stays for the questions."""
    rounds, kept = {program.name: [] for program in programs}, []
    for _ in range(options.rounds):
        for left in kept:
            left.close()
        shutil.rmtree(f"{folder}/../scratch", ignore_errors=True)
        os.mkdir(f"{folder}/../scratch")
        kept = [program(f"{folder}/../scratch") if program is Recoll else
                program(os.path.abspath(options.build), f"{folder}/../scratch") for program in programs]
        for one in kept:
            figures = one.index(folder)
            rounds[one.name].append(figures)
            print(f"{one.name}: {figures['wall_s']:.1f} s, {figures['cpu_s']:.1f} s of processor time", file=sys.stderr)
    return rounds, kept


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default="build/release", help="build folder (default %(default)s)")
    parser.add_argument("--rounds", type=int, default=3, help="times each program indexes (default %(default)s)")
    parser.add_argument("--scale", type=float, default=1, help="of the number of files (default %(default)s)")
    parser.add_argument("--words", type=int, default=10, help="asked for of each kind and place (default %(default)s)")
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--corpus", help="folder that tests/corpus/make_corpus.py made")
    parser.add_argument("--no-recoll", action="store_true", help="measure ours alone")
    options = parser.parse_args()

    programs = [Ours]
    if not options.no_recoll:
        problem = Recoll.problem()
        print(f"recoll is not measured: {problem}" if problem else
              subprocess.run(["recollindex", "-h"], capture_output=True, text=True, check=False).stdout.split("\n")[-2])
        programs += [] if problem else [Recoll]
    scratch, kept = tempfile.mkdtemp(prefix="fi-mixed-"), []
    try:
        folder = make_folder(os.path.join(scratch, "mixed"), options.seed, options.scale, options.corpus)
        questions = choose(folder.planted, options.words, options.seed)
        print(f"{folder.files} files, {folder.bytes / 1e6:.0f} MB, seed {options.seed}", flush=True)
        rounds, kept = measure(programs, folder.path, options)
        show_figures(rounds)
        show_words(questions, {one.name: found_words(one, questions) for one in kept})
        return 0
    finally:
        for one in kept:
            one.close()
        shutil.rmtree(scratch, ignore_errors=True)


if __name__ == "__main__":
    sys.exit(main())
