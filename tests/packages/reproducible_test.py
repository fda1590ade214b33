#!/usr/bin/env python3
"""The packages, built once more from their source package under other circumstances, are the same to the last byte.

usage: reproducible_test.py PACKAGES

The second build has another path, user, home, host name, time zone, locale, umask and number of jobs, a later time, and no
compiler's cache.
"""

import hashlib
import os
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

PACKAGES = None
OTHER = "nobody"
ENVIRONMENT = {"PATH": "/usr/sbin:/usr/bin:/sbin:/bin", "LC_ALL": "C", "TZ": "Elsewhere-14", "CCACHE_DISABLE": "1",
               "DEB_BUILD_OPTIONS": "parallel=1", "USER": OTHER, "LOGNAME": OTHER}
BUILD = 'hostname elsewhere && umask 0002 && cd "$0" && exec setpriv --reuid {0} --regid nogroup --clear-groups "$@"'.format(OTHER)


def digests(folder):
    return {path.name: hashlib.sha256(path.read_bytes()).hexdigest() for path in Path(folder).glob("*.deb")}


def differences(name, first, second):
    """The files of a package that are not the same in both folders."""
    with tempfile.TemporaryDirectory() as place:
        for part, folder in (("first", first), ("second", second)):
            subprocess.run(["dpkg-deb", "--raw-extract", Path(folder) / name, Path(place) / part], check=True)
        return subprocess.run(["diff", "--recursive", "--no-dereference", "--brief", "first", "second"], cwd=place,
                              capture_output=True, text=True).stdout


class ReproducibleTest(unittest.TestCase):
    maxDiff = None

    def test_a_build_elsewhere_makes_the_same_packages(self):
        first = digests(PACKAGES)
        self.assertGreaterEqual(len(first), 6)
        with tempfile.TemporaryDirectory(prefix="reproducible-") as place:
            os.chmod(place, 0o755)
            folder = Path(place) / "a/longer/path/of-another-name"
            folder.mkdir(parents=True)
            subprocess.run(["dpkg-source", "--extract", *PACKAGES.glob("*.dsc"), folder / "source"], check=True,
                           stdout=subprocess.DEVNULL)
            subprocess.run(["chown", "-R", f"{OTHER}:nogroup", place], check=True)
            built = subprocess.run(
                ["unshare", "--uts", "--net", "sh", "-ec", BUILD, folder / "source",
                 "dpkg-buildpackage", "--no-sign", "--build=binary"],
                env={**ENVIRONMENT, "HOME": str(folder)}, capture_output=True, text=True)
            self.assertEqual(built.returncode, 0, built.stdout[-2000:] + built.stderr[-2000:])
            second = digests(folder)
            other = {name: differences(name, PACKAGES, folder) for name in first
                     if name in second and first[name] != second[name]}
        self.assertEqual((sorted(first), other), (sorted(second), {}))


if __name__ == "__main__":
    if os.geteuid() != 0:
        os.execvp("sudo", ["sudo", "-n", sys.executable, "-B", *sys.argv])
    PACKAGES = Path(sys.argv.pop(1))
    unittest.main(verbosity=2)
