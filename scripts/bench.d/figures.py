"""Rows, tables and ways of measuring that the sections share."""

import json
import statistics
import subprocess
import time

DOCUMENT_HEAD = """# Benchmarks

Ratios of medians, each from one run of `scripts/bench --write`, turn about with the named peer, so that a slow machine
slows both. Smaller is better. Last run: {machine}.

"""


class Tables:
    """What was measured: one table of ratios against targets, and tables of growth."""

    def __init__(self):
        self._rows = []
        self._growth = []

    def ratio(self, what, against, value, peer, target, unit):
        """A figure and its peer's, in the same unit, and the most that their ratio should be."""
        self._rows.append((what, against, f"{_number(value)} {unit}", f"{_number(peer)} {unit}", value / peer, target))

    def count(self, what, value, target):
        """A count that should be at most the target, with no peer to divide by."""
        self._rows.append((what, "none", _number(value), "", float(value), target))

    def growth(self, title, heads, rows):
        self._growth.append((title, heads, rows))

    def missed(self):
        return sum(1 for row in self._rows if row[4] > row[5])

    def markdown(self):
        lines = ["| what | against | ours | peer | ratio | target | |", "|---|---|---|---|---|---|---|"]
        for what, against, value, peer, ratio, target in self._rows:
            verdict = "met" if ratio <= target else "**missed**"
            lines.append(f"| {what} | {against} | {value} | {peer} | {ratio:.2f} | at most {target:g} | {verdict} |")
        if not self._rows:
            lines = []
        for title, heads, rows in self._growth:
            lines += ["", f"## {title}", "", "| " + " | ".join(heads) + " |", "|" + "---|" * len(heads)]
            lines += ["| " + " | ".join(map(_number, row)) + " |" for row in rows]
        return "\n".join(lines)


def _number(value):
    if isinstance(value, float):
        return f"{value:.3g}" if abs(value) < 1000 else f"{value:,.0f}"
    return f"{value:,}" if isinstance(value, int) else str(value)


def google_benchmark(program, name_filter, repetitions=9):
    """Median real times in nanoseconds by benchmark name, the benchmarks run in random turn."""
    return {name: ours for name, (ours, _) in google_benchmark_pairs(program, name_filter, repetitions).items()}


def google_benchmark_pairs(program, name_filter, repetitions=9):
    """The same, each with the median of the peer that it takes turns with, or None where it has none."""
    result = subprocess.run(
        [program, f"--benchmark_filter={name_filter}", f"--benchmark_repetitions={repetitions}",
         "--benchmark_enable_random_interleaving=true", "--benchmark_min_time=0.05", "--benchmark_format=json"],
        check=True, capture_output=True, text=True)
    scale = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}
    return {run["run_name"].removesuffix("/manual_time"): (run["real_time"] * scale[run["time_unit"]], run.get("peer_ns"))
            for run in json.loads(result.stdout)["benchmarks"]
            if run.get("run_type") == "aggregate" and run["aggregate_name"] == "median"}


def timed(command):
    """How long a command takes as a whole process, in ms; it has to succeed."""
    start = time.perf_counter()
    subprocess.run(command, check=True, stdout=subprocess.DEVNULL)
    return (time.perf_counter() - start) * 1e3


def turn_about(first, second, rounds):
    """Medians of two measurements that are taken turn about, after one of each that does not count."""
    first(), second()
    ours, peers = [], []
    for _ in range(rounds):
        ours.append(first())
        peers.append(second())
    return statistics.median(ours), statistics.median(peers)
