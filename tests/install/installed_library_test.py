#!/usr/bin/env python3
"""What `cmake --install` leaves: the shared library, what it exports, who links it, and its modules beside those of another
version.

usage: installed_library_test.py BUILD_DIR CXX LIBDIR VERSION SANITIZERS
"""

import ctypes
import os
import re
import shlex
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

HERE = Path(__file__).resolve().parent
NAME = "libwelcomer.so.0"


def output_of(*command):
    return subprocess.run(list(map(str, command)), check=True, stdout=subprocess.PIPE, text=True, timeout=60).stdout


def dynamic(path, tag):
    return re.findall(rf"\({tag}\).*\[(.*)\]", output_of("readelf", "--dynamic", "--wide", path))


def is_elf(path):
    with path.open("rb") as file:
        return file.read(4) == b"\x7fELF"


class Installed(unittest.TestCase):
    build = compiler = libdir = version = sanitizers = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="installed-library-"))
        cls.prefix = cls.folder / "prefix"
        subprocess.run(["cmake", "--install", cls.build, "--prefix", cls.prefix], check=True, stdout=subprocess.DEVNULL,
                       timeout=120)
        cls.lib = cls.prefix / cls.libdir
        cls.library = cls.lib / NAME

    @classmethod
    def tearDownClass(cls):
        shutil.rmtree(cls.folder)

    def modules(self):
        return sorted((self.lib / "welcomer" / self.version).glob("*.so"))

    def programs(self):
        found = [path for folder in ("bin", "libexec") for path in (self.prefix / folder).iterdir()]
        self.assertGreaterEqual(len(found), 2)
        return found


class Library(Installed):
    def test_its_name_is_that_of_its_interface(self):
        self.assertEqual(dynamic(self.library, "SONAME"), [NAME])
        self.assertEqual(os.readlink(self.lib / "libwelcomer.so"), NAME)
        self.assertEqual(list(self.lib.glob("*.a")), [], "a second copy could be linked from an archive")

    def exported(self):
        """Of each kind of symbol, the names with their versions."""
        found = []
        for line in output_of("nm", "--dynamic", "--defined-only", "--with-symbol-versions", "--demangle", self.library).splitlines():
            _, kind, name = line.split(" ", 2)
            if kind != "A":
                found.append((kind, *name.rsplit("@@", 1)))
        return found

    def test_it_exports_the_system_and_nothing_else(self):
        exported = self.exported()
        self.assertGreater(len(exported), 300)
        self.assertEqual([name for _, name, _ in exported if not re.match(
            r"(vtable for |typeinfo (name )?for )?welcomer::", name)], [])

    def test_what_the_backends_export_is_for_this_version_alone(self):
        private = re.compile(r"(\w+ )*welcomer::(desktop|local|network|posix|simulated)::")
        for _, name, version in self.exported():
            expected = f"WELCOMER_PRIVATE_{self.version}" if private.match(name) else "WELCOMER_0"
            if not name.startswith(("welcomer::reportUnexpectedEnd", "welcomer::restoreStoredNetwork")):
                self.assertEqual(version, expected, name)

    def test_nothing_that_changes_is_exported(self):
        self.assertEqual([name for kind, name, _ in self.exported() if kind in "BbDdu" and "vtable for" not in name
                          and "typeinfo" not in name], [], "a program would have another copy of it")

    def test_it_starts_without_what_only_some_need(self):
        for path in (self.library, *self.programs()):
            with self.subTest(path.name):
                self.assertEqual([name for name in dynamic(path, "NEEDED")
                                  if re.match(r"lib(mnl|crypt|gio|glib|nm|secret|goa)\b", name)], [])

    def test_programs_link_it(self):
        for path in self.programs():
            with self.subTest(path.name):
                self.assertIn(NAME, dynamic(path, "NEEDED"))

    def test_programs_and_modules_bring_no_copy_of_their_own(self):
        if self.sanitizers:
            own = set()  # the sanitizers' build is not optimised: every inline function has a copy
        else:
            own = {name for kind, name, _ in self.exported() if kind == "T"}
            self.assertGreater(len(own), 200)
        self.assertEqual(len(self.modules()) > 0, (self.build / "lib/welcomer" / self.version).exists())
        for path in (*self.programs(), *self.modules()):
            with self.subTest(path.name):
                defined = {line.split(" ", 2)[2] for line in output_of("nm", "--defined-only", "--demangle", path).splitlines()
                           if line.split(" ", 2)[1] in "Tt"}
                self.assertEqual(sorted(defined & own), [])

    def test_a_moved_tree_finds_it(self):
        moved = self.folder / "elsewhere"
        self.prefix.rename(moved)
        try:
            for program in ("bin/welcomer", "libexec/wlnimbussetup"):
                self.assertIn(self.version, output_of(moved / program, "--version"))
        finally:
            moved.rename(self.prefix)

    def test_the_manifest_names_all_that_is_installed(self):
        stage = self.folder / "stage"
        copy = self.folder / "build"
        copy.mkdir()
        shutil.copy(self.build / "cmake_install.cmake", copy)
        script = (copy / "cmake_install.cmake").read_text()
        # The list is written beside the script; the build's own may be another installation's at the same time.
        (copy / "cmake_install.cmake").write_text(script.replace(f'"{self.build}/${{CMAKE_INSTALL_MANIFEST}}"',
                                                                 f'"{copy}/${{CMAKE_INSTALL_MANIFEST}}"'))
        subprocess.run(["cmake", f"-DCMAKE_INSTALL_PREFIX={stage}", "-P", copy / "cmake_install.cmake"], check=True,
                       stdout=subprocess.DEVNULL, timeout=120)
        listed = set((copy / "install_manifest.txt").read_text().splitlines())
        there = {str(path) for path in stage.rglob("*") if path.is_symlink() or path.is_file()}
        self.assertEqual(there - listed, set())
        self.assertEqual(listed - there, set())


