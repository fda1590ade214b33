#!/usr/bin/env python3
"""What the installed programs offer plug-ins beyond the first table: lines of the log, whom the setup is for, progress,
and blocks on the main loop; in C and in C++.

usage: extensions_test.py BUILD_DIR PLUGIN_DIR
"""

import json
import plistlib
import re
import shutil
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

AGENT, TOOL = "/usr/local/libexec/wlnimbussetup", "/usr/local/bin/welcomer"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
ACCOUNT = "newcomer@nimbus.example"
LINGER = "delaying exit by two minutes"


class Extensions(unittest.TestCase):
    maxDiff = None

    def setUp(self):
        self.folder = Path(tempfile.mkdtemp(prefix="extensions-"))
        self.addCleanup(self.folder.rmdir)
        self.machine = machine.Machine(self.folder / "machine")
        self.addCleanup(self.machine.stop)
        self.machine.install(self.build)
        root = self.machine.root
        (root / "var/log").mkdir()
        (root / "etc/rsyslog.conf").write_text("\n".join([
            'module(load="imuxsock")',
            '*.* action(type="omfile" file="/var/log/syslog" template="RSYSLOG_TraditionalFileFormat" '
            'fileCreateMode="0644")', ""]))
        self.machine._daemons.append(self.machine.start(
            ["/usr/sbin/rsyslogd", "-n", "-f", "/etc/rsyslog.conf", "-i", "/run/rsyslogd.pid"]))
        self.machine.wait_for(lambda: (root / "dev/log").exists(), "the system log's socket")
        self.plugins_folder = root / PLUGIN_FOLDER
        self.plugins_folder.mkdir(parents=True)

    def install_plugin(self, source, name):
        shutil.copy(self.plugins / f"{source}.ncdplugin", self.plugins_folder / f"{name}.ncdplugin")

    def tool(self, *arguments, status=0):
        done = self.machine.run([TOOL, *arguments], user=True)
        self.assertEqual(done.returncode, status, done)
        return done.stdout

    def lines(self):
        logins = json.loads(self.tool("--json", "log"))["logins"] if self.has_logged() else []
        texts = [line["message"] for login in logins for line in login["lines"]]
        return [re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text) for text in texts]

    def has_logged(self):
        log = self.machine.root / "var/log/syslog"
        return log.exists() and "Self destructing" in log.read_text()

    def start_login(self, identifiers, last):
        """An agent that has come to this line; it is not left to linger."""
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps({"delegatesResponseDict": {"delegates": dict.fromkeys(identifiers, {})}}))
        replay.chmod(0o644)
        self.tool("replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist", "--bundle",
                  "/usr/local/share/welcomer/setup-bundle")
        agent = self.machine.start([AGENT], user=True)

        def end():
            agent.kill()
            agent.wait()

        self.addCleanup(end)
        self.machine.wait_for(lambda: last in self.lines(), f"the line {last!r}")

    def test_in_c(self):
        self.install_plugin("ExtensionPlugin", "extended")
        self.start_login(["org.example.extended"], LINGER)
        version = self.tool("--version").split()[1]
        own = [line for line in self.lines() if line.startswith(("plug-in ", "org.example.extended"))]
        expected = [
            "plug-in extended.ncdplugin warning: being made",
            f"plug-in extended.ncdplugin debug: account {ACCOUNT}, home /home/{machine.USER}, root /, real, version {version}",
            "plug-in (unknown) warning: nobody knows whose",
            r"plug-in extended.ncdplugin information: on a thread\nof its own",
            "org.example.extended progress: 0 %",
            "org.example.extended progress: 40 % copying",
            "org.example.extended progress: 0 % copying"]
        self.assertEqual(own[:len(expected)], expected)
        self.assertEqual(own[len(expected):], [
            "plug-in extended.ncdplugin information: at once",
            "plug-in extended.ncdplugin information: after a while on the main thread",
            "plug-in extended.ncdplugin information: dropped: later",
            "plug-in extended.ncdplugin information: cancelled",
            "plug-in extended.ncdplugin information: not cancelled twice",
            "org.example.extended progress: 100 % done",
            "org.example.extended setup: completed (N seconds)"])

    def test_over_the_layer(self):
        self.install_plugin("LayerExtensionPlugin", "layered")
        self.start_login(["org.example.layered"], LINGER)
        self.assertEqual(
            sorted(line for line in self.lines() if "layered" in line and not line.startswith("setting up")),
            sorted([
                "plug-in layered.ncdplugin information: being made",
                f"plug-in layered.ncdplugin information: account {ACCOUNT}, home /home/{machine.USER}, root /, real",
                "org.example.layered progress: 25 % waiting",
                "exception in a block of plug-in layered.ncdplugin: thrown in a block",
                "plug-in layered.ncdplugin information: 2 hold it",
                "plug-in layered.ncdplugin information: cancelled and let go",
                "plug-in layered.ncdplugin information: a block",
                "org.example.layered setup: completed (N seconds)"]))

    def test_progress_shows_where_the_login_is_watched(self):
        self.install_plugin("LayerExtensionPlugin", "waiting")
        self.start_login(["org.example.waiting"], "org.example.waiting progress: 25 % waiting")
        # What there is to be done besides is not of interest here.
        status = json.loads(self.machine.run([TOOL, "--json", "status"], user=True).stdout)
        self.assertEqual([(each["identifier"], each["outcome"], each["progress"])
                          for each in status["lastLogin"]["delegates"]],
                         [("org.example.waiting", "working", "25 % waiting")])
        self.assertIn("has not answered yet, at 25 % waiting", self.machine.run([TOOL, "status"], user=True).stdout)


if __name__ == "__main__":
    machine.enter_namespaces()
    Extensions.build, Extensions.plugins = sys.argv[1], Path(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
