#!/usr/bin/env python3
"""Times pointing a cloud domain at an environment until a name resolves: `welcomer switch select` with the service
running, and resolvectl on the link that the nameserver is reached through.

usage: resolver.py BUILD_DIR RESOLVED_DIR [ROUNDS]

Prints the medians in milliseconds as JSON.
"""

import json
import shutil
import subprocess
import sys
import tempfile
import time
from pathlib import Path

TOP = Path(__file__).resolve().parents[2]
sys.path.insert(0, str(TOP / "tests" / "support"))

import figures  # noqa: E402
import resolver  # noqa: E402

NAME = "probe.nimbus.example"
ENVIRONMENT = "Nimbus1"


def wait_for(answer):
    while resolver.ask(NAME) != answer:
        time.sleep(0.001)


def main():
    build, resolved = sys.argv[1:3]
    rounds = int(sys.argv[3]) if len(sys.argv) > 3 else 15
    resolver.enter_namespaces()
    folder = Path(tempfile.mkdtemp(prefix="bench-resolver-"))
    machine = resolver.ResolverMachine(folder / "machine", resolved)
    machine.install(build)
    service = machine.start(["/usr/local/libexec/welcomer-resolver-sync"], stderr=subprocess.DEVNULL)

    def timed(commands):
        start = time.perf_counter()
        for command in commands:
            done = machine.run(command)
            assert done.returncode == 0, done
        wait_for(resolver.ANSWERS[ENVIRONMENT])
        return (time.perf_counter() - start) * 1e3

    def ours():
        taken = timed([["/usr/local/bin/welcomer", "switch", "select", ENVIRONMENT]])
        assert machine.run(["/usr/local/bin/welcomer", "switch", "select", "Prod"]).returncode == 0
        wait_for(None)
        machine.wait_for(lambda: "welcomer0" not in Path("/proc/net/dev").read_text(), "the end of the link")
        return taken

    def peer():
        tool = f"{resolver.RESOLVED}/usr/bin/resolvectl"
        taken = timed([[tool, "dns", resolver.LINK, resolver.NAMESERVERS[ENVIRONMENT]],
                       [tool, "domain", resolver.LINK, *(f"~{domain}" for domain in resolver.DOMAINS)]])
        machine.resolvectl("revert", resolver.LINK)
        machine.resolvectl("flush-caches")
        wait_for(None)
        return taken

    medians = figures.turn_about(ours, peer, rounds)
    service.terminate()
    service.wait(timeout=20)
    machine.stop()
    shutil.rmtree(folder)
    print(json.dumps(dict(zip(("ours", "peer"), medians))))


if __name__ == "__main__":
    main()
