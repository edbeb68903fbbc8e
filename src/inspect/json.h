#pragma once

#include <concepts>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "inspect/present_fields.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Appends a JSON string. What is not well-formed UTF-8 becomes U+FFFD. No character that could
/// end a line or steer a terminal is left unescaped.
void appendJsonText(std::string& out, std::string_view text);

/// Appends a JSON string of standard base64, padded.
void appendJsonBytes(std::string& out, std::span<const std::uint8_t> bytes);

/// Appends a field's value: a nested record is an object of the fields that are there.
template <class T>
void appendJson(std::string& out, const T& value) {
  if constexpr (std::same_as<T, Bool>) {
    out += value ? "true" : "false";
  } else if constexpr (std::integral<T>) {
    out += std::to_string(value);
  } else if constexpr (std::same_as<T, String>) {
    appendJsonText(out, value.view());
  } else if constexpr (std::same_as<T, Data>) {
    appendJsonBytes(out, value.bytes());
  } else if constexpr (kIsList<T>) {
    out += '[';
    bool first = true;
    for (const auto& element : value) {
      if (!first) out += ", ";
      first = false;
      appendJson(out, element);
    }
    out += ']';
  } else {
    static_assert(Record<T>);
    out += '{';
    bool first = true;
    forEachPresentField(value, [&](std::string_view name, const auto& present) {
      if (!first) out += ", ";
      first = false;
      out += '"';
      out += name;
      out += "\": ";
      appendJson(out, present);
    });
    out += '}';
  }
}

}  // namespace ironmoat::inspect
