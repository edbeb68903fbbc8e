"""The clients in examples/python, examples/go and examples/rust, the latter two built with types that
are generated from records.json: all test vectors, a service that dies, and one that lies.

    languages_test.py python|go|rust BUILD_FOLDER SERVICE TEST_SERVER

Exits with 77 if there is no compiler.
"""

import json
import os
import pathlib
import shutil
import subprocess
import sys
import tempfile
import unittest

import vectors_test

ironmoat = vectors_test.ironmoat
ROOT = vectors_test.ROOT
LANGUAGE, BUILD, SERVICE, TEST_SERVER = sys.argv[1], *map(pathlib.Path, sys.argv[2:5])
PROGRAM = BUILD / LANGUAGE / "unpack_messages"


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
        client = ironmoat.Client(service, vectors_test.RECORDS, 5, vectors_test.SANITIZED)
        answers = client.unpack([(output_type, pathlib.Path(file).read_bytes())
                                 for output_type, file in requests])
        client.close()
        return list(map(vectors_test.shown, answers))
    lines = "".join(f"{output_type} {file}\n" for output_type, file in requests)
    result = subprocess.run([PROGRAM, service, str(vectors_test.SANITIZED)], input=lines.encode(),
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
        requests = [(entry, file) for entry in vectors_test.ENTRIES for file in entry["files"]]
        answers = outcomes(SERVICE, [(entry["outputType"], vectors_test.VECTORS / file)
                                     for entry, file in requests])
        for (entry, file), answer in zip(requests, answers, strict=True):
            with self.subTest(file):
                self.assertEqual(vectors_test.comparable(answer, entry), vectors_test.outcome(entry))

    def test_gets_a_rejection_for_a_message_over_the_limit(self):
        answer, = outcomes_of_bytes(SERVICE, [(vectors_test.RESPONSE, b"x" * (17 << 20))])
        self.assertEqual(answer["error"]["kind"], "limitExceeded")

    def test_fails_only_the_message_that_kills_or_stalls_the_service(self):
        messages = [b"a 1", b"crash 2", b"b 3", b"stall 4", b"c 5"]
        answers = outcomes_of_bytes(
            TEST_SERVER, [(vectors_test.RESPONSE, message) for message in messages])
        commands = [answer.get("record", {}).get("command") for answer in answers]
        self.assertEqual(commands, [1, None, 3, None, 5])
        self.assertTrue(all("failure" in answers[place] for place in (1, 3)))

    def test_rejects_replies_that_violate_the_protocol(self):
        good = [(vectors_test.RESPONSE, b"\0\x01\0" + bytes(8)),
                (vectors_test.PAYLOAD, vectors_test.nested_payloads(512)),
                (vectors_test.RESPONSE, b"\1\5" + vectors_test.REFUSAL[2:] + b"why"),
                (vectors_test.RESPONSE, b"\3not now")]
        lies = [(output_type, body) for _, output_type, body in vectors_test.LIES]
        answers = outcomes_of_bytes(ROOT / "tests/lying_service.py", good + lies)
        self.assertEqual(answers[0], {"record": {"command": 0}})
        self.assertIn("record", answers[1])
        self.assertEqual(answers[2], {"error": {"kind": "rejectedByHost", "path": "c", "message": "why"}})
        self.assertEqual(answers[3], {"failure": "not now"})
        for (what, _, _), answer in zip(vectors_test.LIES, answers[len(good):], strict=True):
            with self.subTest(what):
                self.assertEqual(list(answer), ["failure"])


if __name__ == "__main__":
    if LANGUAGE != "python":
        found = shutil.which("go" if LANGUAGE == "go" else "rustc")
        if not found:
            print(f"skipped: no compiler for {LANGUAGE} is installed")
            sys.exit(77)
        build(found)
    sys.setrecursionlimit(10_000)  # for records of 512 levels
    unittest.main(argv=sys.argv[:1])
