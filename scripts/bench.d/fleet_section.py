"""A fleet of account servers: machines that sign in, against users who ask the directory itself, and what grows."""

import json
import subprocess
import sys
from pathlib import Path

TOP = Path(__file__).resolve().parents[2]
PEER = "connect, StartTLS, bind and who-am-I for each user, with libldap"


def measure(build, tables):
    for package in ("nginx", "slapd"):
        subprocess.run([TOP / "scripts/fetch-package", package, build / package], check=True)
    result = subprocess.run([sys.executable, "-B", TOP / "tests/fleet/measure.py", build], check=True, stdout=subprocess.PIPE,
                            text=True)
    figure = json.loads(result.stdout.splitlines()[-1])
    (rate, late), (peer_rate, peer_late) = figure["many"]
    tables.ratio("a sign-in through the fleet, 16 at once", PEER, 1e3 / rate, 1e3 / peer_rate, 1.5, "ms")
    tables.ratio("its 99th percentile", PEER, late, peer_late, 1.5, "ms")
    morning = figure["morning"]
    tables.count("wrong answers and double counts of 10,000 machines", morning["fault_count"], 0)
    file = figure["file"]
    tables.growth("Growth of the fleet", ("users", "sign-ins a second", "99th percentile, ms"),
                  [(users, *figure[name][0]) for name, users in (("few", 1_000), ("many", 100_000))])
    tables.growth("10,000 machines on a Monday morning, with a part of each kind killed meanwhile",
                  ("what", "figure"),
                  [("times as fast as in ten minutes", morning["squeeze"]), ("sign-ins a second", morning["per_second"]),
                   ("99th percentile, ms", morning["late_ms"]), ("tries", morning["tries"]),
                   *((f"told: {text}", number) for text, number in morning["failures"].items())])
    tables.growth("Memory of an idle connection with TLS", ("of", "kB"),
                  [("an account server", figure["idle_server"] / 1e3), ("the front", figure["idle_front"] / 1e3)])
    tables.growth("A sign-in with the directory file", ("what", "ms"),
                  [("one user, a password with a hash of the least work", file["plain"]),
                   ("one user, a password with yescrypt", file["yescrypt"]),
                   ("1,000 users, the least work", file["few"]), ("the first one after a change", file["few, the first"]),
                   ("50,000 users, the least work", file["many"]), ("the first one after a change", file["many, the first"])])
