#!/usr/bin/env python3
"""The installed tool signs in with an account server: over TLS and a Unix socket, and with servers that it must not trust.

usage: account_server_test.py BUILD_DIR SUITE
"""

import json
import os
import signal
import ssl
import subprocess
import sys
import tempfile
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402
import tls_server  # noqa: E402
from tls_server import HOST, Authority, Server, answer, problem  # noqa: E402

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
        subprocess.run(["rm", "-rf", str(self.root / "root/Library")], check=True)

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

    def tool(self, *arguments, password=PASSWORD, **options):
        reading, writing = os.pipe()
        os.write(writing, password.encode() + b"\n")
        os.close(writing)
        try:
            return self.machine.run([TOOL, *arguments, "--password-fd", str(reading)], pass_fds=[reading], **options)
        finally:
            os.close(reading)

    def sign_in(self):
        return self.tool("account", "sign-in", "anna")

    def refused(self):
        """What the tool says to somebody who cannot sign in."""
        done = self.sign_in()
        self.assertEqual((done.returncode, done.stdout), (1, f"Asking the account server {self.address}\n"), done)
        self.assertEqual(done.stderr.count("\n"), 1, done)
        self.assertFalse((self.root / "root/Library/Accounts").exists(), "nothing is stored")
        return done.stderr.removeprefix("welcomer: ").strip()


class SigningIn(AccountServerTest):
    def signs_in(self, server):
        done = self.sign_in()
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertEqual(done.stdout, f"Asking the account server {self.address}\nanna is signed in.\n")
        status = json.loads(self.machine.run([TOOL, "--json", "account", "status"]).stdout)
        self.assertEqual(status["loggedIn"], "anna")
        for head, body in server.requests:
            self.assertEqual(head.split("\r\n")[0], "POST /v1/authenticate HTTP/1.1")
            self.assertNotIn(PASSWORD, head)
            request = json.loads(body)
            self.assertEqual((request["user"], request["password"]), ("anna", PASSWORD))
            self.assertEqual(sorted(request["machine"]), ["locale", "product", "version"])
            self.assertEqual(request["machine"]["locale"], "C.UTF-8")
        # The first asks for the delegates; the second completes the sign-in.
        self.assertEqual([sorted(json.loads(body)["delegatesRequest"]) for _, body in server.requests],
                         [["delegates"], ["com.corvid.nimbus.property.accountID"]])
        self.assertNotEqual(*[json.loads(body)["requestID"] for _, body in server.requests])

    def test_over_tls(self):
        server = self.serve(certificate=self.certificate)
        self.settle(server)
        self.signs_in(server)

    def test_over_a_unix_socket(self):
        path = self.root / "run/account-server"
        server = self.serve(path=path)
        self.addCleanup(path.unlink)
        self.settle(AccountServer="unix:/run/account-server")
        self.signs_in(server)

    def test_for_another_user_root_asks(self):
        path = self.root / "run/roots-own"
        server = self.serve(path=path)
        self.addCleanup(path.unlink)
        path.chmod(0o600)
        self.settle(AccountServer="unix:/run/roots-own")
        done = self.tool("account", "sign-in", "anna", "--user", machine.USER)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertTrue((self.machine.home / "Library/Accounts").is_dir())
        self.assertEqual([sorted(json.loads(body)["delegatesRequest"]) for _, body in server.requests],
                         [["delegates"], ["com.corvid.nimbus.property.accountID"]])

    def test_the_account_has_what_the_server_gives_it(self):
        self.settle(self.serve(certificate=self.certificate))
        self.assertEqual(self.sign_in().returncode, 0)
        services = json.loads(self.machine.run([TOOL, "--json", "account", "services", "anna"]).stdout)["services"]
        self.assertEqual([(each["identifier"], each["canBeEnabled"]) for each in services if each["present"]],
                         [("com.corvid.nimbus.service.mail", False)])

    def test_what_the_server_refuses_is_told(self):
        answers = {
            "the password is wrong": problem(401, "wrong-password"),
            "there is no such user": problem(401, "unknown-user"),
            "The user name or the password is wrong": problem(401, "wrong-credentials"),
            "There were too many tries; try again in 42 s":
                problem(429, "too-many-tries").replace(b"\r\n\r\n", b"\r\nRetry-After: 42\r\n\r\n"),
            "The directory is being moved.": problem(503, "unavailable", detail="The directory is being moved."),
        }
        for text, reply in answers.items():
            with self.subTest(text):
                self.settle(self.serve(lambda *_, reply=reply: reply, certificate=self.certificate))
                self.assertEqual(self.refused(), "cannot sign in anna: " + text)

    def test_a_program_that_is_ended_meanwhile_ends(self):
        asked = []
        server = self.serve(lambda *_: (asked.append(1), b"")[1], certificate=self.certificate)
        server._reply = lambda *_: (asked.append(1), self.machine.wait_for(lambda: len(asked) > 1, "the end"), b"")[2]
        self.settle(server)
        reading, writing = os.pipe()
        os.write(writing, PASSWORD.encode() + b"\n")
        os.close(writing)
        process = self.machine.start([TOOL, "account", "sign-in", "anna", "--password-fd", str(reading)],
                                     pass_fds=[reading])
        os.close(reading)
        self.machine.wait_for(lambda: asked, "the request")
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(timeout=20), -signal.SIGTERM)
        asked.append(2)


