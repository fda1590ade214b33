#!/usr/bin/env python3
"""The installed tool's trial of the whole story, with the installed account server over a Unix socket.

usage: try_test.py BUILD_DIR
"""

import json
import os
import shutil
import signal
import subprocess
import sys
import unittest
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "support"))
import machine  # noqa: E402
from account_server import PROGRAM  # noqa: E402

TOOL = "/usr/local/bin/welcomer"
DELEGATES = [f"com.corvid.{name}" for name in ("chatter", "storefront", "vidlink")]


def servers():
    """The processes of account servers."""
    found = []
    for process in Path("/proc").glob("[0-9]*"):
        try:
            if os.readlink(process / "exe").endswith(Path(PROGRAM).name):
                found.append(process.name)
        except OSError:
            pass  # it has ended, or is the kernel's
    return found


class TryServer(unittest.TestCase):
    build = None

    @classmethod
    def setUpClass(cls):
        machine.for_class(cls, cls.build, "try-server")

    def tearDown(self):
        self.assertEqual(list((self.machine.root / "tmp").iterdir()), [], "the temporary folder is gone")
        self.assertEqual(servers(), [], "the server has ended")

    def document(self, *arguments):
        done = self.machine.run([TOOL, "--json", "try", "--time-lapse", *arguments], user=True, timeout=120)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        return json.loads(done.stdout)

    def hide(self, path):
        hidden = path.rename(path.with_suffix(".away"))
        self.addCleanup(hidden.rename, path)

    def program(self):
        return self.machine.root / PROGRAM.lstrip("/")

    def module(self):
        [module] = (self.machine.root / "usr/local/lib").glob("**/accountserver.so")
        return module

    def refused(self):
        done = self.machine.run([TOOL, "try", "--time-lapse", "--server"], user=True, timeout=120)
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1), done)
        return done

    def test_it_is_the_same_story(self):
        with_server, without = self.document("--server"), self.document()
        server = with_server["setup"]["server"]
        self.assertIsNone(without["setup"]["server"])
        self.assertRegex(server["address"], r"^unix:/tmp/welcomer-try\.\w{6}/run/welcomer-account-server\.sock$")
        self.assertEqual([line.split(" from=")[0] for line in server["log"]],
                         [f"listening socket={server['address'].removeprefix('unix:')} use=clear",
                          "authenticate status=200", "authenticate status=200"])
        self.assertIn(f'from="uid {machine.UID}" user=user@nimbus.example', server["log"][-1])
        for document in (with_server, without):
            self.assertEqual([(each["identifier"], each["outcome"]) for each in
                              sorted(document["firstLogin"]["delegates"], key=lambda each: each["identifier"])],
                             [(name, "completed") for name in DELEGATES])
        for part in ("aliases", "delegates", "services"):
            self.assertEqual(with_server["setup"][part], without["setup"][part])
        for part in ("left", "changedBySecondLogin"):
            self.assertEqual(with_server[part], without[part])

    def test_people_see_which_server_it_is_and_what_it_logs(self):
        done = self.machine.run([TOOL, "try", "--time-lapse", "--server"], timeout=120)
        self.assertEqual((done.returncode, done.stderr), (0, ""), done)
        self.assertRegex(done.stdout, rf"\n  account server     {PROGRAM}, asked at unix:/tmp/\S+\n")
        own = done.stdout.split("  The account server's own log:\n")[1].split("\n\n")[0].splitlines()
        self.assertEqual([line.split()[:2] for line in own[1:]], [["authenticate", "status=200"]] * 2)
        self.assertIn("  com.corvid.vidlink     completed", done.stdout)
        self.assertIn("The temporary folder is removed.\n", done.stdout)

    def test_below_a_root_nothing_of_the_server_is_left(self):
        root = self.machine.root / "var/fresh"
        root.mkdir()
        self.addCleanup(shutil.rmtree, root)
        for _ in range(2):
            done = self.machine.run([TOOL, "--root", "/var/fresh", "try", "--time-lapse", "--server"], timeout=120)
            self.assertEqual(done.returncode, 0, done)
            self.assertEqual(list((root / "run").iterdir()), [])
        done = self.machine.run([TOOL, "--root", "/var/fresh", "try", "--time-lapse"], timeout=120)
        self.assertEqual((done.returncode, "account server" in done.stdout), (0, False), done)

    def test_where_the_server_is_not_installed_one_line_says_so(self):
        self.hide(self.program())
        done = self.refused()
        self.assertEqual((done.stdout, done.stderr),
                         ("", f"welcomer: the account server is not installed: there is no {PROGRAM} or "
                              "/usr/local/bin/welcomer-account-server\n"))

    def test_where_its_client_is_not_installed_one_line_says_so(self):
        self.hide(self.module())
        self.assertIn("the module accountserver.so cannot be used", self.refused().stderr)

    def test_where_it_does_not_start_its_own_words_say_why(self):
        folder = "/tmp/" + "long" * 25
        (self.machine.root / folder.lstrip("/")).mkdir(mode=0o777)
        done = self.machine.run(["/usr/bin/env", f"TMPDIR={folder}", TOOL, "try", "--time-lapse", "--server"])
        (self.machine.root / folder.lstrip("/")).rmdir()
        self.assertEqual(done.returncode, 1, done)
        self.assertRegex(done.stderr, r"^welcomer: the account server does not start: welcomer-account-server: \S+: "
                                      r"File name too long\n$")

    def test_without_the_option_neither_is_wanted(self):
        self.hide(self.program())
        self.hide(self.module())
        self.document()

    def start_and_wait(self):
        process = self.machine.start([TOOL, "try", "--server"], user=True, stdout=subprocess.DEVNULL)
        self.machine.wait_for(servers, "the server")
        return process

    def test_who_ends_the_tool_ends_the_server(self):
        process = self.start_and_wait()
        process.terminate()
        self.assertEqual(process.wait(timeout=60), -signal.SIGTERM)

    def test_when_the_tool_is_killed_the_server_ends(self):
        process = self.start_and_wait()
        process.kill()
        process.wait(timeout=60)
        self.machine.wait_for(lambda: not servers(), "the server's end")
        [left] = (self.machine.root / "tmp").iterdir()
        shutil.rmtree(left)


if __name__ == "__main__":
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    TryServer.build = sys.argv.pop(1)
    unittest.main(verbosity=2)
