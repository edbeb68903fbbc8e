"""Unpacks many messages in both formats with vesk-unpack; compares each outcome with the model's.

    model.py TOOL DUMP_TABLES WRITE_RECORDS PART [--messages N] [--seed S] [--folder FOLDER]

PART is a kind of message, generated from the seed; `faults`, each field of each record with each
wrong kind of value; or `written`, the files of WRITE_RECORDS. By hand, 2000 messages and other
seeds find more; FOLDER keeps the messages. (S2, S10, S11)
"""

import argparse
import collections
import json
import os
import pathlib
import plistlib
import random
import subprocess
import sys
import tempfile

sys.path.append(str(pathlib.Path(__file__).resolve().parents[1] / "scripts/from_tables"))
from model_messages import Generator, every_fault  # noqa: E402
from message_model import RECORDS, Model, binary, shown, xml  # noqa: E402

FORMATS = {"binary": plistlib.FMT_BINARY, "xml": plistlib.FMT_XML}


class Test:
    def __init__(self, options):
        self.options = options
        self.model = Model(options.dump_tables)
        self.failures = 0

    def unpack(self, kind, files):
        """The lines of vesk-unpack, in the order of the files."""
        command = [os.path.abspath(self.options.tool), "--type", kind, "--format", "json", *files]
        result = subprocess.run(command, cwd=self.options.folder, stdout=subprocess.PIPE,
                                timeout=250)
        lines = [json.loads(line) for line in result.stdout.decode().split("\n")[:-1]]
        rejected = any("error" in line for line in lines)
        if [line["file"] for line in lines] != files or result.returncode != rejected:
            sys.exit(f"{kind}: {len(lines)} lines for {len(files)} files, "
                     f"status {result.returncode}")
        return lines

    def check(self, kind, files, least):
        """Compares the outcomes of `files`, (name, outcome); requires `least` of each sort."""
        expected = dict(files)
        counts = collections.Counter(name.rpartition(".")[2] for name in expected)
        for line in self.unpack(kind, list(expected)):
            name, outcome = line["file"], expected[line["file"]]
            counts[outcome["error"]["kind"] if "error" in outcome else "record"] += 1
            # As text: the order of members counts, and true is not 1.
            got, wanted = json.dumps(shown(line)), json.dumps(outcome)
            if got != wanted:
                self.failures += 1
                if self.failures <= 5:
                    at = max(0, len(os.path.commonprefix([got, wanted])) - 60)
                    print(f"{kind}, {name}\n  got    {got[at:at + 400]}\n"
                          f"  wanted {wanted[at:at + 400]}")
        print(f"{kind}: {dict(counts)}")
        for what, number in least.items():
            if counts[what] < number:
                sys.exit(f"{kind}: too few: {what}")

    def path(self, file):
        return os.path.join(self.options.folder, file)

    def judged(self, kind, file):
        """A file and the model's outcome for the message that plistlib reads from it."""
        with open(self.path(file), "rb") as content:
            message = plistlib.load(content, fmt=FORMATS[file.rpartition(".")[2]])
        return file, self.model.outcome(kind, message)

    def write(self, name, formats):
        """Files of one message in some formats."""
        for format, content in formats.items():
            with open(self.path(f"{name}.{format}"), "wb") as out:
                out.write(content)
        return [f"{name}.{format}" for format in formats]

    def generated(self, kind):
        r = random.Random(f"{self.options.seed}/{kind}")
        for number in range(self.options.messages):
            for_xml = r.random() < 0.9
            faults = r.choice([0, 0.01, 0.1, 0.3])
            message = Generator(self.model.fields, r, for_xml, faults).message(RECORDS[kind][0])
            formats = {"binary": binary(message)} | ({"xml": xml(message)} if for_xml else {})
            yield from (self.judged(kind, file) for file in self.write(number, formats))

    def every_fault(self, kind):
        for format, encode in (("binary", binary), ("xml", xml)):
            messages = every_fault(self.model.fields, RECORDS[kind][0], encode is xml)
            for number, message in enumerate(messages):
                file, = self.write(number, {format: encode(message)})
                yield file, self.model.outcome(kind, message)

    def run(self, part):
        if part in RECORDS:
            least = {"binary": 1, "xml": 0.8, "record": 0.65, "typeMismatch": 0.2,
                     "keyNotFound": 0.01, "outOfRange": 0.01}
            self.check(part, self.generated(part),
                       {what: share * self.options.messages for what, share in least.items()})
        elif part == "faults":
            for kind, (name, _) in RECORDS.items():
                fields = len(self.model.fields[name])
                self.check(kind, self.every_fault(kind), {"typeMismatch": 2 * 8 * fields})
        else:
            self.written()

    def written(self):
        subprocess.run([self.options.write_records, self.options.folder], check=True)
        files = sorted(os.listdir(self.options.folder))
        widths = set()
        for kind in RECORDS:
            outcomes = dict(self.judged(kind, file) for file in files if file.startswith(kind))
            self.check(kind, outcomes.items(), {"record": 2 * 100, "binary": 100, "xml": 100})
            for file, outcome in outcomes.items():
                name, _, format = file.rpartition(".")
                if format != "binary":
                    continue
                if "error" in outcome or outcome != outcomes[name + ".xml"]:
                    sys.exit(f"{file}: not the record of the other format")
                with open(self.path(file), "rb") as content:
                    content.seek(-26, os.SEEK_END)
                    offset, reference = content.read(2)
                    widths |= {("offsets", offset), ("references", reference)}
        if len(widths) < 6:
            sys.exit(f"not all widths: {widths}")


def main():
    sys.setrecursionlimit(20_000)  # for messages nested to the limit
    parser = argparse.ArgumentParser()
    for program in ("tool", "dump_tables", "write_records"):
        parser.add_argument(program)
    parser.add_argument("part", choices=[*RECORDS, "faults", "written"])
    parser.add_argument("--messages", type=int, default=700)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--folder")
    options = parser.parse_args()
    with tempfile.TemporaryDirectory() as folder:
        options.folder = options.folder or folder
        test = Test(options)
        test.run(options.part)
    if test.failures:
        sys.exit(f"{options.part}, seed {options.seed}: {test.failures} failures")


if __name__ == "__main__":
    main()
