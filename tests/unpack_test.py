"""vesk-unpack as a process, with the real service: what it prints and how it exits.

    unpack_test.py TOOL [unittest arguments]
"""

import contextlib
import json
import os
import pathlib
import pty
import re
import shutil
import subprocess
import sys
import tempfile
import threading
import unittest

PROJECT = pathlib.Path(__file__).resolve().parents[1]
sys.path.append(str(PROJECT / "scripts/from_tables"))
from message_model import RECORDS, binary, xml  # noqa: E402

TOOL = None
MESSAGE_BYTES = 16 << 20


def unpack(*arguments, **options):
    if "input" not in options:
        options["stdin"] = subprocess.DEVNULL
    pipes = {"stdout": subprocess.PIPE, "stderr": subprocess.PIPE}
    return subprocess.run([TOOL, "--type", "command-response", *arguments], timeout=250,
                          **pipes | options)


def lines_of(result):
    return [json.loads(line) for line in result.stdout.decode().split("\n")[:-1]]


def error(content, *arguments):
    return lines_of(unpack("--format=json", *arguments, input=content))[0]["error"]


class InFolder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder.name)

    def write(self, name, content):
        with open(name, "wb") as file:
            file.write(content)

    def script(self, name, commands):
        self.write(name, f"#!/bin/sh\n{commands}\n".encode())
        os.chmod(name, 0o755)

    def expect(self, result, status, output, errors=""):
        self.assertEqual((result.returncode, result.stdout.decode(), result.stderr.decode()),
                         (status, output, errors))


class CommandLine(InFolder):
    def setUp(self):
        super().setUp()
        self.write("good", binary({"c": 5, "qai": "é"}))
        self.write("bad", xml({"c": 5, "U": "text"}))

    def test_exit_status_and_lines(self):
        good = '{"file": "good", "record": {"command": 5, "applicationId": "é"}}\n'
        offset = xml({"c": 5, "U": "text"}).index(b"<string>")
        bad = ('{"file": "bad", "error": {"kind": "typeMismatch", "path": "U", '
               f'"message": "expected data, found string", "offset": {offset}, '
               '"line": 8, "column": 2}}\n')
        unreadable = ('{"file": "%s", "error": {"kind": "unreadable", "path": "", '
                      '"message": "%s"}}\n')
        missing = unreadable % ("missing", "No such file or directory")
        folder = unreadable % (".", "Is a directory")
        for files, status, output in (
                (["good", "good"], 0, good * 2), (["bad", "good"], 1, bad + good),
                (["missing", "good", ".", "bad"], 2, missing + good + folder + bad)):
            self.expect(unpack("--format=json", *files), status, output)

    def test_standard_input(self):
        for arguments in ([], ["good", "-", "bad"]):
            result = unpack("--format=json", *arguments, input=binary({"c": 5}))
            self.assertEqual([line["file"] for line in lines_of(result)], arguments or ["-"])

    def test_wrong_usage_reads_nothing(self):
        result = unpack("good", "--nonsense")
        self.assertEqual((result.returncode, result.stdout), (2, b""))
        self.assertIn(b"--help", result.stderr)

    def test_help_and_version(self):
        for arguments, text in ((["--help", "good"], rb"([^\n]{0,80}\n)+"),
                                (["--version"], rb"vesk-unpack \d+\.\d+\.\d+\n")):
            result = unpack(*arguments)
            self.assertEqual((result.returncode, result.stderr), (0, b""))
            self.assertTrue(re.fullmatch(text, result.stdout), result.stdout)

    def test_no_service(self):
        for program in ("/nonexistent/service", "/bin/true"):
            result = unpack("--format=json", "--service", program, "good", "bad")
            self.assertEqual(result.returncode, 2)
            self.assertEqual([(line["file"], line["error"]["kind"]) for line in lines_of(result)],
                             [("good", "unavailable"), ("bad", "unavailable")])

    def test_no_service_that_others_can_replace(self):
        os.mkdir("open")
        tool = shutil.copy(TOOL, "open")
        self.script("open/VeskIronmoatService", "touch ran")
        os.chmod("open", 0o777)
        result = subprocess.run([tool, "good"], capture_output=True, timeout=60)
        self.assertEqual(result.returncode, 2)
        self.assertRegex(result.stderr.decode(), "other users can replace '.*/open/VeskIronmoatServ")
        hidden = "mount -t tmpfs none /proc && exec "
        if not subprocess.run(["unshare", "-m", "sh", "-c", hidden + "true"]).returncode:
            subprocess.run(["unshare", "-m", "sh", "-c", hidden + '"$0" good', tool], cwd="open",
                           capture_output=True, timeout=60)
        self.assertFalse(os.path.exists("ran") or os.path.exists("open/ran"))

    def test_too_long_messages_are_not_read_whole(self):
        for name, size in (("huge", 5 << 30), ("longest", MESSAGE_BYTES)):
            self.write(name, b"")
            os.truncate(name, size)
        errors = [line["error"] for line in lines_of(
            unpack("--format=json", "huge", "/dev/zero", "longest"))]
        self.assertEqual([error["message"] for error in errors[:2]], [
            f"message of {5 << 30} bytes, more than {MESSAGE_BYTES}",
            f"message of more than {MESSAGE_BYTES} bytes"])
        self.assertEqual([error["kind"] for error in errors],
                         ["limitExceeded", "limitExceeded", "malformed"])

    def test_file_names_that_are_no_text(self):
        self.write(b'n\xff\n"\xc3\xa9\x1b', binary({"c": 1}))
        self.assertEqual(lines_of(unpack("--format=json", b'n\xff\n"\xc3\xa9\x1b')),
                         [{"file": 'n\ufffd\n"é\x1b', "record": {"command": 1}}])

    def test_output_that_cannot_be_written(self):
        for arguments in (["good"], ["--help"]):
            with open("/dev/full", "wb") as full:
                result = unpack(*arguments, stdout=full)
            self.assertEqual(result.returncode, 2)
            self.assertIn(b"standard output", result.stderr)


