#!/usr/bin/env python3
"""What the installed doctor finds wrong below a root, and that it finds nothing where all is well.

usage: installed_doctor_test.py BUILD_DIR PLUGIN_DIR
"""

import json
import os
import plistlib
import pwd
import shutil
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

BUILD, OWN_PLUGINS = map(Path, sys.argv[1:3])
HOME = pwd.getpwuid(os.geteuid()).pw_dir
SYSTEM_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
LAUNCH_AGENT = "Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist"


def setUpModule():
    global FOLDER, PREFIX
    # A folder that nobody else may write, as the programs' own has to be.
    FOLDER = Path(tempfile.mkdtemp(prefix="installed-doctor-"))
    unittest.addModuleCleanup(shutil.rmtree, FOLDER)
    PREFIX = FOLDER / "prefix"
    subprocess.run(["cmake", "--install", BUILD, "--prefix", PREFIX], check=True, stdout=subprocess.DEVNULL, timeout=120)


class DoctorTest(unittest.TestCase):
    def setUp(self):
        self.root = Path(tempfile.mkdtemp(prefix="root-", dir=FOLDER))
        self.home = self.root / HOME.lstrip("/")
        self.home.mkdir(parents=True, mode=0o755)
        self.write("usr/lib/systemd/user/welcomer-launch-agents.service", "[Unit]\n")

    def write(self, name, text):
        path = self.root / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text(text, encoding="utf-8")
        return path

    def run_tool(self, *arguments):
        # Plug-ins that the tests make tell by this file that they were loaded.
        self.trace = self.root / "loaded"
        self.trace.unlink(missing_ok=True)
        return subprocess.run([PREFIX / "bin/welcomer", "--root", self.root, *map(str, arguments)], capture_output=True,
                              text=True, timeout=100, stdin=subprocess.DEVNULL, check=False,
                              env={**os.environ, "TRACE_OF_LOADING": str(self.trace)})

    def doctor(self, failure=None):
        """The doctor's document, which ends with this failure."""
        result = self.run_tool("doctor", "--json")
        self.assertEqual((result.returncode, result.stderr),
                         (1, f"welcomer: {failure}\n") if failure else (0, ""), result.stdout)
        document = json.loads(result.stdout)
        wrong = [each for each in document["checks"] if each["state"] == "wrong"]
        people = self.run_tool("doctor")
        self.assertEqual((people.returncode, people.stderr), (result.returncode, result.stderr))
        self.assertEqual(people.stdout.count("WRONG  "), len(wrong), people.stdout)
        for each in wrong:
            self.assertIn(f"WRONG  {each['subject']}: {each['text']}\n", people.stdout)
        return document

    def wrong(self, failure="one thing is wrong"):
        return [(each["subject"], each["text"]) for each in self.doctor(failure)["checks"] if each["state"] == "wrong"]

    def right(self, subject):
        return [each["text"] for each in self.doctor()["checks"] if each["subject"] == subject and each["state"] == "right"]


class Units(DoctorTest):
    def test_the_unit_or_the_autostart_entry_will_do(self):
        self.assertEqual(self.right("units"), ["welcomer-launch-agents.service starts agents at a login"])
        (self.root / "usr/lib/systemd/user/welcomer-launch-agents.service").unlink()
        self.write("etc/xdg/autostart/welcomer-launch-agents.desktop", "")
        self.assertEqual(self.right("units"), ["/etc/xdg/autostart/welcomer-launch-agents.desktop starts agents at a login"])

    def test_without_either_nothing_starts_agents(self):
        (self.root / "usr/lib/systemd/user/welcomer-launch-agents.service").unlink()
        self.assertEqual(self.wrong(), [("units", "nothing starts agents at a login")])


