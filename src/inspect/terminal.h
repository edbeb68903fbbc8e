#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <string_view>

#include "inspect/text_view.h"

namespace ironmoat::inspect {

/// Standard output and standard error of the tool, in step: what is printed first shows first on a
/// terminal. Functions that are not noexcept throw std::system_error when standard output cannot be
/// written.
class Terminal {
 public:
  Terminal();

  /// Colours for what goes to standard output, and to standard error.
  [[nodiscard]] const Colours& outputColours() const noexcept { return outputColours_; }
  [[nodiscard]] const Colours& errorColours() const noexcept { return errorColours_; }

  /// Columns; 0 where it is no terminal, or one that does not tell.
  [[nodiscard]] std::size_t outputWidth() const noexcept;
  [[nodiscard]] std::size_t errorWidth() const noexcept;

  /// Appends to standard output; buffered unless that is a terminal.
  void print(std::string_view text);
  /// Writes to standard error at once.
  void complain(std::string_view text);
  /// The same when there is nothing left to do about standard output.
  void lastWords(std::string_view text) noexcept;
  /// Shows how far the work is, if standard error is a terminal and the work takes a while.
  void showProgress(std::size_t done, std::size_t total);
  /// Takes away the progress line and writes out what is buffered.
  void flush();

 private:
  using Clock = std::chrono::steady_clock;

  void eraseProgress() noexcept;

  const bool outputIsTerminal_;
  const bool errorIsTerminal_;
  const Colours outputColours_;
  const Colours errorColours_;
  std::string buffer_;
  bool progressShown_ = false;
  Clock::time_point nextProgress_;
};

}  // namespace ironmoat::inspect
