#!/usr/bin/env python3
"""Prints the measures that this code is kept by, and with --check fails where one of the marks does not hold.

Lines are raw lines (blank and comment lines included) of the files that git knows, but for the comment share. Without
git, or in a tree that it does not know, nothing is measured, and the exit code is 77.

code            the C++ of base, platform, common, sdk, wire, fileindex, services and cli
tests           the C++ and the Python in tests/. Not counted: data files (those that are neither), CMake and shell files,
                and the fuzz targets and the benchmarks, whose sizes are printed beside
comment share   lines with a comment, be it behind code, among all lines that are not blank
public headers  those that are installed: of common, sdk and platform/include all, of base, wire and fileindex those that
                cmake/FerroxInstall.cmake names
functions       as universal-ctags finds them; left out where it is not installed
"""
import argparse
import functools
import pathlib
import re
import shutil
import statistics
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
sys.path.insert(0, str(ROOT / "tests/library"))
import include_rules  # noqa: E402

ROOMS = ("base", "platform", "common", "sdk", "wire", "fileindex", "services", "cli")
PUBLIC = ("common/", "sdk/", "platform/include/")  # installed whole
FILE_LINES, FUNCTION_LINES, FUNCTION_AIM = 300, 50, 30
SKIPPED = 77  # the exit code by which ctest knows
COMMENTS_MIN, PUBLIC_COMMENTS_MIN, TESTS_MAX = 15, 45, 0.36  # percent, percent, tests per line of code
STANDARD_MUTEX = re.compile(r"\bstd::(recursive_|shared_|timed_)*mutex\b|\bstd::condition_variable")
# What of a line matters here: a literal (raw, string, character; not the ' in 1'000), a comment, any other text.
TOKENS = re.compile(r'(?P<literal>R"(?P<end>[^(\s]{0,16})\(.*?\)(?P=end)"|"(?:\\.|[^"\\\n])*"'
                    r"|(?<![0-9a-fA-F])'(?:\\.|[^'\\\n])+')"
                    r"|(?P<comment>//[^\n]*|/\*.*?\*/)|(?P<other>\S)", re.S)


@functools.lru_cache(maxsize=None)
def text_of(name):
    return (ROOT / name).read_text(encoding="utf-8")


def files(suffixes, *folders):
    listed = subprocess.run(["git", "-C", ROOT, "ls-files", "-z", *folders], capture_output=True, text=True, check=True)
    return sorted(name for name in listed.stdout.split("\0") if name.endswith(suffixes) and (ROOT / name).is_file())


def git_problem():
    """Why git cannot say which files belong here, as in a tree that was exported; "" when it can."""
    if not shutil.which("git"):
        return "git is not installed"
    known = subprocess.run(["git", "-C", ROOT, "ls-files", "--error-unmatch", "tests/measures.py"], capture_output=True,
                           text=True, check=False)
    return known.stderr.strip()


def lines(names):
    return sum(text_of(name).count("\n") for name in names)


@functools.lru_cache(maxsize=None)
def comments(name):
    """How many lines have a comment, and how many are not blank."""
    text, commented, used, line, place = text_of(name), set(), set(), 1, 0
    for token in TOKENS.finditer(text):
        line += text.count("\n", place, token.start())
        place = token.start()
        covered = range(line, line + token.group().count("\n") + 1)
        used.update(covered)
        if token.lastgroup == "comment":
            commented.update(covered)
    return len(commented), len(used)


def comment_share(names):
    counts = [comments(name) for name in names]
    return 100 * sum(count[0] for count in counts) / max(1, sum(count[1] for count in counts))


def public_headers(code):
    installed = re.findall(r"\b(?:base|wire|fileindex)/[\w/]+", text_of("cmake/FerroxInstall.cmake"))
    return [name for name in code if name.endswith(".h") and (name.startswith(PUBLIC) or name[:-2] in installed)]


