"""What the checks of the source tree, and their tests, have in common."""

import importlib.util
import os
import sys
import tempfile
from pathlib import Path


def files(tree):
    """The files of a tree, in order, without what is built in it."""
    found = []
    for folder, folders, names in os.walk(tree):
        folders[:] = [name for name in folders if not name.startswith((".", "build", "_build"))]
        found += (Path(folder, name) for name in names)
    return sorted(found)


def report(findings, well):
    """Prints what was found in the tree that the command line names, or that all is well; returns the exit status."""
    found = list(findings(Path(sys.argv[1] if len(sys.argv) > 1 else ".")))
    print("\n".join(found) if found else well)
    return 1 if found else 0


def load(name):
    """A check, by the name of its program."""
    specification = importlib.util.spec_from_file_location(name, Path(__file__).resolve().parent / f"{name}.py")
    check = importlib.util.module_from_spec(specification)
    specification.loader.exec_module(check)
    return check


def findings_in(check, texts):
    """What a check finds in a tree of these files, from their names to their texts."""
    with tempfile.TemporaryDirectory() as folder:
        for name, text in texts.items():
            path = Path(folder, name)
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(text, encoding="utf-8")
        return list(check(Path(folder)))
