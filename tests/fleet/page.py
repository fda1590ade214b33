"""The settings of a fleet, as docs/deploying.md has them for people: what is tested is what is told."""

import re
from pathlib import Path

PAGE = Path(__file__).resolve().parents[2] / "docs" / "deploying.md"
# "`/etc/FILE`, a word on it:", and the block behind it.
FILE = re.compile(r"^`(/[^`]+)`[^\n]*:\n\n```\n(.*?)^```$", re.MULTILINE | re.DOTALL)
# "| `name` | 192.0.2.1 |" and "| `a1`, `a2` | 192.0.2.11 to 12 |"
HOST = re.compile(r"^\| (`[^|]+`) \| (\d+\.\d+\.\d+)\.(\d+)[^|]* \|", re.MULTILINE)
DOMAIN = "company.example"


def files(page=PAGE):
    """The text of each file by its path."""
    return dict(FILE.findall(page.read_text(encoding="utf-8")))


def hosts(page=PAGE):
    """The address of each host by its full name."""
    found = {}
    for names, network, number in HOST.findall(page.read_text(encoding="utf-8")):
        for place, name in enumerate(re.findall(r"`([^`]+)`", names)):
            full = name if name.endswith(DOMAIN) else f"{name}.{DOMAIN}"
            found[full] = f"{network}.{int(number) + place}"
    return found


def settings(text):
    """The lines of a file of ours, by name; of several with one name the last counts."""
    lines = (line.partition("=") for line in text.splitlines() if line and not line.startswith("#"))
    return {name: value for name, _, value in lines}
