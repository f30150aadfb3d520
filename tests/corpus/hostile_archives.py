"""Hostile archives and packed files."""

import bz2
import gzip
import io
import lzma
import struct
import tarfile
import zipfile
import zlib

from seeds import WORD, pack, tarred, zipped

MEGABYTE = 1 << 20


def local(name, packed, size, method=8):
    return b"PK\3\4" + pack("HHHHHIIIHH", 20, 0, method, 0, 0, 0, len(packed), size, len(name), 0) + name + packed


def central(name, packed_size, size, offset, method=8):
    return b"PK\1\2" + pack("HHHHHHIIIHHHHHII", 20, 20, 0, method, 0, 0, 0, packed_size, size, len(name), 0, 0, 0, 0, 0,
                            offset) + name


def directory_end(count, size, offset):
    return b"PK\5\6" + pack("HHHHIIH", 0, 0, count & 0xFFFF, count & 0xFFFF, size, offset, 0)


def overlapping(count):
    """Many members that are all the same packed bytes."""
    packer = zlib.compressobj(9, zlib.DEFLATED, -15)
    packed = packer.compress(bytes(20 * MEGABYTE)) + packer.flush()
    names = [b"word/document.xml"] + [b"m%d" % i for i in range(count - 1)]
    start = local(names[0], packed, 20 * MEGABYTE)
    rows = b"".join(central(name, len(packed), 20 * MEGABYTE, 0) for name in names)
    return start + rows + directory_end(count, len(rows), len(start))


def add_zip(out):
    bomb = zipped([("zeros", bytes(16 * MEGABYTE))])
    for _ in range(4):
        bomb = zipped([(f"nested{i}.zip", bomb) for i in range(8)], zipfile.ZIP_STORED if len(bomb) < 4096 else zipfile.ZIP_DEFLATED)
    out.add("zip/nested.zip", bomb)
    for extension in ("zip", "docx", "odt", "epub", "jar"):
        out.add(f"zip/overlapping.{extension}", overlapping(20000))
        out.add(f"zip/one_huge.{extension}", zipped([("word/document.xml", bytes(64 * MEGABYTE))]))
    many = io.BytesIO()
    with zipfile.ZipFile(many, "w") as file:
        for i in range(20000):
            file.writestr(zipfile.ZipInfo(f"{i}"), b"")
    out.add("zip/many.zip", many.getvalue())
    itself = local(b"r.zip", b"", 0, 0)
    row = central(b"r.zip", 2147483647, 2147483647, 0, 0)
    out.add("zip/itself.zip", itself, row, directory_end(1, len(row), 0))  # the directory begins at the member
    out.add("zip/loop.zip", itself, row * 3, directory_end(65535, 0xFFFFFFFF, 0))
    out.add("zip/far.zip", itself, central(b"r.zip", 9, 9, 0xFFFFFFF0), directory_end(1, 51, len(itself)))
    ends = b"PK\6\6" + pack("QHHIIQQQQ", 44, 45, 45, 0, 0, 1 << 62, 1 << 62, 1 << 62, 0)
    out.add("zip/zip64.zip", itself, ends, b"PK\6\7" + pack("IQI", 0, len(itself), 1), directory_end(65535, 0xFFFFFFFF, 0xFFFFFFFF))
    out.add("zip/ends.zip", itself, directory_end(1, 9, 0) * 100000)
    names = [("../" * 20000 + "etc/passwd", WORD), ("/etc/passwd", WORD), ("a\0b", WORD), ("x" * 65000, WORD), ("\x1b[2J\r\n", WORD)]
    out.add("zip/names.zip", zipped(names))
    digits = [("9" * 30000 + f"{i}", b"") for i in range(60)]
    out.add("zip/digits.zip", zipped(digits))


def add_tar(out):
    out.add("tar/empty_members.tar", tarfile.TarInfo("x").tobuf() * 100000)
    thousand = bz2.compress(tarfile.TarInfo("x").tobuf() * 1000)
    out.add("tar/million.tar.bz2", thousand * 1000)
    for name, size in (("huge", 1 << 62), ("negative", -1), ("most", (1 << 63) - 1)):
        header = bytearray(tarfile.TarInfo("x").tobuf(tarfile.GNU_FORMAT))
        header[124:136] = b"\x80" + bytes(3) + struct.pack(">q", size) if size >= 0 else b"\xff" * 12
        header[148:156] = b"%06o\0 " % (sum(header[:148]) + sum(header[156:512]) + 8 * 32)
        out.add(f"tar/size_{name}.tar", bytes(header), bytes(1024))
    for name, kind in (("long_name", tarfile.GNUTYPE_LONGNAME), ("long_link", tarfile.GNUTYPE_LONGLINK), ("pax", tarfile.XHDTYPE)):
        info = tarfile.TarInfo("x")
        info.type, info.size = kind, 1 << 30
        out.add(f"tar/{name}.tar", info.tobuf(), size=1 << 30)
        info.size = 0
        out.add(f"tar/{name}_chain.tar", info.tobuf() * 50000)
    sparse = tarfile.TarInfo("x")
    sparse.pax_headers = {"GNU.sparse.major": "1", "GNU.sparse.minor": "0", "GNU.sparse.realsize": "9" * 18}
    sparse.size = 512
    out.add("tar/sparse.tar", sparse.tobuf(tarfile.PAX_FORMAT), b"99999999\n".ljust(512, b"9"))


