#!/usr/bin/python3
"""What reading a file costs, by format: by the reader in a process of its own, by ParseFile with its daemon and sandboxed
worker, and by the command-line tool of the same library, which starts for each file.

Workload: a file of each format, of 100 KB or more: 60,000 words of 5,000 different ones as a text, a sheet of 20,000 rows,
a photo, a song and a film of noise. LibreOffice, ffmpeg and exiv2 make those that Python alone cannot; without them, and
without a tool, its place in the table is empty. All processes share one processor, so the figures are for one core;
where that is allowed nobody else gets it meanwhile. Medians. "isolation" is how much longer ParseFile takes.

Prints the tables of docs/benchmarks.md.
"""

import argparse
import email.message
import os
import random
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
import zipfile

TOOL_SECONDS = 1.0
TOOLS = {
    "txt": ["iconv", "-f", "UTF-8", "-t", "UTF-16"],
    "pdf": ["pdftotext", "{}", "-"],
    "docx": ["unzip", "-p"],
    "xlsx": ["unzip", "-p"],
    "pptx": ["unzip", "-p"],
    "odt": ["unzip", "-p"],
    "epub": ["unzip", "-p"],
    "jpg": ["exiv2", "-q", "-pa"],
    "flac": ["mediainfo"],
    "mp3": ["mediainfo"],
    "mp4": ["mediainfo"],
    "doc": ["antiword"],
    "xls": ["xls2csv"],
    "rtf": ["catdoc"],
    "zip": ["unzip", "-l"],
}
ORDER = ["txt", "html", "pdf", "docx", "xlsx", "pptx", "odt", "epub", "jpg", "flac", "mp3", "mp4", "eml", "doc", "xls", "rtf",
         "zip"]
SIZES = [1000, 100000, 1000000]


