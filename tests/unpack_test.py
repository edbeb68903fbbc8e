"""vesk-unpack as a process, with the real service: what it prints and how it exits.

    unpack_test.py TOOL DUMP_TABLES [unittest arguments]
"""

import contextlib
import json
import os
import plistlib
import pty
import random
import re
import subprocess
import sys
import tempfile
import threading
import unittest

from message_generator import Generator, binary, xml
from message_model import RECORDS, Model, shown

TOOL = DUMP_TABLES = None
PROJECT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
MESSAGE_BYTES = 16 << 20


def unpack(*arguments, **options):
    if "input" not in options:
        options["stdin"] = subprocess.DEVNULL
    pipes = {"stdout": subprocess.PIPE, "stderr": subprocess.PIPE}
    return subprocess.run([TOOL, "--type", "command-response", *arguments], timeout=250,
                          **pipes | options)


def lines_of(result):
    return [json.loads(line) for line in result.stdout.decode().split("\n")[:-1]]


class InFolder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder.name)

    def write(self, name, content):
        with open(name, "wb") as file:
            file.write(content)
        return name


class Batch(InFolder):
    def messages(self, count):
        """(bytes, outcome); half of them are broken, of those half no property lists."""
        r = random.Random(20)
        model = Model(DUMP_TABLES)
        malformed = {"error": {"kind": "malformed", "path": ""}}
        for number in range(count):
            faults = 0.3 if number % 4 == 1 else 0
            message = Generator(model.fields, r, True, False, faults).message(
                RECORDS["command-response"][0])
            content = r.choice([binary, xml])(message)
            if number % 8 == 3:
                yield content[:r.randrange(len(content.rstrip()))], malformed
            elif number % 8 == 7:
                yield r.choice([b"", b"bplist00", b"<?xml"]) + r.randbytes(200), malformed
            else:
                yield content, model.outcome("command-response", plistlib.loads(content))

    def test_ten_thousand_messages_half_of_them_broken(self):
        outcomes = [(self.write(str(number), content), outcome)
                    for number, (content, outcome) in enumerate(self.messages(2500))]
        expected = random.Random(21).choices(outcomes, k=10_000)
        result = unpack("--format", "json", *(name for name, _ in expected))
        self.assertEqual((result.returncode, result.stderr), (1, b""))
        self.assertEqual([line["file"] for line in lines_of(result)],
                         [name for name, _ in expected])
        for line, (name, outcome) in zip(lines_of(result), expected):
            self.assertEqual(json.dumps(shown(line)), json.dumps(outcome), name)
        broken = sum("error" in outcome for _, outcome in expected)
        self.assertTrue(4000 < broken < 6000, broken)


