#!/usr/bin/env python3
"""The installed account server in front of real LDAP directories.

usage: ldap_test.py BUILD_DIR SLAPD
    SLAPD   the folder that the package slapd is unpacked in
"""

import shutil
import socket
import subprocess
import sys
import threading
import time
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import account_server  # noqa: E402
import machine  # noqa: E402
import slapd  # noqa: E402
from account_server import PASSWORD  # noqa: E402

USERS = {
    "anna": {"mail": ["anna@nimbus.example", "a@nimbus.example"], "displayName": "Anna A.", "employeeNumber": "7"},
    "bert": {}, "counted": {}, "änna": {},
    "brackets(*)\\": {},
    "terms": {"employeeType": "3"}, "accepting": {"employeeType": "3"}, "repair": {"employeeType": "5"}, "misled": {"employeeType": "many"},
}
SETTINGS = f"""
Source=ldap
LdapBase={slapd.BASE}
LdapFilter=(&(objectClass=inetOrgPerson)(|(uid=%u)(cn=%u)))
LdapSearchName=cn=searcher,{slapd.BASE}
LdapSearchPasswordFile=/etc/searcher
LdapAuthority=/etc/authority.pem
LdapSeconds=1
LdapAttribute=mail mailAddress
LdapAttribute=mail delegates/com.corvid.chatter/aliases[]
LdapValue=delegates/com.corvid.chatter/status:integer 0
LdapAttribute=displayName delegates/com.corvid.vidlink/name
LdapAttribute=employeeNumber delegates/com.corvid.vidlink/level:integer
LdapAttribute=employeeType accountError:integer
LdapValue=errorInfo/version 2026-10
"""


class Cable:
    """Carries connections to a port of this host, until it is pulled: then they stay, and so do new ones, in silence."""

    def __init__(self, port):
        self._port, self._silent, self.count = port, threading.Event(), 0
        self._listening = socket.create_server(("127.0.0.1", 0), backlog=64)
        self.address = f"ldap://127.0.0.1:{self._listening.getsockname()[1]}"
        self._ends = []
        threading.Thread(target=self._accept, daemon=True).start()

    def _accept(self):
        while True:
            try:
                near = self._listening.accept()[0]
            except OSError:
                return
            self.count += 1
            self._ends.append(near)
            if not self._silent.is_set():
                far = socket.create_connection(("127.0.0.1", self._port))
                self._ends.append(far)
                for one, other in ((near, far), (far, near)):
                    threading.Thread(target=self._carry, args=(one, other), daemon=True).start()

    def _carry(self, one, other):
        try:
            while (piece := one.recv(65536)) and not self._silent.is_set():
                other.sendall(piece)
        except OSError:
            pass
        if not self._silent.is_set():
            other.close()

    def pull(self):
        self._silent.set()

    def close(self):
        for end in (self._listening, *self._ends):
            end.close()


def entries():
    yield slapd.entry(slapd.BASE, {"objectClass": ["dcObject", "organization"], "o": "Nimbus", "dc": "nimbus"})
    yield slapd.entry(f"cn=searcher,{slapd.BASE}", {"objectClass": ["organizationalRole", "simpleSecurityObject"],
                                                    "cn": "searcher", "userPassword": "searching"})
    users = [*USERS.items(), ("twice", {}), ("twice", {"description": "again"})]
    for number, (name, attributes) in enumerate(users):
        yield slapd.entry(f"ou=user-{number},{slapd.BASE}",
                          {"objectClass": "inetOrgPerson", "uid": name, "cn": f"{name}-common", "sn": "S",
                           "ou": f"user-{number}", "userPassword": PASSWORD, **attributes})


