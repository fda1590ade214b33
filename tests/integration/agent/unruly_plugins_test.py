#!/usr/bin/env python3
"""The installed programs with plug-ins that do what they should not: whatever comes of that, it costs only them.

usage: unruly_plugins_test.py BUILD_DIR [LOOP_RUNNER_PLUGIN ...]

Three logins side by side with plug-ins, by each compiler, that let exceptions of one kind out of every operation,
beside good ones; and one login with plug-ins whose threads run GLib's main context. Each on a machine of its own.
"""

import collections
import functools
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

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402

TOOL, AGENT = "/usr/local/bin/welcomer", "/usr/local/libexec/wlnimbussetup"
PLUGIN_FOLDER = "System/Library/CoreServices/FirstRunPlugins"
SETUP_BUNDLE = "/usr/local/share/welcomer/setup-bundle"
ACCOUNT = "newcomer"
KINDS = {"standard": "thrown in {}", "number": "unknown exception", "own": "unknown exception"}
# By the compiler that builds the plug-in: the messaging delegate that it is.
MESSAGING = {"gcc": "com.corvid.vidlink", "clang": "com.corvid.chatter"}
WRONG_ON_LOAD = ("create", "load")

BUILD = None
LOOP_RUNNERS = ()
LOGINS = {}


def setUpModule():
    folder = Path(tempfile.mkdtemp(prefix="unruly-plugins-"))
    unittest.addModuleCleanup(folder.rmdir)
    for kind in KINDS:
        LOGINS[kind] = ThrowerLogin(folder / kind, kind)
    if LOOP_RUNNERS:
        LOGINS["loops"] = Login(folder / "loops")
        LOGINS["loops"].prepare({Path(plugin).name: plugin for plugin in LOOP_RUNNERS})
    for login in LOGINS.values():
        login.start()
    for login in LOGINS.values():
        login.finish()


class Login:
    """One user's machine, whose agent runs once with the plug-ins that are given."""

    _installed = None  # the machine that all programs are installed on

    def __init__(self, folder):
        self.machine = machine.Machine(folder)
        unittest.addModuleCleanup(self.machine.stop)
        if Login._installed is None:
            self.machine.install(BUILD)
            Login._installed = self.machine
        else:
            machine.mount(Login._installed.root / "usr/local", self.machine.root / "usr/local", None, machine.MS_BIND)
        (self.machine.root / PLUGIN_FOLDER).mkdir(parents=True)
        self.machine.start_system_log()

    def prepare(self, plugins):
        """Installs the plug-ins, given by their names, and stores a response for each identifier of theirs."""
        for name, plugin in plugins.items():
            shutil.copy(plugin, self.machine.root / PLUGIN_FOLDER / name)
        identifiers = [f"com.corvid.{Path(name).stem}" if name.startswith("loop") else name.split(",")[0]
                       for name in plugins]
        replay = self.machine.root / "tmp/replay.plist"
        replay.write_bytes(plistlib.dumps({
            "delegatesResponseDict": {"delegates": {identifier: {"status": 0} for identifier in identifiers}}}))
        replay.chmod(0o644)
        self.tool("replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist", "--bundle", SETUP_BUNDLE)

    def tool(self, *arguments, password=False, status=0):
        """What the tool prints and logs; it must end with this status."""
        command = [TOOL, *arguments]
        if password:
            command = ["/bin/sh", "-c", 'exec "$@" --password-fd 3 3< /tmp/password', "sh", *command]
        done = self.machine.run(command, user=True)
        if done.returncode != status:
            raise AssertionError(f"{arguments}: {done}")
        return done

    def start(self):
        self.begin = len(self.records())
        self.started = time.monotonic()
        self.process = self.machine.start([AGENT], user=True)

    def finish(self):
        """Waits for the agent's end, which two minutes are to pass before."""
        self.status = self.process.wait(timeout=self.started + 220 - time.monotonic())
        self.seconds = time.monotonic() - self.started
        if self.status == 0:
            self.machine.wait_for(lambda: "exiting" in self.records(), "the last record")
        self.lines = [re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text) for text in self.records()[self.begin:]]

    def records(self, program="wlnimbussetup"):
        return [text for _, _, text in self.machine.log_records(program)]