class Modules(Installed):
    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        flags = shlex.split(output_of("pkg-config", "--cflags", "--libs",
                                      cls.prefix / cls.libdir / "pkgconfig/welcomer.pc"))
        cls.application = cls.folder / "application"
        sanitize = [f"-fsanitize={cls.sanitizers}"] if cls.sanitizers else []
        subprocess.run([cls.compiler, *sanitize, HERE / "modules/application.cpp", *flags, f"-Wl,-rpath,{cls.lib}", "-o",
                        cls.application], check=True, timeout=300)

    def setUp(self):
        self.own = self.lib / "welcomer" / self.version
        self.other = self.lib / "welcomer" / "99.0.0"
        self.kept = self.folder / "kept"
        shutil.copytree(self.own, self.kept)

    def tearDown(self):
        for folder in (self.own, self.other):
            shutil.rmtree(folder, ignore_errors=True)
        self.kept.rename(self.own)

    def run_while(self, change):
        """What the application says when this happens after its start."""
        process = subprocess.Popen([self.application], stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
        self.assertEqual(process.stdout.readline(), "started\n")
        change()
        said, _ = process.communicate("\n", timeout=60)
        self.assertEqual(process.returncode, 0)
        return said.splitlines()

    def test_its_own_modules_serve(self):
        self.assertEqual(self.run_while(lambda: None), ["run loop: the desktop's"])

    def test_they_serve_beside_those_of_another_version(self):
        self.assertEqual(self.run_while(lambda: shutil.copytree(self.own, self.other)), ["run loop: the desktop's"])

    def test_after_an_upgrade_one_line_says_that_they_are_gone(self):
        self.assertEqual(self.run_while(lambda: self.own.rename(self.other)), [
            "logged 115: The desktop's runloop is not used, but what is local: the module runloop.so of version "
            f"{self.version} is not installed, but that of version 99.0.0", "run loop: local"])

    def test_without_the_package_of_modules_there_is_nothing_to_say(self):
        self.assertEqual(self.run_while(lambda: shutil.rmtree(self.own)), ["run loop: local"])

    def replace_in_module(self, name, old, new):
        self.assertEqual(len(old), len(new))
        path = self.own / f"{name}.so"
        content = path.read_bytes()
        self.assertIn(old, content)
        path.unlink()  # another program may have the old one in use
        path.write_bytes(content.replace(old, new))
        return path

    def test_modules_of_another_build_are_refused(self):
        old = f"{self.version} ".encode()
        said = self.run_while(lambda: self.replace_in_module("runloop", old, b"X" + old[1:]))
        self.assertEqual(len(said), 2, said)
        self.assertRegex(said[0], "^logged 115: .*/runloop.so is of another build: X")
        self.assertEqual(said[1], "run loop: local")

    def test_the_loader_refuses_what_takes_from_the_backends_of_another_version(self):
        if self.sanitizers or not (self.own / "networkstate.so").exists():
            return  # their runtime comes first in a process, and Python has none; or built without it
        ctypes.CDLL(str(self.own / "networkstate.so"))
        old = f"WELCOMER_PRIVATE_{self.version}".encode()
        path = self.replace_in_module("networkstate", old, old[:-1] + b"X")
        other = path.with_name("other.so")
        path.rename(other)  # the first one stays loaded
        with self.assertRaisesRegex(OSError, "WELCOMER_PRIVATE_.*X' not found"):
            ctypes.CDLL(str(other))


if __name__ == "__main__":
    Installed.build = Path(sys.argv[1])
    Installed.compiler, Installed.libdir, Installed.version, Installed.sanitizers = sys.argv[2:6]
    if not (Installed.build / "lib/welcomer" / Installed.version / "runloop.so").exists():
        del Modules  # built without them
    unittest.main(argv=[sys.argv[0], *sys.argv[6:]])
