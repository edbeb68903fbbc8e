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
    ("min", "binary"): (0, 2520, 680, 23),
    ("min", "xml"): (0, 3970, 1020, 43),
    ("typical", "binary"): (0, 7390, 1400, 65),
    ("typical", "xml"): (1, 16400, 3250, 207),
    ("full", "binary"): (17, 104000, 16600, 1230),
    ("full", "xml"): (27, 248000, 47200, 3600),
    ("fanout", "binary"): (11, 3220000, 691000, 27900),
    ("fanout", "xml"): (31, 8430000, 2170000, 115000),
    ("blob", "binary"): (0, 7440, 1400, 69),
    ("blob", "xml"): (1, 8920000, 1140000, 77400),
    ("unicode", "binary"): (2, 13100, 2140, 128),
    ("unicode", "xml"): (1, 20700, 4530, 273),
    ("lengths", "binary"): (0, 7320, 1390, 72),
    ("lengths", "xml"): (1.3, 16200, 3270, 200),
    ("kinds", "binary"): (2.0, 14200, 2500, 212),
    ("kinds", "xml"): (4.0, 31400, 6180, 494),
    ("some", "binary"): (0.5, 8790, 1640, 112),
    ("some", "xml"): (1.8, 19500, 3910, 264),
    ("order", "binary"): (0, 7490, 1420, 65),
    ("order", "xml"): (1, 16600, 3360, 183),
    ("varied", "binary"): (0.5, 8470, 1580, 117),
    ("varied", "xml"): (1.8, 18900, 3790, 282),
    ("deep", "binary"): (405, 893000, 221000, 5440),
    ("deep", "xml"): (416, 1110000, 277000, 9690),
    ("unknown", "binary"): (2, 754000, 104000, 440),
    ("unknown", "xml"): (16, 2270000, 633000, 20300),
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
