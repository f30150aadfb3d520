"""Documents with queries whose answers are known by rule: manual pages and docs of Debian packages. Nothing is installed,
and nothing of it is kept in the repository: packages are downloaded by apt-get, and unpacked."""

import collections
import gzip
import os
import random
import re
import subprocess
import tarfile

PACKAGES = """acl adduser apt aria2 aspell at attr autoconf bash bc bind9-dnsutils bison borgbackup btrfs-progs bzip2 cmake-data
coreutils cpio cron cryptsetup-bin cups-client curl dash dctrl-tools debhelper diffutils dosfstools dpkg e2fsprogs ed exiv2
fdisk ffmpeg file findutils flac flex fzf gawk gdb git-man gnupg gpg graphviz grep groff-base gzip hdparm htop hunspell
imagemagick-6.q16 iproute2 iputils-ping iptables jq kmod lame less lftp libxml2-utils logrotate lsof lvm2 m4 make man-db mawk
mdadm moreutils mount mutt nano ncdu netcat-openbsd nfs-common nmap openssh-client openssl parted passwd patch plocate
poppler-utils procps psmisc pv qpdf quota rclone rcs rdiff-backup ripgrep rsync sane-utils screen sed smartmontools smbclient sox
sqlite3 strace sudo sysstat systemd tar tcpdump tesseract-ocr texinfo time tmux traceroute tree units unzip util-linux valgrind
vim-common vorbis-tools wget whois xfsprogs xmlstarlet xz-utils zip zsh-common zstd""".split()
FILE_MAX_BYTES = 2 << 20
SEPARATOR = re.compile(r"\s\\?-+\s")
STOP_WORDS = frozenset("about after all also and any are been both but can for from has have into its like may more most not "
                       "off one onto other out over some such than that the their them then there these this under until use "
                       "used using via was what when where which while who will with within without you your".split())

Page = collections.namedtuple("Page", "path names description data span")  # span: of the NAME section's lines in data
Query = collections.namedtuple("Query", "kind text relevant")


def download(folder, count):
    """Downloads what `folder` lacks of the first `count` packages. Returns the packages' files; none without a network."""
    os.makedirs(folder, exist_ok=True)
    policy = subprocess.run(["apt-cache", "policy", *PACKAGES[:count]], capture_output=True, text=True, check=False).stdout
    known = re.findall(r"^([a-z0-9][a-z0-9+.-]*):\n(?:  .*\n)*?  Candidate: \d", policy, re.M)
    there = {name.split("_")[0] for name in os.listdir(folder)}
    wanted = [name for name in known if name not in there]
    if wanted:
        subprocess.run(["apt-get", "download", "-qq", *wanted], cwd=folder, capture_output=True, check=False)
    return sorted(os.path.join(folder, name) for name in os.listdir(folder)
                  if name.endswith(".deb") and name.split("_")[0] in known)


def unpack(deb, target):
    """Writes the package's manual pages, those in English, and docs; returns its name and the line that describes it."""
    fields = subprocess.run(["dpkg-deb", "-f", deb, "Package", "Description"], capture_output=True, text=True, check=True).stdout
    name, description = re.match(r"Package: (.*)\nDescription: (.*)", fields).groups()
    with subprocess.Popen(["dpkg-deb", "--fsys-tarfile", deb], stdout=subprocess.PIPE) as process:
        with tarfile.open(fileobj=process.stdout, mode="r|") as archive:
            for member in archive:
                path = member.name.removeprefix("./")
                if not member.isfile() or member.size > FILE_MAX_BYTES or not re.match(r"usr/share/(man/man\d|doc)/", path):
                    continue
                os.makedirs(os.path.dirname(f"{target}/{path}"), exist_ok=True)
                with open(f"{target}/{path}", "wb") as out:
                    out.write(archive.extractfile(member).read())
    return name, description


def read(path):
    """The file's bytes, unpacked where they are compressed."""
    try:
        with (gzip.open if path.endswith(".gz") else open)(path, "rb") as file:
            return file.read()
    except (OSError, EOFError):
        return b""


def plain(text):
    """Text of roff without its escapes and quotes."""
    text = re.sub(r"\\f(\[\w*\]|\(..|.)|\\s[-+]?\d|\\[&|^/,]|\\\*\(..|\"", "", text)
    return " ".join(re.sub(r"\\\((?:en|em|hy)|\\-", "-", text).replace("\\", "").split())