class CommandLine(InFolder):
    def setUp(self):
        super().setUp()
        self.good = self.write("good", binary({"c": 5, "qai": "é"}))
        self.bad = self.write("bad", xml({"c": 5, "U": "text"}))

    def test_exit_status_and_lines(self):
        good = '{"file": "good", "record": {"command": 5, "applicationId": "é"}}\n'
        bad = ('{"file": "bad", "error": {"kind": "typeMismatch", "path": "U", '
               '"message": "expected data, found string", '
               f'"offset": {xml({"c": 5, "U": "text"}).index(b"<string>")}, '
               '"line": 8, "column": 2}}\n')
        missing = ('{"file": "missing", "error": {"kind": "unreadable", "path": "", '
                   '"message": "No such file or directory"}}\n')
        folder = ('{"file": ".", "error": {"kind": "unreadable", "path": "", '
                  '"message": "Is a directory"}}\n')
        rows = [
            (["good"], 0, good),
            (["good", "good"], 0, good * 2),
            (["bad", "good"], 1, bad + good),
            (["missing", "good", ".", "bad"], 2, missing + good + folder + bad),
        ]
        for files, status, output in rows:
            result = unpack("--format=json", *files)
            self.assertEqual((result.returncode, result.stdout.decode(), result.stderr),
                             (status, output, b""))

    def test_standard_input(self):
        content = binary({"c": 5})
        for arguments in ([], ["-"]):
            result = unpack("--format=json", *arguments, input=content)
            self.assertEqual(result.returncode, 0)
            self.assertEqual(lines_of(result)[0]["file"], "-")
        result = unpack("--format=json", "good", "-", "bad", input=content)
        self.assertEqual([line["file"] for line in lines_of(result)], ["good", "-", "bad"])

    def test_wrong_usage_reads_nothing(self):
        for arguments in (["-q", "--summary"], ["--schema=payload"], ["--nonsense"], ["--format"], ["--type", "letter"], ["-", "-"]):
            result = unpack("good", *arguments)
            self.assertEqual((result.returncode, result.stdout), (2, b""))
            self.assertIn(b"--help", result.stderr)

    def test_help_and_version(self):
        result = unpack("--help", "good")
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        for word in (b"--type", b"--format", b"--service", b"unreadable", b"Exit status"):
            self.assertIn(word, result.stdout)
        self.assertTrue(all(len(line) <= 80 for line in result.stdout.splitlines()))
        result = unpack("--version")
        self.assertEqual((result.returncode, result.stderr), (0, b""))
        self.assertRegex(result.stdout, rb"\Avesk-unpack \d+\.\d+\.\d+\n\Z")

    def test_no_service(self):
        for program in ("/nonexistent/service", "/bin/true", "/"):
            result = unpack("--format=json", "--service", program, "good", "bad")
            self.assertEqual(result.returncode, 2)
            self.assertEqual([(line["file"], line["error"]["kind"]) for line in lines_of(result)],
                             [("good", "unavailable"), ("bad", "unavailable")])
        result = unpack("--service=/nonexistent/service", "good")
        self.assertEqual((result.returncode, result.stdout), (2, b""))
        self.assertIn(b"/nonexistent/service", result.stderr)

    def test_too_long_messages_are_not_read_whole(self):
        for name, size in (("huge", 5 << 30), ("longest", MESSAGE_BYTES)):
            os.truncate(self.write(name, b""), size)
        lines = lines_of(unpack("--format=json", "huge", "/dev/zero", "longest"))
        errors = [(line["error"]["kind"], line["error"]["message"]) for line in lines]
        self.assertEqual(errors[:2], [
            ("limitExceeded", f"message of {5 << 30} bytes, more than {MESSAGE_BYTES}"),
            ("limitExceeded", f"message of more than {MESSAGE_BYTES} bytes")])
        self.assertEqual(errors[2][0], "malformed")  # allowed, but no property list

    def test_file_names_that_are_no_text(self):
        name = self.write(b'n\xff\n"\xc3\xa9\x1b', binary({"c": 1}))
        self.assertEqual(lines_of(unpack("--format=json", name)),
                         [{"file": 'n\ufffd\n"é\x1b', "record": {"command": 1}}])

    def test_output_that_cannot_be_written(self):
        for arguments in (["good"], ["--help"]):
            with open("/dev/full", "wb") as full:
                result = unpack(*arguments, stdout=full)
            self.assertEqual(result.returncode, 2)
            self.assertIn(b"standard output", result.stderr)


