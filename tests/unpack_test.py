"""vesk-unpack as a process, with the real service: what it prints and how it exits.

    unpack_test.py TOOL [unittest arguments]
"""

import contextlib
import fcntl
import json
import os
import pathlib
import pty
import re
import shutil
import struct
import subprocess
import sys
import tempfile
import termios
import threading
import unittest

PROJECT = pathlib.Path(__file__).resolve().parents[1]
sys.path.append(str(PROJECT / "scripts/from_tables"))
from message_model import RECORDS, binary, xml  # noqa: E402

TOOL = None
MESSAGE_BYTES = 16 << 20
GOOD = binary({"c": 5, "qai": "é"})
BAD = xml({"c": 5, "U": "text"})


def run(*arguments, **options):
    if "input" not in options:
        options["stdin"] = subprocess.DEVNULL
    pipes = {"stdout": subprocess.PIPE, "stderr": subprocess.PIPE}
    return subprocess.run(arguments, timeout=250, **pipes | options)


def unpack(*arguments, **options):
    return run(TOOL, "--type", "command-response", *arguments, **options)


def lines(*arguments, **options):
    output = unpack("--format=json", *arguments, **options).stdout.decode()
    return [json.loads(line) for line in output.split("\n")[:-1]]


def error(content, *arguments):
    return lines(*arguments, input=content)[0]["error"]


class InFolder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder.name)
        self.write("good", GOOD)
        self.write("bad", BAD)

    def write(self, name, content, mode=0o644):
        os.makedirs(os.path.dirname(name) or b".", exist_ok=True)
        with open(name, "wb") as file:
            file.write(content)
        os.chmod(name, mode)

    def expect(self, result, status, output, errors=""):
        self.assertEqual((result.returncode, result.stdout.decode(), result.stderr.decode()),
                         (status, output, errors))


