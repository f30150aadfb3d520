"""Hostile pictures, sound and films."""

import struct
import zlib

from seeds import (WORD, aiff, ape, atom, chunk, dsf, element, flac, id3, id3_frame, jpeg, mkv, mp3, mp4, pack, png, png_chunk,
                   tiff, vorbis_comment, wav, webp)

MEGABYTE = 1 << 20
UNKNOWN = b"\x01" + b"\xff" * 7


def add_pictures(out):
    zeros = zlib.compress(bytes(60 * MEGABYTE), 1)
    side = 60000
    out.add("photo/large.png", png(side, side))
    out.add("photo/largest.png", png(0x7FFFFFFF, 0x7FFFFFFF))
    for name, content in {"ztxt": png_chunk(b"zTXt", b"Description\0\0" + zeros), "iccp": png_chunk(b"iCCP", b"x\0\0" + zeros),
                          "itxt": png_chunk(b"iTXt", b"XML:com.adobe.xmp\0\1\0\0\0" + zeros),
                          "exif": png_chunk(b"zTXt", b"Raw profile type exif\0\0" + zlib.compress(b"\nexif\n99999999\n" + b"ff" * MEGABYTE)),
                          "long": png_chunk(b"tEXt", b"x", 0x7FFFFFFF), "many": png_chunk(b"tEXt", b"x\0y") * 100000,
                          "empty": png_chunk(b"tEXt", b"") * 100000}.items():
        out.add(f"photo/{name}.png", png(chunks=content))
    ifd = 8
    entries = {"loop": [(34665, 4, 1, ifd)], "gps_loop": [(34853, 4, 1, ifd), (34665, 4, 1, ifd)], "sub": [(330, 4, 100000, 8)],
               "count": [(270, 2, 0x7FFFFFFF, 8)], "overflow": [(270, 12, 0x20000001, 8)], "type": [(270, 255, 9, 9)],
               "far": [(270, 2, 99, 0xFFFFFFFF)], "maker": [(271, 2, 6, 60), (34665, 4, 1, ifd), (37500, 7, 0x7FFFFFFF, 8)],
               "size": [(256, 4, 1, side), (257, 4, 1, side)], "many": [(270, 2, 4, 8)] * 65535,
               "xmp": [(700, 1, 0x7FFFFFFF, 8)], "iptc": [(33723, 7, 0x7FFFFFFF, 8)], "previews": [(330, 4, 1, ifd)] * 3000}
    for name, rows in entries.items():
        content = tiff(rows, b"Nikon\0" * 20)
        out.add(f"photo/{name}.tif", content)
        out.add(f"photo/{name}.dng", content)
        out.add(f"photo/{name}.jpg", jpeg(b"\xff\xe1" + struct.pack(">H", min(len(content) + 8, 65535)) + b"Exif\0\0" + content[:65000]))
        out.add(f"photo/{name}.webp", webp(chunk(b"EXIF", content)))
    out.add("photo/next.tif", tiff(next_ifd=8))
    out.add("photo/chain.tif", b"II*\0", pack("I", 8), *[pack("HI", 0, 8 + 6 * (i + 1)) for i in range(200000)])
    out.add("photo/large.jpg", jpeg(width=side, height=side))
    out.add("photo/large.tif", tiff([(256, 4, 1, side), (257, 4, 1, side), (258, 3, 0x7FFFFFFF, 8)]))
    icc = b"ICC_PROFILE\0\1\xff" + pack("I", 0xFFFFFFFF) * 16000
    out.add("photo/icc.jpg", jpeg(b"".join(b"\xff\xe2" + struct.pack(">H", 65535) + icc[:65533] for _ in range(255))))
    out.add("photo/segments.jpg", jpeg(b"\xff\xe1\0\2" * 500000))
    out.add("photo/photoshop.jpg", jpeg(b"\xff\xed" + struct.pack(">H", 60000) + b"Photoshop 3.0\0" + (b"8BIM\4\4\0\0" + b"\xff" * 4) * 5000))
    packet = b'<x:xmpmeta xmlns:x="adobe:ns:meta/">' + b"<a>" * 20000
    out.add("photo/deep.webp", webp(chunk(b"XMP ", packet)))
    out.add("photo/deep.jpg", jpeg(b"\xff\xe1" + struct.pack(">H", 60031) + (b"http://ns.adobe.com/xap/1.0/\0" + packet)[:60029]))
    bomb = b'<?xml version="1.0"?><!DOCTYPE a [' + b'<!ENTITY l0 "lol">' + b"".join(
        b'<!ENTITY l%d "%s">' % (i, b"&l%d;" % (i - 1) * 10) for i in range(1, 10)) + b"]><x:xmpmeta xmlns:x='adobe:ns:meta/'>&l9;</x:xmpmeta>"
    out.add("photo/billion.webp", webp(chunk(b"XMP ", bomb)))
    external = b'<!DOCTYPE a [<!ENTITY x SYSTEM "file:///etc/passwd">]><x:xmpmeta xmlns:x="adobe:ns:meta/">&x;</x:xmpmeta>'
    out.add("photo/external.webp", webp(chunk(b"XMP ", external)))
    out.add("photo/iccp.webp", webp(chunk(b"ICCP", b"x", 0xFFFFFFFE)))
    out.add("photo/chunks.webp", webp(chunk(b"JUNK", b"") * 500000))
    box = atom(b"ftyp", b"heic" + bytes(4) + b"mif1heic")
    out.add("photo/nested.heic", box, nest(b"meta", 5000, bytes(4)))
    out.add("photo/loop.heic", box, atom(b"meta", bytes(4) + atom(b"iinf", struct.pack(">IH", 0, 65535)) + atom(b"iloc", struct.pack(">IHH", 0x01000000, 0x4444, 65535))))
    item = atom(b"infe", struct.pack(">IHH", 2 << 24, 1, 0) + b"Exif\0")
    places = struct.pack(">IHH", 0, 0, 65535) + struct.pack(">HHH", 2, 0, 65535) * 65535
    out.add("photo/pieces.heic", box, atom(b"meta", bytes(4) + atom(b"iinf", struct.pack(">IH", 0, 1) + item) + atom(b"iloc", places)))
    out.add("photo/zero.heic", box, atom(b"meta", b"", 0), atom(b"free", b"", 0) * 100000)
    out.add("photo/boxes.avif", box.replace(b"heic", b"avif"), atom(b"free", b"") * 500000)
    out.add("photo/resources.psd", b"8BPS\0\1" + bytes(6) + struct.pack(">HIIHH", 3, side, side, 8, 3), struct.pack(">II", 0, 0x7FFFFFFF), b"8BIM\4\4\0\0" + b"\xff" * 4)
    out.add("photo/loop.crw", b"II" + pack("I", 26) + b"HEAPCCDR" + bytes(12), pack("HHII", 1, 0x300A, 0x7FFFFFFF, 0) * 500, pack("I", 26))
    out.add("photo/offset.cr2", b"II*\0" + pack("I", 0xFFFFFFF0) + b"CR\2\0" + bytes(999))
    out.add("photo/offset.raf", b"FUJIFILMCCD-RAW " + b"x" * 68 + b"\xff" * 200)


