"""The clients in examples/python, examples/go and examples/rust, the latter two built with types that
are generated from records.json: all test vectors, a service that dies, and one that lies. That in
Python also repeats the exchange of doc/protocol.md.

    languages_test.py python|go|rust BUILD_FOLDER SERVICE TEST_SERVER FAKE_SERVICE

Exits with 77 if there is no compiler.
"""

import base64
import json
import os
import pathlib
import re
import shutil
import struct
import subprocess
import sys
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[1]
sys.path.append(str(ROOT / "examples/python"))
import ironmoat  # noqa: E402

VECTORS = ROOT / "tests/vectors"
RECORDS = json.loads((ROOT / "doc/records.json").read_text())["records"]
SANITIZED = 0b10_0000_1010  # the parts of the sandbox that a service built with a sanitizer has
LANGUAGE, BUILD, SERVICE, TEST_SERVER, FAKE_SERVICE = sys.argv[1], *map(pathlib.Path, sys.argv[2:6])
PROGRAM = BUILD / LANGUAGE / "unpack_messages"

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


def shown(answer):
    """An outcome of the Python client in the shape of vectors.json."""
    if isinstance(answer, dict):
        return {"record": json.loads(json.dumps(
            answer, default=lambda data: base64.b64encode(data).decode()))}
    if isinstance(answer, ironmoat.NoAnswer):
        return {"failure": str(answer)}
    error = vars(answer) | {"message": str(answer)}
    return {"error": {name: value for name, value in error.items() if value is not None}}


def build(compiler):
    folder = BUILD / LANGUAGE
    shutil.rmtree(folder, ignore_errors=True)
    shutil.copytree(ROOT / "examples" / LANGUAGE, folder)
    types = subprocess.run(
        [sys.executable, ROOT / "examples/generate_types.py", LANGUAGE, ROOT / "doc/records.json"],
        stdout=subprocess.PIPE, check=True).stdout
    (folder / ("types.go" if LANGUAGE == "go" else "types.rs")).write_bytes(types)
    if LANGUAGE == "go":
        command = [compiler, "build", "-o", PROGRAM.name, "./unpack"]
    else:
        command = [compiler, "--edition=2021", "-O", "-Dwarnings", "-o", PROGRAM.name, "main.rs"]
    environment = os.environ | {"GOCACHE": str(BUILD / "go_cache"), "GOPROXY": "off",
                                "IRONMOAT_TYPES": str(folder)}
    subprocess.run(command, cwd=folder, env=environment, check=True)


def outcomes(service, requests):
    """Of {output type, file}, in their order."""
    if LANGUAGE == "python":
        client = ironmoat.Client(service, RECORDS, 5, SANITIZED)
        answers = client.unpack([(output_type, pathlib.Path(file).read_bytes())
                                 for output_type, file in requests])
        client.close()
        return list(map(shown, answers))
    lines = "".join(f"{output_type} {file}\n" for output_type, file in requests)
    result = subprocess.run([PROGRAM, service, str(SANITIZED)], input=lines.encode(),
                            stdout=subprocess.PIPE, check=True, timeout=100)
    return list(map(json.loads, result.stdout.splitlines()))


def outcomes_of_bytes(service, requests):
    with tempfile.TemporaryDirectory() as folder:
        files = []
        for number, (output_type, message) in enumerate(requests):
            file = pathlib.Path(folder) / str(number)
            file.write_bytes(message)
            files.append((output_type, file))
        return outcomes(service, files)


class Language(unittest.TestCase):
    maxDiff = 2000

    def test_gets_the_outcomes_of_the_vectors(self):
        entries = json.loads((VECTORS / "vectors.json").read_text())
        asked = [(entry, file) for entry in entries for file in entry["files"]]
        answers = outcomes(SERVICE, [(entry["outputType"], VECTORS / file) for entry, file in asked])
        for (entry, file), answer in zip(asked, answers, strict=True):
            with self.subTest(file):
                what = "record" if "record" in entry else "error"
                found = answer.get(what)
                if found and what == "error":  # of which a vector need not say everything
                    found = {name: found.get(name) for name in entry[what]}
                self.assertEqual(found, entry[what])

    def test_gets_a_rejection_for_a_message_over_the_limit(self):
        answer, = outcomes_of_bytes(SERVICE, [(RESPONSE, b"x" * (17 << 20))])
        self.assertEqual(answer["error"]["kind"], "limitExceeded")

    def test_fails_only_the_message_that_kills_or_stalls_the_service(self):
        messages = [b"a 1", b"crash 2", b"b 3", b"stall 4", b"c 5"]
        answers = outcomes_of_bytes(TEST_SERVER, [(RESPONSE, message) for message in messages])
        commands = [answer.get("record", {}).get("command") for answer in answers]
        self.assertEqual(commands, [1, None, 3, None, 5])
        self.assertTrue(all("failure" in answers[place] for place in (1, 3)))

    def test_rejects_replies_that_violate_the_protocol(self):
        good = [(RESPONSE, b"\0\x01\0" + bytes(8)), (PAYLOAD, nested_payloads(512)),
                (RESPONSE, b"\1\5" + REFUSAL[2:] + b"why"), (RESPONSE, b"\3not now")]
        answers = outcomes_of_bytes(FAKE_SERVICE, [
            (output_type, b"reply " + body)
            for output_type, body in good + [lie[1:] for lie in LIES]])
        self.assertIn("record", answers.pop(1))
        self.assertEqual(answers[:3], [
            {"record": {"command": 0}},
            {"error": {"kind": "rejectedByHost", "path": "c", "message": "why"}},
            {"failure": "not now"}])
        for (what, _, _), answer in zip(LIES, answers[3:], strict=True):
            with self.subTest(what):
                self.assertEqual(list(answer), ["failure"])


class Page(unittest.TestCase):
    @unittest.skipUnless(LANGUAGE == "python", "once is enough")
    def test_shows_an_exchange_that_the_service_repeats(self):
        """Apart from the bits of the sandbox, which depend on the machine."""
        page = (ROOT / "doc/protocol.md").read_text()
        lines = re.findall(r"^([<>]) ((?:[0-9a-f]{2} )+)", page, re.MULTILINE)
        sent, received = (bytes.fromhex("".join(line for sign, line in lines if sign == wanted))
                          for wanted in "><")
        found = subprocess.run([SERVICE], input=sent, stdout=subprocess.PIPE, check=True).stdout
        self.assertEqual(found[:14] + found[18:], received[:14] + received[18:])


if __name__ == "__main__":
    if LANGUAGE != "python":
        found = shutil.which("go" if LANGUAGE == "go" else "rustc")
        if not found:
            print(f"skipped: no compiler for {LANGUAGE} is installed")
            sys.exit(77)
        build(found)
    sys.setrecursionlimit(10_000)  # for records of 512 levels
    unittest.main(argv=sys.argv[:1])
