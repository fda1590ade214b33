#!/usr/bin/env python3
"""From `welcomer setup` to the end of the login after it, with the installed packages: a real login starts the agent.

Seven machines side by side. On one the administrator sets up two users, who log in at the same time; on another one an
organisation's users sign in over HTTPS against its directory; on the others one user is set up, by the administrator or in a
session of their own: with a keyring and online accounts, with the keyring locked and somebody or nobody to unlock it, without
a keyring, and with a bus that dies while the plug-ins work.

usage: login_test.py MACHINE [PACKAGES SLAPD]
    MACHINE   the root folder of a minimal system; what happens leaves it as it is
    PACKAGES  the folder of the packages that are to be installed on it; without one, they are installed already
    SLAPD     the folder that the package slapd is unpacked in; without one, it is installed
"""

import concurrent.futures
import json
import re
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import booted_machine as booted  # noqa: E402
import organisation  # noqa: E402
import slapd  # noqa: E402
import stories  # noqa: E402
from stories import POST_LOGIN, PRE_LOGIN, SERVICE  # noqa: E402

SEEN = {}


class StoryTest(unittest.TestCase):
    """What is seen in every story that ends well."""

    story = None

    @classmethod
    def setUpClass(cls):
        cls.seen = SEEN[cls.story].result()
        cls.newcomer = cls.seen.newcomers[0]

    def assert_log_is_the_storys(self, newcomer):
        texts = [re.sub(r"\(\d+\.\d{3} seconds\)", "(N seconds)", text) for text in newcomer.texts_at_end]
        begin = min(texts.index(f"setting up com.corvid.{name}") for name in ("chatter", "vidlink", "deskmate"))
        end = texts.index("delaying exit by two minutes")
        self.assertEqual(texts[:begin], [
            "Self destructing...",
            "Killing onlineaccounts",
            f"Enabling post-login services for account {newcomer.name}",
            f"Enabling Nimbus service '{SERVICE}contacts'",
            f"Enabling '{SERVICE}calendars' after a 3.00 second delay",
            f"Enabling Nimbus service '{SERVICE}bookmarks'",
            f"{SERVICE}mediastream should be configured pre-login",
            f"Enabling '{SERVICE}reminders' after a 3.00 second delay",
            f"{SERVICE}accountsync should be configured pre-login",
            f"{SERVICE}locator should be configured pre-login",
            f"Enabling Nimbus Mail: {newcomer.name}@nimbus.example",
            "Enabling Nimbus Notes",
            f"{SERVICE}documents should be configured pre-login",
            f"Vidlink: {self.seen.aliases} aliases",
            f"Chatter: {self.seen.aliases} aliases",
        ])
        delayed = {f"Enabling Nimbus service '{SERVICE}{name}'" for name in ("calendars", "reminders")}
        # The plug-ins finish beside one another: only each one's own two lines have an order.
        plugins = [text for text in texts[begin:end] if text not in delayed]
        for name, kind in (("chatter", "setup+chosen"), ("vidlink", "setup+chosen"), ("deskmate", "setup")):
            self.assertEqual([text for text in plugins if f"com.corvid.{name}" in text],
                             [f"setting up com.corvid.{name}", f"com.corvid.{name} {kind}: completed (N seconds)"])
        self.assertEqual(len(plugins), 6)
        self.assertEqual(sorted(text for text in texts[begin:] if text in delayed), sorted(delayed))
        self.assertEqual([text for text in texts[end:] if text not in delayed],
                         ["delaying exit by two minutes", "exiting"])
        self.assertEqual({record[:2] for record in newcomer.records_at_end}, {(14, 3)})

    def assert_setup_and_login_are_whole(self, services_after_login=PRE_LOGIN | POST_LOGIN):
        for newcomer in self.seen.newcomers:
            with self.subTest(newcomer.name):
                self.assertTrue(newcomer.installed)
                self.assertEqual(newcomer.replay_after_setup, newcomer.name)
                self.assertEqual(newcomer.services_after_setup, PRE_LOGIN)
                self.assertFalse(newcomer.launch_agent_at_end)
                self.assertEqual(newcomer.seen["SubState"], "running")
                self.assertGreaterEqual(newcomer.seconds, 119)
                self.assertEqual(newcomer.ended, ["exited", "success", "0"])
                self.assert_log_is_the_storys(newcomer)
                self.assertEqual(newcomer.services_after_login, services_after_login)
                self.assertIsNone(newcomer.replay_after_login)

    def assert_second_login_starts_nothing(self):
        for newcomer in self.seen.newcomers:
            with self.subTest(newcomer.name):
                self.assertEqual(newcomer.second_units, "")
                self.assertEqual(newcomer.texts_after_second, newcomer.texts_at_end)
                self.assertEqual(newcomer.starter_records, [])


