"""Provokes what doc/operations.md explains: each message must be in its table of messages.

    troubleshooting_test.py VESK_UNPACK SERVICE FAKE_START
"""

import os
import pathlib
import re
import resource
import shutil
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parents[1]
TOOL, SERVICE, FAKE_START = (os.path.abspath(path) for path in sys.argv[1:4])
TABLE = (ROOT / "doc/operations.md").read_text().split("| message |")[1].split("\n\n")[0]
ROWS = re.findall(r"^\| `([^`]*)`", TABLE, re.MULTILINE)


def row_of(words):
    fitting = [row for row in ROWS if re.search(".+".join(map(re.escape, row.split("..."))), words)]
    return fitting[0] if fitting else sys.exit(f"not in the table: {words}")


def message(*arguments, tool=TOOL, **options):
    result = subprocess.run([tool, *arguments, "-"], input="<plist/>", text=True, timeout=60,
                            stderr=subprocess.PIPE, **options)
    return result.stderr.removeprefix("vesk-unpack: ")


def provoked(folder):
    yield message("--service", "/nonexistent")
    yield message("--service", "/etc/passwd")
    yield message(preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_NOFILE, (7, 7)))
    for start in ("hello smaller", "exit 65"):
        program = folder / start
        program.symlink_to(FAKE_START)
        yield message("--service", program)
    dying = folder / "dies"
    dying.write_text("#!/bin/sh\nkill -SYS $$\n")
    dying.chmod(0o755)
    yield message("--service", dying)
    lacking = folder / "lacks_a_library"
    lacking.write_text("#!/bin/sh\nexit 127\n")
    lacking.chmod(0o755)
    yield message("--service", lacking)
    for program in (TOOL, SERVICE):
        shutil.copy(program, folder)
    folder.chmod(0o777)
    yield message(tool=folder / "vesk-unpack")


def main():
    with tempfile.TemporaryDirectory() as folder:
        found = {row_of(words) for words in provoked(pathlib.Path(folder))}
    # One needs a user who may start no process, the other takes ten seconds.
    left = [row for row in ROWS if row not in found and not re.search("temporarily|no hello", row)]
    sys.exit(f"never printed: {left}" if left else 0)


if __name__ == "__main__":
    main()
