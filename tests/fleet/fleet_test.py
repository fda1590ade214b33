#!/usr/bin/env python3
"""A small fleet that loses a directory, an account server and a front's worker while its machines sign in.

usage: fleet_test.py BUILD_DIR [SUITE]
"""

import shutil
import sys
import tempfile
import threading
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import accounting  # noqa: E402
import fleet  # noqa: E402
import machine  # noqa: E402

MACHINES = 120
AT_ONCE = 8  # few, so that all have an answer in time on a machine that is busy with something else


class SmallFleet(unittest.TestCase):
    """What the suites have in common: a fleet for each test."""
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="fleet-"))
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.installed = fleet.install(cls.build, cls.folder / "stage")

    def setUp(self):
        folder = Path(tempfile.mkdtemp(prefix="", dir=self.folder))
        self.fleet = fleet.Fleet(folder, self.build, self.installed, MACHINES)
        self.addCleanup(self.fleet.close)
        self.tries = []  # of all machines of this test

    def sign_in(self, count, events=None):
        """Has machines sign in, and something happen once so many have an answer; gives what they saw."""
        lines, wrong = accounting.plan(range(count), seconds=0)
        tries, threads = [], []
        program = self.fleet.machines(lines, AT_ONCE)
        for fields in program.lines():
            tries.append(accounting.Try.of(fields))
            if event := (events or {}).get(len(tries)):
                threads.append(threading.Thread(target=event))
                threads[-1].start()
        for thread in threads:
            thread.join(60)
            self.assertFalse(thread.is_alive())
        self.assertEqual(list(accounting.wrong_answers(lines, wrong, tries)), [])
        self.tries += tries
        self.assertEqual(list(accounting.wrong_counts(self.fleet.servers, self.tries, self.fleet.front.given_up())), [])
        return tries


class Kills(SmallFleet):
    def test_whatever_is_killed_no_answer_is_wrong_and_no_sign_in_counts_twice(self):
        directory, server, front = self.fleet.directories[0], self.fleet.servers[0], self.fleet.front
        workers = front.workers()

        def end_server():
            server.kill()
            server.start_again()

        tries = self.sign_in(MACHINES, {MACHINES // 4: directory.kill, MACHINES // 2: end_server,
                                        MACHINES * 3 // 4: front.kill_worker})
        print(f"{len(tries)} tries of {MACHINES} machines; failed: {dict(accounting.failures(tries))}")
        self.assertNotEqual(front.workers(), workers)
        self.assertEqual([how for how, _ in server.log()], ["killed", None])
        gone = "directory-unavailable server=ldap://ldap1.company.example "
        self.assertTrue(any(gone in line for each in self.fleet.servers for line in each.host.lines()))
        for each in self.fleet.servers:
            self.assertGreater(len(accounting.sign_ins(each.host.lines())), 0, each.host.name)


class RollingRestart(SmallFleet):
    def test_a_rolling_restart_is_seen_by_nobody(self):
        def restart(server):
            server.stop()
            server.start()

        events = {place * 20: lambda server=server: restart(server) for place, server in enumerate(self.fleet.servers, 1)}
        self.assertEqual(accounting.losses(self.sign_in(80, events)), {})


class Silence(SmallFleet):
    def test_a_directory_that_nobody_hears_from_is_passed_over(self):
        self.sign_in(20)
        self.fleet.directories[0].host.cut_off()
        self.assertEqual(accounting.losses(self.sign_in(40)), {})


class LostHost(SmallFleet):
    def test_an_account_server_that_nobody_hears_from_costs_a_wait_and_nothing_else(self):
        self.sign_in(20)  # the front keeps connections to each of them
        lost = self.fleet.servers[0]
        lost.host.cut_off()
        before = len(accounting.sign_ins(lost.host.lines()))
        tries = self.sign_in(40)
        print(f"the longest took {max(each.took for each in tries):.1f} s; failed: {dict(accounting.failures(tries))}")
        self.assertEqual(accounting.losses(tries), {})
        self.assertEqual(len(accounting.sign_ins(lost.host.lines())), before)


class Addresses(SmallFleet):
    def test_the_servers_know_who_asked_the_front(self):
        self.sign_in(20)
        asked = {request["from"] for server in self.fleet.servers for request in accounting.requests(server.host.lines())}
        self.assertEqual(asked, {self.fleet.office.address})


class Replication(SmallFleet):
    def test_what_was_changed_in_one_directory_holds_when_only_the_other_is_left(self):
        first, second = self.fleet.directories
        user = fleet.user_name(0)
        first.kill()
        change = f"dn: uid={user},{fleet.PEOPLE}\nchangetype: modify\nreplace: userPassword\nuserPassword: {{}}\n"
        second.change(change.format(fleet.hash_of("new")))
        first.start()
        fleet.wait_for(lambda: first.entry(user) == second.entry(user), "the change to arrive")
        second.kill()
        outcomes = [fields[4] for fields in self.fleet.machines([(0, user, "new"), (1, user, fleet.password_of(user))], 1).lines()]
        self.assertEqual(outcomes, ["completed", accounting.WRONG_PASSWORD])


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    SmallFleet.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
