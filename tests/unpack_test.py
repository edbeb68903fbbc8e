"""vesk-unpack with the real service: what the commands of vesk-unpack.md cannot show.

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


class Schemas(unittest.TestCase):
    def test_are_those_of_the_tables(self):
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


class UnknownKeys(InFolder):
    def test_are_found_at_any_depth_up_to_a_hundred(self):
        inner = binary({"c": 5, "mml": [{"c": 1}, {"c": 2, "h": {"x y": 3}}]})
        line, = lines("--type=payload", input=inner)
        self.assertEqual(line["unknownKeys"], {"count": 1, "paths": ["mml[1].h.x y"]})
        many = binary({"c": 5} | {f"{i:03}" + "é" * 200: 0 for i in range(500)})
        line, = lines(input=many)
        self.assertEqual(line["unknownKeys"],
                         {"count": 500, "paths": [f"{i:03}" + "é" * 126 for i in range(100)]})


class Terminal(InFolder):
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

    def test_wraps_long_values_at_width_of_terminal(self):
        self.write("long", binary({"c": 5, "U": b"\x10\xff\x1f\xa9456789", "qai": "0123456789abc\n漢"}))
        self.assertEqual(self.on_terminal("long", columns=29, NO_COLOR="1"),
                         'long\n  command        5\n'
                         '  messageUUID    10ff1fa9\n'
                         '                 34353637\n'
                         '                 3839\n'
                         '                 (10 bytes)\n'
                         '  applicationId  "0123456789a\n'
                         '                 bc\\n漢"\n')

    def test_erases_progress_line_on_terminal(self):
        os.mkfifo("slow")
        feeder = threading.Timer(0.5, self.write, ("slow", GOOD))
        feeder.start()
        output = self.on_terminal("slow", "good")
        feeder.join()
        self.assertIn("1 of 2 messages", output)
        self.assertNotIn("of 2 messages", re.sub(".*\r\x1b\\[K", "", output))


class Start(InFolder):
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

    def test_passes_self_test(self):
        result = run(TOOL, "--self-test")
        output = result.stdout.decode()
        self.assertEqual((result.returncode, "NOT SAFE" in output), (0, False), output)
        if "sanitizer" not in output:
            self.assertGreater(output.count("killed by SIGSYS"), 8)

    def test_fails_self_test_when_a_required_part_is_missing(self):
        hello = b"IRONMOAT" + struct.pack("<HIQQQQI", 1, 0x3FFF ^ 2, *[0] * 5)
        self.write("unsafe", f"#!{sys.executable}\nimport sys\n"
                   f"sys.stdout.buffer.write({bytes([len(hello), 0, 0, 0]) + hello})\n".encode(), 0o755)
        result = run(TOOL, "--self-test", "--service", "./unsafe")
        self.assertEqual(result.returncode, 1)
        self.assertEqual(re.findall("(.*\\S) +no +<-- NOT SAFE", result.stdout.decode()),
                         ["  no new privileges"])


if __name__ == "__main__":
    TOOL = os.path.abspath(sys.argv.pop(1))
    unittest.main()