class Companions(unittest.TestCase):
    """The man page and the completions know what the tool does."""

    def test_all_options_are_known(self):
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

    def test_completions_of_values(self):
        types = ["payload", "command-response", "web-tunnel-response"]
        for words, expected in (
                (["--type", ""], [*types, "auto"]), (["--type", "=", "pay"], ["payload"]),
                (["a", "--schema", "="], types), (["--format", "j"], ["json"]),
                (["pay"], ["payload"]), (["--", "--t"], [])):
            self.assertEqual(self.completions(*words), expected)


class Places(InFolder):
    """Where a message is wrong is told alike for both forms and all encodings."""

    def test_offsets_are_those_of_the_value_at_fault(self):
        body = ('<plist version=">1"><dict><!-- <dict> --><key>c</key><integer>5</integer>'
                '<key><![CDATA[<s>]]></key><?a <b>?><array ><data/><true/></array>'
                '<key>é&lt;</key><dict/>\n%s</dict></plist>')
        one = "<dict><key>c</key><integer>1</integer></dict>"
        for before, value, kind, path in (
                ("<key>U</key>\r\n\t", "<array/>", "typeMismatch", "U"),
                ("<key>s</key>", "<integer>9223372036854775808</integer>", "outOfRange", "s"),
                ("<key>mml</key><array>" + one, "<dict/></array>", "keyNotFound", "mml[1].c")):
            text = body % (before + value)
            ahead = text[:text.index(before) + len(before)]
            for mark, encoding in (("", "utf-8"), ("\ufeff", "utf-8"), ("\ufeff", "utf-16-le"),
                                   ("\ufeff", "utf-16-be")):
                found = error((mark + text).encode(encoding), "--type=payload")
                del found["message"]
                self.assertEqual(found, {
                    "kind": kind, "path": path, "offset": len((mark + ahead).encode(encoding)),
                    "line": 1 + ahead.count("\n"), "column": len(ahead) - ahead.rindex("\n")})

    def test_offsets_in_the_binary_form(self):
        filler = {str(number): number for number in range(300)}  # for offsets of two bytes
        for message, path, marker in (({"c": 5, "U": "found me"}, "U", b"\x58found me"),
                                      ({"c": 5, "s": 2**64 - 1}, "s", b"\x14" + bytes(8)),
                                      ({"mml": [{"C": 77}]}, "c", b"\xdf\x11")):
            content = binary({**filler, **message})
            found = error(content, "--type=payload")
            self.assertEqual((found["path"], found["offset"]), (path, content.index(marker)))
            self.assertNotIn("line", found)

    def test_a_key_in_the_wrong_case_is_hinted_at(self):
        for message, hinted in (({"C": 5}, True), ({"d": 1, "cc": 1, "\u0421": 1}, False)):
            for content in (binary(message), xml(message)):
                found = error(content)
                self.assertEqual((found["kind"], "only in case" in found["message"]),
                                 ("keyNotFound", hinted))


