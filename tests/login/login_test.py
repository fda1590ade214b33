#!/usr/bin/env python3
"""From `welcomer setup` to the end of the second login, with what is installed: a real user manager starts the agent.

usage: login_test.py BUILD_DIR PLUGIN ...
"""

import json
import os
import plistlib
import re
import shutil
import sys
import tempfile
import time
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import login as logins  # noqa: E402
import machine  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
LABEL = "com.corvid.welcomer.nimbussetup.user"
UNIT = f"welcomer-agent-{LABEL}.service"
ACCOUNT, PASSWORD = "newcomer", "correct horse"
SERVICE = "com.corvid.nimbus.service."


class LoginStory(unittest.TestCase):
    build, plugins = None, ()

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="login-"))
        cls.machine = machine.Machine(cls.folder / "machine")
        cls.machine.install(cls.build)
        plugin_folder = cls.machine.root / "System/Library/CoreServices/FirstRunPlugins"
        plugin_folder.mkdir(parents=True)
        for plugin in cls.plugins:
            (shutil.copytree if Path(plugin).is_dir() else shutil.copy)(plugin, plugin_folder / Path(plugin).name)
        cls.machine.start_system_log()
        cls.set_up()
        cls.first_login()
        cls.second_login()

    @classmethod
    def tearDownClass(cls):
        cls.machine.stop()
        shutil.rmtree(cls.folder)

    @classmethod
    def tool(cls, *arguments, user=True, password=None):
        command = [TOOL, *arguments]
        if password:
            command = ["/bin/sh", "-c", 'exec "$@" --password-fd 3 3< /tmp/password', "sh", *command]
        done = cls.machine.run(command, user=user)
        if done.returncode != 0:
            raise AssertionError(f"the tool failed: {done}")
        return done.stdout

    @classmethod
    def set_up(cls):
        (cls.machine.root / "tmp/password").write_text(PASSWORD + "\n")
        cls.tool("account", "add", ACCOUNT, "--mail", f"{ACCOUNT}@nimbus.example", user=False, password=PASSWORD)
        # Who signs in is who has the directory.
        directory = cls.machine.root / "var/lib/welcomer"
        for path in (directory, *directory.iterdir()):
            os.chown(path, machine.UID, machine.UID)
        answers = cls.machine.root / "tmp/answers.plist"
        answers.write_bytes(plistlib.dumps({"Account": ACCOUNT}))
        answers.chmod(0o644)
        cls.tool("setup", "--answers", "/tmp/answers.plist", "--bundle", "/usr/local/share/welcomer/setup-bundle",
                 password=PASSWORD)
        cls.launch_agent = cls.machine.home / f"Library/LaunchAgents/{LABEL}.plist"
        cls.installed = cls.launch_agent.exists()
        cls.services_after_setup = cls.services()

    @classmethod
    def services(cls):
        listed = json.loads(cls.tool("--json", "account", "services", ACCOUNT))["services"]
        return {service["service"] for service in listed if service["enabled"]}

    @classmethod
    def texts(cls):
        return [record[2] for record in cls.machine.log_records("wlnimbussetup")]

    @classmethod
    def first_login(cls):
        login = logins.Login(cls.machine)
        login.start_session()
        started = time.monotonic()
        seen = login.systemctl("show", UNIT, "--property=MainPID,SubState").stdout
        cls.seen = dict(line.split("=", 1) for line in seen.splitlines())
        cls.machine.wait_for(lambda: cls.texts()[-1:] == ["exiting"], "the agent's end", seconds=200)
        cls.seconds = time.monotonic() - started
        cls.machine.wait_for(lambda: not login.systemctl("list-units", "--all", "--plain", "--no-legend", UNIT).stdout,
                             "the end of the agent's unit")
        login.end()
        cls.manager_log = (cls.machine.root / "run/user-manager.log").read_text()
        cls.first_texts = cls.texts()
        cls.services_after_login = cls.services()

    @classmethod
    def second_login(cls):
        login = logins.Login(cls.machine)
        login.start_session()
        cls.second_units = login.systemctl("list-units", "--all", "--plain", "--no-legend", "welcomer-agent-*").stdout
        login.end()

    def test_the_setup_installs_the_launch_agent_and_the_login_removes_it(self):
        self.assertTrue(self.installed)
        self.assertFalse(self.launch_agent.exists())

    def test_the_login_starts_the_agent_as_a_unit_of_its_own(self):
        self.assertEqual(self.seen["SubState"], "running")
        self.assertGreater(int(self.seen["MainPID"]), 0)

    def test_the_agent_ends_after_two_minutes_with_status_zero(self):
        self.assertGreaterEqual(self.seconds, 119)
        self.assertNotRegex(self.manager_log, rf"{re.escape(UNIT)}.*(Failed|status=|code=)")

    def test_the_log_is_the_storys(self):
        texts = [re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text) for text in self.first_texts]
        begin, end = texts.index("setting up com.corvid.chatter"), texts.index("delaying exit by two minutes")
        begin = min(begin, texts.index("setting up com.corvid.vidlink"))
        self.assertEqual(texts[:begin], [
            "Self destructing...",
            "Killing onlineaccounts",
            f"Enabling post-login services for account {ACCOUNT}",
            f"Enabling Nimbus service '{SERVICE}contacts'",
            f"Enabling '{SERVICE}calendars' after a 3.00 second delay",
            f"Enabling Nimbus service '{SERVICE}bookmarks'",
            f"{SERVICE}mediastream should be configured pre-login",
            f"Enabling '{SERVICE}reminders' after a 3.00 second delay",
            f"{SERVICE}accountsync should be configured pre-login",
            f"{SERVICE}locator should be configured pre-login",
            f"Enabling Nimbus Mail: {ACCOUNT}@nimbus.example",
            "Enabling Nimbus Notes",
            f"{SERVICE}documents should be configured pre-login",
            "Vidlink: 0 aliases",
            "Chatter: 0 aliases",
        ])
        # Two plug-ins finish beside one another: only each one's own two lines have an order.
        for name in ("chatter", "vidlink"):
            self.assertEqual([text for text in texts[begin:end] if f"com.corvid.{name}" in text],
                             [f"setting up com.corvid.{name}",
                              f"com.corvid.{name} setup+chosen: completed (N seconds)"])
        self.assertEqual(end - begin, 4)
        self.assertEqual(sorted(texts[end + 1:-1]), [f"Enabling Nimbus service '{SERVICE}{name}'"
                                                     for name in ("calendars", "reminders")])
        self.assertEqual(texts[-1], "exiting")
        self.assertEqual({record[:2] for record in self.machine.log_records("wlnimbussetup")}, {(115, "14.3")})

    def test_the_login_turns_on_the_services_that_belong_after_it(self):
        self.assertEqual(self.services_after_setup, {"photo-stream", "account-sync", "locator", "documents"})
        self.assertEqual(self.services_after_login - self.services_after_setup,
                         {"contacts", "calendars", "bookmarks", "reminders", "mail", "notes"})

    def test_the_replay_item_is_gone(self):
        shown = self.machine.run([TOOL, "replay", "show"], user=True)
        self.assertEqual(shown.returncode, 1, shown)

    def test_the_second_login_starts_nothing(self):
        self.assertEqual(self.second_units, "")
        self.assertEqual(self.texts(), self.first_texts)
        self.assertEqual(self.machine.log_records("welcomer-launch-agents"), [])


if __name__ == "__main__":
    machine.enter_namespaces()
    LoginStory.build, LoginStory.plugins = sys.argv[1], sys.argv[2:]
    unittest.main(argv=sys.argv[:1], verbosity=2)
