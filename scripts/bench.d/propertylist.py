#!/usr/bin/env python3
"""Times Python's own property-list module on the document of the property-list benchmark.

usage: propertylist.py BENCH_PROGRAM [REPETITIONS]

BENCH_PROGRAM is the built bench-propertylist, which makes the document. Prints JSON: the medians of reading and
writing in milliseconds, and the size of the document in bytes.
"""

import gc
import json
import os
import plistlib
import statistics
import subprocess
import sys
import tempfile
import time


def median_milliseconds(action, repetitions):
    times = []
    for _ in range(repetitions):
        gc.collect()
        start = time.perf_counter()
        result = action()
        times.append((time.perf_counter() - start) * 1000)
        del result
    return statistics.median(times)


def main():
    if len(sys.argv) not in (2, 3):
        sys.exit(__doc__)
    repetitions = int(sys.argv[2]) if len(sys.argv) == 3 else 5
    with tempfile.TemporaryDirectory() as folder:
        path = os.path.join(folder, "document.plist")
        subprocess.run([sys.argv[1], "--write-document=" + path], check=True)
        with open(path, "rb") as file:
            document = file.read()
    value = plistlib.loads(document)
    print(json.dumps({
        "document_bytes": len(document),
        "repetitions": repetitions,
        "plistlib_read_ms": median_milliseconds(lambda: plistlib.loads(document), repetitions),
        "plistlib_write_ms": median_milliseconds(lambda: plistlib.dumps(value), repetitions),
    }, indent=2))


if __name__ == "__main__":
    main()
