#!/usr/bin/env python3
"""The installed account server answers as the protocol's document says, on each of its sockets.

usage: protocol_test.py BUILD_DIR
"""

import json
import plistlib
import re
import shutil
import socket
import ssl
import subprocess
import sys
import time
import unittest
import warnings
from pathlib import Path

TOP = Path(__file__).resolve().parents[3]
sys.path.insert(0, str(TOP / "tests/support"))
import account_server  # noqa: E402
import machine  # noqa: E402
from account_server import AccountServer, PASSWORD  # noqa: E402

TERMS = {"version": "2026-10", "url": "https://services.nimbus.example/terms"}
DELEGATES = {"com.corvid.chatter": {"status": 0, "aliases": ["anna@nimbus.example"]}}
USERS = {
    "anna": {"Response": {"status": 0, "delegates": DELEGATES}, "MailAddress": "anna@nimbus.example"},
    "binary": {"Response": {"status": 0, "delegates": {"com.corvid.chatter": {"picture": b"\0\1"}}}},
    "late": {"DelaySeconds": 1.5},
    "terms": {"AccountError": 3, "AccountErrorInfo": TERMS},
    "terms-of-others": {"AccountError": 3, "AccountErrorInfo": TERMS},
    "repair": {"AccountError": 5, "AccountErrorInfo": "Call us."},
    "broken": {"Fails": True},
    "tried": {}, "tried-in-secret": {}, "counted": {}, "claiming": {},
}
WAYS = ("account", "tls", "clear")


def rows_of_the_document():
    """Status and type of each failure in the table."""
    text = (TOP / "docs/account-server.md").read_text(encoding="utf-8")
    return {name: int(status) for status, name in
            re.findall(r"^\| (\d+) \| `urn:welcomer:problem:([a-z-]+)` \|", text, flags=re.M)}


