"""Scanning plug-ins, from one to ten thousand."""

import json
import shutil
import subprocess
import sys
import tempfile
from pathlib import Path

import figures

FOLDER = "System/Library/CoreServices/FirstRunPlugins"
DIGITS = b"com.corvid.bench.number0000"


def make_plugins(build, root, count):
    folder = Path(root) / FOLDER
    folder.mkdir(parents=True)
    original = (build / "bench" / "numbered.ncdplugin").read_bytes()
    if original.count(DIGITS) != 1:
        raise RuntimeError("the numbered plug-in's identifier does not stand in it exactly once")
    for number in range(count):
        copy = original.replace(DIGITS, DIGITS[:-4] + f"{number:04d}".encode())
        (folder / f"number{number:04d}.ncdplugin").write_bytes(copy)


def measure(build, tables):
    # In a program of its own, since it puts itself into namespaces: a machine's plug-ins are below "/".
    result = subprocess.run([sys.executable, __file__, str(build)], check=True, stdout=subprocess.PIPE, text=True)
    rows = json.loads(result.stdout)
    # The dynamic linker compares each library's name with those of all that are loaded: bare dlopen grows with the square.
    for (count, ours, bare, *_), target in zip(rows[-2:], (1.15, 1.2)):
        tables.ratio(f"scanning {count:,} plug-ins", "bare dlopen and dlsym of the same files", ours, bare, target, "ms")
    tables.growth("Growth with the number of plug-ins",
                  ("plug-ins", "scan, ms", "bare dlopen, ms", "scan, kB more", "bare dlopen, kB more"), rows)


def scan(place, kind, count):
    result = place.run(["/tmp/scan-plugins", kind, "/"])
    figure = json.loads(result.stdout)
    if figure["found"] != count:
        raise RuntimeError(f"{kind} found {figure['found']} plug-ins of {count}")
    return figure


def row(place, build, count):
    shutil.rmtree(place.root / FOLDER, ignore_errors=True)
    make_plugins(build, place.root, count)
    memory = {kind: scan(place, kind, count)["kB"] for kind in ("welcomer", "bare")}
    ours, bare = figures.turn_about(lambda: scan(place, "welcomer", count)["ns"],
                                    lambda: scan(place, "bare", count)["ns"], 9 if count <= 1000 else 3)
    return count, ours / 1e6, bare / 1e6, memory["welcomer"], memory["bare"]


def inside(build):
    import machine

    machine.enter_namespaces()
    place = machine.Machine(Path(tempfile.mkdtemp()))
    try:
        shutil.copy(build / "bench" / "scan-plugins", place.root / "tmp")
        json.dump([row(place, build, count) for count in (1, 10, 100, 1000, 10000)], sys.stdout)
    finally:
        place.stop()


if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "tests" / "support"))
    inside(Path(sys.argv[1]))
