#!/usr/bin/env python3
"""Takes the figures of a fleet, and has it lose what the small one of the tests loses.

usage: measure.py BUILD_DIR [MACHINES [ROUNDS [USERS]]]    10,000, 3 and 100,000 unless given

Prints them as JSON. Each round is one of ours and one of the peer's, turn about.
"""

import json
import shutil
import socket
import ssl
import statistics
import subprocess
import sys
import tempfile
import threading
import time
from pathlib import Path

sys.path.insert(0, str(Path(__file__).resolve().parents[1] / "support"))
import account_server  # noqa: E402
import accounting  # noqa: E402
import fleet  # noqa: E402
import machine  # noqa: E402

MONDAY_MORNING = 600  # seconds in which all machines are switched on
AT_ONCE = 16
ROUND = 300           # sign-ins
FEW = 1_000           # users
MOST_IN_FILE = 50_000  # users: with twice as many it would be longer than it may be
IDLE = 500            # connections
SETTLED = 3           # seconds after which the account server relies on what it has read of a file that was changed


def percentile(values, part):
    return sorted(values)[min(len(values) - 1, int(len(values) * part))]


def figures_of(spans):
    """(sign-ins per second, 99th percentile in ms) of pairs of beginning and duration in seconds."""
    begin, end = min(at for at, _ in spans), max(at + took for at, took in spans)
    return len(spans) / (end - begin), percentile([took for _, took in spans], 0.99) * 1e3


def ours(test_fleet, numbers, seen):
    """As figures_of() has it. seen: receives every try."""
    lines, wrong = accounting.plan(numbers, 0, wrong_every=len(numbers) + 1)
    tries = [accounting.Try.of(fields) for fields in test_fleet.machines(lines, AT_ONCE).lines()]
    seen += tries
    assert not (faults := [*accounting.wrong_answers(lines, wrong, tries)]), faults[:3]
    late = accounting.failures(tries)
    if late:
        print(f"not at once: {dict(late)}", file=sys.stderr)
    # What was tried again took as long as all of it.
    first = {each.user: each.at for each in reversed(tries)}
    return figures_of([(first[each.user], each.at + each.took - first[each.user])
                       for each in tries if each.outcome == "completed"])


def peers(test_fleet, numbers):
    lines, _ = accounting.plan(numbers, 0, wrong_every=len(numbers) + 1)
    done = [(float(at), float(took), code) for _, at, took, code in test_fleet.binds(lines, AT_ONCE).lines()]
    assert len(done) == len(lines) and all(code == "0" for _, _, code in done), done[:3]
    return figures_of([(at, took) for at, took, _ in done])