def add_packed(out):
    content = tarred([("zeppelin.txt", WORD)])
    for _ in range(100):
        content = gzip.compress(content, mtime=0)
    out.add("packed/gz_of_gz.gz", content)
    out.add("packed/zeros.gz", gzip.compress(bytes(60 * MEGABYTE), 1, mtime=0))
    out.add("packed/streams.gz", gzip.compress(b"x", mtime=0) * 200000)
    out.add("packed/streams.xz", lzma.compress(b"") * 100000)
    header = b"\x1f\x8b\x08\x08" + bytes(6)
    out.add("packed/name.gz", header, b"x" * (4 * MEGABYTE))
    xz = bytearray(lzma.compress(WORD * 999, filters=[{"id": lzma.FILTER_LZMA2, "preset": 1}]))
    xz[16] = 40  # a dictionary of 4 GiB
    xz[20:24] = pack("I", zlib.crc32(xz[12:20]))
    out.add("packed/dictionary.xz", bytes(xz))
    out.add("packed/dictionary.lzma", b"\x5d" + pack("I", 0xFFFFFFFF) + pack("Q", (1 << 63) - 1) + bytes(99))
    raw = b"\x01" + (WORD * 9).ljust(128, b"x")  # one raw block, the last
    for window in (0x58, 0xF8):  # 2 MiB and more than any machine has
        out.add(f"packed/window_{window:x}.zst", b"\x28\xb5\x2f\xfd", bytes([0x00, window]), pack("I", 128 << 3 | 1)[:3], raw[1:])
    out.add("packed/window_2g.zst", b"\x28\xb5\x2f\xfd\x00\xa8", pack("I", 128 << 3 | 1)[:3], raw[1:])
    out.add("packed/run.zst", b"\x28\xb5\x2f\xfd\x00\x58", pack("I", (128 << 10) << 3 | 2)[:3] + b"x", (pack("I", (128 << 10) << 3 | 2)[:3] + b"x") * 20000)
    out.add("packed/bzip.bz2", b"BZh9", b"1AY&SY" + b"\xff" * 100000)
    out.add("packed/compress.z", b"\x1f\x9d\x90", b"\xff" * MEGABYTE)


def seven_zip(header, offset=0, size=None):
    start = pack("QQI", offset, len(header) if size is None else size, zlib.crc32(header))
    return b"7z\xbc\xaf\x27\x1c\0\4" + pack("I", zlib.crc32(start)) + start + header


def add_others(out):
    most = b"\xff" + b"\xff" * 8
    headers = {"files": b"\x01\x05" + most, "folders": b"\x01\x04\x07\x0b" + most, "streams": b"\x01\x04\x06\0" + most,
               "coders": b"\x01\x04\x07\x0b\x01\0" + b"\xff" * 99, "names": b"\x01\x05\xc0\xff\xff\x11" + most + b"\0",
               "packed": b"\x17\x06" + most + most + b"\x09" + most, "properties": b"\x01\x02" + b"\x19\xff" * 999,
               "empty": b"\x01\x05\xc0\xff\xff\x0e" + b"\x80" * 99}
    for name, header in headers.items():
        out.add(f"others/{name}.7z", seven_zip(header))
    out.add("others/far.7z", seven_zip(b"\x01", offset=1 << 62))
    out.add("others/size.7z", seven_zip(b"\x01", size=1 << 62))
    out.add("others/header_bomb.7z", seven_zip(b"\x01\x05" + bytes(4 * MEGABYTE)))

    def block(kind, flags, content, size=None):
        head = pack("BHH", kind, flags, 7 + len(content) if size is None else size) + content
        return pack("H", zlib.crc32(head) & 0xFFFF) + head
    rar = b"Rar!\x1a\7\0" + block(0x73, 0, bytes(6))
    member = pack("IIBIIBBHI", 0xFFFFFFFF, 0xFFFFFFFF, 2, 0, 0, 29, 0x33, 0xFFFF, 0) + b"x" * 9
    out.add("others/member.rar", rar, block(0x74, 0x8000, member))
    out.add("others/large.rar", rar, block(0x74, 0x8100, member[:25] + pack("II", 0x7FFFFFFF, 0x7FFFFFFF) + b"x"))
    out.add("others/blocks.rar", rar * 1, block(0x7A, 0x8000, pack("I", 0)) * 200000)
    out.add("others/zero.rar", rar, block(0x74, 0, b"", 0) * 1000)
    five = b"Rar!\x1a\7\1\0"

    def block5(content):
        body = bytes([len(content)]) + content
        return pack("I", zlib.crc32(body)) + body
    out.add("others/five.rar", five, block5(b"\1\0\0"), block5(b"\2\3" + b"\xff" * 9 + b"\x01" + b"\xff" * 40))
    out.add("others/size5.rar", five, pack("I", 0), b"\xff" * 9)
    out.add("others/cpio.cpio", b"070701" + b"ffffffff" * 13, b"x" * 9999)
    out.add("others/cpio_odc.cpio", b"070707" + b"7" * 70, b"x" * 9999)
    out.add("others/cpio_names.cpio", (b"070701" + b"00000000" * 11 + b"00000008" + b"00000000" + b"zeppeli\0\0\0") * 50000)


def add(out):
    add_zip(out)
    add_tar(out)
    add_packed(out)
    add_others(out)
