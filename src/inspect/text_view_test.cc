#include "inspect/text_view.h"

#include <gtest/gtest.h>

#include <string>

#include "ironmoat/fields.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

// A field of each type that records have.

struct PartArguments {
  Optional<String> name;
  Optional<Int> number;

  using Fields = FieldList<PartArguments, &PartArguments::name, &PartArguments::number>;
};
struct Part : PartArguments {
  using Arguments = PartArguments;
};

struct Whole;
struct WholeArguments {
  Int command = 0;
  Optional<Int64> time;
  Optional<Bool> flag;
  Optional<String> text;
  Optional<Data> bytes;
  Optional<List<String>> texts;
  Optional<Part> part;
  List<Whole> wholes;

  using R = WholeArguments;
  using Fields = FieldList<R, &R::command, &R::time, &R::flag, &R::text, &R::bytes, &R::texts,
                           &R::part, &R::wholes>;
};
struct Whole : WholeArguments {
  using Arguments = WholeArguments;
};

namespace {

using namespace std::literals;

std::string view(const Whole& whole, const Style& style = {}) {
  std::string out;
  TextView(out, style).record(whole, 2);
  return out;
}

TEST(TextView, AlignsFieldsAndIndentsWhatIsNested) {
  Whole whole;
  whole.command = 32;
  whole.flag = true;
  whole.bytes = Data("0123456789");
  whole.texts = List<String>{"one", "two"};
  whole.part = Part{{.name = String("n"), .number = -7}};
  whole.wholes.resize(2);
  whole.wholes[0].part = Part{};
  whole.wholes[1].texts = List<String>{};
  EXPECT_EQ(view(whole),
            "  command  32\n"
            "  flag     true\n"
            "  bytes    30313233 34353637 3839 (10 bytes)\n"
            "  texts  (2 elements)\n"
            "    [0] \"one\"\n"
            "    [1] \"two\"\n"
            "  part\n"
            "    name    \"n\"\n"
            "    number  -7\n"
            "  wholes  (2 elements)\n"
            "    [0]\n"
            "      command  0\n"
            "      part\n"
            "        (no fields)\n"
            "    [1]\n"
            "      command  0\n"
            "      texts    (empty list)\n");
}

TEST(TextView, CutsLongValuesAndSaysSo) {
  Whole whole;
  whole.bytes = Data(std::string(33, 'a'));
  whole.text = String(std::string(399, 'x') + "\xC3\xA9" + "y");
  EXPECT_EQ(view(whole),
            "  command  0\n"
            "  text     \"" +
                std::string(399, 'x') +
                "\xC3\xA9\" ... the first 401 of 402 bytes\n"
                "  bytes    61616161 61616161 61616161 61616161 61616161 61616161 61616161 61616161"
                " ... the first 32 of 33 bytes\n");
}

TEST(TextView, BreaksValuesThatAreWiderThanTheScreen) {
  Whole whole;
  whole.bytes = Data("0123456789");
  whole.text = String("0123456789abc\n\xE6\xBC\xA2");
  whole.texts = List<String>{"0123456789abcdefgh", "", "0123456789abcdef"};
  EXPECT_EQ(view(whole, {.width = 24}),
            "  command  0\n"
            "  text     \"0123456789ab\n"
            "           c\\n\xE6\xBC\xA2\"\n"
            "  bytes    30313233\n"
            "           34353637 3839\n"
            "           (10 bytes)\n"
            "  texts  (3 elements)\n"
            "    [0] \"0123456789abcde\n"
            "        fgh\"\n"
            "    [1] \"\"\n"
            "    [2] \"0123456789abcde\n"
            "        f\"\n");
}

TEST(TextView, ColoursLabelsAndNothingOfTheSenderWhoCannotEndQuotes) {
  Whole whole;
  whole.text = String("\x1B[31m\" (4 bytes)\\");
  EXPECT_EQ(view(whole, {.colours = Colours::quiet()}),
            "  \033[36mcommand\033[0m  0\n"
            "  \033[36mtext\033[0m     \"\\u{1b}[31m\\\" (4 bytes)\\\\\"\n");
}

TEST(Harmless, WritesOutWhatATerminalWouldObey) {
  const std::pair<std::string_view, std::string_view> rows[] = {
      {"plain \xC3\xA9\xF0\x9F\x98\x80", "plain \xC3\xA9\xF0\x9F\x98\x80"},
      {"\n\r\t", R"(\n\r\t)"},
      {"\0\x07\x1B]0;title\x07\x7F"sv, R"(\u{0}\u{7}\u{1b}]0;title\u{7}\u{7f})"},
      {"\xC2\x9B"
       "2J",
       R"(\u{9b}2J)"},  // the one-character form of ESC [
      {"\xE2\x80\xAE"
       "fdp.exe",
       R"(\u{202e}fdp.exe)"},  // right to left
      {"a\xE2\x80\x8B\xEF\xBB\xBF"
       "b",
       R"(a\u{200b}\u{feff}b)"},
      {"\xF3\xA0\x81\x81", R"(\u{e0041})"},  // a tag
      {"\xFFz\xE2\x82", R"(\x{ff}z\x{e2}\x{82})"},
  };
  for (const auto& [text, expected] : rows) {
    std::string out;
    appendHarmless(out, text);
    EXPECT_EQ(out, expected);
  }
}

}  // namespace
}  // namespace ironmoat::inspect
