#!/usr/bin/env python3
"""quick.py GROWTH-PROGRAM: has unpacking become worse in a way that shows on any machine?

Counts allocations and, where there is valgrind, instructions; looks at no clock. Fails when a
message needs more than it is granted below, when refusing it at its end takes more than twice the
instructions of accepting it and those of an exception, when instructions or memory grow faster than
the message, or when allocations come with the number of texts or records.
"""

import math
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile

import growth_table

# message, form: allocations and instructions that it may take. The instructions are what was
# counted last (g++ 12, -O3) and a fifth more; lower them when they have become far too many.
GRANTED = {
    ("min", "binary"): (0, 2_650),
    ("min", "xml"): (0, 3_560),
    ("typical", "binary"): (0, 7_950),
    ("typical", "xml"): (1, 17_100),
    ("full", "binary"): (17, 112_000),
    ("full", "xml"): (27, 248_000),
    ("fanout", "binary"): (11, 3_450_000),
    ("fanout", "xml"): (31, 8_550_000),
    ("blob", "binary"): (0, 8_000),
    ("blob", "xml"): (1, 5_750_000),
    ("unicode", "binary"): (2, 14_100),
    ("unicode", "xml"): (1, 21_000),
}
REFUSED_AT_MOST = 2.0  # against accepted
THROWN = 22_000  # one exception through three frames: about 18,000 were counted
SIZES = (4096, 262144)
# Buffers double: so many allocations for each doubling of a message, and these to begin with.
PER_DOUBLING, AT_FIRST = 6, 12
# These have a list in each of their records; a list is an allocation in each of the two records.
LIST_PER_BYTES = {"nested": 850}


def count(program):
    """The lines that the program prints, each with its instructions if they can be counted."""
    with tempfile.TemporaryDirectory() as folder:
        out = pathlib.Path(folder) / "calls"
        sizes = [str(size) for size in SIZES]
        lines_file = pathlib.Path(folder) / "lines"
        counter = ["valgrind", "--quiet", "--tool=callgrind", "--toggle-collect=measured",
                   "--dump-after=measured", f"--callgrind-out-file={out}"]
        counted = shutil.which(counter[0]) is not None
        with lines_file.open("w", encoding="utf-8") as lines:
            subprocess.run([*(counter if counted else []), program, *sizes], stdout=lines,
                           check=True)
        found = growth_table.read(lines_file)
        if not counted:
            print("No valgrind: instructions are not counted.")
            return found
        for number, line in enumerate(found, 1):
            dump = pathlib.Path(f"{out}.{number}").read_text(encoding="utf-8")
            line["instructions"] = int(re.search(r"^totals: (\d+)", dump, re.MULTILINE)[1])
        return found


def faults(lines):
    accepted = {(line["name"], line["form"]): line for line in lines if line["kind"] == "sample"}
    for line in lines:
        if line["kind"] in ("wrong", "broken") and "instructions" in line:
            decoded = line["instructions"] - THROWN
            ratio = decoded / accepted[line["name"], line["form"]]["instructions"]
            if ratio > REFUSED_AT_MOST:
                yield (f"{line['name']}, {line['form']}, {line['kind']} at its end: {decoded:,} "
                       f"instructions before it throws, {ratio:.2f} times what accepting takes")
    for line in accepted.values():
        allocations, instructions = GRANTED[line["name"], line["form"]]
        for what, most in (("allocations", allocations), ("instructions", instructions)):
            if line.get(what, 0) > most:
                yield f"{line['name']}, {line['form']}: {line[what]:,} {what}, granted {most:,}"
    for (name, form), points in growth_table.curves(lines).items():
        for what in ("instructions", "peak"):
            if what not in points[0]:
                continue
            steep = growth_table.slope([(p["bytes"], p["bytes"] + p[what]) for p in points])
            if steep > growth_table.STEEPEST:
                yield f"{name}, {form}: {what} grow with the message to the power of {steep:.2f}"
        for point in points:
            most = AT_FIRST + PER_DOUBLING * math.log2(point["bytes"] / 1024)
            if name in LIST_PER_BYTES:
                most += 2 * point["bytes"] / LIST_PER_BYTES[name]
            if point["allocations"] > most:
                yield (f"{name}, {form}: {point['allocations']} allocations for "
                       f"{point['bytes']:,} bytes, granted {most:.0f}")


def main():
    lines = count(sys.argv[1])
    for line in lines:
        print(f"{line['kind']:<7}{line['name']:<14}{line['form']:<8}{line['bytes']:>10,} bytes"
              f"{line.get('instructions', 0):>12,} instructions{line['allocations']:>6} allocations"
              f"{line['peak']:>12,} bytes of heap")
    found = list(faults(lines))
    for fault in found:
        print(f"FAULT {fault}", file=sys.stderr)
    sys.exit(1 if found else 0)


if __name__ == "__main__":
    main()
