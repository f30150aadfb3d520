"""Archives: the names of their members, also in the encodings of systems that did not know Unicode.

Words are what 7z or tar list, or the names that the archive is made with here.
"""

import binascii
import bz2
import gzip
import io
import lzma
import struct
import tarfile
import zipfile

MIMETYPE = "golang-github-gabriel-vasile-mimetype-dev"
DONORS = [MIMETYPE]

RAR, ZIP, TAR = "application/vnd.rar", "application/zip", "application/x-tar"

# As libarchive's own tests have them: their name there, the name here, words, and what else is to be found.
LIBARCHIVE = [
    ("rar_unicode.rar", "rar/japanese.rar", ["新規テキスト", "ファイル"], {"mime": RAR}),
    ("rar_windows.rar", "rar/windows.rar", ["testshortcut", "testemptydir"], {"mime": RAR}),
    ("rar_compress_best.rar", "rar/packed.rar", ["LibarchiveAddingTest", "testlink"], {"mime": RAR}),
    ("rar_encryption_data.rar", "rar/secret_content.rar", ["foo", "bar"], {}),
    ("rar_encryption_header.rar", "rar/secret_names.rar", [], {"error": "encrypted"}),
    ("rar5_stored.rar", "rar/five_stored.rar", ["helloworld"], {"mime": RAR}),
    ("rar5_win32.rar", "rar/five_windows.rar", ["testdir", "test6"], {"mime": RAR}),
    ("rar5_multiple_files_solid.rar", "rar/five_solid.rar", ["test1", "test4"], {"mime": RAR}),
    ("zip_filename_cp866.zip", "zip/dos_russian.zip", ["привет"], {"mime": ZIP}),
    ("zip_filename_cp932.zip", "zip/windows_japanese.zip", ["一覧表", "漢字"], {"mime": ZIP}),
    ("zip_filename_utf8_jp.zip", "zip/japanese.zip", ["一覧表"], {"mime": ZIP}),
    ("zip_traditional_encryption_data.zip", "zip/secret_content.zip", ["foo", "bar"], {}),
    ("zip_mac_metadata.zip", "zip/mac.zip", ["file3"], {}),
    ("zip_zip64b.zip", "zip/large_fields.zip", [], {"mime": ZIP}),
    ("zip_lzma_multi.zipx", "zip/newer_packing.zipx", ["smartd", "vimrc"], {}),
    ("zip_padded1.zip", "zip/behind_other_bytes.zip", ["file0"], {}),
    ("7zip_lzma1_2.7z", "7z/folder.7z", ["file4"], {"mime": "application/x-7z-compressed"}),
    ("7zip_ppmd.7z", "7z/packed.7z", ["ppmd_test"], {}),
    ("7zip_symbolic_name.7z", "7z/links.7z", ["symlinkfile"], {}),
    ("7zip_encryption_header.7z", "7z/secret_names.7z", [], {"error": "encrypted"}),
    ("gtar_filename_cp866.tar.Z", "tar/dos_russian.tar.Z", ["привет"], {}),
    ("cpio_filename_utf8_ru.cpio", "cpio/russian.cpio", ["привет"], {"mime": "application/x-cpio"}),
    ("cpio_filename_cp866.cpio", "cpio/dos_russian.cpio", ["привет"], {}),
    ("cpio_svr4_gzip_rpm.rpm", "rpm/package.rpm", ["file2"], {"mime": "application/x-rpm"}),
    ("cab_filename_cp932.cab", "cab/japanese.cab", ["一覧表"], {"mime": "application/vnd.ms-cab-compressed"}),
    ("lha_filename_utf16.lzh", "lha/japanese.lzh", ["テスト"], {"mime": "application/x-lha"}),
    ("iso_joliet_rockridge.iso.Z", "iso/packed.iso.Z", ["textfile"], {}),
]

NAMES = {
    "russian": ["отчёты/итоги за год.txt", "отчёты/договор.doc"],
    "chinese": ["文件夹/年度报告.doc", "文件夹/照片.jpg"],
    "german": ["Übersicht/Größen im März.txt", "Übersicht/Straßen.txt"],
    "long": ["/".join(["a folder whose name is rather long"] * 6) + "/hippopotamus.txt"],
}
WORDS = {"russian": ["отчёты", "договор"], "chinese": ["报告", "照片"], "german": ["Größen", "Straßen"],
         "long": ["hippopotamus"]}