class ThrowerLogin(Login):
    """With plug-ins of one kind, the tool's commands run before the agent."""

    def __init__(self, folder, kind):
        super().__init__(folder)
        self.kind = kind
        self.plugins = {}
        for compiler, messaging in MESSAGING.items():
            built = BUILD / "tests/fixtures/plugins" / compiler / "named-thrower.ncdplugin"
            for name, operations in (("create", "create"), ("load", "load+destroy"), ("identifier", "identifier"),
                                     ("request", "request"), ("completion", "completion"), ("good", "nothing")):
                self.plugins[f"com.corvid.{compiler}.{name},{kind},{operations}.ncdplugin"] = built
            self.plugins[f"{messaging},{kind},aliases+chosen.ncdplugin"] = built
        for name, plugin in self.plugins.items():
            shutil.copy(plugin, self.machine.root / PLUGIN_FOLDER / name)
        self.listed = json.loads(self.tool("--json", "plugins", "list", status=1).stdout)["plugins"]
        self.story = self.run_story()
        self.set_up = self.run_setup()
        # The agent is to have responses for all of them.
        self.tool("replay", "delete")
        shutil.rmtree(self.machine.home / "Library/LaunchAgents")
        self.prepare(self.plugins)

    def run_story(self):
        """The whole story beside the example plug-ins, which are the messaging delegates there."""
        story = self.machine.root / "tmp/story"
        (story / PLUGIN_FOLDER).mkdir(parents=True)
        for name, plugin in self.plugins.items():
            if not name.startswith(tuple(MESSAGING.values())):
                shutil.copy(plugin, story / PLUGIN_FOLDER / name)
        for path in (story, *story.rglob("*")):
            os.chown(path, machine.UID, machine.UID)
        return json.loads(self.tool("--root", "/tmp/story", "--json", "try", "--time-lapse").stdout)

    def run_setup(self):
        """The setup application asks for requests and aliases, which the agent never does."""
        (self.machine.root / "tmp/password").write_text("correct horse\n")
        (self.machine.root / "tmp/answers.plist").write_bytes(plistlib.dumps({"Account": ACCOUNT}))
        server = self.machine.root / "var/lib/welcomer"  # the user stands for the server, too
        server.mkdir(parents=True)
        os.chown(server, machine.UID, machine.UID)
        self.tool("account", "add", ACCOUNT, "--alias", "a@b.example", password=True)
        return self.tool("--verbose", "setup", "--answers", "/tmp/answers.plist", password=True).stderr.splitlines()

    def thrown_in(self, operation):
        return KINDS[self.kind].format(operation)

    def files(self, name):
        return [file for file in self.plugins if file.split(",")[0].endswith("." + name)]

    def scan_lines(self):
        """What the log says about plug-ins that are not loaded."""
        return [*(f"Nimbus Plugins: Failed to init plugin object for {file}" for file in self.files("create")),
                *(f"Nimbus Plugins: Exception querying '{file}' for id on load: {self.thrown_in('load')}"
                  for file in self.files("load"))]

    def request_lines(self):
        """What it says when they are asked for their requests."""
        return [*(f"Nimbus Plugins: Exception querying '(unknown)' for setup request: {self.thrown_in('identifier')}"
                  for _ in MESSAGING),
                *(f"Nimbus Plugins: Exception querying 'com.corvid.{compiler}.request' for setup request: "
                  f"{self.thrown_in('request')}" for compiler in MESSAGING)]

    def identifier_lines(self):
        """What the agent says when it asks who they are."""
        return [f"exception querying plugin <Thrower> for id: {self.thrown_in('identifier')}" for _ in MESSAGING]


def of_each_kind(test):
    """A test that looks at the login with each kind of exception."""

    @functools.wraps(test)
    def run(self):
        for kind in KINDS:
            with self.subTest(kind):
                test(self, LOGINS[kind])

    return run


