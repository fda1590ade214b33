"""Reads what abidiff says of two builds of the probe library, and allows nothing but growth at the end.

Suppressions of abidiff's own let a member through that is inserted in the middle; here each line is known, or a problem.
"""

import re

STRUCTURE = re.compile(r"^'struct (\w+) at [^']*' changed:$")
SIZE = re.compile(r"^  type size changed from (\d+) to (\d+) \(in bits\)$")
INSERTIONS = re.compile(r"^  \d+ data member insertions?:$")
INSERTION = re.compile(r"^    '.* (\w+)', at offset (\d+) \(in bits\)( at [^ ]+)?$")
SUMMARIES = (re.compile(r"^Leaf changes summary: \d+ artifacts? changed$"),
             re.compile(r"^Changed leaf types summary: \d+ leaf types? changed$"),
             re.compile(r"^Removed/Changed/Added (functions|variables) summary: "
                        r"0 Removed, 0 Changed, 0 Added (function|variable)$"))
# Passed by value: a plug-in and a host of different versions would not agree on where its arguments are.
FIXED = {"wl_completion_handler"}


def problems(report):
    """The lines of abidiff's leaf report that are no growth at the end of a structure, each with its structure."""
    found = []
    structure, size = None, None
    for line in report.splitlines():
        begin, grown, member = STRUCTURE.match(line), SIZE.match(line), INSERTION.match(line)
        if begin:
            structure, size = begin[1], None
            if structure in FIXED:
                found.append(f"{structure} is passed by value and cannot change")
        elif grown and int(grown[2]) > int(grown[1]):
            size = int(grown[1])
        elif member and size is not None and int(member[2]) >= size:
            pass
        elif line and not INSERTIONS.match(line) and not any(each.match(line) for each in SUMMARIES):
            found.append(f"{structure or 'the library'}: {line.strip()}")
    return found
