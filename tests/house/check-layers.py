#!/usr/bin/env python3
"""Checks that the folders of a source tree include only what is on lower floors, without cycles.

usage: check-layers.py [TREE]

Prints one line per finding and exits 1 when there is any. See the README's section on the floors.
"""

import re
import sys
from pathlib import Path

FLOORS = {
    "propertylist": 1,
    "sdk": 1,
    "text": 2,
    "platform": 2,
    "log": 3,
    "handoff": 4,
    "plugins": 4,
    "network": 4,
    "switch": 4,
    "cloud": 5,
    "state": 6,
    "agent": 6,
    "tools": 7,
    "examples": 7,
}
# What the rooms beside the floors may include, besides themselves. A room's name is a path; the longest that fits counts.
SIDES = {
    "backends": {"platform", "propertylist", "backends/posix", "backends/local", "backends/desktop"},
    "backends/accountserver": {"platform", "propertylist"},
    "backends/posix": {"platform", "propertylist"},
    "backends/bus": {"platform"},
    "backends/network": {"platform", "propertylist"},
    "backends/local": {"platform", "propertylist", "backends/posix", "backends/network"},
    "backends/desktop": {"platform", "propertylist", "backends/accountserver", "backends/posix", "backends/bus",
                         "backends/network", "backends/local"},
    "backends/simulated": {"platform", "propertylist"},
    "examples/plugins": {"sdk"},
}
# Lies beside its rooms and below them: how a program asks for a platform.
ASKED = {"backends/Backends.h"}
# What a room shows of itself to those that may include it; the others show everything.
SHOWN = {"backends/local": re.compile(r"/Local[^/]*\.h$")}
# The rooms of one program, from the lowest: a room includes itself and those before it. What stands beside them may
# include all of them.
TOOL_ROOMS = {"tools/welcomer": ["terminal", "cli", "login", "story", "checks", "plugins", "commands"]}
# Free to include everything: nothing includes them.
TESTS = {"tests"}
# The only files, besides tests and the backends themselves, that may choose a backend, and what is offered to them.
PROGRAMS = re.compile(r"^(agent/main\.cpp|tools/[^/]+/main\.cpp|examples/setup/[^/]+\.cpp)$")
OFFERED = re.compile(
    r"^backends/(Backends|StoredNetwork|UnexpectedEnd|simulated/.+|local/LocalSystemLog|local/accounts/NimbusDirectory)\.h$")

# What of the backends tools may use, too: the bases on the kernel and on the bus, addresses as text, and what the account
# server says.
FOR_TOOLS = re.compile(r"^backends/(posix/[^/]+|bus/[^/]+|network/IPv4Text|accountserver/[^/]+)\.h$")

SOURCES = {".h", ".hpp", ".c", ".cpp"}
INCLUDE = re.compile(r'^\s*#\s*include\s*([<"])([^>"]+)[>"]')
# A header of the standard library: no folder, no ending. C's own have one, and the SDK's C header needs them.
STANDARD = re.compile(r"^[a-z_0-9]+$")
STANDARD_C = {"stdbool.h", "stddef.h", "stdint.h"}


def source_files(tree):
    for folder in sorted({room.split("/")[0] for room in [*FLOORS, *SIDES, *TESTS]}):
        for path in sorted((tree / folder).rglob("*")):
            if path.suffix in SOURCES and path.is_file():
                yield path.relative_to(tree)


def includes(path):
    for number, line in enumerate(path.read_text(encoding="utf-8").splitlines(), 1):
        match = INCLUDE.match(line)
        if match:
            yield number, match.group(1) == '"', match.group(2)


def side_of(path):
    """The room beside the floors that a file is in, or None."""
    fitting = [room for room in SIDES if path.startswith(room + "/")]
    return max(fitting, key=len, default=None)


