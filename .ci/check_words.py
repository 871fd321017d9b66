#!/usr/bin/env python3
"""Fails when the daemon's command words are not the same wherever they are listed."""

import re
import sys

TRUTH = "service/commands.cpp"
ROW = r'^    \{"([A-Z_]+)",'
# Where else each word stands, and how.
LISTED = {
    "client/command_words.cpp": ROW,
    "docs/man/corvexctl.1.md": r"(?:^|(?<=, ))\*\*([A-Z_]+)\*\*(?=,|$)",
    "docs/man/corvexd.8.md": r"(?:^|(?<=, ))\*\*([A-Z_]+)\*\*(?=,|$)",
    "docs/architecture.md": r"(?<=^\| )`([A-Z_]+)`|(?<=, )`([A-Z_]+)`(?= \|)",
}


def read_words(path, pattern):
    """The words that the pattern's groups find in a file."""
    with open(path, encoding="utf-8") as file:
        found = re.finditer(pattern, file.read(), re.MULTILINE)
        return [next(filter(None, match.groups())) for match in found]


def main():
    words = read_words(TRUTH, ROW)
    failed = not words
    for path, pattern in LISTED.items():
        listed = read_words(path, pattern)
        for word in sorted(set(words) ^ set(listed)):
            where = path if word in words else TRUTH
            print(f"{word} is missing in {where}", file=sys.stderr)
            failed = True
    return failed


if __name__ == "__main__":
    sys.exit(main())
