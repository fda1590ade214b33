#!/usr/bin/env python3
"""Where the installed agent loads plug-ins from: the system's folder, and in its place the one beside the library.

usage: plugin_folder_test.py BUILD_DIR PLUGIN OTHER_PLUGIN
"""

import json
import plistlib
import shutil
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
LABEL = "com.corvid.welcomer.nimbussetup.user"
SYSTEM_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
IDENTIFIERS = ["com.corvid.chatter", "com.corvid.storefront"]


class PluginFolder(unittest.TestCase):
    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="plugin-folder-"))
        self.addCleanup(self.folder.rmdir)
        self.machine = machine.Machine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        self.machine.start_system_log()
        [own] = (self.machine.root / "usr/local").glob("lib*/**/welcomer/plugins")
        shutil.copy(self.plugin, own)
        self.own = f"/{own.relative_to(self.machine.root)}"
        self.replay = self.machine.root / "tmp/replay.plist"
        self.replay.write_bytes(plistlib.dumps({"delegatesResponseDict": {"delegates": dict.fromkeys(IDENTIFIERS, {})}}))
        self.replay.chmod(0o644)

    def tool(self, *arguments):
        return self.machine.run([TOOL, *arguments], user=True)

    def delegates_of_a_login(self):
        """The delegates that the agent sets up; it is not left to linger."""
        stored = self.tool("replay", "store", "--account", "newcomer", "--file", "/tmp/replay.plist", "--bundle",
                           "/usr/local/share/welcomer/setup-bundle")
        self.assertEqual(stored.returncode, 0, stored)
        definition = plistlib.loads((self.machine.home / "Library/LaunchAgents" / f"{LABEL}.plist").read_bytes())
        agent = self.machine.start(definition["ProgramArguments"], user=True)
        texts = lambda: [text for _, _, text in self.machine.log_records("wlnimbussetup")]
        try:
            self.machine.wait_for(lambda: "delaying exit by two minutes" in texts(), "the agent's linger")
        finally:
            agent.kill()
            agent.wait()
        return [name for name in IDENTIFIERS if f"setting up {name}" in texts()
                and any(text.startswith(f"{name} setup") and "completed" in text for text in texts())]

    def doctors_folder(self):
        """The folder that the doctor names, for programs and for people."""
        document = json.loads(self.tool("--json", "doctor").stdout)
        found = [each for each in document["checks"] if each["subject"] == "plug-ins"]
        self.assertEqual([(each["state"], each["text"]) for each in found],
                         [("right", f"they are in {document['pluginFolder']}"), ("right", "all load: 1")])
        self.assertIn(f"plug-ins: they are in {document['pluginFolder']}\n", self.tool("doctor").stdout)
        return document["pluginFolder"]

    def test_where_the_system_has_no_folder_the_one_of_the_installation_serves(self):
        self.assertEqual(self.doctors_folder(), self.own)
        self.assertEqual(self.delegates_of_a_login(), ["com.corvid.storefront"])

    def test_where_the_system_has_one_it_serves_alone(self):
        folder = self.machine.root / SYSTEM_FOLDER
        folder.mkdir(parents=True)
        shutil.copy(self.other_plugin, folder)
        self.assertEqual(self.doctors_folder(), f"/{SYSTEM_FOLDER}")
        self.assertEqual(self.delegates_of_a_login(), ["com.corvid.chatter"])

    def test_an_empty_one_of_the_systems_is_one(self):
        (self.machine.root / SYSTEM_FOLDER).mkdir(parents=True)
        document = json.loads(self.tool("--json", "doctor").stdout)
        self.assertEqual(document["pluginFolder"], f"/{SYSTEM_FOLDER}")
        self.assertEqual(self.delegates_of_a_login(), [])


if __name__ == "__main__":
    machine.enter_namespaces()
    PluginFolder.build, PluginFolder.plugin, PluginFolder.other_plugin = sys.argv[1:4]
    unittest.main(argv=[sys.argv[0], *sys.argv[4:]], verbosity=2)
