#!/usr/bin/env python3
"""Checks that no file of a source tree has more than 400 lines, and no function in C or C++ more than 50.

usage: check-lengths.py [TREE]

Prints one line per finding and exits 1 when there is any. A function is known by how the formatter lays it out: its last
line is a brace alone, and its first one the nearest line above that stands as far to the left.
"""

import os
import re
import sys
from pathlib import Path

FILE_LINES = 400
FUNCTION_LINES = 50
SUFFIXES = {".c", ".cpp", ".h", ".hpp", ".py"}


def source_files(tree):
    for folder, folders, names in os.walk(tree):
        folders[:] = [name for name in folders if not name.startswith((".", "build", "_build"))]
        for name in names:
            path = Path(folder, name)
            if path.suffix in SUFFIXES:
                yield path


def indentation(line):
    return len(line) - len(line.lstrip())


def long_functions(lines):
    """The line that each begins in, from 0, and how many lines there are between its braces."""
    for end, line in enumerate(lines):
        if line.strip() != "}":
            continue
        depth = indentation(line)
        begin = end - 1
        while begin > 0 and (not lines[begin].strip() or lines[begin].startswith("#")
                             or indentation(lines[begin]) > depth):
            begin -= 1
        body = begin
        while body < end and not re.search(r"\{(\s*//.*)?$", lines[body]):
            body += 1
        if end - body - 1 > FUNCTION_LINES and not lines[begin].lstrip().startswith("extern"):
            yield begin, end - body - 1


def findings(tree):
    for path in sorted(source_files(tree)):
        name = path.relative_to(tree).as_posix()
        lines = path.read_text(encoding="utf-8").splitlines()
        if len(lines) > FILE_LINES:
            yield f"{name}: {len(lines)} lines, of at most {FILE_LINES}"
        if path.suffix != ".py":
            for begin, count in long_functions(lines):
                yield f"{name}:{begin + 1}: a function of {count} lines, of at most {FUNCTION_LINES}"


def main():
    found = list(findings(Path(sys.argv[1] if len(sys.argv) > 1 else ".")))
    print("\n".join(found) if found else "no file and no function is too long")
    return 1 if found else 0


if __name__ == "__main__":
    sys.exit(main())