class WithoutTrust(AccountServerTest):
    def reason(self, server=None, **settings):
        self.settle(server, **settings)
        text = self.refused()
        self.assertTrue(text.startswith("cannot sign in anna: "), text)
        return text.removeprefix("cannot sign in anna: ")

    def refuses_certificate(self, certificate, text):
        server = self.serve(certificate=certificate)
        self.assertIn(f"the certificate of {HOST}:{server.port} {text}", self.reason(server))
        self.assertEqual(server.requests, [], "no password is sent")

    def test_an_authority_that_is_not_known(self):
        other = Authority(self.folder / "other")
        self.refuses_certificate(other.issue("right"), "is from an authority that is not known")

    def test_a_certificate_that_is_its_own_authority(self):
        self.refuses_certificate(self.authority.self_signed(), "is from an authority that is not known")

    def test_a_certificate_for_another_host(self):
        self.refuses_certificate(self.authority.issue("other", host="other.example"), "is for another host")

    def test_a_certificate_that_has_expired(self):
        self.refuses_certificate(self.authority.issue("old", end="20200201000000Z"), "has expired by this machine's clock")

    def test_a_certificate_of_the_future(self):
        self.refuses_certificate(self.authority.issue("new", start="20480101000000Z"),
                                 "is not valid yet by this machine's clock")

    def test_authorities_that_cannot_be_read(self):
        server = self.serve(certificate=self.certificate)
        self.assertEqual(self.reason(server, AccountServerAuthority="/etc/nothing.pem"),
                         "the authorities in /etc/nothing.pem cannot be read")

    def test_a_server_that_offers_old_tls_alone(self):
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
        context.set_ciphers("ALL:@SECLEVEL=0")
        context.minimum_version = ssl.TLSVersion.TLSv1
        context.maximum_version = ssl.TLSVersion.TLSv1_1
        server = self.serve(certificate=self.certificate, context=context)
        self.assertIn("does not offer TLS 1.2 or newer", self.reason(server))
        self.assertEqual(server.requests, [])

    def test_a_server_without_tls(self):
        server = self.serve()
        self.assertIn("does not speak TLS there", self.reason(server))
        self.assertEqual(server.requests, [])

    def test_a_redirect(self):
        other = self.serve()
        server = self.serve(lambda *_: answer(307, "", fields=f"Location: http://{HOST}:{other.port}/\r\n"),
                            certificate=self.certificate)
        self.assertIn(f"sends on to http://{HOST}:{other.port}/, where no password is sent",
                      self.reason(server))
        self.assertEqual(other.connections, 0)

    def test_a_login_page_of_the_network(self):
        server = self.serve(lambda *_: answer(200, "<html>", "text/html"), certificate=self.certificate)
        self.assertIn("a login page of this network may stand in between", self.reason(server))

    def test_a_server_that_is_not_there(self):
        server = Server(right)
        server.close()
        self.assertEqual(self.reason(server), f"no server can be reached at {HOST}:{server.port}: Connection refused")

    def test_a_name_that_is_not_found(self):
        self.assertIn("the name of nowhere.example is not found", self.reason(AccountServer="https://nowhere.example"))

    def test_a_machine_without_a_network(self):
        self.assertIn("there is no network connection to 192.0.2.1: Network is unreachable",
                      self.reason(AccountServer="https://192.0.2.1"))

    def test_a_server_that_is_silent(self):
        server = self.serve(is_silent=True)
        self.assertEqual(self.reason(server, AccountServerConnectSeconds="1", AccountServerSeconds="2"),
                         f"no connection to {HOST}:{server.port} within 1 s: look at the network")

    def test_a_missing_module_lets_nobody_in(self):
        modules = list(self.root.glob("usr/local/lib/**/accountserver.so"))
        self.assertEqual(len(modules), 1)
        hidden = modules[0].rename(modules[0].with_suffix(".away"))
        try:
            self.assertIn("the module accountserver.so cannot be used", self.reason(AccountServer="https://192.0.2.1"))
        finally:
            hidden.rename(modules[0])


class Doctor(AccountServerTest):
    def doctor(self):
        done = self.machine.run([TOOL, "--json", "doctor"])
        document = json.loads(done.stdout)
        return (document["backends"], [each for each in document["checks"] if each["subject"] == "account server"])

    def test_it_says_which_server_answers_and_until_when_its_certificate_holds(self):
        server = self.serve(lambda *_: answer(200, {"server": "a server", "version": "1.2"}), certificate=self.certificate)
        self.settle(server)
        backends, checks = self.doctor()
        found = [each for each in backends if each["interface"] == "SignInDirectory"]
        self.assertEqual([(each["backend"], each["reason"]) for each in found],
                         [(f"https://{HOST}:{server.port}",
                           "answers: a server 1.2, certificate until 2049-01-01, tells no time")])
        self.assertEqual(checks, [])
        self.assertEqual([(head.split("\r\n")[0], body) for head, body in server.requests], [("GET /v1/server HTTP/1.1", "")])

    def test_a_server_that_does_not_answer_is_wrong(self):
        server = Server(right)
        server.close()
        self.settle(server)
        self.assertEqual([(each["state"], each["text"]) for each in self.doctor()[1]],
                         [("wrong", f"no server can be reached at {HOST}:{server.port}: Connection refused")])

    def test_without_a_server_there_is_nothing_to_say(self):
        self.settle()
        backends, checks = self.doctor()
        self.assertNotIn("SignInDirectory", [each["interface"] for each in backends])
        self.assertEqual(checks, [])


if __name__ == "__main__":
    machine.enter_namespaces()
    subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
    AccountServerTest.build = Path(sys.argv.pop(1)).resolve()
    unittest.main(verbosity=2)
