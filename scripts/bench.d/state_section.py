"""The per-user record and the switch."""

import json
import subprocess
import sys
from pathlib import Path

NAMES = {
    "writeToDefaults": ("`writeToDefaults`", "writing and syncing one file of the same size"),
    "loadChangedRecord": ("loading the record", "reading its file and the property list in it"),
    "loadRecord": ("loading it again, unchanged", "reading its file and the property list in it"),
    "switchSelect": ("`switch select`, whole process", "a shell script with the same file operations"),
}


def measure(build, tables):
    # It says by its exit status that a ratio is too high, which the table says as well.
    result = subprocess.run([sys.executable, Path(__file__).with_name("state.py"), build], check=False,
                            stdout=subprocess.PIPE, text=True)
    for name, figure in json.loads(result.stdout).items():
        if name in NAMES:
            tables.ratio(*NAMES[name], figure["median_us"], figure["peer_us"], figure["maximum_ratio"], "us")
