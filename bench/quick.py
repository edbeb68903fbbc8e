#!/usr/bin/env python3
"""quick.py GROWTH-PROGRAM [grant]: checks costs of unpacking that are the same on any machine.

Counts allocations and, with valgrind, instructions, branches and the mispredictions of a simple
processor. Fails if
- a count for one message exceeds its limit below,
- rejecting a message at its end takes more than twice the instructions of accepting it, without those
  of one exception,
- instructions or memory grow faster than the message, or
- allocations grow with the number of texts, payloads or lists.

With `grant`, prints limits from the counts of this run instead.
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
# Limits for one message, on average over a stream, by message and form: the last counts (g++ 12, -O3)
# plus 10 %, for mispredictions plus 25 %, because these depend on the addresses of branches. If counts
# have fallen far below, replace them by what `grant` prints.
GRANTED = {
    ("min", "binary"): (0, 1670, 215, 15),
    ("min", "xml"): (0, 3110, 550, 30),
    ("typical", "binary"): (1, 6850, 951, 55),
    ("typical", "xml"): (2, 15100, 2670, 174),
    ("full", "binary"): (8, 93100, 13700, 893),
    ("full", "xml"): (18, 224000, 41500, 3000),
    ("fanout", "binary"): (21, 2840000, 447000, 21200),
    ("fanout", "xml"): (41, 7750000, 1850000, 101000),
    ("blob", "binary"): (1, 6900, 956, 63),
    ("blob", "xml"): (2, 7610000, 746000, 25900),
    ("unicode", "binary"): (3, 12700, 1730, 120),
    ("unicode", "xml"): (2, 19600, 4000, 248),
    ("lengths", "binary"): (1, 6790, 941, 54),
    ("lengths", "xml"): (2.5, 15100, 2720, 177),
    ("kinds", "binary"): (3.1, 12800, 1820, 157),
    ("kinds", "xml"): (5.1, 28400, 5200, 402),
    ("some", "binary"): (1.7, 8140, 1150, 77),
    ("some", "xml"): (3.0, 17900, 3260, 218),
    ("order", "binary"): (1, 6960, 972, 48),
    ("order", "xml"): (2, 15300, 2780, 162),
    ("varied", "binary"): (1.7, 7850, 1100, 83),
    ("varied", "xml"): (3.0, 17600, 3180, 232),
    ("deep", "binary"): (25, 483000, 74200, 2220),
    ("deep", "xml"): (36, 692000, 130000, 6840),
    ("unknown", "binary"): (3, 683000, 92300, 403),
    ("unknown", "xml"): (17, 2190000, 621000, 16000),
}
REFUSED_AT_MOST = 2.0  # times accepted
THROWN = 22_000  # instructions; one exception through three frames takes about 18,000
SIZES = (4096, 262144)
# Allocations for each doubling of a message, because buffers double, and for the smallest message.
PER_DOUBLING, AT_FIRST = 6, 12


def count(program):
    """The lines that the program prints, with instruction counts if valgrind is installed."""
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
            print("valgrind not found: counting allocations only")
            return found
        for number, line in enumerate(found, 1):
            dump = pathlib.Path(f"{out}.{number}").read_text(encoding="utf-8")
            events, totals = (re.search(rf"^{what}: (.*)", dump, re.MULTILINE)[1].split()
                              for what in ("events", "totals"))
            # callgrind omits trailing zeros.
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
                yield (f"{line['name']}, {line['form']}, {line['kind']}: rejecting takes {decoded:,} "
                       f"instructions without the exception, {ratio:.2f} times as many as accepting")
    for line in accepted.values():
        for what, most in zip(COUNTS, GRANTED[line["name"], line["form"]]):
            if line.get(what, 0) > most:
                yield f"{line['name']}, {line['form']}: {number(line[what])} {what} exceed the limit of {most:,}"
    for (name, form), points in growth_table.curves(lines).items():
        for what in ("instructions", "peak"):
            if what not in points[0]:
                continue
            steep = growth_table.slope([(p["bytes"], p["bytes"] + p[what]) for p in points])
            if steep > growth_table.STEEPEST:
                yield f"{name}, {form}: {what}: slope {steep:.2f} exceeds the limit of {growth_table.STEEPEST}"
        for point in points:
            most = AT_FIRST + PER_DOUBLING * math.log2(point["bytes"] / 1024)
            if point["allocations"] > most:
                yield (f"{name}, {form}: {point['allocations']} allocations for "
                       f"{point['bytes']:,} bytes exceed the limit of {most:.0f}")


def grants(lines):
    """Prints GRANTED from the counts of this run."""
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
    print(f"| message | format | bytes | {' | '.join(COUNTS)} | peak heap, bytes |")
    print("|---" * (len(COUNTS) + 4) + "|")
    for line in lines:
        if line["kind"] in ("sample", "stream"):
            cells = [number(line.get(what, 0)) for what in ("bytes", *COUNTS, "peak")]
            print(f"| {line['name']} | {line['form'].replace('xml', 'XML')} | {' | '.join(cells)} |")
    found = list(faults(lines))
    for fault in found:
        print(f"fault: {fault}", file=sys.stderr)
    sys.exit(1 if found else 0)


if __name__ == "__main__":
    main()
