"""Makes a folder as people have it on a file server, and tells which words to look for."""

import csv
import email.message
import email.policy
import io
import json
import os
import random
import shutil
import tarfile
import zipfile
from collections import namedtuple

from . import documents, media
from .texts import Texts

Planted = namedtuple("Planted", "kind place path word")
SCRIPTS = ("latin", "latin", "latin", "accents", "cyrillic", "greek", "japanese", "chinese")
#: Files of each kind in a folder of scale 1.
COUNTS = {"text": 450, "text of old encodings": 60, "source": 350, "Markdown": 150, "CSV": 80, "HTML": 250, "PDF": 300,
          "DOCX": 220, "XLSX": 110, "PPTX": 70, "ODT": 110, "RTF": 70, "EPUB": 40, "mail": 400, "mailbox": 12,
          "photo": 600, "MP3": 350, "FLAC": 60, "ZIP": 40, "tar.gz": 30}
ENCODINGS = (("cyrillic", "cp1251"), ("cyrillic", "koi8-r"), ("greek", "iso8859-7"), ("japanese", "shift_jis"),
             ("chinese", "gb18030"), ("accents", "utf-16"))
COUNT_OF_MACHINE = 800
MACHINE_FILE_MAX = 4 << 20


class Folder:
    """`planted` are the words, one or several in each generated file."""

    def __init__(self, path, seed):
        self.path, self.random, self.texts = path, random.Random(seed), Texts(seed)
        self.files, self.bytes, self.planted = 0, 0, []

    def write(self, relative, data):
        path = os.path.join(self.path, relative)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "wb") as file:
            file.write(data)
        self.files, self.bytes = self.files + 1, self.bytes + len(data)
        return path

    def make(self, kind, count):
        for number in range(count):
            words = {}

            def plant(place, script="latin"):
                words[place] = self.texts.word(script)  # pylint: disable=cell-var-from-loop
                return words[place]
            name, data = MAKERS[kind](self, plant, number)
            path = self.write(f"{kind}/{number // 50}/{name}", data)
            self.planted += [Planted(kind, place, path, word) for place, word in words.items()]

    def size(self, low, high):
        """Of files, most are small."""
        return int(low * (high / low) ** self.random.random())

    def script(self, number):
        return SCRIPTS[number % len(SCRIPTS)]

    def paragraphs(self, plant, number, low, high):
        script = self.script(number)
        place = "text" if script == "latin" else "text, not English"
        return self.texts.with_word(self.size(low, high), plant(place, script), script)


def _text(folder, plant, number):
    return f"notes{number}.txt", "\n\n".join(folder.paragraphs(plant, number, 1000, 200000)).encode()


def _old_text(folder, plant, number):
    script, encoding = ENCODINGS[number % len(ENCODINGS)]
    text = "\n".join(folder.texts.with_word(folder.size(1000, 20000), plant(f"text, {encoding}", script), script))
    return f"old{number}.txt", text.encode(encoding, "replace")


def _source(folder, plant, number):
    name, mark = (("module{}.py", "# "), ("unit{}.c", "// "), ("script{}.sh", "# "))[number % 3]
    comments = folder.texts.with_word(folder.size(1000, 40000), plant("text"))
    code = "".join(f"{mark}{line}\nvalue_{i} = compute(value_{i // 2}, {i * 31 % 97});\n"
                   for i, line in enumerate(documents.lines(comments)))
    return name.format(number), code.encode()


def _markdown(folder, plant, number):
    parts = folder.paragraphs(plant, number, 1000, 40000)
    return f"readme{number}.md", (f"# {plant('title')} plan\n\n" + "\n\n## Next\n\n".join(parts)).encode()


def _csv(folder, plant, number):
    out = io.StringIO()
    rows = csv.writer(out)
    for i, line in enumerate(documents.lines(folder.paragraphs(plant, number, 10000, 400000))):
        rows.writerow([i, line[:40], line[40:], i * 997 % 1013 / 10])
    return f"table{number}.csv", out.getvalue().encode()


def _html(folder, plant, number):
    parts = "".join(f"<p class='x'>{part.replace('&', '&amp;')}</p>\n"
                    for part in folder.paragraphs(plant, number, 2000, 80000))
    style = "<style>p { margin: 1em; color: #123456 }</style>" * 10
    return f"page{number}.html", (f"<!DOCTYPE html><html><head><meta charset='utf-8'><title>{plant('title')} news</title>"
                                  f"{style}</head><body><h1>News</h1>{parts}</body></html>").encode()


def _office(make, extension, low, high):
    def maker(folder, plant, number):
        script = folder.script(number)
        title, author = plant("title", script), plant("author")
        return f"letter{number}.{extension}", make(f"Report {title}", f"Maria {author}",
                                                   folder.paragraphs(plant, number, low, high))
    return maker


def _xlsx(folder, plant, number):
    return f"sums{number}.xlsx", documents.xlsx(plant("title"), "Maria", folder.paragraphs(plant, number, 2000, 100000),
                                                plant("name of a sheet"))


def _pptx(folder, plant, number):
    return f"talk{number}.pptx", documents.pptx(plant("title"), "Maria", folder.paragraphs(plant, number, 2000, 20000),
                                                "Mind the " + plant("note"))