class Samples:
    """Makes the files, each once."""

    def __init__(self, folder):
        self.folder = folder
        self.random = random.Random(1)
        syllables = [a + b for a in "bdfghklmnprstvwz" for b in ("a", "e", "i", "o", "u", "ä", "er", "en", "in", "as")]
        self.words = ["".join(self.random.choices(syllables, k=self.random.randint(1, 4))) for _ in range(5000)]
        self.paragraphs = [" ".join(self.random.choices(self.words, k=60)) for _ in range(1000)]

    def path(self, kind):
        return os.path.join(self.folder, "sample." + kind)

    def write(self, kind, text):
        with open(self.path(kind), "w", encoding="utf-8") as file:
            file.write(text)

    def pack(self, kind, members):
        with zipfile.ZipFile(self.path(kind), "w", zipfile.ZIP_DEFLATED) as archive:
            for name, text in members:
                archive.writestr(name, text)

    def make(self):
        done = os.path.join(self.folder, "done")
        if os.path.exists(done):
            return
        os.makedirs(self.folder, exist_ok=True)
        self.make_texts()
        self.make_packages()
        self.make_with_tools()
        with open(done, "w", encoding="ascii"):
            pass

    def make_texts(self):
        self.write("txt", "\n\n".join(self.paragraphs))
        body = "".join(f"<p class='a'>{text}</p>\n" for text in self.paragraphs)
        head = "<meta charset='utf-8'><title>Sample</title>"
        self.write("html", f"<!DOCTYPE html><html><head>{head}</head><body>{body}</body></html>")
        names = self.random.choices(self.words, k=20000)
        self.write("csv", "".join(f"{name},{i},{i / 7:.3f}\n" for i, name in enumerate(names)))
        lines = "".join(f"w\u00f6rter{i} und\n" for i in range(80000)).encode()
        for size in SIZES:
            with open(self.path(f"{size}.txt"), "wb") as file:
                file.write(lines[:size])
        message = email.message.EmailMessage()
        message["From"], message["To"], message["Subject"] = "Ann <ann@example.org>", "Bob <bob@example.org>", "Sample"
        message.set_content("\n".join(self.paragraphs))
        with open(self.path("eml"), "wb") as file:
            file.write(message.as_bytes())

    def make_packages(self):
        slide = ('<p:sld xmlns:p="http://schemas.openxmlformats.org/presentationml/2006/main" '
                 'xmlns:a="http://schemas.openxmlformats.org/drawingml/2006/main"><p:cSld><p:spTree><p:sp><p:txBody>{}'
                 '</p:txBody></p:sp></p:spTree></p:cSld></p:sld>')
        runs = [f"<a:p><a:r><a:t>{text}</a:t></a:r></a:p>" for text in self.paragraphs]
        relations = '<Relationships xmlns="http://schemas.openxmlformats.org/package/2006/relationships">{}</Relationships>'
        relation = ('<Relationship Id="r{}" Type="http://schemas.openxmlformats.org/officeDocument/2006/relationships/{}" '
                    'Target="{}"/>')
        numbers = range(1, 51)
        slides = [(f"ppt/slides/slide{i}.xml", slide.format("".join(runs[i * 20 - 20:i * 20]))) for i in numbers]
        shown = "".join(f'<p:sldId id="{255 + i}" r:id="r{i}"/>' for i in numbers)
        of_slides = "".join(relation.format(i, "slide", f"slides/slide{i}.xml") for i in numbers)
        self.pack("pptx", [("_rels/.rels", relations.format(relation.format(1, "officeDocument", "ppt/presentation.xml"))),
                           ("ppt/presentation.xml", f"<p:presentation><p:sldIdLst>{shown}</p:sldIdLst></p:presentation>"),
                           ("ppt/_rels/presentation.xml.rels", relations.format(of_slides)), *slides])
        chapters = [(f"chapter{i}.xhtml", "<html><body><p>" + "</p><p>".join(self.paragraphs[i * 50:i * 50 + 50]) +
                     "</p></body></html>") for i in range(20)]
        items = "".join(f'<item id="c{i}" href="{name}" media-type="application/xhtml+xml"/>'
                        for i, (name, _) in enumerate(chapters))
        spine = "".join(f'<itemref idref="c{i}"/>' for i in range(20))
        package = (f'<package><metadata><title>Sample</title></metadata><manifest>{items}</manifest>'
                   f'<spine>{spine}</spine></package>')
        container = '<container><rootfiles><rootfile full-path="book.opf"/></rootfiles></container>'
        self.pack("epub", [("mimetype", "application/epub+zip"), ("META-INF/container.xml", container),
                           ("book.opf", package), *chapters])
        self.pack("zip", [(f"folder{i // 50}/file{i}.txt", text) for i, text in enumerate(self.paragraphs)])

    def make_with_tools(self):
        for kind in ("pdf", "docx", "odt", "doc", "rtf"):
            self.office("html", kind, "HTML (StarWriter)")
        for kind in ("xlsx", "xls"):
            self.office("csv", kind)
        noise = ["-f", "lavfi", "-i", "anoisesrc=d=20:a=0.3:seed=1", "-metadata", "title=Sample", "-metadata", "artist=Ann"]
        picture = "nullsrc=s=640x480:d=10,geq=random(1)*255:128:128"
        self.ffmpeg(*noise, self.path("flac"))
        self.ffmpeg(*noise, self.path("mp3"))
        self.ffmpeg("-f", "lavfi", "-i", picture, *noise[:4], "-shortest", "-t", "3", self.path("mp4"))
        self.ffmpeg("-f", "lavfi", "-i", picture, "-frames:v", "1", self.path("jpg"))
        tags = ["Exif.Image.Make Maker", "Exif.Image.Model Model", "Exif.Photo.ExposureTime 1/100", "Exif.Photo.FNumber 4/1",
                "Iptc.Application2.Headline Sample", "Xmp.dc.title Sample"]
        run_quietly("exiv2", *[f"-Mset {tag}" for tag in tags], self.path("jpg"))

    def office(self, source, kind, reads_as=None):
        infilter = [f"--infilter={reads_as}"] if reads_as else []
        with tempfile.TemporaryDirectory() as profile:
            run_quietly("soffice", f"-env:UserInstallation=file://{profile}", "--headless", *infilter, "--convert-to", kind,
                        "--outdir", self.folder, self.path(source))

    @staticmethod
    def ffmpeg(*arguments):
        run_quietly("ffmpeg", "-nostdin", "-y", "-loglevel", "error", *arguments)


