"""The records' tables as pages: doc/records.md for people, doc/records.json for programs.

A record is shown under its output record's name; the n-th argument of the initialiser is the n-th
field of the wire record.
"""

import json

from message_model import LIST_OF, RECORDS

INTRODUCTION = """\
# Records

The fields of all records, in the order in which they are decoded, in which the initialisers take
them, and in which they lie in a reply ([protocol.md](protocol.md)). Printed from the tables in the code
by `scripts/refresh`; [records.json](records.json) holds the same for programs.

- *key*: under which the message's dictionary has it. Keys are compared byte by byte. An entry under
  an unknown key is ignored, whatever its value.
- *type*: `Int` and `Int64` are both 64 bits, signed. An integer of any size beyond that is
  `outOfRange`, a value of another kind a `typeMismatch`.
- *in a message*: a *required* key must be there, or the message is refused with `keyNotFound`.
- *in the record*: an *optional* field may be absent; a list that is *always* there is empty where
  the message has none.
- *label*: of the initialiser's argument.

Some values fit in no field. Under a known key they are a `typeMismatch` (a wide integer under an
integer's key: `outOfRange`), under an unknown key they are ignored like any other value:

| value | binary | XML |
|---|---|---|
| integer beyond 64 bits, signed | of 16 bytes | any number of digits, decimal or hexadecimal |
| real | of 4 or 8 bytes | digits with a point and an exponent, `nan`, `inf`, `infinity` |
| date | any 8 bytes | `dddd-dd-ddTdd:dd:ddZ`, also where no calendar has it |
| UID | of 1 to 16 bytes | none |
| null, which is not absence | 0x00 | none |
| set | counted as an array | none |

Other bytes are not a property list, and `malformed` wherever they stand: integers of more than 16
bytes, the fill byte 0x0F where an object should be, and the URLs, UUIDs, UTF-8 texts and ordered
sets of later versions of the binary format.
"""


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
        for name, record in self.records.items():
            parts.append(f"\n## {name}\n\nThe wire record is `{record['wireRecord']}`")
            if name in self.output_types:
                kind, = (kind for kind, (_, output) in RECORDS.items() if output == name)
                parts.append(f"; a message of type `{kind}`")
            parts.append(f". {len(record['fields'])} field{'s' * (len(record['fields']) > 1)}.\n\n"
                         "| | field | type | key | in a message | in the record | label |\n"
                         "|---|---|---|---|---|---|---|\n")
            for place, field in enumerate(record["fields"]):
                link = self.link(field["type"])
                parts.append(f"| {place} | {field['name']} | {link} | `{field['key']}` "
                             f"| {'required' if field['required'] else ''} "
                             f"| {'optional' if field['optional'] else 'always'} "
                             f"| {field['label']} |\n")
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
