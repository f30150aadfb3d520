"""Music and other sound: real recordings, with tags in several languages and of several ages. Others are listed.

How long, how fast and how wide each is, mutagen says; it also writes the tags, except those of old kinds.
"""

import shutil
import struct
import tempfile

import tools

DONORS = [tools.MUTAGEN]

# Of a language: title, artist, album, genre, composer, comment.
TAGS = {
    "russian": ("Группа крови", "Виктор Цой", "Легенда", "Рок", "Чайковский", "запись с концерта"),
    "japanese": ("戦場のメリークリスマス", "坂本龍一", "音楽図鑑", "映画音楽", "滝廉太郎", "東京公演"),
    "german": ("Größer als wir", "Die Ärzte", "Geräusch", "Müßiggang", "Händel", "für Übungen"),
}
FIELDS = ("Title", "Authors", "Album", "MusicalGenre", "Composer", "Comment")
FRAMES = ("TIT2", "TPE1", "TALB", "TCON", "TCOM")
WAV, AIFF, OGG, MP4 = "audio/x-wav", "audio/x-aiff", "audio/ogg", "audio/mp4"

# taglib's samples: name, format here, how the tags are written, the MIME type.
BASES = [
    ("xing.mp3", "mp3", "id3", "audio/mpeg"), ("silence-44-s.flac", "flac", "vorbis", "audio/flac"),
    ("test.ogg", "ogg", "vorbis", OGG), ("correctness_gain_silent_output.opus", "opus", "vorbis", OGG),
    ("empty.spx", "spx", "vorbis", OGG), ("empty_flac.oga", "oga", "vorbis", OGG), ("no-tags.m4a", "m4a", "mp4", MP4),
    ("empty_alac.m4a", "m4b", "mp4", MP4), ("empty.wav", "wav", "id3", WAV), ("empty.aiff", "aiff", "id3", AIFF),
    ("mac-399.ape", "ape", "ape", "audio/x-ape"), ("click.wv", "wv", "ape", "audio/x-wavpack"),
    ("click.mpc", "mpc", "ape", "audio/x-musepack"), ("silence-1.wma", "wma", "asf", "audio/x-ms-wma"),
    ("empty.tta", "tta", "id3", "audio/x-tta"),
]
NAMES = {
    "ape": ("Title", "Artist", "Album", "Genre", "Composer", "Comment"),
    "asf": ("Title", "Author", "WM/AlbumTitle", "WM/Genre", "WM/Composer", "Description"),
    "mp4": ("\xa9nam", "\xa9ART", "\xa9alb", "\xa9gen", "\xa9wrt", "\xa9cmt"),
    "vorbis": ("title", "artist", "album", "genre", "composer", "comment"),
}


def donor(corpus, name):
    return corpus.source_donor("taglib", f"tests/data/{name}")


def numbers_of(corpus, path):
    """The fields that say how long, how fast and how wide a sound is."""
    info = tools.mutagen(corpus).File(path).info
    fields = {}
    if getattr(info, "length", 0) > 0.1:
        fields["KOVAMDDurationSecond"] = tools.near(info.length, 0.05)
    for name, field in (("sample_rate", "AudioSampleRate"), ("channels", "AudioChannelCount")):
        if getattr(info, name, 0):
            fields["KOVAMD" + field] = getattr(info, name)
    return fields


def write_id3(corpus, path, texts, version=4, encoding=3):
    """Frames of ID3; in encoding 0 a text stands in its language's own code page, as old programs wrote it."""
    id3 = tools.mutagen(corpus, "id3")
    file = tools.mutagen(corpus).File(path)
    if file.tags is None:
        file.add_tags()
    file.tags.clear()
    for name, text in zip(FRAMES, texts):
        file.tags.add(getattr(id3, name)(encoding=encoding, text=[text]))
    file.tags.add(id3.COMM(encoding=encoding, lang="und", desc="", text=[texts[5]]))
    file.tags.add(id3.TRCK(encoding=0, text=["7/12"]))
    file.tags.add(id3.TDRC(encoding=0, text=["1988"]))
    if version == 3:
        file.tags.update_to_v23()
    file.save(**({} if path.endswith((".tta", ".dsf")) else {"v2_version": version}))


