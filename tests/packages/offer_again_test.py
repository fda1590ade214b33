#!/usr/bin/env python3
"""The installed agent at logins where its item cannot be asked for: it is offered again, and never acts twice.

Each story is a machine of its own with a real keyring, side by side with the others, since the keyring's user has two
minutes to answer.

usage: offer_again_test.py MACHINE PACKAGES
    MACHINE   the minimal system that make_machine.py has made
    PACKAGES  the folder of the packages that are installed on it
"""

import concurrent.futures
import plistlib
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import booted_machine as booted  # noqa: E402

USER, BUNDLE = "newcomer", "/usr/share/welcomer/setup-bundle"
LABEL = "com.corvid.welcomer.nimbussetup.user"
UNIT, STARTER = f"welcomer-agent-{LABEL}.service", "welcomer-launch-agents.service"
PASSWORD, ACCOUNT = "battery staple", "newcomer@nimbus.example"
LOCKED = "the keyring is locked, and nobody can be asked to unlock it"
UNANSWERED = "the prompt of the keyring was not answered in time"
SILENT = "the keyring could not be asked for the item: no answer within 10 seconds"
BEGIN, END, ACTS = "Self destructing...", "exiting", "Killing onlineaccounts"

MACHINE, PACKAGES = None, ()
STORIES = {}


def offered(number, reason):
    return f"Launch agent {LABEL} is offered again at the next login ({number} of 3): {reason}"


class Story:
    """A machine whose user has an item in the keyring and an agent that waits for the next login."""

    def __init__(self):
        self.machine = booted.BootedMachine(MACHINE)
        self.agent_file = self.machine.root / "home" / USER / f"Library/LaunchAgents/{LABEL}.plist"
        self.seen = []

    def run(self):
        try:
            self.prepare()
            self.machine.boot()
            self.machine.install(PACKAGES)
            self.machine.add_user(USER)
            self.set_up()
            self.tell()
            self.everything = "\n".join(self.machine.journal())
        finally:
            self.machine.shut_down()
        return self

    def prepare(self):
        """What is different about the machine."""

    def set_up(self):
        item = self.machine.root / "home" / USER / "replay.plist"
        item.write_bytes(plistlib.dumps({"delegatesResponseDict": {"delegates": {}}}))
        login = booted.Session(self.machine, USER)
        login.start_keyring(PASSWORD)
        self.tool(login, "replay", "store", "--account", ACCOUNT, "--file", f"/home/{USER}/{item.name}", "--bundle", BUNDLE)
        self.definition = self.agent_file.read_bytes()
        login.end()

    def tool(self, login, *arguments):
        done = login.run(["welcomer", *arguments])
        if done.returncode != 0:
            raise AssertionError(f"the tool failed: {done}")
        return done.stdout

    def log_in(self, unlocked=True, prompter=None, hang=False):
        login = booted.Session(self.machine, USER)
        login.start_keyring(PASSWORD, unlocked)
        if prompter:
            login.start_script("prompter.py", prompter)
        if hang:
            login.systemctl("kill", "--signal=STOP", "test-keyring.service")
        login.start_desktop()
        return login

    def until_the_starter_has_ended(self, login):
        booted.wait_for(lambda: self.property(login, STARTER, "SubState") == "exited", "the starter's end", 200)

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
        login = booted.Session(self.machine, USER)
        login.start_keyring(PASSWORD)
        shown = login.run(["welcomer", "replay", "show"])
        login.end()
        return ACCOUNT in shown.stdout


class NeverUnlocked(Story):
    """Locked with nobody to ask, twice; a keyring that hangs; and locked once more."""

    def tell(self):
        for hang in (False, False, True, False):
            self.whole_login(hang=hang, unlocked=hang)
        self.item_is_left = self.item()
        login = booted.Session(self.machine, USER)
        login.start_desktop()
        self.until_the_starter_has_ended(login)
        self.end(login)


class SilentThenOpen(Story):
    """Nobody answers the keyring's question at the first login; at the second it is open."""

    def tell(self):
        self.whole_login(unlocked=False, prompter="silent")
        login = self.log_in()
        booted.wait_for(lambda: "delaying exit by two minutes" in self.machine.journal("-t", "wlnimbussetup"),
                        "the agent's work")
        self.end(login)
        self.item_is_left = self.item()
        login = self.log_in()
        self.until_the_starter_has_ended(login)
        self.end(login)


class WithoutAJournal(Story):
    """The user may read nothing of a journal that is in memory alone."""

    def prepare(self):
        self.machine.write("etc/systemd/journald.conf.d/volatile.conf", "[Journal]\nStorage=volatile\n")

    def tell(self):
        self.whole_login(unlocked=False)
        self.item_is_left = self.item()
        login = booted.Session(self.machine, "root")
        login.systemctl("start", STARTER)
        shown = login.systemctl("show", STARTER, "--property=ActiveState,ConditionResult")
        self.of_a_system_user = shown.stdout.split()
        login.end()


class Otherwise(Story):
    """The agent is killed while it waits for the keyring's user; then there is no item."""

    def tell(self):
        login = self.log_in(unlocked=False, prompter="silent")
        booted.wait_for(lambda: BEGIN in self.machine.journal("-t", "wlnimbussetup"), "the agent's start")
        for line in ("Failed to find replay keychain item: 8", END):  # another program's, under the agent's name
            login.run(["/usr/bin/logger", "-t", "wlnimbussetup", line])
        login.systemctl("kill", "--signal=KILL", UNIT)
        self.until_the_starter_has_ended(login)
        self.end(login)
        self.agent_file.write_bytes(self.definition)
        self.machine.must(["chown", f"{USER}:{USER}", f"/home/{USER}/Library/LaunchAgents/{LABEL}.plist"])
        login = booted.Session(self.machine, USER)
        login.start_keyring(PASSWORD)
        self.tool(login, "replay", "delete")
        login.start_desktop()
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
                         story.everything)
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
    booted.enter_namespaces()
    MACHINE, PACKAGES = sys.argv[1], booted.package_files(sys.argv[2])
    kinds = (SilentThenOpen, NeverUnlocked, WithoutAJournal, Otherwise)
    with concurrent.futures.ThreadPoolExecutor(len(kinds)) as pool:
        STORIES.update({kind: pool.submit(lambda each: each().run(), kind) for kind in kinds})
        program = unittest.main(argv=sys.argv[:1], verbosity=2, exit=False)
    sys.exit(not program.result.wasSuccessful())
