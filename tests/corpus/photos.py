"""Pictures: what cameras, and then people, put into them.

exiftool adds texts in several languages to pictures of every format. Those as cameras and programs made them are listed.
"""

import struct
import tempfile
import zlib

import tools

GO_IMAGE, MIMETYPE = "golang-golang-x-image-dev", "golang-github-gabriel-vasile-mimetype-dev"
DONORS = [GO_IMAGE, MIMETYPE]
SAMPLES = {GO_IMAGE: "usr/share/gocode/src/golang.org/x/image/testdata",
           MIMETYPE: "usr/share/gocode/src/github.com/gabriel-vasile/mimetype/testdata"}

# Of a language: title, description, keywords, author, city, country, people.
TEXTS = {
    "russian": ("Закат над Волгой", "Вид с набережной", ["река", "вечер"],
                "Иван Шишкин", "Казань", "Россия", "Мария"),
    "japanese": ("桜の公園", "春の散歩道", ["花見", "公園"], "山田太郎", "京都", "日本", "花子"),
    "greek": ("Ηλιοβασίλεμα", "Το λιμάνι το βράδυ", ["θάλασσα", "λιμάνι"],
              "Ελένη Παππά", "Χανιά", "Ελλάδα", "Νίκος"),
}
BASES = {
    "jpg": (GO_IMAGE, "go-turns-two-280x360.jpeg"), "tif": (GO_IMAGE, "video-001.tiff"),
    "png": (GO_IMAGE, "go-turns-two-down-nn.png"), "avif": (MIMETYPE, "avif.avif"),
    "psd": (MIMETYPE, "psd.psd"), "heic": None, "dng": None, "nef": None, "gif": None,
    "jp2": None,
}


def donor(corpus, package, name):
    return corpus.donor(package, f"{SAMPLES[package]}/{name}")


def tags_of(texts):
    title, description, keywords, author, city, country, person = texts
    return [f"-XMP-dc:Title={title}", f"-XMP-dc:Description={description}", f"-XMP-dc:Creator={author}",
            *[f"-XMP-dc:Subject={word}" for word in keywords], f"-XMP-photoshop:City={city}",
            f"-XMP-photoshop:Country={country}", f"-XMP-iptcExt:PersonInImage={person}",
            "-EXIF:Make=Kamerawerk", "-EXIF:Model=K 100", "-EXIF:DateTimeOriginal=2023:07:14 18:30:00",
            "-EXIF:OffsetTimeOriginal=+02:00"]


def base(corpus, extension):
    if BASES[extension] is not None:
        return donor(corpus, *BASES[extension])
    if extension == "heic":
        return corpus.source_donor("libheif", "examples/example.heic")
    names = {"dng": "DNG.dng", "nef": "Nikon.nef", "gif": "GIF.gif", "jp2": "Jpeg2000.jp2"}
    return tools.sample(corpus, names[extension])


def webp(picture, width, height, xmp):
    """The picture with XMP, in the extended form that it then needs."""
    def chunk(name, data):
        return name + struct.pack("<I", len(data)) + data + b"\0" * (len(data) % 2)
    size = (width - 1).to_bytes(3, "little") + (height - 1).to_bytes(3, "little")
    chunks = b"WEBP" + chunk(b"VP8X", b"\4\0\0\0" + size) + picture[12:] + chunk(b"XMP ", xmp)
    return b"RIFF" + struct.pack("<I", len(chunks)) + chunks


def add_webp_with_texts(corpus):
    """Its XMP is made beside it, since exiftool does not write this format."""
    path = donor(corpus, GO_IMAGE, "blue-purple-pink.lossless.webp")
    said = tools.examine(corpus, [path])[path]
    with open(path, "rb") as file:
        picture = file.read()
    with tempfile.TemporaryDirectory() as work:
        for language, texts in TEXTS.items():
            tags = [tag for tag in tags_of(texts) if tag.startswith("-XMP")]
            tools.exiftool(corpus, [*tags, "-XMP-tiff:Model=K 200", "-o", f"{work}/{language}.xmp"])
            with open(f"{work}/{language}.xmp", "rb") as file:
                packet = file.read()
            width, height = said["ImageWidth"], said["ImageHeight"]
            corpus.add(f"webp/{language}.webp", webp(picture, width, height, packet), texts[2], {
                "KOVAMDTitle": texts[0], "KOVAMDCity": texts[4], "KOVAMDAcquisitionModel": "K 200",
                "KOVAMDPixelWidth": width, "KOVAMDPixelHeight": height})


