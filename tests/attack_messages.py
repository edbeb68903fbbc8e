"""Messages that attack: `catalogue(size)` gives (group, name, messages) for messages of up to
`size` bytes, as payloads. Nothing here needs a property-list library: none would write them."""

import struct

HEAD = b"bplist00"
TRAILER = 32


def number(value, size):
    return value.to_bytes(size, "big")


def head(kind, count):
    """Marker and length of data, text or a container."""
    if count < 15:
        return bytes([kind | count])
    size, power = (1, 0) if count < 1 << 8 else (2, 1) if count < 1 << 16 else (4, 2)
    return bytes([kind | 15, 0x10 | power]) + number(count, size)


def text(value):
    return head(0x50, len(value)) + value


def array(references, width=3):
    return head(0xA0, len(references)) + b"".join(number(r, width) for r in references)


def dictionary(entries, width=3):
    """Of pairs of references."""
    return (head(0xD0, len(entries)) + b"".join(number(key, width) for key, _ in entries) +
            b"".join(number(value, width) for _, value in entries))


def repeated(kind, count, reference, width):
    """A container of one reference over and over."""
    return head(kind, count) + number(reference, width) * (count * (2 if kind == 0xD0 else 1))


def trailer(offset_size, width, count, root, table):
    return bytes(6) + bytes([offset_size, width]) + struct.pack(">QQQ", count, root, table)


def message(objects, width=3, root=0):
    body, offsets = bytearray(HEAD), []
    for item in objects:
        offsets.append(len(body))
        body += item
    table = len(body)
    size = 1 if table < 1 << 8 else 2 if table < 1 << 16 else 3 if table < 1 << 24 else 4
    body += b"".join(number(offset, size) for offset in offsets)
    return bytes(body) + trailer(size, width, len(offsets), root, table)


ONE = b"\x10\x01"
OVERHEAD = 400  # of what stands around the part that fills a message


def payload(key, value, further=(), width=3):
    """{"c": 1, key: value}; the value is object 4, `further` follow."""
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


# --- the binary form's graph


def cycle(length):
    """Arrays, each the only element of the one before, and the first that of the last."""
    return payload(b"?", array([5]), [array([5 + (i + 1) % length]) for i in range(length)])


