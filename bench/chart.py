#!/usr/bin/env python3
"""chart.py FOLDER UNPACK.json... -- SERVICE.json...: draws what runs of unpack_bench, and of
service_bench and rpc_bench, measured as the bar charts of doc/performance.md, in FOLDER. A bar with a
limit has it as a line."""

import pathlib
import statistics
import sys

import service_table
import table

UNPACKING = {"unpacking_binary.svg": "binary / protobuf arena", "unpacking_xml.svg": "XML / pugixml DOM"}
ROUND_TRIPS = {
    "in this process": "inProcess/threads:1", "service": "rpc/service",
    "protobuf over pipes": "rpc/protobufOverPipes", "gRPC, Unix socket": "rpc/grpcOverUnixSocket"}
RATES = {
    "in this process": "inProcess/threads:1", "1 thread": "roundTrip/service/threads:1",
    "2 threads": "roundTrip/service/threads:2", "4 threads": "roundTrip/service/threads:4",
    "64 in flight": "pipelined/service/64", "256 in flight": "pipelined/service/256"}
ROW, LEFT, WIDTH = 22, 150, 430  # pixels


def ratios(runs, column):
    """Yields message, ratio and limit, or None if the ratio has no limit."""
    for messages, columns in ((table.MESSAGES, table.COLUMNS), (table.STREAMS, table.STREAM_COLUMNS)):
        measured, against, limits = columns[column]
        for message, limit in zip(messages, limits):
            yield message, statistics.median(table.ratios(runs, message, measured, against)), limit


def line(x, top, bottom, colour, width):
    return (f'<line x1="{x:.1f}" y1="{top}" x2="{x:.1f}" y2="{bottom}" stroke="{colour}" '
            f'stroke-width="{width}"/>')


def svg(title, bars, largest, form="{:.2f}", mark=None):
    """A bar of `bars` is its name, its value and its limit or None. One longer than `largest` is cut
    off. `mark` is a value with a gray line."""
    def across(value):
        return LEFT + WIDTH * min(value, largest) / largest

    height = ROW * (len(bars) + 2)
    yield (f'<svg xmlns="http://www.w3.org/2000/svg" width="{LEFT + WIDTH + 90}" height="{height}" '
           'font-family="sans-serif" font-size="13">')
    yield '<rect width="100%" height="100%" fill="white"/>'
    yield f'<text x="8" y="16">{title}</text>'
    for place, (name, value, limit) in enumerate(bars, 1):
        top = ROW * place + 6
        colour = "#c0504d" if limit and value > limit else "#4f81bd"
        yield f'<text x="{LEFT - 8}" y="{top + 13}" text-anchor="end">{name}</text>'
        yield (f'<rect x="{LEFT}" y="{top}" width="{across(value) - LEFT:.1f}" height="{ROW - 6}" '
               f'fill="{colour}"/>')
        yield f'<text x="{LEFT + WIDTH + 10}" y="{top + 13}">{form.format(value)}</text>'
        if limit:
            yield line(across(limit), top - 2, top + ROW - 4, "black", 2)
    if mark:
        yield line(across(mark), ROW + 2, height - ROW / 2, "gray", 1)
    yield "</svg>"


def main():
    folder, *paths = sys.argv[1:]
    split = paths.index("--")
    runs = [table.times(path) for path in paths[:split]]
    service = service_table.Runs(paths[split + 1:])
    charts = {name: svg(f"Time to unpack: {column} (black line: limit)", list(ratios(runs, column)),
                        2.5, mark=1)
              for name, column in UNPACKING.items()}
    trips = [(name, service.time(run) / 1e3, None) for name, run in ROUND_TRIPS.items()]
    charts["service_latency.svg"] = svg("Microseconds from the bytes of a typical message to its record",
                                        trips, 50, "{:.1f}")
    rates = [(name, 1e6 / service.time(run), None) for name, run in RATES.items()]
    charts["service_throughput.svg"] = svg("Thousands of typical messages a second", rates,
                                           max(rate for _, rate, _ in rates), "{:,.0f}")
    for name, lines in charts.items():
        (pathlib.Path(folder) / name).write_text("\n".join(lines) + "\n", encoding="utf-8")


if __name__ == "__main__":
    main()
