"""Property lists in XML as other writers may spell them: comments, CDATA, references, hexadecimal
integers, white space, repeated keys, other encodings. What is written stands for the same value."""

import base64

REFERENCES = {"<": "&lt;", "&": "&amp;", ">": "&gt;", '"': "&quot;", "'": "&apos;"}
ENCODINGS = [("utf-8", "", ""), ("utf-8", "", "UTF-8"), ("utf-8", "\uFEFF", "utf-8"),
             ("utf-16-le", "\uFEFF", "UTF-16"), ("utf-16-be", "\uFEFF", "utf-16"),
             ("utf-16-be", "\uFEFF", ""), ("ascii", "", "US-ASCII")]
DOCTYPES = ["", '<!DOCTYPE plist SYSTEM "plist.dtd">', "<!DOCTYPE plist >"]


class Speller:
    def __init__(self, random):
        self.random = random
        self.choice = random.choice
        self.oddity = random.choice([0.02, 0.1, 0.5])  # how much is written in an unusual way

    def odd(self):
        return self.random.random() < self.oddity

    def spell(self, value):
        """The message as bytes."""
        encoding, mark, declared = self.choice(ENCODINGS)
        self.only_ascii = encoding == "ascii"
        head = ""
        if declared or self.random.random() < 0.5:
            quote = self.choice("\"'")
            head = f"<?xml version={quote}1.0{quote}"
            if declared:
                head += f" encoding = {quote}{declared}{quote}"
            head += self.choice(["", " standalone='yes'"]) + " ?>"
        parts = [mark, head, self.space(), self.choice(DOCTYPES), self.space(),
                 self.choice(["<plist>", '<plist version="1.0">', "<plist\n>"]), self.space(),
                 self.value(value), self.space(), self.choice(["</plist>", "</plist >"]),
                 self.space()]
        return "".join(parts).encode(encoding)

    def space(self):
        return self.choice([" \t\r\n", "<!-- <key>c</key> -->", "\r<?note >?>\n", "<!---->"]
                           if self.odd() else ["", "", "\n"])

    def value(self, value):
        if isinstance(value, dict):
            return self.element("dict", self.apart(map(self.entry, value.items())))
        if isinstance(value, list):
            return self.element("array", self.apart(map(self.value, value)))
        if isinstance(value, bool):
            return self.element("true" if value else "false", "")
        if isinstance(value, int):
            return self.element("integer", self.integer(value))
        if isinstance(value, float):
            return self.element("real", self.choice([" ", "\t\r\n"]) + repr(value) + " "
                                if self.odd() else repr(value))
        if isinstance(value, str):
            return self.element("string", self.text(value))
        if isinstance(value, bytes):
            return self.element("data", self.base64(value))
        return self.element("date", value.isoformat() + "Z")

    def element(self, name, content):
        blank = " " if self.odd() else ""
        if not content and self.choice([True, False]):
            return f"<{name}{blank}/>"
        return f"<{name}>{content}</{name}{blank}>"

    def apart(self, parts):
        return "".join(part + self.space() for part in ["", *parts])

    def entry(self, entry):
        key, value = entry
        written = self.element("key", self.text(key)) + self.space() + self.value(value)
        if self.random.random() < 0.01:  # the last of several counts
            other = self.choice([5, "5", b"5", 5.0, True, [], {"c": {}}])
            return self.apart([self.entry((key, other)), written])
        return written

    def integer(self, value):
        if value >= 0 and self.odd():
            return self.choice([f"0x{value:x}", f"0X{value:016X}", f"+{value}", f"000{value}",
                                f" {value}\n", f"\r\n\t{value} "])
        return self.text(str(value))

    def base64(self, value):
        text = base64.b64encode(value).decode()
        if not self.odd():
            return text
        width = self.random.randrange(1, 80)
        lines = [text[at:at + width] for at in range(0, len(text), width)]
        return self.choice(["\n\t", " ", "\r\n"]).join(["", *lines, ""])

    def text(self, text):
        if not self.odd():
            return "".join(map(self.plain, text))
        pieces = []
        while text:
            size = self.random.randrange(1, 10)
            pieces.append(self.piece(text[:size]))
            text = text[size:]
            if self.odd():
                pieces.append(self.choice(["<!-- & ]]> -->", "<?p &?>", "<![CDATA[]]>"]))
        return "".join(pieces)

    def plain(self, character):
        if character in "<&>\r" or self.only_ascii and character > "\x7f":
            return REFERENCES.get(character) or f"&#{ord(character)};"
        return character

    def piece(self, text):
        how = self.random.randrange(4)
        if how == 0 and "\r" not in text and "]]>" not in text and \
                (text.isascii() or not self.only_ascii):
            return "<![CDATA[" + self.line_ends(text) + "]]>"
        if how == 1:
            return "".join(f"&#x{ord(c):x};" if self.odd() else self.plain(c) for c in text)
        if how == 2:
            return "".join(REFERENCES.get(c) or f"&#{ord(c):07};" for c in text)
        return self.line_ends("".join(map(self.plain, text)))

    def line_ends(self, text):
        return text.replace("\n", self.choice(["\n", "\r\n", "\r"]))
