"""The installed tool, for classes of tests that run it many times."""

import os
import shutil
import subprocess
import tempfile
import unittest
from pathlib import Path


class InstalledToolCase(unittest.TestCase):
    """What derives from it names the build: cls.build. Then there are cls.folder, which goes with the class, cls.prefix below
    it, and cls.temporary for the tool's own folders, which it has to take away after each test."""

    maxDiff = None
    build = None

    @classmethod
    def setUpClass(cls):
        cls.folder = Path(tempfile.mkdtemp(prefix="installed-tool-"))
        cls.addClassCleanup(shutil.rmtree, cls.folder)
        cls.prefix = cls.folder / "prefix"
        subprocess.run(["cmake", "--install", cls.build, "--prefix", cls.prefix], check=True, stdout=subprocess.DEVNULL,
                       timeout=120)
        cls.temporary = cls.folder / "tmp"
        cls.temporary.mkdir()

    def tearDown(self):
        self.assertEqual(list(self.temporary.iterdir()), [], "the tool takes its folders away")

    def tool(self, *arguments, **environment):
        """Runs it to its end, with these variables besides."""
        return subprocess.run([self.prefix / "bin/welcomer", *map(str, arguments)], capture_output=True, text=True,
                              timeout=280, stdin=subprocess.DEVNULL, check=False,
                              env={**os.environ, "TMPDIR": str(self.temporary), **environment})
