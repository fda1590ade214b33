#!/usr/bin/env python3
"""What half a setup has left is mended with the installed tool: by root for another user, and by that user.

usage: mending_test.py BUILD_DIR
"""

import json
import plistlib
import sys
import unittest

from for_others_test import LABEL, OTHER, OTHER_ID, ForOthersTest, machine


class Mending(ForOthersTest):
    def setUp(self):
        super().setUp()
        self.add_anna()
        (self.root / "tmp/answers.plist").write_bytes(plistlib.dumps({"Account": "anna"}))
        (self.root / "tmp/answers.plist").chmod(0o644)

    def ways(self):
        """How to call the tool, and what is then suggested: as root, and as the user, who can do all but sign in."""
        yield lambda *arguments: self.tool(*arguments, "--user", OTHER), f" --user {OTHER}"
        yield lambda *arguments: self.tool(*arguments, user=OTHER_ID), ""

    def test_an_item_without_an_agent_is_told_and_armed(self):
        for tool, named in self.ways():
            with self.subTest(named):
                self.succeeds(self.set_up(OTHER))
                whole = self.launch_agent(OTHER).read_bytes()
                self.fails(tool("setup", "--answers", "/tmp/answers.plist"), 1,
                           f"waiting for the next login already; `welcomer setup --cancel{named}` takes it back")
                self.launch_agent(OTHER).unlink()
                self.fails(tool("setup", "--answers", "/tmp/answers.plist"), 1,
                           f"is waiting, but no agent will start for it at the next login; `welcomer replay arm{named}` "
                           f"installs the agent, `welcomer setup --cancel{named}` removes the item")
                self.assertEqual(json.loads(self.succeeds(tool("replay", "arm", "--json"))), {"installed": True})
                self.assertEqual(self.launch_agent(OTHER).read_bytes(), whole)
                self.assertEqual(self.launch_agent(OTHER).stat().st_uid, OTHER_ID)
                self.assertEqual(json.loads(self.succeeds(tool("replay", "arm", "--json"))), {"installed": False})
                self.assertEqual(json.loads(self.succeeds(tool("replay", "show", "--json")))["account"], "anna")
                self.succeeds(tool("setup", "--cancel"))

    def test_a_file_that_starts_no_agent_makes_way_for_one_that_does(self):
        for tool, named in self.ways():
            self.succeeds(self.set_up(OTHER))
            whole = self.launch_agent(OTHER).read_bytes()
            definition = plistlib.loads(whole)
            for broken in (b"", plistlib.dumps({**definition, "ProgramArguments": ["/gone"]}),
                           plistlib.dumps({**definition, "RunAtLoad": False})):
                with self.subTest(named, broken=broken):
                    self.launch_agent(OTHER).write_bytes(broken)
                    self.assertEqual(json.loads(self.succeeds(tool("replay", "arm", "--json"))), {"installed": True})
                    self.assertEqual(self.launch_agent(OTHER).read_bytes(), whole)
                    self.assertEqual(self.launch_agent(OTHER).stat().st_uid, OTHER_ID)
                    self.assertTrue(json.loads(self.succeeds(tool("status", "--json")))["waiting"]["fit"])
            self.start_what_is_armed()

    def start_what_is_armed(self):
        """As the login does: the agent takes the item, and its file goes."""
        agent = self.machine.start(plistlib.loads(self.launch_agent(OTHER).read_bytes())["ProgramArguments"], user=OTHER_ID)
        try:
            gone = lambda: self.tool("replay", "show", user=OTHER_ID).returncode == 1
            self.machine.wait_for(lambda: not self.launch_agent(OTHER).exists() and gone(), "the agent's beginning")
        finally:
            agent.kill()
            agent.wait()

    def test_a_hand_over_is_taken_back(self):
        for tool, named in self.ways():
            with self.subTest(named):
                self.fails(tool("setup", "--cancel"), 1, "nothing is waiting for the next login")
                self.succeeds(self.set_up(OTHER))
                self.assertEqual(self.succeeds(tool("setup", "--cancel")),
                                 "Removed the replay item and the agent: nothing happens at the next login. "
                                 "The account stays as it is (see welcomer account).\n")
                self.assertFalse(self.launch_agent(OTHER).exists())
                self.fails(tool("replay", "show"), 1, "no such item")
                self.fails(tool("replay", "arm"), 1, "no replay item is waiting for which the agent could be installed")
                self.assertFalse(self.launch_agent(OTHER).exists())
                self.succeeds(self.set_up(OTHER))
                self.launch_agent(OTHER).unlink()
                self.assertEqual(json.loads(self.succeeds(tool("setup", "--cancel", "--json"))),
                                 {"item": True, "agent": False})
                self.succeeds(self.set_up(OTHER))
                self.succeeds(tool("replay", "delete"))
                self.fails(tool("setup", "--answers", "/tmp/answers.plist"), 1,
                           f"{LABEL}.plist; `welcomer setup --cancel{named}` removes it")
                self.assertEqual(json.loads(self.succeeds(tool("setup", "--cancel", "--json"))),
                                 {"item": False, "agent": True})
        self.fails(self.tool("setup", "--cancel", "--answers", "/root/answers.plist"), 2, "--cancel")

    def accounts(self):
        content = plistlib.loads((self.homes[OTHER] / "Library/Accounts/Accounts.plist").read_bytes())
        return sorted(content["Accounts"]), content.get("LoggedInAccount")

    def test_another_account_after_signing_out(self):
        self.succeeds(self.tool("account", "add", "carl"))
        for tool, named in self.ways():
            with self.subTest(named):
                self.succeeds(self.tool("account", "sign-in", "anna", "--user", OTHER))
                self.fails(self.tool("account", "sign-in", "carl", "--user", OTHER), 1, "anna is logged in to the cloud already")
                self.assertEqual(self.succeeds(tool("account", "sign-out")), "anna is signed out.\n")
                self.fails(tool("account", "sign-out"), 1, "nobody is logged in to a cloud account")
                self.assertEqual(self.accounts(), (["anna"], None))
                self.succeeds(self.tool("account", "sign-in", "carl", "--user", OTHER))
                self.assertEqual(self.accounts(), (["anna", "carl"], "carl"))
                self.succeeds(tool("account", "remove", "anna"))
                self.assertEqual(self.accounts(), (["carl"], "carl"))
                self.assertEqual(json.loads(self.succeeds(tool("account", "remove", "carl", "--json"))),
                                 {"account": "carl", "removed": True})
                self.assertEqual(self.accounts(), ([], None))
                self.fails(tool("account", "remove", "carl"), 1, "cannot remove carl: there is no account carl")

    def test_who_can_sign_in_no_more(self):
        self.succeeds(self.tool("account", "sign-in", "anna", "--user", OTHER))
        self.fails(self.tool("account", "remove", "anna", "--from-directory", user=OTHER_ID), 1, "cannot remove anna")
        self.succeeds(self.tool("account", "remove", "anna", "--from-directory"))
        self.fails(self.tool("account", "remove", "anna", "--from-directory"), 1, "there is no user anna")
        listed = json.loads(self.succeeds(self.tool("account", "list", "--json", "--user", OTHER)))["accounts"]
        self.assertEqual(listed, [{"name": "anna", "canSignIn": False, "hasAccount": True, "loggedIn": True}])
        self.fails(self.tool("account", "sign-in", "anna", "--user", machine.USER), 1, "there is no such user")


if __name__ == "__main__":
    machine.enter_namespaces()
    Mending.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
