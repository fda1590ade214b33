#!/usr/bin/env python3
"""The installed agent at logins where its item cannot be asked for: it is offered again, and never acts twice.

Each story is a machine of its own with a real systemd, a real journal and a real keyring, side by side with the others,
since the keyring's user has two minutes to answer.

usage: offer_again_test.py BUILD_DIR
"""

import concurrent.futures
import os
import plistlib
import shutil
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import booted  # noqa: E402
import machine  # noqa: E402

TOOL, BUNDLE = "/usr/local/bin/welcomer", "/usr/local/share/welcomer/setup-bundle"
LABEL = "com.corvid.welcomer.nimbussetup.user"
UNIT, STARTER = f"welcomer-agent-{LABEL}.service", "welcomer-launch-agents.service"
PASSWORD, ACCOUNT = "battery staple", "newcomer@nimbus.example"
LOCKED = "the keyring is locked, and nobody can be asked to unlock it"
UNANSWERED = "the prompt of the keyring was not answered in time"
SILENT = "the keyring could not be asked for the item: no answer within 10 seconds"
BEGIN, END, ACTS = "Self destructing...", "exiting", "Killing onlineaccounts"

BUILD = None
STORIES = {}


def offered(number, reason):
    return f"Launch agent {LABEL} is offered again at the next login ({number} of 3): {reason}"


class Story:
    """A machine whose user has an item in the keyring and an agent that waits for the next login."""

    def __init__(self):
        self.folder = Path(tempfile.mkdtemp(prefix="offer-again-"))
        self.machine = booted.BootedMachine(self.folder / "machine", with_keyring=True)
        self.agent_file = self.machine.home / f"Library/LaunchAgents/{LABEL}.plist"
        self.seen = []

    def run(self):
        try:
            self.machine.install(BUILD)
            self.machine.enable_for_users(STARTER)
            self.prepare()
            self.machine.boot()
            self.set_up()
            self.tell()
            self.journal = "\n".join(self.machine.journal())
        finally:
            self.machine.stop()
            shutil.rmtree(self.folder)
        return self

    def prepare(self):
        """What is different about the machine."""

    def set_up(self):
        (self.machine.root / "tmp/replay.plist").write_bytes(plistlib.dumps({"delegatesResponseDict": {"delegates": {}}}))
        login = booted.BootedLogin(self.machine)
        self.start_keyring(login)
        self.tool(login, "replay", "store", "--account", ACCOUNT, "--file", "/tmp/replay.plist", "--bundle", BUNDLE)
        self.definition = self.agent_file.read_bytes()
        login.end()

    def tool(self, login, *arguments):
        done = login.run([TOOL, *arguments])
        if done.returncode != 0:
            raise AssertionError(f"the tool failed: {done}")
        return done.stdout

    def start_keyring(self, login, unlocked=True, prompter=None):
        """As a service of the login, which ends with it."""
        start = "--unlock" if unlocked else "--start"
        command = f"printf '{PASSWORD}' | exec gnome-keyring-daemon --foreground --components=secrets {start}"
        login.run(["/usr/bin/systemd-run", "--user", "--unit=keyring", "/bin/sh", "-c", command])
        locked = ["gdbus", "call", "--session", "-d", "org.freedesktop.secrets", "-o",
                  "/org/freedesktop/secrets/collection/login", "-m", "org.freedesktop.DBus.Properties.Get",
                  "org.freedesktop.Secret.Collection", "Locked"]
        self.machine.wait_for(lambda: f"<{str(not unlocked).lower()}>" in login.run(locked).stdout, "the keyring")
        if prompter:
            (self.machine.root / "tmp/prompter.py").write_bytes(
                (Path(__file__).resolve().parents[2] / "support/prompter.py").read_bytes())
            login.run(["/usr/bin/systemd-run", "--user", "--unit=prompter", "/usr/bin/python3", "-B", "/tmp/prompter.py",
                       prompter])
            named = ["gdbus", "call", "--session", "-d", "org.freedesktop.DBus", "-o", "/", "-m",
                     "org.freedesktop.DBus.NameHasOwner", "org.gnome.keyring.SystemPrompter"]
            self.machine.wait_for(lambda: "true" in login.run(named).stdout, "the prompter")

    def log_in(self, hang=False, **keyring):
        login = booted.BootedLogin(self.machine)
        self.start_keyring(login, **keyring)
        if hang:
            login.systemctl("kill", "--signal=STOP", "keyring.service")
        login.start_session()
        return login

    def until_the_starter_has_ended(self, login):
        self.machine.wait_for(lambda: self.property(login, STARTER, "SubState") == "exited", "the starter's end", 200)

    def property(self, login, unit, name):
        return login.systemctl("show", unit, f"--property={name}", "--value").stdout.strip()

    def end(self, login):
        """The end of a login: notes what is to be seen of it."""
        process = self.property(login, UNIT, "ExecMainPID")
        state = [self.property(login, UNIT, name) for name in ("ActiveState", "SubState", "Result")]
        login.end()
        identifier = ["-t", "wlnimbussetup"]
        self.seen.append({
            "state": state,
            "lines": self.machine.journal(*identifier, f"_PID={process}"),
            "all lines": self.machine.journal(*identifier),
            "starter": self.machine.journal("-t", "welcomer-launch-agents"),
            "definition": self.agent_file.read_bytes() if self.agent_file.exists() else None,
        })

    def whole_login(self, **options):
        login = self.log_in(**options)
        self.until_the_starter_has_ended(login)
        self.end(login)

    def item(self):
        """The account of the replay item, where there is one."""
        login = booted.BootedLogin(self.machine)
        self.start_keyring(login)
        shown = login.run([TOOL, "replay", "show"])
        login.end()
        return ACCOUNT in shown.stdout


