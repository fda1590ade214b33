#!/usr/bin/env python3
"""What waits for another user's login, as the installed tool's status tells root.

usage: status_test.py BUILD_DIR
"""

import json
import plistlib
import sys
import unittest

from for_others_test import DIRECTORY, LABEL, OTHER, OTHER_ID, ForOthersTest, machine


class Status(ForOthersTest):
    def setUp(self):
        super().setUp()
        self.add_anna()

    def status(self, *arguments, failure=None, **options):
        """The status document of a user for whom something is to be done, or nothing."""
        done = self.tool("status", "--json", *arguments, **options)
        self.assertEqual((done.returncode, done.stderr), (1, f"welcomer: {failure}\n") if failure else (0, ""), done)
        return json.loads(done.stdout)

    def waiting(self, *arguments, **options):
        """(item, agent's file, whether they fit)"""
        waiting = self.status(*arguments, **options)["waiting"]
        return waiting["item"], waiting["agent"], waiting["fit"]

    def to_do(self, **options):
        return [(each["what"], each["advice"])
                for each in self.status("--user", OTHER, failure="one thing is to be done", **options)["toDo"]]

    def test_what_waits_is_told_to_root_and_to_the_user_alike(self):
        self.assertEqual(self.waiting("--user", OTHER), (False, False, True))
        self.succeeds(self.set_up(OTHER))
        for asked, options in ((["--user", OTHER], {}), ([], {"user": OTHER_ID})):
            found = self.status(*asked, **options)
            self.assertEqual(found["waiting"] | {"itemStatus": None},
                             {"item": True, "itemStatus": None, "account": "anna", "store": "local file", "agent": True,
                              "agentFile": f"/home/{OTHER}/Library/LaunchAgents/{LABEL}.plist", "agentProblem": None,
                              "fit": True})
            self.assertEqual((found["lastLogin"], found["toDo"]), (None, []))
        shown = self.succeeds(self.tool("status", "--user", OTHER))
        self.assertRegex(shown, r"\AItem: +waits, for anna, in the local file\nAgent: +installed, /home/bert/[^\n]*\n"
                                r"They fit: +yes, the next login finishes the setup\n")
        self.assertRegex(shown, r"\nNothing is to be done\.\n\Z")
        # It is that user's alone: root's own, and everybody else's, is asked of themselves.
        self.assertEqual(self.waiting(), (False, False, True))
        self.assertEqual(self.waiting("--user", machine.USER), (False, False, True))
        self.assertEqual(self.waiting(user=True), (False, False, True))

    def test_what_does_not_fit_is_told_with_what_root_can_do(self):
        arm, cancel = f"welcomer replay arm --user {OTHER}", f"welcomer setup --cancel --user {OTHER}"
        self.succeeds(self.set_up(OTHER))
        definition = plistlib.loads(self.launch_agent(OTHER).read_bytes())
        self.launch_agent(OTHER).unlink()
        self.assertEqual(self.to_do(), [("an item waits, but no agent will start for it",
                                         f"{arm} installs the agent; {cancel} gives the setup up")])
        self.launch_agent(OTHER).write_bytes(plistlib.dumps({**definition, "ProgramArguments": ["/gone"]}))
        [(what, advice)] = self.to_do()
        self.assertRegex(what, "^the agent's file starts no agent: .*/gone")
        self.assertEqual(advice, f"{arm} installs the agent; {cancel} gives the setup up")
        # The advice helps.
        self.succeeds(self.tool("replay", "arm", "--user", OTHER))
        self.assertEqual(self.waiting("--user", OTHER), (True, True, True))
        self.succeeds(self.tool("replay", "delete", "--user", OTHER))
        self.assertEqual(self.to_do(), [("the agent will start, but there is no item for it",
                                         f"{cancel} removes the agent's file")])
        shown = self.tool("status", "--user", OTHER)
        self.assertEqual((shown.returncode, shown.stderr), (1, "welcomer: one thing is to be done\n"))
        self.assertIn(f"To be done:\n  the agent will start, but there is no item for it\n    advice: {cancel} ", shown.stdout)
        # Who asks for themselves needs no name.
        own = self.status(user=OTHER_ID, failure="one thing is to be done")
        self.assertEqual(own["toDo"][0]["advice"], "welcomer setup --cancel removes the agent's file")

    def test_what_the_status_shows_changes_nothing(self):
        self.succeeds(self.set_up(OTHER))
        before, directory = self.outside(), (self.root / DIRECTORY).read_bytes()
        home = {path: path.lstat().st_mtime_ns for path in self.homes[OTHER].rglob("*") if path.is_file()}
        self.status("--user", OTHER)
        self.assertEqual(self.outside(), before)
        self.assertEqual((self.root / DIRECTORY).read_bytes(), directory)
        self.assertEqual({path: path.lstat().st_mtime_ns for path in self.homes[OTHER].rglob("*") if path.is_file()}, home)

    def test_who_cannot_be_asked_for(self):
        self.fails(self.tool("status", "--user", OTHER, user=True), 1, "--user: only root can act for another user")
        self.fails(self.tool("status", "--user", "nobody-here"), 1, "--user: there is no user nobody-here")
        self.fails(self.tool("status", "--user", "root"), 2, "root is root, who needs no such option")
        self.fails(self.tool("status", "--user", ""), 2, "the user's name is empty")


if __name__ == "__main__":
    machine.enter_namespaces()
    ForOthersTest.build = sys.argv[1]
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
