#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"

/// Messages in XML from their parts. Entries and elements are concatenated.
namespace ironmoat::testing::xml {

inline std::string element(std::string_view name, std::string_view content) {
  return std::string("<").append(name).append(">").append(content).append("</").append(name) + ">";
}
inline std::string dictionary(std::string_view entries) { return element("dict", entries); }
inline std::string array(std::string_view elements) { return element("array", elements); }
inline std::string entry(std::string_view key, std::string_view value) {
  return element("key", key).append(value);
}
inline std::string number(std::string_view key, int value) {
  return entry(key, element("integer", std::to_string(value)));
}
inline std::string text(std::string_view key, std::string_view value) {
  return entry(key, element("string", value));
}
/// An array of dictionaries with these entries.
inline std::string list(std::string_view key, const std::vector<std::string>& dictionaries) {
  std::string elements;
  for (const std::string& entries : dictionaries) elements += dictionary(entries);
  return entry(key, array(elements));
}

inline Data message(std::string_view value) {
  return Data(std::string_view(element("plist", value)));
}

}  // namespace ironmoat::testing::xml
