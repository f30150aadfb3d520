#!/usr/bin/env python3
"""Writes fold_tables.inc, the folded form of each letter in three blocks of Unicode, from python3's unicodedata.

    python3 make_fold_tables.py >fold_tables.inc

Indices are cut by these tables: a character that folds differently from one release to the next is no longer found in
an index of the earlier one. WordsTest.EveryCharacterFoldsAsInEarlierReleases holds them. Where a newer Unicode folds a
character differently, its present form is added to EXCEPTIONS below.
"""
import re
import unicodedata

# First and last code point, and the name of the table. What lies outside is folded by rule in fold.cpp.
BLOCKS = [(0x00A0, 0x024F, "kLatin"), (0x0370, 0x052F, "kGreekAndCyrillic"), (0x1E00, 0x1FFF, "kExtended")]

# Letters that Unicode does not decompose, in the form in which people type them on other keyboards.
SPELT = {"æ": "ae", "ð": "d", "þ": "th", "ĳ": "ij", "œ": "oe", "ı": "i"}

# What the rule below would fold otherwise.
EXCEPTIONS = {
    0x0149: "n",       # the apostrophe before it is left out
    0x0189: "d",       # African D, in its look the same as eth
    0x0488: "\u0488",  # enclosing signs for large numbers were taken for letters by the first release
    0x0489: "\u0489",
    0x1E9A: "a",       # the half ring at its right is left out
}

# Forms of two characters are numbered from here on: private use, so no letter has such a number.
EXPANSION_BASE = 0xE000

STROKE = re.compile(r"LATIN (?:CAPITAL|SMALL) LETTER ([A-Z]) WITH (?:DIAGONAL )?(?:STROKE|BAR)\b")


def without_marks(text):
    decomposed = unicodedata.normalize("NFD", text)
    return "".join(c for c in decomposed if not unicodedata.combining(c))


def fold(code_point):
    """The folded form: case folding of the canonical decomposition without its marks; "" for what is no letter."""
    character = chr(code_point)
    if code_point in EXCEPTIONS:
        return EXCEPTIONS[code_point]
    if unicodedata.category(character)[0] not in "LN":
        return ""
    if unicodedata.decomposition(character).startswith("<super>"):
        return unicodedata.normalize("NFKD", character)
    stroke = STROKE.match(unicodedata.name(character))
    if stroke:
        return stroke.group(1).lower()
    folded = without_marks(without_marks(character).casefold())
    return "".join(SPELT.get(c, c) for c in folded)


def main():
    expansions = []

    def encoded(code_point):
        folded = fold(code_point)
        if len(folded) < 2:
            return ord(folded) if folded else 0
        if folded not in expansions:
            expansions.append(folded)
        return EXPANSION_BASE + expansions.index(folded)

    print(f"// Made by make_fold_tables.py from Unicode {unicodedata.unidata_version}. Not to be edited.")
    print("// One number for each code point of a block, 16 in a row: that of the folded form, 0 for what is no letter,")
    print("// or from kExpansionBase on the place of a form of two letters in kExpansions.")
    for first, last, name in BLOCKS:
        print(f"constexpr uint16_t {name}[] = {{")
        for row in range(first, last + 1, 16):
            numbers = ", ".join(f"0x{encoded(c):04X}" for c in range(row, row + 16))
            print(f"    {numbers},  // U+{row:04X}")
        print("};")
    print(f"constexpr uint16_t kExpansionBase = 0x{EXPANSION_BASE:04X};")
    print("constexpr const char* kExpansions[] = {" + ", ".join(f'"{e}"' for e in expansions) + "};")
    blocks = ", ".join(f"{{0x{first:04X}, 0x{last:04X}, {name}}}" for first, last, name in BLOCKS)
    print(f"constexpr FoldBlock kBlocks[] = {{{blocks}}};")


if __name__ == "__main__":
    main()