def _message(folder, plant, number):
    message = email.message.EmailMessage(policy=email.policy.SMTP)
    message["Subject"] = f"Re: {plant('subject', folder.script(number))} until Friday"
    message["From"] = f"Anna {plant('sender')} <anna@example.org>"
    message["To"] = "Ben Miller <ben@example.org>"
    message["Date"] = "Fri, 01 Mar 2024 12:00:00 +0100"
    message["Message-ID"] = f"<{number}.{folder.random.getrandbits(60)}@example.org>"
    paragraphs = folder.paragraphs(plant, number, 500, 20000)
    message.set_content("\n\n".join(paragraphs))
    if number % 2:
        message.add_alternative("<html><body>" + "".join(f"<p>{part}</p>" for part in paragraphs) + "</body></html>",
                                subtype="html")
    if number % 4 == 0:
        message.add_attachment("\n".join(folder.texts.with_word(3000, plant("attachment"))),
                               filename=f"{plant('name of an attachment')}.txt")
    return message.as_bytes()


def _mail(folder, plant, number):
    return f"message{number}.eml", _message(folder, plant, number)


def _mailbox(folder, plant, number):
    messages = []
    for i in range(60):
        def in_box(place, script="latin", chosen=i % 20 == 10):
            return plant(f"{place} of a message", script) if chosen else folder.texts.word(script)
        messages.append(b"From anna@example.org Fri Mar  1 12:00:00 2024\n" +
                        _message(folder, in_box, i).replace(b"\r\n", b"\n").replace(b"\nFrom ", b"\n>From ") + b"\n")
    return f"box{number}.mbox", b"".join(messages)


def _photo(folder, plant, number):
    return f"IMG_{number:04}.jpg", media.jpeg(
        folder.random, folder.size(100000, 800000), "Camera " + plant("camera maker"), "Model " + plant("camera model"),
        f"At the {plant('description', folder.script(number))} beach", "Maria " + plant("photographer"),
        ["holidays", plant("keyword", folder.script(number + 3))])


def _tags(folder, plant, number):
    script = folder.script(number)
    return {"title": f"Song of {plant('title', script)}", "artist": plant("artist", script),
            "album": plant("album"), "comment": plant("comment")}


def _mp3(folder, plant, number):
    return f"track{number}.mp3", media.mp3(folder.random, folder.size(60000, 600000), _tags(folder, plant, number))


def _flac(folder, plant, number):
    return f"track{number}.flac", media.flac(folder.random, folder.size(200000, 1000000), _tags(folder, plant, number))


def _members(folder, plant):
    inside = "\n\n".join(folder.texts.with_word(3000, plant("text of a member")))
    return [(f"pictures/{plant('name of a member')}.png", folder.random.randbytes(20000)),
            ("notes/readme.txt", inside.encode())]


def _zip(folder, plant, number):
    out = io.BytesIO()
    with zipfile.ZipFile(out, "w", zipfile.ZIP_DEFLATED) as archive:
        for name, data in _members(folder, plant):
            archive.writestr(zipfile.ZipInfo(name), data)
    return f"packed{number}.zip", out.getvalue()


def _tar(folder, plant, number):
    out = io.BytesIO()
    with tarfile.open(fileobj=out, mode="w:gz") as archive:
        for name, data in _members(folder, plant):
            member = tarfile.TarInfo(name)
            member.size = len(data)
            archive.addfile(member, io.BytesIO(data))
    return f"packed{number}.tar.gz", out.getvalue()


MAKERS = {"text": _text, "text of old encodings": _old_text, "source": _source, "Markdown": _markdown, "CSV": _csv,
          "HTML": _html, "PDF": _office(documents.pdf, "pdf", 3000, 150000),
          "DOCX": _office(documents.docx, "docx", 2000, 150000), "XLSX": _xlsx, "PPTX": _pptx,
          "ODT": _office(documents.odt, "odt", 2000, 100000), "RTF": _office(documents.rtf, "rtf", 2000, 100000),
          "EPUB": _office(documents.epub, "epub", 50000, 600000), "mail": _mail, "mailbox": _mailbox, "photo": _photo,
          "MP3": _mp3, "FLAC": _flac, "ZIP": _zip, "tar.gz": _tar}


def _add_machine(folder, source, count):
    """So many documents of this machine, as they are."""
    paths = []
    for where, folders, names in os.walk(source):
        folders.sort()
        paths += [os.path.join(where, name) for name in sorted(names)]
    usable = [path for path in paths if not os.path.islink(path) and 0 < os.path.getsize(path) <= MACHINE_FILE_MAX]
    for path in usable[::max(1, len(usable) // count)][:count]:
        with open(path, "rb") as file:
            folder.write(os.path.join("machine", os.path.relpath(path, source)), file.read())


def _add_corpus(folder, corpus, copies):
    """The files of the tests' corpus with their words, and more copies of them, which are what there is of formats that
    nobody writes any more."""
    with open(os.path.join(corpus, "expected.json"), encoding="utf-8") as file:
        listed = json.load(file)["files"]
    for entry in listed:
        with open(os.path.join(corpus, "files", entry["path"]), "rb") as file:
            data = file.read()
        kind, name = entry["path"].split("/", 1)
        for copy in range(copies):
            path = folder.write(f"corpus/{kind}/{copy}/{name}", data)
            if copy == 0:
                folder.planted += [Planted("corpus: " + kind, "text", path, word) for word in entry["words"]]


def make_folder(path, seed, scale, corpus=None, source="/usr/share/doc"):
    """@return the Folder. `corpus` is what tests/corpus/make_corpus.py made."""
    shutil.rmtree(path, ignore_errors=True)
    folder = Folder(path, seed)
    for kind, count in COUNTS.items():
        folder.make(kind, max(1, int(count * scale)))
    _add_machine(folder, source, int(COUNT_OF_MACHINE * scale))
    if corpus:
        _add_corpus(folder, corpus, max(1, int(3 * scale)))
    return folder
