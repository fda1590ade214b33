#!/usr/bin/env python3
"""What is installed of manual pages and completions: nothing of the command line is missing in them, and they work.

usage: installed_help_test.py BUILD_DIR [TEST ...]
"""

import os
import pty
import re
import select
import shutil
import subprocess
import sys
import tempfile
import time
import unittest
from pathlib import Path

BUILD = Path(sys.argv[1])
# Groups of commands and commands without one, as each `--help` lists them.
LISTED = re.compile(r"^  (?! )(-{0,2}[a-zA-Z][\w-]*)(?:,(--[\w-]+))?", re.MULTILINE)


def setUpModule():
    global FOLDER, PREFIX, PROGRAM, LEVELS
    FOLDER = Path(tempfile.mkdtemp(prefix="installed-help-"))
    unittest.addModuleCleanup(shutil.rmtree, FOLDER)
    PREFIX = FOLDER / "prefix"
    subprocess.run(["cmake", "--install", BUILD, "--prefix", PREFIX], check=True, stdout=subprocess.DEVNULL, timeout=120)
    PROGRAM = PREFIX / "bin/welcomer"
    LEVELS = dict(levels(()))


def run(*arguments, **options):
    return subprocess.run([PROGRAM, *map(str, arguments)], capture_output=True, text=True, timeout=60,
                          stdin=subprocess.DEVNULL, check=False, **options)


def section_of(text, heading):
    """The lines below a heading of a help text."""
    found = re.search(rf"^{heading}:\n((?:  .*\n)*)", text, re.MULTILINE)
    return found.group(1) if found else ""


def levels(command):
    """Every level of the command line from this one on, with its options."""
    text = run(*command, "--help").stdout
    assert text, command
    yield command, {name for names in LISTED.findall(section_of(text, "Options")) for name in names if name}
    for name, _ in LISTED.findall(section_of(text, "Commands")):
        yield from levels((*command, name))


def is_group(command):
    return any(other[: len(command)] == command and len(other) > len(command) for other in LEVELS)


class Help(unittest.TestCase):
    def test_there_is_something_to_compare(self):
        self.assertIn(("replay", "store"), LEVELS)
        self.assertIn("--bundle", LEVELS["replay", "store"])
        self.assertIn("--root", LEVELS[()])
        self.assertGreater(len(LEVELS), 30)

    def test_help_says_the_same_as_the_option(self):
        for command in LEVELS:
            with self.subTest(command):
                asked, option = run("help", *command), run(*command, "--help")
                self.assertEqual((asked.returncode, asked.stderr), (0, ""))
                self.assertEqual(asked.stdout, option.stdout)

    def test_help_of_no_command_is_a_usage_error(self):
        for arguments, text in ((["nonsense"], "there is no command nonsense"),
                                (["replay", "shwo"], 'there is no command shwo; did you mean "show"?')):
            result = run("help", *arguments)
            self.assertEqual((result.returncode, result.stdout), (2, ""), result)
            self.assertEqual(result.stderr, f"welcomer: {text} (see welcomer help --help)\n")

    def test_what_was_mistyped_is_asked_back(self):
        for arguments, text in (
                (["replya"], 'there is no command replya; did you mean "replay"? (see welcomer --help)'),
                (["serv"], 'there is no command serv; did you mean "services"? (see welcomer --help)'),
                (["state", "sohw"], 'there is no command sohw; did you mean "show"? (see welcomer state --help)'),
                (["--jsn"], 'there is no option --jsn; did you mean "--json"? (see welcomer --help)'),
                (["replay", "show", "--jsno"],
                 'The following argument was not expected: --jsno; did you mean "--json"? (see welcomer replay show --help)'),
                (["try", "--timelapse=1"], 'The following argument was not expected: --timelapse=1; '
                 'did you mean "--time-lapse"? (see welcomer try --help)'),
                (["nothinglikeit"], "there is no command nothinglikeit (see welcomer --help)")):
            with self.subTest(arguments):
                result = run(*arguments)
                self.assertEqual((result.returncode, result.stdout), (2, ""), result)
                self.assertEqual(result.stderr, f"welcomer: {text}\n")

    def test_on_a_terminal_help_is_as_wide_as_that(self):
        for width in (60, 44):
            for arguments in (["replay", "store", "--help"], ["help", "network", "apply"]):
                with self.subTest(width=width, arguments=arguments):
                    shown = on_a_terminal([PROGRAM, *arguments], width)
                    self.assertLessEqual(max(map(len, shown.splitlines())), width)
                    self.assertEqual(shown.split(), run(*arguments).stdout.split())

    def test_what_the_build_and_completions_use_is_not_shown(self):
        self.assertNotRegex(run("--help").stdout, "write-help|list-values")