class CommandLine(InFolder):
    def test_prints_line_for_each_file_and_exits_with_highest_status(self):
        good = '{"file": "good", "record": {"command": 5, "applicationId": "é"}}\n'
        bad = ('{"file": "bad", "error": {"kind": "typeMismatch", "path": "U", '
               f'"message": "expected data, found string", "offset": {BAD.index(b"<string>")}, '
               '"line": 8, "column": 2}}\n')
        unreadable = '{"file": "%s", "error": {"kind": "unreadable", "path": "", "message": "%s"}}\n'
        missing = unreadable % ("missing", "No such file or directory")
        folder = unreadable % (".", "Is a directory")
        for files, status, output in (
                (["good", "good"], 0, good * 2), (["bad", "good"], 1, bad + good),
                (["missing", "good", ".", "bad"], 2, missing + good + folder + bad)):
            self.expect(unpack("--format=json", *files), status, output)

    def test_reads_named_files_in_order_and_folders_and_lists_when_asked(self):
        for name in ("spool/b", "spool/a/z", "spool/a/y", "spool/-", "two\nlines"):
            self.write(name, GOOD)
        os.symlink("../good", "spool/link")
        os.mkfifo("spool/fifo")
        self.write("list", b"good\n\nspool\n")
        for arguments, content, files in (
                ([], GOOD, ["-"]), (["good", "-", "bad"], GOOD, ["good", "-", "bad"]),
                (["-r", "good", "spool"], b"",
                 ["good", "spool/-", "spool/a/y", "spool/a/z", "spool/b"]),
                (["--files-from=list"], b"", ["good", "spool"]),
                (["-r", "bad", "--files-from=list"], b"",
                 ["bad", "good", "spool/-", "spool/a/y", "spool/a/z", "spool/b"]),
                (["--files-from=-"], b"two\nlines\0good\0", ["two\nlines", "good"]),
                (["--files-from=-"], b"", [])):
            self.assertEqual([line["file"] for line in lines(*arguments, input=content)], files)
        for arguments in (["-", "-"], ["-", "--files-from=-"], ["--files-from=missing"]):
            self.assertEqual(unpack(*arguments, input=b"good").returncode, 2)

    def test_prints_usage_help_and_version(self):
        self.expect(unpack("good", "--nonsense"), 2, "", "vesk-unpack: not a valid option: "
                    "'--nonsense'\nTry 'vesk-unpack --help'.\n")
        for arguments, text in ((["--help", "good"], rb"([^\n]{0,80}\n)+"), (
                ["--version"], rb"vesk-unpack \d+\.\d+\.\d+, frames version \d+\n")):
            result = unpack(*arguments)
            self.assertEqual((result.returncode, result.stderr), (0, b""))
            self.assertRegex(result.stdout, b"^" + text + b"$")

    def test_reports_why_service_is_unavailable(self):
        self.write("dies", b"#!/bin/sh\nprintf 'last ~\177' >&2; exit 78\n", 0o755)
        for program, why in (("./dies", "exited with status 78 (last ~"), ("/bin/true", "status 0")):
            for line in lines("--service", program, "good", "bad"):
                self.assertEqual(line["error"]["kind"], "unavailable")
                self.assertIn(why, line["error"]["message"])
            self.assertEqual(unpack("--service", program, "good").returncode, 2)

    def test_starts_no_service_of_others_without_proc(self):
        self.write("open/VeskIronmoatService", b"#!/bin/sh\ntouch ran\n", 0o755)
        os.chmod("open", 0o777)
        tool = os.path.abspath(shutil.copy(TOOL, "open"))
        hidden = ["unshare", "-m", "sh", "-c", 'mount -t tmpfs none /proc && exec "$@"', "sh"]
        if run(*hidden, "true").returncode == 0:
            result = run(*hidden, tool, "../good", cwd="open")
            if b"AddressSanitizer" not in result.stderr:  # which cannot do without /proc
                self.assertIn(b"../good", result.stdout + result.stderr)
        self.assertFalse(os.path.exists("ran") or os.path.exists("open/ran"))

    def test_rejects_too_long_message_without_reading_it_whole(self):
        for name, size in (("huge", 5 << 30), ("longest", MESSAGE_BYTES)):
            self.write(name, b"")
            os.truncate(name, size)
        too_long = ("limitExceeded", f"message exceeds the limit of {MESSAGE_BYTES} bytes")
        errors = [line["error"] for line in lines("huge", "/dev/zero", "longest")]
        self.assertEqual([(each["kind"], each["message"]) for each in errors[:2]], [too_long] * 2)
        self.assertEqual(errors[2]["kind"], "malformed")

    def test_exits_with_2_when_output_cannot_be_written(self):
        for arguments in (["good"], ["good", "bad"], ["--help"]):
            with open("/dev/full", "wb") as full:
                result = unpack(*arguments, stdout=full)
            self.assertEqual(result.returncode, 2)
            self.assertIn(b"standard output: No space left", result.stderr)


class Companions(unittest.TestCase):
    """The man page and the shell completions."""

    def test_list_all_options(self):
        options = set(re.findall(r"^  (--[a-z-]+)", unpack("--help").stdout.decode(), re.MULTILINE))
        self.assertGreater(len(options), 8)
        page = (PROJECT / "doc/man/vesk-unpack.1").read_text().replace("Fl Fl ", "--")
        self.assertEqual(set(re.findall(r"^\.It (--[a-z-]+)", page, re.MULTILINE)), options)
        zsh = (PROJECT / "packaging/completion/_vesk-unpack").read_text()
        self.assertEqual(set(re.findall("--[a-z-]+", zsh)), options)
        self.assertEqual(set(self.completions("--")), options)

    def completions(self, *words):
        script = '''source "$1"; shift
            COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); _vesk_unpack; printf '%s\\n' "${COMPREPLY[@]}"'''
        return subprocess.check_output(
            ["bash", "-c", script, "bash", PROJECT / "packaging/completion/vesk-unpack.bash",
             "vesk-unpack", *words], cwd=PROJECT / "examples", text=True).split()

    def test_complete_values_of_options(self):
        types = ["payload", "command-response", "web-tunnel-response"]
        for words, expected in (
                (["--type", ""], [*types, "auto"]), (["--type", "=", "pay"], ["payload"]),
                (["a", "--schema", "="], types), (["--format", "j"], ["json"]),
                (["pay"], ["payload"]), (["--", "--t"], [])):
            self.assertEqual(self.completions(*words), expected)