class Protocol(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, cls.build, "account-server")
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        cls.machine.start_system_log()
        account_server.write_directory(cls.machine.root, USERS)
        account_server.make_certificate(cls.folder, "authority")
        for file in account_server.make_certificate(cls.folder, "server", "authority"):
            shutil.copy(file, cls.machine.root / "etc")
        tls = "Certificate=/etc/server.pem\nKey=/etc/server.key\n"
        cls.authority = cls.folder / "authority.pem"
        # One that tells unknown users and notes terms, one that does neither, and one behind fronts.
        cls.server = cls.start(f"{tls}UnknownUsers=told\nBodySeconds=2\n", "", certificate=cls.authority)
        cls.other = cls.start(tls, "2", state=False, certificate=cls.authority)
        cls.behind = cls.start("Fronts=root loopback\n", "3")

    @classmethod
    def start(cls, settings, name, **options):
        server = AccountServer(cls.machine, settings, name, **options)
        cls.addClassCleanup(server.close)
        server.start()
        return server

    def assert_answer(self, answer, status, problem=None):
        self.assertEqual(answer.status, status, answer)
        if problem:
            self.assertEqual((answer.problem, answer.content["status"]), (problem, status))

    def too_slow(self, use):
        with self.server.open(use) as bare:
            bare.sendall(b"POST /v1/authenticate HTTP/1.1\r\nHost: x\r\nContent-Type: application/json\r\n"
                         b"Content-Length: 100\r\n\r\n{")
            response = account_server.http.client.HTTPResponse(bare)
            response.begin()
            return account_server.Answer(response)

    def too_many(self, use):
        for _ in range(5):
            self.server.authenticate("tried", "wrong", use)
        return self.server.authenticate("tried", use=use)

    def with_a_damaged_directory(self, use):
        directory = self.machine.root / account_server.DIRECTORY
        whole = directory.read_bytes()
        directory.write_text("{", encoding="ascii")
        try:
            return self.server.authenticate(use=use)
        finally:
            directory.write_bytes(whole)

    # How each failure of the table comes about, on one of the sockets.
    FAILURES = {
        "invalid-request": lambda self, use: self.server.authenticate(use=use, machine=None),
        "wrong-password": lambda self, use: self.server.authenticate(password="wrong", use=use),
        "unknown-user": lambda self, use: self.server.authenticate("nobody", use=use),
        "wrong-credentials": lambda self, use: self.other.authenticate("nobody", use=use),
        "terms-of-service": lambda self, use: self.server.authenticate("terms", use=use),
        "repair": lambda self, use: self.server.authenticate("repair", use=use),
        "no-such-resource": lambda self, use: self.server.request("GET", "/v2/authenticate", use=use),
        "method-not-allowed": lambda self, use: self.server.request("PUT", "/v1/authenticate", "{}", use=use),
        "not-acceptable": lambda self, use: self.server.authenticate("binary", use=use,
                                                                     headers={"Accept": "application/json"}),
        "request-timeout": too_slow,
        "other-terms": lambda self, use: self.server.accept_terms("terms", {"version": "2026-09"}, use=use),
        "content-too-large": lambda self, use: self.server.request(
            "POST", "/v1/authenticate", None, {"Content-Type": "application/json", "Content-Length": str(2**24 + 1)}, use),
        "unsupported-media-type": lambda self, use: self.server.request("POST", "/v1/authenticate", "user=anna",
                                                                        {"Content-Type": "text/plain"}, use),
        "too-many-tries": too_many,
        "server-error": lambda self, use: self.server.authenticate("broken", use=use),
        "not-supported": lambda self, use: self.other.accept_terms("terms", TERMS, use=use),
        "unavailable": with_a_damaged_directory,
    }

    def test_every_failure_of_the_document_comes_on_every_socket(self):
        rows = rows_of_the_document()
        self.assertEqual(sorted(rows), sorted(self.FAILURES))
        for problem, fail in self.FAILURES.items():
            for use in WAYS:
                with self.subTest(problem=problem, use=use):
                    answer = fail(self, use)
                    self.assert_answer(answer, rows[problem], problem)
                    self.assertEqual(answer.kind, "application/problem+json")
                    self.assertIn("GMT", answer.headers["Date"])

    def test_fields_that_go_with_a_status(self):
        self.assertEqual(self.server.authenticate(password="wrong").headers["WWW-Authenticate"], "Welcomer")
        self.assertEqual(self.FAILURES["method-not-allowed"](self, "clear").headers["Allow"], "POST")
        self.assertEqual(self.server.request("POST", "/v1/server", "").headers["Allow"], "GET")
        self.assertIn(int(self.too_many("account").headers["Retry-After"]), range(1, 61))

    def test_a_right_password_is_answered_with_what_the_directory_has(self):
        for use in WAYS:
            answer = self.server.authenticate(use=use)
            self.assert_answer(answer, 200)
            content = answer.content
            self.assertEqual((content["status"], content["accountID"], content["delegates"]), (0, "anna", DELEGATES))
            mail = content["services"]["com.corvid.nimbus.service.mail"]
            self.assertEqual(mail["properties"], {"com.corvid.nimbus.property.mailEmailAddress": "anna@nimbus.example"})
            self.assertEqual(len(content["services"]), 10)

    def test_an_answer_comes_in_the_form_of_the_request_and_data_as_a_property_list(self):
        listed = self.server.authenticate(form="plist")
        self.assertEqual((listed.status, listed.kind, listed.content["accountID"]), (200, "application/x-plist", "anna"))
        data = self.server.authenticate("binary", headers={"Accept": "application/json, application/x-plist"})
        self.assertEqual(data.content["delegates"]["com.corvid.chatter"]["picture"], b"\0\1")
        refused = self.server.authenticate(headers={"Accept": "text/html"})
        self.assert_answer(refused, 406, "not-acceptable")

    def test_what_is_wrong_with_a_request_is_named(self):
        missing = self.server.authenticate(machine={"product": "", "locale": ""})
        self.assertIn("machine/version", missing.content["detail"])
        for body in (b"", b"{", b"[]", b'{"a":1,"a":2}', b"[" * 100_000, b"\xff\xfe", b"1e999", b"null"):
            with self.subTest(body[:20]):
                answer = self.server.request("POST", "/v1/authenticate", body, {"Content-Type": "application/json"})
                self.assert_answer(answer, 400, "invalid-request")

    def test_a_problem_names_its_request(self):
        answer = self.server.authenticate("repair", requestID="one-2-THREE")
        self.assertEqual(answer.content["instance"], "urn:welcomer:request:one-2-THREE")
        self.assertEqual(answer.content["errorInfo"], "Call us.")

    def test_an_empty_password_is_wrong_and_nobody_is_asked(self):
        questions = self.server.figures()["question_seconds_count"]
        self.assert_answer(self.server.authenticate("counted", ""), 401, "wrong-password")
        self.assertEqual(self.server.figures()["question_seconds_count"], questions)

    def test_terms_are_accepted_once_and_not_asked_for_again(self):
        asked = self.server.authenticate("terms-of-others")
        self.assert_answer(asked, 403, "terms-of-service")
        wrong = self.server.accept_terms("terms-of-others", asked.content["errorInfo"], "wrong")
        self.assert_answer(wrong, 401, "wrong-password")
        self.assert_answer(self.server.authenticate("terms-of-others"), 403, "terms-of-service")
        for _ in range(2):
            accepted = self.server.accept_terms("terms-of-others", asked.content["errorInfo"])
            self.assertEqual((accepted.status, accepted.bytes), (204, b""))
        self.assert_answer(self.server.authenticate("terms-of-others"), 200)

    def test_a_repetition_counts_once(self):
        before = self.server.figures()["sign_ins_total"]
        for _ in range(3):
            self.server.authenticate(requestID="the-same")
        self.server.authenticate(requestID="another")
        self.assertEqual(self.server.figures()["sign_ins_total"], before + 2)
        for _ in range(20):
            failed = self.server.authenticate("counted", "wrong", requestID="failed-once")
            self.assert_answer(failed, 401, "wrong-password")

    def test_too_many_tries_hold_back_the_right_password_too_and_nobody_else(self):
        for number in range(5):
            # However the name is written.
            name = ("Tried-In-Secret", " tried-in-secret ")[number % 2]
            self.assert_answer(self.other.authenticate(name, "wrong"), 401, "wrong-credentials")
        self.assert_answer(self.other.authenticate("tried-in-secret"), 429, "too-many-tries")
        self.assert_answer(self.other.authenticate("anna"), 200)
        # From another address the account has tries of its own.
        self.assert_answer(self.other.authenticate("tried-in-secret", use="tls"), 200)

    def test_tries_side_by_side_are_told_five_results_at_most(self):
        connections = [self.other.connect() for _ in range(20)]
        for number, connection in enumerate(connections):
            body = json.dumps(account_server.body_of("broken", f"wrong {number}"))
            connection.request("POST", "/v1/authenticate", body, {"Content-Type": "application/json"})
        answers = [account_server.Answer(connection.getresponse()) for connection in connections]
        for connection in connections:
            connection.close()
        self.assertEqual(sorted(answer.status for answer in answers), [401] * 5 + [429] * 15)

    def test_an_answer_that_takes_its_time_keeps_nobody_else_waiting(self):
        late = self.server.connect()
        body = json.dumps(account_server.body_of("late"))
        began = time.monotonic()
        late.request("POST", "/v1/authenticate", body, {"Content-Type": "application/json"})
        others = [self.server.authenticate().status for _ in range(10)]
        self.assertEqual(self.server.figures()["requests_under_way"], 1)
        self.assertEqual(late.getresponse().status, 200)
        self.assertGreaterEqual(time.monotonic() - began, 1.5)
        late.close()
        self.assertEqual(others, [200] * 10)

    def test_the_server_says_which_it_is(self):
        answer = self.server.request("GET", "/v1/server")
        self.assertEqual(answer.content["server"], "welcomer-account-server")
        self.assertRegex(answer.content["version"], r"^\d+\.\d+\.\d+$")
        listed = self.server.request("GET", "/v1/server", headers={"Accept": "application/x-plist"})
        self.assertEqual(plistlib.loads(listed.bytes), answer.content)

    def test_a_line_of_the_log_has_who_and_what_and_no_password(self):
        self.server.authenticate("anna", "not this one", requestID="to-be-found")
        self.server.authenticate("x\" status=\"200\n", PASSWORD, requestID="to-be-found-2")
        def lines():
            return [text for _, _, text in self.machine.log_records("welcomer-account-server")]
        self.machine.wait_for(lambda: any("to-be-found-2" in line for line in lines()), "the lines of the log")
        line, = (line for line in lines() if "request=to-be-found " in line)
        self.assertRegex(line, r'^authenticate status=401 from="uid 0" user=anna request=to-be-found '
                               r'product="Debian GNU/Linux" version=12 problem=wrong-password seconds=\d+\.\d{3}$')
        line, = (line for line in lines() if "request=to-be-found-2 " in line)
        self.assertIn('user="x\\" status=\\"200\\\\n"', line)
        everything = (self.machine.root / "run/records").read_text(encoding="utf-8")
        for password in ("not this one", PASSWORD, "wrong 1"):
            self.assertNotIn(password, everything)

    def test_a_front_says_who_asks_and_nobody_else_does(self):
        for use in ("account", "clear"):
            # What a client makes up stands before what the front has seen.
            for made_up in range(5):
                seen = {"X-Forwarded-For": f"203.0.113.{made_up}, 198.51.100.1"}
                self.assert_answer(self.behind.authenticate(f"tried-{use}", "wrong", use, seen), 401, "wrong-credentials")
            last = self.behind.authenticate(f"tried-{use}", "wrong", use, {"X-Forwarded-For": "198.51.100.1"})
            self.assert_answer(last, 429, "too-many-tries")
            other = self.behind.authenticate(f"tried-{use}", "wrong", use, {"X-Forwarded-For": "198.51.100.2"})
            self.assert_answer(other, 401, "wrong-credentials")
        for number in range(5):
            claimed = {"X-Forwarded-For": f"198.51.100.{number}"}
            self.assert_answer(self.other.authenticate("claiming", "wrong", "clear", claimed), 401, "wrong-credentials")
        self.assert_answer(self.other.authenticate("claiming", "wrong", "clear", {"X-Forwarded-For": "198.51.100.9"}), 429)

    def test_on_the_unix_socket_the_users_of_the_settings_alone_may_ask(self):
        server = self.start(f"Users={machine.USER}\n", "4")
        with self.assertRaises(ConnectionError):
            server.authenticate()
        asked = self.machine.run(
            ["/usr/bin/python3", "-c", "import socket; s = socket.socket(socket.AF_UNIX); s.settimeout(60); "
             f"s.connect('/{account_server.SOCKET}4'); s.sendall(b'GET /v1/server HTTP/1.1\\r\\nHost: x\\r\\n\\r\\n'); "
             "print(s.recv(100)[:12].decode())"], user=True)
        self.assertEqual(asked.stdout, "HTTP/1.1 200\n", asked)

    def test_tls_is_new_enough(self):
        for version, is_taken in (("TLSv1_1", False), ("TLSv1_2", True), ("TLSv1_3", True)):
            context = ssl.create_default_context(cafile=self.authority)
            context.set_ciphers("ALL:@SECLEVEL=0")
            with warnings.catch_warnings(action="ignore"):
                context.minimum_version = context.maximum_version = getattr(ssl.TLSVersion, version)
            with socket.create_connection(self.server.address("tls"), timeout=60) as bare:
                try:
                    context.wrap_socket(bare, server_hostname="127.0.0.1").close()
                    was_taken = True
                except (ssl.SSLError, ConnectionError):
                    was_taken = False
            self.assertEqual(was_taken, is_taken, version)

    def test_a_new_certificate_is_shown_after_a_reload(self):
        def shown():
            with self.server.open("tls") as connection:
                return connection.getpeercert(binary_form=True)
        before = shown()
        self.server.write_settings(self.server.settings)  # the others have the same file
        self.server.reload()
        self.assertEqual(shown(), before)
        account_server.make_certificate(self.folder, "server", "authority")
        for name in ("server.pem", "server.key"):
            shutil.copy(self.folder / name, self.machine.root / "etc")
        self.server.reload()
        self.assertNotEqual(shown(), before)
        self.assert_answer(self.server.authenticate(use="tls"), 200)

    def test_no_password_stays_in_the_memory(self):
        self.assertTrue(self.server.memory_holds("/etc/welcomer/account-server.conf"))
        for use in WAYS:
            for form in ("json", "plist"):
                for name in ("anna", "nobody"):
                    password = f"remember {use} {form} {name}" if name == "nobody" else PASSWORD
                    self.server.authenticate(name, password, use, form=form)
                    self.assertFalse(self.server.memory_holds(password), password)

    def run_it(self, *arguments, **options):
        return self.machine.run([account_server.PROGRAM, *arguments], **options)

    def test_what_keeps_it_from_serving_is_said_in_one_line(self):
        self.assertEqual(self.run_it("--version").stdout, f"welcomer-account-server {self.version()}\n")
        self.assertEqual((self.run_it("--help").returncode, self.run_it("--sideways").returncode), (0, 2))
        none = self.run_it()
        self.assertEqual((none.returncode, none.stdout, none.stderr.count("\n")), (1, "", 1))
        self.assertIn("welcomer-account-server.socket", none.stderr)
        for settings, why in (("Sauce=x\n", "line 1: there is no such setting"), ("Users=nobody-at-all\n", "nobody-at-all"),
                              ("Certificate=/etc/server.pem\nKey=/etc/missing\n", "/etc/missing: No such file"),
                              ("Certificate=/etc/server.pem\nKey=/etc/passwd\n", "")):
            server = AccountServer(self.machine, settings, f"-{abs(hash(settings))}", certificate=self.authority)
            with self.subTest(settings):
                said = server.fail_to_start()
                self.assertEqual(said.count("\n"), 1, said)
                self.assertTrue(said.startswith("welcomer-account-server: "), said)
                self.assertIn(why, said)
            server.close()

    def version(self):
        return self.server.request("GET", "/v1/server").content["version"]


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    Protocol.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