class Ldap(unittest.TestCase):
    build, tree = None, None

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, cls.build, "account-ldap")
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        cls.machine.start_system_log()
        (cls.machine.root / "etc/searcher").write_text("searching\n", encoding="ascii")
        for authority in ("authority", "other"):
            account_server.make_certificate(cls.folder, authority)
            shutil.copy(cls.folder / f"{authority}.pem", cls.machine.root / "etc")
        account_server.make_certificate(cls.folder, "server", "authority")
        cls.silent = socket.create_server(("127.0.0.1", 3890), backlog=64)
        cls.addClassCleanup(cls.silent.close)
        cls.directories = [slapd.Slapd(cls.tree, cls.folder, cls.folder / f"data{number}", list(entries()),
                                       (3890 + number, 6360 + number)) for number in (1, 2)]
        for directory in cls.directories:
            cls.addClassCleanup(directory.stop)
        first, second = cls.directories
        cls.server = account_server.AccountServer(
            cls.machine, f"{SETTINGS}UnknownUsers=told\nLdapServers={first.address} {second.secure_address}\n")
        cls.addClassCleanup(cls.server.close)

    def setUp(self):
        for directory in self.directories:
            directory.stop()
            directory.start()
        if not self.server.process:
            self.server.start()

    def serve(self, settings):
        """Has the server take other settings over for the rest of the test."""
        self.addCleanup(self.server.reload)
        self.addCleanup(self.server.write_settings, self.server.settings)
        self.server.write_settings(settings)
        self.server.reload()

    def assert_answer(self, answer, status, problem=None):
        self.assertEqual(answer.status, status, (answer, self.machine.log_records("welcomer-account-server")[-4:]))
        if problem:
            self.assertEqual(answer.problem, problem)

    def test_a_right_password_is_answered_with_what_the_table_makes_of_the_entry(self):
        for name in ("anna", "anna-common"):
            answer = self.server.authenticate(name)
            self.assert_answer(answer, 200)
            self.assertEqual(answer.content["accountID"], name)
            self.assertEqual(answer.content["mailAddress"], "anna@nimbus.example")
            self.assertEqual(answer.content["delegates"], {
                "com.corvid.chatter": {"aliases": ["anna@nimbus.example", "a@nimbus.example"], "status": 0},
                "com.corvid.vidlink": {"name": "Anna A.", "level": 7}})
        self.assertEqual(self.server.authenticate("bert").content["delegates"]["com.corvid.chatter"], {"status": 0})

    def test_wrong_passwords_and_unknown_users_fail(self):
        self.assert_answer(self.server.authenticate("bert", "wrong"), 401, "wrong-password")
        self.assert_answer(self.server.authenticate("nobody"), 401, "unknown-user")
        self.assert_answer(self.server.authenticate("searcher", "searching"), 401, "unknown-user")

    def test_an_empty_password_lets_nobody_in(self):
        self.assert_answer(self.server.authenticate("bert", ""), 401, "wrong-password")

    def test_a_name_is_nothing_but_text_in_the_filter(self):
        for name in ("*", "an*", "x)(uid=anna", "anna)(objectClass=*", "\\61nna", "a\0"):
            with self.subTest(name):
                self.assert_answer(self.server.authenticate(name), 401, "unknown-user")
        self.assert_answer(self.server.authenticate("brackets(*)\\"), 200)

    def test_a_name_with_several_entries_is_nobodys(self):
        self.assert_answer(self.server.authenticate("twice"), 500, "server-error")

    def test_tries_are_counted_for_the_entry_however_its_name_is_written(self):
        for name in ("änna", "Änna", "ÄNNA", "  änna", "änna-common"):
            self.assert_answer(self.server.authenticate(name, "wrong"), 401, "wrong-password")
        self.assert_answer(self.server.authenticate("äNNA-common"), 429, "too-many-tries")

    def test_the_table_can_ask_for_terms_and_tell_of_a_repair(self):
        asked = self.server.authenticate("terms")
        self.assert_answer(asked, 403, "terms-of-service")
        self.assertEqual(asked.content["errorInfo"], {"version": "2026-10"})
        self.assert_answer(self.server.accept_terms("terms", asked.content["errorInfo"]), 501, "not-supported")
        self.assert_answer(self.server.authenticate("repair"), 403, "repair")
        self.assert_answer(self.server.authenticate("misled"), 500, "server-error")

    def test_the_users_own_entry_has_the_note_of_accepted_terms(self):
        settings = f"{SETTINGS}LdapServers={self.directories[0].address}\n"
        self.serve(settings + "LdapTermsAttribute=description\n")
        asked = self.server.authenticate("accepting")
        self.assert_answer(asked, 403, "terms-of-service")
        terms = asked.content["errorInfo"]
        self.assert_answer(self.server.accept_terms("accepting", terms, "wrong"), 401, "wrong-credentials")
        others = self.server.accept_terms("accepting", {"version": "2025-01"})
        self.assert_answer(others, 409, "other-terms")
        self.assertEqual(others.content["errorInfo"], terms)
        self.assert_answer(self.server.authenticate("accepting"), 403, "terms-of-service")
        for _ in range(2):
            self.assert_answer(self.server.accept_terms("accepting", terms), 204)
        answer = self.server.authenticate("accepting")
        self.assert_answer(answer, 200)
        self.assertEqual(answer.content["delegates"], {"com.corvid.chatter": {"status": 0}})
        self.assert_answer(self.server.accept_terms("bert", terms), 204)
        self.assert_answer(self.server.authenticate("terms"), 403, "terms-of-service")
        self.serve(f"{settings}LdapTermsAttribute=description\nLdapValue=errorInfo/version 2026-11\n")
        self.assertEqual(self.server.authenticate("accepting").content["errorInfo"], {"version": "2026-11"})
        # An attribute that users may not write.
        self.serve(settings + "LdapTermsAttribute=title\n")
        refused = self.server.accept_terms("accepting", terms)
        self.assert_answer(refused, 500, "server-error")
        self.assertEqual(refused.content["detail"], "the directory refuses: Insufficient access")

    def test_another_server_answers_when_one_has_gone_and_a_new_connection_when_one_was_lost(self):
        first, second = self.directories
        self.assert_answer(self.server.authenticate("bert"), 200)
        first.stop()
        self.assert_answer(self.server.authenticate("bert"), 200)
        second.stop()
        second.start()
        self.assert_answer(self.server.authenticate("bert"), 200)
        second.stop()
        self.assert_answer(self.server.authenticate("bert"), 503, "unavailable")
        first.start()
        self.assert_answer(self.server.authenticate("bert"), 200)

    def test_a_server_that_is_silent_is_passed_over(self):
        for silent in ("ldap://127.0.0.1:3890", "ldaps://127.0.0.1:3890"):
            self.serve(f"{SETTINGS}LdapServers={silent} {self.directories[1].secure_address}\n")
            self.assert_answer(self.server.authenticate("bert"), 200)
        self.serve(f"{SETTINGS}LdapServers=ldap://127.0.0.1:3890\n")
        self.assert_answer(self.server.authenticate("bert"), 503, "unavailable")

    def test_a_server_that_falls_silent_is_passed_over(self):
        self.assert_answer(self.server.authenticate("bert"), 200)
        self.directories[0].fall_silent()
        self.assert_answer(self.server.authenticate("bert"), 200)

    def test_a_server_that_falls_silent_is_waited_for_once_and_then_tried_by_one_alone(self):
        cable = Cable(3891)
        self.addCleanup(cable.close)
        self.serve(f"{SETTINGS}LdapSeconds=5\nLdapServers={cable.address} {self.directories[1].secure_address}\n")
        self.assert_answer(self.server.authenticate("bert"), 200)
        kept = cable.count
        cable.pull()
        self.assert_answer(self.server.authenticate("bert"), 200)
        self.assertEqual(cable.count, kept)  # no new connection to who says nothing
        end = time.monotonic() + 120

        def ask_until_it_is_tried():
            while cable.count == kept and time.monotonic() < end:
                self.server.authenticate("bert")
                time.sleep(0.1)

        threads = [threading.Thread(target=ask_until_it_is_tried) for _ in range(8)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join(180)
        self.assertEqual(cable.count, kept + 1)

    def test_a_server_that_agrees_to_tls_and_is_silent_then_is_passed_over(self):
        agreeing = socket.create_server(("127.0.0.1", 0), backlog=64)
        self.addCleanup(agreeing.close)

        def agree():
            connection, _ = agreeing.accept()
            with connection:
                number = connection.recv(4096)[2:5]  # the message's
                connection.sendall(b"\x30\x0c" + number + b"\x78\x07\x0a\x01\x00\x04\x00\x04\x00")
                while connection.recv(4096):
                    pass

        thread = threading.Thread(target=agree)
        thread.start()
        self.serve(f"{SETTINGS}LdapServers=ldap://127.0.0.1:{agreeing.getsockname()[1]} {self.directories[1].address}\n")
        self.assert_answer(self.server.authenticate("bert"), 200)
        thread.join(60)
        self.assertFalse(thread.is_alive())

    def test_a_server_with_the_certificate_of_another_host_is_told_no_password(self):
        self.serve(f"{SETTINGS}LdapServers={self.directories[0].other_address}\n")
        self.assert_answer(self.server.authenticate("bert"), 503, "unavailable")

    def test_a_server_of_another_authority_is_told_no_password(self):
        first, second = self.directories
        for address in (first.address, second.secure_address):
            self.serve(f"{SETTINGS}LdapServers={address}\nLdapAuthority=/etc/other.pem\n")
            self.assert_answer(self.server.authenticate("bert"), 503, "unavailable")
        begin = f"directory-unavailable server={first.address} "
        self.machine.wait_for(lambda: any(text.startswith(begin) for _, _, text in
                                          self.machine.log_records("welcomer-account-server")), "the line that says so")

    def test_no_password_is_in_the_log(self):
        self.server.authenticate("bert", "a wrong password")
        self.machine.wait_for(lambda: self.machine.log_records("welcomer-account-server"), "a line of the log")
        records = (self.machine.root / "run/records").read_text(encoding="utf-8")
        for password in (PASSWORD, "a wrong password", "searching"):
            self.assertNotIn(password, records)

    def test_no_password_stays_in_the_memory(self):
        for name, password in (("bert", PASSWORD), ("bert", "remember this"), ("nobody", "remember that")):
            self.server.authenticate(name, password)
            self.assertFalse(self.server.memory_holds(password), password)


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    Ldap.build, Ldap.tree = sys.argv[1], slapd.tree_of(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