class Positions(InFolder):
    """Of errors, in both formats and all encodings."""

    def test_are_line_and_column_of_value_at_fault_in_text(self):
        body = ('<plist version=">1"><dict><!-- <dict> --><key>c</key><integer>5</integer>'
                '<key><![CDATA[<s>]]></key><?a <b>?><array ><data/><true/></array>'
                '<key>é&lt;</key><dict/>\n%s</dict></plist>')
        one = "<dict><key>c</key><integer>1</integer></dict>"
        for before, value, path in (
                ("<key>U</key>\r\n\t", "<array/>", "U"),
                ("<key>s</key>", "<integer>9223372036854775808</integer>", "s"),
                ("<key>mml</key><array>" + one, "<dict/></array>", "mml[1].c")):
            text = body % (before + value)
            ahead = text[:text.index(before) + len(before)]
            for mark, encoding in (("", "utf-8"), ("\ufeff", "utf-8"), ("\ufeff", "utf-16-le"),
                                   ("\ufeff", "utf-16-be")):
                found = error((mark + text).encode(encoding), "--type=payload")
                self.assertEqual([found[name] for name in ("path", "offset", "line", "column")],
                                 [path, len((mark + ahead).encode(encoding)),
                                  1 + ahead.count("\n"), len(ahead) - ahead.rindex("\n")])

    def test_are_offset_of_value_at_fault_in_binary_message(self):
        filler = {str(number): number for number in range(300)}  # for offsets of two bytes
        for message, path, marker in (({"c": 5, "U": "found me"}, "U", b"\x58found me"),
                                      ({"c": 5, "s": 2**64 - 1}, "s", b"\x14" + bytes(8)),
                                      ({"mml": [{"C": 77}]}, "c", b"\xdf\x11")):
            content = binary({**filler, **message})
            found = error(content, "--type=payload")
            self.assertEqual((found["path"], found["offset"]), (path, content.index(marker)))
            self.assertNotIn("line", found)


class Types(InFolder):
    def test_have_schemas_of_the_tables(self):
        page = json.loads((PROJECT / "doc/records.json").read_text())["records"]

        def reached(name):
            inner = {re.sub("List<(.*)>", r"\1", field["type"]) for field in page[name]["fields"]}
            return {name}.union(*(reached(each) for each in inner & set(page) - {name}))

        for kind, (_, output) in RECORDS.items():
            records = lines("--schema", kind)[0]["records"]
            self.assertEqual(records[0]["name"], output)
            self.assertEqual({record["name"]: record["fields"] for record in records}, {
                name: [{"key": field["key"], "name": field["name"], "label": field["label"],
                        "type": re.sub("List<(.*)>", r"\1", field["type"]),
                        "list": field["type"].startswith("List"), "required": field["required"]}
                       for field in page[name]["fields"]] for name in reached(output)})
            text = unpack("--schema", kind).stdout.decode()
            self.assertEqual(sum(line.startswith("  ") for line in text.splitlines()),
                             sum(len(record["fields"]) for record in records))

    def test_auto_takes_record_with_most_values(self):
        for message, kind, as_well in (
                ({"c": 5}, "command-response", ["web-tunnel-response", "payload"]),
                ({"c": 5, "i": 7}, "command-response", ["web-tunnel-response"]),
                ({"c": 5, "i": "seven"}, "payload", []),
                ({"c": 5, "hs": 200}, "web-tunnel-response", ["payload"])):
            line, = lines("--type=auto", input=binary(message))
            self.assertEqual((line["type"], line["asWell"]), (kind, as_well))
        self.expect(unpack("--type=auto", input=binary({"c": 5})), 0,
                    "- (command-response; also fits: web-tunnel-response, payload)\n  command  5\n")

    def test_auto_reports_all_rejections_when_they_differ(self):
        found = error(xml({"c": 5, "i": True}), "--type=auto")
        self.assertEqual(found["kind"], "noTypeFits")
        self.assertEqual([(each["type"], each["path"], each["message"]) for each in found["types"]],
                         [("command-response", "i", "expected integer, found boolean"),
                          ("web-tunnel-response", "i", "expected integer, found boolean"),
                          ("payload", "i", "expected string, found boolean")])
        for content, kind in ((b"", "malformed"), (xml({"C": 1}), "keyNotFound")):
            found = error(content, "--type=auto")  # the same for all types
            self.assertEqual((found["kind"], "types" in found), (kind, False))

    def test_are_hinted_at_when_default_type_rejects(self):
        hint = "(decoded as payload; --type auto tries all types)\n"
        for arguments, hinted in (
                ([], True), (["bad", "good"], True), (["--type=payload"], False), (["good"], False),
                (["--format=json"], False), (["--summary"], False), (["missing"], False)):
            result = run(TOOL, *arguments, input=xml({"C": 5}))
            self.assertEqual(result.stderr.decode().endswith(hint), hinted)


