"""A person at a terminal, for a test."""

import fcntl
import os
import pty
import re
import select
import signal
import struct
import termios
import time


class AtTerminal:
    """A person, on a terminal of 100 columns."""

    def start_program(self, *command, stdout=None):
        self.process, self.terminal = pty.fork()
        if self.process == 0:
            fcntl.ioctl(1, termios.TIOCSWINSZ, struct.pack("HHHH", 40, 100, 0, 0))
            if stdout:
                os.dup2(os.open(stdout, os.O_WRONLY | os.O_CREAT), 1)
            os.execv(command[0], command)
        self.addCleanup(os.close, self.terminal)
        self.seen = ""

    def expect(self, pattern, timeout=60):
        """Reads until the pattern has come; forgets what was before its end."""
        end = time.monotonic() + timeout
        while not (match := re.search(pattern, self.seen)):
            ready, _, _ = select.select([self.terminal], [], [], max(0, end - time.monotonic()))
            self.assertTrue(ready, f"{pattern} did not come: {self.seen}")
            try:
                self.seen += os.read(self.terminal, 65536).decode()
            except OSError:
                self.fail(f"{pattern} did not come: {self.seen}")
        before, self.seen = self.seen[:match.end()], self.seen[match.end():]
        return before

    def answer(self, pattern, text):
        before = self.expect(pattern)
        os.write(self.terminal, (text + "\n").encode())
        return before

    def answer_password(self, pattern, text):
        """Waits for the terminal to be without echo, and checks that the text is not shown."""
        before = self.expect(pattern)
        self.assertFalse(termios.tcgetattr(self.terminal)[3] & termios.ECHO)
        os.write(self.terminal, (text + "\n").encode())
        return before

    def end(self):
        """The rest of what is shown, and the exit status. One that asks for more is ended."""
        rest = self.seen
        end = time.monotonic() + 60
        while True:
            if not select.select([self.terminal], [], [], max(0, end - time.monotonic()))[0]:
                os.kill(self.process, signal.SIGKILL)
                os.waitpid(self.process, 0)
                self.fail(f"it does not end: {rest}")
            try:
                part = os.read(self.terminal, 65536).decode()
            except OSError:
                break
            if not part:
                break
            rest += part
        _, status = os.waitpid(self.process, 0)
        return rest, status

    def accept_everything(self):
        """All aliases, all services, and the last yes; the setup then ends well."""
        for _ in range(3):
            self.answer(r"none \[all\]: ", "")
        self.answer(r"\[Y/n\] ", "")
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
