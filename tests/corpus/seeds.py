"""The smallest well-formed file of each format that is easily made by hand: what hostile files are bent from, and what the
fuzzers start with. Each holds the word "zeppelin", in its text or its title.

python3 seeds.py [--fuzz] FOLDER: writes them there, as "seed.<extension>"; for the fuzzer with a line before them that
names the reader.
"""

import bz2
import gzip
import io
import lzma
import os
import struct
import sys
import tarfile
import zipfile
import zlib

WORD = b"zeppelin"
NONE, END, FAT_SECTOR = 0xFFFFFFFF, 0xFFFFFFFE, 0xFFFFFFFD


def pack(form, *values):
    return struct.pack("<" + form, *values)


def zipped(members, method=zipfile.ZIP_DEFLATED):
    """A ZIP file of (name, content) pairs."""
    target = io.BytesIO()
    with zipfile.ZipFile(target, "w", method) as file:
        for name, content in members:
            file.writestr(zipfile.ZipInfo(name), content, zipfile.ZIP_STORED if name == "mimetype" else method)
    return target.getvalue()


def tarred(members):
    target = io.BytesIO()
    with tarfile.open(fileobj=target, mode="w") as file:
        for name, content in members:
            info = tarfile.TarInfo(name)
            info.size = len(content)
            file.addfile(info, io.BytesIO(content))
    return target.getvalue()


# --- office

def relations(*rows):
    base = "http://schemas.openxmlformats.org/officeDocument/2006/relationships/"
    rows = "".join(f'<Relationship Id="r{i}" Type="{base}{kind}" Target="{target}"/>'
                   for i, (kind, target) in enumerate(rows, 1))
    return f"<Relationships>{rows}</Relationships>".encode()


CORE = b"<cp:coreProperties><dc:title>zeppelin</dc:title><dc:creator>Ada</dc:creator></cp:coreProperties>"


def docx(body=b"<w:p><w:r><w:t>zeppelin</w:t></w:r></w:p>", core=CORE, extra=()):
    main = b"<w:document><w:body>" + body + b"</w:body></w:document>"
    return zipped([("[Content_Types].xml", b"<Types/>"), *extra,
                   ("_rels/.rels", relations(("officeDocument", "word/document.xml"),
                                             ("metadata/core-properties", "docProps/core.xml"))),
                   ("docProps/core.xml", core), ("word/document.xml", main)])


def xlsx(sheet=b'<row><c t="s"><v>0</v></c><c><v>1.5</v></c></row>', texts=b"<si><t>zeppelin</t></si>"):
    return zipped([("_rels/.rels", relations(("officeDocument", "xl/workbook.xml"))),
                   ("xl/workbook.xml", b'<workbook><sheets><sheet name="One" r:id="r1"/></sheets></workbook>'),
                   ("xl/_rels/workbook.xml.rels", relations(("worksheet", "worksheets/sheet1.xml"),
                                                            ("sharedStrings", "sharedStrings.xml"))),
                   ("xl/sharedStrings.xml", b"<sst>" + texts + b"</sst>"),
                   ("xl/worksheets/sheet1.xml", b"<worksheet><sheetData>" + sheet + b"</sheetData></worksheet>")])


def pptx(slide=b"<a:p><a:r><a:t>zeppelin</a:t></a:r></a:p>"):
    return zipped([("_rels/.rels", relations(("officeDocument", "ppt/presentation.xml"))),
                   ("ppt/presentation.xml", b'<p:presentation><p:sldIdLst><p:sldId r:id="r1"/></p:sldIdLst>'
                                            b"</p:presentation>"),
                   ("ppt/_rels/presentation.xml.rels", relations(("slide", "slides/slide1.xml"))),
                   ("ppt/slides/slide1.xml", b"<p:sld>" + slide + b"</p:sld>")])


def odt(body=b"<text:p>zeppelin</text:p>"):
    return zipped([("mimetype", b"application/vnd.oasis.opendocument.text"),
                   ("meta.xml", b"<office:meta><dc:title>zeppelin</dc:title></office:meta>"),
                   ("content.xml", b"<office:body>" + body + b"</office:body>")])


def epub(spine=b'<itemref idref="a"/>', chapters=(("c1.xhtml", b"<html><p>zeppelin</p></html>"),)):
    items = b"".join(b'<item id="%c" href="%s"/>' % (97 + i, name.encode()) for i, (name, _) in enumerate(chapters))
    return zipped([("mimetype", b"application/epub+zip"),
                   ("META-INF/container.xml", b'<container><rootfile full-path="o/p.opf"/></container>'),
                   ("o/p.opf", b"<package><metadata><dc:title>zeppelin</dc:title></metadata><manifest>" + items +
                    b"</manifest><spine>" + spine + b"</spine></package>"),
                   *(("o/" + name, text) for name, text in chapters)])