class Types(InFolder):
    def test_schemas_are_the_tables(self):
        page = json.loads((PROJECT / "doc/records.json").read_text())["records"]

        def reached(name):
            inner = {re.sub("List<(.*)>", r"\1", field["type"]) for field in page[name]["fields"]}
            return {name}.union(*(reached(each) for each in inner & set(page) - {name}))

        for kind, (_, output) in RECORDS.items():
            records = lines_of(unpack("--format=json", "--schema", kind))[0]["records"]
            self.assertEqual(records[0]["name"], output)
            self.assertEqual({record["name"]: record["fields"] for record in records}, {
                name: [{"key": field["key"], "name": field["name"], "label": field["label"],
                        "type": re.sub("List<(.*)>", r"\1", field["type"]),
                        "list": field["type"].startswith("List"), "required": field["required"]}
                       for field in page[name]["fields"]] for name in reached(output)})
            text = unpack("--schema", kind).stdout.decode()
            self.assertEqual(sum(line.startswith("  ") for line in text.splitlines()),
                             sum(len(record["fields"]) for record in records))

    def test_auto_takes_the_record_that_got_most(self):
        rows = [
            ({"c": 5}, "command-response", ["web-tunnel-response", "payload"]),
            ({"c": 5, "i": 7}, "command-response", ["web-tunnel-response"]),
            ({"c": 5, "i": "seven"}, "payload", []),
            ({"c": 5, "qrss": True}, "command-response", ["payload"]),
            ({"c": 5, "hs": 200}, "web-tunnel-response", ["payload"]),
        ]
        for number, (message, _, _) in enumerate(rows):
            self.write(str(number), binary(message))
        result = unpack("--type=auto", "--format=json", *map(str, range(len(rows))))
        self.assertEqual(result.returncode, 0)
        self.assertEqual([(line["type"], line["asWell"]) for line in lines_of(result)],
                         [(kind, as_well) for _, kind, as_well in rows])
        self.assertIn("0 (command-response; as well: web-tunnel-response, payload)\n",
                      unpack("--type=auto", "0").stdout.decode())

    def test_auto_when_no_type_fits(self):
        found = error(xml({"c": 5, "i": True}), "--type=auto")
        self.assertEqual(found["kind"], "noTypeFits")
        self.assertEqual([(each["type"], each["path"], each["message"]) for each in found["types"]],
                         [("command-response", "i", "expected integer, found boolean"),
                          ("web-tunnel-response", "i", "expected integer, found boolean"),
                          ("payload", "i", "expected string, found boolean")])
        for content, kind, service in ((b"", "malformed", []), (xml({"C": 1}), "keyNotFound", []),
                                       (b"", "unavailable", ["--service=/bin/true"])):
            found = error(content, "--type=auto", *service)  # all say the same
            self.assertEqual((found["kind"], "types" in found), (kind, False))

    def test_quiet_and_summary(self):
        self.write("good", xml({"c": 5}))
        self.write("bad", xml({}))
        self.write("junk", b"")
        for files, status in ((["good"], 0), (["good", "bad"], 1), (["bad", "missing"], 2)):
            self.expect(unpack("--quiet", *files), status, "")
        files = ["good", "bad", "junk", "missing", "bad", *["good"] * 9]
        self.expect(unpack("--summary", *files), 2, "14  messages\n"
                                                    "10  accepted\n"
                                                    " 2  keyNotFound\n"
                                                    " 1  malformed\n"
                                                    " 1  unreadable\n")
        self.assertEqual(lines_of(unpack("--summary", "--format=json", "--type=auto", *files)), [
            {"messages": 14, "accepted": 10, "types": {"command-response": 10},
             "errors": {"keyNotFound": 2, "malformed": 1, "unreadable": 1}}])


class Text(InFolder):
    def test_a_record_and_a_refusal(self):
        self.write("good", xml({"c": 5, "U": bytes(range(16)), "qai": "a.b", "qrss": False}))
        self.write("bad", xml({"c": 5, "U": "text"}))
        record = ("good\n"
                  "  command        5\n"
                  "  messageUUID    00010203 04050607 08090a0b 0c0d0e0f (16 bytes)\n"
                  '  applicationId  "a.b"\n'
                  "  sharedSession  false\n")
        self.assertEqual(
            unpack("good", "bad", "missing", "good", stderr=subprocess.STDOUT).stdout.decode(),
            record + "vesk-unpack: bad: typeMismatch at U: expected data, found string\n"
            "  line 8, column 2\n"
            "    <string>text</string>\n"
            "    ^\n"
            "vesk-unpack: missing: unreadable: No such file or directory\n"
            "\n" + record)

    def test_nothing_of_the_sender_steers_a_terminal(self):
        nasty = "\x1b]0;owned\x07\x9b2J\r\n\u202e" + "a" * 10_000
        names = [f"\x1b[31m{name}\n" for name in ("good", "bad", "missing")]
        self.write(names[0], binary({"c": 5, "qai": nasty, "\x1b[2J": 1}))
        self.write(names[1], xml({"c": "no"}))
        output = unpack(*names, stderr=subprocess.STDOUT).stdout.decode()
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
    TOOL = os.path.abspath(sys.argv.pop(1))
    unittest.main()
