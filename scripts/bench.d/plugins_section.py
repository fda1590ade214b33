"""Scanning plug-ins, from one to a thousand."""

import json
import subprocess
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


def scan(build, kind, root, count):
    result = subprocess.run([build / "bench" / "scan-plugins", kind, root], check=True, capture_output=True, text=True)
    figure = json.loads(result.stdout)
    if figure["found"] != count:
        raise RuntimeError(f"{kind} found {figure['found']} plug-ins of {count}")
    return figure


def measure(build, tables):
    rows = []
    for count in (1, 10, 100, 1000):
        with tempfile.TemporaryDirectory() as root:
            make_plugins(build, root, count)
            memory = {kind: scan(build, kind, root, count)["kB"] for kind in ("welcomer", "bare")}
            ours, bare = figures.turn_about(lambda: scan(build, "welcomer", root, count)["ns"],
                                            lambda: scan(build, "bare", root, count)["ns"], 9)
        rows.append((count, ours / 1e6, bare / 1e6, memory["welcomer"], memory["bare"]))
        if count == 1000:
            tables.ratio("scanning 1,000 plug-ins", "bare dlopen and dlsym of the same files", ours / 1e6, bare / 1e6,
                         1.3, "ms")
    tables.growth("Growth with the number of plug-ins",
                  ("plug-ins", "scan, ms", "bare dlopen, ms", "scan, kB more", "bare dlopen, kB more"), rows)
