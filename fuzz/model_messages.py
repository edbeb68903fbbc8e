"""Valid and invalid messages made from the records' tables, by a given random.Random."""

import datetime
import plistlib

from message_model import KINDS, LIST_OF

GOOD_INTEGERS = [0, 1, -1, 7, 127, 128, 255, 256, 32767, 65535, 65536, -2**31, 2**31 - 1, 2**31,
                 2**32 - 1, 2**32, 2**53 + 1, 2**63 - 1, -2**63, -2**63 + 1]
WIDE_INTEGERS = [2**63, 2**64 - 1, 2**64, 2**127 - 1, -2**63 - 1, -2**127]
REALS = [0.0, -0.0, 1.5, 5.0, 1e300, -1e-300, float("inf"), float("nan")]
SIZES = [1, 2, 14, 15, 16, 17, 40, 255, 256, 300]  # binary lengths take more bytes from 15, 256
ODD_TEXTS = ["", "", "x", "0", "5", "true", " padded ", "e\u0301\u200d\u202e", "\uFEFF",
             "\x7f\x85\u2028", "漢字かな😀", "<&>\"']]>&amp;<![CDATA[ \n\t<!-- -->"]
NOT_IN_XML = ["\r", "a\0", "\x01é", "\x0b", "\x1b😀", "a\uFFFE", "\uFFFF"]


def wrong_values(type_name, for_xml):
    """Values of each kind but the type's, and integers that do not fit."""
    right = list if type_name.startswith(LIST_OF) else KINDS.get(type_name, dict)
    values = [5, True, "5", "", b"5", b"", 5.0, datetime.datetime(2001, 1, 1), [], [5], ["5"], {},
              {"c": 5}] + [plistlib.UID(5), None] * (not for_xml)
    return [value for value in values if type(value) is not right] + WIDE_INTEGERS * (right is int)


def every_fault(fields, name, for_xml):
    """For each field of the record, and of each record nested in it, and for the second element of
    each list: messages whose only fault is there, one with each wrong value."""

    def faults(name, message_with, around):
        required = {field["key"]: 5 for field in fields[name] if not field["optional"]}
        for field in fields[name]:
            key, inner = field["key"], field["type"]
            put = lambda value: message_with(required | {key: value})
            yield from map(put, wrong_values(inner, for_xml))
            if inner.startswith(LIST_OF):
                inner = inner[len(LIST_OF):]
                first = "5" if inner in KINDS else {"c": 5}
                put = lambda value: message_with(required | {key: [first, value]})
                yield from map(put, wrong_values(inner, for_xml))
            if inner in fields and inner not in around:
                yield from faults(inner, put, [*around, inner])

    return faults(name, lambda message: message, [name])


class Generator:
    """Makes one message. `xml`: only values that XML can hold. `faults`: the share of values that
    are of a wrong kind or missing."""

    def __init__(self, fields, random, xml, faults):
        self.fields = fields
        self.random = random
        self.xml = xml
        self.odd_texts = ODD_TEXTS + NOT_IN_XML * (not xml)
        self.faults = faults
        self.records = random.choice([0, 3, 10, 30])  # that may yet be nested

    def chance(self, probability):
        return self.random.random() < probability

    def message(self, name):
        message = self.value(name, self.random.choice([0, 0.1, 0.1, 0.3, 0.8, 1]))
        itself = [field["key"] for field in self.fields[name] if field["type"] == LIST_OF + name]
        if itself and self.chance(0.05):
            for _ in range(self.random.randrange(60)):
                message = self.record(name, 0) | {self.random.choice(itself): [message]}
        return message

    def value(self, type_name, share=None):
        if self.chance(self.faults):
            return self.random.choice(wrong_values(type_name, self.xml))
        if type_name.startswith(LIST_OF):
            return self.list(type_name[len(LIST_OF):])
        if type_name in self.fields:
            return self.record(type_name, share)
        return self.scalar(KINDS[type_name])

    def record(self, name, share=None):
        """`share`: of its optional fields, how many to set."""
        self.records -= 1
        fields = self.fields[name]
        if share is None:
            share = self.random.choice([0, 0.5, 1] if len(fields) < 100 else [0, 0.02, 0.02, 0.1])
        message = {field["key"]: self.value(field["type"]) for field in fields
                   if self.chance(share if field["optional"] else 1 - self.faults)}
        while self.chance(0.2):
            key = self.random.choice([self.near_miss(name), self.text()])
            if all(key != field["key"] for field in fields):
                message[key] = self.anything()
        entries = list(message.items())
        self.random.choice([list, list.reverse, self.random.shuffle])(entries)
        return dict(entries)

    def list(self, element):
        count = self.random.choice([0, 1, 2, 3, 15, 16] if element in KINDS else [0, 1, 1, 2, 3])
        if element in self.fields:
            count = min(count, self.records)
        if count > 1 and self.chance(0.2):
            return [self.value(element)] * count  # one object, shared in the binary form
        return [self.value(element) for _ in range(count)]

    def scalar(self, kind):
        r = self.random
        if kind is int:
            some = r.choice([1, -1]) * r.getrandbits(r.randrange(1, 64))
            return r.choice([some, r.choice(GOOD_INTEGERS)])
        if kind is bytes:
            return r.randbytes(r.choice([0, 0, 4, 16, *SIZES]))
        return self.text() if kind is str else self.chance(0.5)

    def text(self):
        r = self.random
        how = r.randrange(8)
        if how < 3:
            return r.choice(self.odd_texts)
        if how < 6:
            return "".join(r.choices("abcXYZ019-_./ ", k=r.choice(SIZES)))
        return "".join(self.character() for _ in range(r.choice(SIZES[:6])))

    def character(self):
        r = self.random
        while True:
            plane = r.choice([0, 0, 0, *range(17)])
            point = (plane << 16) + r.choice([r.randrange(0x20, 0x800), r.randrange(0x10000)])
            if point >= 0x20 and not 0xD800 <= point < 0xE000 and point not in (0xFFFE, 0xFFFF):
                return chr(point)

    # What a record is to pass over.

    def near_miss(self, name):
        key = self.random.choice(self.fields[name])["key"]
        return self.random.choice([key.swapcase(), key.upper(), key + " ", " " + key, key + "\n",
                                   key[:-1], key + "x", key + key, "\uFEFF" + key,
                                   key.replace("-", "_"), chr(ord(key[0]) + 0xFEE0) + key[1:]])

    def anything(self, depth=3):
        r = self.random
        how = r.randrange(10 if depth else 8)
        if how < 4:
            return self.scalar([int, str, bytes, bool][how])
        if how < 6:
            return r.choice([WIDE_INTEGERS, REALS + [None] * (not self.xml)][how - 4])
        if how == 6 or how == 7 and self.xml:
            return datetime.datetime(r.randrange(1, 10000), 2, 28, 23, 59, 59)
        if how == 7:
            return plistlib.UID(r.choice([0, 255, 256, 2**32, 2**64 - 1]))
        values = [self.anything(depth - 1) for _ in range(r.randrange(4))]
        if how == 8:
            return values
        return {r.choice(["c", "i", "U", "h", "dtl", self.text()]): value for value in values}