def function_lengths(code):
    """(lines, file, name) of each function; None without universal-ctags."""
    if not shutil.which("ctags"):
        return None
    words = ["ctags", "-f", "-", "--languages=C++", "--langmap=C++:+.h", "--kinds-C++=f", "--fields=+ne", "-L", "-"]
    listed = subprocess.run(words, input="\n".join(code), capture_output=True, text=True, cwd=ROOT, check=False)
    rows = re.findall(r"^([^\t]+)\t([^\t]+)\t.*\tline:(\d+).*\tend:(\d+)", listed.stdout, re.M)
    return [(int(end) - int(begin) + 1, file, name) for name, file, begin, end in rows] or None


def print_sizes(code):
    sizes = sorted((lines([name]), name) for name in code)
    small = sum(size <= FILE_LINES for size, _ in sizes)
    print(f"files: {len(sizes)}, median {statistics.median(size for size, _ in sizes):.0f} lines, "
          f"{100 * small / len(sizes):.1f} % up to {FILE_LINES}; longer:")
    print(*(f"  {size} {name}\n" for size, name in sizes[:small - 1:-1]), sep="", end="")
    functions = function_lengths(code)
    if functions is None:
        print("functions: not measured, universal-ctags is not installed")
        return
    longer = sum(size > FUNCTION_AIM for size, _, _ in functions)
    print(f"functions: {len(functions)}, {longer} over {FUNCTION_AIM} lines; over {FUNCTION_LINES}:")
    print(*(f"  {size} {file} {name}\n" for size, file, name in sorted(functions, reverse=True) if size > FUNCTION_LINES),
          sep="", end="")


def print_includes(code):
    """How many includes need an exception from the rules, and which rooms include each other because of that."""
    room_of, met = include_rules.room_of, set()
    for name in (name for name in code if name not in include_rules.FORWARDING):
        met |= {(room_of(name), room_of(other)) for other in re.findall(r'^\s*#\s*include\s+"([^"]+)"', text_of(name), re.M)}
    circles = sorted(pair for pair in met if None not in pair and pair[0] < pair[1] and pair[::-1] in met)
    print(f"includes by exception: {sum(map(len, include_rules.EXCEPTIONS.values()))}; rooms that include each other: {len(circles)}")
    print(*(f"  {one} and {other}\n" for one, other in circles), sep="", end="")


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--check", action="store_true", help="exit 1 when a mark does not hold")
    check = parser.parse_args().check
    if problem := git_problem():
        print(f"skipped: {problem}")
        return SKIPPED
    code, cpp, python = files((".cpp", ".h"), *ROOMS), files((".cpp", ".h"), "tests"), files(".py", "tests")
    print_sizes(code)
    public, wrong = public_headers(code), []

    def mark(text, holds):
        print(f"{text}: {'holds' if holds else 'DOES NOT HOLD'}")
        if not holds:
            wrong.append(text)

    overall, headers = comment_share(code), comment_share(public)
    mark(f"comments {overall:.1f} % of the lines, at least {COMMENTS_MIN}", overall >= COMMENTS_MIN)
    mark(f"comments {headers:.1f} % of {len(public)} public headers, at least {PUBLIC_COMMENTS_MIN}", headers >= PUBLIC_COMMENTS_MIN)
    share = lines(cpp + python) / lines(code)
    mark(f"tests {share:.3f} of the code ({lines(cpp)} lines of C++ and {lines(python)} of Python : {lines(code)}), "
         f"at most {TESTS_MAX}", share <= TESTS_MAX)
    print(f"  beside them: fuzz {lines(files(('.cpp', '.h'), 'fuzz'))}, bench {lines(files(('.cpp', '.h', '.py'), 'bench'))} lines")
    mutexes = {name: len(STANDARD_MUTEX.findall(text_of(name))) for name in code if not name.startswith("base/")}
    mark(f"the standard library's mutexes are named {sum(mutexes.values())} times outside of base/", not sum(mutexes.values()))
    print(*(f"  {count} {name}\n" for name, count in mutexes.items() if count), sep="", end="")
    print_includes(code)
    mark("include rules", include_rules.main(ROOT) == 0)
    return 1 if check and wrong else 0


if __name__ == "__main__":
    sys.exit(main())
