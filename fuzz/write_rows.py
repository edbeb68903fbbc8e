"""write_rows.py ROWS FOLDER: writes each message of a file of rows to a file of its own."""

import pathlib
import re
import sys

rows, folder = map(pathlib.Path, sys.argv[1:])
folder.mkdir(parents=True, exist_ok=True)
for number, row in enumerate(rows.read_bytes().splitlines()):
    message = row.partition(b"\t")[2]
    (folder / f"row-{number}").write_bytes(
        re.sub(rb"\\x(..)", lambda byte: bytes.fromhex(byte[1].decode()), message))
