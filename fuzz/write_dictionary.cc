// write_dictionary binary|xml: prints libFuzzer's dictionary for the format, with the wire keys of
// the records' tables.

#include <cstdio>
#include <set>
#include <string>
#include <string_view>

#include "wire_keys.h"

namespace {

using ironmoat::fuzz::wireKeys;

constexpr const char* kXmlWords[] = {
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>",
    "encoding=\"UTF-16\"",
    "encoding=\"US-ASCII\"",
    "standalone=\"yes\"",
    "<!DOCTYPE plist SYSTEM \"plist.dtd\">",
    "<!DOCTYPE plist PUBLIC \"a\" 'b'>",
    "<!DOCTYPE plist [<!ENTITY a \"b\">]>",
    "<plist version=\"1.0\">",
    "</plist>",
    "<dict>",
    "</dict>",
    "<dict/>",
    "<array>",
    "</array>",
    "<array/>",
    "<key>",
    "</key>",
    "<key/>",
    "<string>",
    "</string>",
    "<string/>",
    "<data>",
    "</data>",
    "<data/>",
    "<integer>",
    "</integer>",
    "<real>",
    "</real>",
    "<date>",
    "</date>",
    "2000-01-01T00:00:00Z",
    "<true/>",
    "<false/>",
    "<true>",
    "</true>",
    "<!--",
    "-->",
    "--",
    "<![CDATA[",
    "]]>",
    "<?a b?>",
    "&lt;",
    "&amp;",
    "&quot;",
    "&#0;",
    "&#xD800;",
    "&#x10FFFF;",
    "&#x110000;",
    "&#65;",
    "\r\n",
    "\xEF\xBB\xBF",
    "\xFF\xFE<",
    "\xFE\xFF",
    "\xEF\xBF\xBE",
    "\xED\xA0\x80",
    "\xF0\x9F\x98\x80",
    "\xC0\x80",
    "AAAA",
    "AA==",
    "0x",
    "-9223372036854775808",
    "9223372036854775807",
    "9223372036854775808",
    "18446744073709551615",
    "18446744073709551616",
    "-0xFFFFFFFFFFFFFFFFFF",
    "-0",
    "nan",
    "infinity",
};
constexpr std::string_view kBinaryWords[] = {
    "bplist00",
    "\x08",
    "\x09",
    {"\x10\x00", 2},
    "\x10\x01",
    "\x13\x7F\xFF\xFF\xFF\xFF\xFF\xFF\xFF",
    {"\x13\x80\x00\x00\x00\x00\x00\x00\x00", 9},
    "\x14\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF",
    {"\x22\x00\x00\x00\x00", 5},
    "\x4F\x10",
    "\x5F\x10",
    "\x6F\x11",
    "\x61\xD8\x3D",
    "\x62\xD8\x3D\xDE\x01",
    {"\x80\x00", 2},
    {"\x00", 1},
    "\xC1",
    "\xA0",
    "\xA1",
    "\xD0",
    "\xD1",
    {"\x00\x00\x00\x00\x00\x00\x01\x01", 8},
    {"\x00\x00\x00\x00\x00\x00\x02\x02", 8},
};

std::string asciiHead(std::size_t length) {
  if (length < 15) return {static_cast<char>(0x50 | length)};
  return {'\x5F', '\x10', static_cast<char>(length)};
}

void print(std::string_view word) {
  std::putchar('"');
  for (const char c : word) {
    const bool plain = c >= ' ' && c <= '~' && c != '"' && c != '\\';
    if (plain) {
      std::putchar(c);
    } else {
      std::printf("\\x%02X", static_cast<unsigned char>(c));
    }
  }
  std::puts("\"");
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) return 1;
  const bool xml = std::string_view(argv[1]) == "xml";
  std::set<std::string> words;
  for (const auto& [key, holds] : wireKeys()) {
    const std::string text(key);
    words.insert(xml ? "<key>" + text + "</key>" : asciiHead(text.size()) + text);
  }
  if (xml) {
    words.insert(std::begin(kXmlWords), std::end(kXmlWords));
  } else {
    words.insert(std::begin(kBinaryWords), std::end(kBinaryWords));
  }
  for (const std::string& word : words) print(word);
  return std::fflush(stdout) == 0 ? 0 : 1;
}
