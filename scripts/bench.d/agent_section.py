"""The agent as a whole process: its start without a replay item, its linger, and its growth with the replay data."""

import json
import os
import plistlib
import shutil
import subprocess
import sys
import tempfile
import time
from pathlib import Path

import figures
import plugins_section

TOP = Path(__file__).resolve().parents[2]
AGENT = "/usr/local/libexec/wlnimbussetup"
TOOL = "/usr/local/bin/welcomer"
LIBRARIES = "/usr/local/lib"
BUNDLE = "/usr/local/share/welcomer/setup-bundle"


def measure(build, tables):
    # In a program of its own, since it puts itself into namespaces.
    result = subprocess.run([sys.executable, __file__, str(build)], check=True, stdout=subprocess.PIPE, text=True)
    for kind, arguments in json.loads(result.stdout):
        getattr(tables, kind)(*arguments)


def status_field(status, field):
    text = status.read_text()
    return int(next(line.split()[1] for line in text.splitlines() if line.startswith(field + ":")))


def replay_with(delegates, filler=0):
    replay = {"delegatesResponseDict": {"delegates": {name: {} for name in delegates}}}
    if filler:
        replay["filler"] = os.urandom(filler)
    return plistlib.dumps(replay)


class BenchMachine:
    """A root folder with the installed programs and a real system log."""

    def __init__(self, build, folder, plugin_count=0):
        import machine

        self.machine = machine.Machine(folder)
        self.machine.install(build)
        self._use_loader_cache()
        for name in ("empty-program", "process-pair"):
            shutil.copy(build / "bench" / name, self.machine.root / "tmp" / name)
        if plugin_count:
            plugins_section.make_plugins(build, self.machine.root, plugin_count)
        self.machine.start_system_log()
        self.session = []  # what makes a command one of the user's session, if there is one

    def _use_loader_cache(self):
        """As the packages have it: the loader's cache knows the library, and no program looks for it beside itself."""
        for program in (AGENT, TOOL):
            subprocess.run(["patchelf", "--remove-rpath", self.machine.root / program[1:]], check=True)
        subprocess.run(["ldconfig", "-r", self.machine.root, LIBRARIES], check=True)

    def store(self, replay):
        path = self.machine.root / "tmp" / "replay.plist"
        path.write_bytes(replay)
        path.chmod(0o644)
        agents = self.machine.home / "Library" / "LaunchAgents"
        shutil.rmtree(agents, ignore_errors=True)
        result = self.machine.run([*self.session, TOOL, "replay", "store", "--account", "bench", "--file", "/tmp/replay.plist",
                                   "--bundle", BUNDLE],
                                  user=True, timeout=120)
        if result.returncode:
            raise RuntimeError(result.stderr)

    def status(self, process):
        # The machine's own, since the processes are in a namespace of their own.
        return self.machine.root / "proc" / str(process.pid) / "status"

    def wake_ups(self, process):
        return sum(status_field(task / "status", "voluntary_ctxt_switches")
                   for task in (self.status(process).parent / "task").iterdir())

    def lingering(self):
        """The agent, once it lingers, and how long that took."""
        before = len(self.machine.log_records("wlnimbussetup"))
        start = time.monotonic()
        agent = self.machine.start([*self.session, AGENT], user=True)
        self.machine.wait_for(lambda: any(text == "delaying exit by two minutes" for _, _, text in
                                          self.machine.log_records("wlnimbussetup")[before:]), "the linger", 60)
        return agent, time.monotonic() - start


def inside(build):
    import machine

    machine.enter_namespaces()
    root = Path(tempfile.mkdtemp())
    bench = BenchMachine(build, root, plugin_count=10)
    try:
        json.dump(figures_of(bench), sys.stdout)
    finally:
        bench.machine.stop()


def figures_of(bench):
    found = []
    result = bench.machine.run(["/tmp/process-pair", "300", AGENT, "--", "/tmp/empty-program"], user=True)
    times = json.loads(result.stdout)
    found.append(("ratio", ("the agent without a replay item, whole process",
                            "an empty C++ program, dynamically linked", times["ns"] / 1e6, times["peer_ns"] / 1e6,
                            1.35, "ms")))
    bench.store(replay_with(f"com.corvid.bench.number{n:04d}" for n in range(10)))
    agent, _ = bench.lingering()
    asleep = bench.machine.start(["/tmp/empty-program", "60"], user=True)
    time.sleep(15)  # two services are turned on ten seconds after the others
    before = bench.wake_ups(agent)
    time.sleep(30)
    woken = bench.wake_ups(agent) - before
    memory, peer = (status_field(bench.status(each), "VmRSS") for each in (agent, asleep))
    for process in (agent, asleep):
        process.kill()
        process.wait()
    found.append(("ratio", ("resident memory while lingering, ten plug-ins", "an empty C++ program asleep", memory,
                            peer, 3.0, "kB")))
    found.append(("count", ("wake-ups of the lingering process in 30 seconds", woken, 0)))

    rows = []
    for size in (1_000, 10_000, 100_000, 1_000_000, 10_000_000, 100_000_000):
        bench.store(replay_with([], filler=size * 3 // 4))  # as base64, a third more
        agent, seconds = bench.lingering()
        rows.append((size, seconds * 1e3, status_field(bench.status(agent), "VmHWM"),
                     status_field(bench.status(agent), "VmRSS")))
        agent.kill()
        agent.wait()
    found.append(("growth", ("Growth with the replay data",
                             ("bytes of replay data", "start to linger, ms", "most memory, kB", "lingering, kB"),
                             rows)))
    return found


if __name__ == "__main__":
    sys.path.insert(0, str(TOP / "tests" / "support"))
    inside(Path(sys.argv[1]))
