#!/usr/bin/env python3
"""table.py UNPACK.json...: prints the ratios of runs of unpack_bench as the tables of
doc/performance.md.

The ratio of a run divides the medians of two CPU times over its repetitions. CPU time varies less than
wall time on a busy machine. A cell holds the median of the runs' ratios; if it has a limit, their
range, too.
"""

import json
import statistics
import sys

MESSAGES = ["min", "typical", "full", "fanout", "blob", "unicode"]
STREAMS = ["lengths", "kinds", "some", "order", "varied", "deep", "unknown"]
STREAM_LIMITS = {
    "binary / protobuf arena": [0.9, 0.9, 0.9, 1.0, 1.0, 1.4, 0.9],
    "XML / pugixml DOM": [1.25, 1.25, 1.25, 1.25, 1.25, None, 0.75],
}

# Column to (measured, against, limit for each message).
COLUMNS = {
    "binary / protobuf arena": ("binary/unpack", "protobuf_arena", [1.15, 1.0, 0.85, 0.8, 1.1, 1.3]),
    "XML / expat events": ("xml/unpack", "expat", [0.15, 0.25, 0.25, 0.33, 0.2, 0.3]),
    "XML / pugixml DOM": ("xml/unpack", "pugixml", [1.25, 1.15, 1.15, 1.2, 0.8, 1.4]),
    "wrong field / accepted: binary": ("binary/wrong", "binary/unpack", [2.0] * 6),
    "wrong field: XML": ("xml/wrong", "xml/unpack", [2.0] * 6),
    "broken / accepted: binary": ("binary/broken", "binary/unpack", [2.0] * 6),
    "broken: XML": ("xml/broken", "xml/unpack", [2.0] * 6),
    "with the copy: binary / protobuf arena": ("binary/copy_and_unpack", "protobuf_arena", None),
    "XML / pugixml": ("xml/copy_and_unpack", "pugixml", None),
    "binary / protobuf": ("binary/unpack", "protobuf", None),
    "binary / protobuf warm arena": ("binary/unpack", "protobuf_warm_arena", None),
}
STREAM_COLUMNS = {
    name: (measured, against, STREAM_LIMITS.get(name))
    for name, (measured, against, _) in COLUMNS.items() if "wrong" not in name and "broken" not in name
}


def times(path):
    """Maps benchmark names to runs by repetition."""
    found = {}
    with open(path, encoding="utf-8") as file:
        for run in json.load(file)["benchmarks"]:
            if run["run_type"] == "iteration":
                found.setdefault(run["run_name"], {})[run["repetition_index"]] = run
    return found


def median(runs):
    return statistics.median(run["cpu_time"] for run in runs.values())


def human(nanoseconds):
    for unit, size in (("ms", 1e6), ("µs", 1e3)):
        if nanoseconds >= size:
            return f"{nanoseconds / size:.3g} {unit}"
    return f"{nanoseconds:.3g} ns"


def ratios(runs, message, measured, against):
    """The ratio of each run, in order of size."""
    return sorted(median(run[f"{message}/{measured}"]) / median(run[f"{message}/{against}"])
                  for run in runs)


def rows(runs, messages, columns):
    """Prints a row of ratios for each message. Returns how many exceed their limit, and how many have
    one."""
    over = judged = 0
    print("| message | " + " | ".join(columns) + " |")
    print("|---" * (len(columns) + 1) + "|")
    for place, message in enumerate(messages):
        cells = []
        for measured, against, limits in columns.values():
            all_runs = ratios(runs, message, measured, against)
            ratio = statistics.median(all_runs)
            limit = limits and limits[place]
            if not limit:
                cells.append(f"{ratio:.2f}")
                continue
            judged += 1
            over += ratio > limit
            mark = " **over**" if ratio > limit else ""
            cells.append(f"{ratio:.2f} ({all_runs[0]:.2f}–{all_runs[-1]:.2f}; ≤ {limit}){mark}")
        print(f"| {message} | " + " | ".join(cells) + " |")
    return over, judged


def main():
    runs = [times(path) for path in sys.argv[1:]]
    judged = rows(runs, MESSAGES, COLUMNS)
    print("\nThe streams of 2,048 different messages, then `deep` and `unknown`:\n")
    judged += rows(runs, STREAMS, STREAM_COLUMNS)

    kinds = ["binary/unpack", "binary/copy_and_unpack", "xml/unpack", "xml/copy_and_unpack",
             "protobuf_arena", "protobuf_warm_arena", "protobuf", "expat", "pugixml"]
    print("\n| message | bytes: binary, XML, protobuf | " + " | ".join(kinds) + " |")
    print("|---" * (len(kinds) + 2) + "|")
    for message in [*MESSAGES, *STREAMS]:
        sizes = [int(runs[0][f"{message}/{kind}"][0]["bytes"])
                 for kind in ("binary/unpack", "xml/unpack", "protobuf")]
        cells = [human(statistics.median(median(run[f"{message}/{kind}"]) for run in runs))
                 for kind in kinds]
        print(f"| {message} | {', '.join(f'{size:,}' for size in sizes)} | {' | '.join(cells)} |")
    print(f"\n{judged[0] + judged[2]} of the {judged[1] + judged[3]} ratios with a limit exceed it.")


if __name__ == "__main__":
    main()
