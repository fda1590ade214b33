#!/usr/bin/env python3
"""The installed agent at a login whose system log accepts and never reads: the login's work is done all the same.

usage: silent_log_test.py BUILD_DIR PLUGIN_DIR
"""

import os
import socket
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parent))
import agent_ending_test  # noqa: E402
import machine  # noqa: E402



class SilentLog(agent_ending_test.OnAMachine):
    def listen(self, kind):
        """Has /dev/log be this test's own socket, of this kind."""
        path = self.machine.root / "dev/log"
        path.unlink(missing_ok=True)
        log = socket.socket(socket.AF_UNIX, kind)
        self.addCleanup(log.close)
        # The path may be longer than a socket's name can be.
        folder = os.open(path.parent, os.O_RDONLY | os.O_DIRECTORY)
        log.bind(f"/proc/self/fd/{folder}/log")
        os.close(folder)
        path.chmod(0o666)
        return log

    @staticmethod
    def fill(sending):
        """Sends until the daemon has no room left."""
        sending.setblocking(False)
        try:
            while True:
                sending.send(b"<13>Nov 20 22:06:34 other: text")
        except BlockingIOError:
            pass

    def connected(self, log, kind):
        sending = socket.socket(socket.AF_UNIX, kind)
        self.addCleanup(sending.close)
        folder = os.open(self.machine.root / "dev", os.O_RDONLY | os.O_DIRECTORY)
        sending.setblocking(False)
        sending.connect(f"/proc/self/fd/{folder}/log")
        os.close(folder)
        return sending

    def log_in(self):
        """The whole login, up to the plug-in that ends the agent."""
        self.install_plugin("EndingPlugin", "Bad.ncdplugin")
        ended = self.machine.run(["/usr/bin/env", "ENDING=complete exit", agent_ending_test.AGENT], user=True)
        self.assertEqual((ended.returncode, ended.stdout, ended.stderr), (0, "", ""), ended)
        shown = self.machine.run([agent_ending_test.TOOL, "account", "list"], user=True)
        self.assertIn(agent_ending_test.ACCOUNT, shown.stdout)

    def test_a_full_datagram_socket_holds_up_nobody(self):
        self.store_replay_item()
        log = self.listen(socket.SOCK_DGRAM)
        self.fill(self.connected(log, socket.SOCK_DGRAM))
        self.log_in()

    def test_a_stream_that_nobody_is_let_into_holds_up_nobody(self):
        self.store_replay_item()
        log = self.listen(socket.SOCK_STREAM)
        log.listen(0)
        self.connected(log, socket.SOCK_STREAM)
        self.log_in()

    def test_a_stream_that_is_read_has_the_records(self):
        self.store_replay_item()
        log = self.listen(socket.SOCK_STREAM)
        log.listen(16)
        self.log_in()
        log.settimeout(60)
        records = b""
        connection, _ = log.accept()
        with connection:
            while part := connection.recv(65536):
                records += part
        texts = [record.split(b" wlnimbussetup: ", 1) for record in records.split(b"\0")]
        self.assertEqual(texts.pop(), [b""], "each ends in a NUL")
        for head, _ in texts:
            self.assertRegex(head, rb"^<115>[A-Z][a-z]{2} [ 1-3]\d \d\d:\d\d:\d\d$")
        self.assertEqual([text for _, text in texts][:2], [b"Self destructing...", b"Killing onlineaccounts"])


if __name__ == "__main__":
    machine.enter_namespaces()
    agent_ending_test.BUILD, agent_ending_test.PLUGINS = sys.argv[1], Path(sys.argv[2])
    unittest.main(argv=sys.argv[:1], verbosity=2)
