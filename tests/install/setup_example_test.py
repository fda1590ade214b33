#!/usr/bin/env python3
"""The example of a setup application, built by a stranger against the installed library and run below a root of its own.

    setup_example_test.py BUILD_DIR GENERATOR CXX SANITIZERS
"""

import json
import os
import pathlib
import pwd
import shutil
import subprocess
import sys
import tempfile
import unittest

BUILD, GENERATOR, CXX, SANITIZE = sys.argv[1:5]
EXAMPLE = pathlib.Path(__file__).resolve().parents[2] / "examples" / "setup"
PLUGINS = "System/Library/CoreServices/FirstRunPlugins"
BUNDLE = "usr/share/welcomer/setup-bundle"
PASSWORD = "open sesame"


def run(*command, **options):
    return subprocess.run([str(part) for part in command], capture_output=True, text=True, timeout=240, **options)


class SetupExample(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.work = pathlib.Path(tempfile.mkdtemp())
        cls.addClassCleanup(shutil.rmtree, cls.work)
        cls.prefix = cls.work / "prefix"
        cls.succeeded(run("cmake", "--install", BUILD, "--prefix", cls.prefix))
        options = [f"-DCMAKE_PREFIX_PATH={cls.prefix}", f"-DCMAKE_CXX_COMPILER={CXX}", "-DCMAKE_BUILD_TYPE=Debug"]
        if SANITIZE:
            options.append(f"-DCMAKE_CXX_FLAGS=-fsanitize={SANITIZE}")
        cls.succeeded(run("cmake", "-G", GENERATOR, "-S", EXAMPLE, "-B", cls.work / "first-run", *options))
        cls.succeeded(run("cmake", "--build", cls.work / "first-run"))

    @staticmethod
    def succeeded(result):
        if result.returncode != 0:
            raise AssertionError(f"{result.args}: {result.returncode}\n{result.stdout}{result.stderr}")
        return result.stdout

    def setUp(self):
        self.root = pathlib.Path(tempfile.mkdtemp(dir=self.work))
        (self.root / pwd.getpwuid(os.getuid()).pw_dir.lstrip("/")).mkdir(parents=True)
        plugins = self.root / PLUGINS
        plugins.mkdir(parents=True)
        for plugin in (pathlib.Path(BUILD) / "plugins").glob("*.ncdplugin"):
            if plugin.is_dir():
                shutil.copytree(plugin, plugins / plugin.name)
            else:
                shutil.copy(plugin, plugins)
        shutil.copytree(self.prefix / "share/welcomer/setup-bundle", self.root / BUNDLE, symlinks=False)
        self.tool("account", "add", "anna", "--alias", "anna@nimbus.example", password=PASSWORD)

    def tool(self, *arguments, password=None):
        command = [self.prefix / "bin/welcomer", "--root", self.root, "--json", *arguments]
        if password is None:
            return self.succeeded(run(*command))
        return self.succeeded(run(*command, "--password-fd", "0", input=password + "\n"))

    def first_run(self, password, *arguments):
        return run(self.work / "first-run/first-run", "--root", self.root, *(arguments or ("anna", "/" + BUNDLE)),
                   input=password + "\n")

    def enabled(self):
        services = json.loads(self.tool("account", "services", "anna"))["services"]
        return {service["service"] for service in services if service["enabled"]}

    def test_it_signs_in_and_hands_over_to_the_next_login(self):
        result = self.first_run(PASSWORD)
        self.assertEqual((result.returncode, result.stderr), (0, ""))
        self.assertEqual(json.loads(self.tool("account", "status"))["loggedIn"], "anna")
        self.assertEqual(self.enabled(), {"photo-stream", "account-sync", "locator", "documents"})
        replay = json.loads(self.tool("replay", "show"))
        self.assertEqual(replay["account"], "anna")
        self.assertEqual(replay["replay"]["vlAliases"], ["anna@nimbus.example"])
        self.assertIn("com.corvid.chatter", replay["replay"]["delegatesResponseDict"]["delegates"])
        agents = [path.name for path in self.root.rglob("Library/LaunchAgents/*")]
        self.assertEqual(agents, ["com.corvid.welcomer.nimbussetup.user.plist"])

    def test_a_wrong_password_leaves_nothing_behind(self):
        before = sorted(self.root.rglob("*.plist"))
        result = self.first_run("not the password")
        self.assertEqual(result.returncode, 1)
        self.assertIn("first-run: the server does not accept this name and password", result.stderr)
        self.assertEqual(sorted(self.root.rglob("*.plist")), before)

    def test_a_hand_over_that_is_waiting_is_not_replaced(self):
        self.assertEqual(self.first_run(PASSWORD).returncode, 0)
        before = self.tool("replay", "show")
        result = self.first_run(PASSWORD)
        self.assertEqual(result.returncode, 1)
        self.assertIn("cannot hand over to the next login", result.stderr)
        self.assertEqual(self.tool("replay", "show"), before)

    def test_a_command_line_that_makes_no_sense_ends_with_2(self):
        result = self.first_run(PASSWORD, "anna")
        self.assertEqual((result.returncode, result.stdout), (2, ""))
        self.assertIn("usage: first-run", result.stderr)


if __name__ == "__main__":
    unittest.main(argv=sys.argv[:1])