class AdministeredTest(StoryTest):
    story = stories.Administered

    def test_both_users_are_set_up_by_root_and_log_in(self):
        self.assertEqual([newcomer.name for newcomer in self.seen.newcomers], ["newcomer", "latecomer"])
        self.assert_setup_and_login_are_whole()

    def test_the_second_login_starts_nothing(self):
        self.assert_second_login_starts_nothing()

    def test_the_doctor_hears_of_the_unit_from_the_user_manager(self):
        for newcomer in self.seen.newcomers:
            self.assertEqual([(each["state"], each["text"]) for each in newcomer.doctor["checks"] if each["subject"] == "units"],
                             [("right", "the user's unit welcomer-launch-agents.service starts agents at a login")])

    def test_no_file_in_a_home_is_anybody_elses(self):
        for newcomer in self.seen.newcomers:
            self.assertEqual(newcomer.foreign_files, "")


class WholeTest(StoryTest):
    story = stories.Whole

    def test_from_the_setup_to_the_end_of_the_login(self):
        self.assert_setup_and_login_are_whole()

    def test_the_second_login_starts_nothing(self):
        self.assert_second_login_starts_nothing()

    def test_the_online_account_has_its_services_on(self):
        self.assertEqual(len(self.seen.online_accounts), 1)
        account = self.seen.online_accounts[0]
        self.assertEqual(account["Identity"], self.newcomer.name)
        self.assertEqual({name: account[f"{name}Enabled"] for name in ("Calendar", "Contacts", "Files")},
                         {"Calendar": "true", "Contacts": "true", "Files": "true"})

    def test_a_plug_in_calls_on_the_bus_while_the_agent_lingers(self):
        self.assertEqual(self.seen.greetings, ["Deskmate is ready"])


class OrganisationTest(StoryTest):
    story = organisation.Organisation

    def test_its_users_sign_in_over_https_and_every_delegate_finishes_at_the_login(self):
        self.assertEqual([newcomer.name for newcomer in self.seen.newcomers], ["newcomer", "latecomer"])
        self.assert_setup_and_login_are_whole()

    def test_the_second_login_starts_nothing(self):
        self.assert_second_login_starts_nothing()

    def test_the_status_says_that_every_delegate_has_finished(self):
        for newcomer in self.seen.newcomers:
            self.assertEqual(newcomer.status.returncode, 0, newcomer.status)
            status = json.loads(newcomer.status.stdout)
            self.assertEqual((status["lastLogin"]["account"], status["lastLogin"]["end"]), (newcomer.name, "ended"))
            self.assertEqual({each["identifier"]: each["outcome"] for each in status["lastLogin"]["delegates"]},
                             {f"com.corvid.{name}": "completed" for name in ("chatter", "vidlink", "deskmate")})
            self.assertEqual((status["waiting"]["item"], status["waiting"]["agent"], status["toDo"]), (False, False, []))

    def test_the_setup_and_the_doctor_say_which_server_is_asked(self):
        for newcomer in self.seen.newcomers:
            self.assertIn(f"Asking the account server {organisation.ADDRESS}\n", newcomer.said)
            [server] = [each for each in newcomer.doctor["backends"] if each["interface"] == "SignInDirectory"]
            self.assertEqual(server["backend"], organisation.ADDRESS)
            self.assertRegex(server["reason"], r"^answers: welcomer-account-server [\d.]+, certificate until \d{4}-\d\d-\d\d, "
                                               r"(clocks agree|its clock is \d+ s behind)$")

    def test_a_wrong_password_sets_nothing_up(self):
        for newcomer in self.seen.newcomers:
            self.assertEqual((newcomer.refused.returncode, newcomer.installed_when_refused), (1, False))
            self.assertEqual(newcomer.refused.stderr,
                             f"welcomer: cannot sign in {newcomer.name}: The user name or the password is wrong\n")

    def test_the_server_asks_the_directory_and_no_file_and_tells_of_no_password(self):
        self.assertEqual(self.seen.users_of_the_machine, [])
        for newcomer in self.seen.newcomers:
            answers = [line for line in self.seen.server_log if f" user={newcomer.name} " in line]
            # Who completes the sign-in asks once more.
            self.assertEqual([line.split()[:3] for line in answers],
                             [["authenticate", f"status={status}", "from=127.0.0.1"] for status in (401, 200, 200)])
        for password in (stories.PASSWORD, organisation.WRONG_PASSWORD, organisation.SEARCHERS_PASSWORD):
            self.assertNotIn(password, self.seen.everything)


