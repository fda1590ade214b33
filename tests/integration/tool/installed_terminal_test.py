#!/usr/bin/env python3
"""What a person at a terminal meets: stopping the installed tool with Ctrl-Z, mending a line, tables that fit.

Run like tool_test.py beside it.
"""

import os
import re
import shlex
import signal
import termios
import time
import unittest

import installed_values_test
import setup_test
import tool_test
from account_test import PASSWORD, CloudTest

WIDTH = 100  # of the terminals of AtTerminal
LONG = "x" * 5000
BEGINNING, LEFT, BACKSPACE, SUSPEND = "\x01", "\x1b[D", "\x7f", "\x1a"


def setUpModule():
    installed_values_test.setUpModule()
    setup_test.PROGRAM = tool_test.PROGRAM


def tearDownModule():
    installed_values_test.tearDownModule()


class Terminal(setup_test.AtTerminal, setup_test.SetupTest):
    def echoes(self):
        return bool(termios.tcgetattr(self.terminal)[3] & termios.ECHO)

    def start_in_a_shell(self, *arguments):
        """The tool as a shell's job, which goes on after a line once it was stopped."""
        tool = shlex.join([str(tool_test.PROGRAM), "--root", str(self.root), *arguments])
        self.start_program("/bin/sh", "-m", "-c", f"{tool}; echo has stopped; read line; fg >/dev/null; echo ended: $?")

    def suspend(self, question):
        """Ctrl-Z at the question, and back."""
        self.expect(question)
        os.write(self.terminal, ("ab" + SUSPEND).encode())
        self.expect("has stopped")
        self.assertTrue(self.echoes(), "the shell's terminal shows what is typed")
        os.write(self.terminal, b"\n")

    def set_up(self):
        for _ in range(3):
            self.answer(r"none \[all\]: ", "")
        self.answer(r"\[Y/n\] ", "")
        self.expect("anna is set up.")
        self.expect("ended: 0")
        self.end()

    def test_control_z_at_the_password_stops_the_tool_and_is_no_part_of_the_password(self):
        self.start_in_a_shell("setup")
        self.answer("account's name: ", "anna")
        self.suspend("Password for anna: ")
        self.answer_password("Password for anna: ", PASSWORD)
        self.set_up()

    def test_after_control_z_a_question_is_shown_again(self):
        self.start_in_a_shell("setup")
        self.suspend("account's name: ")
        self.expect("account's name: ")
        os.write(self.terminal, ("\x15" + "anna\n").encode())  # Ctrl-U: what was typed before may be there again
        self.answer_password("Password for anna: ", PASSWORD)
        self.set_up()

    def test_control_c_after_control_z_ends_it_with_the_echo_back(self):
        self.start_in_a_shell("setup")
        self.answer("account's name: ", "anna")
        self.suspend("Password for anna: ")
        self.expect("Password for anna: ")
        self.assertFalse(self.echoes())
        os.write(self.terminal, b"\x03")
        deadline = time.monotonic() + 60
        while not self.echoes():
            self.assertLess(time.monotonic(), deadline)
            time.sleep(0.01)
        self.end()

    def test_a_signal_that_ends_it_at_a_question_leaves_the_terminal_as_it_was(self):
        for question in ("account's name: ", "Password for anna: "):
            for number in (signal.SIGALRM, signal.SIGSEGV, signal.SIGABRT, signal.SIGUSR1, signal.SIGRTMIN):
                with self.subTest(signal=number, question=question):
                    tool = shlex.join([str(tool_test.PROGRAM), "--root", str(self.root), "setup"])
                    self.start_program("/bin/sh", "-m", "-c", f"echo begins; read line; {tool}; echo ended; read line")
                    self.expect("begins")
                    before = termios.tcgetattr(self.terminal)
                    os.write(self.terminal, b"\n")
                    if question.startswith("Password"):
                        self.answer("account's name: ", "anna")
                    self.expect(question)
                    self.assertEqual(self.echoes(), not question.startswith("Password") and not self.mends_by_itself())
                    os.kill(os.tcgetpgrp(self.terminal), number)
                    self.expect("ended")
                    self.assertEqual(termios.tcgetattr(self.terminal), before)
                    os.kill(self.process, signal.SIGKILL)
                    os.waitpid(self.process, 0)

    def mends_by_itself(self):
        """Whether the tool takes each key as it comes, and not whole lines from the terminal."""
        return not termios.tcgetattr(self.terminal)[3] & termios.ICANON

    def test_a_line_can_be_mended_in_its_middle(self):
        self.start("setup")
        self.expect("account's")
        self.assertTrue(self.mends_by_itself())
        self.answer(" name: ", "nx" + BACKSPACE + "a" + LEFT + "n" + BEGINNING + "a")
        self.answer_password("Password for anna: ", PASSWORD)
        self.accept_everything()

    def test_a_line_beyond_ascii_can_be_mended(self):
        self.add("Zoë 東京")
        self.start("setup")
        self.answer("account's name: ", "oë 東x" + BACKSPACE + "京" + BEGINNING + "Z")
        self.answer_password("Password for Zoë 東京: ", PASSWORD)
        self.accept_everything()


class WithoutTheLibrary(Terminal):
    """The same where there is no libedit that could be loaded: lines are mended with what the terminal has."""

    def setUp(self):
        super().setUp()
        (self.folder / "libedit.so.2").write_text("no library")
        os.environ["LD_LIBRARY_PATH"] = str(self.folder)
        self.addCleanup(os.environ.pop, "LD_LIBRARY_PATH")

    def test_a_line_can_be_mended_in_its_middle(self):
        self.start("setup")
        self.expect("account's name: ")
        self.assertFalse(self.mends_by_itself())
        os.write(self.terminal, ("annx" + BACKSPACE + "a\n").encode())
        self.answer_password("Password for anna: ", PASSWORD)
        self.accept_everything()

    def test_a_line_beyond_ascii_can_be_mended(self):
        self.start("setup")
        self.answer("account's name: ", "東京\x15anna")  # Ctrl-U: begin again
        self.answer_password("Password for anna: ", PASSWORD)
        self.accept_everything()


class Tables(setup_test.AtTerminal, CloudTest):
    def setUp(self):
        super().setUp()
        for name in (LONG, "bert", "東京" * 40):
            self.add(name, aliases=[])

    def test_on_a_terminal_a_line_is_no_wider_than_that(self):
        self.start("account", "list")
        rest, status = self.end()
        self.assertEqual(status, 0, rest)
        lines = rest.splitlines()
        self.assertEqual([re.split("  +", line)[1:] for line in lines],
                         [["CAN SIGN IN", "ACCOUNT", "LOGGED IN"], *[["yes", "no", "no"]] * 3])
        self.assertEqual([line.index("yes") for line in lines[1:3]], [lines[0].index("CAN SIGN IN")] * 2)
        self.assertRegex(lines[2], r"^x{40,}…  +yes")
        self.assertRegex(lines[3], "^(東京){15,}東?… +yes")
        for line in lines:
            self.assertLessEqual(len(line) + len(re.findall("[東京]", line)), WIDTH, line)

    def test_in_a_pipe_nothing_is_lost(self):
        rows = self.succeeds(self.run_below_root("account", "list")).splitlines()
        self.assertEqual([re.split("  +", row)[0] for row in rows], ["NAME", "bert", LONG, "東京" * 40])

    def test_a_document_on_a_terminal_is_whole(self):
        self.start("--json", "account", "list")
        rest, _ = self.end()
        self.assertIn(LONG, rest)


if __name__ == "__main__":
    unittest.main()
