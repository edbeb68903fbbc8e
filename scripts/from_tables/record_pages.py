"""The records' tables as pages: doc/records.md for people, doc/records.json for programs.

The notes are the comments on fields in include/ironmoat/. A record is shown under its output record's name; the n-th argument of the initialiser is the n-th
field of the wire record.
"""

import json
import pathlib
import re

from message_model import LIST_OF, RECORDS

ROOT = pathlib.Path(__file__).resolve().parents[2]

INTRODUCTION = """\
# Records

The fields of all records, in the order in which a message is decoded and a reply holds them
([protocol.md](protocol.md)). `scripts/refresh` generates this page, and [records.json](records.json)
for programs, from the tables and comments in the code.

- The service checks the type of a value and carries the value without interpretation. It checks
  neither ranges nor formats, nor one field against another.
- *key*: the key in the message's dictionary, compared byte by byte. The service ignores an entry
  under an unknown key, whatever its value.
- *type*: `Int` and `Int64` are both signed 64-bit integers. A larger integer is `outOfRange`, a value
  of another type a `typeMismatch`.
- A message without a *required* key is rejected with `keyNotFound`. Without another key, a list of
  records is empty, and any other field is absent.
- In an initialiser the first argument is labelled `with`, and each other one as its field.

Some values fit no field. Under a known key they are a `typeMismatch` (a wide integer under an
integer's key: `outOfRange`), under an unknown key they are ignored:

| value | binary | XML |
|---|---|---|
| integer beyond 64 bits, signed | of 16 bytes | any number of digits, decimal or hexadecimal |
| real | of 4 or 8 bytes | digits with a point and an exponent, `nan`, `inf`, `infinity` |
| date | any 8 bytes | `dddd-dd-ddTdd:dd:ddZ`, also where no calendar has it |
| UID | of 1 to 16 bytes | none |
| null, which is not absence | 0x00 | none |
| set | counted as an array | none |

Other objects are `malformed` under any key: integers of more than 16 bytes, the fill byte 0x0F in
place of an object, and the URLs, UUIDs, UTF-8 texts and ordered sets of later versions of the binary
format.
"""


def comments():
    """(record, field) to the comment on the field, and to the group that begins with it."""
    notes, groups = {}, {}
    for header in sorted((ROOT / "include/ironmoat").glob("*.h")):
        begun = {}
        for line in header.read_text(encoding="utf-8").splitlines():
            if group := re.match(r"///     (\w+) {2,}(.+)", line):
                begun[group[1]] = group[2]
            elif struct := re.match(r"struct (\w+)Arguments\b", line):
                record = struct[1]
                groups.update({(record, field): group for field, group in begun.items()})
                begun = {}
            elif note := re.search(r"(\w+);\s+///< (.+)", line):
                notes[record, note[1]] = note[2]
    return notes, groups


class Page:
    def __init__(self, tables):
        pairs = list(zip(tables["wireRecords"], tables["outputRecords"]))
        self.records = {output["name"]: {
            "wireRecord": wire["name"],
            "bytes": wire["bytes"],
            "fields": [self.field(*both) for both in zip(wire["fields"], output["arguments"])],
        } for wire, output in pairs}
        self.version = tables["version"]
        self.output_types = [output for _, output in RECORDS.values()]

    def field(self, field, argument):
        name = argument["type"]
        is_list = name.startswith(LIST_OF)
        return {"name": field["name"], "type": f"List<{name[len(LIST_OF):]}>" if is_list else name,
                "key": field["key"], "label": argument["label"],
                "required": not field["optional"], "optional": argument["optional"]}

    def markdown(self):
        parts = [INTRODUCTION]
        notes, groups = comments()
        for name, record in self.records.items():
            parts.append(f"\n## {name}\n\nThe wire record is `{record['wireRecord']}`")
            if name in self.output_types:
                kind, = (kind for kind, (_, output) in RECORDS.items() if output == name)
                parts.append(f"; a message of type `{kind}`")
            parts.append(f". {len(record['fields'])} field{'s' * (len(record['fields']) > 1)}.\n\n"
                         "| | field | type | key | note |\n|---|---|---|---|---|\n")
            for place, field in enumerate(record["fields"]):
                if group := groups.get((name, field["name"])):
                    parts.append(f"| | *{group}* |\n")
                note = "required" if field["required"] else notes.get((name, field["name"]), "")
                parts.append(f"| {place} | {field['name']} | {self.link(field['type'])} "
                             f"| `{field['key']}` |{note and f' {note} |'}\n")
        return "".join(parts)

    def link(self, type_name):
        if type_name.startswith("List<"):
            return f"List of {self.link(type_name[5:-1])}"
        return f"[{type_name}](#{type_name.lower()})" if type_name in self.records else type_name

    def json(self):
        """One line for each field."""
        records = []
        for name, record in self.records.items():
            fields = ",\n".join("      " + json.dumps(field) for field in record["fields"])
            records.append(f'    {json.dumps(name)}: {{"wireRecord": {json.dumps(record["wireRecord"])}'
                           f', "bytes": {record["bytes"]}, "fields": [\n{fields}]}}')
        return (f'{{\n  "version": {self.version},\n'
                f'  "outputTypes": {json.dumps(self.output_types)},\n'
                f'  "records": {{\n'
                + ",\n".join(records) + "\n  }\n}\n")
