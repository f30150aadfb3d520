"""Files that mean harm to whoever reads them: bombs, loops, lies about sizes, and what is no file at all.

python3 hostile.py FOLDER: makes them there, in "set" by subject. Nothing here is random. Those of a format are kept in
hostile_files, named after what is wrong in them: as they are, or, with ".packed" behind the name, as `xz -9` packs them.
hostile_files/sizes.txt has those that go on as a hole, with their whole length in bytes.
"""

import lzma
import os
import sys

HERE = os.path.dirname(os.path.abspath(__file__))
FILES = os.path.join(HERE, "hostile_files")
SEEDS = os.path.join(HERE, "..", "..", "fuzz", "corpus", "readers")
PACKED = ".packed"
TEN_TERABYTES = 10 << 40


def read(path):
    with open(path, "rb") as file:
        return file.read()


def seeds():
    """The smallest well-formed file of each format, by extension: what the fuzzer starts with, without the first line,
    which names the reader. Each holds the word "zeppelin", in its text or its title."""
    return {name.split(".", 1)[1]: read(os.path.join(SEEDS, name)).split(b"\n", 1)[1] for name in sorted(os.listdir(SEEDS))}


class HostileSet:
    """Writes files below a folder. Large ones are sparse, or small enough for any disk."""

    def __init__(self, folder):
        self.folder = folder
        self.paths = []

    def path(self, name):
        path = os.path.join(os.fsencode(self.folder), name if isinstance(name, bytes) else name.encode())
        os.makedirs(os.path.dirname(path), exist_ok=True)
        self.paths.append(path)
        return path

    def add(self, name, *pieces, size=0):
        """A file of these pieces, and of zeros up to `size`, or up to what this file system takes."""
        with open(self.path(name), "wb") as file:
            for piece in pieces:
                file.write(piece)
            while size > file.tell():
                try:
                    file.truncate(size)
                    return
                except OSError:
                    size //= 4

    def special(self, name, make):
        """What only some may make is left out where it cannot be made."""
        path = self.path(name)
        try:
            make(path)
        except OSError:
            self.paths.remove(path)


def add_formats(out):
    with open(os.path.join(FILES, "sizes.txt"), encoding="ascii") as file:
        sizes = {name: int(size) for size, name in map(str.split, file)}
    for parent, _, names in os.walk(FILES):
        for path in (os.path.join(parent, name) for name in names if parent != FILES):
            name = os.path.relpath(path, FILES)
            content = lzma.decompress(read(path)) if name.endswith(PACKED) else read(path)
            name = name.removesuffix(PACKED)
            out.add(name, content, size=sizes.get(name, 0))


def add_sizes(out):
    """Nothing but a hole, and what begins well and goes on as a hole."""
    for extension, content in seeds().items():
        out.add(f"sizes/hole.{extension}", size=TEN_TERABYTES)
        out.add(f"sizes/tail.{extension}", content, size=TEN_TERABYTES)
        out.add(f"sizes/long.{extension}", content, size=3 << 30)
        out.add(f"sizes/empty.{extension}")
    out.add("sizes/line.csv", b"a,b\n\"", size=1 << 30)
    out.add("sizes/no.extension", size=TEN_TERABYTES)


def add_what_is_no_file(out):
    import socket
    import stat

    def bind(path):
        with socket.socket(socket.AF_UNIX) as listener:
            here = os.open(os.path.dirname(path), os.O_PATH)
            listener.bind(b"/proc/self/fd/%d/" % here + os.path.basename(path))
            os.close(here)

    for extension in ("txt", "pdf", "docx", "mp3", "mp4", "jpg", "eml", "zip", "xls"):
        out.special(f"special/fifo.{extension}", os.mkfifo)
        out.special(f"special/socket.{extension}", bind)
        out.special(f"special/device.{extension}",
                    lambda path: os.mknod(path, stat.S_IFCHR | 0o600, os.makedev(1, 5)))  # endless zeros
        out.special(f"special/link.{extension}", lambda path: os.symlink("/etc/passwd", path))
        out.special(f"special/loop.{extension}", lambda path: os.symlink(os.path.basename(path), path))
        out.special(f"special/folder.{extension}", os.mkdir)


def add_names(out):
    text = b"zeppelin"
    for name in (b"x" * 251 + b".txt", b"\xff\xfe\x80" * 83 + b".txt", b"\xf0\x90" * 125 + b".pdf", b"line\nend\r.txt",
                 b"\x1b[31mred\x07.txt", b"tab\t\x01\x7f.docx", b" ", b"-rf", b"%s%n.txt", b"\xe2\x80\xae" + b"txt.exe",
                 b"quote\"'\\.txt", b"....txt", b"x." + b"y" * 253):
        out.add(b"names/" + name, text)


def make_all(folder):
    """Makes all of them. @return their paths, as bytes, in a fixed order."""
    out = HostileSet(os.path.join(folder, "set"))
    add_formats(out)
    add_sizes(out)
    add_what_is_no_file(out)
    add_names(out)
    return sorted(out.paths)


if __name__ == "__main__":
    print(len(make_all(sys.argv[1])), "files")
