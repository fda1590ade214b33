#!/usr/bin/env python3
"""The installed units of the account server: started by the real systemd as its own user, in its sandbox, it works.

usage: account_server_test.py MACHINE PACKAGES
    MACHINE   the minimal system that make_machine.py has made
    PACKAGES  the folder of the packages that are installed on it
"""

import plistlib
import stat
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import account_server  # noqa: E402
import booted_machine as booted  # noqa: E402

SERVICE, USER = "welcomer-account-server.service", "welcomer-accounts"
SOMEBODY = "newcomer"
SOCKET, METRICS, TLS = (f"welcomer-account-server{kind}.socket" for kind in ("", "-metrics", "-tls"))


class Units(unittest.TestCase):
    base, packages = None, ()

    @classmethod
    def setUpClass(cls):
        cls.machine = booted.BootedMachine(cls.base)
        cls.addClassCleanup(cls.machine.shut_down)
        cls.machine.boot()
        # The directory is older than the server, as root's tool makes it.
        cls.machine.install([package for package in cls.packages if "account-server" not in package.name])
        cls.add_user("anna")
        cls.directory = cls.machine.root / account_server.DIRECTORY
        cls.mode_before = stat.S_IMODE(cls.directory.stat().st_mode)
        cls.machine.install([package for package in cls.packages if "account-server" in package.name])
        cls.before = [cls.state_of(unit) for unit in (SERVICE, SOCKET, METRICS, TLS)]
        cls.machine.add_user(SOMEBODY)
        cls.machine.must(["systemctl", "start", SOCKET, METRICS])

    @classmethod
    def add_user(cls, name):
        cls.machine.must(["welcomer", "account", "add", name, "--password-fd", "0"], input=account_server.PASSWORD + "\n")

    @classmethod
    def state_of(cls, unit, what="is-enabled"):
        return cls.machine.run(["systemctl", what, unit]).stdout.strip()

    def ask(self, path, members):
        """What an ordinary user is answered."""
        return account_server.ask_on(self.machine, SOMEBODY, path, members)

    def authenticate(self, user, password=account_server.PASSWORD):
        return self.ask("/v1/authenticate", account_server.body_of(user, password))

    def process_status(self):
        process = self.machine.must(["systemctl", "show", SERVICE, "--property=MainPID", "--value"]).strip()
        text = self.machine.must(["cat", f"/proc/{process}/status"])
        return dict(line.split(":\t", 1) for line in text.splitlines() if ":\t" in line)

    def test_1_the_package_and_the_presets_leave_them_disabled(self):
        self.assertEqual(self.before, ["static"] + ["disabled"] * 3)
        self.machine.must(["systemctl", "preset", SOCKET, METRICS, TLS])
        self.assertEqual([self.state_of(unit) for unit in (SERVICE, SOCKET, METRICS, TLS)], ["static"] + ["disabled"] * 3)

    def test_2_its_exposure_is_low(self):
        rated = self.machine.run(["systemd-analyze", "security", "--offline=yes", "--threshold=15",
                                  f"/lib/systemd/system/{SERVICE}"])
        self.assertIn("Overall exposure level", rated.stdout)
        self.assertEqual(rated.returncode, 0, rated.stdout.splitlines()[-1])

    def test_3_it_starts_when_somebody_asks_and_reads_what_is_roots(self):
        self.assertEqual(self.state_of(SERVICE, "is-active"), "inactive")
        status, answer = self.authenticate("anna")
        self.assertEqual((status, answer["accountID"]), (200, "anna"), self.machine.journal("-u", SERVICE))
        process = self.process_status()
        user = str(self.machine.user_id(USER))
        self.assertEqual(process["Uid"].split(), [user] * 4)
        self.assertEqual([process[name] for name in ("CapEff", "CapPrm", "CapBnd")], ["0" * 16] * 3)
        self.assertEqual((process["NoNewPrivs"], process["Seccomp"]), ("1", "2"))
        # Its user's other processes, if there were any, could not look into it.
        self.assertEqual(self.machine.must(["stat", "-c", "%u", f"/proc/{process['Pid']}/environ"]), "0\n")

    def test_4_the_directory_stays_roots_and_the_servers(self):
        self.assertEqual(self.mode_before, 0o600)
        self.add_user("bert")
        self.assertEqual(self.authenticate("bert")[0], 200)
        status = self.directory.stat()
        group = int(self.machine.must(["id", "-g", USER]))
        self.assertEqual((status.st_uid, status.st_gid, stat.S_IMODE(status.st_mode)), (0, group, 0o640))

    def test_5_users_are_known_by_the_kernels_word(self):
        self.assertEqual(self.authenticate("anna", "wrong")[0], 401)
        lines = self.machine.journal("-u", SERVICE)
        self.assertTrue(any(f'status=401 from="uid {self.machine.user_id(SOMEBODY)}" user=anna' in line for line in lines), lines)

    def test_6_accepted_terms_are_kept_over_a_restart(self):
        content = plistlib.loads(self.directory.read_bytes())
        content["Users"]["anna"].update({"AccountError": 3, "AccountErrorInfo": "October"})
        self.directory.write_bytes(plistlib.dumps(content))
        self.assertEqual(self.authenticate("anna")[0], 403)
        accepted = self.ask("/v1/accept-terms", account_server.body_of("anna", delegatesRequest=None, terms="October"))
        self.assertEqual(accepted[0], 204)
        self.machine.must(["systemctl", "restart", SERVICE])
        self.assertEqual(self.authenticate("anna")[0], 200)

    def test_7_its_figures_are_on_a_socket_of_their_own(self):
        self.authenticate("anna")
        asked = self.machine.run(["python3", "-c", "import urllib.request; print(urllib.request.urlopen("
                                  "'http://127.0.0.1:9468/metrics').read().decode())"], SOMEBODY)
        self.assertIn('welcomer_account_answers_total{resource="authenticate",status="200"} ', asked.stdout, asked)

    def test_8_settings_are_taken_over_by_a_reload_unless_they_make_no_sense(self):
        self.machine.write("etc/welcomer/account-server.conf", "UnknownUsers=perhaps\n")
        self.machine.must(["systemctl", "reload", SERVICE])
        self.assertTrue(self.authenticate("nobody")[1]["type"].endswith(":wrong-credentials"))
        self.machine.write("etc/welcomer/account-server.conf", "UnknownUsers=told\n")
        self.machine.must(["systemctl", "reload", SERVICE])
        self.assertTrue(self.authenticate("nobody")[1]["type"].endswith(":unknown-user"))
        failed = [line for line in self.machine.journal("-u", SERVICE) if "reload-failed" in line]
        self.assertIn("line 1: UnknownUsers is not", failed[0])

    def test_9_its_end_is_a_success(self):
        self.authenticate("anna")
        self.machine.must(["systemctl", "stop", SOCKET, METRICS, SERVICE])
        self.assertEqual(self.machine.must(["systemctl", "show", SERVICE, "--property=Result", "--value"]).strip(), "success")


if __name__ == "__main__":
    booted.enter_namespaces()
    Units.base, Units.packages = sys.argv[1], booted.package_files(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
