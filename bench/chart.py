#!/usr/bin/env python3
"""chart.py UNPACK.json FOLDER: draws the ratios of one run of unpack_bench as bars, each with its limit
as a line, in unpacking_binary.svg and unpacking_xml.svg, for doc/performance.md."""

import pathlib
import sys

import table

CHARTS = {"unpacking_binary.svg": "binary / protobuf arena", "unpacking_xml.svg": "XML / pugixml DOM"}
ROW, LEFT, WIDTH, LARGEST = 22, 90, 480, 2.5  # pixels; a longer bar is cut off at LARGEST


def ratios(found, column):
    """Yields message, ratio and limit, or None if the ratio has no limit."""
    for messages, columns in ((table.MESSAGES, table.COLUMNS), (table.STREAMS, table.STREAM_COLUMNS)):
        measured, against, limits = columns[column]
        for message, limit in zip(messages, limits):
            yield (message, table.median(found[f"{message}/{measured}"]) /
                   table.median(found[f"{message}/{against}"]), limit)


def across(ratio):
    return LEFT + WIDTH * min(ratio, LARGEST) / LARGEST


def line(ratio, top, bottom, colour, width):
    return (f'<line x1="{across(ratio):.1f}" y1="{top}" x2="{across(ratio):.1f}" y2="{bottom}" '
            f'stroke="{colour}" stroke-width="{width}"/>')


def svg(title, found, column):
    rows = list(ratios(found, column))
    height = ROW * (len(rows) + 2)
    yield (f'<svg xmlns="http://www.w3.org/2000/svg" width="{LEFT + WIDTH + 60}" height="{height}" '
           'font-family="sans-serif" font-size="13">')
    yield '<rect width="100%" height="100%" fill="white"/>'
    yield f'<text x="8" y="16">{title} (black line: limit)</text>'
    for place, (message, ratio, limit) in enumerate(rows, 1):
        top = ROW * place + 6
        colour = "#c0504d" if limit and ratio > limit else "#4f81bd"
        yield f'<text x="{LEFT - 8}" y="{top + 13}" text-anchor="end">{message}</text>'
        yield (f'<rect x="{LEFT}" y="{top}" width="{across(ratio) - LEFT:.1f}" height="{ROW - 6}" '
               f'fill="{colour}"/>')
        yield f'<text x="{LEFT + WIDTH + 10}" y="{top + 13}">{ratio:.2f}</text>'
        if limit:
            yield line(limit, top - 2, top + ROW - 4, "black", 2)
    yield line(1, ROW + 2, height - ROW / 2, "gray", 1)
    yield "</svg>"


def main():
    found = table.times(sys.argv[1])
    for name, column in CHARTS.items():
        text = "\n".join(svg(f"Time to unpack: {column}", found, column)) + "\n"
        (pathlib.Path(sys.argv[2]) / name).write_text(text, encoding="utf-8")


if __name__ == "__main__":
    main()
