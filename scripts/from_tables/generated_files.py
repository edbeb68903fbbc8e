"""generated_files.py DUMP_TABLES [--check]: generates files of this tree from the records' tables.

Prints the names of files that change. With --check, changes nothing and fails if a file would change.
"""

import json
import pathlib
import sys

from message_model import RECORDS, Model
from message_vectors import Vectors
from record_pages import Page

ROOT = pathlib.Path(__file__).resolve().parents[2]
VECTORS = ROOT / "tests/vectors"


def vector_files(model):
    lines = []
    for about, kind, files, outcome in Vectors(model).entries:
        yield from ((VECTORS / file, content) for file, content in files.items())
        lines.append(json.dumps({"files": list(files), "about": about,
                                 "outputType": RECORDS[kind][1]} | outcome, ensure_ascii=False))
    yield VECTORS / "vectors.json", ("[\n" + ",\n".join(lines) + "\n]\n").encode()


def main():
    sys.setrecursionlimit(10_000)  # for messages that are nested too deep
    model = Model(sys.argv[1])
    page = Page(model.tables)
    wanted = dict(vector_files(model)) | {
        ROOT / "doc/records.md": page.markdown().encode(),
        ROOT / "doc/records.json": page.json().encode()}
    there = {path for path in VECTORS.glob("*/*")} | set(wanted)
    stale = [path for path in sorted(there)
             if not path.exists() or path.read_bytes() != wanted.get(path)]
    for path in stale:
        print(path.relative_to(ROOT))
        if sys.argv[2:] != ["--check"]:
            path.parent.mkdir(parents=True, exist_ok=True)
            path.unlink(missing_ok=True)
            if path in wanted:
                path.write_bytes(wanted[path])
    if stale and sys.argv[2:] == ["--check"]:
        sys.exit("not as the tables are: run scripts/refresh")


if __name__ == "__main__":
    main()
