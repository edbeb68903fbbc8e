#!/usr/bin/env python3
"""quick.py GROWTH-PROGRAM: has unpacking become worse in a way that shows on any machine?

Counts allocations and, where there is valgrind, instructions, branches and, as a simple processor
would, mispredictions; looks at no clock. Fails when a message needs more than it is granted below,
when refusing it at its end takes more than twice the instructions of accepting it and those of an
exception, when instructions or memory grow faster than the message, or when allocations come with
the number of texts or records.
"""

import math
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile

import growth_table

COUNTS = ("allocations", "instructions", "branches", "mispredictions")
# message, form: what one message may take of each, on average over a stream. It is what was counted
# last (g++ 12, -O3) and a tenth more; of mispredictions a quarter, for they depend on where in
# memory the branches lie. Lower them when they have become far too many: `quick.py GROWTH-PROGRAM
# grant` prints them anew.
GRANTED = {
    ("min", "binary"): (0, 2470, 603, 9),
    ("min", "xml"): (0, 3930, 940, 37),
    ("typical", "binary"): (0, 7310, 1310, 68),
    ("typical", "xml"): (1, 15500, 3010, 187),
    ("full", "binary"): (17, 103000, 16400, 1130),
    ("full", "xml"): (27, 232000, 43800, 3160),
    ("fanout", "binary"): (11, 3200000, 647000, 28500),
    ("fanout", "xml"): (31, 8090000, 2060000, 100000),
    ("blob", "binary"): (0, 7360, 1320, 64),
    ("blob", "xml"): (1, 7610000, 746000, 25900),
    ("unicode", "binary"): (2, 13100, 2050, 128),
    ("unicode", "xml"): (1, 20100, 4330, 255),
    ("lengths", "binary"): (0, 7250, 1300, 67),
    ("lengths", "xml"): (1.3, 15600, 3060, 187),
    ("kinds", "binary"): (2.0, 14300, 2400, 193),
    ("kinds", "xml"): (4.0, 29800, 5760, 442),
    ("some", "binary"): (0.5, 8730, 1540, 103),
    ("some", "xml"): (1.8, 18500, 3630, 239),
    ("order", "binary"): (0, 7420, 1330, 63),
    ("order", "xml"): (1, 15800, 3120, 169),
    ("varied", "binary"): (0.5, 8410, 1490, 104),
    ("varied", "xml"): (1.8, 18100, 3550, 252),
    ("deep", "binary"): (405, 890000, 206000, 5920),
    ("deep", "xml"): (416, 1100000, 261000, 9830),
    ("unknown", "binary"): (2, 757000, 108000, 439),
    ("unknown", "xml"): (16, 2270000, 636000, 16100),
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
        counter = ["valgrind", "--quiet", "--tool=callgrind", "--branch-sim=yes",
                   "--toggle-collect=measured", "--dump-after=measured",
                   f"--callgrind-out-file={out}"]
        counted = shutil.which(counter[0]) is not None
        with lines_file.open("w", encoding="utf-8") as lines:
            subprocess.run([*(counter if counted else []), program, *sizes], stdout=lines,
                           check=True)
        found = growth_table.read(lines_file)
        if not counted:
            print("No valgrind: only allocations are counted.")
            return found
        for number, line in enumerate(found, 1):
            dump = pathlib.Path(f"{out}.{number}").read_text(encoding="utf-8")
            events, totals = (re.search(rf"^{what}: (.*)", dump, re.MULTILINE)[1].split()
                              for what in ("events", "totals"))
            # callgrind leaves out what is 0 at the end.
            of = dict(zip(events, map(int, totals + ["0"] * len(events))))
            for what, parts in (("instructions", ("Ir",)), ("branches", ("Bc", "Bi")),
                                ("mispredictions", ("Bcm", "Bim"))):
                line[what] = round(sum(of[part] for part in parts) / line["messages"])
        return found


def number(value):
    return f"{value:,.3g}" if value < 10 else f"{round(value):,}"


def faults(lines):
    accepted = {(line["name"], line["form"]): line for line in lines
                if line["kind"] in ("sample", "stream")}
    for line in lines:
        if line["kind"] in ("wrong", "broken") and "instructions" in line:
            decoded = line["instructions"] - THROWN
            ratio = decoded / accepted[line["name"], line["form"]]["instructions"]
            if ratio > REFUSED_AT_MOST:
                yield (f"{line['name']}, {line['form']}, {line['kind']} at its end: {decoded:,} "
                       f"instructions before it throws, {ratio:.2f} times what accepting takes")
    for line in accepted.values():
        for what, most in zip(COUNTS, GRANTED[line["name"], line["form"]]):
            if line.get(what, 0) > most:
                yield f"{line['name']}, {line['form']}: {number(line[what])} {what}, granted {most:,}"
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


def grants(lines):
    """The table above as it would be now."""
    for line in lines:
        if line["kind"] in ("sample", "stream"):
            mean = line["allocations"]
            counts = [round(mean) if mean == round(mean) else math.ceil(mean * 12) / 10]
            for what in COUNTS[1:]:
                exact = line[what] * (1.25 if what == "mispredictions" else 1.1)
                unit = 10 ** max(0, math.floor(math.log10(exact)) - 2)
                counts.append(math.ceil(exact / unit) * unit)
            print(f"    {line['name'], line['form']}: ({', '.join(map(str, counts))}),"
                  .replace("'", '"'))


def main():
    lines = count(sys.argv[1])
    if sys.argv[2:] == ["grant"]:
        return grants(lines)
    print(f"| one message | form | bytes | {' | '.join(COUNTS)} | most heap, bytes |")
    print("|---" * (len(COUNTS) + 4) + "|")
    for line in lines:
        if line["kind"] in ("sample", "stream"):
            cells = [number(line.get(what, 0)) for what in ("bytes", *COUNTS, "peak")]
            print(f"| {line['name']} | {line['form']} | {' | '.join(cells)} |")
    found = list(faults(lines))
    for fault in found:
        print(f"FAULT {fault}", file=sys.stderr)
    sys.exit(1 if found else 0)


if __name__ == "__main__":
    main()