class NextLogin(DoctorTest):
    def store(self):
        bundle = self.root / "Setup.app"
        shutil.copytree(PREFIX / "share/welcomer/setup-bundle", bundle, symlinks=True)
        program = plistlib.loads((bundle / "Resources" / Path(LAUNCH_AGENT).name).read_bytes())["ProgramArguments"][0]
        self.program = self.write(program.lstrip("/"), "")
        replay = self.root / "replay.plist"
        replay.write_bytes(plistlib.dumps({"delegatesResponseDict": {}}))
        stored = self.run_tool("replay", "store", "--account", "a", "--file", replay, "--bundle", "/Setup.app")
        self.assertEqual(stored.returncode, 0, stored)

    def test_nothing_waits(self):
        self.assertEqual(self.right("next login"), ["nothing waits"])

    def test_an_item_with_its_agent_is_well(self):
        self.store()
        self.assertEqual(self.right("next login"), ["a replay item waits, and the agent will start for it"])

    def test_an_item_without_its_agent_is_not(self):
        self.store()
        (self.home / LAUNCH_AGENT).unlink()
        self.assertEqual(self.wrong(), [("next login", "a replay item waits, and no agent will start for it")])

    def test_an_agent_without_an_item_is_not(self):
        self.store()
        self.assertEqual(self.run_tool("replay", "delete").returncode, 0)
        self.assertEqual(self.wrong(), [("next login", "the agent will start, and find no replay item")])

    def test_an_agent_whose_program_is_gone_is_not(self):
        self.store()
        self.program.unlink()
        self.assertEqual(self.wrong(), [("next login", "a replay item waits, but the agent's file starts no agent: "
                                         f"the program that it names is not there: /{self.program.relative_to(self.root)}")])

    def test_a_launch_agent_that_starts_nothing_is_not(self):
        self.store()
        for content, why in ((b"", "it is no property list: byte 0: the data is empty"),
                             (plistlib.dumps({"RunAtLoad": True, "ProgramArguments": []}),
                              "the program that it names is not there: none"),
                             (plistlib.dumps({"ProgramArguments": ["/bin/sh"]}),
                              "it does not say that it starts at the login")):
            (self.home / LAUNCH_AGENT).write_bytes(content)
            [(subject, text)] = self.wrong()
            self.assertEqual(subject, "next login")
            self.assertEqual(text, f"a replay item waits, but the agent's file starts no agent: {why}")


class Plugins(DoctorTest):
    def setUp(self):
        super().setUp()
        self.plugins = self.root / SYSTEM_FOLDER
        self.plugins.mkdir(parents=True)

    def install(self, plugin):
        return Path(shutil.copy(plugin, self.plugins))

    def test_those_that_load_are_well(self):
        self.install(OWN_PLUGINS / "TalkingPlugin.ncdplugin")
        self.assertEqual(self.right("plug-ins"), [f"they are in /{SYSTEM_FOLDER}", "all load: 1"])
        self.assertEqual(self.doctor()["pluginFolder"], f"/{SYSTEM_FOLDER}")

    def test_one_that_does_not_load_is_not(self):
        self.install(OWN_PLUGINS / "SymbolLessLibrary.ncdplugin")
        [(subject, text)] = self.wrong()
        self.assertEqual(subject, "plug-ins")
        self.assertRegex(text, r"^SymbolLessLibrary\.ncdplugin: .+")

    def test_one_that_ends_its_process_does_not_end_the_doctor(self):
        self.install(OWN_PLUGINS / "CrashingPlugin.ncdplugin")
        [(subject, text)] = self.wrong()
        self.assertEqual(subject, "plug-ins")
        self.assertEqual(text, "CrashingPlugin.ncdplugin: it ends the process: SIGABRT")

    def assert_loaded(self):
        self.assertIn("all load: 1", self.right("plug-ins"))
        self.assertTrue(self.trace.exists())

    def assert_stranger(self, text):
        """That the doctor finds this wrong, and does not have strangers' code loaded."""
        document = self.doctor("one thing is wrong")
        self.assertEqual([(each["state"], each["text"]) for each in document["checks"] if each["subject"] == "plug-ins"],
                         [("right", f"they are in /{SYSTEM_FOLDER}"), ("wrong", text),
                          ("unknown", "they are not loaded: what others may change would run with the rights of this "
                           "process")])
        self.assertFalse(self.trace.exists())

    def test_what_others_may_write_is_not_and_is_not_loaded(self):
        plugin = self.install(OWN_PLUGINS / "TracingPlugin.ncdplugin")
        self.assert_loaded()
        shown = self.root
        for path, mode, text in ((self.plugins, 0o777, f"everybody may write {shown}/{SYSTEM_FOLDER}"),
                                 (self.plugins, 0o1777, f"everybody may write {shown}/{SYSTEM_FOLDER}"),
                                 (plugin, 0o646, f"everybody may write {plugin}"),
                                 (self.root / "System", 0o777, f"everybody may write {shown}/System")):
            before = path.stat().st_mode
            path.chmod(mode)
            self.assert_stranger(text)
            path.chmod(before)
        self.assert_loaded()

    @unittest.skipIf(os.geteuid() != 0, "giving files to others needs root")
    def test_what_belongs_to_others_is_not_and_is_not_loaded(self):
        plugin = self.install(OWN_PLUGINS / "TracingPlugin.ncdplugin")
        os.chown(plugin, 12345, 0)
        self.assert_stranger(f"{plugin} belongs to user 12345")
        os.chown(plugin, 0, 12345)
        plugin.chmod(0o664)
        self.assert_stranger(f"group 12345 may write {plugin}")