class Companions(unittest.TestCase):
    """The man page and the completions know what the tool does."""

    def read(self, *path):
        with open(os.path.join(PROJECT, *path)) as file:
            return file.read()

    def test_all_options_are_known(self):
        options = set(re.findall(r"^  (--[a-z-]+)", unpack("--help").stdout.decode(), re.MULTILINE))
        self.assertGreater(len(options), 8)
        page = self.read("doc", "man", "vesk-unpack.1").replace("Fl Fl ", "--")
        self.assertEqual(set(re.findall(r"^\.It (--[a-z-]+)", page, re.MULTILINE)), options)
        zsh = self.read("packaging", "completion", "_vesk-unpack")
        self.assertEqual(set(re.findall("--[a-z-]+", zsh)), options)
        self.assertEqual(set(self.completions("--")), options)

    def completions(self, *words):
        script = '''source "$1"; shift
            COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); _vesk_unpack; printf '%s\\n' "${COMPREPLY[@]}"'''
        return subprocess.check_output(
            ["bash", "-c", script, "bash",
             os.path.join(PROJECT, "packaging", "completion", "vesk-unpack.bash"),
             "vesk-unpack", *words], cwd=os.path.join(PROJECT, "examples"), text=True).split()

    def test_completions_of_values(self):
        types = ["payload", "command-response", "web-tunnel-response"]
        rows = [
            (["--type", ""], [*types, "auto"]),
            (["--type", "=", "pay"], ["payload"]),
            (["a", "--schema", "="], types),
            (["--format", "j"], ["json"]),
            (["pay"], ["payload"]),
            (["--", "--t"], []),
        ]
        for words, expected in rows:
            self.assertEqual(self.completions(*words), expected)


class Places(InFolder):
    """Where a message is wrong is told alike for both forms and all encodings."""

    def error(self, content, *arguments):
        return lines_of(unpack("--format=json", *arguments, input=content))[0]["error"]

    def test_offsets_are_those_of_the_value_at_fault(self):
        body = ('<plist version=">1"><dict><!-- <dict> --><key>c</key><integer>5</integer>'
                '<key><![CDATA[<s>]]></key><?a <b>?><array ><data/><true/></array>'
                '<key>é&lt;</key><dict/>\n%s</dict></plist>')
        rows = [
            ("<key>U</key>", "<string>x</string>", "typeMismatch", "U"),
            ("<key>U</key>\r\n\t", "<array/>", "typeMismatch", "U"),
            ("<key>s</key>", "<integer>9223372036854775808</integer>", "outOfRange", "s"),
            ("<key>Dc</key>", "<date>2020-01-01T00:00:00Z</date>", "typeMismatch", "Dc"),
            ("<key>mml</key><array><dict><key>c</key><integer>1</integer></dict>", "<dict/></array>",
             "keyNotFound", "mml[1].c"),
        ]
        for before, value, kind, path in rows:
            text = body % (before + value)
            ahead = text[:text.index(before) + len(before)]
            for mark, encoding in (("", "utf-8"), ("\ufeff", "utf-8"), ("\ufeff", "utf-16-le"),
                                   ("\ufeff", "utf-16-be")):
                error = self.error((mark + text).encode(encoding), "--type=payload")
                del error["message"]
                self.assertEqual(error, {
                    "kind": kind, "path": path, "offset": len((mark + ahead).encode(encoding)),
                    "line": 1 + ahead.count("\n"), "column": len(ahead) - ahead.rindex("\n")})

    def test_offsets_in_the_binary_form(self):
        filler = {str(number): number for number in range(300)}  # for offsets of two bytes
        for message, path, marker in (({"c": 5, "U": "found me"}, "U", b"\x58found me"),
                                      ({"c": 5, "s": 2**64 - 1}, "s", b"\x14" + bytes(8)),
                                      ({"mml": [{"C": 77}]}, "c", b"\xdf\x11")):
            content = binary({**filler, **message})
            error = self.error(content, "--type=payload")
            self.assertEqual((error["path"], error["offset"]), (path, content.index(marker)))
            self.assertNotIn("line", error)

    def test_a_key_in_the_wrong_case_is_hinted_at(self):
        rows = [({"C": 5}, True), ({"d": 1}, False), ({"cc": 1}, False), ({"\u0421": 1}, False)]
        for message, hinted in rows:
            for content in (binary(message), xml(message)):
                error = self.error(content)
                self.assertEqual((error["kind"], "only in case" in error["message"]),
                                 ("keyNotFound", hinted))


