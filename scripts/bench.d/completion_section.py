"""Completing delegates that return at once, from one to a thousand."""

import figures
from log_section import system_log_socket


def measure(build, tables):
    with system_log_socket():
        times = figures.google_benchmark(build / "bench" / "bench-completion", ".")
    rows = []
    for count in (1, 10, 100, 1000):
        ours = times[f"completeDelegates/{count}/real_time"] / 1e6
        peer = times[f"createAndJoinThreads/{count}/real_time"] / 1e6
        rows.append((count, ours, peer))
    tables.ratio("completing 1,000 delegates that return at once", "one thread created and joined per delegate",
                 ours, peer, 1.0, "ms")
    tables.growth("Growth with the number of delegates", ("delegates", "completing, ms", "threads, ms"), rows)
