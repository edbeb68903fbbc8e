#pragma once

#include <concepts>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "inspect/present_fields.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Whether integers become JSON numbers or strings.
enum class Integers : std::uint8_t { numbers, strings };

/// Appends JSON to a string, with commas as needed. Escapes characters that end a line or control a
/// terminal, and replaces bytes that are not UTF-8 by U+FFFD.
class JsonWriter {
 public:
  /// `out` must outlive the writer. Several writers may append to it in turns.
  explicit JsonWriter(std::string& out, Integers integers = Integers::numbers)
      : out_(out), integers_(integers) {}

  /// `bracket` is `{` or `[`.
  JsonWriter& open(char bracket) {
    separate();
    out_ += bracket;
    return *this;
  }
  /// `bracket` is `}` or `]`.
  JsonWriter& close(char bracket) {
    out_ += bracket;
    return *this;
  }
  /// Appends the name of the next value.
  JsonWriter& name(std::string_view name) {
    text(name);
    out_ += ": ";
    return *this;
  }
  template <class T>
  JsonWriter& member(std::string_view name, const T& value) {
    return this->name(name).value(value);
  }

  /// Writes a record as an object of its present fields, and bytes in base64.
  template <class T>
  JsonWriter& value(const T& value) {
    if constexpr (std::same_as<T, bool>) {
      separate();
      out_ += value ? "true" : "false";
    } else if constexpr (std::integral<T>) {
      integer(std::to_string(value));
    } else if constexpr (std::convertible_to<T, std::string_view>) {
      text(value);
    } else if constexpr (std::same_as<T, String>) {
      text(value.view());
    } else if constexpr (std::same_as<T, Data>) {
      bytes(value.bytes());
    } else if constexpr (Record<T>) {
      open('{');
      forEachPresentField(
          value, [&](std::string_view field, const auto& present) { member(field, present); });
      close('}');
    } else {
      open('[');
      for (const auto& element : value) this->value(element);
      close(']');
    }
    return *this;
  }

 private:
  void separate();
  void integer(std::string_view digits);
  void text(std::string_view text);
  void bytes(std::span<const std::uint8_t> bytes);

  std::string& out_;
  const Integers integers_;
};

}  // namespace ironmoat::inspect