def add_with_texts(corpus):
    with tempfile.TemporaryDirectory() as work:
        jobs = [(base(corpus, extension), f"{work}/{language}.{extension}", tags_of(texts))
                for extension in BASES for language, texts in TEXTS.items()]
        tools.write_tags(corpus, jobs)
        for extension in BASES:
            for language, texts in TEXTS.items():
                title, description, keywords, author, city, country, person = texts
                fields = {"KOVAMDTitle": title, "KOVAMDDescription": description, "KOVAMDCity": city,
                          "KOVAMDCountry": country, "KOVAMDPeopleDisplayName": person}
                if extension not in ("gif", "nef"):  # no EXIF in the one; the other keeps what it has of the camera
                    fields.update({"KOVAMDAcquisitionMake": "Kamerawerk", "KOVAMDAcquisitionModel": "K 100",
                                   "KOVAMDContentCreationDate": 1689352200})
                corpus.add(f"{extension}/{language}.{extension}", f"{work}/{language}.{extension}",
                           [*keywords, author.split()[0]], fields)


def add_older_texts(corpus):
    """Texts outside of XMP: IPTC, with and without a mark for UTF-8, comments, Windows' own, raw code pages."""
    jpeg = base(corpus, "jpg")
    with tempfile.TemporaryDirectory() as work:
        def written(name, *tags):
            tools.write_tags(corpus, [(jpeg, f"{work}/{name}", list(tags))])
            return f"{work}/{name}"
        corpus.add("jpg/iptc.jpg", written("iptc.jpg", "-IPTC:ObjectName=Mořské pobřeží", "-IPTC:City=Plzeň",
                                           "-IPTC:Keywords=léto", "-IPTC:Caption-Abstract=Dovolená u moře",
                                           "-IPTC:Country-PrimaryLocationName=Česko", "-IPTC:Sub-location=Doudlevce"),
                   ["léto", "moře"],
                   {"KOVAMDTitle": "Mořské pobřeží", "KOVAMDNamedLocation": "Doudlevce, Plzeň, Česko"})
        corpus.add("jpg/windows.jpg", written("windows.jpg", "-EXIF:XPTitle=Ausflug zum Königssee",
                                              "-EXIF:XPKeywords=Gebirge;Schiff", "-EXIF:XPComment=schönes Wetter"),
                   ["Gebirge", "Schiff"], {"KOVAMDTitle": "Ausflug zum Königssee", "KOVAMDComment": "schönes Wetter"})
        corpus.add("jpg/comment.jpg", written("comment.jpg", "-Comment=prise du vieux phare"), ["phare"])
        corpus.add("jpg/user_comment.jpg", written("user_comment.jpg", "-EXIF:UserComment=宿の窓から"), ["窓"],
                   {"KOVAMDComment": "宿の窓から"})
        plain = written("plain.jpg", "-EXIF:ImageDescription=" + "x" * 26, "-EXIF:Artist=Somebody")
        with open(plain, "rb") as file:
            old = file.read().replace(b"x" * 26, "Прогулка по берегу Финского".encode("cp1251")[:26])
        corpus.add("jpg/old_russian.jpg", old, ["берегу"])


def add_png_texts(corpus):
    """Texts of its own kinds, before and behind the picture."""
    def chunk(name, data):
        return struct.pack(">I", len(data)) + name + data + struct.pack(">I", zlib.crc32(name + data))
    with open(base(corpus, "png"), "rb") as file:
        png = file.read()
    early = chunk(b"tEXt", b"Software\0Ritprogram") + chunk(b"tEXt", "Author\0Åsa Öberg".encode("latin-1"))
    late = chunk(b"iTXt", b"Title\0\0\0sv\0\0" + "Tåget i fjällen".encode())
    corpus.add("png/texts.png", png[:33] + early + png[33:-12] + late + png[-12:], ["fjällen"], {
        "KOVAMDTitle": "Tåget i fjällen", "KOVAMDAuthors": "Åsa Öberg", "KOVAMDCreator": "Ritprogram"})


def make(corpus):
    add_with_texts(corpus)
    add_webp_with_texts(corpus)
    add_older_texts(corpus)
    add_png_texts(corpus)
