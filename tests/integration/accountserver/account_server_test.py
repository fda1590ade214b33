#!/usr/bin/env python3
"""The installed tool signs in with an account server: over TLS and a Unix socket. What the doctor says of it, and where the
password is meanwhile.

usage: account_server_test.py BUILD_DIR SUITE
"""

import json
import signal
import subprocess

from account_server_case import PASSWORD, RIGHT, TOOL, AccountServerTest, machine, main, right
from tls_server import HOST, Server, answer, problem
import process_memory


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
        process = self.with_password(self.machine.start, "account", "sign-in", "anna")
        self.machine.wait_for(lambda: asked, "the request")
        process.send_signal(signal.SIGTERM)
        self.assertEqual(process.wait(timeout=20), -signal.SIGTERM)
        asked.append(2)


class Memory(AccountServerTest):
    """The password is looked for as in a core file."""

    def sign_in_watched(self, server, *arguments, **options):
        """Signs in. The number of copies in each process while the server is asked, and of those at their ends."""
        held, left, process = [], {}, []
        proc = self.root / "proc"

        def reply(line, body):
            self.machine.wait_for(lambda: process, "the program")
            held.append([process_memory.count(proc, each, PASSWORD)
                         for each in process_memory.descendants(proc, process[0].pid)])
            return right(line, body)

        server._reply = reply
        process.append(self.with_password(self.machine.start, "account", "sign-in", "anna", *arguments,
                                          stdout=subprocess.DEVNULL, **options))
        process[0].returncode = process_memory.watch_ends(
            proc, process[0].pid, lambda each: left.update({each: process_memory.count(proc, each, PASSWORD)}))
        self.assertEqual(process[0].returncode, 0)
        return held, list(left.values())

    def test_while_the_server_is_asked_the_password_is_in_one_place_and_afterwards_nowhere(self):
        server = self.serve(certificate=self.certificate)
        self.settle(server)
        held, left = self.sign_in_watched(server)
        self.assertEqual((held, left), ([[1], [1]], [0]))

    def test_so_it_is_in_each_of_both_where_root_asks_for_another_user(self):
        path = self.root / "run/watched"
        server = self.serve(path=path)
        self.addCleanup(path.unlink)
        self.settle(AccountServer="unix:/run/watched")
        held, left = self.sign_in_watched(server, "--user", machine.USER)
        self.assertEqual((held, left), ([[1, 1], [1, 1]], [0, 0]))

    def test_nobody_may_look_while_it_is_held(self):
        server = self.serve(certificate=self.certificate)
        self.settle(server)
        process, owners = [], []

        def reply(line, body):
            self.machine.wait_for(lambda: process, "the program")
            owners.append((self.root / f"proc/{process[0].pid}/mem").stat().st_uid)
            return right(line, body)

        server._reply = reply
        process.append(self.with_password(self.machine.start, "account", "sign-in", "anna", user=True, stdout=subprocess.DEVNULL))
        self.assertEqual(process[0].wait(timeout=60), 0)
        self.assertEqual(owners, [0, 0], "neither the user's other processes nor a core file get to see it")
        other = self.machine.start(["sleep", "60"], user=True)
        self.addCleanup(other.wait)
        self.addCleanup(other.kill)
        self.machine.wait_for(lambda: (self.root / f"proc/{other.pid}/mem").stat().st_uid == machine.UID, "what is otherwise so")


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
    main()
