"""Messages made from the records' tables: good ones, and ways to make them bad.

All choices come from the random.Random that a generator is given.
"""

import datetime
import plistlib

from message_model import KINDS, LIST_OF

GOOD_INTEGERS = [0, 1, -1, 7, 127, 128, 255, 256, 32767, 65535, 65536, -2**31, 2**31 - 1, 2**31,
                 2**32 - 1, 2**32, 2**53 + 1, 2**63 - 1, -2**63, -2**63 + 1]
WIDE_INTEGERS = [2**63, 2**63 + 1, 2**64 - 2, 2**64 - 1]
SIZES = [1, 2, 14, 15, 16, 17, 40, 255, 256, 300]  # binary lengths change their form at 15 and 256
MARKUP = "<&>\"']]>&amp;<![CDATA[ \n\t<!-- -->"
NOT_IN_XML = ["\0", "\x01", "\x0b", "\x1b", "\uFFFE", "\uFFFF"]


def wrong_values(type_name):
    """One or more of each kind other than the type's; for integers those that do not fit, too."""
    right = list if type_name.startswith(LIST_OF) else KINDS.get(type_name, dict)
    values = [5, True, "5", "", b"5", b"", 5.0, datetime.datetime(2001, 1, 1), plistlib.UID(5),
              [], [5], ["5"], {}, {"c": 5}]
    wide = WIDE_INTEGERS if right is int else []
    return [value for value in values if type(value) is not right] + wide


def every_fault(fields, name):
    """For each field of the record, and of each record nested in it, and for the second element of
    each list: messages whose only fault is there, one with each wrong value."""

    def faults(name, message_with, around):
        required = {field["key"]: 5 for field in fields[name] if not field["optional"]}
        for field in fields[name]:
            key, inner = field["key"], field["type"]
            put = lambda value: message_with(required | {key: value})
            yield from map(put, wrong_values(inner))
            if inner.startswith(LIST_OF):
                inner = inner[len(LIST_OF):]
                first = "5" if inner in KINDS else {"c": 5}
                put = lambda value: message_with(required | {key: [first, value]})
                yield from map(put, wrong_values(inner))
            if inner in fields and inner not in around:
                yield from faults(inner, put, [*around, inner])

    return faults(name, lambda message: message, [name])


