"""tests/vectors/ through vesk-unpack and through the unpackers without a sandbox, and the pages that
are generated from the tables.

    vectors_test.py TOOL SERVICE TEST_SERVER DUMP_TABLES [unittest arguments]
"""

import base64
import json
import os
import pathlib
import re
import struct
import subprocess
import sys
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[1]
sys.path += [str(ROOT / folder) for folder in ("examples/python", "scripts/from_tables")]
import ironmoat  # noqa: E402
import message_model  # noqa: E402

VECTORS = ROOT / "tests/vectors"
ENTRIES = json.loads((VECTORS / "vectors.json").read_text())
RECORDS = json.loads((ROOT / "doc/records.json").read_text())["records"]
LIMITS = dict(zip(ironmoat.LIMITS, (16 << 20, 64 << 20, 64 << 20, 144 << 20, 512)))
SANITIZED = 0b10_0000_1010  # the parts of the sandbox that a service built with a sanitizer has
TOOL = SERVICE = TEST_SERVER = DUMP_TABLES = None


RESPONSE, PAYLOAD = "VeskCommandResponse", "DrelUserPayload"
REFUSAL = struct.pack("<BBQHs", 1, 2, 2**64 - 1, 1, b"c")
# A payload of required fields only: its command, and lists, the first of them of payloads.
FIELDS = RECORDS[PAYLOAD]["fields"]
ALWAYS = sum(1 << place for place, field in enumerate(FIELDS) if not field["optional"])
HEAD = ALWAYS.to_bytes((len(FIELDS) + 7) // 8, "little") + bytes(8)
LISTS = sum(field["type"].startswith("List") and not field["optional"] for field in FIELDS)


def nested_payloads(levels):
    """The body of a reply."""
    nested = HEAD + bytes(4 * LISTS)
    for _ in range(levels - 1):
        nested = HEAD + struct.pack("<I", 1) + nested + bytes(4 * (LISTS - 1))
    return b"\0" + nested


# Bodies of replies that violate the protocol: {violation, output type, body}.
LIES = (
    ("unknown status", RESPONSE, b"\x04"),
    ("unknown kind", RESPONSE, b"\1\x07" + REFUSAL[2:]),
    ("path beyond the end", RESPONSE, REFUSAL[:-1]),
    ("zero byte in a sentence", RESPONSE, REFUSAL + b"a\0"),
    ("no UTF-8 in a sentence", RESPONSE, b"\3\xff"),
    ("required field missing", RESPONSE, b"\0\0\0"),
    ("unused presence bit", RESPONSE, b"\0\x01\x20" + bytes(8)),
    ("Bool of 2", RESPONSE, b"\0\x41\0" + bytes(8) + b"\2"),
    ("text beyond the end", RESPONSE, b"\0\x01\1" + bytes(8) + struct.pack("<I", 1)),
    ("no UTF-8 in a record", RESPONSE, b"\0\x01\1" + bytes(8) + struct.pack("<I", 1) + b"\xff"),
    ("bytes behind the record", RESPONSE, b"\0\x01\0" + bytes(8) + b"\0"),
    ("a list of everything", PAYLOAD, b"\0" + HEAD + b"\xff" * 4 + bytes(64)),
    ("a list that takes too much memory", PAYLOAD,
     b"\0" + HEAD + struct.pack("<I", 28_150) + bytes(28_150)),
    ("nested too deep", PAYLOAD, nested_payloads(513)))


def outcome(entry):
    return {"record": entry["record"]} if "record" in entry else {"error": entry["error"]}


def comparable(record_or_error, entry):
    """Without what the vector does not say about an error."""
    error = record_or_error.get("error")
    return {"error": {name: error.get(name) for name in entry["error"]}} \
        if error and "error" in entry else record_or_error


def shown(answer):
    """An outcome of the Python client in the shape of vectors.json."""
    if isinstance(answer, dict):
        return {"record": json.loads(json.dumps(
            answer, default=lambda data: base64.b64encode(data).decode()))}
    if isinstance(answer, ironmoat.NoAnswer):
        return {"failure": str(answer)}
    error = vars(answer) | {"message": str(answer)}
    return {"error": {name: value for name, value in error.items() if value is not None}}


class Vectors(unittest.TestCase):
    maxDiff = 2000

    def test_generated_pages_are_up_to_date(self):
        subprocess.run([sys.executable, ROOT / "scripts/from_tables/generated_files.py", DUMP_TABLES, "--check"],
                       check=True)

    def test_tool_prints_their_outcomes(self):
        for kind, (_, output_type) in message_model.RECORDS.items():
            files = {file: entry for entry in ENTRIES if entry["outputType"] == output_type
                     for file in entry["files"]}
            result = subprocess.run([TOOL, "--type", kind, "--format", "json", *files], cwd=VECTORS,
                                    stdout=subprocess.PIPE)
            lines = list(map(json.loads, result.stdout.splitlines()))
            self.assertEqual([line["file"] for line in lines], list(files))
            for line in lines:
                entry = files[line.pop("file")]
                with self.subTest(entry["about"]):
                    self.assertEqual(comparable(line, entry), outcome(entry))


class Answers(unittest.TestCase):
    """The replies of the program `answers`, in an emulator if the build is for one."""

    def test_are_those_of_the_vectors(self):
        asked = [(entry, file) for entry in ENTRIES for file in entry["files"]]
        requests = b""
        for number, (entry, file) in enumerate(asked):
            name = entry["outputType"].encode()
            body = struct.pack("<QB", number, len(name)) + name + (VECTORS / file).read_bytes()
            requests += struct.pack("<I", len(body)) + body
        program = pathlib.Path(TEST_SERVER).parent / "answers"
        result = subprocess.run([*os.environ.get("EMULATOR", "").split(), program], input=requests,
                                stdout=subprocess.PIPE, check=True)
        for (entry, file), body in zip(asked, split(result.stdout), strict=True):
            with self.subTest(file):
                answer = ironmoat.Reply(body, RECORDS, LIMITS).outcome(entry["outputType"])
                self.assertEqual(comparable(shown(answer), entry), outcome(entry))


class FramesPage(unittest.TestCase):
    def test_shows_an_exchange_that_the_service_repeats(self):
        """Apart from the bits of the sandbox, which depend on the machine."""
        page = (ROOT / "doc/protocol.md").read_text()
        lines = re.findall(r"^([<>]) ((?:[0-9a-f]{2} )+)", page, re.MULTILINE)
        sent, received = (bytes.fromhex("".join(line for sign, line in lines if sign == wanted))
                          for wanted in "><")
        result = subprocess.run([SERVICE], input=sent, stdout=subprocess.PIPE, check=True)
        self.assertEqual(frames(result.stdout), frames(received))


def split(stream):
    """The frames' bodies."""
    bodies = []
    while stream:
        end = 4 + int.from_bytes(stream[:4], "little")
        bodies.append(stream[4:end])
        stream = stream[end:]
    return bodies


def frames(stream):
    """The hello without the bits of the sandbox, and the replies."""
    hello, *replies = split(stream)
    return [hello[:10] + hello[14:], *replies]


if __name__ == "__main__":
    TOOL, SERVICE, TEST_SERVER, DUMP_TABLES = map(os.path.abspath, sys.argv[1:5])
    unittest.main(argv=sys.argv[:1] + sys.argv[5:])
