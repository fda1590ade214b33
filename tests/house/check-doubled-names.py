#!/usr/bin/env python3
"""Checks that no function and no class of a source tree's Python hides another one that stands above it.

usage: check-doubled-names.py [TREE]

Of two tests with one name, only the second one runs. Prints one line per finding and exits 1 when there is any.
"""

import ast
import sys

import house

DEFINITIONS = (ast.FunctionDef, ast.AsyncFunctionDef, ast.ClassDef)


def is_python(path):
    if path.suffix or not path.is_file():
        return path.suffix == ".py"
    with path.open("rb") as file:
        return file.readline().startswith(b"#!/usr/bin/env python3")


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
    for path in filter(is_python, house.files(tree)):
        for line, name in doubled_names(ast.parse(path.read_bytes())):
            yield f"{path.relative_to(tree).as_posix()}:{line}: another {name} stands above it, and is hidden"


if __name__ == "__main__":
    sys.exit(house.report(findings, "no name hides another one"))
