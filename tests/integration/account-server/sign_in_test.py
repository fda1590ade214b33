#!/usr/bin/env python3
"""The installed tool of an ordinary user signs in through the installed account server.

usage: sign_in_test.py BUILD_DIR
"""

import json
import shutil
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import account_server  # noqa: E402
import machine  # noqa: E402
from account_server import PASSWORD  # noqa: E402

MAIL = "com.corvid.nimbus.service.mail"


class SignIn(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, cls.build, "account-sign-in")
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        account_server.make_certificate(cls.folder, "authority")
        for file in (cls.folder / "authority.pem", *account_server.make_certificate(cls.folder, "server", "authority")):
            shutil.copy(file, cls.machine.root / "etc")
        cls.server = account_server.AccountServer(cls.machine, "Certificate=/etc/server.pem\nKey=/etc/server.key\n",
                                                  certificate=cls.folder / "authority.pem")
        cls.addClassCleanup(cls.server.close)
        account_server.write_directory(cls.machine.root, {
            "anna": {"MailAddress": "anna@nimbus.example",
                     "Services": {MAIL: {"Properties": {}}, "com.corvid.nimbus.service.notes": {"CanBeEnabled": False}}},
            "terms": {"AccountError": 3, "AccountErrorInfo": {"version": "2026-10"}}})
        (cls.machine.root / account_server.DIRECTORY).chmod(0o600)
        cls.server.start()

    def setUp(self):
        for path in self.machine.home.iterdir():
            shutil.rmtree(path)

    def ask(self, address):
        settings = self.machine.root / "etc/welcomer/platform.conf"
        settings.write_text(f"AccountServer={address}\nAccountServerAuthority=/etc/authority.pem\n", encoding="ascii")

    def addresses(self):
        return f"unix:/{account_server.SOCKET}", "https://127.0.0.1:{1}".format(*self.server.address("tls"))

    def sign_in(self, name, password=PASSWORD):
        return self.machine.run(["/bin/sh", "-c", 'exec /usr/local/bin/welcomer --verbose account sign-in "$0" --password-fd 3 '
                                 f"3<<END\n{password}\nEND\n", name], user=True)

    def test_what_is_roots_lets_a_user_in(self):
        unreadable = self.machine.run(["/bin/cat", f"/{account_server.DIRECTORY}"], user=True)
        self.assertNotEqual(unreadable.returncode, 0)
        for address in self.addresses():
            with self.subTest(address):
                self.setUp()
                self.ask(address)
                signed_in = self.sign_in("anna")
                self.assertEqual(signed_in.returncode, 0, signed_in)
                shown = self.machine.run(["/usr/local/bin/welcomer", "--json", "account", "services", "anna"], user=True)
                services = {service["service"]: service["canBeEnabled"] for service in json.loads(shown.stdout)["services"]
                            if service["present"]}
                self.assertEqual(services, {"mail": True, "notes": False}, shown)

    def test_a_wrong_password_and_terms_do_not(self):
        for address in self.addresses():
            self.ask(address)
            with self.subTest(address):
                for name, password, why in (("anna", "wrong horse", "The user name or the password is wrong"),
                                            ("nobody", PASSWORD, "The user name or the password is wrong"),
                                            ("terms", PASSWORD, "terms of service")):
                    refused = self.sign_in(name, password)
                    self.assertEqual(refused.returncode, 1, refused)
                    self.assertIn(why, refused.stderr.splitlines()[-1])
                    self.assertNotIn(password, refused.stdout + refused.stderr)


if __name__ == "__main__":
    machine.enter_namespaces()
    SignIn.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