class NeverUnlocked(Story):
    """Locked with nobody to ask, twice; a keyring that hangs; and locked once more."""

    def tell(self):
        for hang in (False, False, True, False):
            self.whole_login(hang=hang, unlocked=hang)
        self.item_is_left = self.item()
        login = booted.BootedLogin(self.machine)
        login.start_session()
        self.until_the_starter_has_ended(login)
        self.end(login)


class SilentThenOpen(Story):
    """Nobody answers the keyring's question at the first login; at the second it is open."""

    def tell(self):
        self.whole_login(unlocked=False, prompter="silent")
        login = self.log_in()
        self.machine.wait_for(lambda: "delaying exit by two minutes" in self.machine.journal("-t", "wlnimbussetup"),
                              "the agent's work")
        self.end(login)
        self.item_is_left = self.item()
        login = self.log_in()
        self.until_the_starter_has_ended(login)
        self.end(login)


class WithoutAJournal(Story):
    """The user may read nothing of a journal that is in memory alone."""

    def prepare(self):
        self.machine.add_to("etc/systemd/journald.conf.d", "[Journal]\nStorage=volatile\n", "volatile.conf")

    def tell(self):
        self.whole_login(unlocked=False)
        self.item_is_left = self.item()
        self.machine.systemctl("start", "user@0.service")
        as_system_user = ["/usr/bin/env", "XDG_RUNTIME_DIR=/run/user/0", "/usr/bin/systemctl", "--user"]
        self.machine.run([*as_system_user, "start", STARTER])
        self.of_a_system_user = self.machine.run(
            [*as_system_user, "show", STARTER, "--property=ActiveState,ConditionResult"]).stdout.split()


