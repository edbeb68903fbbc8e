"""The messages of tests/vectors/ and their outcomes. Each run generates the same ones."""

import functools
import json
import pathlib
import plistlib
import re

from message_model import KINDS, LIST_OF, RECORDS, binary, xml

ROOT = pathlib.Path(__file__).resolve().parents[2]
AT = "^"  # marks the offset of the error in a malformed message


class Vectors:
    """`entries`: (about, kind of message, {file: content}, outcome)."""

    def __init__(self, model):
        self.model, self.entries = model, []
        for kind in RECORDS:
            self.examples(kind)
            self.records(kind)
        self.spellings()
        self.wrong_kinds()
        self.faults()
        self.malformed_xml()
        self.malformed_binary()

    def examples(self, kind):
        for path in sorted((ROOT / "examples" / kind).glob("*.plist")):
            forms = [path, path.with_suffix(".bplist")]
            files = {f"../../{form.relative_to(ROOT)}": form.read_bytes() for form in forms}
            outcome, = {json.dumps(self.model.outcome(kind, plistlib.loads(content)))
                        for content in files.values()}
            self.entries.append(("an example", kind, files, json.loads(outcome)))

    # Messages that plistlib writes in both formats.

    def add(self, kind, name, about, message, forms=(".bplist", ".plist")):
        write = {".bplist": binary, ".plist": plain_xml}
        files = {f"{kind}/{name}{form}": write[form](message) for form in forms}
        self.entries.append((about, kind, files, self.model.outcome(kind, message)))

    def records(self, kind):
        name = RECORDS[kind][0]
        self.add(kind, "minimal", "only what is required", {"c": 96})
        self.add(kind, "full", "every field, each list with elements", self.full(name))
        empty = {"Int": 0, "Int64": 0, "Bool": False, "String": "", "Data": b""}
        self.add(kind, "empty", "every field there and empty: not the same as absent", {
            field["key"]: empty.get(field["type"], [] if field["type"].startswith(LIST_OF) else {})
            for field in self.model.fields[name]})

    def full(self, name, place=0):
        message = {}
        for field in self.model.fields[name]:
            place += 1
            message[field["key"]] = self.some(name, field, place)
        return message

    def some(self, record, field, place):
        """A value that differs from those of neighbouring fields."""
        kind = field["type"]
        if kind.startswith(LIST_OF):
            kind = kind[len(LIST_OF):]
            if kind == record:
                return [{"c": place}, {"c": -place}]
            return [self.some(record, field | {"type": kind}, place + more) for more in (0, 1)]
        if kind in self.model.fields:
            return self.full(kind, place)
        extremes = [0, 2**63 - 1, -2**63, 2**32, -1]
        texts = [field["name"], f"<{field['key']}> & 'so' \"on\"", f"{field['name']}: é", "漢字 😀"]
        return {int: place if place % 2 else extremes[place // 2 % 5] + (place == 1),
                bool: place % 2 == 0, str: texts[place % 4], bytes: bytes(range(place % 20))
                }[KINDS[kind]]

    def spellings(self):
        unknown = {"C": 1, "": "no key", "dtl ": [], "?": {"c": "not looked at", "deep": [[], [1.5]]}}
        self.add("payload", "unknown-keys", "keys that no field has are passed over, whatever is "
                 "under them", {"c": 96} | unknown)
        fields_none = [None, 2**100, plistlib.UID(1)]
        self.entries.append(("values that fit in no field, under an unknown key: a set of null, a wide "
                             "integer and a UID; a date out of range", "command-response", {
            "command-response/no-field.bplist":
                binary({"c": 96, "?": fields_none}).replace(b"\xa3", b"\xc3"),
            "command-response/no-field.plist":
                b"<plist><dict><key>?</key><array><date>2024-13-32T24:60:61Z</date><integer>-0x1"
                b"0000000000000000</integer></array><key>c</key><integer>96</integer></dict></plist>"
        }, {"record": {"command": 96}, "unknownKeys": {"count": 1, "paths": ["?"]}}))
        chain = {"c": 0, "Dc": {"c": 7}, "h": {"ri": "innermost"}}
        for depth in range(1, 20):
            chain = {"c": depth, "dtl" if depth % 2 else "mml": [chain]}
        self.add("payload", "nested", "payloads in one another's lists, 20 of them", chain)
        shared = {"ri": "r"}
        twice = {"c": 1, "mml": [{"c": 2, "h": shared}, {"c": 3, "h": shared}], "h": shared}
        self.add("payload", "shared", "one dictionary under three keys, an object of its own only "
                 "once in the binary form", twice)
        xml_text = (
            '<?xml version="1.0" encoding="UTF-8"?>\n<!DOCTYPE plist SYSTEM "plist.dtd">\n'
            '<!-- a comment --><plist version="1.0"><dict><key>c</key><integer> 0x60\n</integer>'
            '<key>q&#x61;i</key><string>a<![CDATA[ <b> ]]>&amp;<!-- none --> c\r\nd</string>'
            '<key>t</key><data>\n\tAAEC\n\tAw==\n</data><key>x-internal</key><true></true>'
            '<key>s</key><string>no integer, but the last one counts</string>'
            '<key>s</key><integer>+007</integer></dict></plist>\n')
        record = {"command": 96, "responseStatus": 7, "token": "AAECAw==", "internalBuild": True,
                  "applicationId": "a <b> & c\nd"}
        for name, about, encoded in (
                ("spelling", "comments, CDATA, references, hexadecimal, a repeated key: the last "
                 "one counts", xml_text.encode()),
                ("utf-16", "the same in UTF-16 with a byte-order mark",
                 xml_text.replace("UTF-8", "UTF-16").replace("<?", "\uFEFF<?").encode("utf-16-le"))):
            self.entries.append((about, "command-response", {
                f"command-response/{name}.plist": encoded}, {"record": record}))

    # Rejected messages.

    def wrong_kinds(self):
        """A wrong value for the first field of each type."""
        seen = set()
        for kind, (name, _) in RECORDS.items():
            for field in self.model.fields[name]:
                wanted = field["type"]
                for record in self.model.fields:
                    wanted = wanted.replace(record, "record")
                if wanted not in seen:
                    seen.add(wanted)
                    self.add(kind, "no-" + wanted.replace(" ", "-"),
                             f"{wanted} wanted, another kind found",
                             {"c": 96} | {field["key"]: True if wanted.startswith("Int") else 5})

    def faults(self):
        add = self.add
        add("command-response", "real", "a real is no integer", {"c": 96.0})
        add("command-response", "true", "true is no integer", {"c": True})
        add("command-response", "too-large", "an integer beyond 64 bits, signed", {"c": 2**63})
        add("command-response", "far-too-large", "an integer beyond 64 bits", {"c": 1, "s": -2**100})
        add("command-response", "null", "null is not absence", {"c": 1, "s": None}, [".bplist"])
        add("command-response", "lacking", "a required key is missing", {"C": 96, "?": 2**64})
        add("command-response", "no-dictionary", "the message is no dictionary", [{"c": 96}])
        add("payload", "nested-mismatch", "the fault lies deep", {
            "c": 1, "mml": [{"c": 2}, {"c": 3, "dtl": [{"c": 4, "U": "text"}]}]})
        add("payload", "nested-lacking", "a required key of an element is missing",
            {"c": 1, "dtl": [{"c": 2}, {"v": 3}]})
        add("payload", "element-mismatch", "one element of a list of texts is none",
            {"c": 1, "dal": ["a", b"b"]})
        add("payload", "two-faults", "two faults: the first in the record's order counts, wherever "
            "in the message it stands", {"ua": 5, "c": 1, "v": "8"})
        add("payload", "date-and-uid", "kinds that no field takes are mismatches",
            {"c": 1, "v": plistlib.UID(8)}, [".bplist"])
        add("web-tunnel-response", "header-mismatch", "the fault lies in the header block",
            {"c": 1, "h": {"ri": 5}})
        limit = self.model.tables["limits"]["nestedContainers"]
        lists = functools.reduce(lambda inner, _: [inner], range(limit - 1), [])
        deep = "<array>" * limit + "</array>" * limit
        self.entries.append((f"{limit + 1} containers inside one another", "command-response", {
            "command-response/too-deep.bplist": binary({"c": 1, "?": lists}),
            "command-response/too-deep.plist":
                f"<plist><dict><key>c</key><integer>1</integer><key>?</key>{deep}</dict></plist>"
                .encode()}, {"error": {"kind": "limitExceeded", "path": ""}}))

    def refuse(self, name, about, content, offset):
        self.entries.append((about, "command-response", {f"malformed/{name}": content}, {
            "error": {"kind": "malformed", "path": "", "offset": offset}}))

    def malformed_xml(self):
        for name, about, content in (
                ("empty", "nothing at all", "^"),
                ("text", "no property list", "^hello"),
                ("cut-short", "the end is missing",
                 "<plist><dict><key>c</key><integer>96</integer>^"),
                ("wrong-end-tag", "an end tag that closes nothing",
                 "<plist><dict><key>c</key><integer>96</integer>^</array></plist>"),
                ("key-without-value", "a key at the end of its dictionary",
                 "<plist><dict><key>c</key>^</dict></plist>"),
                ("entity", "an entity that nothing declares",
                 "<plist><dict><key>c</key><string>^&c;</string></dict></plist>"),
                ("internal-subset", "entities cannot be declared",
                 '<!DOCTYPE plist ^[<!ENTITY c "d">]><plist><dict/></plist>'),
                ("no-integer", "digits are wanted",
                 "<plist><dict><key>c</key><integer>^nine</integer></dict></plist>"),
                ("no-base64", "base64 is wanted",
                 "<plist><dict><key>t</key><data>AAEC^*A==</data></dict></plist>"),
                ("two-values", "only one value", "<plist><dict/>^<dict/></plist>"),
                ("after-the-end", "nothing may follow", "<plist><dict/></plist>^x")):
            before, after = content.split(AT)
            self.refuse(name + ".plist", about, (before + after).encode(), len(before.encode()))
        content = b"<plist><string>\xc3\x28</string></plist>"
        self.refuse("no-utf-8.plist", "bytes that are no text", content, content.index(b"\xc3"))

    def malformed_binary(self):
        """A good message with changed bytes. Its objects: at 8 a dictionary with two keys and two
        values, at 13 and 15 the keys, at 17 an integer, at 19 a list of that integer."""
        good = binary({"c": 96, "l": [96]})
        assert good[8:21] == b"\xd2\1\2\3\4\x51c\x51l\x10\x60\xa1\3", good
        trailer = len(good) - 32
        for name, about, changes, offset in (
                ("size-of-offsets", "offsets of no bytes", {trailer + 6: 0}, trailer + 6),
                ("top-object", "the top object is not in the table", {trailer + 23: 5}, trailer + 16),
                ("object-count", "more objects than offsets", {trailer + 15: 6}, trailer + 8),
                ("offset", "an offset behind the objects", {21 + 4: 21}, 21 + 4),
                ("reference", "a reference that is not in the table", {20: 5}, 20),
                ("cycle", "a list that contains itself", {20: 4}, 19),
                ("kind", "a kind of object that there is not", {17: 0x70}, 17),
                ("key", "a key that is no text", {9: 3}, 8),
                ("length", "a text longer than what is left", {13: 0x5E}, 13)):
            content = bytearray(good)
            for at, byte in changes.items():
                content[at] = byte
            self.refuse(name + ".bplist", about, bytes(content), offset)
        self.refuse("cut-short.bplist", "the end is missing", good[:-32], len(good) - 32)


def plain_xml(message):
    return re.sub(rb"<!DOCTYPE[^>]*>\n", b"", xml(message))
