#!/usr/bin/env python3
"""What plug-ins say, in the system log of the installed agent: one record for each line of the agent's, whatever
is in it, and none that somebody else has made up.

usage: plugin_texts_test.py BUILD_DIR PLUGIN ...
"""

import plistlib
import shutil
import socket
import sys
import tempfile
import time
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

LABEL = "com.corvid.welcomer.nimbussetup.user"
ACCOUNT = "newcomer@nimbus.example"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
REPLAY = {"delegatesResponseDict": {"delegates": {
    "com.corvid.answers\n<115>forged": {}, "com.corvid.raises": {}, "com.corvid.loses": {}}}}
FORGERY = r"\n<115>forged\x1b[2J\x7f\x0d\x85\x9b\u{2028}\u{2029}"
LONGEST = 1024


def bounded(text):
    """A plug-in's text of a million characters, as it is in a line."""
    return text + FORGERY + "x" * (LONGEST - len("…".encode()) - len(text + FORGERY)) + "…"


class LogSocket:
    """The system log's socket, with nobody behind it who would cut or change a record."""

    def __init__(self, path):
        self._socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self._socket.bind(str(path))
        path.chmod(0o666)
        self._socket.settimeout(60)

    def take_up_to(self, last):
        """The texts of the records that have come, up to one that ends like this."""
        texts = []
        end = time.monotonic() + 60
        while not texts or not texts[-1].endswith(last):
            if time.monotonic() > end:
                raise TimeoutError(f"no record ends in {last!r}: {texts}")
            record = self._socket.recv(1 << 21).decode("utf-8")
            # "<115>Nov 20 22:06:34 wlnimbussetup: text"
            head, _, text = record.partition("wlnimbussetup: ")
            assert head.startswith("<115>"), record
            texts.append(text)
        return texts

    def close(self):
        self._socket.close()


class PluginTexts(unittest.TestCase):
    build = None
    plugins = ()

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="plugin-texts-"))
        self.addCleanup(self.folder.rmdir)
        self.machine = machine.Machine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        plugin_folder = self.machine.root / PLUGIN_FOLDER
        plugin_folder.mkdir(parents=True)
        for plugin in map(Path, self.plugins):
            shutil.copy(plugin, plugin_folder / plugin.name)
        # Entries that are no plug-ins, whose names are the texts.
        (plugin_folder / "empty\n<115>forged.ncdplugin").write_text("no library")
        self.log = LogSocket(self.machine.root / "dev/log")
        self.addCleanup(self.log.close)

    def agents_lines(self, account=ACCOUNT):
        """The lines of a login, up to the two minutes that nobody needs to wait for."""
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps(REPLAY))
        replay.chmod(0o644)
        stored = self.machine.run(
            ["/usr/local/bin/welcomer", "replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist",
             "--bundle", "/usr/local/share/welcomer/setup-bundle"], user=True)
        self.assertEqual(stored.returncode, 0, stored)
        # No command line is long enough for every name.
        items = self.machine.home / "Library/Credentials/Items.plist"
        items.write_bytes(items.read_bytes().replace(f"<string>{ACCOUNT}<".encode(), f"<string>{account}<".encode()))
        definition = plistlib.loads((self.machine.home / "Library/LaunchAgents" / f"{LABEL}.plist").read_bytes())
        agent = self.machine.start(definition["ProgramArguments"], user=True)
        try:
            return self.log.take_up_to("delaying exit by two minutes")
        finally:
            agent.kill()
            agent.wait()

    def test_each_line_is_one_record_and_none_is_lost_or_forged(self):
        texts = [text.split(" seconds)", 1) for text in self.agents_lines()]
        # Without the seconds, which differ.
        texts = [first if not rest else first.rsplit("(", 1)[0] + rest[0] for first, *rest in texts]
        for line in (
                r"Nimbus Plugins: Failed to get principal class for empty\n<115>forged.ncdplugin",
                "Nimbus Plugins: Exception querying 'HasNoIdentifier.ncdplugin' for id on load: " + bounded("none"),
                "exception querying plugin <Text" + FORGERY + "> for id: " + bounded("lost"),
                r"no cached response for com.corvid.waits\n<115>forged",
                r"setting up com.corvid.answers\n<115>forged",
                r"com.corvid.answers\n<115>forged setup: " + bounded("failed") + " ",
                "setting up com.corvid.raises",
                "exception in setup response for plugin com.corvid.raises : " + bounded("raised")):
            self.assertEqual(texts.count(line), 1, f"{line!r} in {texts!r}")
        for text in texts:
            self.assertTrue(text.isprintable(), text)
            self.assertFalse(text.startswith(("<115>", "forged")), text)

    def test_a_line_of_the_agents_own_that_no_datagram_holds_is_cut(self):
        begin = "Enabling post-login services for account "
        line = next((text for text in self.agents_lines("é" * 150_000) if text.startswith(begin)), "lost")
        self.assertRegex(line, begin + "é+…$")
        self.assertLess(64 * 1024 - 4, len(line.encode()))
        self.assertLessEqual(len(line.encode()), 64 * 1024)


if __name__ == "__main__":
    machine.enter_namespaces()
    PluginTexts.build, PluginTexts.plugins = sys.argv[1], sys.argv[2:]
    unittest.main(argv=sys.argv[:1], verbosity=2)
