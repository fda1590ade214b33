#!/usr/bin/env python3
"""What the installed programs do about files that others could read, and about what a killed or a failed one left.

usage: leftovers_test.py BUILD_DIR
"""

import fcntl
import os
import plistlib
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402
import other_users_test  # noqa: E402
from other_users_test import LABEL, REPLAY  # noqa: E402

STARTER = "/usr/local/libexec/welcomer-launch-agents"
STORED = ["replay", "store", "--account", "newcomer@nimbus.example", "--file", "/tmp/replay.plist", "--bundle",
          "/usr/local/share/welcomer/setup-bundle"]


class Leftovers(other_users_test.InstalledTest):
    def setUp(self):
        super().setUp()
        self.machine.start_system_log()
        replay = self.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        self.agents = self.home / "Library/LaunchAgents"

    def make_agents_folder(self):
        for folder in (self.agents.parent, self.agents):
            folder.mkdir()
            os.chown(folder, machine.UID, machine.UID)

    def leave(self, name):
        """What a process that was killed while it copied has left."""
        path = self.agents / name
        path.write_text("half a defin", encoding="ascii")
        os.chown(path, machine.UID, machine.UID)
        path.chmod(0o600)
        return path

    def names(self):
        return sorted(path.name for path in self.agents.iterdir())

    def records(self, program):
        """All records of a program, up to one that is written now."""
        self.machine.run(["/usr/bin/logger", "-t", "afterwards", "done"])
        before = getattr(self, "marks", 0)
        self.machine.wait_for(lambda: len(self.machine.log_records("afterwards")) > before, "the record")
        self.marks = before + 1
        return [text for _, _, text in self.machine.log_records(program)]

    def test_credentials_that_others_could_read_are_complained_about_and_made_private(self):
        self.succeeds(self.tool(*STORED, user=True))
        items = self.home / "Library/Credentials/Items.plist"
        items.chmod(0o644)
        self.succeeds(self.tool("replay", "show", user=True))
        complaint = (f"The credentials in /home/{machine.USER}/Library/Credentials/Items.plist could be read by everybody; "
                     "they are the user's alone now")
        self.assertEqual(self.records("welcomer"), [complaint])
        self.assertEqual(items.stat().st_mode & 0o777, 0o600)
        self.succeeds(self.tool("replay", "show", user=True))
        self.assertEqual(self.records("welcomer"), [complaint])

    def test_the_next_copy_clears_away_what_a_killed_one_left(self):
        self.make_agents_folder()
        self.leave(".copy-123456")
        with open(self.leave(".copy-7"), "rb") as writing:
            fcntl.flock(writing, fcntl.LOCK_EX)
            self.succeeds(self.tool(*STORED, user=True))
            self.assertEqual(self.names(), [".copy-7", f"{LABEL}.plist"], "one that is being written stays")

    def test_so_does_the_next_login_without_a_word(self):
        self.make_agents_folder()
        self.leave(".copy-123456")
        with open(self.leave(".copy-7"), "rb") as writing:
            fcntl.flock(writing, fcntl.LOCK_EX)
            started = self.machine.run([STARTER], user=True)
            self.assertEqual((started.returncode, started.stdout, started.stderr), (0, "", ""))
            self.assertEqual(self.names(), [".copy-7"])
        self.assertEqual([text for text in self.records("welcomer-launch-agents") if ".copy-" in text], [])

    def test_on_a_full_disk_selecting_an_environment_leaves_no_empty_override(self):
        small = self.root / "small"
        small.mkdir()
        machine.mount("tmpfs", small, "tmpfs", 0, "size=64k")
        (small / "etc/resolver").mkdir(parents=True)
        with open(small / "filler", "wb", buffering=0) as filler:
            try:
                while True:
                    filler.write(b"\0" * 4096)
            except OSError:
                pass
        selected = self.tool("--root", "/small", "switch", "select", "Nimbus1")
        self.fails(selected, 1, "No space left on device")
        left = {path.name: path.read_text() for path in (small / "etc/resolver").glob("*")}
        self.assertEqual(left, {})
        (small / "filler").unlink()
        self.succeeds(self.tool("--root", "/small", "switch", "select", "Nimbus1"))
        self.assertEqual(len(list((small / "etc/resolver").iterdir())), 4)


if __name__ == "__main__":
    machine.enter_namespaces()
    subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
    other_users_test.InstalledTest.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