class Output(InFolder):
    def test_is_exit_status_or_summary_only_when_asked(self):
        self.write("junk", b"")
        for files, status in ((["good"], 0), (["good", "bad"], 1), (["bad", "missing"], 2)):
            self.expect(unpack("--quiet", *files), status, "")
        files = ["good", "bad", "junk", "missing", "bad", *["good"] * 9]
        result = unpack("--summary", *files)
        self.assertRegex(result.stdout.decode(), r"""^14  messages in \d+\.\d{3} s \(\d+/s, \d+\.\d\d MB/s\)
10  accepted \(71\.4 %\)
 1  malformed \(7\.1 %\)
 2  typeMismatch \(14\.3 %\)
 1  unreadable \(7\.1 %\)
$""")
        summary, = lines("--summary", "--type=auto", *files)
        self.assertLess(0, summary.pop("seconds"))
        self.assertEqual(summary, {
            "messages": 14, "accepted": 10, "types": {"command-response": 10},
            "errors": {"malformed": 1, "typeMismatch": 2, "unreadable": 1}, "bytes": 10 * len(GOOD) + 2 * len(BAD)})

    def test_has_integers_as_strings_when_asked(self):
        line, = lines("--exact-integers", input=binary({"c": 5, "i": 2**63 - 1}))
        self.assertEqual(line["record"], {"command": "5", "messageId": "9223372036854775807"})

    def test_shows_records_and_rejections_in_order_as_text(self):
        self.write("good", xml({"c": 5, "U": bytes(range(16)), "qai": "a.b", "qrss": False}))
        record = ("good\n"
                  "  command        5\n"
                  "  messageUUID    00010203 04050607 08090a0b 0c0d0e0f (16 bytes)\n"
                  '  applicationId  "a.b"\n'
                  "  sharedSession  false\n")
        result = unpack("good", "bad", "missing", "good", stderr=subprocess.STDOUT)
        self.assertEqual(
            result.stdout.decode(),
            record + "vesk-unpack: bad: typeMismatch at U: expected data, found string\n"
            "  line 8, column 2\n"
            "    <string>text</string>\n"
            "    ^\n"
            "vesk-unpack: missing: unreadable: No such file or directory\n"
            "\n" + record)

    def test_escapes_senders_text_that_would_control_a_terminal(self):
        nasty = "\x1b]0;owned\x07\x9b2J\r\n\u202e" + "a" * 10_000
        names = [f"\x1b[31m{name}\n" for name in ("good", "bad", "missing")]
        self.write(names[0], binary({"c": 5, "qai": nasty, "\x1b[2J": 1}))
        self.write(names[1], xml({"c": "no"}))
        output = unpack("--strict", *names, stderr=subprocess.STDOUT).stdout.decode()
        self.assertNotRegex(output, "[\x00-\x09\x0b-\x1f\x7f-\x9f\u202e]")
        self.assertEqual(len(output.splitlines()), 12)
        self.assertLess(max(map(len, output.splitlines())), 600)

    def test_lists_unknown_keys_and_exits_with_3_when_strict(self):
        self.write("extra", xml({"c": 5, "C": 6, "\x7f\u202e": {"c": 7}}))
        self.write("inner", binary({"c": 5, "mml": [{"c": 1}, {"c": 2, "h": {"x y": 3}}]}))
        record = "extra\n  command  5\n"
        self.expect(unpack("extra"), 0, record + "  (2 unknown keys; --strict lists them)\n")
        self.expect(unpack("--strict", "extra"), 3, record + "  unknown keys\n    count  2\n"
                    '    paths  (2 elements)\n      [0] "C"\n      [1] "\\u{7f}\\u{202e}"\n')
        line, = lines("--type=payload", "inner")
        self.assertEqual(line["unknownKeys"], {"count": 1, "paths": ["mml[1].h.x y"]})
        for files, status in ((["good"], 0), (["extra", "bad"], 1), (["extra", "missing"], 2)):
            self.assertEqual(unpack("--strict", "--quiet", *files).returncode, status)
        summary, = lines("--strict", "--summary", "extra", "good", "bad")
        self.assertEqual((summary["accepted"], summary["withUnknownKeys"]), (2, 1))
        self.write("many", binary({"c": 5} | {f"{i:03}" + "é" * 200: 0 for i in range(500)}))
        self.assertEqual(lines("many")[0]["unknownKeys"],
                         {"count": 500, "paths": [f"{i:03}" + "é" * 126 for i in range(100)]})

    def on_terminal(self, *arguments, columns=80, **environment):
        """Standard output and standard error as a terminal gets them."""
        master, slave = pty.openpty()
        fcntl.ioctl(slave, termios.TIOCSWINSZ, struct.pack("4H", 24, columns, 0, 0))
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
        return output.decode().replace("\r\n", "\n")

    def test_has_colours_on_terminal_only(self):
        self.assertIn("\x1b[", self.on_terminal("good", "missing"))
        for environment in ({"NO_COLOR": "1"}, {"TERM": "dumb"}):
            self.assertNotIn("\x1b", self.on_terminal("good", "missing", **environment))
        self.assertNotIn("\x1b[", self.on_terminal("--format=json", "good"))

    def test_wraps_descriptions_at_width_of_terminal(self):
        for columns, words in ((40, ":\n    expected data, found string"),
                               (64, ": expected data, found string"),
                               (63, ": expected data, found\n    string")):
            shown = self.on_terminal("bad", columns=columns, NO_COLOR="1")
            self.assertIn("vesk-unpack: bad: typeMismatch at U" + words + "\n  line 8", shown)

    def test_erases_progress_line_on_terminal(self):
        os.mkfifo("slow")
        feeder = threading.Timer(0.5, self.write, ("slow", GOOD))
        feeder.start()
        output = self.on_terminal("slow", "good")
        feeder.join()
        self.assertIn("1 of 2 messages", output)
        self.assertNotIn("of 2 messages", re.sub(".*\r\x1b\\[K", "", output))


