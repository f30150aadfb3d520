#!/usr/bin/env python3
"""Fails when one of the library's own error codes is expected by no unit test.

usage: error_codes.py SOURCE_FOLDER
A test expects a code when it names the enumerator, or a text that begins with the number or has it after "code=".
"""
import pathlib
import re
import sys

root = pathlib.Path(sys.argv[1])
codes = re.findall(r"\bk(\w+) = (\d+)", (root / "common/error.h").read_text())
own = [(name, number) for name, number in codes if not 1400 <= int(number) < 1500]  # those are the engine's
tests = [(path.name, path.read_text()) for path in sorted((root / "tests").rglob("*_test.cpp"))]
missing = 0
for name, number in own:
    expected = re.compile(rf'"(throws )?{number}\b|\bcode={number}\b|\bError::k{name}\b')
    users = [file for file, text in tests if expected.search(text)]
    print(number, name, *users)
    missing += not users
sys.exit(1 if missing or len(own) < 15 else 0)
