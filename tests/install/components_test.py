#!/usr/bin/env python3
"""The components of `cmake --install`: one for each Debian package, with the same files.

usage: components_test.py BUILD_DIR LIBDIR
"""

import os
import subprocess
import sys
import tempfile
import unittest
from fnmatch import fnmatch
from pathlib import Path

DEBIAN = Path(__file__).resolve().parents[2] / "debian"
BUILD = LIBDIR = None
# By component, its package.
PACKAGES = {"welcomer": "welcomer", "desktop": "welcomer-desktop", "library": "libwelcomer0", "dev": "libwelcomer-dev",
            "plugin-dev": "welcomer-plugin-dev", "resolver-sync": "welcomer-resolver-sync",
            "account-server": "welcomer-account-server"}


def files_of(*arguments):
    """What an installation below /usr leaves there, by path; an empty folder is one, too."""
    with tempfile.TemporaryDirectory(prefix="components-") as stage:
        subprocess.run(["cmake", "--install", BUILD, "--prefix", "/usr", *arguments], check=True, timeout=120,
                       stdout=subprocess.DEVNULL, env={**os.environ, "DESTDIR": stage})
        return {str(path.relative_to(stage)) for path in Path(stage).rglob("*")
                if path.is_symlink() or path.is_file() or not any(path.iterdir())}


def is_in(path, package):
    """Whether a package has a file, as its list says: shell patterns of files and folders."""
    patterns = (DEBIAN / f"{package}.install").read_text(encoding="ascii").split()
    # A package has libraries in a folder of their architecture, and its system units where systemd itself has them.
    patterns = [pattern.replace("usr/lib/*/", f"usr/{LIBDIR}/", 1).replace("lib/systemd/system/", "usr/lib/systemd/system/", 1)
                if pattern.startswith(("usr/lib/*/", "lib/")) else pattern for pattern in patterns]
    parts = path.split("/")
    ways = ["/".join(parts[:count]) for count in range(1, len(parts) + 1)]
    return any(fnmatch(way, pattern) and way.count("/") == pattern.count("/") for way in ways for pattern in patterns)


class Components(unittest.TestCase):
    maxDiff = None

    def test_there_is_one_for_each_package_that_has_files_installed(self):
        self.assertEqual(sorted(PACKAGES.values()), sorted(path.stem for path in DEBIAN.glob("*.install")))

    def test_each_has_the_files_of_its_package_and_all_of_them_are_the_whole(self):
        whole = files_of()
        together = []
        for component, package in PACKAGES.items():
            with self.subTest(component):
                own = files_of("--component", component)
                self.assertEqual(own, {path for path in whole if is_in(path, package)})
                self.assertTrue(own or component in ("desktop", "account-server"))  # which may not have been built
                together += own
        self.assertEqual(sorted(together), sorted(whole))

    def test_the_resolvers_service_is_one_by_itself(self):
        self.assertEqual(sorted(files_of("--component", "resolver-sync")), [
            "usr/lib/systemd/system-preset/80-welcomer-resolver-sync.preset",
            "usr/lib/systemd/system/welcomer-resolver-sync.service",
            "usr/lib/sysusers.d/welcomer-resolver-sync.conf",
            "usr/lib/tmpfiles.d/welcomer-resolver-sync.conf",
            "usr/libexec/welcomer-resolver-sync",
            "usr/share/man/man8/welcomer-resolver-sync.8",
            "usr/share/polkit-1/rules.d/welcomer-resolver-sync.rules",
        ])


if __name__ == "__main__":
    BUILD, LIBDIR = sys.argv[1:3]
    unittest.main(argv=sys.argv[:1], verbosity=2)
