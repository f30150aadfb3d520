"""Programs that say what is in a file, or write it there, without being installed: exiftool and mutagen."""

import importlib
import json
import os
import subprocess
import sys
import tempfile

MUTAGEN = "python3-mutagen"
EXIFTOOL = "libimage-exiftool-perl"


def exiftool(corpus, arguments):
    """Runs it with the arguments, one a line in a file."""
    with tempfile.NamedTemporaryFile("w", encoding="utf-8") as file:
        file.write("\n".join(arguments) + "\n")
        file.flush()
        done = subprocess.run(["perl", corpus.source_donor(EXIFTOOL, "exiftool"), "-@", file.name], check=False,
                              stdout=subprocess.PIPE, stderr=subprocess.PIPE)
    if not done.stdout:
        raise RuntimeError(f"exiftool: {done.stderr.decode(errors='replace')}")
    return done.stdout


def sample(corpus, name):
    """One of exiftool's own samples: real files of many cameras and programs, with little left of the picture."""
    return corpus.source_donor(EXIFTOOL, f"t/images/{name}")


def examine(corpus, paths):
    """What exiftool says of each file, in numbers rather than words."""
    said = json.loads(exiftool(corpus, ["-json", "-n", "-charset", "filename=utf8", *paths]))
    return {entry["SourceFile"]: entry for entry in said}


def write_tags(corpus, jobs):
    """Of (path of a file, target, ["-Tag=value", ...]): writes the targets, copies with these tags."""
    arguments = []
    for source, target, tags in jobs:
        arguments += ["-m", "-charset", "iptc=utf8", "-codedcharacterset=utf8", *tags, "-o", target, source, "-execute"]
    exiftool(corpus, arguments)
    for _, target, _ in jobs:
        if not os.path.isfile(target):
            raise RuntimeError(f"exiftool did not write {target}")


def mutagen(corpus, module=None):
    """The library, or one of its modules."""
    corpus.donors.fetch([MUTAGEN])
    folder = os.path.join(corpus.donors.root(MUTAGEN), "usr/lib/python3/dist-packages")
    if folder not in sys.path:
        sys.path.insert(0, folder)
    return importlib.import_module("mutagen" + (f".{module}" if module else ""))


def near(value, share=0.02):
    """A number that programs may round as they like."""
    return {"min": value * (1 - share) - 1e-9, "max": value * (1 + share) + 1e-9}
