#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>

#include "ironmoat/errors.h"
#include "plist/decoder.h"
#include "plist/document.h"
#include "support/wire_fields.h"

/// A second decoder, for comparison, as plain as possible: it looks up each field's key separately
/// and appends the value to a text. It shares no container, index or record with the first one.
namespace ironmoat {

namespace fuzz {

/// A record as text, or its rejection as "kind path: description".
struct Outcome {
  bool accepted = false;
  std::string text;
  friend bool operator==(const Outcome&, const Outcome&) = default;
};

inline void describe(std::string& out, Int value) { out += std::to_string(value) + ";"; }
inline void describe(std::string& out, Int64 value) { out += std::to_string(value) + ";"; }
inline void describe(std::string& out, Bool value) { out += value ? "yes;" : "no;"; }
inline void describeBytes(std::string& out, char kind, std::string_view bytes) {
  out += kind;
  out += std::to_string(bytes.size()) + ":";
  out += bytes;
}
inline void describe(std::string& out, const String& value) {
  describeBytes(out, 't', value.view());
}
inline void describe(std::string& out, const Data& value) { describeBytes(out, 'd', value.view()); }
template <class R>
requires requires { typename R::CodingKeys; }
void describe(std::string& out, const R& record);
template <class T>
void describe(std::string& out, const List<T>& list) {
  out.append("[").append(std::to_string(list.size())).append(":");
  for (const T& element : list) describe(out, element);
}
template <class Optional>
requires requires(const Optional& value) { value.has_value(); }
void describe(std::string& out, const Optional& value) {
  if (!value) {
    out += '-';
  } else {
    describe(out, *value);
  }
}
/// Writes a decoded record as SlowDecoder does.
template <class R>
requires requires { typename R::CodingKeys; }
void describe(std::string& out, const R& record) {
  out += '{';
  testing::FieldsOf<R>::List::forEach([&](auto field) { describe(out, field.in(record)); });
}

inline std::string lowered(std::string_view text) {
  std::string result(text);
  for (char& c : result) c = c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
  return result;
}

class SlowDecoder {
 public:
  SlowDecoder(const plist::Document& document, plist::Budget budget)
      : document_(document), left_(budget) {}

  template <class R>
  Outcome decode() {
    try {
      Outcome outcome{true, {}};
      record<R>(document_.root(), "", outcome.text);
      return outcome;
    } catch (const Rejected& rejected) {
      return {false, rejected.text};
    }
  }
  [[nodiscard]] const plist::Budget& left() const { return left_; }

 private:
  using Path = const std::string&;
  struct Rejected {
    std::string text;
  };
  [[noreturn]] static void reject(std::string_view kind, Path path, std::string_view description) {
    throw Rejected{std::string(kind) + " " + path + ": " + std::string(description)};
  }

  const plist::Node& expect(plist::Kind kind, plist::NodeIndex index, Path path) {
    const plist::Node& node = document_.node(index);
    if (node.kind != kind) {
      reject("typeMismatch", path,
             "expected " + std::string(nameOf(kind)) + ", found " + std::string(nameOf(node.kind)));
    }
    return node;
  }
  static void pay(std::size_t& left, std::size_t amount, Path path, std::string_view description) {
    if (amount > left) reject("limitExceeded", path, description);
    left -= amount;
  }

  /// The index of the last entry under `key`, plus 1; 0 if there is none.
  std::uint32_t lastEntry(const plist::Node& node, std::string_view key) {
    std::uint32_t entry = node.count;
    while (entry > 0 && document_.text(document_.node(document_.keys(node)[entry - 1])) != key) {
      --entry;
    }
    return entry;
  }
  template <class R>
  void payForValues(const plist::Node& node, Path path) {
    std::size_t place = 0;
    std::size_t bytes = 0;
    testing::FieldsOf<R>::List::forEach([&](auto field) {
      const std::string_view key = records::Table<R>::rows.keys[place++];
      if (field.sparse && lastEntry(node, key) != 0) bytes += 16;
    });
    pay(left_.recordBytes, bytes, path, "memory of lists exceeds the limit of 67108864 bytes");
  }
  template <class R>
  void record(plist::NodeIndex index, Path path, std::string& out) {
    const plist::Node& node = expect(plist::Kind::dictionary, index, path);
    pay(left_.scannedEntries, node.count, path,
        "size of shared dictionaries exceeds the limit of 8388608 entries");
    payForValues<R>(node, path);
    out += '{';
    std::size_t place = 0;
    testing::FieldsOf<R>::List::forEach([&](auto field) {
      const std::string_view key = records::Table<R>::rows.keys[place++];
      const std::string below = path + (path.empty() ? "" : ".") + std::string(key);
      const std::uint32_t entry = lastEntry(node, key);
      using T = typename decltype(field)::Type;
      if (entry != 0) {
        value(document_.values(node)[entry - 1], below, out, static_cast<T*>(nullptr));
      } else if constexpr (std::is_same_v<T, Int>) {
        bool inOtherCase = false;
        for (const plist::NodeIndex other : document_.keys(node)) {
          inOtherCase |= lowered(document_.text(document_.node(other))) == lowered(key);
        }
        reject("keyNotFound", below,
               inOtherCase ? "missing required key; found a key that differs only in case"
                           : "missing required key");
      } else {
        out += '-';
      }
    });
  }

  template <class T>
  void value(plist::NodeIndex index, Path path, std::string& out, const Optional<T>*) {
    value(index, path, out, static_cast<const T*>(nullptr));
  }
  template <class T>
  void value(plist::NodeIndex index, Path path, std::string& out, const List<T>*) {
    const plist::Node& node = expect(plist::Kind::array, index, path);
    pay(left_.recordBytes, node.count * sizeof(T), path,
        "memory of lists exceeds the limit of 67108864 bytes");
    out.append("[").append(std::to_string(node.count)).append(":");
    for (std::uint32_t i = 0; i < node.count; ++i) {
      value(document_.elements(node)[i], path + "[" + std::to_string(i) + "]", out,
            static_cast<const T*>(nullptr));
    }
  }
  template <class T>
  void value(plist::NodeIndex index, Path path, std::string& out, const T*) {
    using plist::Kind;
    if constexpr (requires { typename T::CodingKeys; }) {
      record<T>(index, path, out);
    } else if constexpr (std::is_same_v<T, Bool>) {
      out += expect(Kind::boolean, index, path).payload != 0 ? "yes;" : "no;";
    } else if constexpr (std::is_integral_v<T>) {
      if (document_.node(index).kind == Kind::wideInteger) {
        reject("outOfRange", path, "not a valid signed 64-bit integer");
      }
      const std::uint64_t bits = expect(Kind::integer, index, path).payload;
      out += std::to_string(static_cast<std::int64_t>(bits)) + ";";
    } else {
      constexpr bool text = std::is_same_v<T, String>;
      const plist::Node& node = expect(text ? Kind::string : Kind::data, index, path);
      pay(left_.deliveredBytes, node.count, path,
          "size of text and data exceeds the limit of 67108864 bytes");
      describeBytes(out, text ? 't' : 'd', document_.text(node));
    }
  }

  const plist::Document& document_;
  plist::Budget left_;
};

}  // namespace fuzz
}  // namespace ironmoat
