#pragma once

#include <algorithm>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "inspect/code_points.h"
#include "inspect/present_fields.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Terminal sequences for what stands out; all empty where there is no terminal.
struct Colours {
  std::string_view title;
  std::string_view label;
  std::string_view aside;
  std::string_view error;
  std::string_view end;

  static constexpr Colours none() { return {}; }
  static constexpr Colours quiet() {
    return {"\033[1m", "\033[36m", "\033[2m", "\033[31m", "\033[0m"};
  }
};

/// Appends `text` so that it shows on a terminal and does nothing else there: what is not visible
/// as itself is written out, as in `\n` or `\u{202e}`, and a byte that is no text as `\x{ff}`.
void appendHarmless(std::string& out, std::string_view text);
/// The same in single quotes.
std::string inQuotes(std::string_view text);
/// Appends one character so, which is the first of `text`; returns the columns that it takes.
std::size_t appendHarmless(std::string& out, std::string_view text, const CodePoint& point);

/// How text is to look.
struct Style {
  Colours colours = Colours::none();
  std::size_t width = 0;  ///< columns of the screen; 0: lines may have any length
};

/// A person's view of records: a field a line, or more where a value is wider than the screen.
/// Lists of records that are there but empty, which every payload has, are left out.
class TextView {
 public:
  /// Appends to `out`, which must outlive the view.
  explicit TextView(std::string& out, const Style& style)
      : out_(out), colours_(style.colours), width_(style.width) {}

  /// Appends lines, each with its line end; none for a record without fields.
  template <Record R>
  void record(const R& record, std::size_t indent) {
    std::size_t width = 0;
    forEachPresentField(record, [&](std::string_view name, const auto& value) {
      if (!spansLines(value) && !isLeftOut(value)) width = std::max(width, name.size());
    });
    forEachPresentField(record, [&](std::string_view name, const auto& value) {
      if (isLeftOut(value)) return;
      label(name, indent);
      if constexpr (!Record<std::remove_cvref_t<decltype(value)>>) {
        out_.append(spansLines(value) ? kGap : width - name.size() + kGap, ' ');
        column_ = valueColumn_ = indent + width + kGap;
      }
      field(value, indent + kStep);
    });
  }

 private:
  static constexpr std::size_t kStep = 2;
  static constexpr std::size_t kGap = 2;  // between a label and its value

  template <class T>
  static bool isLeftOut(const T& value) {
    if constexpr (kIsList<T>) {
      return Record<typename T::value_type> && value.empty();
    } else {
      return false;
    }
  }

  // Such a field's label stands on a line above its value, and so does not widen the column.
  template <class T>
  static bool spansLines(const T& value) {
    if constexpr (kIsList<T>) {
      return !value.empty();
    } else {
      return Record<T>;
    }
  }

  // What follows a label, to the end of its last line.
  template <class T>
  void field(const T& value, std::size_t indent) {
    if constexpr (std::same_as<T, Bool>) {
      out_ += value ? "true\n" : "false\n";
    } else if constexpr (std::integral<T>) {
      out_ += std::to_string(value);
      out_ += '\n';
    } else if constexpr (std::same_as<T, String>) {
      text(value.view());
    } else if constexpr (std::same_as<T, Data>) {
      bytes(value.bytes());
    } else if constexpr (kIsList<T>) {
      count(value.size());
      for (std::size_t i = 0; i < value.size(); ++i) {
        position(i, indent);
        out_ += Record<typename T::value_type> ? '\n' : ' ';
        ++column_;
        ++valueColumn_;
        element(value[i], indent + kStep);
      }
    } else {
      out_ += '\n';
      element(value, indent);
    }
  }

  template <class T>
  void element(const T& value, std::size_t indent) {
    if constexpr (Record<T>) {
      const std::size_t before = out_.size();
      record(value, indent);
      if (out_.size() == before) noFields(indent);
    } else {
      field(value, indent);
    }
  }

  void label(std::string_view name, std::size_t indent);
  void position(std::size_t index, std::size_t indent);
  void text(std::string_view text);
  void bytes(std::span<const std::uint8_t> bytes);
  void count(std::size_t elements);
  void noFields(std::size_t indent);
  void aside(std::string_view remark);
  void remark(std::string_view words);
  void makeRoom(std::size_t columns, bool spaced = false);

  std::string& out_;
  Colours colours_;
  std::size_t width_;
  std::size_t valueColumn_ = 0;  // where the value that is being written started
  std::size_t column_ = 0;       // how far it has come
};

}  // namespace ironmoat::inspect
