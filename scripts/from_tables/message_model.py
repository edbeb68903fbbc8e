"""A second implementation of the rules by which a message becomes a record or is rejected.

Takes the fields from the tables that dump_tables prints, and messages as plistlib reads them (dict,
list, str, bytes, bool, int of any size; other types are values that fit no field).
"""

import base64
import io
import json
import plistlib
import subprocess

LIST_OF = "list of "
KINDS = {"Int": int, "Int64": int, "Bool": bool, "String": str, "Data": bytes}
RECORDS = {
    "payload": ("VeskCorvelProtocolPayload", "DrelUserPayload"),
    "command-response": ("VeskCommandResponseSchema", "VeskCommandResponse"),
    "web-tunnel-response": ("VeskCommandWebTunnelResponseSchema", "VeskCommandWebTunnelResponse"),
}


class BinaryWriter(plistlib._BinaryPlistWriter):
    """plistlib's writer, extended to integers beyond 2**64."""

    def _write_object(self, value):
        try:
            super()._write_object(value)
        except OverflowError:  # only the object's offset has been written
            self._fp.write(b"\x14" + value.to_bytes(16, "big", signed=True))


class XmlWriter(plistlib._PlistWriter):
    def write_value(self, value):
        try:
            super().write_value(value)
        except OverflowError:
            self.simple_element("integer", str(value))


def written(writer, value):
    out = io.BytesIO()
    writer(out, sort_keys=False, skipkeys=False).write(value)
    return out.getvalue()


def binary(value):
    return written(BinaryWriter, value)


def xml(value):
    return written(XmlWriter, value)


class Refusal(Exception):
    pass


class Model:
    def __init__(self, dump_tables):
        self.tables = json.loads(subprocess.check_output([dump_tables]))
        self.fields = {record["name"]: record["fields"] for record in self.tables["wireRecords"]}
        self.arguments = {record["name"]: record["arguments"]
                          for record in self.tables["outputRecords"]}

    def outcome(self, kind, message):
        """The outcome of a message: {"record": ...}, with "unknownKeys" if it has any, or
        {"error": {"kind": ..., "path": ...}}."""
        self.unknown = []
        try:
            outcome = {"record": self.record(*RECORDS[kind], message, "")}
        except Refusal as refusal:
            return {"error": dict(zip(("kind", "path"), refusal.args))}
        if self.unknown:
            outcome["unknownKeys"] = {"count": len(self.unknown), "paths": self.unknown[:100]}
        return outcome

    def record(self, wire, output, value, path):
        """The output record: the n-th argument has the n-th field's value and name."""
        if not isinstance(value, dict):
            raise Refusal("typeMismatch", path)
        fields, arguments = self.fields[wire], self.arguments[output]
        assert len(fields) == len(arguments)
        known = {field["key"] for field in fields}
        self.unknown += [(f"{path}." if path else "") + key.encode()[:255].decode(errors="ignore")
                         for key in value if key not in known]
        shown = {}
        for field, argument in zip(fields, arguments):
            name, key = field["name"], field["key"]
            assert argument["label"] == (name if field is not fields[0] else "with")
            way = f"{path}.{key}" if path else key
            if key in value:
                shown[name] = self.value(field["type"], argument["type"], value[key], way)
            elif not field["optional"]:
                raise Refusal("keyNotFound", way)
            elif not argument["optional"]:  # a list that is never absent
                shown[name] = []
        return shown

    def value(self, wire, output, value, path):
        if wire in self.fields:
            return self.record(wire, output, value, path)
        kind = list if wire.startswith(LIST_OF) else KINDS[wire]
        if type(value) is not kind:  # not isinstance: True is an int to Python
            raise Refusal("typeMismatch", path)
        if kind is list:
            wire, output = wire[len(LIST_OF):], output[len(LIST_OF):]
            shown, unknown = [], len(self.unknown)
            for index, element in enumerate(value):
                again = (index > 0 and element is value[index - 1]  # saves time for long lists
                         and len(self.unknown) == unknown)
                shown.append(shown[-1] if again else
                             self.value(wire, output, element, f"{path}[{index}]"))
            return shown
        assert wire == output
        if kind is int and not -2**63 <= value < 2**63:
            raise Refusal("outOfRange", path)
        return base64.b64encode(value).decode() if kind is bytes else value


def shown(line):
    """The outcome in a line of vesk-unpack."""
    if "error" not in line:
        return {name: line[name] for name in ("record", "unknownKeys") if name in line}
    if not line["error"]["message"]:
        raise AssertionError("an error without a message")
    return {"error": {name: line["error"][name] for name in ("kind", "path")}}