def nest(kind, depth, before=b""):
    content = b""
    for _ in range(depth):
        content = atom(kind, before + content)
    return content


def add_sound(out):
    out.add("sound/frame.mp3", mp3(id3(id3_frame(b"TIT2", b"\0x", 256 * MEGABYTE), 256 * MEGABYTE - 1)), size=300 * MEGABYTE)
    out.add("sound/picture.mp3", mp3(id3(id3_frame(b"APIC", b"\0image/png\0\3\0", 200 * MEGABYTE), 256 * MEGABYTE - 1)), size=300 * MEGABYTE)
    out.add("sound/frames.mp3", mp3(id3(id3_frame(b"TXXX", b"\0a\0b") * 200000)))
    out.add("sound/titles.mp3", mp3(id3(id3_frame(b"TPE1", b"\0a") * 200000)))
    out.add("sound/packed.mp3", mp3(id3(b"TIT2" + struct.pack(">I", 200000) + b"\0\x80" + struct.pack(">I", 0x7FFFFFFF) + zlib.compress(bytes(60 * MEGABYTE), 1))))
    out.add("sound/chapters.mp3", mp3(id3(id3_frame(b"CHAP", b"x\0" + bytes(16) + id3_frame(b"CHAP", b"x\0" + bytes(16)) * 999) * 20)))
    out.add("sound/tags.mp3", id3() * 50000, mp3())
    out.add("sound/junk.mp3", b"ID3" + b"\xff" * 7, b"\xff\xfb" * MEGABYTE)
    out.add("sound/sync.mp3", b"\xff" * (16 * MEGABYTE))
    out.add("sound/nosync.mp3", id3(), b"\x55\xaa" * (16 * MEGABYTE))
    out.add("sound/footer.mp3", mp3(), b"APETAGEX" + pack("IIII", 2000, 0x7FFFFFFF, 0x7FFFFFFF, 0) + bytes(8))
    out.add("sound/items.mp3", mp3(), (pack("II", 1, 0) + b"a\0x") * 100000, b"APETAGEX" + pack("IIII", 2000, 1100032, 100000, 0) + bytes(8))
    out.add("sound/comments.flac", flac(vorbis_comment([b"TITLE=x"] * 300000)))
    out.add("sound/keys.flac", flac(vorbis_comment([b"K%d=x" % i for i in range(300000)])))
    out.add("sound/count.flac", flac(vorbis_comment(count=0xFFFFFFFF)))
    out.add("sound/blocks.flac", b"fLaC", b"\1\0\0\0" * 500000)
    out.add("sound/picture.flac", b"fLaC\0\0\0\x22" + bytes(34) + b"\x86\xff\xff\xff", b"\xff" * 999, size=16 * MEGABYTE)
    page = b"OggS\0\2" + bytes(8) + pack("III", 1, 0, 0)
    out.add("sound/pages.ogg", (page + b"\0") * 200000)
    out.add("sound/lacing.ogg", (page + b"\xff" + b"\xff" * 255 + bytes(65025)) * 60)
    head = b"\1vorbis" + pack("IBIIII", 0, 2, 44100, 0, 0, 0) + b"\xb8\1"
    comments = b"\3vorbis" + pack("I", 0) + pack("I", 0xFFFFFFFF)
    out.add("sound/count.ogg", page + b"\1" + bytes([len(head)]) + head, page.replace(b"\2", b"\0") + b"\1" + bytes([len(comments)]) + comments)
    for name, content in {"lie": chunk(b"LIST", b"INFO", 0xFFFFFFFF), "odd": chunk(b"LIST", b"INFO" + chunk(b"INAM", b"x", 0xFFFFFFFF)),
                          "many": chunk(b"junk", b"") * 300000, "id3": chunk(b"id3 ", id3(length=0x0FFFFFFF)),
                          "infos": chunk(b"LIST", b"INFO" + chunk(b"INAM", b"xx") * 200000)}.items():
        out.add(f"sound/{name}.wav", wav(content))
        out.add(f"sound/{name}.avi", wav(content).replace(b"WAVE", b"AVI "))
    out.add("sound/lie.aiff", aiff(b"ANNO\x7f\xff\xff\xff"))
    out.add("sound/many.aiff", aiff((b"ANNO" + struct.pack(">I", 0)) * 300000))
    for name, place in (("far", 1 << 63), ("itself", 0), ("head", 8), ("last", (1 << 64) - 1)):
        out.add(f"sound/{name}.dsf", dsf(tag_at=place))
    out.add("sound/frame.dsf", dsf(id3(id3_frame(b"TIT2", b"\0x", 0x7FFFFFFF), 0x0FFFFFFF)), size=300 * MEGABYTE)
    out.add("sound/lie.ape", ape(b"\xff" * 76))
    out.add("sound/lie.wv", b"wvpk" + pack("IHBBIIIII", 0xFFFFFFFF, 0x410, 0, 0, 0xFFFFFFFF, 0, 0xFFFFFFFF, 0, 0), bytes(999))
    out.add("sound/blocks.wv", (b"wvpk" + pack("IHBBIIIII", 24, 0x410, 0, 0, 0xFFFFFFFF, 0, 1, 0, 0)) * 200000)
    out.add("sound/lie.mpc", b"MPCKSH" + b"\xff" * 999)
    object_id = bytes.fromhex("3026b2758e66cf11a6d900aa0062ce6c")
    out.add("sound/objects.wma", object_id + pack("QI", 0xFFFFFFFFFFFFFFFF, 0xFFFFFFFF) + b"\1\2", (bytes(16) + pack("Q", 24)) * 100000)
    out.add("sound/zero.wma", object_id + pack("QI", 30, 0x7FFFFFFF) + b"\1\2", bytes(24) * 1000)


