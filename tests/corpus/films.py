"""Films in many containers, with texts in several languages added. Those as they are found elsewhere are listed."""

import shutil
import struct
import tempfile

import tools

MIMETYPE = "golang-github-gabriel-vasile-mimetype-dev"
DONORS = [MIMETYPE, tools.MUTAGEN]

# Of a language: title, author, genre, comment.
TEXTS = {
    "russian": ("Летние каникулы", "Ольга Крузе", "Семейное", "снято на даче"),
    "japanese": ("夏休みの思い出", "小津安二郎", "家族", "海辺で撮影"),
    "polish": ("Wakacje nad jeziorem", "Łucja Ślązak", "Rodzinny", "żeglowanie o świcie"),
}

def donor(corpus, package, name):
    if package == "exiftool":
        return tools.sample(corpus, name)
    if package == "taglib":
        return corpus.source_donor("taglib", f"tests/data/{name}")
    return corpus.donor(MIMETYPE, f"usr/share/gocode/src/github.com/gabriel-vasile/mimetype/testdata/{name}")


def add_by_mutagen(corpus, work):
    """MP4 and its relatives, WMV, Ogg."""
    names = {"mp4": ("\xa9nam", "\xa9ART", "\xa9gen", "\xa9cmt"), "wmv": ("Title", "Author", "WM/Genre", "Description"),
             "ogv": ("title", "artist", "genre", "description")}
    for package, name, extension, kind in ((MIMETYPE, "mp4.mp4", "mp4", "mp4"), (MIMETYPE, "3gp.3gp", "3gp", "mp4"),
                                           ("taglib", "blank_video.m4v", "m4v", "mp4"),
                                           ("exiftool", "ASF.wmv", "wmv", "wmv"), (MIMETYPE, "ogg.ogv", "ogv", "ogv")):
        for language, texts in TEXTS.items():
            path = f"{work}/{language}.{extension}"
            shutil.copyfile(donor(corpus, package, name), path)
            module = tools.mutagen(corpus, {"mp4": "mp4", "wmv": "asf", "ogv": "oggtheora"}[kind])
            file = {"mp4": "MP4", "wmv": "ASF", "ogv": "OggTheora"}[kind]
            film = getattr(module, file)(path)
            if film.tags is None:
                film.add_tags()
            for tag, text in zip(names[kind], texts):
                film.tags[tag] = [text]
            film.save()
            corpus.add(f"{extension}/{language}.{extension}", path, [texts[1].split()[0]], {
                "KOVAMDTitle": texts[0], "KOVAMDAuthors": texts[1], "KOVAMDMusicalGenre": texts[2],
                "KOVAMDDescription" if kind == "ogv" else "KOVAMDComment": texts[3]})


def add_of_phones(corpus, work):
    """As telephones write them: who made it, and when and where it was taken."""
    jobs = [(donor(corpus, MIMETYPE, "mov.mov"), f"{work}/{language}_phone.mov",
             ["-Keys:Make=Apple", "-Keys:Model=iPhone 13", f"-Keys:Title={texts[0]}", f"-Keys:Comment={texts[3]}",
              "-Keys:CreationDate=2022:07:14 18:30:00+02:00"]) for language, texts in TEXTS.items()]
    tools.write_tags(corpus, jobs)
    for (_, path, _), (language, texts) in zip(jobs, TEXTS.items()):
        corpus.add(f"mov/{language}.mov", path, fields={
            "KOVAMDTitle": texts[0], "KOVAMDComment": texts[3], "KOVAMDAcquisitionMake": "Apple",
            "KOVAMDAcquisitionModel": "iPhone 13", "KOVAMDContentCreationDate": 1657816200, "KOVAMDPixelWidth": 560})


def element(ident, data):
    return ident + (1 << 56 | len(data)).to_bytes(8, "big") + data


def with_matroska_tags(film, texts):
    """The film with tags where its writer left a gap."""
    gap = film.index(b"\xec\1\0\0\0\0\0\0")
    size = film[gap + 8]
    tags = b"".join(element(b"\x67\xc8", element(b"\x45\xa3", name) + element(b"\x44\x87", text.encode()))
                    for name, text in zip((b"TITLE", b"ARTIST", b"GENRE"), texts))
    made = element(b"\x12\x54\xc3\x67", element(b"\x73\x73", tags))
    rest = 9 + size - len(made)
    if rest < 9:
        raise ValueError(f"{len(made)} bytes of tags have no place in a gap of {size}")
    return film[:gap] + made + element(b"\xec", bytes(rest - 9)) + film[gap + 9 + size:]


def add_matroska(corpus):
    for extension, name in (("mkv", "mkv.mkv"), ("webm", "webm.webm")):
        with open(donor(corpus, MIMETYPE, name), "rb") as file:
            film = file.read()
        for language, (title, author, genre, _) in TEXTS.items():
            corpus.add(f"{extension}/{language}.{extension}", with_matroska_tags(film, (title, author)),
                       [author.split()[0]], {"KOVAMDTitle": title, "KOVAMDAuthors": author})


def with_flash_texts(film, texts):
    """The film with one more list of names and texts at its beginning."""
    def text(value):
        return struct.pack(">H", len(value.encode())) + value.encode()
    pairs = zip(("title", "artist", "genre", "comment"), texts)
    body = b"\2" + text("onMetaData") + b"\x08" + struct.pack(">I", 4)
    body += b"".join(text(name) + b"\2" + text(value) for name, value in pairs) + b"\0\0\x09"
    tag = b"\x12" + len(body).to_bytes(3, "big") + bytes(7) + body
    return film[:13] + tag + struct.pack(">I", len(tag)) + film[13:]


def with_avi_texts(film, texts):
    def chunk(name, data):
        return name + struct.pack("<I", len(data)) + data + b"\0" * (len(data) % 2)
    pairs = zip((b"INAM", b"IART", b"IGNR", b"ICMT"), texts)
    added = chunk(b"LIST", b"INFO" + b"".join(chunk(name, text.encode() + b"\0") for name, text in pairs))
    size = struct.unpack("<I", film[4:8])[0] + len(added)
    return film[:4] + struct.pack("<I", size) + film[8:12] + added + film[12:]


def add_flash_and_avi(corpus):
    with open(donor(corpus, MIMETYPE, "flv.flv"), "rb") as file:
        flash = file.read()
    with open(donor(corpus, "exiftool", "RIFF.avi"), "rb") as file:
        avi = file.read()
    for language, texts in TEXTS.items():
        corpus.add(f"flv/{language}.flv", with_flash_texts(flash, texts), [texts[1].split()[0]], {
            "KOVAMDTitle": texts[0], "KOVAMDMusicalGenre": texts[2], "KOVAMDComment": texts[3]})
        corpus.add(f"avi/{language}.avi", with_avi_texts(avi, texts), [texts[1].split()[0]], {
            "KOVAMDTitle": texts[0], "KOVAMDMusicalGenre": texts[2], "KOVAMDComment": texts[3],
            "KOVAMDPixelWidth": 320})


def make(corpus):
    with tempfile.TemporaryDirectory() as work:
        add_by_mutagen(corpus, work)
        add_of_phones(corpus, work)
    add_matroska(corpus)
    add_flash_and_avi(corpus)