class Otherwise(Story):
    """The agent is killed while it waits for the keyring's user; then there is no item."""

    def tell(self):
        login = self.log_in(unlocked=False, prompter="silent")
        self.machine.wait_for(lambda: BEGIN in self.machine.journal("-t", "wlnimbussetup"), "the agent's start")
        for line in ("Failed to find replay keychain item: 8", END):  # another program's, under the agent's name
            login.run(["/usr/bin/logger", "-t", "wlnimbussetup", line])
        login.systemctl("kill", "--signal=KILL", UNIT)
        self.until_the_starter_has_ended(login)
        self.end(login)
        self.agent_file.write_bytes(self.definition)
        os.chown(self.agent_file, machine.UID, machine.UID)
        login = booted.BootedLogin(self.machine)
        self.start_keyring(login)
        self.tool(login, "replay", "delete")
        login.start_session()
        self.until_the_starter_has_ended(login)
        self.end(login)


class OfferAgainTest(unittest.TestCase):
    @staticmethod
    def story(kind):
        return STORIES[kind].result()

    def test_an_agent_whose_keyring_stays_closed_is_offered_three_times_and_no_more(self):
        story = self.story(NeverUnlocked)
        seen = story.seen
        self.assertEqual([login["lines"] for login in seen[:4]],
                         [[BEGIN, f"Failed to find replay keychain item: {status}", END] for status in (8, 8, 15, 8)],
                         story.journal)
        lines = [offered(1, LOCKED), offered(2, LOCKED), offered(3, SILENT),
                 f"Launch agent {LABEL} is not offered once more: {LOCKED}"]
        for number in range(4):
            self.assertEqual(seen[number]["starter"], lines[:number + 1])
            self.assertEqual(seen[number]["state"], ["active", "exited", "success"])
        whole = plistlib.loads(story.definition)
        self.assertEqual([login["definition"] and plistlib.loads(login["definition"]) for login in seen[:4]],
                         [{**whole, "OfferedAgain": number} for number in (1, 2, 3)] + [None])
        self.assertTrue(story.item_is_left)
        self.assertEqual(seen[4]["all lines"], seen[3]["all lines"])

    def test_an_agent_that_nobody_answered_does_its_work_once_at_the_next_login(self):
        story = self.story(SilentThenOpen)
        first, second, third = story.seen
        self.assertEqual(first["lines"], [BEGIN, "Failed to find replay keychain item: 10", END])
        self.assertEqual(first["starter"], [offered(1, UNANSWERED)])
        self.assertEqual(second["lines"].count(ACTS), 1)
        self.assertFalse(story.item_is_left)
        self.assertIsNone(second["definition"])
        self.assertEqual(third["all lines"].count(ACTS), 1)
        self.assertEqual(third["starter"], first["starter"])
        self.assertIsNone(third["definition"])

    def test_without_a_journal_that_can_be_read_nothing_is_offered(self):
        story = self.story(WithoutAJournal)
        [login] = story.seen
        self.assertEqual(login["lines"], [BEGIN, "Failed to find replay keychain item: 8", END])
        self.assertEqual((login["starter"], login["definition"]), ([], None))
        self.assertTrue(story.item_is_left)

    def test_a_system_users_session_starts_no_agents(self):
        self.assertEqual(sorted(self.story(WithoutAJournal).of_a_system_user), ["ActiveState=inactive", "ConditionResult=no"])

    def test_an_agent_that_was_killed_or_had_no_item_is_not_offered(self):
        killed, without_item = self.story(Otherwise).seen
        self.assertEqual(killed["lines"], [BEGIN])
        self.assertEqual(killed["state"], ["failed", "failed", "signal"])
        self.assertEqual(without_item["lines"], [BEGIN, "Failed to find replay keychain item: 2", END])
        self.assertEqual(without_item["definition"], None)
        self.assertEqual((killed["starter"], killed["definition"], without_item["starter"]), ([], None, []))


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    BUILD = sys.argv[1]
    kinds = (SilentThenOpen, NeverUnlocked, WithoutAJournal, Otherwise)
    with concurrent.futures.ThreadPoolExecutor(len(kinds)) as pool:
        STORIES.update({kind: pool.submit(lambda each: each().run(), kind) for kind in kinds})
        program = unittest.main(argv=sys.argv[:1], verbosity=2, exit=False)
    sys.exit(not program.result.wasSuccessful())
