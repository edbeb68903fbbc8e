#pragma once

#include <algorithm>
#include <concepts>
#include <cstddef>
#include <string>
#include <string_view>

#include "inspect/present_fields.h"
#include "inspect/terminal_text.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Shows records to people: a line for each field, or several if a value is wider than the screen.
/// Omits empty lists of records, which every payload has.
class TextView {
 public:
  /// `out`, to which the view appends, must outlive it.
  explicit TextView(std::string& out, const Style& style) : out_(out), style_(style) {}

  /// Appends complete lines; none for a record without present fields.
  template <Record R>
  void record(const R& record, std::size_t indent) {
    std::size_t width = 0;
    forEachPresentField(record, [&](std::string_view name, const auto& value) {
      if (!isLeftOut(value)) width = std::max(width, name.size());
    });
    forEachPresentField(record, [&](std::string_view name, const auto& value) {
      if (!isLeftOut(value)) field(style_.colours.label, name, indent, indent + width + 2, value);
    });
  }

 private:
  static constexpr std::size_t kStep = 2;

  template <class T>
  static bool isLeftOut(const T& value) {
    if constexpr (kIsList<T>) return Record<typename T::value_type> && value.empty();
    return false;
  }

  /// Appends a label in `colour`, then its value, which starts in `column`.
  template <class T>
  void field(std::string_view colour, std::string_view name, std::size_t indent, std::size_t column,
             const T& value) {
    label(colour, name, indent);
    if constexpr (Record<T>) {
      out_ += '\n';
      const std::size_t before = out_.size();
      record(value, indent + kStep);
      if (out_.size() == before) line(aside("(no fields)"), 0, indent + kStep);
    } else if constexpr (kIsList<T>) {
      line(elements(value.size()), indent + name.size(), column);
      for (std::size_t i = 0; i < value.size(); ++i) {
        const std::string position = '[' + std::to_string(i) + ']';
        const std::size_t start = indent + kStep;
        field(style_.colours.aside, position, start, start + position.size() + 1, value[i]);
      }
    } else {
      line(shown(value), indent + name.size(), column);
    }
  }

  static std::string shown(Bool value) { return value ? "true" : "false"; }
  static std::string shown(std::integral auto value) { return std::to_string(value); }
  [[nodiscard]] std::string shown(const String& value) const;
  [[nodiscard]] std::string shown(const Data& value) const;
  [[nodiscard]] std::string elements(std::size_t number) const;
  [[nodiscard]] std::string aside(std::string_view remark) const;
  void label(std::string_view colour, std::string_view name, std::size_t indent);
  /// Ends a line that has `filled` columns.
  void line(std::string_view value, std::size_t filled, std::size_t column);

  std::string& out_;
  const Style style_;
};

}  // namespace ironmoat::inspect