def on_a_terminal(command, width):
    master, slave = pty.openpty()
    subprocess.run(["stty", "cols", str(width), "rows", "20"], stdin=slave, check=True)
    process = subprocess.Popen(command, stdin=slave, stdout=slave, stderr=slave)
    os.close(slave)
    text = b""
    while True:
        try:
            more = os.read(master, 65536)
        except OSError:  # the other end is closed
            break
        if not more:
            break
        text += more
    os.close(master)
    assert process.wait(timeout=60) == 0
    return text.decode().replace("\r\n", "\n")


class Pages(unittest.TestCase):
    def shown(self, page):
        result = subprocess.run(["man", "--warnings", "-E", "UTF-8", "-l", page], capture_output=True, text=True, timeout=60,
                                env={**os.environ, "MANWIDTH": "2000", "MANPAGER": "cat", "LC_ALL": "C.UTF-8"}, check=False)
        self.assertEqual((result.returncode, result.stderr), (0, ""), page)
        return re.sub(".\b", "", result.stdout)

    def test_every_command_and_option_has_its_place(self):
        for command, options in LEVELS.items():
            page = PREFIX / "share/man/man1" / ("-".join(["welcomer", *command[:1]]) + ".1")
            with self.subTest(command):
                text = self.shown(page)
                words = set(re.findall(r"[\w-]+", text))
                own = options - ({"-h", "--help"} if command else set())
                self.assertEqual(own - words, set())
                self.assertIn(" ".join(["welcomer", *command]) if not is_group(command) or not command else command[-1], text)

    def test_there_is_no_other_page_of_the_tool(self):
        expected = {"-".join(["welcomer", *command]) + ".1" for command in LEVELS if len(command) < 2}
        self.assertEqual({page.name for page in (PREFIX / "share/man/man1").iterdir()}, expected)

    def test_no_page_has_a_warning_and_each_says_what_it_is_of(self):
        pages = sorted((PREFIX / "share/man").rglob("*.[1-9]"))
        names = {page.name for page in pages}
        for name in ("wlnimbussetup.8", "welcomer-platform.conf.5", "welcomer-plugins.7"):
            self.assertIn(name, names)
        for page in pages:
            with self.subTest(page.name):
                self.assertRegex(self.shown(page), rf"NAME\n +{re.escape(page.stem)} - \S")

    def test_every_installed_program_has_a_page(self):
        for program in [*(PREFIX / "bin").iterdir(), *(PREFIX / "libexec").iterdir()]:
            if program.is_file():
                self.assertTrue(list((PREFIX / "share/man").rglob(program.name + ".[18]")), program)