def run_quietly(*command):
    if shutil.which(command[0]) is None:
        return False
    nothing = subprocess.DEVNULL
    return subprocess.run(command, stdin=nothing, stdout=nothing, stderr=nothing, check=False).returncode == 0


def take_one_processor():
    """For this process and those that it starts, and before all others where that is allowed."""
    os.sched_setaffinity(0, {max(os.sched_getaffinity(0))})
    try:
        os.sched_setscheduler(0, os.SCHED_FIFO, os.sched_param(1))
    except PermissionError:
        print("note: others at work on this processor are measured along (only root can keep them out)")


def tool_seconds(kind, path):
    """The median of what the format's tool takes; None when it is not here, or cannot read the file."""
    template = TOOLS.get(kind)
    if template is None or shutil.which(template[0]) is None:
        return None
    command = [path if part == "{}" else part for part in template]
    command += [] if "{}" in template else [path]
    taken = []
    end = time.monotonic() + TOOL_SECONDS
    while len(taken) < 5 or time.monotonic() < end:
        begin = time.monotonic()
        if not run_quietly(*command):
            return None
        taken.append(time.monotonic() - begin)
    return statistics.median(taken)


def speed(seconds, size):
    return f"{1 / seconds:,.0f} / {size / seconds / 1e6:,.1f}"


def tool_name(kind):
    return " ".join(TOOLS[kind][:2 if TOOLS[kind][0] == "unzip" else 1])


def measured(bench, paths):
    """For each file the seconds in process and by ParseFile."""
    out = subprocess.run([bench, *paths], stdout=subprocess.PIPE, text=True, check=True).stdout
    return [[float(part) / 1e6 for part in line.split("\t")[1:]] for line in out.splitlines()]


def print_formats(bench, samples):
    kinds = [kind for kind in ORDER if os.path.exists(samples.path(kind))]
    print("| files a second / MB a second | size | in process | `ParseFile` | isolation | tool | `ParseFile` is |\n"
          "|---|---|---|---|---|---|---|")
    for kind, (here, isolated) in zip(kinds, measured(bench, [samples.path(kind) for kind in kinds])):
        size = os.path.getsize(samples.path(kind))
        tool = tool_seconds(kind, samples.path(kind))
        compared = f"{speed(tool, size)} (`{tool_name(kind)}`) | {tool / isolated:.1f} times as fast" if tool else "|"
        print(f"| {kind.upper()} | {size / 1000:,.0f} KB | {speed(here, size)} | {speed(isolated, size)} "
              f"| {1000 * (isolated - here):+.2f} ms, {100 * (isolated / here - 1):+.0f} % | {compared} |", flush=True)


def print_sizes(bench, samples):
    taken = measured(bench, [samples.path(f"{size}.txt") for size in SIZES])
    print("\n| plain text | " + " | ".join(f"{size // 1000:,} KB" for size in SIZES) + " |\n|---|" + "---|" * len(SIZES))
    for way, name in enumerate(("in process", "`ParseFile`")):
        print(f"| {name} | " + " | ".join(f"{1000 * one[way]:.3f} ms" for one in taken) + " |")


def print_starts(bench):
    out = subprocess.run([bench, "--starts"], stdout=subprocess.PIPE, text=True, check=True).stdout
    print("\n| milliseconds | program and first worker | further worker |\n|---|---|---|")
    for line in out.splitlines():
        program, first, further = line.split("\t")
        print(f"| `{program}` | {float(first):.1f} | {float(further):.1f} |")


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default="build/release", help="the build folder (default: %(default)s)")
    options = parser.parse_args()
    samples = Samples(os.path.join(os.path.abspath(options.build), "extract_bench_samples"))
    samples.make()
    print(f"load average {os.getloadavg()[0]:.1f}, {os.cpu_count()} processors\n")
    take_one_processor()
    bench = os.path.join(options.build, "bin", "extract_bench")
    print_formats(bench, samples)
    print_sizes(bench, samples)
    print_starts(bench)
    return 0


if __name__ == "__main__":
    sys.exit(main())
