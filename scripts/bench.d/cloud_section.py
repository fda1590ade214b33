"""The cloud services: enabling after login, the account request, and the sign-in."""

import json
import subprocess

import figures

# How long one slice of the run loop lasts at most while a sign-in is waited for.
SLICE_MICROSECONDS = 100_000


def measure(build, tables):
    program = build / "bench" / "bench-cloud"
    times = figures.google_benchmark(program, "^(postLoginStage|tenBareWrites|buildRequest|signIn)")
    tables.ratio("the post-login phase for one account", "ten bare, synced writes of the account file",
                 times["postLoginStage/manual_time"] / 1e3, times["tenBareWrites/manual_time"] / 1e3, 1.5, "us")
    sign_in = times["signInAnsweredAtOnce/real_time"] / 1e3
    tables.ratio("a sign-in that is answered at once", "one slice of the run loop", sign_in, SLICE_MICROSECONDS, 1.0,
                 "us")
    result = subprocess.run([program, "--benchmark_filter=^signIn", "--benchmark_format=json"], check=True,
                            capture_output=True, text=True)
    slices = int(json.loads(result.stdout)["benchmarks"][0]["slices"])
    tables.count("slices that it turns", slices, 1)
    counts = (1, 10, 100, 1000)
    rows = [(count, times[f"buildRequest/{count}"] / 1e3, times[f"buildRequest/{count}"] / count) for count in counts]
    tables.growth("Growth of the account request", ("plug-ins", "building, us", "per plug-in, ns"), rows)
