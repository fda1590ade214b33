"""A user's session with a real, unlocked keyring: reading the replay item, the agent that finds none, and the memory of the
lingering agent."""

import json
import os
import subprocess
import sys
import tempfile
import time
from pathlib import Path

import agent_section

ROUNDS = 101
PASSWORD = "the password of the keyring"
LOOK_UP = ["secret-tool", "lookup", "service", "Welcomer Nimbus Replay Data", "account", "Welcomer"]
DELEGATES = [f"com.corvid.bench.number{number:04d}" for number in range(10)]


def measure(build, tables):
    # In a program of its own, since it puts itself into namespaces.
    result = subprocess.run([sys.executable, __file__, str(build)], check=True, stdout=subprocess.PIPE, text=True)
    for arguments in json.loads(result.stdout):
        tables.ratio(*arguments)


class UserSession(agent_section.BenchMachine):
    """The machine, with a session bus of the user's own and the daemons on it. All end with the namespaces."""

    def __init__(self, build, folder):
        super().__init__(build, folder, plugin_count=len(DELEGATES))
        import machine

        runtime = self.machine.root / "run/user" / str(machine.UID)
        runtime.mkdir(parents=True, mode=0o700)
        os.chown(runtime, machine.UID, machine.UID)
        address = f"unix:path=/run/user/{machine.UID}/bus"
        self.session = ["/usr/bin/env", f"XDG_RUNTIME_DIR=/run/user/{machine.UID}", f"DBUS_SESSION_BUS_ADDRESS={address}"]
        self._start(["/usr/bin/dbus-daemon", "--session", "--nofork", f"--address={address}"])
        self.machine.wait_for((runtime / "bus").exists, "the session bus")
        (self.machine.home / ".local").mkdir()
        (self.machine.home / ".local/share").mkdir()
        for folder in (".local", ".local/share"):
            os.chown(self.machine.home / folder, machine.UID, machine.UID)
        self._start(["/bin/sh", "-c", f"printf '%s' '{PASSWORD}' | "
                     "exec gnome-keyring-daemon --foreground --unlock --components=secrets"])
        self.machine.wait_for(self._keyring_is_unlocked, "the keyring")
        self.online_accounts = self._start(["/usr/libexec/goa-daemon"])
        self.machine.wait_for(lambda: self._is_owned("org.gnome.OnlineAccounts"), "the online accounts")

    def _start(self, command):
        return self.machine.start([*self.session, *command], user=True, stdout=subprocess.DEVNULL,
                                  stderr=subprocess.DEVNULL)

    def run(self, command):
        return self.machine.run([*self.session, *command], user=True, timeout=300)

    def _call(self, name, path, method, *arguments):
        return self.run(["gdbus", "call", "--session", "--dest", name, "--object-path", path, "--method", method,
                         *arguments]).stdout.strip()

    def _is_owned(self, name):
        return self._call("org.freedesktop.DBus", "/", "org.freedesktop.DBus.NameHasOwner", name) == "(true,)"

    def _keyring_is_unlocked(self):
        # A call to a daemon that is not there yet would have the bus start another.
        return self._is_owned("org.freedesktop.secrets") and self._call(
            "org.freedesktop.secrets", "/org/freedesktop/secrets/collection/login",
            "org.freedesktop.DBus.Properties.Get", "org.freedesktop.Secret.Collection", "Locked") == "(<false>,)"

    def pair(self, command, status):
        """Medians in ms of a command and of looking the item up; both end as they should."""
        for each, expected in ((command, 0), (LOOK_UP, status)):
            result = self.run(each)
            if result.returncode != expected:
                raise RuntimeError(f"{each}: {result}")
        times = json.loads(self.run(["/tmp/process-pair", str(ROUNDS), *command, "--", *LOOK_UP]).stdout)
        return times["ns"] / 1e6, times["peer_ns"] / 1e6

    def proportional_size(self, process):
        """A process's memory in kB, with its share of what it has in common with others."""
        return agent_section.status_field(self.status(process).with_name("smaps_rollup"), "Pss")


def inside(build):
    import machine

    machine.enter_namespaces()
    session = UserSession(build, Path(tempfile.mkdtemp()))
    try:
        json.dump(figures_of(session), sys.stdout)
    finally:
        session.machine.stop()


def figures_of(session):
    rows = [("the agent without a replay item, with a keyring", "`secret-tool lookup` of a missing item",
             *session.pair([agent_section.AGENT], status=1), 1.0, "ms")]
    session.store(agent_section.replay_with(DELEGATES))
    rows.append(("`welcomer replay show` from the keyring", "`secret-tool lookup` of the same item",
                 *session.pair([agent_section.TOOL, "replay", "show"], status=0), 1.2, "ms"))
    agent, _ = session.lingering()
    time.sleep(15)  # two services are turned on ten seconds after the others
    rows.append(("proportional memory (PSS) of the lingering agent in a desktop session, ten plug-ins", "goa-daemon, idle",
                 session.proportional_size(agent), session.proportional_size(session.online_accounts), 0.5, "kB"))
    if session.run(LOOK_UP).returncode != 1:
        raise RuntimeError("the agent has not taken the item from the keyring")
    agent.kill()
    agent.wait()
    return rows


if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parents[2] / "tests" / "support"))
    inside(Path(sys.argv[1]))
