"""Messages that attack: `catalogue(size)` yields (group, name, messages), payloads of at most `size`
bytes. No property-list library would write them."""

import array as arrays
import struct

HEAD = b"bplist00"


def number(value, size):
    return value.to_bytes(size, "big")


def numbers_of(values, size, marker=b""):
    """The values in `size` bytes each, each behind the marker; of millions in no time."""
    words = arrays.array("I", values)
    words.byteswap()
    columns, step = words.tobytes(), len(marker) + size
    out = bytearray(len(words) * step)
    for place, byte in enumerate(marker):
        out[place::step] = bytes([byte]) * len(words)
    for place in range(size):
        out[len(marker) + place::step] = columns[4 - size + place::4]
    return bytes(out)


def head(kind, count):
    """Marker and length of data, text or a container."""
    if count < 15:
        return bytes([kind | count])
    size, power = (1, 0) if count < 1 << 8 else (2, 1) if count < 1 << 16 else (4, 2)
    return bytes([kind | 15, 0x10 | power]) + number(count, size)


def text(value):
    return head(0x50, len(value)) + value


def array(references, width=3):
    return head(0xA0, len(references)) + numbers_of(references, width)


def dictionary(entries, width=3):
    """Of {key, value} pairs of references."""
    return head(0xD0, len(entries)) + b"".join(numbers_of(half, width) for half in zip(*entries))


def repeated(kind, count, reference, width):
    """A container of `count` copies of one reference."""
    return head(kind, count) + number(reference, width) * (count * (2 if kind == 0xD0 else 1))


def trailer(offset_size, width, count, root, table):
    return bytes(6) + bytes([offset_size, width]) + struct.pack(">QQQ", count, root, table)


class Row:
    """Objects of one size, one behind the other."""

    def __init__(self, size, content):
        self.size, self.content = size, content


def lists(elements):
    """A row of lists of one element, with references of 3 bytes."""
    return Row(4, numbers_of(elements, 3, b"\xa1"))


def message(objects, width=3, root=0):
    body, offsets = bytearray(HEAD), arrays.array("I")
    for item in objects:
        row = item if isinstance(item, Row) else Row(len(item), item)
        offsets.extend(range(len(body), len(body) + len(row.content), row.size))
        body += row.content
    table = len(body)
    size = 1 if table < 1 << 8 else 2 if table < 1 << 16 else 3 if table < 1 << 24 else 4
    return bytes(body) + numbers_of(offsets, size) + trailer(size, width, len(offsets), root, table)


ONE = b"\x10\x01"
OVERHEAD = 400  # bytes around the part that fills a message


def payload(key, value, further=(), width=3):
    """{"c": 1, key: value}; `value` is object 4 and `further` are the next ones."""
    return message([dictionary([(1, 2), (3, 4)], width), text(b"c"), ONE, text(key), value,
                    *further], width)


def xml(body):
    return b'<plist version="1.0">' + body + b"</plist>"


def xml_payload(key, value):
    return xml(b"<dict><key>c</key><integer>1</integer><key>" + key + b"</key>" + value + b"</dict>")


