"""Generated messages in both forms through vesk-unpack, each outcome against the model's.

    model_test.py TOOL DUMP_TABLES PART [--messages N] [--seed S] [--only NUMBER --folder FOLDER]

PART is a kind of message, generated from the seed (one is named SEED-NUMBER; --only writes just
that one to FOLDER and compares it); `faults`, each field of each record with each wrong kind of
value; or `extremes`, messages at the limits.
"""

import argparse
import collections
import json
import os
import plistlib
import random
import subprocess
import sys
import tempfile

import message_extremes
from message_generator import Generator, every_fault
from message_model import Model
from xml_spelling import Speller, without_uids

RECORDS = {
    "payload": ("VeskCorvelProtocolPayload", "DrelUserPayload"),
    "command-response": ("VeskCommandResponseSchema", "VeskCommandResponse"),
    "web-tunnel-response": ("VeskCommandWebTunnelResponseSchema", "VeskCommandWebTunnelResponse"),
}
FORMATS = {"binary": plistlib.FMT_BINARY, "xml": plistlib.FMT_XML}


def binary(value):
    return plistlib.dumps(value, fmt=plistlib.FMT_BINARY, sort_keys=False)


def xml(value):
    return plistlib.dumps(without_uids(value), fmt=plistlib.FMT_XML, sort_keys=False)


class Test:
    def __init__(self, options):
        self.options = options
        self.tables = json.loads(subprocess.check_output([options.dump_tables]))
        self.model = Model(self.tables)
        self.failures = 0

    def write(self, file, content):
        with open(os.path.join(self.options.folder, file), "wb") as out:
            out.write(content)

    def unpack(self, kind, files):
        """The lines of vesk-unpack, one after the other."""
        if not files:  # without any it would read standard input
            return []
        command = [os.path.abspath(self.options.tool), "--type", kind, "--format", "json", *files]
        result = subprocess.run(command, cwd=self.options.folder, stdout=subprocess.PIPE,
                                timeout=250)
        lines = [json.loads(line) for line in result.stdout.decode().split("\n")[:-1]]
        refused = any("error" in line for line in lines)
        if [line["file"] for line in lines] != files or result.returncode != refused:
            sys.exit(f"{kind}: {len(lines)} lines for {len(files)} files, "
                     f"status {result.returncode}")
        return lines

    def compare(self, what, line, expected):
        """As text: the order of members counts, and true is not 1."""
        sentence = line["error"].pop("message") if "error" in line else "none needed"
        got = json.dumps({name: line[name] for name in line if name != "file"})
        wanted = json.dumps(expected)
        if got == wanted and sentence:
            return
        self.failures += 1
        if self.failures <= 5:
            at = max(0, len(os.path.commonprefix([got, wanted])) - 60)
            print(f"{what}: {sentence!r}\n  got    {got[at:at + 400]}\n"
                  f"  wanted {wanted[at:at + 400]}")

    def message(self, kind, number):
        """Message `number` in its forms; depends on nothing but the seed, the kind and itself."""
        r = random.Random(f"{self.options.seed}/{kind}/{number}")
        spelled, in_xml = r.random() < 0.4, r.random() < 0.9
        generator = Generator(self.model.fields, r, in_xml, carriage_returns=spelled)
        name = RECORDS[kind][0]
        message = generator.top(name)
        if r.random() < 0.4:
            for _ in range(r.choice([1, 1, 2, 3])):
                generator.break_somewhere(name, message)
            if r.random() < 0.02:
                message = generator.wrong(name)
        forms = {"binary": binary(message)}
        if in_xml:
            forms["xml"] = Speller(r).spell(message) if spelled else xml(message)
        return forms

    def generated(self, kind):
        numbers = range(self.options.messages) if self.options.only is None else [self.options.only]
        counts = self.check(kind, ((f"{self.options.seed}-{number}", self.message(kind, number))
                                   for number in numbers))
        least = {"binary": 1, "xml": 0.8, "record": 0.8, "typeMismatch": 0.2, "keyNotFound": 0.01,
                 "outOfRange": 0.01}
        for what, share in least.items():
            if len(numbers) > 1 and counts[what] < share * len(numbers):
                sys.exit(f"{kind}: too few with {what}")

    def faults(self):
        for kind, (name, _) in RECORDS.items():
            counts = self.check(kind, (
                (str(number), {"binary": binary(message), "xml": xml(message)})
                for number, message in enumerate(every_fault(self.model.fields, name))))
            fields = len(self.model.fields[name])
            if counts["record"] or counts["typeMismatch"] < 2 * 8 * fields:
                sys.exit(f"{kind}: too few faults")

    def check(self, kind, messages):
        """Compares what comes of `messages`, (name, {form: bytes}); how many of what there were."""
        expected = {form: {} for form in FORMATS}
        for name, forms in messages:
            outcomes = []
            for form, content in forms.items():
                file = f"{name}.{form}"
                self.write(file, content)
                read = plistlib.loads(content, fmt=FORMATS[form])
                outcomes.append(self.model.outcome(*RECORDS[kind], read))
                expected[form][file] = outcomes[-1]
            assert all(json.dumps(o) == json.dumps(outcomes[0]) for o in outcomes), name
        counts = collections.Counter()
        for form, outcomes in expected.items():
            for line in self.unpack(kind, list(outcomes)):
                outcome = outcomes[line["file"]]
                self.compare(f"{kind}, message {line['file']}", line, outcome)
                counts[form] += 1
                counts[outcome["error"]["kind"] if "error" in outcome else "record"] += 1
        print(f"{kind}: {counts['binary'] + counts['xml']} compared: {dict(counts)}")
        return counts

    def extremes(self):
        compared = 0
        for what, message, expected in message_extremes.messages(self.tables):
            expected = expected or self.model.outcome(*RECORDS["payload"], message)
            for form, written in (("binary", binary(message)), ("xml", xml(message))):
                self.write(form, written)
                line, = self.unpack("payload", [form])
                self.compare(f"{what}, {form}", line, expected)
                compared += 1
        print(f"{compared} compared")


def main():
    sys.setrecursionlimit(20_000)  # for messages nested to the limit
    parser = argparse.ArgumentParser()
    parser.add_argument("tool")
    parser.add_argument("dump_tables")
    parser.add_argument("part", choices=[*RECORDS, "faults", "extremes"])
    parser.add_argument("--messages", type=int, default=2000)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--only", type=int)
    parser.add_argument("--folder")
    options = parser.parse_args()
    with tempfile.TemporaryDirectory() as folder:
        options.folder = options.folder or folder
        test = Test(options)
        if options.part in RECORDS:
            test.generated(options.part)
        else:
            getattr(test, options.part)()
    if test.failures:
        sys.exit(f"{options.part}, seed {options.seed}: {test.failures} failures")


if __name__ == "__main__":
    main()
