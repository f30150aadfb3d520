"""Files out of Debian source packages: the samples that libraries are tested with are in no other."""

import glob
import os
import re
import shutil
import subprocess
import tempfile

# All are fetched together, since each look at the archive's list of sources takes a second and 10 MB.
PACKAGES = ("libarchive", "libheif", "libimage-exiftool-perl", "taglib")


def codename():
    with open("/etc/os-release", encoding="utf-8") as file:
        found = re.search(r"^VERSION_CODENAME=(\w+)", file.read(), re.MULTILINE)
    return found.group(1) if found else ""


def source_entries(suite):
    """Where this system has its packages from, as places of their sources; in the two forms that apt knows."""
    lines, stanzas = [], []
    for path in sorted(["/etc/apt/sources.list"] + glob.glob("/etc/apt/sources.list.d/*")):
        if not os.path.isfile(path) or not path.endswith((".list", ".sources")):
            continue
        with open(path, encoding="utf-8") as file:
            text = file.read()
        if path.endswith(".list"):
            lines += [re.sub(r"^deb ", "deb-src ", line) for line in text.splitlines()
                      if re.match(rf"deb .*\s{suite}\s.*\bmain\b", line)]
        else:
            text = re.sub(r"(?m)^Types:.*", "Types: deb-src", text)
            stanzas += [re.sub(r"(?m)^Suites:.*", f"Suites: {suite}", stanza) for stanza in re.split(r"\n\s*\n", text)
                        if re.search(rf"(?m)^Suites:.*\s{suite}(\s|$)", stanza)]
    return "\n".join(lines), "\n\n".join(stanzas)


def download(folder):
    """Fetches them into the folder, with lists of its own: no root needed. Returns what apt complains of."""
    os.makedirs(f"{folder}/parts")
    os.makedirs(f"{folder}/lists/partial")
    lines, stanzas = source_entries(codename())
    for name, text in (("here.list", lines), ("here.sources", stanzas)):
        with open(f"{folder}/parts/{name}", "w", encoding="utf-8") as file:
            file.write(text + "\n")
    apt = ["apt-get", "-qq", "-o", "Dir::Etc::SourceList=/dev/null", "-o", f"Dir::Etc::SourceParts={folder}/parts",
           "-o", f"Dir::State::Lists={folder}/lists", "-o", f"Dir::Cache={folder}", "-o", "APT::Sandbox::User="]
    said = ""
    for command in (["update"], ["source", "--download-only", *PACKAGES]):
        said += subprocess.run(apt + command, cwd=folder, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True,
                               check=False).stderr
    return said


def fetch(folder):
    """Makes folder/PACKAGE of each. Returns what went wrong, "" when nothing did."""
    if all(os.path.isdir(f"{folder}/{name}") for name in PACKAGES):
        return ""
    os.makedirs(folder, exist_ok=True)
    with tempfile.TemporaryDirectory(dir=folder) as work:
        said = download(work)
        for name in PACKAGES:
            tars = glob.glob(f"{glob.escape(work)}/{name}_*.orig.tar.?z")
            if not tars:
                return f"source package {name} cannot be fetched\n{said}"
            os.makedirs(f"{work}/{name}")
            subprocess.run(["tar", "--strip-components=1", "-C", f"{work}/{name}", "-xf", tars[0]], check=True)
            shutil.rmtree(f"{folder}/{name}", ignore_errors=True)
            os.rename(f"{work}/{name}", f"{folder}/{name}")
    return ""