def filled(size, piece, before=b"", after=b""):
    return before + piece * ((size - OVERHEAD - len(before) - len(after)) // len(piece)) + after


def utf16(content):
    return b"\xff\xfe" + content.decode().encode("utf-16-le")


# --- the object graph of the binary format


def reference_cycles(size):
    """Arrays, each the only element of its predecessor, the first that of the last."""
    length = (size - OVERHEAD) // 8
    yield "one cycle of two million arrays", [payload(b"?", array([5]), [lists([*range(6, 5 + length), 5])])]


def wide(entries, key):
    """A payload with that many entries under one key."""
    return (head(0xD0, entries + 1) + number(key, 3) * entries + number(1, 3) +
            number(2, 3) * (entries + 1))


def doubling(levels):
    """Payloads, each twice in the list of its predecessor: 2 ** levels of them."""
    objects = [text(b"c"), ONE, text(b"mml")]
    for level in range(levels):
        place = len(objects)
        objects += [dictionary([(0, 1), (2, place + 1)]), array([place + 2] * 2)]
    return message(objects + [dictionary([(0, 1)])], root=3)


def sharing(size):
    yield "250 levels, each twice in its parent", [doubling(250)]
    yield "255 levels of arrays, thousands of references to each", [
        payload(b"?", array([5]), [repeated(0xA0, (size - OVERHEAD) // 255 // 3 - 9, 6 + level, 3)
                                   for level in range(254)] + [b"\xa0"])]
    count = size // 2 - OVERHEAD
    yield "one text as every element of a list", [
        payload(b"dal", repeated(0xA0, min(count, 4_000_000), 5, 1), [text(b"y" * 15)], 1)]
    yield "one empty payload as every element of a list", [
        payload(b"mml", repeated(0xA0, min(count, times), 5, 3), [dictionary([(1, 2)])])
        for times in (28_000, 400_000)]
    blob = b"\xaa" * (1 << 20 if size > 1 << 22 else 1 << 14)
    yield "1 MiB of data, referenced 63 and 4,000 times", [
        payload(b"mml", repeated(0xA0, times, 5, 3),
                [dictionary([(1, 2), (6, 7)]), text(b"P"), head(0x40, len(blob)) + blob])
        for times in (63, 4_000)]
    yield "a dictionary of unknown keys, or of keys like known ones, 10,000 times", [
        payload(b"mml", repeated(0xA0, 10_000, 5, 3), [wide(size // 8, 6), text(key)])
        for key in (b"unknown", b"strict-transport-securitY")]
    yield "nearly every limit at once", [most_of_everything(size)]


def most_of_everything(size):
    """As many payloads, bytes and entries as the limits allow, then unreferenced objects."""
    times = min(28_140, size // 8)
    objects = [dictionary([(1, 2), (3, 4)]), text(b"c"), ONE, text(b"mml"),
               repeated(0xA0, times, 5, 3),
               dictionary([(1, 2), (6, 7)] + [(8, 2)] * 290), text(b"P"),
               head(0x40, 2370) + bytes(2370), text(b"?")]
    left = size - OVERHEAD - sum(map(len, objects))
    return message([*objects, Row(1, b"\x08" * (left // 4))])


# --- offsets and counts of the binary format

def overlapping(size):
    big = text(b"a" * (size // 2))
    count = (size - len(big) - OVERHEAD) // 3
    yield "millions of offsets in one long text", [
        HEAD + big + number(8, 3) * count + trailer(3, 1, count, 0, 8 + len(big))]
    starts = size // 12
    area = HEAD + b"\x5f\x12\x00\x00\xff\xff" * starts
    yield "texts that overlap", [
        area + numbers_of(range(8, 8 + 6 * starts, 6), 3) + trailer(3, 1, starts, 0, len(area))]


def many_objects(size):
    yield "millions of objects at one offset", [
        HEAD + b"\x08" * (size // 2 - 40) + b"\x08" * (size // 2 - 40) +
        trailer(1, 1, size // 2 - 40, 0, 8 + size // 2 - 40)]
    count = (size - OVERHEAD) // 4
    yield "millions of unreferenced empty arrays", [payload(b"?", ONE, [Row(1, b"\xa0" * count)])]
    yield "one array of millions of elements", [
        payload(b"?", repeated(0xA0, size - OVERHEAD, 2, 1), width=1)]
    yield "one dictionary of millions of entries", [
        payload(b"?", repeated(0xD0, (size - OVERHEAD) // 2, 1, 1), width=1)]
    # Keys in an order that no cache foresees.
    keys = (size - OVERHEAD) // (1 + 4 + 3 + 3 + 3)
    order = [3 + i * 7_368_787 % keys for i in range(keys)]
    texts = numbers_of((0x61626364 + i % 7 for i in range(keys)), 4, b"\x54")
    yield "a million keys, shuffled", [
        message([head(0xD0, keys + 1) + numbers_of(order, 3) + number(1, 3) +
                 number(2, 3) * (keys + 1), text(b"c"), ONE, Row(5, texts)])]


def nesting(size):
    count = (size - OVERHEAD) // 8
    yield "two million nested arrays, outermost first or last", [
        payload(b"?", array([5]), [lists(range(6, 5 + count)), b"\xa0"]),
        message([b"\xa0", lists(range(count - 1)),
                 dictionary([(count + 1, count + 2), (count + 3, count - 1)]), text(b"c"), ONE,
                 text(b"?")], root=count)]
    yield "XML: megabytes of unclosed arrays or dictionaries", [
        filled(size, b"<array>", b"<plist>"), filled(size, b"<dict><key/>", b"<plist>")]


def tiny_records(size):
    for what, most in (("400,000 payloads", 400_000), ("28,000 payloads", 28_000)):
        count = min(most, (size - OVERHEAD) // 50)
        yield what + ", binary", [
            payload(b"mml", array(range(5, 5 + count)),
                    [Row(7, (b"\xd1" + number(1, 3) + number(2, 3)) * count)])]
    yield "a million relay records", [
        payload(b"qplr", repeated(0xA0, min(size // 2, 1_100_000), 5, 3), [b"\xd0"])]
    one = b"<dict><key>c</key><integer>1</integer></dict>"
    yield "XML: megabytes of empty dictionaries, 28,000 payloads", [
        xml_payload(b"mml", filled(size, b"<dict/>", b"<array>", b"</array>")),
        xml_payload(b"mml", b"<array>" + one * min(size // 50, 28_000) + b"</array>")]


# --- text


def texts(size):
    yield "UTF-16 that grows by half as UTF-8", [
        payload(b"u", head(0x60, (size - OVERHEAD) // 2) + b"\x4e\x2d" * ((size - OVERHEAD) // 2)),
        utf16(xml_payload(b"u", b"<string>" + "中".encode() * ((size - OVERHEAD) // 2)
                          + b"</string>"))]
    yield "millions of texts of one UTF-16 unit", [
        payload(b"?", ONE, [Row(3, b"\x61\x4e\x2d" * ((size - OVERHEAD) // 6))])]
    yield "NUL bytes", [
        bytes(size), HEAD + bytes(size - 8), b"<plist>" + bytes(size // 2),
        payload(b"u", text(bytes(size // 2)))]


# --- XML


def entities(size):
    levels = b"".join(b'<!ENTITY l%d "%s">' % (i, b"&l%d;" % (i - 1) * 10) for i in range(1, 12))
    yield "entity bomb, internal subset", [
        b'<!DOCTYPE plist [<!ENTITY l0 "ha">' + levels + b"]><plist><string>&l11;</string></plist>",
        b"<!DOCTYPE plist [" + filled(size, b'<!ATTLIST dict a CDATA "x">') + b"]>" + xml(b"<true/>")]
    yield "megabytes of references", [
        xml_payload(b"u", filled(size, piece, b"<string>", b"</string>"))
        for piece in (b"&amp;", b"&#65;", b"&#x10FFFF;", b"&")]


def unclosed(size):
    yield "unclosed comments, CDATA, instructions, tags", [
        filled(size, piece, start) for start, piece in (
            (b"<!--", b"- "), (b"<!--", b"-"), (b"<plist><string><![CDATA[", b"]"),
            (b"<plist><string><![CDATA[", b"]] "), (b"<?a ", b"?"), (b"<plist><string>", b"]]"),
            (b"<plist><array>", b"<"), (b"<plist><array>", b"<string>"), (b"<plist", b" "),
            (b"<!DOCTYPE plist SYSTEM '", b"a"), (b"<!DOCTYPE ", "\u0300".encode()))]
    yield "tags and names of megabytes", [
        xml(filled(size, b" ", b"<string", b"></string>")), filled(size, b"a", b"<plist><", b"/>"),
        xml(filled(size, b" ", b"<string></string", b">")), filled(size, b"a", b"<?", b"?><plist/>")]
    yield "a million attributes", [
        filled(size, b" a=''", start, b">") for start in
        (b"<plist", b"<plist><dict", b"<?xml version='1.0'")]
    yield "millions of comments, CDATA sections, instructions", [
        xml(filled(size, b"<!---->", b"<array>", b"</array>")),
        xml(filled(size, b"<![CDATA[]]>", b"<string>", b"</string>")),
        xml(filled(size, b"<?a?>", b"<string>", b"</string>"))]
    yield "megabytes of line ends", [xml(filled(size, piece, b"<string>", b"</string>"))
                                        for piece in (b"\r", b"\rx", b"<![CDATA[\r\r\r\r]]>")]


def numbers(size):
    yield "megabytes of digits", [
        xml_payload(b"?", filled(size, piece, b"<" + tag + b">" + before, after + b"</" + tag + b">"))
        for tag, piece, before, after in (
            (b"integer", b"1", b"", b""), (b"integer", b"0", b"", b"7"),
            (b"integer", b"f", b"0x", b""), (b"integer", b"0", b"-0x", b"7"),
            (b"integer", b" ", b"", b"7"), (b"integer", b"<![CDATA[ ]]>", b"", b"7"),
            (b"real", b"1", b"1.", b""), (b"real", b"9", b"1e", b""), (b"date", b"2", b"", b""))]
    yield "megabytes of digits in a character reference", [
        xml_payload(b"u", filled(size, b"0", b"<string>&#", b"65;</string>")),
        xml_payload(b"u", filled(size, b"9", b"<string>&#", b";</string>"))]


def data(size):
    yield "base64: plain, spaced, cut by comments, wrong at the end", [
        xml_payload(b"P", filled(size, piece, b"<data>", after + b"</data>"))
        for piece, after in ((b"AAAA", b""), (b"A A A A ", b""), (b"\n", b""),
                             (b"AAAA<!---->", b""), (b"<![CDATA[AAAA]]>", b""), (b"AAAA", b"!"),
                             (b"=", b""), (b"AAAA", b"<!---->"))]
    yield "millions of small elements", [
        xml_payload(b"?", filled(size, piece, b"<array>", b"</array>"))
        for piece in (b"<true/>", b"<dict/>", b"<string/>", b"<data/>", b"<string>&lt;</string>",
                      b"<integer>1</integer>")]


def encodings(size):
    yield "XML declarations of megabytes", [
        filled(size, piece, start, b'"?>') + xml(b"<true/>") for piece, start in (
            (b"U", b'<?xml version="1.0" encoding="'), (b"1", b'<?xml version="1.'))]


def too_long(size):
    yield "one byte over the limit", [b" " * (size + 1)]


def catalogue(size):
    for group in (reference_cycles, sharing, overlapping, many_objects, nesting, tiny_records, texts,
                  entities, unclosed, numbers, data, encodings, too_long):
        for name, messages in group(size):
            yield group.__name__.replace("_", " "), name, messages
