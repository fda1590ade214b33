#!/usr/bin/env python3
"""The installed units of the account server: started by the real systemd as its own user, in its sandbox, it works.

usage: units_test.py BUILD_DIR
"""

import json
import os
import plistlib
import shutil
import stat
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import account_server  # noqa: E402
import booted  # noqa: E402
import machine  # noqa: E402

SERVICE, USER = "welcomer-account-server.service", "welcomer-accounts"
SOCKET, METRICS, TLS = (f"welcomer-account-server{kind}.socket" for kind in ("", "-metrics", "-tls"))
# Asks over the Unix socket as whoever runs it.
ASK = """
import http.client, socket, sys
class Connection(http.client.HTTPConnection):
    def connect(self):
        self.sock = socket.socket(socket.AF_UNIX)
        self.sock.connect("/run/welcomer-account-server.sock")
connection = Connection("localhost", timeout=60)
connection.request("POST", sys.argv[1], sys.argv[2], {"Content-Type": "application/json"})
answer = connection.getresponse()
print(answer.status, answer.read().decode())
"""


class Units(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="account-units-"))
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.machine = booted.BootedMachine(cls.folder / "machine")
        cls.addClassCleanup(cls.machine.stop)
        cls.machine.install(cls.build)
        preset = cls.machine.run(["/usr/bin/systemctl", "preset", SOCKET, METRICS, TLS])
        assert preset.returncode == 0, preset
        cls.machine.boot()
        cls.before = [cls.machine.systemctl("is-enabled", unit, check=False).stdout.strip()
                      for unit in (SERVICE, SOCKET, METRICS, TLS)]
        # A directory that is older than the server, as root's tool makes it.
        (cls.machine.inside / account_server.DIRECTORY).unlink()
        cls.add_user("anna")
        made = cls.machine.run(["/usr/bin/systemd-tmpfiles", "--create", "welcomer-account-server.conf"])
        assert made.returncode == 0, made
        cls.machine.systemctl("start", SOCKET, METRICS)

    @classmethod
    def add_user(cls, name):
        added = cls.machine.run(["/bin/sh", "-c", f"echo '{account_server.PASSWORD}' | /usr/local/bin/welcomer account add "
                                 f"{name} --password-fd 0"])
        assert added.returncode == 0, added

    def ask(self, path, members):
        """What an ordinary user is answered."""
        done = self.machine.run(["/usr/bin/python3", "-c", ASK, path, json.dumps(members)], user=True)
        self.assertEqual(done.returncode, 0, done)
        status, body = done.stdout.split(" ", 1)
        return int(status), json.loads(body) if body.strip() else None

    def authenticate(self, user, password=account_server.PASSWORD):
        return self.ask("/v1/authenticate", account_server.body_of(user, password))

    def process_status(self):
        process = self.machine.systemctl("show", SERVICE, "--property=MainPID", "--value").stdout.strip()
        text = (self.machine.inside / f"proc/{process}/status").read_text(encoding="ascii")
        return dict(line.split(":\t", 1) for line in text.splitlines() if ":\t" in line)

    def test_1_the_presets_leave_them_disabled(self):
        self.assertEqual(self.before, ["static"] + ["disabled"] * 3)

    def test_2_its_exposure_is_low(self):
        rated = self.machine.run(["/usr/bin/systemd-analyze", "security", "--offline=yes", "--threshold=15",
                                  f"/usr/local/lib/systemd/system/{SERVICE}"])
        self.assertIn("Overall exposure level", rated.stdout)
        self.assertEqual(rated.returncode, 0, rated.stdout.splitlines()[-1])

    def test_3_it_starts_when_somebody_asks_and_reads_what_is_roots(self):
        self.assertEqual(self.machine.systemctl("is-active", SERVICE, check=False).stdout.strip(), "inactive")
        status, answer = self.authenticate("anna")
        self.assertEqual((status, answer["accountID"]), (200, "anna"), self.machine.journal("-u", SERVICE))
        process = self.process_status()
        user = self.machine.run(["/usr/bin/id", "-u", USER]).stdout.strip()
        self.assertEqual(process["Uid"].split(), [user] * 4)
        self.assertEqual([process[name] for name in ("CapEff", "CapPrm", "CapBnd")], ["0" * 16] * 3)
        self.assertEqual((process["NoNewPrivs"], process["Seccomp"]), ("1", "2"))
        # Its user's other processes, if there were any, could not look into it.
        self.assertEqual((self.machine.inside / f"proc/{process['Pid']}/environ").stat().st_uid, 0)

    def test_4_the_directory_stays_roots_and_the_servers(self):
        self.add_user("bert")
        self.assertEqual(self.authenticate("bert")[0], 200)
        status = (self.machine.inside / account_server.DIRECTORY).stat()
        group = int(self.machine.run(["/usr/bin/id", "-g", USER]).stdout)
        self.assertEqual((status.st_uid, status.st_gid, stat.S_IMODE(status.st_mode)), (0, group, 0o640))

    def test_5_users_are_known_by_the_kernels_word(self):
        self.assertEqual(self.authenticate("anna", "wrong")[0], 401)
        lines = self.machine.journal("-u", SERVICE)
        self.assertTrue(any(f'status=401 from="uid {machine.UID}" user=anna' in line for line in lines), lines)

    def test_6_accepted_terms_are_kept_over_a_restart(self):
        directory = self.machine.inside / account_server.DIRECTORY
        content = plistlib.loads(directory.read_bytes())
        content["Users"]["anna"].update({"AccountError": 3, "AccountErrorInfo": "October"})
        directory.write_bytes(plistlib.dumps(content))
        self.assertEqual(self.authenticate("anna")[0], 403)
        accepted = self.ask("/v1/accept-terms", account_server.body_of("anna", delegatesRequest=None, terms="October"))
        self.assertEqual(accepted[0], 204)
        self.machine.systemctl("restart", SERVICE)
        self.assertEqual(self.authenticate("anna")[0], 200)

    def test_7_its_figures_are_on_a_socket_of_their_own(self):
        self.authenticate("anna")
        asked = self.machine.run(["/usr/bin/python3", "-c", "import urllib.request; print(urllib.request.urlopen("
                                  "'http://127.0.0.1:9468/metrics').read().decode())"], user=True)
        self.assertIn('welcomer_account_answers_total{resource="authenticate",status="200"} ', asked.stdout, asked)

    def test_8_settings_are_taken_over_by_a_reload_unless_they_make_no_sense(self):
        settings = self.machine.inside / "etc/welcomer/account-server.conf"
        settings.parent.mkdir(exist_ok=True)
        settings.write_text("UnknownUsers=perhaps\n", encoding="ascii")
        self.machine.systemctl("reload", SERVICE)
        self.assertTrue(self.authenticate("nobody")[1]["type"].endswith(":wrong-credentials"))
        settings.write_text("UnknownUsers=told\n", encoding="ascii")
        self.machine.systemctl("reload", SERVICE)
        self.assertTrue(self.authenticate("nobody")[1]["type"].endswith(":unknown-user"))
        failed = [line for line in self.machine.journal("-u", SERVICE) if "reload-failed" in line]
        self.assertIn("line 1: UnknownUsers is not", failed[0])

    def test_9_its_end_is_a_success(self):
        self.authenticate("anna")
        self.machine.systemctl("stop", SOCKET, METRICS, SERVICE)
        self.assertEqual(self.machine.systemctl("show", SERVICE, "--property=Result", "--value").stdout.strip(), "success")


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    os.umask(0o022)
    Units.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
