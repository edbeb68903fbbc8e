#!/usr/bin/env python3
"""growth_table.py GROWTH.jsonl: prints the results of `growth` as a table of doc/performance.md."""

import json
import math
import sys
from collections import defaultdict

STEEPEST = 1.05


def read(path):
    with open(path, encoding="utf-8") as file:
        return [json.loads(line) for line in file]


def slope(points):
    """The slope of the straight line through (log x, log y), by least squares."""
    logs = [(math.log(x), math.log(y)) for x, y in points]
    middle_x = sum(x for x, _ in logs) / len(logs)
    middle_y = sum(y for _, y in logs) / len(logs)
    return (sum((x - middle_x) * (y - middle_y) for x, y in logs)
            / sum((x - middle_x) ** 2 for x, _ in logs))


def curves(lines):
    """Maps (shape, form) to its lines, smallest message first."""
    found = defaultdict(list)
    for line in lines:
        if line["kind"] == "shape":
            found[line["name"], line["form"]].append(line)
    return found


def main():
    lines = read(sys.argv[1])
    print("| shape | format | bytes | slope of time | slope of memory | ns per byte, smallest "
          "and largest | peak heap per byte of the largest |\n|---|---|---|---|---|---|---|")
    for (name, form), points in curves(lines).items():
        first, last = points[0], points[-1]
        # Includes the message's own block, to which slices of it add nothing.
        memory = slope([(p["bytes"], p["bytes"] + p["peak"]) for p in points])
        time = slope([(p["bytes"], p["nanoseconds"]) for p in points])
        mark = " **over**" if max(time, memory) > STEEPEST else ""
        print(f"| {name} | {form.replace('xml', 'XML')} | {first['bytes']:,} – {last['bytes']:,} | {time:.2f}{mark} "
              f"| {memory:.2f} | {first['nanoseconds'] / first['bytes']:.2f}, "
              f"{last['nanoseconds'] / last['bytes']:.2f} | {last['peak'] / last['bytes']:.2f} |")


if __name__ == "__main__":
    main()
