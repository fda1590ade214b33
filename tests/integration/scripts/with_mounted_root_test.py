#!/usr/bin/env python3
"""scripts/with-mounted-root in a plain chroot, whose root folder is no mount point.

usage: with_mounted_root_test.py SCRIPT
"""

import os
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

# What a test does that has mounts of its own, and what it finds then.
TEST = "unshare --mount sh -c 'mount -t tmpfs tmpfs /var/elsewhere && pwd'; ls /tmp"


class WithMountedRoot(unittest.TestCase):
    script = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="mounted-root-"))
        self.addCleanup(self.remove)
        self.machine = machine.Machine(self.folder / "machine")
        self.root = self.machine.root / "var/inside"
        for name in ("var/work folder", "var/elsewhere", "tmp", "proc", "dev"):
            (self.root / name).mkdir(parents=True)
        for name in ("usr", "bin", "sbin", "lib", "lib32", "lib64", "libx32"):
            outside = self.machine.root / name
            if outside.is_symlink():
                (self.root / name).symlink_to(os.readlink(outside))
            elif outside.is_dir():
                (self.root / name).mkdir()
                machine.mount(outside, self.root / name, None, machine.MS_BIND | machine.MS_REC)
        machine.mount("proc", self.root / "proc", "proc")
        machine.mount(self.machine.root / "dev", self.root / "dev", None, machine.MS_BIND)
        shutil.copy(self.script, self.root / "var/script")

    def remove(self):
        self.machine.stop()
        shutil.rmtree(self.folder)

    def run_inside(self, *command):
        return subprocess.run(["/usr/sbin/chroot", str(self.root), "sh", "-c", 'cd "/var/work folder" && exec "$@"', "sh",
                               *command], env={"PATH": "/usr/sbin:/usr/bin:/sbin:/bin"}, capture_output=True, text=True,
                              check=False)

    def test_a_plain_chroot_cannot_have_mounts_of_its_own_and_here_it_can(self):
        self.assertNotEqual(self.run_inside("unshare", "--mount", "true").returncode, 0)
        done = self.run_inside("/var/script", "sh", "-c", TEST)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        self.assertEqual(done.stdout.splitlines()[0], "/var/work folder")

    def test_nothing_is_left_and_the_commands_status_is_the_scripts(self):
        before = Path("/proc/self/mountinfo").read_text()
        self.assertEqual(self.run_inside("/var/script", "sh", "-c", 'exit "$1"', "sh", "7").returncode, 7)
        self.assertEqual(list((self.root / "tmp").iterdir()), [])
        self.assertEqual(Path("/proc/self/mountinfo").read_text(), before)

    def test_where_mounts_would_appear_outside_it_refuses(self):
        machine.mount("none", self.machine.root, None, 0x100000)  # shared
        before = Path("/proc/self/mountinfo").read_text()
        done = self.run_inside("/var/script", "true")
        self.assertEqual(done.returncode, 1)
        self.assertRegex(done.stderr, "^with-mounted-root: .*\n$")
        self.assertEqual(Path("/proc/self/mountinfo").read_text(), before)
        self.assertEqual(list((self.root / "tmp").iterdir()), [])


if __name__ == "__main__":
    machine.enter_namespaces()
    WithMountedRoot.script = sys.argv[1]
    unittest.main(argv=sys.argv[:1], verbosity=2)
