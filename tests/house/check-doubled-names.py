#!/usr/bin/env python3
"""Checks that no function and no class of a source tree's Python hides another one that stands above it.

usage: check-doubled-names.py [TREE]

Of two tests with one name, only the second one runs. Prints one line per finding and exits 1 when there is any.
"""

import ast
import os
import sys
from pathlib import Path

DEFINITIONS = (ast.FunctionDef, ast.AsyncFunctionDef, ast.ClassDef)


def python_files(tree):
    for folder, folders, names in os.walk(tree):
        folders[:] = [name for name in folders if not name.startswith((".", "build", "_build"))]
        for path in (Path(folder, name) for name in names):
            if path.suffix == ".py":
                yield path
            elif not path.suffix and path.is_file():
                with path.open("rb") as file:
                    if file.readline().startswith(b"#!/usr/bin/env python3"):
                        yield path


def adds_to_another(definition):
    """A property's setter has the name of what it adds to."""
    return any(isinstance(decorator, ast.Attribute) and getattr(decorator.value, "id", None) == definition.name
               for decorator in definition.decorator_list)


def doubled_names(tree):
    """The line and the name of each definition that hides one in the same body."""
    for scope in ast.walk(tree):
        if not isinstance(scope, (ast.Module, *DEFINITIONS)):
            continue
        found = set()
        for definition in scope.body:
            if isinstance(definition, DEFINITIONS) and not adds_to_another(definition):
                if definition.name in found:
                    yield definition.lineno, definition.name
                found.add(definition.name)


def findings(tree):
    for path in sorted(python_files(tree)):
        for line, name in doubled_names(ast.parse(path.read_bytes())):
            yield f"{path.relative_to(tree).as_posix()}:{line}: another {name} stands above it, and is hidden"


def main():
    found = list(findings(Path(sys.argv[1] if len(sys.argv) > 1 else ".")))
    print("\n".join(found) if found else "no name hides another one")
    return 1 if found else 0


if __name__ == "__main__":
    sys.exit(main())
