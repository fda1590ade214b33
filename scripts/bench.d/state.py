#!/usr/bin/env python3
"""Times the per-user record against plain files, and `welcomer switch select` against a shell script.

usage: state.py BUILD_FOLDER [ROUNDS]

Prints JSON: the medians, their ratios, and for most of them the ratio that must not be exceeded. Everything happens in temporary
folders. The switch needs the superuser; without that its part is left out. Exits 1 when a ratio is exceeded.
"""

import json
import os
import statistics
import subprocess
import sys
import tempfile
import time

import figures

ENVIRONMENTS = {"Nimbus1": "192.0.2.1", "Q1": "198.51.100.1"}

# The same file operations as the command: look at the last domain's override, remove the folder, make it, write four.
SCRIPT = """
resolver=$1/etc/resolver
nameserver=$2
if [ -r "$resolver/online.example" ]; then
    current=$(sed -n 's/^.*nameserver //p' "$resolver/online.example")
fi
[ "$current" = "$nameserver" ] && exit
rm -rf "$resolver"
for domain in configuration.nimbus.example services.nimbus.example nimbus.example online.example; do
    [ -d "$resolver" ] || mkdir "$resolver"
    printf '# Switch override for Nimbus\\ndomain %s\\nnameserver %s\\n' "$domain" "$nameserver" \\
        > "$resolver/$domain"
done
"""


def record_medians(build, rounds):
    pairs = figures.google_benchmark_pairs(os.path.join(build, "bench/bench-state"), ".", rounds)
    return {name: {"median_us": ours / 1e3, "peer_us": peer / 1e3} for name, (ours, peer) in pairs.items()}


def switch_medians(build, rounds):
    times = {"tool": [], "script": []}
    with tempfile.TemporaryDirectory() as folder:
        script = os.path.join(folder, "switch.sh")
        with open(script, "w") as file:
            file.write(SCRIPT)
        for round_number in range(rounds):
            for name, address in ENVIRONMENTS.items():
                commands = {"tool": [os.path.join(build, "bin/welcomer"), "--root", folder + "/tool", "switch",
                                     "select", name],
                            "script": ["/bin/sh", script, folder + "/script", address]}
                for kind, command in commands.items():
                    os.makedirs(f"{folder}/{kind}/etc", exist_ok=True)
                    start = time.perf_counter()
                    subprocess.run(command, check=True, stdout=subprocess.DEVNULL)
                    times[kind].append((time.perf_counter() - start) * 1e6)
                    resolver = f"{folder}/{kind}/etc/resolver"
                    written = {each: open(os.path.join(resolver, each)).read() for each in os.listdir(resolver)}
                    assert len(written) == 4 and all(address in text for text in written.values()), written
    return {kind: statistics.median(each) for kind, each in times.items()}


def main():
    if len(sys.argv) not in (2, 3):
        sys.exit(__doc__)
    build = sys.argv[1]
    rounds = int(sys.argv[2]) if len(sys.argv) == 3 else 40
    record = record_medians(build, rounds)
    results = {
        "writeToDefaults": {**record["writeToDefaults"], "maximum_ratio": 1.5},
        "loadRecord": {**record["loadRecord"], "maximum_ratio": 1.2},
        "loadChangedRecord": {**record["loadChangedRecord"], "maximum_ratio": 1.2},
    }
    if os.geteuid() == 0:
        switch = switch_medians(build, rounds)
        results["switchSelect"] = {"median_us": switch["tool"], "peer_us": switch["script"], "maximum_ratio": 0.5}
    for result in results.values():
        result["ratio"] = result["median_us"] / result["peer_us"]
    print(json.dumps(results, indent=2))
    sys.exit(any(result["ratio"] > result.get("maximum_ratio", float("inf")) for result in results.values()))


if __name__ == "__main__":
    main()