class LockedTest(StoryTest):
    story = stories.Locked

    def test_the_user_is_asked_for_the_password_and_all_is_as_if_it_had_been_open(self):
        self.assertEqual(self.seen.questions, ["password"])
        self.assert_setup_and_login_are_whole()


class LockedForGoodTest(StoryTest):
    story = stories.LockedForGood

    def test_the_agent_gives_up_after_two_minutes_and_the_item_stays(self):
        self.assertEqual(self.seen.questions, ["BeginPrompting"])
        self.assertGreaterEqual(self.newcomer.seconds, 119)
        self.assertEqual(self.newcomer.texts_at_end,
                         ["Self destructing...", "Failed to find replay keychain item: 10", "exiting"])
        self.assertEqual(self.newcomer.ended, ["exited", "success", "0"])
        self.assertEqual(self.newcomer.services_after_first, PRE_LOGIN)

    def test_it_is_offered_again_and_finds_the_item_at_the_second_login(self):
        self.assertTrue(self.newcomer.launch_agent_at_end)
        self.assertEqual(len(self.newcomer.starter_records), 1)
        self.assertRegex(self.newcomer.starter_records[0], "is offered again at the next login")
        second = self.newcomer.texts_after_second[3:]
        self.assertEqual(second[0], "Self destructing...")
        self.assertIn(f"Enabling post-login services for account {self.newcomer.name}", second)
        self.assertEqual(second[-1], "exiting")
        self.assertEqual(self.newcomer.services_after_login, PRE_LOGIN | POST_LOGIN)
        self.assertIsNone(self.newcomer.replay_after_login)
        self.assertFalse(self.newcomer.launch_agent_after_second)


class WithoutKeyringTest(StoryTest):
    story = stories.WithoutKeyring

    def test_the_local_stores_serve(self):
        self.assert_setup_and_login_are_whole()

    def test_the_second_login_starts_nothing(self):
        self.assert_second_login_starts_nothing()


class BusDiesTest(StoryTest):
    story = stories.BusDies

    def test_the_agent_goes_on_and_nothing_that_was_asked_for_is_lost(self):
        self.assertTrue(self.seen.bus_ran)
        self.assertFalse([text for text in self.seen.before_the_end if "completed" in text and "vidlink" not in text])
        # The switch in the online account could not be reached any more; that it was asked for is written down.
        self.assert_setup_and_login_are_whole((PRE_LOGIN | POST_LOGIN) - {"calendars"})
        self.assertTrue(self.seen.written_down[f"{SERVICE}calendars"]["Enabled"])


def main():
    base, packages = sys.argv[1], booted.package_files(sys.argv[2]) if len(sys.argv) > 2 else ()
    organisation.Organisation.slapd = slapd.tree_of(*sys.argv[3:4])
    kinds = (stories.Administered, organisation.Organisation, stories.Whole, stories.Locked, stories.LockedForGood, stories.WithoutKeyring,
             stories.BusDies)
    with concurrent.futures.ThreadPoolExecutor(len(kinds)) as pool:
        SEEN.update({kind: pool.submit(lambda each: each(base, packages).run(), kind) for kind in kinds})
        program = unittest.main(argv=sys.argv[:1], verbosity=2, exit=False)
    sys.exit(not program.result.wasSuccessful())


if __name__ == "__main__":
    booted.enter_namespaces()
    main()