class Programs(DoctorTest):
    def test_only_root_may_change_what_code_is_loaded_from(self):
        [text] = self.right("programs")
        self.assertRegex(text, r"^only root may change the \d+ files that code is loaded from$")

    def test_what_others_may_write_is_wrong(self):
        folder = PREFIX / "bin"
        self.addCleanup(folder.chmod, folder.stat().st_mode)
        folder.chmod(0o777)
        self.assertEqual(self.wrong(), [("programs", f"code is loaded from {folder}/welcomer, and everybody may write {folder}")])


class Settings(DoctorTest):
    def test_each_value_is_shown_with_where_it_comes_from(self):
        self.write("usr/share/welcomer/platform.conf", "OnlineAccountProvider=delivered\nPluginFolder=/delivered\n")
        self.write("etc/welcomer/platform.conf", "PluginFolder = /opt/plug-ins\n")
        document = self.doctor()
        found = {each["setting"]: (each["value"], each["origin"]) for each in document["settings"]}
        self.assertEqual(found.pop("OnlineAccountServer")[1], "the build")
        for name, value in (("AccountServer", ""), ("AccountServerAuthority", ""), ("AccountServerConnectSeconds", "10"),
                            ("AccountServerRevocations", ""), ("AccountServerSeconds", "30")):
            self.assertEqual(found.pop(name), (value, "the build"))
        self.assertEqual(found, {"OnlineAccountProvider": ("delivered", "/usr/share/welcomer/platform.conf"),
                                 "PluginFolder": ("/opt/plug-ins", "/etc/welcomer/platform.conf")})
        self.assertEqual(document["pluginFolder"], "/opt/plug-ins")

    def test_what_makes_no_sense_is_wrong_and_costs_nothing_else(self):
        self.write("etc/welcomer/platform.conf", "PluginFoldr=/a\nPluginFolder=b\nOnlineAccountProvider=kind\n")
        document = self.doctor("2 things are wrong")
        self.assertEqual([each["text"] for each in document["checks"] if each["state"] == "wrong"],
                         ["/etc/welcomer/platform.conf, line 1: there is no such setting: PluginFoldr",
                          "/etc/welcomer/platform.conf, line 2: PluginFolder is not the path of a folder, which begins with /"])
        self.assertIn({"setting": "OnlineAccountProvider", "value": "kind", "origin": "/etc/welcomer/platform.conf"},
                      document["settings"])


class Overrides(DoctorTest):
    def test_those_that_have_no_effect_are_wrong(self):
        (self.root / "etc/resolver").mkdir(parents=True)
        self.doctor()
        self.write("etc/resolver/nimbus.example", "nameserver 192.0.2.1\n")
        self.assertEqual(self.wrong(), [("resolver overrides",
                                         "systemd-resolved does not run: the overrides have no effect")])


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1], verbosity=2)
