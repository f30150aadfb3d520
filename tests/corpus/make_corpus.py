#!/usr/bin/env python3
"""Makes the corpus, FOLDER/files, and what must be found in it, FOLDER/expected.json.

Each subject is a module beside this one with a function make(corpus), and with a list DONORS of the packages that it
takes files out of: films, photos and sound, whose files get texts in several languages, and listed, for all that is a file
elsewhere and what is known of it.
"""

import argparse
import contextlib
import fcntl
import glob
import gzip
import hashlib
import importlib
import json
import os
import shutil
import subprocess
import sys
import tempfile

import source_packages

HERE = os.path.dirname(os.path.abspath(__file__))


class MissingDonor(Exception):
    """A package, or a file of one, that cannot be had."""


class Donors:
    """Files out of Debian packages, each fetched and unpacked once; several runs may share the folder."""

    def __init__(self, folder):
        self.folder = folder
        os.makedirs(folder, exist_ok=True)

    def root(self, package):
        return os.path.join(self.folder, package)

    def fetch(self, packages):
        with locked(os.path.join(self.folder, ".lock")):
            wanted = sorted({name for name in packages if not os.path.isdir(self.root(name))})
            if not wanted:
                return
            with tempfile.TemporaryDirectory(dir=self.folder) as work:
                reasons = self.download(wanted, work)
                missing = [name for name in wanted if not self.unpack(name, work)]
        if missing:
            raise MissingDonor(f"these packages cannot be fetched: {' '.join(missing)}\n{reasons}"
                               "remedy: 'apt-get update' as root when the lists are old or missing, or a network; "
                               f"or unpack each by hand: dpkg-deb -x FILE.deb {self.folder}/PACKAGE")

    def fetch_sources(self):
        folder = os.path.join(self.folder, "sources")
        with locked(os.path.join(self.folder, ".lock")):
            problem = source_packages.fetch(folder)
        if problem:
            raise MissingDonor(problem)
        return folder

    @staticmethod
    def download(packages, folder):
        """Fetches what can be fetched; one unknown name makes apt refuse them all, so then each is tried alone."""
        def get(*names):
            return subprocess.run(["apt-get", "-qq", "-o", "APT::Sandbox::User=", "download", *names], cwd=folder,
                                  stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True, check=False)
        try:
            if get(*packages).returncode == 0:
                return ""
            return "".join(get(name).stderr for name in packages)
        except FileNotFoundError as missing:
            return f"{missing}\n"

    def unpack(self, package, folder):
        files = glob.glob(os.path.join(glob.escape(folder), f"{package}_*.deb"))
        if not files:
            return False
        made = os.path.join(folder, package)
        subprocess.run(["dpkg-deb", "-x", files[0], made], check=True)
        os.chmod(made, 0o755)
        os.rename(made, self.root(package))
        return True


class Corpus:
    """What a subject adds its files to."""

    def __init__(self, folder, donors):
        self.folder = folder
        self.donors = donors
        self.entries = []

    def add(self, path, source, words=(), fields=None, mime=None, error=None):
        """One file, path being FORMAT/NAME; source: its bytes, or the path of a file to copy.

        words: each is found by a search for it. fields: name to value, or to {"min": a, "max": b}. mime: the type that
        is told, where that is to be checked. error: the "_KOVAExtractError" it must have; none is allowed otherwise.
        """
        target = os.path.join(self.folder, "files", path)
        os.makedirs(os.path.dirname(target), exist_ok=True)
        if os.path.exists(target):
            raise ValueError(f"{path} is added twice")
        for word in words:
            if word.lower() in path.lower():
                raise ValueError(f"{path} is found by its name when {word} is searched")
        if isinstance(source, bytes):
            with open(target, "wb") as file:
                file.write(source)
        else:
            shutil.copyfile(source, target)
        entry = {"path": path, "words": list(words), "fields": fields or {}, "type": mime, "error": error}
        self.entries.append({key: value for key, value in entry.items() if value is not None})

    def donor(self, package, path):
        """The path of a file out of a package, named as the package names it."""
        self.donors.fetch([package])
        found = os.path.join(self.donors.root(package), path.lstrip("/"))
        if not os.path.isfile(found):
            raise MissingDonor(f"package {package} has no file {path}: another version of it is here; "
                               "take another file, or another package")
        return found

    def source_donor(self, package, path):
        """The path of a file out of one of source_packages.PACKAGES, as named below its topmost folder."""
        found = os.path.join(self.donors.fetch_sources(), package, path)
        if not os.path.exists(found):
            raise MissingDonor(f"source package {package} has no file {path}: another version of it is here")
        return found

    def donor_bytes(self, package, path):
        """The bytes of such a file; of a name in .gz, the unpacked ones."""
        found = self.donor(package, path)
        with gzip.open(found) if found.endswith(".gz") else open(found, "rb") as file:
            return file.read()


@contextlib.contextmanager
def locked(path):
    with open(path, "w", encoding="ascii") as file:
        fcntl.flock(file, fcntl.LOCK_EX)
        yield


def subjects():
    sys.path.insert(0, HERE)
    names = sorted(name[:-3] for name in os.listdir(HERE) if name.endswith(".py") and name != "make_corpus.py")
    modules = [importlib.import_module(name) for name in names]
    return [module for module in modules if hasattr(module, "make")]


def fingerprint():
    """Of all that decides what the corpus is."""
    digest = hashlib.sha256()
    for path in sorted(glob.glob(os.path.join(glob.escape(HERE), "*.*")) +
                       glob.glob(os.path.join(glob.escape(HERE), "samples", "*", "*"))):
        if os.path.isfile(path):
            with open(path, "rb") as file:
                digest.update(file.read())
    return digest.hexdigest()


def made_by(folder):
    try:
        with open(os.path.join(folder, "expected.json"), encoding="utf-8") as file:
            return json.load(file).get("made_by")
    except (OSError, ValueError):
        return None


def make(folder, donors):
    """Beside the folder first, so that it is whole whenever it is there."""
    new = folder + ".new"
    shutil.rmtree(new, ignore_errors=True)
    corpus = Corpus(new, donors)
    modules = subjects()
    donors.fetch([name for module in modules for name in getattr(module, "DONORS", ())])
    for module in modules:
        module.make(corpus)
    with open(os.path.join(new, "expected.json"), "w", encoding="utf-8") as file:
        json.dump({"made_by": fingerprint(), "files": corpus.entries}, file, ensure_ascii=False, indent=1)
    shutil.rmtree(folder, ignore_errors=True)
    os.rename(new, folder)
    return len(corpus.entries)


def main():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("folder", help="where the corpus is made; what is there goes")
    parser.add_argument("--donors", help="where unpacked packages are kept (default: FOLDER-donors)")
    options = parser.parse_args()
    folder = os.path.abspath(options.folder)
    os.makedirs(os.path.dirname(folder), exist_ok=True)
    with locked(folder + ".lock"):
        if made_by(folder) == fingerprint():
            print(f"{folder} is as it would be made")
            return 0
        try:
            count = make(folder, Donors(os.path.abspath(options.donors or folder + "-donors")))
        except MissingDonor as missing:
            print(f"the corpus cannot be made: {missing}", file=sys.stderr)
            return 1
    print(f"{count} files in {folder}")
    return 0


if __name__ == "__main__":
    sys.exit(main())
