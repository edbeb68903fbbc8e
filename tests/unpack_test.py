"""vesk-unpack as a process, with the real service: what it prints and how it exits.

    unpack_test.py TOOL [unittest arguments]
"""

import base64
import json
import os
import plistlib
import pty
import random
import re
import struct
import subprocess
import sys
import tempfile
import threading
import time
import unittest

TOOL = None
MESSAGE_BYTES = 16 << 20

# Fields of a command response in the order in which they are decoded: wire key, label, type.
FIELDS = [
    ("c", "command", int), ("i", "messageId", int), ("U", "messageUUID", bytes),
    ("s", "responseStatus", int), ("fR", "failReason", int), ("t", "token", bytes),
    ("x-internal", "internalBuild", bool), ("x-logging", "loggingProfile", bool),
    ("qai", "applicationId", str), ("qat", "requestType", int), ("qvesk", "veskSessionId", bytes),
    ("qrss", "sharedSession", bool), ("qv", "protocolVersion", int),
]
KEYS = [key for key, _, _ in FIELDS]
TYPES = {key: kind for key, _, kind in FIELDS}


def unpack(*arguments, **options):
    options.setdefault("stdin", subprocess.DEVNULL if "input" not in options else None)
    if "input" in options:
        del options["stdin"]
    options.setdefault("stdout", subprocess.PIPE)
    options.setdefault("stderr", subprocess.PIPE)
    command = [TOOL, "--type", "command-response", *arguments]
    return subprocess.run(command, timeout=250, **options)


def lines_of(result):
    return [json.loads(line) for line in result.stdout.decode().split("\n")[:-1]]


def binary(value):
    return plistlib.dumps(value, fmt=plistlib.FMT_BINARY, sort_keys=False)


def xml(value):
    return plistlib.dumps(value, fmt=plistlib.FMT_XML, sort_keys=False)


