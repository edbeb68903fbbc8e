#pragma once

#include <chrono>
#include <cstddef>
#include <string_view>

#include "inspect/terminal_text.h"

namespace ironmoat::inspect {

/// Standard output and standard error of the tool. Keeps their order on a terminal.
class Terminal {
 public:
  Terminal();

  /// The style of standard output or standard error: has colours and a width if it is a terminal.
  [[nodiscard]] Style outputStyle() const noexcept;
  [[nodiscard]] Style errorStyle() const noexcept;

  /// Writes to standard output, which is buffered unless it is a terminal. Throws std::system_error
  /// if it cannot be written.
  void print(std::string_view text);
  /// Writes to standard error at once.
  void printError(std::string_view text) noexcept;
  /// Shows the number of finished messages if standard error is a terminal and the work takes long.
  void showProgress(std::size_t done, std::size_t total);
  /// Erases the progress line and writes what is buffered. Throws like print().
  void finish();

 private:
  using Clock = std::chrono::steady_clock;

  void eraseProgress() noexcept;

  const bool outputIsTerminal_;
  const bool errorIsTerminal_;
  int outputError_ = 0;  // errno of standard output, if printError() could not flush it; 0: none
  bool progressShown_ = false;
  Clock::time_point nextProgress_;
};

}  // namespace ironmoat::inspect
