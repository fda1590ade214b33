"""The switch, until a name in the cloud's domains resolves to the environment."""

import json
import subprocess
import sys
from pathlib import Path

TOP = Path(__file__).resolve().parents[2]


def measure(build, tables):
    resolved = Path(build) / "systemd-resolved"
    subprocess.run([TOP / "scripts/fetch-package", "systemd-resolved", resolved], check=True, stdout=sys.stderr)
    result = subprocess.run([sys.executable, "-B", Path(__file__).with_name("resolver.py"), build, resolved], check=True,
                            stdout=subprocess.PIPE, text=True)
    figure = json.loads(result.stdout.splitlines()[-1])
    tables.ratio("`switch select`, until a name resolves", "`resolvectl dns` and `resolvectl domain`, until it resolves",
                 figure["ours"], figure["peer"], 2.0, "ms")