def compound(streams, chain=None, header=None):
    """A compound file with these (name, content) streams; `chain` may bend the table of sectors, `header` the header."""
    sectors, table, entries = [], [], []

    def store(content):
        first = len(sectors)
        pieces = [content[at:at + 512].ljust(512, b"\0") for at in range(0, len(content), 512)]
        sectors.extend(pieces)
        table.extend(range(first + 1, first + len(pieces)))
        table.append(END)
        return first

    def entry(name, kind, first, size):
        raw = (name + "\0").encode("utf-16-le")
        return raw.ljust(64, b"\0") + pack("HBB3I16x20xIQ", len(raw), kind, 1, NONE, NONE, NONE, first, size)

    for name, content in streams:
        content = content.ljust(4096, b"\0")  # shorter ones are kept elsewhere
        entries.append(entry(name, 2, store(content), len(content)))
    directory = store(b"".join([entry("Root Entry", 5, END, 0)] + entries))
    tables = -(-(len(sectors) + 8) // 128)
    first_table = len(sectors)
    table += [FAT_SECTOR] * tables
    if chain is not None:
        chain(table, directory)
    sectors.append(b"".join(pack("I", number) for number in table).ljust(512 * tables, b"\xff"))
    lists = [first_table + i for i in range(tables)] + [NONE] * (109 - tables)
    fields = {"shift": 9, "mini_shift": 6, "directory": directory, "mini": END, "more": END, "more_count": 0,
              "lists": lists} | (header or {})
    head = (b"\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1" + bytes(16) +
            pack("HHHHH6xIIIIIIIIII", 0x3E, 3, 0xFFFE, fields["shift"], fields["mini_shift"], 0, tables,
                 fields["directory"], 0, 4096, fields["mini"], 0, fields["more"], fields["more_count"], 0)[:-4])
    return head + b"".join(pack("I", number) for number in fields["lists"]) + b"".join(sectors)


def doc(pieces=None, text=WORD + b" flies\r"):
    head = bytearray(1024)
    struct.pack_into("<HH", head, 0, 0xA5EC, 0x00C1)
    struct.pack_into("<II", head, 0x18, 1024, 1024 + len(text))
    table = b""
    if pieces is not None:
        places = b"".join(pack("I", end) for end in [0] + [end for end, _ in pieces])
        table = places + b"".join(pack("HIH", 0, place, 0) for _, place in pieces)
        table = b"\x02" + pack("I", len(table)) + table
        struct.pack_into("<II", head, 0x1A2, 0, len(table))
    return compound([("WordDocument", bytes(head) + text), ("0Table", table)])


def record(kind, content, length=None):
    return pack("HH", kind, len(content) if length is None else length) + content


def xls(records=None):
    texts = pack("II", 1, 1) + pack("HB", len(WORD), 0) + WORD
    book = record(0x0809, pack("HH", 0x0600, 5) + bytes(12)) + record(0x00FC, texts)
    book += record(0x0203, pack("HHHd", 0, 1, 0, 12.5)) if records is None else records
    return compound([("Workbook", book)])


def slide(kind, content, version=0, length=None):
    return pack("HHI", version, kind, len(content) if length is None else length) + content


def ppt(records=None):
    content = slide(0x03E8, slide(0x0FA8, WORD), 15) if records is None else records
    return compound([("PowerPoint Document", content)])


def msg():
    wide = "zeppelin".encode("utf-16-le")
    return compound([("__substg1.0_0037001F", wide), ("__substg1.0_1000001F", wide)])


# --- PDF

def stream(content, more=b""):
    return b"<</Length %d%s>>stream\n%s\nendstream" % (len(content), more, content)


def pdf(objects=None, trailer=b"", table=True, head=b"%PDF-1.5\n"):
    """Objects by their numbers; those of the smallest document where none are given for them."""
    all_objects = {1: b"<</Type/Catalog/Pages 2 0 R>>", 2: b"<</Type/Pages/Kids[3 0 R]/Count 1>>",
                   3: b"<</Type/Page/Parent 2 0 R/MediaBox[0 0 99 99]/Contents 4 0 R/Resources<</Font<</F 5 0 R>>>>>>",
                   4: stream(b"BT/F 9 Tf(zeppelin)Tj ET"), 5: b"<</Type/Font/Subtype/Type1/BaseFont/Helvetica>>",
                   6: b"<</Title(zeppelin)>>"} | (objects or {})
    out, places = bytearray(head), {}
    for number, content in sorted(all_objects.items()):
        places[number] = len(out)
        out += b"%d 0 obj%s\nendobj\n" % (number, content)
    start, count = len(out), max(places) + 1
    if table:
        out += b"xref\n0 %d\n0000000000 65535 f \n" % count
        out += b"".join(b"%010d 00000 n \n" % places.get(i, 0) for i in range(1, count))
        out += b"trailer<</Root 1 0 R/Info 6 0 R/Size %d%s>>" % (count, trailer)
    return bytes(out) + b"startxref\n%d\n%%%%EOF" % start


# --- pictures

def png_chunk(kind, content, length=None):
    return struct.pack(">I", len(content) if length is None else length) + kind + content + struct.pack(
        ">I", zlib.crc32(kind + content))


def png(width=8, height=8, chunks=None):
    text = png_chunk(b"tEXt", b"Description\0zeppelin") if chunks is None else chunks
    pixels = png_chunk(b"IDAT", zlib.compress(bytes(9 * 8)))
    return (b"\x89PNG\r\n\x1a\n" + png_chunk(b"IHDR", struct.pack(">IIBBBBB", width, height, 8, 0, 0, 0, 0)) + text +
            pixels + png_chunk(b"IEND", b""))


def tiff(entries=None, behind=b"", next_ifd=0):
    """One list of (tag, type, count, value) entries at 8."""
    text = WORD + b"\0"
    if entries is None:
        entries = [(256, 4, 1, 8), (257, 4, 1, 8), (270, 2, len(text), 8 + 2 + 3 * 12 + 4)]
        behind = text
    return (b"II*\0" + pack("I", 8) + pack("H", len(entries)) + b"".join(pack("HHII", *entry) for entry in entries) +
            pack("I", next_ifd) + behind)


def jpeg(segments=None, width=8, height=8):
    def segment(kind, content):
        return b"\xff" + bytes([kind]) + struct.pack(">H", len(content) + 2) + content
    exif = segment(0xE1, b"Exif\0\0" + tiff()) if segments is None else segments
    frame = segment(0xC0, struct.pack(">BHHB", 8, height, width, 1) + b"\x01\x11\x00")
    return b"\xff\xd8" + exif + frame + segment(0xDA, b"\x01\x01\x00\x00\x3f\x00") + b"\0\xff\xd9"


def chunk(kind, content, length=None):
    return kind + pack("I", len(content) if length is None else length) + content + b"\0" * (len(content) % 2)


def webp(chunks=None):
    frame = chunk(b"VP8X", pack("I", 8) + b"\x07\0\0\x07\0\0")
    content = b"WEBP" + frame + (chunk(b"EXIF", tiff()) if chunks is None else chunks)
    return chunk(b"RIFF", content)


# --- sound and films

def id3_frame(kind, content, length=None):
    size = len(content) if length is None else length
    return kind + struct.pack(">I", size) + b"\0\0" + content


def id3(frames=None, length=None):
    content = id3_frame(b"TIT2", b"\0" + WORD) if frames is None else frames
    size = len(content) if length is None else length
    return b"ID3\x03\0\0" + bytes((size >> shift) & 0x7F for shift in (21, 14, 7, 0)) + content


def mp3(tag=None):
    return (id3() if tag is None else tag) + (b"\xff\xfb\x90\x00" + bytes(413)) * 4


def vorbis_comment(rows=(b"TITLE=zeppelin",), count=None):
    return pack("I", 1) + b"x" + pack("I", len(rows) if count is None else count) + b"".join(
        pack("I", len(row)) + row for row in rows)


def flac(comment=None):
    def block(kind, content):
        return bytes([kind]) + struct.pack(">I", len(content))[1:] + content
    info = struct.pack(">HH", 4096, 4096) + bytes(6) + struct.pack(">Q", (44100 << 44) | (1 << 41) | (15 << 36) | 44100)
    return (b"fLaC" + block(0, info + bytes(16)) + block(0x84, vorbis_comment() if comment is None else comment) +
            b"\xff\xf8\xc9\x18" + bytes(64))


def wav(chunks=None):
    form = chunk(b"fmt ", pack("HHIIHH", 1, 1, 8000, 8000, 1, 8))
    more = chunk(b"LIST", b"INFO" + chunk(b"INAM", WORD)) if chunks is None else chunks
    return chunk(b"RIFF", b"WAVE" + form + more + chunk(b"data", bytes(800)))


def aiff(chunks=b""):
    def part(kind, content):
        return kind + struct.pack(">I", len(content)) + content
    common = part(b"COMM", struct.pack(">HIH", 1, 800, 8) + bytes.fromhex("400bfa00000000000000"))
    return part(b"FORM", b"AIFF" + common + part(b"ID3 ", id3()) + chunks + part(b"SSND", bytes(808)))


def dsf(tag=None, tag_at=92):
    tag = id3() if tag is None else tag
    return (b"DSD " + pack("QQQ", 28, 92 + len(tag), tag_at) +
            b"fmt " + pack("QIIIIIIQII", 52, 1, 0, 2, 2, 2822400, 1, 2822400, 4096, 0) + b"data" + pack("Q", 12) + tag)


def ape(fields=None):
    head = b"MAC " + pack("HHIIIIIII", 3990, 0, 52, 24, 44, 0, 0, 0, 0) + bytes(16)
    head += pack("HHIIIHHI", 2000, 0, 73728, 100, 1, 16, 2, 44100)
    return head if fields is None else head[:8] + fields


def atom(kind, content, length=None):
    return struct.pack(">I", len(content) + 8 if length is None else length) + kind + content


def mp4(movie=None, brand=b"isom"):
    title = atom(b"udta", atom(b"meta", bytes(4) + atom(b"ilst", atom(b"\xa9nam", atom(
        b"data", struct.pack(">II", 1, 0) + WORD)))))
    head = atom(b"mvhd", struct.pack(">IIIII", 0, 0, 0, 1000, 2000) + bytes(80))
    return atom(b"ftyp", brand + bytes(4) + brand) + atom(b"moov", head + title if movie is None else movie)


def element(number, content, size=None):
    """EBML; `size` as its eight bytes where it is to lie."""
    return bytes.fromhex(number) + (struct.pack(">Q", len(content) | (1 << 56)) if size is None else size) + content


def mkv(segment=None):
    head = element("1a45dfa3", element("4282", b"matroska"))
    info = element("1549a966", element("2ad7b1", b"\x0f\x42\x40") + element("7ba9", WORD))
    return head + element("18538067", info if segment is None else segment)


# --- the rest

RTF = b"{\\rtf1\\ansi{\\info{\\title zeppelin}}zeppelin {\\b flies}\\par}"
HTML = b"<html><head><title>zeppelin</title></head><body><p>zeppelin</p></body></html>"
XML = b'<?xml version="1.0"?><a><b c="d">zeppelin</b></a>'
MAIL = (b"From: Ada <ada@example.org>\r\nSubject: zeppelin\r\nMIME-Version: 1.0\r\n"
        b'Content-Type: multipart/mixed; boundary="b"\r\n\r\n--b\r\nContent-Type: text/plain\r\n\r\nzeppelin\r\n--b--\r\n')
MBOX = b"From ada@example.org Sat Jan  1 00:00:00 2022\n" + MAIL.replace(b"\r", b"") + b"\n"


def seeds():
    """Extension to bytes."""
    member = [("zeppelin.txt", WORD * 9)]
    return {"txt": WORD, "csv": b"a,b\nzeppelin,1\n", "xml": XML, "html": HTML, "svg": b"<svg><text>zeppelin</text></svg>",
            "docx": docx(), "xlsx": xlsx(), "pptx": pptx(), "odt": odt(), "epub": epub(), "doc": doc(), "xls": xls(),
            "ppt": ppt(), "msg": msg(), "rtf": RTF, "eml": MAIL, "mbox": MBOX, "pdf": pdf(), "png": png(),
            "tif": tiff(), "jpg": jpeg(), "webp": webp(), "mp3": mp3(), "flac": flac(), "wav": wav(), "aiff": aiff(),
            "dsf": dsf(), "ape": ape(), "mp4": mp4(), "m4a": mp4(brand=b"M4A "), "mkv": mkv(), "zip": zipped(member),
            "tar": tarred(member), "tar.gz": gzip.compress(tarred(member), mtime=0), "txt.xz": lzma.compress(WORD * 99),
            "txt.bz2": bz2.compress(WORD * 99)}


READERS = {"old-office": ("doc", "xls", "ppt", "msg"), "rich-text": ("rtf",), "office": ("docx", "xlsx", "pptx"),
           "open-document": ("odt",), "book": ("epub",), "mail": ("eml", "mbox"), "plain": ("txt", "csv"), "html": ("html",),
           "archive": ("zip", "tar", "tar.gz", "txt.xz", "txt.bz2"), "xml": ("xml", "svg"), "unknown": ("txt", "pdf"),
           "audio": ("mp3", "flac", "wav", "aiff", "dsf", "ape", "m4a"), "xmp": ("xmp",),
           "pdf": ("pdf",), "photo": ("png", "tif", "jpg", "webp"), "video": ("mp4", "mkv")}
PACKET = b"<rdf:RDF><dc:title><rdf:Alt><rdf:li>zeppelin</rdf:li></rdf:Alt></dc:title></rdf:RDF>"


def main():
    folder = sys.argv[-1]
    os.makedirs(folder, exist_ok=True)
    files = seeds()
    if "--fuzz" in sys.argv:
        files["xmp"] = PACKET
        files = {f"{reader}.{extension}": reader.encode() + b"\n" + files[extension]
                 for reader, extensions in READERS.items() for extension in extensions}
    for name, content in files.items():
        with open(os.path.join(folder, "seed." + name), "wb") as file:
            file.write(content)


if __name__ == "__main__":
    main()