class Types(InFolder):
    def test_schemas_are_the_tables(self):
        model = Model(DUMP_TABLES)

        def check(wire, output, shown):
            """Removes the record and those in it from `shown`."""
            fields = shown.pop(output, None)
            if fields is None:
                return
            self.assertEqual(len(fields), len(model.fields[wire]))
            for field, wire_field, argument in zip(fields, model.fields[wire],
                                                   model.arguments[output]):
                inner = argument["type"].removeprefix("list of ")
                self.assertEqual(field, {
                    "key": wire_field["key"], "name": wire_field["name"],
                    "label": argument["label"], "type": inner,
                    "list": argument["type"] != inner, "required": not wire_field["optional"]})
                if inner in model.arguments:
                    check(wire_field["type"].removeprefix("list of "), inner, shown)

        for kind, (wire, output) in RECORDS.items():
            result = unpack("--format=json", "--schema", kind)
            records = lines_of(result)[0]["records"]
            self.assertEqual(records[0]["name"], output)
            shown = {record["name"]: record["fields"] for record in records}
            check(wire, output, shown)
            self.assertEqual(shown, {})
            text = unpack("--schema", kind).stdout.decode()
            self.assertEqual(sum(line.startswith("  ") for line in text.splitlines()),
                             sum(len(record["fields"]) for record in records))
            self.assertIn("  c ", text)

    def test_auto_takes_the_record_that_got_most(self):
        everywhere = ["web-tunnel-response", "payload"]
        rows = [
            ({"c": 5}, "command-response", everywhere),
            ({"c": 5, "unknown": 1}, "command-response", everywhere),
            ({"c": 5, "i": 7}, "command-response", ["web-tunnel-response"]),
            ({"c": 5, "i": "seven"}, "payload", []),
            ({"c": 5, "qrss": True}, "command-response", ["payload"]),
            ({"c": 5, "hs": 200}, "web-tunnel-response", ["payload"]),
            ({"c": 5, "hs": 200, "mml": [{"c": 1}]}, "payload", []),
        ]
        for number, (message, _, _) in enumerate(rows):
            self.write(str(number), binary(message))
        files = [str(number) for number in range(len(rows))]
        result = unpack("--type=auto", "--format=json", *files)
        self.assertEqual(result.returncode, 0)
        self.assertEqual([(line["type"], line["asWell"]) for line in lines_of(result)],
                         [(kind, as_well) for _, kind, as_well in rows])
        self.assertIn("0 (command-response; as well: web-tunnel-response, payload)\n",
                      unpack("--type=auto", "0").stdout.decode())

    def test_auto_when_no_type_fits(self):
        result = unpack("--type=auto", "--format=json", input=xml({"c": 5, "i": True}))
        self.assertEqual(result.returncode, 1)
        error = lines_of(result)[0]["error"]
        self.assertEqual(error["kind"], "noTypeFits")
        self.assertEqual([(each["type"], each["path"], each["message"]) for each in error["types"]],
                         [("command-response", "i", "expected integer, found boolean"),
                          ("web-tunnel-response", "i", "expected integer, found boolean"),
                          ("payload", "i", "expected string, found boolean")])
        for content, kind in ((b"", "malformed"), (xml({"C": 1}), "keyNotFound")):  # all say the same
            error = lines_of(unpack("--type=auto", "--format=json", input=content))[0]["error"]
            self.assertEqual((error["kind"], "types" in error), (kind, False))
        error = lines_of(unpack("--type=auto", "--format=json", "--service=/bin/true",
                                input=xml({"c": 5})))[0]["error"]
        self.assertEqual(error["kind"], "unavailable")

    def test_quiet_and_summary(self):
        for name, content in (("good", xml({"c": 5})), ("bad", xml({})), ("junk", b"")):
            self.write(name, content)
        for files, status in ((["good"], 0), (["good", "bad"], 1), (["bad", "missing"], 2)):
            result = unpack("--quiet", *files)
            self.assertEqual((result.returncode, result.stdout, result.stderr), (status, b"", b""))
        files = ["good", "bad", "junk", "missing", "bad", *["good"] * 9]
        result = unpack("--summary", *files)
        self.assertEqual((result.returncode, result.stderr), (2, b""))
        self.assertEqual(result.stdout.decode(), "14  messages\n"
                                                 "10  accepted\n"
                                                 " 2  keyNotFound\n"
                                                 " 1  malformed\n"
                                                 " 1  unreadable\n")
        result = unpack("--summary", "--format=json", "--type=auto", *files)
        self.assertEqual(lines_of(result), [
            {"messages": 14, "accepted": 10, "types": {"command-response": 10},
             "errors": {"keyNotFound": 2, "malformed": 1, "unreadable": 1}}])