def parse_page(path, data):
    """The manual page with the names and the line of its NAME section; None where that cannot be read."""
    lines = data.decode("utf-8", "replace").split("\n")
    begin = next((i + 1 for i, line in enumerate(lines) if re.match(r'\.S[Hh]\s+"?NAME', line, re.I)), None)
    if begin is None:
        return None
    end = next((i for i in range(begin, len(lines)) if re.match(r"\.S[HhSs]\b", lines[i])), len(lines))
    section = [line for line in lines[begin:end] if line and not line.startswith(('.\\"', "'", ".PP", ".P", ".in", ".ad", ".nh"))]
    if any(line.startswith(".Nd") for line in section):
        names = " ".join(line[4:] for line in section if line.startswith(".Nm"))
        description = next(line[4:] for line in section if line.startswith(".Nd"))
    else:
        text = " ".join(re.sub(r"^\.(?:[BIR]{1,2}|SM|SB)\s+", "", line) for line in section if not line.startswith(".\\"))
        parts = SEPARATOR.split(text.replace("\\(en", "-").replace("\\(em", "-"), maxsplit=1)
        if len(parts) != 2:
            return None
        names, description = parts
    names = [name for name in re.split(r"[\s,]+", plain(names)) if name]
    return Page(path, names, plain(description).rstrip("."), data, (begin, end)) if names else None


def content_words(text):
    return [word for word in re.findall(r"[A-Za-z][A-Za-z0-9]{2,}", text) if word.lower() not in STOP_WORDS]


def without_line(page):
    """The page's bytes with nothing but a name in its NAME section."""
    lines = page.data.decode("utf-8", "replace").split("\n")
    lines[page.span[0]:page.span[1]] = [page.names[0]]
    return "\n".join(lines).encode()


def mistyped(word, rng):
    """The word with one wrong letter, not the first: another one, one too many, one too few, or two that changed places."""
    at = rng.randrange(1, len(word) - 1)
    letter = rng.choice([c for c in "abcdefghijklmnopqrstuvwxyz" if c not in word])
    swapped = word[:at] + word[at + 1] + word[at] + word[at + 2:]
    return rng.choice([word[:at] + letter + word[at + 1:], word[:at] + letter + word[at:], word[:at] + word[at + 1:],
                       swapped if swapped != word else word[:at] + word[at + 1:]])


def find_pages(target):
    pages = []
    for where, _, names in os.walk(f"{target}/usr/share/man"):
        for name in names:
            path = os.path.join(where, name)
            page = parse_page(os.path.relpath(path, target), read(path))
            if page is not None and len(content_words(page.description)) >= 3:
                pages.append(page)
    return sorted(pages)


def package_queries(target, described):
    """The line that describes a package; right are its README and the manual page of its name."""
    for package, description in described:
        folder = f"usr/share/doc/{package}"
        names = os.listdir(f"{target}/{folder}") if os.path.isdir(f"{target}/{folder}") else []
        right = {f"{folder}/{name}" for name in names if name.upper().startswith("README") and "debian" not in name.lower()}
        for section in range(1, 9):
            page = f"usr/share/man/man{section}/{package}.{section}.gz"
            if os.path.exists(f"{target}/{page}"):
                right.add(page)
        if right:
            yield Query("package", description, right)


def make_set(debs, target, each, seed):
    """Unpacks the packages below `target` and returns the queries, at most `each` of a kind. Kinds have pages of their own:
    package   the line that describes a package, which stands in no document as such
    line      the line of a NAME section; it is taken out of the indexed page
    name      a page's name and one word of its line
    typo      four words of a page's line, one of them mistyped"""
    rng = random.Random(seed)
    described = [unpack(deb, target) for deb in debs]
    pages = find_pages(target)
    same = collections.defaultdict(set)
    for page in pages:
        same[page.description.lower()].add(page.path)
    rng.shuffle(pages)
    queries = list(package_queries(target, described))
    rng.shuffle(queries)
    del queries[each:]
    for number, page in enumerate(pages[:3 * each]):
        kind, words = ("line", "name", "typo")[number % 3], content_words(page.description)
        right = same[page.description.lower()]
        if kind == "line":
            for other in pages:
                if other.path in right:
                    with gzip.open(f"{target}/{other.path}", "wb") as file:
                        file.write(without_line(other))
            queries.append(Query(kind, page.description, right))
        elif kind == "name":
            queries.append(Query(kind, f"{page.names[0]} {rng.choice(words)}", {page.path}))
        else:
            long = [word for word in words if len(word) >= 6 and word.isalpha()]
            if long:
                wrong = rng.choice(long)
                chosen = [words[i] for i in sorted(rng.sample(range(len(words)), min(4, len(words)))) if words[i] != wrong][:3]
                chosen.insert(rng.randrange(len(chosen) + 1), mistyped(wrong.lower(), rng))
                queries.append(Query(kind, " ".join(chosen), right))
    return queries