def cycles(size):
    yield "a container in itself", [message([dictionary([(1, 0)]), text(b"c")])]
    yield "a list of payloads in itself", [
        message([dictionary([(1, 2), (3, 4)]), text(b"c"), ONE, text(b"mml"), array([0])])]
    yield "long ones", [cycle(500), cycle((size - OVERHEAD) // 8)]
    yield "through keys", [message([dictionary([(0, 1)]), ONE]),
                           message([dictionary([(1, 1)]), array([0])])]


def wide(entries, key):
    """A payload of that many entries under one key."""
    return (head(0xD0, entries + 1) + number(key, 3) * entries + number(1, 3) +
            number(2, 3) * (entries + 1))


def doubling(levels, width):
    """Payloads, each `width` times in the list of the one before: width ** levels of them."""
    objects = [text(b"c"), ONE, text(b"mml")]
    for level in range(levels):
        place = len(objects)
        objects += [dictionary([(0, 1), (2, place + 1)]), array([place + 2] * width)]
    return message(objects + [dictionary([(0, 1)])], root=3)


def sharing(size):
    yield "doubling at each of 250 levels", [doubling(250, 2)]
    yield "255 levels of unknown lists, thousands of references in each", [
        payload(b"?", array([5]), [repeated(0xA0, (size - OVERHEAD) // 255 // 3 - 9, 6 + level, 3)
                                   for level in range(254)] + [b"\xa0"])]
    count = size // 2 - OVERHEAD
    yield "one text as all elements of a list", [
        payload(b"dal", repeated(0xA0, min(count, 4_000_000), 5, 1), [text(b"y" * 15)], 1)]
    yield "one empty payload as all elements of a list", [
        payload(b"mml", repeated(0xA0, min(count, 28_000), 5, 3), [dictionary([(1, 2)])]),
        payload(b"mml", repeated(0xA0, min(count, 400_000), 5, 3), [dictionary([(1, 2)])])]
    blob = b"\xaa" * (1 << 20 if size > 1 << 22 else 1 << 14)
    yield "a megabyte 64 and 4,000 times", [
        payload(b"mml", repeated(0xA0, times, 5, 3),
                [dictionary([(1, 2), (6, 7)]), text(b"P"), head(0x40, len(blob)) + blob])
        for times in (63, 4_000)]
    yield "a dictionary of unknown keys, or of keys like known ones, 10,000 times", [
        payload(b"mml", repeated(0xA0, 10_000, 5, 3), [wide(size // 8, 6), text(key)])
        for key in (b"unknown", b"strict-transport-securitY")]
    yield "the most of everything", [most_of_everything(size)]


def most_of_everything(size):
    """As many payloads, bytes and entries as may be, and nodes that nothing refers to behind."""
    times = min(28_140, size // 8)
    objects = [dictionary([(1, 2), (3, 4)]), text(b"c"), ONE, text(b"mml"),
               repeated(0xA0, times, 5, 3),
               dictionary([(1, 2), (6, 7)] + [(8, 2)] * 290), text(b"P"),
               head(0x40, 2370) + bytes(2370), text(b"?")]
    left = size - OVERHEAD - sum(map(len, objects))
    return message(objects + [b"\x08"] * (left // 4))


# --- the binary form's offsets, counts and lengths

EDGES = sorted({max(0, (1 << bits) + delta) & (2**64 - 1)
                for bits in (0, 3, 4, 7, 8, 15, 16, 24, 31, 32, 33, 48, 61, 62, 63, 64)
                for delta in (-2, -1, 0, 1)})


def wraps():
    good = message([dictionary([(1, 2), (3, 4)], 1), text(b"c"), ONE, text(b"dal"),
                    array([5], 1), text(b"x")], 1)
    for place, width in ((6, 1), (7, 1), (8, 8), (16, 8), (24, 8)):
        for value in EDGES:
            if value >> (8 * width) == 0:
                at = len(good) - TRAILER + place
                yield good[:at] + number(value, width) + good[at + width:]
    for width in range(1, 9):  # an offset, and a reference
        for value in EDGES:
            if value >> (8 * width) == 0:
                yield (HEAD + b"\xa0" + number(value, width) +
                       trailer(width, 1, 1, 0, len(HEAD) + 1))
                yield (HEAD + b"\xa1" + number(value, width) + b"\x08" +
                       trailer(1, width, 1, 0, len(HEAD) + 1 + width))


def lengths():
    """Lengths and counts with nothing behind them."""
    for kind in (0x40, 0x50, 0x60, 0xA0, 0xD0):
        for power in range(4):
            for value in EDGES:
                if value >> (8 << power) == 0:
                    yield payload(b"?", bytes([kind | 15, 0x10 | power]) + number(value, 1 << power))
    for kind in range(256):
        yield payload(b"?", bytes([kind]))


def overlapping(size):
    big = text(b"a" * (size // 2))
    count = (size - len(big) - OVERHEAD) // 3
    yield "one text of megabytes from millions of offsets", [
        HEAD + big + number(8, 3) * count + trailer(3, 1, count, 0, 8 + len(big))]
    starts = size // 12
    area = HEAD + b"\x5f\x12\x00\x00\xff\xff" * starts
    yield "texts that begin inside one another", [
        area + b"".join(number(8 + 6 * i, 3) for i in range(starts)) +
        trailer(3, 1, starts, 0, len(area))]


def nodes(size):
    yield "as many objects as bytes", [
        HEAD + b"\x08" * (size // 2 - 40) + b"\x08" * (size // 2 - 40) +
        trailer(1, 1, size // 2 - 40, 0, 8 + size // 2 - 40)]
    count = (size - OVERHEAD) // 4
    yield "millions of empty lists that nothing refers to", [payload(b"?", ONE, [b"\xa0"] * count)]
    yield "one list of millions of elements", [
        payload(b"?", repeated(0xA0, size - OVERHEAD, 2, 1), width=1)]
    yield "one dictionary of millions of entries", [
        payload(b"?", repeated(0xD0, (size - OVERHEAD) // 2, 1, 1), width=1)]
    # Keys in an order that no cache foresees.
    per = 1 + 4 + 3 + 3 + 3
    keys = (size - OVERHEAD) // per
    order = [3 + i * 7_368_787 % keys for i in range(keys)]
    yield "a million keys, shuffled", [
        message([head(0xD0, keys + 1) + b"".join(number(key, 3) for key in order) + number(1, 3) +
                 number(2, 3) * (keys + 1), text(b"c"), ONE] +
                [b"\x54" + number(0x61626364 + i % 7, 4) for i in range(keys)])]


def depths(size):
    """So many containers inside one another, parents first and last."""
    for containers in (512, 513, (size - OVERHEAD) // 8):
        lists = containers - 2
        yield payload(b"?", array([5]), [array([6 + i]) for i in range(lists - 1)] + [b"\xa0"])
        lists = containers - 1
        yield message([b"\xa0"] + [array([i]) for i in range(lists - 1)] +
                      [dictionary([(lists + 1, lists + 2), (lists + 3, lists - 1)]), text(b"c"),
                       ONE, text(b"?")], root=lists)


def deep_payloads(levels):
    inner = b"<dict><key>c</key><integer>1</integer></dict>"
    start = b"<dict><key>c</key><integer>1</integer><key>mml</key><array>"
    return xml(start * (levels - 1) + inner + b"</array></dict>" * (levels - 1))


def nesting(size):
    yield "512, 513 and 2 million containers inside one another, parents first or last", list(depths(size))
    yield "payloads in payloads, 256 and 257", [
        doubling(255, 1), doubling(256, 1), deep_payloads(256), deep_payloads(257)]
    yield "XML: lists or dictionaries opened by the megabyte", [
        filled(size, b"<array>", b"<plist>"), filled(size, b"<dict><key/>", b"<plist>")]


def tiny_records(size):
    count = min(400_000, (size - OVERHEAD) // 50)
    yield "400,000 payloads, binary", [
        payload(b"mml", array(range(5, 5 + count)), [b"\xd1" + number(1, 3) + number(2, 3)] * count)]
    yield "all payloads that fit, each its own", [
        payload(b"mml", array(range(5, 5 + min(count, 28_000))),
                [b"\xd1" + number(1, 3) + number(2, 3)] * min(count, 28_000))]
    yield "millions of relay records", [
        payload(b"qplr", repeated(0xA0, min(size // 2, 1_100_000), 5, 3), [b"\xd0"])]
    one = b"<dict><key>c</key><integer>1</integer></dict>"
    yield "XML: empty dictionaries by the megabyte", [
        xml_payload(b"mml", filled(size, b"<dict/>", b"<array>", b"</array>")),
        xml_payload(b"mml", b"<array>" + one * min(count, 28_000) + b"</array>")]


# --- text


def surrogates():
    high, low, plain = b"\xd8\x3d", b"\xde\x00", b"\x00a"
    for units in (high, low, low + high, high + high + low, high + low + low, high + plain + low,
                  plain + low, plain + high, b"\xdb\xff", b"\xdf\xff\xd8\x00"):
        yield payload(b"?", head(0x60, len(units) // 2) + units)
        little = b"".join(units[i:i + 2][::-1] for i in range(0, len(units), 2))
        before, after = (utf16(part)[2:] for part in (b"<plist><string>", b"</string></plist>"))
        yield b"\xff\xfe" + before + little + after
    for reference in (b"&#xD83D;", b"&#xDE00;", b"&#xD83D;&#xDE00;"):
        yield xml_payload(b"u", b"<string>" + reference + b"</string>")


def broken_utf8():
    for sequence in (b"\x80", b"\xbf", b"\xc0\x80", b"\xc1\xbf", b"\xc2", b"\xc3\x28",
                     b"\xe0\x80\x80", b"\xe0\x9f\xbf", b"\xe2\x82", b"\xed\xa0\x80",
                     b"\xed\xbf\xbf", b"\xf0\x80\x80\x80", b"\xf0\x8f\xbf\xbf", b"\xf0\x9f\x98",
                     b"\xf4\x90\x80\x80", b"\xf5\x80\x80\x80", b"\xf8\x88\x80\x80\x80", b"\xfe",
                     b"\xff", b"\xef\xbf\xbe", b"\xef\xbf\xbf"):
        for before in (b"", b"x" * 15, b"x" * 31):
            yield xml_payload(b"u", b"<string>" + before + sequence + b"</string>")
            yield b"<plist><string>" + before + sequence
            yield payload(b"u", text(before + sequence))


def texts(size):
    yield "surrogates in every wrong order", list(surrogates())
    yield "UTF-8 over-long, cut short, past the end", list(broken_utf8())
    yield "UTF-16 that grows by half", [
        payload(b"u", head(0x60, (size - OVERHEAD) // 2) + b"\x4e\x2d" * ((size - OVERHEAD) // 2)),
        utf16(xml_payload(b"u", b"<string>" + "中".encode() * ((size - OVERHEAD) // 2)
                          + b"</string>"))]
    yield "millions of texts of one UTF-16 unit", [
        payload(b"?", ONE, [b"\x61\x4e\x2d"] * ((size - OVERHEAD) // 6))]
    yield "NUL everywhere", [
        bytes(size), HEAD + bytes(size - 8), b"<plist>" + bytes(size // 2), b"\xff\xfe" + bytes(99),
        payload(b"u", text(bytes(size // 2))), payload(b"\0", text(b"")),
        xml_payload(b"u", b"<string>a\0b</string>"), xml_payload(b"u", b"<string>&#0;</string>")]


# --- XML


def entities(size):
    levels = b"".join(b'<!ENTITY l%d "%s">' % (i, b"&l%d;" % (i - 1) * 10) for i in range(1, 12))
    plist = b"<plist><string>&l11;</string></plist>"
    yield "entity bomb", [b'<!DOCTYPE plist [<!ENTITY l0 "ha">' + levels + b"]>" + plist]
    yield "external entities", [
        b'<!DOCTYPE plist [<!ENTITY x SYSTEM "file:///etc/passwd">]><plist>&x;</plist>',
        b'<!DOCTYPE plist SYSTEM "file:///etc/passwd"><plist><string>&x;</string></plist>',
        b'<!DOCTYPE plist PUBLIC "x" "http://127.0.0.1/x"><plist>&x;</plist>']
    yield "internal subsets", [
        b"<!DOCTYPE plist [" + filled(size, b'<!ATTLIST dict a CDATA "x">') + b"]>" + xml(b"<true/>")]
    yield "references by the megabyte", [
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
    yield "comments and sections by the million", [
        xml(filled(size, b"<!---->", b"<array>", b"</array>")),
        xml(filled(size, b"<![CDATA[]]>", b"<string>", b"</string>")),
        xml(filled(size, b"<?a?>", b"<string>", b"</string>"))]
    yield "line ends by the megabyte", [xml(filled(size, piece, b"<string>", b"</string>"))
                                        for piece in (b"\r", b"\rx", b"<![CDATA[\r\r\r\r]]>")]


def numbers(size):
    yield "digits by the megabyte", [
        xml_payload(b"?", filled(size, piece, b"<" + tag + b">" + before, after + b"</" + tag + b">"))
        for tag, piece, before, after in (
            (b"integer", b"1", b"", b""), (b"integer", b"0", b"", b"7"),
            (b"integer", b"f", b"0x", b""), (b"integer", b"0", b"-0x", b"7"),
            (b"integer", b" ", b"", b"7"), (b"integer", b"<![CDATA[ ]]>", b"", b"7"),
            (b"real", b"1", b"1.", b""), (b"real", b"9", b"1e", b""), (b"date", b"2", b"", b""))]
    yield "digits of a character reference by the megabyte", [
        xml_payload(b"u", filled(size, b"0", b"<string>&#", b"65;</string>")),
        xml_payload(b"u", filled(size, b"9", b"<string>&#", b";</string>"))]


def data(size):
    yield "base64: plain, spaced, cut by comments, wrong at the end", [
        xml_payload(b"P", filled(size, piece, b"<data>", after + b"</data>"))
        for piece, after in ((b"AAAA", b""), (b"A A A A ", b""), (b"\n", b""),
                             (b"AAAA<!---->", b""), (b"<![CDATA[AAAA]]>", b""), (b"AAAA", b"!"),
                             (b"=", b""), (b"AAAA", b"<!---->"))]
    yield "empty elements by the million", [
        xml_payload(b"?", filled(size, piece, b"<array>", b"</array>"))
        for piece in (b"<true/>", b"<dict/>", b"<string/>", b"<data/>", b"<string>&lt;</string>",
                      b"<integer>1</integer>")]


def encodings(size):
    def declared(name):
        return b'<?xml version="1.0" encoding="' + name + b'"?>'
    plain = xml_payload(b"u", "<string>é</string>".encode())
    yield "encoding declarations that lie", [
        declared(b"UTF-16") + plain, declared(b"US-ASCII") + plain, utf16(declared(b"UTF-8") + plain),
        declared(b"UTF-7") + plain, declared(b"ISO-8859-1") + plain, declared(b"") + plain,
        b"\xef\xbb\xbf" + utf16(plain), utf16(plain)[2:], b"\xfe\xff" + utf16(plain)[2:],
        utf16(plain)[:-1], b"\xff\xfe\0\0" + plain.decode().encode("utf-32-le")]
    yield "declarations of megabytes", [
        filled(size, b"U", b'<?xml version="1.0" encoding="', b'"?>') + xml(b"<true/>"),
        filled(size, b"1", b'<?xml version="1.', b'"?>') + xml(b"<true/>")]


def catalogue(size):
    groups = [
        ("reference cycles", cycles(size)), ("sharing", sharing(size)),
        ("wrap-around", [("offsets, counts and sizes at every edge", list(wraps())),
                         ("lengths without bytes, markers without objects", list(lengths()))]),
        ("overlapping", overlapping(size)), ("many objects", nodes(size)),
        ("nesting", nesting(size)), ("tiny records", tiny_records(size)), ("text", texts(size)),
        ("entities", entities(size)), ("unclosed", unclosed(size)), ("numbers", numbers(size)),
        ("data", data(size)), ("encodings", encodings(size)),
        ("size", [("a message one byte too long", [b" " * (size + 1)])]),
    ]
    for group, attacks in groups:
        for name, messages in attacks:
            yield group, name, messages
