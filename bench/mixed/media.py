"""Bytes of photos and music: true headers and tags in front of noise, which those who index do not look at."""

import struct
from xml.sax.saxutils import escape


def _noise(random, size):
    """Without the byte that begins a marker."""
    return random.randbytes(size).replace(b"\xff", b"\xfe")


def _directory(entries, begin):
    """A TIFF directory at `begin`: tag -> text, or number."""
    begin_of_data = begin + 2 + 12 * len(entries) + 4
    fields, data = struct.pack("<H", len(entries)), b""
    for tag, value in sorted(entries.items()):
        if isinstance(value, str):
            value = value.encode() + b"\0"
            place = value.ljust(4, b"\0") if len(value) <= 4 else struct.pack("<I", begin_of_data + len(data))
            data += b"" if len(value) <= 4 else value + b"\0" * (len(value) % 2)
            fields += struct.pack("<HHI", tag, 2, len(value)) + place
        else:
            fields += struct.pack("<HHII", tag, 4 if tag == 0x8769 else 3, 1, value)
    return fields + b"\0\0\0\0" + data


def _exif(make, model, description, artist):
    camera = {0x10E: description, 0x10F: make, 0x110: model, 0x112: 1, 0x13B: artist, 0x8769: 0}
    camera[0x8769] = 8 + len(_directory(camera, 8))
    shot = {0x8827: 200, 0x9003: "2023:07:14 18:20:11"}
    return b"II*\0" + struct.pack("<I", 8) + _directory(camera, 8) + _directory(shot, camera[0x8769])


def _xmp(keywords):
    items = "".join(f"<rdf:li>{escape(keyword)}</rdf:li>" for keyword in keywords)
    return ('<?xpacket begin="\ufeff" id="W5M0MpCehiHzreSzNTczkc9d"?><x:xmpmeta xmlns:x="adobe:ns:meta/"><rdf:RDF '
            'xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#"><rdf:Description rdf:about="" '
            'xmlns:dc="http://purl.org/dc/elements/1.1/"><dc:subject><rdf:Bag>' + items +
            '</rdf:Bag></dc:subject></rdf:Description></rdf:RDF></x:xmpmeta><?xpacket end="w"?>').encode()


def _segment(marker, body):
    return struct.pack(">BBH", 0xFF, marker, len(body) + 2) + body


def jpeg(random, size, make, model, description, artist, keywords):
    frame = struct.pack(">BHHB", 8, 3000, 4000, 1) + b"\x01\x11\x00"
    return b"\xff\xd8" + _segment(0xE1, b"Exif\0\0" + _exif(make, model, description, artist)) + \
        _segment(0xE1, b"http://ns.adobe.com/xap/1.0/\0" + _xmp(keywords)) + \
        _segment(0xDB, b"\0" + b"\x10" * 64) + _segment(0xC0, frame) + \
        _segment(0xC4, b"\x00" + bytes([0, 1] + [0] * 14) + b"\x00") + _segment(0xDA, b"\x01\x01\x00\x00\x3f\x00") + \
        _noise(random, size) + b"\xff\xd9"


def _id3_frame(name, text):
    body = b"\x01" + text.encode("utf-16")
    if name == "COMM":
        body = b"\x01eng" + "".encode("utf-16") + b"\0\0" + text.encode("utf-16")
    return name.encode() + struct.pack(">IH", len(body), 0) + body


def mp3(random, size, tags):
    """`tags`: title, artist, album, comment."""
    names = {"title": "TIT2", "artist": "TPE1", "album": "TALB", "comment": "COMM"}
    frames = b"".join(_id3_frame(names[name], text) for name, text in tags.items())
    length = bytes(len(frames) >> shift & 0x7F for shift in (21, 14, 7, 0))
    sound = b"\xff\xfb\x90\x64" + b"\0" * 32 + _noise(random, 381)
    return b"ID3\x03\0\0" + length + frames + sound * (size // len(sound))


def flac(random, size, tags):
    texts = [f"{name.upper()}={text}".encode() for name, text in tags.items()]
    comment = struct.pack("<I", 5) + b"maker" + struct.pack("<I", len(texts))
    comment += b"".join(struct.pack("<I", len(text)) + text for text in texts)
    rate = 44100 << 44 | 1 << 41 | 15 << 36 | 44100 * 180  # Hz, two channels, 16 bits, samples
    stream = struct.pack(">HH", 4096, 4096) + b"\0" * 6 + struct.pack(">Q", rate) + b"\0" * 16
    return b"fLaC" + b"\0" + len(stream).to_bytes(3, "big") + stream + \
        b"\x84" + len(comment).to_bytes(3, "big") + comment + b"\xff\xf8\xc9\x18" + _noise(random, size)
