#!/usr/bin/env python3
"""The installed tool and account servers that mean harm, or nothing that makes sense.

usage: hostile_test.py BUILD_DIR SUITE
"""

import itertools
import json
import re
import time
from pathlib import Path

from account_server_case import RIGHT, AccountServerTest, main
from tls_server import HOST, answer, problem

DOCUMENT = Path(__file__).resolve().parents[3] / "docs/account-server.md"


class Hostile(AccountServerTest):
    """Servers that have the right certificate, and nothing else that is right."""

    WHOLE = answer(200, RIGHT)

    def told(self, reply, **settings):
        """What is said to a server's reply; it has been asked once."""
        server = self.serve(reply if callable(reply) else lambda *_: reply, certificate=self.certificate)
        text = self.reason(server, **settings)
        self.assertEqual((len(server.requests), server.connections), (1, 1), "what was carried is not sent again")
        return text.replace(f"{HOST}:{server.port}", "SERVER")

    def test_an_answer_that_breaks_off(self):
        head = self.WHOLE.index(b"\r\n\r\n") + 4
        for size in (0, 1, 12, 30, head - 2, head, head + 1, len(self.WHOLE) - 1):
            with self.subTest(size):
                self.assertIn("the connection to SERVER broke off", self.told(self.WHOLE[:size]))

    def test_an_answer_that_does_not_say_how_long_it_is(self):
        # Somebody between may have cut it off.
        self.assertEqual(self.told(b"HTTP/1.1 200 OK\r\nContent-Type: application/json\r\n\r\n" + json.dumps(RIGHT).encode()),
                         "the connection to SERVER broke off (the answer does not say how long it is)")

    def test_an_answer_that_drips_is_given_up_in_time(self):
        def dripping(content):
            def reply(*_):
                for byte in content:
                    yield bytes([byte])
                    time.sleep(0.2)
            return reply
        head = self.WHOLE.index(b"\r\n\r\n") + 4
        for what, reply in (("header", dripping(self.WHOLE)),
                            ("body", lambda *_: itertools.chain([self.WHOLE[:head]], dripping(self.WHOLE[head:])()))):
            with self.subTest(what):
                self.assertEqual(self.told(reply, AccountServerSeconds="6"), "SERVER has not answered within 6 s")

    def test_an_answer_without_an_end_is_broken_off(self):
        chunk = b"10000\r\n" + b" " * 0x10000 + b"\r\n"
        head = b"HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n"
        sent = []
        self.assertEqual(self.told(lambda *_: itertools.chain([head], (sent.append(1) or chunk for _ in itertools.count()))),
                         "the answer of SERVER is too long")
        self.assertLess(len(sent), 2 * 256, "it was read no further")

    def test_an_answer_that_says_that_it_is_too_long(self):
        self.assertEqual(self.told(b"HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nContent-Length: 16777217\r\n\r\n"),
                         "the answer of SERVER is too long")

    def test_what_is_no_answer_of_the_protocol_is_told_with_what_is_wrong(self):
        for body, why in (("nonsense", "line 1, column 2: this is not JSON"),
                          (json.dumps(RIGHT)[:-1], "the text ends too early"),
                          ("[" * 100_000, "is nested more than 64 deep"),
                          ('{"status": 1e999, "accountID": "anna"}', "a number is out of range"),
                          ('{"status": 18446744073709551616, "accountID": "anna"}', "does not fit 64 bits"),
                          ('{"status": 0, "accountID": "anna", "accountID": "bert"}', "accountID appears twice"),
                          ('{"status": 0}', "the member accountID is missing")):
            with self.subTest(why):
                text = self.told(answer(200, body))
                self.assertTrue(text.startswith("SERVER does not speak the account server's protocol: "), text)
                self.assertIn(why, text)

    def test_an_answer_about_somebody_else(self):
        self.assertEqual(self.told(answer(200, {**RIGHT, "accountID": "bert"})), "SERVER has answered for another user")

    def test_a_server_that_speaks_something_else(self):
        for greeting in (b"SSH-2.0-OpenSSH_9.2\r\n", b"220 mail.example ESMTP\r\n", b"\x00\x01\x02"):
            with self.subTest(greeting):
                self.assertIn("SERVER speaks something else than HTTP", self.told(greeting))

    def test_every_status_of_the_document_is_told_and_nothing_is_sent_again(self):
        rows = re.findall(r"^\| (\d+) \| `urn:welcomer:problem:([a-z-]+)` \| (\d) \|", DOCUMENT.read_text(encoding="utf-8"),
                          re.MULTILINE)
        self.assertEqual(len(rows), 17)
        for status, name, error in rows:
            with self.subTest(name):
                text = self.told(problem(int(status), name, title="A title", detail="What to do."))
                self.assertIn(text, {"1": ["the password is wrong", "What to do."], "2": ["there is no such user"],
                                     "4": ["What to do."]}.get(error, [text]))
                self.assertNotIn("HTTP", text, "it is the server's own word")

    def test_a_connection_that_carries_nothing_is_tried_twice_more(self):
        server = self.serve(certificate=self.certificate, hangs_up=True)
        self.assertIn(f"the connection to {HOST}:{server.port} broke off before it was secured: a firewall of this network may "
                      "stand in between", self.reason(server))
        self.assertEqual((server.requests, server.connections), ([], 3))


if __name__ == "__main__":
    main()