class Text(InFolder):
    def test_a_record_and_a_refusal(self):
        self.write("good", xml({"c": 5, "U": bytes(range(16)), "qai": "a.b", "qrss": False}))
        self.write("bad", xml({"c": 5, "U": "text"}))
        result = unpack("good", "bad", "missing", "good", stderr=subprocess.STDOUT)
        record = ("good\n"
                  "  command        5\n"
                  "  messageUUID    00010203 04050607 08090a0b 0c0d0e0f (16 bytes)\n"
                  '  applicationId  "a.b"\n'
                  "  sharedSession  false\n")
        self.assertEqual(result.stdout.decode(),
                         record +
                         "vesk-unpack: bad: typeMismatch at U: expected data, found string\n"
                         "  line 8, column 2\n"
                         "    <string>text</string>\n"
                         "    ^\n"
                         "vesk-unpack: missing: unreadable: No such file or directory\n"
                         "\n" + record)
        self.assertEqual(result.returncode, 2)

    def test_nothing_of_the_sender_steers_a_terminal(self):
        nasty = "\x1b]0;owned\x07\x9b2J\r\n\u202e" + "a" * 10_000
        self.write("\x1b[31mgood\n", binary({"c": 5, "qai": nasty, "\x1b[2J": 1}))
        self.write("\x1b[31mbad\n", xml({"c": "no"}))
        result = unpack("\x1b[31mgood\n", "\x1b[31mbad\n", "\x1b[31mmissing\n",
                        stderr=subprocess.STDOUT)
        output = result.stdout.decode()
        self.assertNotRegex(output, "[\x00-\x09\x0b-\x1f\x7f-\x9f\u202e]")
        self.assertEqual(len(output.splitlines()), 8)
        self.assertLess(max(map(len, output.splitlines())), 600)

    def on_terminal(self, *arguments, **environment):
        """Standard output and standard error as a terminal gets them."""
        master, slave = pty.openpty()
        with os.fdopen(master, "rb", buffering=0) as terminal:
            process = subprocess.Popen([TOOL, "--type=command-response", *arguments], stdout=slave,
                                       stderr=slave, stdin=subprocess.DEVNULL,
                                       env={"TERM": "xterm", **environment})
            os.close(slave)
            output = b""
            with contextlib.suppress(OSError):  # how Linux says that nobody writes any more
                while part := terminal.read(65536):
                    output += part
            process.wait(timeout=60)
        return output.decode()

    def test_colours_on_a_terminal_only(self):
        self.write("good", xml({"c": 5}))
        self.assertIn("\x1b[", self.on_terminal("good", "missing"))
        for environment in ({"NO_COLOR": "1"}, {"TERM": "dumb"}):
            self.assertNotIn("\x1b", self.on_terminal("good", "missing", **environment))
        self.assertNotIn("\x1b[", self.on_terminal("--format=json", "good"))

    def test_progress_shows_and_goes_away(self):
        self.write("good", xml({"c": 5}))
        os.mkfifo("slow")
        feeder = threading.Timer(0.5, self.write, ("slow", xml({"c": 5})))
        feeder.start()
        output = self.on_terminal("slow", "good")
        feeder.join()
        self.assertIn("1 of 2 messages", output)
        on_screen = "\n".join(re.sub(".*\r\x1b\\[K", "", line) for line in output.split("\r\n"))
        self.assertNotIn("of 2 messages", on_screen)


if __name__ == "__main__":
    TOOL, DUMP_TABLES = map(os.path.abspath, sys.argv[1:3])
    unittest.main(argv=sys.argv[:1] + sys.argv[3:])
