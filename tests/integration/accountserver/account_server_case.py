"""The installed tool on a machine of its own, and account servers that its settings name."""

import os
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402
from tls_server import HOST, Authority, Server, answer  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
PASSWORD = "Tr0ub4dor and 3"
RIGHT = {"status": 0, "accountID": "anna", "delegates": {}, "mailAddress": "anna@example.org",
         "services": {"com.corvid.nimbus.service.mail": {"canBeEnabled": False}}}


def right(_line, _body):
    return answer(200, RIGHT)


class AccountServerTest(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="account-server-"))
        cls.machine = machine.Machine(cls.folder / "machine")
        cls.machine.install(cls.build)
        cls.root = cls.machine.root
        (cls.root / "etc/welcomer").mkdir(parents=True, exist_ok=True)
        (cls.root / "etc/hosts").write_text(f"127.0.0.1 localhost {HOST} other.example\n", encoding="ascii")
        (cls.root / "var/lib").mkdir(exist_ok=True)
        cls.authority = Authority(cls.folder / "authority")
        (cls.root / "etc/authority.pem").write_bytes(cls.authority.certificate.read_bytes())
        cls.certificate = cls.authority.issue("right")

    @classmethod
    def tearDownClass(cls):
        cls.machine.stop()
        subprocess.run(["rm", "-r", str(cls.folder)], check=True)

    def tearDown(self):
        subprocess.run(["rm", "-rf", str(self.root / "root/Library"), str(self.machine.home / "Library")], check=True)

    def serve(self, reply=right, **options):
        server = Server(reply, **options)
        self.addCleanup(server.close)
        return server

    def settle(self, server=None, **settings):
        """Writes the settings: for a server over TLS, or as they are given."""
        lines = {"AccountServer": f"https://{HOST}:{server.port}" if server else "",
                 "AccountServerAuthority": "/etc/authority.pem", **settings}
        self.address = lines["AccountServer"]
        (self.root / "etc/welcomer/platform.conf").write_text(
            "".join(f"{name}={value}\n" for name, value in lines.items()), encoding="ascii")

    def with_password(self, run, *arguments, variables=(), password=PASSWORD, **options):
        """Has the machine run the tool with a password and perhaps with variables of the environment."""
        reading, writing = os.pipe()
        os.write(writing, password.encode() + b"\n")
        os.close(writing)
        try:
            return run(["/usr/bin/env", *variables, TOOL, *arguments, "--password-fd", str(reading)], pass_fds=[reading],
                       **options)
        finally:
            os.close(reading)

    def tool(self, *arguments, **options):
        return self.with_password(self.machine.run, *arguments, **options)

    def sign_in(self, **options):
        return self.tool("account", "sign-in", "anna", **options)

    def refused(self, **options):
        """What the tool says to somebody who cannot sign in."""
        done = self.sign_in(**options)
        self.assertEqual((done.returncode, done.stdout), (1, f"Asking the account server {self.address}\n"), done)
        self.assertEqual(done.stderr.count("\n"), 1, done)
        self.assertFalse((self.root / "root/Library/Accounts").exists(), "nothing is stored")
        return done.stderr.removeprefix("welcomer: ").strip()


    def reason(self, server=None, variables=(), **settings):
        self.settle(server, **settings)
        text = self.refused(variables=variables)
        self.assertTrue(text.startswith("cannot sign in anna: "), text)
        return text.removeprefix("cannot sign in anna: ")


def main():
    """usage: TEST.py BUILD_DIR SUITE"""
    machine.enter_namespaces()
    subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
    AccountServerTest.build = Path(sys.argv.pop(1)).resolve()
    unittest.main(module="__main__", verbosity=2)
