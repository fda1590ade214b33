#!/usr/bin/env python3
"""Checks that no file of a source tree has more than 400 lines, and no function in C or C++ more than 50.

usage: check-lengths.py [TREE]

Prints one line per finding and exits 1 when there is any. A function is known by how the formatter lays it out: its last
line is a brace alone, and its first one the nearest line above that stands as far to the left.
"""

import re
import sys

import house

FILE_LINES = 400
FUNCTION_LINES = 50
SUFFIXES = {".c", ".cpp", ".h", ".hpp", ".py"}


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
    for path in house.files(tree):
        if path.suffix not in SUFFIXES:
            continue
        name = path.relative_to(tree).as_posix()
        lines = path.read_text(encoding="utf-8").splitlines()
        if len(lines) > FILE_LINES:
            yield f"{name}: {len(lines)} lines, of at most {FILE_LINES}"
        if path.suffix != ".py":
            for begin, count in long_functions(lines):
                yield f"{name}:{begin + 1}: a function of {count} lines, of at most {FUNCTION_LINES}"


if __name__ == "__main__":
    sys.exit(house.report(findings, "no file and no function is too long"))