class Messages:
    """Random command responses, and ways to break them, from one seed."""

    def __init__(self, seed):
        self.random = random.Random(seed)

    def value(self, kind):
        r = self.random
        if kind is bool:
            return r.random() < 0.5
        if kind is int:
            return r.choice([0, -1, 7, 255, 65536, -2**31, 2**53 + 1, 2**63 - 1, -2**63,
                             r.getrandbits(r.randrange(1, 63))])
        if kind is bytes:
            return r.randbytes(r.choice([0, 1, 15, 16, 16, 32, 300]))
        return r.choice(["", "plain", "grüße 漢字 😀", "<&>\"'\\ \n\t", "\u2028\u0085\u00a0", "x" * 500])

    def wrong_value(self, kind):
        choices = {int: 7, bool: True, bytes: b"7", str: "7", float: 7.0, list: [7], dict: {"c": 7}}
        return choices[self.random.choice([other for other in choices if other is not kind])]

    def good(self):
        keys = [key for key in KEYS[1:] if self.random.random() < 0.6] + ["c"]
        self.random.shuffle(keys)
        message = {}
        for key in keys:
            if self.random.random() < 0.1:
                message[self.random.choice(["C", "cc", "unknown", "ü"])] = self.wrong_value(None)
            message[key] = self.value(TYPES[key])
        return message

    def encoded(self, message):
        return self.random.choice([binary, xml])(message)

    # Each way to break a message gives bytes, the kind of error, and its path.

    def without_command(self):
        message = self.good()
        del message["c"]
        return self.encoded(message), "keyNotFound", "c"

    def wrong_fields(self):
        message = self.good()
        wrong = self.random.sample(KEYS, self.random.randrange(1, 4))
        kinds = {}
        for key in wrong:
            if TYPES[key] is int and self.random.random() < 0.4:
                message[key], kinds[key] = self.random.randrange(2**63, 2**64), "outOfRange"
            else:
                message[key], kinds[key] = self.wrong_value(TYPES[key]), "typeMismatch"
        entries = list(message.items())
        self.random.shuffle(entries)
        first = min(wrong, key=KEYS.index)
        return self.encoded(dict(entries)), kinds[first], first

    def no_dictionary(self):
        return self.encoded(self.wrong_value(dict)), "typeMismatch", ""

    def cut_short(self):
        message = self.encoded(self.good()).rstrip()
        return message[:self.random.randrange(len(message))], "malformed", ""

    def noise(self):
        start = self.random.choice([b"", b"bplist00", b"<plist>", b"<?xml"])
        return start + self.random.randbytes(self.random.randrange(200)), "malformed", ""

    def broken_xml(self):
        good = xml(self.good())
        change = self.random.choice([
            (b"<dict>", b"<dict><key>k</key>"),                     # no value
            (b"</dict>", b"<key>k</key><string>&nbsp;</string></dict>"),
            (b"</dict>", b"<key>k</key><null/></dict>"),
            (b"</dict>", b"<key>k</key><data>A=A=</data></dict>"),
            (b"</dict>", b"<key>k</key><integer>1 2</integer></dict>"),
            (b"</dict>", b"<string>no key</string><string/></dict>"),
            (b"</plist>", b"<dict/></plist>"),                      # a second root
            (b"</plist>", b"</plist><plist/>"),
            (b"<dict>", b"text<dict>"),
            (b'encoding="UTF-8"', b'encoding="KOI8-R"'),
            (b"<plist", b'<!DOCTYPE plist [<!ENTITY a "b">]><plist'),
        ])
        if change[1].startswith(b"<!DOCTYPE"):
            good = re.sub(rb"<!DOCTYPE[^>]*>", b"", good)
        return good.replace(*change, 1), "malformed", ""

    def broken_binary(self):
        message = bytearray(binary(self.good() | {"list": [1]}))
        offset_size, reference_size, count, top, table = struct.unpack(">6xBBQQQ", message[-32:])
        assert offset_size <= 2 and reference_size == 1
        offsets = [int.from_bytes(message[table + i * offset_size:][:offset_size], "big")
                   for i in range(count)]
        how = self.random.randrange(5)
        if how == 0:  # an object outside of the message
            message[table:table + offset_size] = b"\xff" * offset_size
        elif how == 1:  # a reference to an object that is not there
            message[offsets[top] + 2] = 0xff
        elif how == 2:  # a list that holds itself
            holder = next(i for i in range(count) if message[offsets[i]] == 0xa1)
            message[offsets[holder] + 1] = holder
        elif how == 3:  # more objects than there can be
            message[-24:-16] = struct.pack(">Q", 2**63)
        else:  # a kind of object that does not exist
            message[offsets[self.random.randrange(count)]] = 0x70
        return bytes(message), "malformed", ""

    def too_deep(self):
        nested = "end"
        for _ in range(600):
            nested = [nested]
        return self.encoded(self.good() | {"unknown": nested}), "limitExceeded", ""

    def bad(self):
        ways = [self.without_command, self.wrong_fields, self.wrong_fields, self.no_dictionary,
                self.cut_short, self.noise, self.broken_xml, self.broken_binary]
        if self.random.random() < 0.01:
            return self.too_deep()
        return self.random.choice(ways)()


def expected_record(message_bytes):
    """What the tool should print of a good message, from an independent reader."""
    message = plistlib.loads(message_bytes)
    record = {}
    for key, label, kind in FIELDS:
        if key in message:
            value = message[key]
            record[label] = base64.b64encode(value).decode() if kind is bytes else value
    return record


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
    def test_ten_thousand_messages_half_of_them_broken(self):
        messages = Messages(seed=20)
        expected = []
        for i in range(10_000):
            if messages.random.random() < 0.5:
                content = messages.encoded(messages.good())
                outcome = {"record": expected_record(content)}
            else:
                content, kind, path = messages.bad()
                outcome = {"error": {"kind": kind, "path": path}}
            expected.append({"file": self.write(str(i), content), **outcome})
        result = unpack("--format", "json", *(line["file"] for line in expected))
        self.assertEqual(result.stderr, b"")
        self.assertEqual(result.returncode, 1)
        lines = lines_of(result)
        self.assertEqual(len(lines), len(expected))
        for line, wanted in zip(lines, expected):
            if "error" in line:
                self.assertTrue(line["error"].pop("message"))
            # As text: the order of members counts, and true is not 1.
            self.assertEqual(json.dumps(line), json.dumps(wanted))


