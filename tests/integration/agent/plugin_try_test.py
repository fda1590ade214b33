#!/usr/bin/env python3
"""The installed tool's `plugins try`, and `try` and `account add` with a plug-in of the author's.

usage: plugin_try_test.py BUILD_DIR PLUGIN_DIR
"""

import json
import plistlib
import shutil
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
from installed_tool import InstalledToolCase  # noqa: E402

BUILD, PLUGINS = None, None


class PluginTry(InstalledToolCase):
    def plugin(self, source, name):
        return Path(shutil.copy(PLUGINS / f"{source}.ncdplugin", self.folder / name))

    def response(self, value):
        path = self.folder / "response.plist"
        path.write_bytes(plistlib.dumps(value))
        return path

    def logins(self, *arguments, status=0, **environment):
        done = self.tool("--json", "plugins", "try", *arguments, **environment)
        self.assertEqual(done.returncode, status, done)
        return json.loads(done.stdout)["logins"]

    def outcome(self, *arguments, status=0, **environment):
        [login] = self.logins(*arguments, status=status, **environment)
        [plugin] = login["plugins"]
        return plugin["outcome"], plugin["message"]

    def test_one_that_completes(self):
        plugin = self.plugin("DroppingPlugin", "good.ncdplugin")
        [login] = self.logins(plugin, "--response", self.response("called"))
        [seen] = login["plugins"]
        self.assertEqual({key: seen[key] for key in ("file", "state", "identifier", "request", "response", "outcome", "message")},
                         {"file": "good.ncdplugin", "state": "loaded", "identifier": "org.example.good", "request": None,
                          "response": "called", "outcome": "completed", "message": None})
        self.assertIsInstance(seen["seconds"], float)
        self.assertEqual((login["end"], login["leftRunning"]), ("status 0", {"threads": [], "processes": []}))
        self.assertIn("setting up org.example.good", [line["message"] for line in login["log"]])
        shown = self.tool("plugins", "try", plugin, "--response", self.folder / "response.plist")
        self.assertEqual(shown.returncode, 0, shown)
        for line in ("good.ncdplugin: org.example.good", "  response  \"called\"", "  outcome   completed", "  progress  -",
                     "  left running, threads: none", "  left running, processes: none"):
            self.assertIn(line + "\n", shown.stdout)

    def test_one_that_does_not(self):
        plugin = self.plugin("DroppingPlugin", "bad.ncdplugin")
        for how, outcome in (("at once", ("refused", "handler dropped")),
                             ("when it throws", ("raised", "thrown with the handler"))):
            with self.subTest(how):
                self.assertEqual(self.outcome(plugin, "--response", self.response(how), status=1), outcome)
        done = self.tool("plugins", "try", plugin, "--response", self.response("at once"))
        self.assertEqual((done.returncode, done.stderr),
                         (1, "welcomer: 1 of 1 logins did not complete every plug-in\n"))

    def test_one_that_never_answers_is_waited_for_within_the_limit(self):
        plugin = self.plugin("MeddlingPlugin", "silent.ncdplugin")
        self.assertEqual(self.outcome(plugin, "--limit", 3, status=1),
                         ("never-answered", "the agent ended with the limit of 3 s"))

    def test_one_that_ends_the_agent(self):
        plugin = self.plugin("EndingPlugin", "ending.ncdplugin")
        self.assertEqual(self.outcome(plugin, status=1, ENDING="complete fault"),
                         ("never-answered", "the agent ended with signal 11 (Segmentation fault)"))
        self.assertEqual(self.outcome(plugin, status=1, ENDING="load exit"), ("not loaded", "status 7"))

    def test_one_that_does_not_load(self):
        text = self.folder / "text.ncdplugin"
        text.write_text("no library")
        [login] = self.logins(text, status=1)
        self.assertEqual(login["plugins"][0]["outcome"], "not loaded")
        self.assertIn("file too short", login["plugins"][0]["message"])
        done = self.tool("plugins", "try", self.folder / "missing")
        self.assertEqual((done.returncode, done.stderr), (1, f"welcomer: there is no file {self.folder}/missing\n"))

    def test_what_it_leaves_running_is_told(self):
        plugin = self.plugin("DroppingPlugin", "leaving.ncdplugin")
        [login] = self.logins(plugin, "--response", self.response("leaves things running"))
        self.assertEqual(login["leftRunning"], {"threads": ["left-thread"], "processes": ["left-process"]})
        self.assertGreaterEqual(login["threads"], 1)

    def test_several_complete_side_by_side_with_their_environment(self):
        vidlink = BUILD / "plugins/Vidlink.ncdplugin"
        [login] = self.logins(vidlink, self.plugin("ExtensionPlugin", "libextended.so"), "--account", "ann@example.org",
                              "--aliases", "a,b")
        self.assertEqual([(each["file"], each["outcome"]) for each in
                          sorted(login["plugins"], key=lambda each: each["file"])],
                         [("Vidlink.ncdplugin", "completed"), ("libextended.ncdplugin", "completed")])
        lines = [line["message"] for line in login["log"]]
        self.assertIn("Vidlink: 2 aliases", lines)
        [context] = [line for line in lines if "debug: account " in line]
        self.assertRegex(context, rf"account ann@example\.org, home /.+, root {self.temporary}/welcomer-try\.\w+, trial")

    def test_many_logins_in_turn_and_at_once(self):
        plugin = self.plugin("DroppingPlugin", "good.ncdplugin")
        for more in ([], ["--concurrent"]):
            logins = self.logins(plugin, "--times", 3, *more, "--response", self.response("called"))
            self.assertEqual([login["plugins"][0]["outcome"] for login in logins], ["completed"] * 3)

    def test_the_whole_story_with_it(self):
        plugin = self.plugin("DroppingPlugin", "good.ncdplugin")
        done = self.tool("--json", "try", "--time-lapse", "--plugin", plugin, "--response",
                         f"org.example.good={self.response('called')}")
        self.assertEqual(done.returncode, 0, done)
        self.assertIn(("org.example.good", "completed"), [
            (each["identifier"], each["outcome"]) for each in json.loads(done.stdout)["firstLogin"]["delegates"]])
        for wrong in ("org.example.good", "=file", "org.example.good="):
            done = self.tool("try", "--time-lapse", "--response", wrong)
            self.assertEqual(done.returncode, 2, done)

    def test_an_account_with_its_response(self):
        root = self.folder / "root"
        root.mkdir()
        password = self.folder / "password"
        password.write_text("correct horse\n")
        with open(password, encoding="utf-8") as file:
            done = subprocess.run(
                [self.prefix / "bin/welcomer", "--root", root, "account", "add", "ann", "--password-fd", "0", "--response",
                 f"org.example.good={self.response({'answer': 42})}"], stdin=file, capture_output=True, text=True,
                timeout=60, check=False)
        self.assertEqual(done.returncode, 0, done)
        stored = b"".join(path.read_bytes() for path in (root / "var/lib/welcomer").rglob("*") if path.is_file())
        self.assertIn(b"org.example.good", stored)
        self.assertIn(b"<integer>42</integer>", stored)


if __name__ == "__main__":
    BUILD, PLUGINS = Path(sys.argv[1]), Path(sys.argv[2])
    InstalledToolCase.build = BUILD
    unittest.main(argv=sys.argv[:1], verbosity=2)