class Completions(unittest.TestCase):
    """In the shells themselves, at a terminal."""

    def setUp(self):
        self.root = FOLDER / "root"
        self.root.mkdir(exist_ok=True)
        with tempfile.TemporaryFile() as password:
            password.write(b"secret\n")
            password.seek(0)
            added = run("--root", self.root, "account", "add", "newcomer@nimbus.example", "--password-fd", password.fileno(),
                        pass_fds=[password.fileno()])
        self.assertIn(added.returncode, (0, 1), added)

    # What is typed, and what the shell makes of it.
    CASES = (
        ("welcomer repl", "welcomer replay"),
        ("welcomer replay sto", "welcomer replay store"),
        ("welcomer replay store --bun", "welcomer replay store --bundle"),
        ("welcomer --json replay store --verb", "welcomer --json replay store --verbose"),
        ("welcomer services enable --account a --phase po", "welcomer services enable --account a --phase post"),
        ("welcomer switch select Pr", "welcomer switch select Prod"),
        ("welcomer state seen cl", "welcomer state seen cloud"),
        ("welcomer --root ROOT account services newc", "welcomer --root ROOT account services newcomer@nimbus.example"),
        ("welcomer --root=ROOT account sign-in newcomer@ni", "welcomer --root=ROOT account sign-in newcomer@nimbus.example"),
        ("welcomer setup --answers ROOT/answ", "welcomer setup --answers ROOT/answers.plist"),
        ("welcomer setup --answers=ROOT/answ", "welcomer setup --answers=ROOT/answers.plist"),
        ("welcomer replay store --bundle ROOT/bun", "welcomer replay store --bundle ROOT/bundle.app"),
        ("welcomer help serv", "welcomer help services"),
    )

    def cases(self):
        (self.root / "answers.plist").touch()
        (self.root / "bundle.app").mkdir(exist_ok=True)
        for typed, completed in self.CASES:
            yield typed.replace("ROOT", str(self.root)), completed.replace("ROOT", str(self.root))
        for command, value in (("state set", "KEY"), ("services enable --select", "SERVICE")):
            names = run("list-values", value).stdout.split()
            name = next(each for each in names if sum(other.startswith(each[:-1]) for other in names) == 1)
            yield f"welcomer {command} {name[:-1]}", f"welcomer {command} {name}"

    def check(self, shell):
        for typed, completed in self.cases():
            with self.subTest(typed):
                self.assertEqual(shell.complete(typed).rstrip("/"), completed)

    def test_bash(self):
        source = PREFIX / "share/bash-completion/completions/welcomer"
        with Shell(["bash", "--norc", "--noprofile", "-i"], [f"source {source}", "bind 'set bell-style none'"]) as shell:
            self.check(shell)

    def test_zsh(self):
        folder = PREFIX / "share/zsh/vendor-completions"
        with Shell(["zsh", "-f", "-i"], [f"fpath=({folder} $fpath)", f"autoload -Uz compinit; compinit -u -d {FOLDER}/zcompdump",
                                         "bindkey -e; setopt no_beep; unsetopt prompt_cr prompt_sp zle_bracketed_paste 2>/dev/null"]) as shell:
            self.check(shell)

    def fish(self, typed):
        source = PREFIX / "share/fish/vendor_completions.d/welcomer.fish"
        environment = {**os.environ, "PATH": f"{PREFIX}/bin:{os.environ['PATH']}", "HOME": str(FOLDER)}
        result = subprocess.run(["fish", "--no-config", "-c", f"source {source}; complete -C $argv[1]", typed], text=True,
                                capture_output=True, timeout=60, env=environment, check=False)
        self.assertEqual(result.stderr, "")
        return [line.split("\t")[0] for line in result.stdout.splitlines()]

    def test_fish(self):
        for typed, completed in self.cases():
            with self.subTest(typed):
                self.assertIn(completed.split()[-1], [each.rstrip("/") for each in self.fish(typed)])

    def test_everything_is_offered(self):
        """Every shell's file names every command and option."""
        for name in ("bash-completion/completions/welcomer", "zsh/vendor-completions/_welcomer",
                     "fish/vendor_completions.d/welcomer.fish"):
            words = set(re.findall(r"-{0,2}[\w-]+", (PREFIX / "share" / name).read_text()))
            for command, options in LEVELS.items():
                with self.subTest(name=name, command=command):
                    known = words | {f"-{word}" for word in words} | {f"--{word}" for word in words}
                    self.assertEqual({*options, *command} - known, set())

    def test_fish_offers_what_belongs_to_a_command_and_nothing_else(self):
        for command, options in LEVELS.items():
            with self.subTest(command):
                typed = " ".join(["welcomer", *command])
                below = {other[len(command)] for other in LEVELS if other[:len(command)] == command and len(other) > len(command)}
                if below:
                    self.assertEqual(set(self.fish(typed + " ")), below)
                offered = set(self.fish(typed + " --"))
                self.assertEqual(offered, {option for option in options | LEVELS[()] if option.startswith("--")})


class Shell:
    """An interactive shell at a terminal. What it makes of a line is told by a program that gets the line's words."""

    def __init__(self, command, preparation):
        environment = {**os.environ, "PATH": f"{PREFIX}/bin:{os.environ['PATH']}", "TERM": "dumb", "HOME": str(FOLDER),
                       "PS1": "> ", "HISTFILE": "/dev/null", "LC_ALL": "C.UTF-8"}
        self._process, self._terminal = pty.fork()
        if self._process == 0:
            os.chdir(FOLDER)
            os.execvpe(command[0], command, environment)
        subprocess.run(["stty", "cols", "1000", "rows", "50"], stdin=self._terminal, check=True)
        for line in preparation:
            self._type(line + "\n")
        self._type("printf '[%s]\\n' ready\n")
        self._read_until("[ready]\r\n")

    def __enter__(self):
        return self

    def __exit__(self, *_):
        os.close(self._terminal)  # hangs up
        os.waitpid(self._process, 0)

    def complete(self, typed):
        """The line that pressing the tabulator makes of what was typed."""
        self._type(typed + "\t")
        # Behind what was completed, and then before the line.
        self._type("\x05 END\x01printf '[%s]\\n' \n")
        words = re.findall(r"^\[(.*)\]\r?$", self._read_until("[END]\r\n"), re.MULTILINE)
        return " ".join(words[:-1])

    def _type(self, text):
        os.write(self._terminal, text.encode())

    def _read_until(self, mark):
        text, end = b"", time.monotonic() + 60
        while not text.endswith(mark.encode()) and mark.encode() not in text:
            ready, _, _ = select.select([self._terminal], [], [], max(0, end - time.monotonic()))
            if not ready:
                raise TimeoutError(f"waited for {mark!r} and saw {text!r}")
            text += os.read(self._terminal, 65536)
        return text.decode(errors="replace")


if __name__ == "__main__":
    unittest.main(argv=[sys.argv[0], *sys.argv[2:]], verbosity=2)
