#!/usr/bin/env python3
"""The installed agent at a login whose account file and preferences are damaged: it says so in the system log.

usage: damaged-files-test.py BUILD_DIR
"""

import plistlib
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

ACCOUNT = "newcomer@nimbus.example"
TORN = "<plist><dict><key>torn"
PRIORITY = (115, "14.3")


class DamagedFiles(unittest.TestCase):
    build = None

    def setUp(self):
        self.machine = machine.Machine(tempfile.mkdtemp(prefix="damaged-files-"))
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        self.machine.start_system_log()
        self.accounts = self.write("Library/Accounts/Accounts.plist", TORN)
        self.preferences = self.write("Library/Preferences/com.corvid.welcomer.plist", TORN)
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps({}))
        replay.chmod(0o644)
        stored = self.machine.run(
            ["/usr/local/bin/welcomer", "replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist",
             "--bundle", "/usr/local/share/welcomer/setup-bundle"], user=True)
        self.assertEqual(stored.returncode, 0, stored)

    def write(self, path, text):
        file = self.machine.home / path
        file.parent.mkdir(parents=True)
        file.write_text(text, encoding="utf-8")
        script = f"chown -R {machine.UID}:{machine.UID} /home/{machine.USER}"
        self.assertEqual(self.machine.run(["/bin/sh", "-c", script]).returncode, 0)
        return file

    def test_each_is_set_aside_with_one_record(self):
        definition = self.machine.home / "Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist"
        agent = self.machine.start(plistlib.loads(definition.read_bytes())["ProgramArguments"], user=True)
        try:
            self.machine.wait_for(
                lambda: any(text == "delaying exit by two minutes" for _, _, text in self.records()), "the linger")
        finally:
            agent.kill()  # the two minutes are nothing to this test
            agent.wait()
        home = f"/home/{machine.USER}/Library"
        damaged = r" are damaged (line 1, column "
        for file, begin in ((self.accounts, f"The accounts in {home}/Accounts{damaged}"),
                            (self.preferences, f"Preferences com.corvid.welcomer{damaged}")):
            with self.subTest(file.name):
                told = [record for record in self.records() if record[2].startswith(begin)]
                self.assertEqual(len(told), 1, self.records())
                self.assertEqual(told[0][:2], PRIORITY)
                other = f"{home}/{file.parent.name}/{file.name}.damaged"
                self.assertTrue(told[0][2].endswith(f") and now at {other}"), told)
                self.assertEqual((self.machine.root / other.lstrip("/")).read_text(encoding="utf-8"), TORN)

    def records(self):
        return self.machine.log_records("wlnimbussetup")


if __name__ == "__main__":
    machine.enter_namespaces()
    DamagedFiles.build = sys.argv[1]
    unittest.main(argv=sys.argv[:1], verbosity=2)
