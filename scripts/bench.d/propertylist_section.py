"""Reading and writing property lists, beside a general XML parser and Python's own module."""

import json
import subprocess
import sys
from pathlib import Path

import figures

PROGRAM = "bench-propertylist"


def measure(build, tables):
    program = build / "bench" / PROGRAM
    times = figures.google_benchmark(program, "^BM_(Read|Write)XML_", repetitions=5)
    result = subprocess.run([sys.executable, Path(__file__).with_name("propertylist.py"), program], check=True,
                            capture_output=True, text=True)
    python = json.loads(result.stdout)
    read, write = times["BM_ReadXML_Welcomer"] / 1e6, times["BM_WriteXML_Welcomer"] / 1e6
    tables.ratio("reading a 10 MB XML property list", "pugixml parsing it and building the same values", read,
                 times["BM_ReadXML_Pugixml"] / 1e6, 1.0, "ms")
    tables.ratio("reading it", "Python's own property-list module", read, python["plistlib_read_ms"], 0.1, "ms")
    tables.ratio("writing it", "Python's own property-list module", write, python["plistlib_write_ms"], 0.1, "ms")
