"""The cloud services: enabling after login, the account request, and the sign-in."""

import json
import subprocess

import figures

# How long one slice of the run loop lasts at most while a sign-in is waited for.
SLICE_MICROSECONDS = 100_000


def counters(program, name):
    result = subprocess.run([program, f"--benchmark_filter=^{name}", "--benchmark_format=json"], check=True,
                            capture_output=True, text=True)
    run = json.loads(result.stdout)["benchmarks"][0]
    if run.get("error_occurred"):
        raise RuntimeError(f"{name}: {run['error_message']}")
    return run


def measure(build, tables):
    program = build / "bench" / "bench-cloud"
    stage = counters(program, "postLoginStage")
    tables.ratio("the post-login phase for one account", "ten bare, synced writes of the account file",
                 stage["ours_us"], stage["peer_us"], 1.5, "us")
    sign_in = counters(program, "signInAnsweredAtOnce")
    tables.ratio("a sign-in that is answered at once", "one slice of the run loop", sign_in["real_time"],
                 SLICE_MICROSECONDS, 1.0, "us")
    tables.count("slices that it turns", int(sign_in["slices"]), 1)
    hashed = counters(program, "signInAndItsHash")
    tables.ratio("a sign-in with a password of `welcomer account add`", "computing that password's hash",
                 hashed["ours_us"], hashed["peer_us"], 1.5, "us")
    tables.count("slices that it turns after its answer", int(hashed["slices_too_many"]), 0)
    times = figures.google_benchmark(program, "^buildRequest")
    counts = (1, 10, 100, 1000)
    rows = [(count, times[f"buildRequest/{count}"] / 1e3, times[f"buildRequest/{count}"] / count) for count in counts]
    tables.growth("Growth of the account request", ("plug-ins", "building, us", "per plug-in, ns"), rows)
