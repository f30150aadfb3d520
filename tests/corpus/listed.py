"""What listed.json lists: documents, archives and texts that need no program to be made.

Each entry has "path", "words", "fields", "type" and "error" as Corpus.add has them, and says where the file is from:
"package" or "source" with the "file" in that Debian package or source package (".uu": unpacked from that), or neither for
a file that is in samples, by its path, with ".packed" behind it where `xz -9` packed it. A file may be changed: in the
text of the file, or of that "member" of a ZIP container, "replace" has what gives way to what; "added" are more members;
"encode" is the encoding that the text gets in place of UTF-8. A "note" says what is special.
"""

import binascii
import io
import json
import lzma
import os
import zipfile

HERE = os.path.dirname(os.path.abspath(__file__))

with open(os.path.join(HERE, "listed.json"), encoding="utf-8") as listed:
    ENTRIES = json.load(listed)
DONORS = sorted({entry["package"] for entry in ENTRIES if "package" in entry})


def read(path):
    with open(path, "rb") as file:
        return file.read()


def uu_decoded(text):
    """Some samples end their lines with a byte too many."""
    lines = text.splitlines()
    begin = next(i for i, line in enumerate(lines) if line.startswith(b"begin "))
    return b"".join(binascii.a2b_uu(line[:(((line[0] - 32) & 63) * 4 + 5) // 3])
                    for line in lines[begin + 1:lines.index(b"end")])


def sample(path):
    path = os.path.join(HERE, "samples", path)
    return read(path) if os.path.exists(path) else lzma.decompress(read(path + ".packed"))


def original(corpus, entry):
    if "package" in entry:
        return corpus.donor_bytes(entry["package"], entry["file"])
    if "source" in entry:
        content = read(corpus.source_donor(entry["source"], entry["file"]))
        return uu_decoded(content) if entry["file"].endswith(".uu") else content
    return sample(entry["path"])


def replaced(content, entry):
    old, new = (text.encode() for text in entry["replace"])
    if old not in content:
        raise ValueError(f"{entry['path']}: its original does not hold {old}")
    return content.replace(old, new)


def with_changed_member(content, entry):
    out = io.BytesIO()
    with zipfile.ZipFile(io.BytesIO(content)) as source, zipfile.ZipFile(out, "w", zipfile.ZIP_DEFLATED) as target:
        for name in source.namelist():
            member = source.read(name)
            target.writestr(name, replaced(member, entry) if name == entry["member"] else member)
        for name, text in entry.get("added", {}).items():
            target.writestr(name, text)
    return out.getvalue()


def make(corpus):
    for entry in ENTRIES:
        content = original(corpus, entry)
        if "member" in entry:
            content = with_changed_member(content, entry)
        elif "replace" in entry:
            content = replaced(content, entry)
        if "encode" in entry:
            content = content.decode().encode(entry["encode"], "ignore")
        corpus.add(entry["path"], content, entry.get("words", ()), entry.get("fields"), entry.get("type"), entry.get("error"))