def libarchive(corpus, name):
    """A sample out of the text that it is kept in; some end their lines with a byte too many."""
    kind = "compat" if name.startswith("compat") else "read_format"
    path = f"libarchive/test/test_{kind}_{name.removeprefix('compat_')}.uu"
    with open(corpus.source_donor("libarchive", path), "rb") as file:
        lines = file.read().splitlines()
    begin = next(i for i, line in enumerate(lines) if line.startswith(b"begin "))
    data = b""
    for line in lines[begin + 1:lines.index(b"end")]:
        data += binascii.a2b_uu(line[:(((line[0] - 32) & 63) * 4 + 5) // 3])
    return data


def tar(names, form, encoding="utf-8"):
    packed = io.BytesIO()
    with tarfile.open(fileobj=packed, mode="w", format=form, encoding=encoding) as archive:
        for name in names:
            info = tarfile.TarInfo(name)
            info.size = len(name)
            archive.addfile(info, io.BytesIO(b"x" * len(name)))
    return packed.getvalue()


def old_zip(names, code_page):
    """As systems wrote it that did not know Unicode: the names in a code page, and nothing that tells which."""
    packed = io.BytesIO()
    places = {}
    with zipfile.ZipFile(packed, "w") as archive:
        for i, name in enumerate(names):
            raw = name.encode(code_page)
            places[f"{i:04}".ljust(len(raw), "_")] = raw
        for place in places:
            archive.writestr(place, "content")
    data = packed.getvalue()
    for place, raw in places.items():
        data = data.replace(place.encode(), raw)
    return data


def new_zip(names):
    packed = io.BytesIO()
    with zipfile.ZipFile(packed, "w", zipfile.ZIP_DEFLATED) as archive:
        for name in names:
            archive.writestr(name, "content " * 100)
    return packed.getvalue()


def empty_7z(names):
    """A 7z archive of empty files: its header lists them, and nothing is packed."""
    def prop(kind, content):
        return bytes([kind, len(content)]) + content
    text = b"\0" + b"".join(name.encode("utf-16-le") + b"\0\0" for name in names)
    bits = bytes([(0xFF << (8 - len(names))) & 0xFF])
    files = bytes([len(names)]) + prop(0x0E, bits) + prop(0x0F, bits) + prop(0x11, text) + b"\0"
    header = b"\x01\x05" + files + b"\0"
    start = struct.pack("<QQI", 0, len(header), binascii.crc32(header))
    return b"7z\xbc\xaf\x27\x1c\0\4" + struct.pack("<I", binascii.crc32(start)) + start + header


def make(corpus):
    for name, path, words, more in LIBARCHIVE:
        corpus.add(path, libarchive(corpus, name), words, **more)
    for name, path, words in [("compat_zstd_1.tar.zst", "tar/packed.tar.zst", ["f3"]),
                              ("compat_lz4_1.tar.lz4", "tar/packed.tar.lz4", ["f3"]),
                              ("compat_lzip_1.tlz", "tar/packed.tlz", ["f3"])]:
        corpus.add(path, libarchive(corpus, name), words)
    for name in ("russian", "chinese", "german", "long"):
        gnu = tar(NAMES[name], tarfile.GNU_FORMAT)
        corpus.add(f"tar/gnu_{name}.tar", gnu, WORDS[name], mime=TAR)
        corpus.add(f"tar/pax_{name}.tar", tar(NAMES[name], tarfile.PAX_FORMAT), WORDS[name], mime=TAR)
        corpus.add(f"tar/{name}.tar.gz", gzip.compress(gnu), WORDS[name], mime="application/gzip")
        corpus.add(f"tar/{name}.tbz2", bz2.compress(gnu), WORDS[name], mime="application/x-bzip2")
        corpus.add(f"tar/{name}.tar.xz", lzma.compress(gnu), WORDS[name], mime="application/x-xz")
        corpus.add(f"zip/new_{name}.zip", new_zip(NAMES[name]), WORDS[name], mime=ZIP)
    corpus.add("tar/koi8.tar", tar(NAMES["russian"], tarfile.GNU_FORMAT, "koi8-r"), WORDS["russian"])
    corpus.add("tar/old_german.tar", tar(NAMES["german"], tarfile.USTAR_FORMAT, "latin-1"), WORDS["german"])
    for name, code_page in [("russian", "cp866"), ("russian", "cp1251"), ("chinese", "gbk"), ("german", "cp437"),
                            ("german", "cp850")]:
        corpus.add(f"zip/{name}_{code_page}.zip", old_zip(NAMES[name], code_page), WORDS[name], mime=ZIP)
    for name in ("russian", "chinese", "german"):
        corpus.add(f"7z/{name}.7z", empty_7z(NAMES[name]), WORDS[name], mime="application/x-7z-compressed")
    corpus.add("gz/single.txt.gz", gzip.compress("Журнал: сервер перезапущен\n".encode() * 50), ["перезапущен"])
    corpus.add("xz/single.csv.xz", lzma.compress("имя;сумма\nСидоров;500\n".encode("cp1251") * 50), ["Сидоров"])
    corpus.add("bz2/single.log.bz2", bz2.compress(b"kernel: thermal throttling ended\n" * 50), ["throttling"])
    samples = "usr/share/gocode/src/github.com/gabriel-vasile/mimetype/testdata"
    corpus.add("tar/oldest.tar", corpus.donor(MIMETYPE, f"{samples}/tar.v7.tar"), ["json"], mime=TAR)
    corpus.add("deb/package.deb", corpus.donor(MIMETYPE, f"{samples}/deb.deb"), ["control.tar"])