class Throwers(unittest.TestCase):
    """Plug-ins by each compiler that let exceptions out."""

    maxDiff = None

    def assert_same_lines(self, found, expected):
        self.assertEqual(sorted(found), sorted(expected))

    @of_each_kind
    def test_the_tool_lists_them_and_says_why_some_are_not_loaded(self, login):
        states = {plugin["file"]: plugin["state"] for plugin in login.listed}
        expected = dict.fromkeys(login.plugins, "loaded")
        for name in WRONG_ON_LOAD:
            expected.update((file, login.thrown_in(name)) for file in login.files(name))
        self.assertEqual(states, expected)

    @of_each_kind
    def test_the_story_goes_on_to_its_end(self, login):
        first = login.story["firstLogin"]
        self.assertEqual({delegate["identifier"]: delegate["outcome"] for delegate in first["delegates"]
                          if delegate["outcome"] != "no cached response"},
                         dict.fromkeys([*MESSAGING.values(), "com.corvid.storefront"], "completed"))
        self.assertEqual(first["exitStatus"], 0)
        for life, expected in (
                (login.story["setup"], [*login.scan_lines(), *login.request_lines()]),
                (first, [*login.scan_lines(), *login.identifier_lines(), "exiting"])):
            logged = collections.Counter(record["message"] for record in life["log"])
            self.assertEqual(collections.Counter(expected) - logged, collections.Counter(), logged)

    @of_each_kind
    def test_the_setup_leaves_out_those_that_throw(self, login):
        identifier = login.thrown_in("identifier")
        self.assert_same_lines(
            [line for line in login.set_up if "Plugins:" in line],
            [*login.scan_lines(),
             *login.request_lines(),
             # Each delegate with aliases is looked for among all plug-ins, since the one that is found throws.
             *(f"Nimbus Plugins: Exception querying '{messaging}' for aliases: {text}"
               for messaging in MESSAGING.values()
               for text in [identifier] * len(MESSAGING) + [login.thrown_in("aliases")])])

    @of_each_kind
    def test_the_agent_ends_well_after_its_two_minutes(self, login):
        self.assertEqual(login.status, 0)
        self.assertGreaterEqual(login.seconds, 120)
        self.assertEqual(login.lines[-1], "exiting")
        self.assertIn("delaying exit by two minutes", login.lines)

    @of_each_kind
    def test_each_costs_its_own_outcome_and_no_other(self, login):
        begin = login.lines.index("Chatter: 0 aliases") + 1
        self.assert_same_lines(
            [line for line in login.lines[begin:login.lines.index("delaying exit by two minutes")]
             if " uncaught in " not in line],
            [*login.scan_lines(),
             *login.identifier_lines(),
             *(line for compiler, messaging in MESSAGING.items() for name, outcome in (
                 (f"com.corvid.{compiler}.good", "good"), (f"com.corvid.{compiler}.request", "good"),
                 (f"com.corvid.{compiler}.completion", "completion"), (messaging, "chosen"))
               for line in (
                   f"setting up {name}",
                   f"{name} setup: completed (N seconds)" if outcome == "good" else
                   f"exception in setup response for plugin {name} (N seconds): {login.thrown_in(outcome)}"))])

    @of_each_kind
    def test_no_exception_counts_as_uncaught_when_a_plugin_is_next_called(self, login):
        for program, needed in (("welcomer", ("request", "aliases", "destroy")),
                                ("wlnimbussetup", ("create", "load", "identifier", "destroy", "completion", "chosen",
                                                   "thread end"))):
            counts = [re.fullmatch(r"(\S+): (-?\d+) uncaught in (.+)", text) for text in login.records(program)]
            found = collections.Counter((count[2], count[3]) for count in counts if count)
            self.assertEqual({number for number, _ in found}, {"0"}, found)
            for operation in needed:
                # Of each compiler's.
                self.assertGreaterEqual(found["0", operation], len(MESSAGING), operation)


class LoopRunners(unittest.TestCase):
    """Threads of plug-ins that run GLib's default main context."""

    @classmethod
    def setUpClass(cls):
        cls.login = LOGINS["loops"]

    def test_the_agent_lingers_for_two_minutes_and_ends(self):
        self.assertEqual(self.login.status, 0)
        self.assertGreaterEqual(self.login.seconds, 120)
        self.assertLess(self.login.lines.index("delaying exit by two minutes"), self.login.lines.index("exiting"))

    def test_each_delegate_has_its_outcome_before_the_linger(self):
        linger = self.login.lines.index("delaying exit by two minutes")
        for number in range(1, 5):
            self.assertIn(f"com.corvid.loop{number} setup: completed (N seconds)", self.login.lines[:linger])

    def test_what_is_attached_to_the_context_runs_on_the_main_thread(self):
        self.assertEqual(sorted(line for line in self.login.lines if "timer" in line),
                         [f"com.corvid.loop{number}: a timer on the main thread" for number in (1, 4)])

    def test_a_loop_comes_back_when_it_is_told_to(self):
        self.assertEqual([line for line in self.login.lines if "the loop has ended" in line],
                         ["com.corvid.loop4: the loop has ended"])


if __name__ == "__main__":
    machine.enter_namespaces()
    BUILD, LOOP_RUNNERS = Path(sys.argv[1]), sys.argv[2:]
    if not LOOP_RUNNERS:  # built without the desktop's run loop, whose context is meant
        del LoopRunners
    unittest.main(argv=sys.argv[:1], verbosity=2)
