"""The rules by which a message becomes a record or is refused, told a second time.

Knows no record: works on the tables that dump_tables prints, and on messages as plistlib reads
them (dict, list, str, bytes, bool, int; whatever else is a value that fits no field).
"""

import base64

LIST_OF = "list of "
KINDS = {"Int": int, "Int64": int, "Bool": bool, "String": str, "Data": bytes}


class Refusal(Exception):
    def __init__(self, kind, path):
        super().__init__(kind, path)
        self.kind = kind
        self.path = path


class Model:
    def __init__(self, tables):
        self.fields = {record["name"]: record["fields"] for record in tables["wireRecords"]}
        self.arguments = {record["name"]: record["arguments"]
                          for record in tables["outputRecords"]}

    def outcome(self, wire, output, message):
        """What comes of a message: {"record": ...} or {"error": {"kind": ..., "path": ...}}."""
        try:
            return {"record": self.record(wire, output, message, "")}
        except Refusal as refusal:
            return {"error": {"kind": refusal.kind, "path": refusal.path}}

    def record(self, wire, output, value, path):
        """The n-th argument shows the n-th field, under the field's name."""
        if not isinstance(value, dict):
            raise Refusal("typeMismatch", path)
        fields, arguments = self.fields[wire], self.arguments[output]
        assert len(fields) == len(arguments)
        shown = {}
        for field, argument in zip(fields, arguments):
            assert argument["label"] == (field["name"] if field is not fields[0] else "with")
            key = field["key"]
            way = f"{path}.{key}" if path else key
            if key in value:
                shown[field["name"]] = self.value(field["type"], argument["type"], value[key], way)
            elif not field["optional"]:
                raise Refusal("keyNotFound", way)
            elif not argument["optional"]:  # a list that is always there
                shown[field["name"]] = []
        return shown

    def value(self, wire, output, value, path):
        if wire.startswith(LIST_OF):
            if not isinstance(value, list):
                raise Refusal("typeMismatch", path)
            wire, output = wire[len(LIST_OF):], output[len(LIST_OF):]
            shown = []
            for index, element in enumerate(value):
                again = index > 0 and element is value[index - 1]  # saves time for long lists
                shown.append(shown[-1] if again else
                             self.value(wire, output, element, f"{path}[{index}]"))
            return shown
        if wire in self.fields:
            return self.record(wire, output, value, path)
        assert wire == output
        if type(value) is not KINDS[wire]:  # not isinstance: True is an int to Python
            raise Refusal("typeMismatch", path)
        if type(value) is int and not -2**63 <= value < 2**63:
            raise Refusal("outOfRange", path)
        return base64.b64encode(value).decode() if type(value) is bytes else value
