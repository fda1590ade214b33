#!/usr/bin/env python3
"""Has clang-tidy look at sources, several at once; ends with 1 where it finds something.

usage: tidy.py BUILD FILE...      BUILD: a configured build folder, with its compile_commands.json

A file that was found clean is not looked at again while all that it is made of is the same: its own bytes, those of
every header that it reads, its compiler's options, the checks and clang-tidy itself. That is remembered, as an empty
file for each, in the user's cache.
"""

import concurrent.futures
import functools
import hashlib
import json
import os
import shlex
import subprocess
import sys
import time
from pathlib import Path

TIDY = "clang-tidy-14"
# The analyzer looks into calls only as far as its shallow mode does: the deep one takes twice as long in all.
SHALLOW = [f"--extra-arg={word}" for word in ("-Xclang", "-analyzer-config", "-Xclang", "mode=shallow")]
FORGOTTEN_AFTER = 60 * 24 * 3600  # seconds without use
TOP = Path(__file__).resolve().parents[2]
CLEAN = Path(os.environ.get("XDG_CACHE_HOME") or Path.home() / ".cache") / "welcomer" / "clang-tidy"


def commands(build):
    """How each file is compiled, as (folder, arguments)."""
    entries = json.loads((build / "compile_commands.json").read_text())
    return {Path(entry["file"]).resolve(): (entry["directory"], shlex.split(entry["command"])) for entry in entries}


def dependencies(folder, arguments):
    """What a file is made of, or None where the compiler cannot tell."""
    output = arguments.index("-o")
    asked = [*arguments[:output], *arguments[output + 2:], "-M", "-MT", "it"]
    done = subprocess.run([word for word in asked if word != "-c"], cwd=folder, capture_output=True, text=True)
    if done.returncode != 0:
        return None
    return [Path(folder) / name for name in shlex.split(done.stdout.replace("\\\n", " "))[1:]]


@functools.cache  # most headers are those of many sources
def digest_of(path):
    return hashlib.sha256(path.read_bytes()).digest()


def key_of(command, surroundings):
    """The name under which a clean file is remembered, or None."""
    files = command and dependencies(*command)
    if not files:
        return None
    key = hashlib.sha256(surroundings)
    key.update(" ".join(command[1]).replace(str(TOP), ".").encode())
    for path in files:
        key.update(str(path).replace(str(TOP), ".").encode() + b"\0" + digest_of(path))
    return key.hexdigest()


def look_at(path, build, command, surroundings):
    """What clang-tidy has to say: nothing about what is clean; None where it was not asked."""
    key = key_of(command, surroundings)
    mark = key and CLEAN / key
    if mark and mark.exists():
        mark.touch()
        return None
    done = subprocess.run([TIDY, "-p", build, "--quiet", *SHALLOW, path], capture_output=True, text=True)
    if done.returncode != 0:
        return f"{path}: {TIDY} ended with {done.returncode}\n{done.stdout}{done.stderr}"
    if mark and not done.stdout:
        mark.touch()
    return done.stdout


def main():
    build, files = Path(sys.argv[1]), [Path(name).resolve() for name in sys.argv[2:]]
    known = commands(build)
    CLEAN.mkdir(parents=True, exist_ok=True)
    for mark in CLEAN.iterdir():
        if mark.stat().st_mtime < time.time() - FORGOTTEN_AFTER:
            mark.unlink(missing_ok=True)
    version = subprocess.run([TIDY, "--version"], capture_output=True, check=True).stdout
    surroundings = version + " ".join(SHALLOW).encode() + (TOP / ".clang-tidy").read_bytes()
    looked = failed = 0
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for said in pool.map(lambda path: look_at(path, build, known.get(path), surroundings), files):
            looked += said is not None
            if said:
                failed += 1
                print(said, flush=True)
    print(f"tidy: {len(files)} files, {looked} of them looked at, {failed} with findings")
    sys.exit(1 if failed else 0)


if __name__ == "__main__":
    main()