def beside_the_floors(side, target):
    """Why a file of this side may not include that one, or None."""
    aim = side_of(target) or target.split("/")[0]
    if aim == side or target in ASKED:
        return None
    if aim not in SIDES[side]:
        return f"{side}/ includes {', '.join(sorted(SIDES[side]))} only"
    if aim in SHOWN and side != "backends" and not SHOWN[aim].search(target):
        return f"is not what {aim}/ shows of itself"
    return None


def program_of(path):
    """The program among the tools that a file belongs to."""
    return path.split("/")[1]


def room_refusal(source, target):
    """Why this file of a tool may not include that one of the same tool, or None."""
    for tool, rooms in TOOL_ROOMS.items():
        pair = [Path(path).relative_to(tool).parts for path in (source, target) if Path(path).is_relative_to(tool)]
        if len(pair) < 2 or len(pair[0]) == 1:
            continue
        for parts in pair:
            if parts[0] not in rooms:
                return f"{tool}/{parts[0]} is none of the rooms {', '.join(rooms)}"
        if rooms.index(pair[1][0]) > rooms.index(pair[0][0]):
            return f"room {pair[1][0]}/ is not below {pair[0][0]}/"
    return None


def refusal(source, target, quoted, tree):
    """Why this file may not include that one, or None."""
    room = source.parts[0]
    if not quoted:
        sdk_own = room in ("sdk", "examples") and target.startswith("welcomer/")
        if room in FLOORS and FLOORS[room] <= 6 and not sdk_own:
            if not STANDARD.match(target) and not (room == "sdk" and target in STANDARD_C):
                return "is on floors 1 to 6, which use the standard library alone"
        return None
    if not (tree / target).is_file():
        if target.startswith("generated/"):
            return None
        return "names a file that is not in the tree (paths start at the root)"
    aim = target.split("/")[0]
    if aim in TESTS:
        return "includes a test"
    side = side_of(str(source))
    if side:
        return beside_the_floors(side, target)
    if aim == "backends":
        if OFFERED.match(target) and PROGRAMS.match(str(source)):
            return None
        if room == "tools" and FOR_TOOLS.match(target):
            return None
        return "chooses a backend; only a program's main.cpp does"
    if aim == "tools" and room == "tools" and program_of(target) not in (program_of(str(source)), "shared"):
        return "belongs to another program"
    if aim == room:
        return room_refusal(source, target)
    if FLOORS[aim] >= FLOORS[room]:
        return f"{aim}/ (floor {FLOORS[aim]}) is not below {room}/ (floor {FLOORS[room]})"
    return None


def cycles(graph):
    """Each include cycle once, as the list of its files."""
    state, stack, found = {}, [], []

    def visit(node):
        state[node] = "open"
        stack.append(node)
        for target in graph.get(node, ()):
            if state.get(target) == "open":
                found.append(stack[stack.index(target) :] + [target])
            elif target not in state:
                visit(target)
        stack.pop()
        state[node] = "done"

    for node in sorted(graph):
        if node not in state:
            visit(node)
    return found


def check(tree):
    findings, graph, count = [], {}, 0
    for source in source_files(tree):
        count += 1
        graph[str(source)] = []
        for line, quoted, target in includes(tree / source):
            if quoted and (tree / target).is_file():
                graph[str(source)].append(target)
            why = None if source.parts[0] in TESTS else refusal(source, target, quoted, tree)
            if why:
                findings.append(f"{source}:{line}: {target}: {why}")
    findings += [f"include cycle: {' -> '.join(cycle)}" for cycle in cycles(graph)]
    if count == 0:
        findings.append(f"{tree}: no source files")
    return findings, count


def main():
    tree = Path(sys.argv[1] if len(sys.argv) > 1 else Path(__file__).resolve().parents[2])
    findings, count = check(tree)
    for finding in findings:
        print(finding)
    if not findings:
        print(f"{count} files, each includes only lower floors")
    return 1 if findings else 0


if __name__ == "__main__":
    sys.exit(main())