class CommandLine(InFolder):
    def setUp(self):
        super().setUp()
        self.good = self.write("good", binary({"c": 5, "qai": "é"}))
        self.bad = self.write("bad", xml({"c": 5, "U": "text"}))

    def test_exit_status_and_lines(self):
        good = '{"file": "good", "record": {"command": 5, "applicationId": "é"}}\n'
        bad = ('{"file": "bad", "error": {"kind": "typeMismatch", "path": "U", '
               '"message": "expected data, found string"}}\n')
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
        with open("good", "rb") as file:
            content = file.read()
        for arguments in ([], ["-"]):
            result = unpack("--format=json", *arguments, input=content)
            self.assertEqual(result.returncode, 0)
            self.assertEqual(lines_of(result)[0]["file"], "-")
        result = unpack("--format=json", "good", "-", "bad", input=content)
        self.assertEqual([line["file"] for line in lines_of(result)], ["good", "-", "bad"])

    def test_wrong_usage_reads_nothing(self):
        for arguments in (["--nonsense"], ["--format"], ["--type", "letter"], ["-", "-"]):
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
        with open("huge", "wb") as file:
            file.truncate(5 << 30)
        with open("longest", "wb") as file:  # allowed, but no property list
            file.truncate(MESSAGE_BYTES)
        huge, endless, longest = lines_of(
            unpack("--format=json", "huge", "/dev/zero", "longest"))
        self.assertEqual(huge["error"], {
            "kind": "limitExceeded", "path": "",
            "message": f"message of {5 << 30} bytes, more than {MESSAGE_BYTES}"})
        self.assertEqual(endless["error"], {
            "kind": "limitExceeded", "path": "",
            "message": f"message of more than {MESSAGE_BYTES} bytes"})
        self.assertEqual(longest["error"]["kind"], "malformed")

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
                         "vesk-unpack: missing: unreadable: No such file or directory\n"
                         "\n" + record)
        self.assertEqual(result.returncode, 2)

    def test_nothing_of_the_sender_steers_a_terminal(self):
        nasty = "\x1b]0;owned\x07\x9b2J\r\n\u202e" + "a" * 10_000
        self.write("\x1b[31mgood\n", binary({"c": 5, "qai": nasty, "\x1b[2J": 1}))
        self.write("\x1b[31mbad\n", xml({"c": "no"}))
        result = unpack("\x1b[31mgood\n", "\x1b[31mbad\n", "\x1b[31mmissing\n",
                        stderr=subprocess.STDOUT)
        shown = result.stdout.decode()
        self.assertNotRegex(shown, "[\x00-\x09\x0b-\x1f\x7f-\x9f\u202e]")
        self.assertEqual(len(shown.splitlines()), 5)
        self.assertLess(max(map(len, shown.splitlines())), 600)

    def on_terminal(self, *arguments, **environment):
        """Standard output and standard error as a terminal gets them."""
        master, slave = pty.openpty()
        with os.fdopen(master, "rb", buffering=0) as terminal:
            process = subprocess.Popen([TOOL, "--type=command-response", *arguments], stdout=slave,
                                       stderr=slave, stdin=subprocess.DEVNULL,
                                       env={"TERM": "xterm", **environment})
            os.close(slave)
            shown = b""
            while True:
                try:
                    part = terminal.read(65536)
                except OSError:  # how Linux says that nobody writes any more
                    break
                if not part:
                    break
                shown += part
            process.wait(timeout=60)
        return shown.decode()

    def test_colours_on_a_terminal_only(self):
        self.write("good", xml({"c": 5}))
        self.assertIn("\x1b[", self.on_terminal("good", "missing"))
        for environment in ({"NO_COLOR": "1"}, {"TERM": "dumb"}):
            self.assertNotIn("\x1b", self.on_terminal("good", "missing", **environment))
        self.assertNotIn("\x1b[", self.on_terminal("--format=json", "good"))

    def test_progress_shows_and_goes_away(self):
        self.write("good", xml({"c": 5}))
        os.mkfifo("slow")

        def feed():
            time.sleep(0.5)
            self.write("slow", xml({"c": 5}))

        feeder = threading.Thread(target=feed)
        feeder.start()
        shown = self.on_terminal("slow", "good")
        feeder.join()
        self.assertIn("1 of 2 messages", shown)
        on_screen = "\n".join(re.sub(".*\r\x1b\\[K", "", line) for line in shown.split("\r\n"))
        self.assertNotIn("of 2 messages", on_screen)


if __name__ == "__main__":
    sys.setrecursionlimit(10_000)  # for messages that are nested too deeply
    TOOL = os.path.abspath(sys.argv.pop(1))
    unittest.main()