def add_films(out):
    for extension, brand in (("mp4", b"isom"), ("m4a", b"M4A ")):
        movies = {"nested": nest(b"moov", 20000), "udta": nest(b"udta", 5000), "trak": nest(b"trak", 5000, bytes(4)),
                  "zero": atom(b"trak", b"", 0) * 1000, "one": struct.pack(">I", 1) + b"trak" + struct.pack(">Q", 0),
                  "large": struct.pack(">I", 1) + b"trak" + struct.pack(">Q", (1 << 64) - 1), "small": atom(b"trak", b"", 3) * 100000,
                  "items": atom(b"udta", atom(b"meta", bytes(4) + atom(b"ilst", atom(b"\xa9nam", atom(b"data", bytes(8) + b"x")) * 100000))),
                  "tracks": atom(b"trak", atom(b"mdia", atom(b"hdlr", bytes(8) + b"soun" + bytes(13)))) * 1000,
                  "table": atom(b"trak", atom(b"mdia", atom(b"minf", atom(b"stbl", atom(b"stsz", struct.pack(">III", 0, 0, 0xFFFFFFFF)) +
                                                                          atom(b"stts", struct.pack(">II", 0, 0xFFFFFFFF)) +
                                                                          atom(b"stsd", struct.pack(">II", 0, 0xFFFFFFFF)))))),
                  "packed": atom(b"cmov", atom(b"dcom", b"zlib") + atom(b"cmvd", struct.pack(">I", 0x7FFFFFFF) + zlib.compress(bytes(60 * MEGABYTE), 1)))}
        endless = movies.pop("table")  # the film keeps its library busy until its worker is ended: one is enough
        out.add("film/endless." + extension, mp4(endless, brand))
        for name, movie in movies.items():
            out.add(f"film/{name}.{extension}", mp4(movie, brand))
        out.add(f"film/free.{extension}", mp4(brand=brand), atom(b"free", b"") * 300000)
    info = element("1549a966", element("7ba9", WORD))
    nested = info
    for _ in range(200):
        nested = element("18538067", nested, UNKNOWN)
    tags = element("1254c367", element("7373", element("67c8", element("45a3", b"TITLE") + element("4487", b"x"))) * 20000)
    for name, segment in {"unknown": nested, "large": element("1549a966", b"", b"\x01" + b"\xff" * 6 + b"\xfe"), "tags": tags,
                          "void": element("ec", b"") * 300000, "zero": bytes(MEGABYTE), "tracks": element("1654ae6b", element("ae", element("d7", b"\1")) * 50000),
                          "seek": element("114d9b74", element("4dbb", element("53ab", b"\x11\x4d\x9b\x74") + element("53ac", bytes(8))) * 20000),
                          "attached": element("1941a469", element("61a7", element("465c", b"x", b"\x01\0\0\x7f\xff\xff\xff\xff")))}.items():
        out.add(f"film/{name}.mkv", mkv(segment))
        out.add(f"film/{name}.webm", mkv(segment).replace(b"matroska", b"webm\0\0\0\0"))
    nested_list = b"AVI "
    for _ in range(2000):
        nested_list = chunk(b"LIST", b"hdrl" + nested_list[:60000])
    out.add("film/lists.avi", chunk(b"RIFF", b"AVI " + nested_list))
    out.add("film/riffs.avi", chunk(b"RIFF", b"AVI ") * 100000)
    out.add("film/tags.flv", b"FLV\1\5\0\0\0\x09", bytes(4), (b"\x12\0\0\0" + bytes(7) + struct.pack(">I", 11)) * 200000)
    script = b"\x02\0\x0aonMetaData\x08\xff\xff\xff\xff" + b"\0\1x\x03" * 10000
    out.add("film/script.flv", b"FLV\1\5\0\0\0\x09", bytes(4), b"\x12" + struct.pack(">I", len(script))[1:] + bytes(7) + script)
    out.add("film/packets.ts", (b"\x47\x40\0\x10" + b"\0\0\xb0\xff" + b"\xff" * 180) * 20000)
    out.add("film/pids.ts", *[b"\x47" + struct.pack(">H", 0x4000 | i % 8192) + b"\x10" + bytes(184) for i in range(50000)])
    out.add("film/sync.mpg", b"\0\0\1\xba" * MEGABYTE)
    out.add("film/starts.mpg", *[b"\0\0\1" + bytes([i % 256]) + b"\xff\xff" for i in range(300000)])


def add(out):
    add_pictures(out)
    add_sound(out)
    add_films(out)