class SelfTest(InFolder):
    def test_passes_for_the_service(self):
        result = run(TOOL, "--self-test")
        output = result.stdout.decode()
        self.assertEqual((result.returncode, "NOT SAFE" in output), (0, False), output)
        if "sanitizer" not in output:
            self.assertGreater(output.count("killed by SIGSYS"), 8)

    def test_fails_when_a_required_part_is_missing(self):
        hello = b"IRONMOAT" + struct.pack("<HIQQQQI", 1, 0x3FFF ^ 2, *[0] * 5)
        self.write("unsafe", f"#!{sys.executable}\nimport sys\n"
                   f"sys.stdout.buffer.write({bytes([len(hello), 0, 0, 0]) + hello})\n".encode(), 0o755)
        result = run(TOOL, "--self-test", "--service", "./unsafe")
        self.assertEqual(result.returncode, 1)
        self.assertEqual(re.findall("(.*\\S) +no +<-- NOT SAFE", result.stdout.decode()),
                         ["  no new privileges"])

    def test_exits_with_2_when_there_is_no_service(self):
        for program in ("/nonexistent/service", "/bin/true"):
            self.assertEqual(run(TOOL, "--self-test", "--service", program).returncode, 2)


if __name__ == "__main__":
    TOOL = os.path.abspath(sys.argv.pop(1))
    unittest.main()