def turn_about(test_fleet, rounds, seen):
    """Medians of ours and of the peer's."""
    numbers = [number * (test_fleet.users // ROUND) for number in range(ROUND)]  # from all over the directory
    ours(test_fleet, numbers, seen), peers(test_fleet, numbers)
    taken = [(ours(test_fleet, numbers, seen), peers(test_fleet, numbers)) for _ in range(rounds)]
    return [[statistics.median(each[who][what] for each in taken) for what in (0, 1)] for who in (0, 1)]


def private_memory(process):
    """Bytes of its own."""
    text = Path(f"/proc/{process}/smaps_rollup").read_text(encoding="ascii")
    return sum(int(line.split()[1]) for line in text.splitlines() if line.startswith("Private_")) * 1024


def idle_memory(test_fleet, host, port, processes):
    """Bytes that each connection costs that has asked and does not ask again for the time being."""
    context = ssl.create_default_context(cafile=test_fleet.authority / "authority.pem")

    def connect():
        bare = socket.create_connection((host.address, port), timeout=60)
        secure = context.wrap_socket(bare, server_hostname=fleet.FRONT)
        secure.sendall(b"GET /v1/server HTTP/1.1\r\nHost: accounts\r\n\r\n")
        assert b" 200 " in secure.recv(4096)
        return secure

    def hold():
        first = [connect() for _ in range(10)]
        before = sum(map(private_memory, processes()))
        held = [connect() for _ in range(IDLE)]
        each = (sum(map(private_memory, processes())) - before) / IDLE
        for connection in first + held:
            connection.close()
        return each

    return test_fleet.office.here(hold)


def morning(test_fleet, count, rate, seen):
    """All machines, so many a second, while the fleet loses a part of each kind. seen: the tries before."""
    seconds = count / rate
    lines, wrong = accounting.plan([number % test_fleet.users for number in range(count)], seconds)
    directory, server = test_fleet.directories[0], test_fleet.servers[0]

    def end_server():
        server.kill()
        server.start_again()

    def end_directory():
        directory.kill()
        time.sleep(seconds / 10)
        directory.start()

    events = {count // 4: end_directory, count // 2: end_server, count * 3 // 4: test_fleet.front.kill_worker}
    tries, threads = [], []
    for fields in test_fleet.machines(lines, AT_ONCE).lines():
        tries.append(accounting.Try.of(fields))
        if event := events.get(len(tries)):
            threads.append(threading.Thread(target=event))
            threads[-1].start()
    for thread in threads:
        thread.join()
    answered = [each for each in tries if each.outcome != accounting.UNAVAILABLE]
    per_second, late = figures_of([(each.at, each.took) for each in answered])
    faults = [*accounting.wrong_answers(lines, wrong, tries),
              *accounting.wrong_counts(test_fleet.servers, seen + tries, test_fleet.front.given_up())]
    return {"machines": count, "squeeze": MONDAY_MORNING / seconds, "per_second": per_second, "late_ms": late,
            "tries": len(tries), "failures": accounting.failures(tries), "faults": faults[:5], "fault_count": len(faults)}


def directory_file(folder, build):
    """Milliseconds for a sign-in with the directory file: by how passwords are kept, and by how many users there are."""
    own = machine.Machine(folder / "machine")
    own.install(build)
    found = {}
    hashes = {"plain": account_server.hash_of(account_server.PASSWORD),
              "yescrypt": subprocess.run(["perl", "-e", "print crypt($ARGV[0], '$y$j9T$abcdefgh$')", account_server.PASSWORD],
                                         check=True, capture_output=True, text=True).stdout}
    server = account_server.AccountServer(own)
    server.start()
    for name, count, kind in (("plain", 1, "plain"), ("yescrypt", 1, "yescrypt"), ("few", FEW, "plain"),
                              ("many", MOST_IN_FILE, "plain")):
        account_server.write_directory(own.root, {
            fleet.user_name(number): {"Password": hashes[kind]} for number in range(count)})
        plan = folder / "plan"
        plan.write_text("".join(f"0\t{fleet.user_name(number % count)}\t{account_server.PASSWORD}\n" for number in range(61)),
                        encoding="utf-8")
        time.sleep(SETTLED)
        with open(plan, encoding="utf-8") as lines:
            done = subprocess.run([build / "fleet/fleet-machines", f"unix:{server.path}", "", "1", "1"], stdin=lines, check=True,
                                  capture_output=True, text=True).stdout.splitlines()
        tries = [accounting.Try.of(line.split("\t")) for line in done]
        assert all(each.outcome == "completed" for each in tries), tries[0]
        found[name] = statistics.median(each.took for each in tries[1:]) * 1e3
        found[f"{name}, the first"] = tries[0].took * 1e3
    server.close()
    own.stop()
    return found


def tell(result):
    """Says how far it is."""
    print(f"so far: {json.dumps(result)}", file=sys.stderr)


def main():
    build = Path(sys.argv[1]).resolve()
    count = int(sys.argv[2]) if len(sys.argv) > 2 else 10_000
    rounds = int(sys.argv[3]) if len(sys.argv) > 3 else 3
    many = int(sys.argv[4]) if len(sys.argv) > 4 else 100_000
    machine.enter_namespaces()
    machine.mount("proc", "/proc", "proc")
    folder = Path(tempfile.mkdtemp(prefix="bench-fleet-"))
    installed = fleet.install(build, folder / "stage")
    result = {"file": directory_file(folder, build)}
    tell(result)
    for name, users in (("few", FEW), ("many", many)):
        (folder / str(users)).mkdir()
        test_fleet, seen = fleet.Fleet(folder / str(users), build, installed, users), []
        result[name] = turn_about(test_fleet, rounds, seen)
        tell(result)
        if name == "many":
            server = test_fleet.servers[0]
            result["idle_server"] = idle_memory(test_fleet, server.host, 8443, lambda: [server.process.pid])
            result["idle_front"] = idle_memory(test_fleet, test_fleet.front.host, 443, test_fleet.front.workers)
            tell(result)
            # As fast as is carried, with a part kept for what comes at once and is tried again.
            result["morning"] = morning(test_fleet, count, 0.7 * result[name][0][0], seen)
        test_fleet.close()
    shutil.rmtree(folder)
    print(json.dumps(result))


if __name__ == "__main__":
    main()
