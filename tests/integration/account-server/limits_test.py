#!/usr/bin/env python3
"""The installed account server and clients that are slow, go away, send too much, or come in great numbers.

usage: limits_test.py BUILD_DIR
"""

import itertools
import json
import resource
import select
import shutil
import socket
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import account_server  # noqa: E402
import machine  # noqa: E402
from account_server import PASSWORD  # noqa: E402

HEAD = b"POST /v1/authenticate HTTP/1.1\r\nHost: localhost\r\nContent-Type: application/json\r\n"
LONGEST = 16 * 1024 * 1024
WAYS = ("account", "clear", "tls")
# A hash that takes a second or two on purpose, so that the checking of a password is still going on when something is looked at.
SLOW_HASH = "$6$rounds=3000000$"
# What one connection that waits for its next request may cost; libmicrohttpd's own memory for it is 16 kB.
BYTES_PER_CONNECTION = {"clear": 40_000, "tls": 120_000}
CONNECTIONS = 500


def slow_hash(salt):
    return subprocess.run(["/usr/bin/perl", "-e", "print crypt($ARGV[0], $ARGV[1])", PASSWORD, SLOW_HASH + salt], check=True,
                          capture_output=True, text=True).stdout


class Limits(unittest.TestCase):
    build = None
    names = itertools.count(1)

    @classmethod
    def setUpClass(cls):
        hard = resource.getrlimit(resource.RLIMIT_NOFILE)[1]
        resource.setrlimit(resource.RLIMIT_NOFILE, (min(hard, 16384), hard))
        machine.for_class(cls, cls.build, "account-limits")
        subprocess.run(["ip", "link", "set", "lo", "up"], check=True)
        long_text = "long " * 400_000
        account_server.write_directory(cls.machine.root, {
            "anna": {}, "slow": {"Password": slow_hash("salt")},
            "wordy": {"Response": {"status": 0, "delegates": {"com.corvid.chatter": {"text": long_text}}}}})
        account_server.make_certificate(cls.folder, "authority")
        for file in account_server.make_certificate(cls.folder, "server", "authority"):
            shutil.copy(file, cls.machine.root / "etc")

    def serve(self, settings):
        name = f"-{next(self.names)}"
        server = account_server.AccountServer(self.machine, f"Certificate=/etc/server.pem\nKey=/etc/server.key\n{settings}",
                                              name, certificate=self.folder / "authority.pem")
        self.addCleanup(server.close)
        server.start()
        return server

    def wait_for_connections(self, server, count):
        # That of the question itself is one of them.
        self.machine.wait_for(lambda: server.figures()["connections"] == count + 1, f"{count} connections")

    def drip(self, bare, text):
        """Sends byte after byte until the server has had enough, and gives what it says."""
        for byte in text:
            try:
                bare.sendall(bytes([byte]))
            except OSError:
                break
            if select.select([bare], [], [], 0.1)[0]:
                break
        else:
            self.fail("the whole text was taken")
        answer = b""
        try:
            while more := bare.recv(65536):
                answer += more
        except ConnectionError:
            pass
        return answer

    def test_a_head_that_drips_is_broken_off_and_nobody_waits_for_it(self):
        server = self.serve("HeadSeconds=1\n")
        for use in WAYS:
            with self.subTest(use), server.open(use) as bare:
                said = self.drip(bare, HEAD + b"X: " + b"x" * 600)
                self.assertTrue(said.startswith(b"HTTP/1.1 408 "), said)
                self.assertEqual(server.authenticate(use=use).status, 200)
        self.assertEqual(server.figures()["connections_broken_off_total"], 3)

    def test_a_client_that_begins_no_tls_is_broken_off(self):
        server = self.serve("HeadSeconds=1\n")
        with socket.create_connection(server.address("tls"), timeout=60) as bare:
            bare.sendall(b"\x16")
            self.assertEqual(bare.recv(100), b"")

    def test_one_user_cannot_hold_all_the_connections(self):
        server = self.serve("Connections=32\nHeadSeconds=600\nIdleSeconds=600\n")
        # Every connection has had an answer, and so is the server's.
        holding = """
import signal, socket, sys
held = []
for number in range(64):
    connection = socket.socket(socket.AF_UNIX)
    held.append(connection)
    try:
        connection.connect(sys.argv[1])
        connection.sendall(b"GET /v1/server HTTP/1.1\\r\\nHost: localhost\\r\\n\\r\\n")
        connection.settimeout(5)
        connection.recv(65536)
    except OSError:
        pass
print("holds", flush=True)
signal.pause()
"""
        path = "/" + str(server.path.relative_to(self.machine.root))
        other = self.machine.start(["/usr/bin/python3", "-c", holding, path], user=31998, stdout=subprocess.PIPE, text=True)
        try:
            self.assertEqual(other.stdout.readline(), "holds\n")
            for _ in range(3):
                self.assertEqual(server.authenticate().status, 200)
            self.assertEqual(server.figures()["connections"], 8 + 1)
        finally:
            other.kill()
            other.wait()
            other.stdout.close()

    def test_a_body_that_drips_is_broken_off(self):
        server = self.serve("BodySeconds=1\n")
        for use in WAYS:
            for head in (b"Content-Length: 600\r\n\r\n", b"Transfer-Encoding: chunked\r\n\r\n258\r\n"):
                with self.subTest(use, head=head), server.open(use) as bare:
                    bare.sendall(HEAD + head)
                    said = self.drip(bare, b"x" * 599)
                    self.assertTrue(said.startswith(b"HTTP/1.1 408 "), said)

    def test_the_head_of_a_second_request_may_not_drip_either(self):
        server = self.serve("IdleSeconds=1\n")
        connection = server.connect()
        connection.request("GET", "/v1/server")
        connection.getresponse().read()
        self.assertEqual(self.drip(connection.sock, b"G" * 600), b"")
        connection.close()

    def test_a_connection_without_a_request_is_closed(self):
        server = self.serve("IdleSeconds=1\nHeadSeconds=1\n")
        connection = server.connect("tls")
        connection.request("GET", "/v1/server")
        connection.getresponse().read()
        self.assertEqual(connection.sock.recv(1), b"")
        connection.close()

    def test_an_answer_that_is_not_taken_is_broken_off(self):
        server = self.serve("AnswerSeconds=1\n")
        body = json.dumps(account_server.body_of("wordy")).encode()
        with server.open() as bare:
            bare.sendall(HEAD + b"Content-Length: %d\r\n\r\n" % len(body) + body)
            self.machine.wait_for(lambda: server.figures()["connections_broken_off_total"] == 1, "the end of the connection")
            self.wait_for_connections(server, 0)
        self.assertEqual(len(server.authenticate("wordy").content["delegates"]["com.corvid.chatter"]["text"]), 2_000_000)

    def test_the_longest_body_is_taken_and_a_longer_one_in_chunks_broken_off(self):
        server = self.serve("")
        body = account_server.body_of("anna", padding="")
        body["padding"] = "x" * (LONGEST - len(json.dumps(body)))
        self.assertEqual(server.authenticate(**body).status, 200)
        before = self.memory(server)
        for use in WAYS:
            with self.subTest(use), server.open(use) as bare:
                bare.sendall(HEAD + b"Transfer-Encoding: chunked\r\n\r\n")
                chunk = b"10000\r\n" + b"x" * 0x10000 + b"\r\n"
                sent = 0
                with self.assertRaises(OSError):
                    while sent < 4 * LONGEST:
                        bare.sendall(chunk)
                        sent += 0x10000
        self.wait_for_connections(server, 0)
        self.assertLess(self.memory(server) - before, 2 * LONGEST)

    def test_a_connection_may_be_cut_anywhere(self):
        server = self.serve("")
        body = json.dumps(account_server.body_of("anna")).encode()
        request = HEAD + b"Content-Length: %d\r\n\r\n" % len(body) + body
        for use in WAYS:
            for length in [*range(1, len(request), 17), len(request)]:
                with server.open(use) as bare:
                    bare.sendall(request[:length])
        self.wait_for_connections(server, 0)
        self.assertEqual(server.authenticate().status, 200)
        self.assertEqual(server.figures()["requests_under_way"], 0)

    def ask_slowly(self, server, count=1):
        """Begins requests whose password takes its time to be checked; back when that has begun for one and the others wait."""
        connections = [server.connect() for _ in range(count)]
        for connection in connections:
            self.addCleanup(connection.close)
            connection.request("POST", "/v1/authenticate", json.dumps(account_server.body_of("slow")),
                               {"Content-Type": "application/json"})
        self.machine.wait_for(lambda: server.figures()["requests_under_way"] == count, "the requests")
        return connections

    def assert_unanswered(self, connection):
        self.assertEqual(select.select([connection.sock], [], [], 0)[0], [])

    def test_what_does_not_fit_the_queue_is_refused_and_everything_else_goes_on(self):
        server = self.serve("Workers=1\nQueue=1\n")
        slow, waiting = self.ask_slowly(server, 2)
        refused = server.authenticate()
        self.assertEqual((refused.status, refused.problem), (503, "unavailable"))
        self.assertGreater(int(refused.headers["Retry-After"]), 0)
        self.assertEqual(server.request("GET", "/v1/server").status, 200)
        self.assert_unanswered(slow)
        self.assertEqual([connection.getresponse().status for connection in (slow, waiting)], [200, 200])
        self.assertEqual(server.authenticate().status, 200)

    def test_what_is_under_way_has_its_answer_before_the_end(self):
        server = self.serve("Workers=1\n")
        idle = server.connect()
        idle.request("GET", "/v1/server")
        idle.getresponse().read()
        slow, waiting = self.ask_slowly(server, 2)
        server.process.terminate()
        self.assertEqual(idle.sock.recv(1), b"")
        answers = [connection.getresponse() for connection in (slow, waiting)]
        self.assertEqual([answer.status for answer in answers], [200, 200])
        self.assertEqual([answer.headers["Connection"] for answer in answers], ["close", "close"])
        self.assertEqual(server.stop(), 0)
        idle.close()

    def test_what_is_under_way_has_its_answer_over_a_reload(self):
        server = self.serve("Workers=1\n")
        slow, = self.ask_slowly(server)
        server.write_settings(server.settings + "UnknownUsers=told\n")
        server.reload()
        self.assert_unanswered(slow)
        self.assertEqual(server.authenticate("nobody").problem, "unknown-user")
        self.assertEqual(slow.getresponse().status, 200)
        self.wait_for_connections(server, 0)

    def test_a_client_that_never_sends_the_rest_does_not_keep_the_end_waiting(self):
        server = self.serve("StopSeconds=1\nBodySeconds=600\n")
        with server.open() as bare:
            bare.sendall(HEAD + b"Content-Length: 600\r\n\r\n{")
            self.wait_for_connections(server, 1)
            self.assertEqual(server.stop(), 0)

    def memory(self, server):
        """Bytes of its own."""
        text = Path(f"/proc/{server.process.pid}/smaps_rollup").read_text(encoding="ascii")
        return sum(int(line.split()[1]) for line in text.splitlines() if line.startswith("Private_")) * 1024

    def test_idle_connections_cost_little(self):
        for use, limit in BYTES_PER_CONNECTION.items():
            server = self.serve("IdleSeconds=600\n")
            server.authenticate(use=use)
            before = self.memory(server)
            connections = [server.connect(use) for _ in range(CONNECTIONS)]
            for connection in connections:
                connection.request("GET", "/v1/server")
                self.assertEqual(connection.getresponse().read()[:1], b"{")
            each = (self.memory(server) - before) / CONNECTIONS
            print(f"{use}: {each / 1000:.1f} kB an idle connection")
            self.assertLess(each, limit)
            for connection in connections:
                connection.close()
            server.close()

    def test_a_flood_of_failed_tries_does_not_fill_the_memory(self):
        server = self.serve("")
        connection = server.connect()
        def fail(count, prefix):
            for number in range(count):
                body = json.dumps(account_server.body_of(f"{prefix}-{number}" * 20, "wrong"))
                connection.request("POST", "/v1/authenticate", body, {"Content-Type": "application/json"})
                self.assertEqual(connection.getresponse().read()[:1], b"{")
        fail(200, "first")
        before = self.memory(server)
        fail(2000, "second")
        # A pair of account and address and a request are remembered by numbers, however long the names are.
        self.assertLess(self.memory(server) - before, 2000 * 1000)
        connection.close()


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    Limits.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