class Generator:
    """One message's worth. `xml`: whether the message must be one that XML can hold.
    `carriage_returns`: whether text may have them."""

    def __init__(self, fields, random, xml, carriage_returns):
        self.fields = fields
        self.random = random
        self.xml = xml
        self.carriage_returns = carriage_returns
        self.records = random.choice([0, 3, 10, 30])  # that may yet be nested

    def chance(self, probability):
        return self.random.random() < probability

    # Good values.

    def text(self):
        r = self.random
        how = r.randrange(8)
        if how == 0:
            return ""
        if how == 1:
            return r.choice(["x", "0", "5", "true", MARKUP, " padded ", "e\u0301\u200d\u202e",
                             "\uFEFF", "\x7f\x85\u2028", "漢字かな😀"])
        if how < 5:
            return "".join(r.choices("abcXYZ019-_./ ", k=r.choice(SIZES)))
        if how == 5 and self.carriage_returns:
            return r.choice(["\r", "a\rb", "\r\n", "\n\r\n", "]]>\r"])
        if how == 6 and not self.xml:
            return "a" + r.choice(NOT_IN_XML) + r.choice(["", "é", "😀"])
        return "".join(self.character() for _ in range(r.choice(SIZES[:6])))

    def character(self):
        r = self.random
        while True:
            plane = r.choice([0, 0, 0, *range(17)])
            point = (plane << 16) + r.choice([r.randrange(0x20, 0x800), r.randrange(0x10000)])
            if point >= 0x20 and not 0xD800 <= point < 0xE000 and point not in (0xFFFE, 0xFFFF):
                return chr(point)

    def bytes(self):
        return self.random.randbytes(self.random.choice([0, 0, 4, 16, *SIZES]))

    def integer(self):
        r = self.random
        if self.chance(0.5):
            return r.choice(GOOD_INTEGERS)
        return r.choice([1, -1]) * r.getrandbits(r.randrange(1, 64))

    def scalar(self, kind):
        if kind is int:
            return self.integer()
        if kind is str:
            return self.text()
        if kind is bytes:
            return self.bytes()
        return self.chance(0.5)

    def value(self, type_name):
        if type_name.startswith(LIST_OF):
            return self.list(type_name[len(LIST_OF):])
        if type_name in self.fields:
            return self.record(type_name)
        return self.scalar(KINDS[type_name])

    def list(self, element):
        r = self.random
        count = r.choice([0, 1, 2, 3, 15, 16] if element in KINDS else [0, 1, 1, 2, 3])
        if element in self.fields:
            count = min(count, self.records)
        if count > 1 and self.chance(0.2):
            return [self.value(element)] * count  # one object, shared in the binary form
        return [self.value(element) for _ in range(count)]

    def record(self, name, share=None):
        """`share`: of its optional fields, how many to set."""
        self.records -= 1
        fields = self.fields[name]
        if share is None:
            share = self.random.choice([0, 0.5, 1]) if len(fields) < 100 else \
                self.random.choice([0, 0.02, 0.02, 0.1])
        message = {}
        for field in fields:
            if not field["optional"] or self.chance(share):
                message[field["key"]] = self.value(field["type"])
        while self.chance(0.2):
            key = self.random.choice([self.near_miss(name), self.text()])
            if all(key != field["key"] for field in fields):
                message[key] = self.anything()
        self.reorder(message)
        return message

    def top(self, name):
        r = self.random
        message = self.record(name, r.choice([0, 0.1, 0.1, 0.3, 0.8, 1]))
        itself = [field["key"] for field in self.fields[name] if field["type"] == LIST_OF + name]
        if itself and self.chance(0.05):
            for _ in range(r.randrange(60)):
                message = self.record(name, 0) | {r.choice(itself): [message]}
        return message

    def reorder(self, message):
        entries = list(message.items())
        order = self.random.randrange(4)
        if order == 0:
            return
        if order == 1:
            entries.reverse()
        else:
            self.random.shuffle(entries)
        message.clear()
        message.update(entries)

    # What a record is to pass over, or to refuse.

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
        if how == 4:
            return r.choice(WIDE_INTEGERS)
        if how == 5:
            return r.choice([0.0, -0.0, 1.5, 5.0, 1e300, -1e-300, float("inf"), float("nan")])
        if how == 6:
            return self.date()
        if how == 7:
            return plistlib.UID(r.choice([0, 255, 256, 2**32, 2**64 - 1]))
        values = [self.anything(depth - 1) for _ in range(r.randrange(4))]
        if how == 8:
            return values
        return {r.choice(["c", "i", "U", "h", "dtl", self.text()]): value for value in values}

    def date(self):
        return datetime.datetime(self.random.randrange(1, 10000), 2, 28, 23, 59, 59)

    def wrong(self, type_name):
        return self.random.choice(wrong_values(type_name))

    def break_somewhere(self, name, message):
        """Puts one fault into a message of the record `name` or into what is nested in it."""
        holders = []
        self.collect(name, message, holders)
        type_name, holder = self.random.choice(holders)
        if isinstance(holder, list):
            place = self.random.randrange(len(holder) + 1)
            holder.insert(place, self.wrong(type_name))
            return
        field = self.random.choice(self.fields[type_name])
        if self.chance(0.3):
            field = self.fields[type_name][0]
        if not field["optional"] and self.chance(0.6):
            holder.pop(field["key"], None)
        else:
            holder[field["key"]] = self.wrong(field["type"])
            self.reorder(holder)

    def collect(self, name, value, holders):
        """The dictionaries (with their record's name) and lists (with their elements' type)."""
        if name in self.fields and isinstance(value, dict):
            holders.append((name, value))
            for field in self.fields[name]:
                if field["key"] in value:
                    self.collect(field["type"], value[field["key"]], holders)
        elif name.startswith(LIST_OF) and isinstance(value, list):
            holders.append((name[len(LIST_OF):], value))
            for element in value:
                self.collect(name[len(LIST_OF):], element, holders)
