#!/usr/bin/env python3
"""The installed unit of the resolver service: started by the real systemd as its own user, in its sandbox, it works.

usage: resolver_sandbox_test.py MACHINE PACKAGES
    MACHINE   the minimal system that make_machine.py has made
    PACKAGES  the folder of the packages that are installed on it
"""

import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import booted_machine as booted  # noqa: E402
import resolver  # noqa: E402

UNIT, USER = "welcomer-resolver-sync.service", "welcomer-resolver"
SOMEBODY = "newcomer"


class Sandbox(unittest.TestCase):
    base, packages = None, ()

    @classmethod
    def setUpClass(cls):
        cls.machine = booted.BootedMachine(cls.base)
        cls.addClassCleanup(cls.machine.shut_down)
        cls.machine.boot()
        # Fetched when the machine was made: not every machine has it.
        [resolved] = (cls.machine.root / "var/cache/apt/archives").glob("systemd-resolved_*.deb")
        cls.machine.install([resolved])
        cls.machine.install(cls.packages)
        # The resolver was started before the bus knew that it may have its name.
        cls.machine.reboot()
        cls.machine.add_user(SOMEBODY)
        cls.machine.enter_network()
        for daemon in resolver.start_environments():
            cls.addClassCleanup(daemon.wait)
            cls.addClassCleanup(daemon.terminate)

    def select(self, name):
        selected = self.machine.run(["welcomer", "switch", "select", name])
        self.assertEqual(selected.returncode, 0, selected)

    def wait_for_answer(self, name, answer):
        try:
            booted.wait_for(lambda: resolver.ask(name) == answer, f"{answer} for {name}", 30)
        except TimeoutError as error:
            raise AssertionError(f"{error}: {self.machine.journal(f'--unit={UNIT}')}") from error

    def status_of(self, process):
        text = self.machine.must(["cat", f"/proc/{process}/status"])
        return dict(line.split(":\t", 1) for line in text.splitlines() if ":\t" in line)

    def state(self):
        return [self.machine.run(["systemctl", f"is-{what}", UNIT]).stdout.strip() for what in ("enabled", "active")]

    def test_1_the_package_and_the_preset_leave_it_disabled(self):
        self.assertEqual(self.state(), ["disabled", "inactive"])
        self.machine.must(["systemctl", "preset", UNIT])
        self.assertEqual(self.state(), ["disabled", "inactive"])

    def test_2_its_exposure_is_low(self):
        rated = self.machine.run(["systemd-analyze", "security", "--offline=yes", "--threshold=20",
                                  f"/lib/systemd/system/{UNIT}"])
        self.assertIn("Overall exposure level", rated.stdout)
        self.assertEqual(rated.returncode, 0, rated.stdout.splitlines()[-1])

    def test_3_it_runs_as_its_own_user_with_two_rights_and_works(self):
        self.machine.must(["systemctl", "start", UNIT])
        process = self.machine.must(["systemctl", "show", UNIT, "--property=MainPID", "--value"]).strip()
        user = str(self.machine.user_id(USER))
        status = self.status_of(process)
        self.assertEqual(status["Uid"].split(), [user] * 4)
        rights = 1 << 12 | 1 << 10  # CAP_NET_ADMIN, CAP_NET_BIND_SERVICE
        self.assertEqual((status["CapEff"], status["CapBnd"]), (f"{rights:016x}",) * 2)
        self.assertEqual((status["NoNewPrivs"], status["Seccomp"]), ("1", "2"))
        self.select("Nimbus1")
        for domain in resolver.DOMAINS:
            self.wait_for_answer(f"probe.{domain}", resolver.ANSWERS["Nimbus1"])
        [forwarder] = self.machine.must(["pgrep", "-u", USER, "dnsmasq"]).split()
        self.assertEqual(self.status_of(forwarder)["Uid"].split(), [user] * 4)
        report = self.machine.run(["welcomer", "doctor"], SOMEBODY).stdout
        self.assertIn("the overrides have an effect", report)
        self.select("Nimbus2")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus2"])
        self.select("Prod")
        self.wait_for_answer("probe.nimbus.example", None)

    def test_4_its_end_leaves_nothing(self):
        self.machine.must(["systemctl", "start", UNIT])
        self.select("Nimbus1")
        self.wait_for_answer("probe.nimbus.example", resolver.ANSWERS["Nimbus1"])
        self.machine.must(["systemctl", "stop", UNIT])
        self.assertEqual(self.machine.must(["systemctl", "show", UNIT, "--property=Result", "--value"]).strip(), "success")
        self.assertEqual(self.machine.must(["find", "/run", "-name", "welcomer-resolver-sync"]), "")
        self.assertEqual(self.machine.run(["pgrep", "-u", USER]).stdout, "")
        self.assertNotIn("welcomer0", self.machine.must(["ip", "link"]))
        self.wait_for_answer("probe.nimbus.example", None)
        failures = [line for line in self.machine.journal("--identifier=welcomer-resolver-sync") if "Failed" in line]
        self.assertEqual(failures, [])


if __name__ == "__main__":
    booted.enter_namespaces()
    Sandbox.base, Sandbox.packages = sys.argv[1], booted.package_files(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