def write_tags(corpus, path, how, texts):
    if how == "id3":
        return write_id3(corpus, path, texts)
    file = tools.mutagen(corpus).File(path)
    if file.tags is None:
        file.add_tags()
    for name, text in zip(NAMES[how], texts):
        file.tags[name] = [text]
    numbers = {"ape": ("Track", "Year", "7", "1988"), "asf": ("WM/TrackNumber", "WM/Year", "7", "1988"),
               "mp4": ("trkn", "\xa9day", (7, 12), "1988"), "vorbis": ("tracknumber", "date", "7", "1988")}[how]
    file.tags[numbers[0]], file.tags[numbers[1]] = [numbers[2]], [numbers[3]]
    return file.save()


def expected(texts):
    fields = {"KOVAMD" + name: text for name, text in zip(FIELDS, texts)}
    return dict(fields, KOVAMDAudioTrackNumber=7, KOVAMDRecordingYear=1988)


def add_with_tags(corpus, work):
    for name, extension, how, mime in BASES:
        for language, texts in TAGS.items():
            path = f"{work}/{language}.{extension}"
            shutil.copyfile(donor(corpus, name), path)
            write_tags(corpus, path, how, texts)
            corpus.add(f"{extension}/{language}.{extension}", path, [texts[1].split()[-1]],
                       dict(numbers_of(corpus, path), **expected(texts)), mime=mime)


def id3_1(texts, code_page):
    """The oldest tag: 128 bytes at the end, of no known encoding."""
    title, artist, album, _, _, comment = [text.encode(code_page)[:28] for text in texts]
    return struct.pack("<3s30s30s30s4s28sBBB", b"TAG", title, artist, album, b"1988", comment, 0, 7, 17)


def without_tags(corpus, work):
    path = f"{work}/plain.mp3"
    shutil.copyfile(donor(corpus, "xing.mp3"), path)
    tools.mutagen(corpus, "id3").delete(path)
    return path


def add_old_tags(corpus, work):
    plain = without_tags(corpus, work)
    with open(plain, "rb") as file:
        frames = file.read()
    for language, code_page in (("russian", "cp1251"), ("japanese", "cp932"), ("german", "latin-1")):
        texts = TAGS[language]
        title = texts[0].encode(code_page)[:28].decode(code_page, "ignore")
        corpus.add(f"mp3/first_{language}.mp3", frames + id3_1(texts, code_page), fields={
            "KOVAMDTitle": title, "KOVAMDAuthors": texts[1], "KOVAMDAudioTrackNumber": 7, "KOVAMDRecordingYear": 1988,
            "KOVAMDMusicalGenre": "Rock"})
        path = f"{work}/raw_{language}.mp3"
        shutil.copyfile(plain, path)
        write_id3(corpus, path, [text.encode(code_page).decode("latin-1") for text in texts], 3, 0)
        corpus.add(f"mp3/raw_{language}.mp3", path, fields=expected(texts))
        path = f"{work}/wide_{language}.mp3"
        shutil.copyfile(plain, path)
        write_id3(corpus, path, texts, 3, 1)
        corpus.add(f"mp3/wide_{language}.mp3", path, [texts[1].split()[-1]], expected(texts))
    path = f"{work}/chinese.mp3"
    shutil.copyfile(plain, path)
    texts = ("青花瓷", "周杰伦", "我很忙", "流行音乐", "方文山", "现场录音")
    write_id3(corpus, path, [text.encode("gbk").decode("latin-1") for text in texts], 3, 0)
    corpus.add("mp3/raw_chinese.mp3", path, fields=expected(texts))


def make(corpus):
    with tempfile.TemporaryDirectory() as work:
        add_with_tags(corpus, work)
        add_old_tags(corpus, work)
