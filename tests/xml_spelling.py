"""Property lists in XML as other writers may spell them: comments, CDATA, references, hexadecimal
integers, white space, repeated keys, other encodings. What is written stands for the same value
(but for a UID, which has no XML form and becomes a date)."""

import base64
import datetime
import plistlib

DATE = datetime.datetime(2001, 1, 1)
REFERENCES = {"<": "&lt;", "&": "&amp;", ">": "&gt;", '"': "&quot;", "'": "&apos;"}


def without_uids(value):
    if isinstance(value, plistlib.UID):
        return DATE
    if isinstance(value, list):
        return [without_uids(element) for element in value]
    if isinstance(value, dict):
        return {key: without_uids(element) for key, element in value.items()}
    return value


class Speller:
    def __init__(self, random):
        self.random = random
        self.oddity = random.choice([0.02, 0.1, 0.5])  # how much is written in an unusual way

    def odd(self):
        return self.random.random() < self.oddity

    def spell(self, value):
        """The message as bytes."""
        r = self.random
        encoding, mark, declared = r.choice([
            ("utf-8", "", ""), ("utf-8", "", "UTF-8"), ("utf-8", "\uFEFF", "utf-8"),
            ("utf-16-le", "\uFEFF", "UTF-16"), ("utf-16-be", "\uFEFF", "utf-16"),
            ("utf-16-be", "\uFEFF", ""), ("ascii", "", "US-ASCII")])
        self.only_ascii = encoding == "ascii"
        head = ""
        if declared or r.random() < 0.5:
            quote = r.choice("\"'")
            head = f"<?xml version={quote}1.0{quote}"
            if declared:
                head += f" encoding = {quote}{declared}{quote}"
            head += r.choice(["", " standalone='yes'"]) + " ?>"
        head += self.space()
        head += r.choice(["", "<!DOCTYPE plist SYSTEM \"plist.dtd\">", "<!DOCTYPE plist >"])
        head += self.space() + r.choice(["<plist>", '<plist version="1.0">', "<plist\n>"])
        self.parts = [mark, head, self.space()]
        self.value(value)
        self.parts += [self.space(), r.choice(["</plist>", "</plist >"]), self.space()]
        return "".join(self.parts).encode(encoding)

    def space(self):
        if not self.odd():
            return self.random.choice(["", "", "\n"])
        return self.random.choice([" \t\r\n", "<!-- <key>c</key> -->", "\r<?note >?>\n", "<!---->"])

    def value(self, value):
        if isinstance(value, dict):
            self.container("dict", value, self.entries)
        elif isinstance(value, list):
            self.container("array", value, self.elements)
        elif isinstance(value, bool):
            name = "true" if value else "false"
            self.parts.append(f"<{name}></{name} >" if self.odd() else f"<{name}/>")
        elif isinstance(value, int):
            self.scalar("integer", self.integer(value))
        elif isinstance(value, float):
            self.scalar("real", self.padded(repr(value)))
        elif isinstance(value, str):
            self.scalar("string", self.text(value))
        elif isinstance(value, bytes):
            self.scalar("data", self.base64(value))
        else:
            date = DATE if isinstance(value, plistlib.UID) else value
            self.scalar("date", f"{date.year:04}" + date.strftime("-%m-%dT%H:%M:%SZ"))

    def container(self, name, value, content):
        if not value and self.random.random() < 0.5:
            self.parts.append(f"<{name}/>")
            return
        self.parts += [f"<{name}>", self.space()]
        content(value)
        self.parts.append(f"</{name} >" if self.odd() else f"</{name}>")

    def entries(self, value):
        for key, element in value.items():
            if self.random.random() < 0.01:  # the last of several counts
                self.entry(key, self.random.choice([5, "5", b"5", 5.0, DATE, [], {"c": {}}]))
            self.entry(key, element)

    def entry(self, key, element):
        self.scalar("key", self.text(key))
        self.parts.append(self.space())
        self.value(element)
        self.parts.append(self.space())

    def elements(self, value):
        for element in value:
            self.value(element)
            self.parts.append(self.space())

    def scalar(self, name, content):
        if not content and self.random.random() < 0.5:
            self.parts.append(f"<{name} />")
        else:
            self.parts += [f"<{name}>", content, f"</{name}>"]

    def padded(self, text):
        return self.random.choice([" ", "\n", "\t\r\n"]) + text + " " if self.odd() else text

    def integer(self, value):
        if value >= 0 and self.odd():
            value = self.random.choice([f"0x{value:x}", f"0X{value:016X}", f"+{value}",
                                        f"000{value}", f" {value}\n", f"\r\n\t{value} "])
        return self.text(str(value))

    def base64(self, value):
        text = base64.b64encode(value).decode()
        if not self.odd():
            return text
        width = self.random.randrange(1, 80)
        lines = [text[at:at + width] for at in range(0, len(text), width)]
        return self.random.choice(["\n\t", " ", "\r\n"]).join(["", *lines, ""])

    def text(self, text):
        if not self.odd():
            return "".join(map(self.plain, text))
        pieces = []
        while text:
            size = self.random.randrange(1, 10)
            pieces.append(self.piece(text[:size]))
            text = text[size:]
            if self.odd():
                pieces.append(self.random.choice(["<!-- & ]]> -->", "<?p &?>", "<![CDATA[]]>"]))
        return "".join(pieces)

    def plain(self, character):
        if character in "<&>\r" or self.only_ascii and character > "\x7f":
            return REFERENCES.get(character) or f"&#{ord(character)};"
        return character

    def piece(self, text):
        how = self.random.randrange(4)
        if how == 0 and "\r" not in text and "]]>" not in text and \
                (text.isascii() or not self.only_ascii):
            return "<![CDATA[" + text.replace("\n", self.line_end()) + "]]>"
        if how == 1:
            return "".join(f"&#x{ord(c):x};" if self.odd() else self.plain(c) for c in text)
        if how == 2:
            return "".join(REFERENCES.get(c) or f"&#{ord(c):07};" for c in text)
        return "".join(map(self.plain, text)).replace("\n", self.line_end())

    def line_end(self):
        return self.random.choice(["\n", "\r\n", "\r"])
