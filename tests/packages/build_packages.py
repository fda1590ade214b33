#!/usr/bin/env python3
"""Builds the packages that the tests look at, or those of the commit before; does nothing when these are there already.

usage: build_packages.py FOLDER          what is to be packaged as it stands
       build_packages.py --before FOLDER the commit before this one
"""

import hashlib
import os
import shutil
import subprocess
import sys
from pathlib import Path

TOP = Path(__file__).resolve().parents[2]
# What the build that is to be compared with it has otherwise.
SURROUNDINGS = {"LC_ALL": "C.UTF-8", "TZ": "UTC"}


def git(*arguments):
    done = subprocess.run(["git", "-C", TOP, *arguments], capture_output=True)
    return done.stdout if done.returncode == 0 else None


def state_of_files():
    """A digest of all that is packaged."""
    digest = hashlib.sha256()
    for name in git("ls-files", "-z", "--cached", "--others", "--exclude-standard", "--deduplicate").split(b"\0"):
        path = TOP / os.fsdecode(name)
        if name and path.is_file():
            digest.update(b"%s\0%o\0%s" % (name, path.stat().st_mode & 0o111, hashlib.sha256(path.read_bytes()).digest()))
    return digest.hexdigest()


def build(folder, state, *arguments):
    mark = folder / "built-from"
    if mark.exists() and mark.read_text() == state:
        return
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir(parents=True)
    os.umask(0o022)
    subprocess.run([TOP / "scripts/package", *arguments, folder], check=True, env={**os.environ, **SURROUNDINGS})
    mark.write_text(state)


def main():
    if sys.argv[1] != "--before":
        build(Path(sys.argv[1]), state_of_files())
        return
    commit = (git("rev-parse", "--verify", "--quiet", "HEAD~1") or b"").decode().strip()
    if not commit or git("cat-file", "-e", f"{commit}:debian/control") is None:
        # The first commit that has packages, or a clone without a past: an upgrade is from the same to the same.
        print("build_packages: the commit before has no packages; these stand in for them")
        build(Path(sys.argv[2]), state_of_files())
    else:
        build(Path(sys.argv[2]), commit, "--commit", commit)


if __name__ == "__main__":
    main()
