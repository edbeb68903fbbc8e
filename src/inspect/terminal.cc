#include "inspect/terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <system_error>

namespace ironmoat::inspect {

namespace {

constexpr std::chrono::milliseconds kProgressDelay{300};
constexpr std::chrono::milliseconds kProgressInterval{100};

std::string_view environment(const char* name) noexcept {
  const char* value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): no code sets variables
  return value == nullptr ? "" : value;
}

Style styleOf(int descriptor, bool isTerminal) noexcept {
  if (!isTerminal) return {};
  winsize size = {};
  const bool known = ::ioctl(descriptor, TIOCGWINSZ, &size) == 0;
  const bool colours = environment("NO_COLOR").empty() && environment("TERM") != "dumb";
  return {colours ? Colours::muted() : Colours::none(), known ? size.ws_col : std::size_t{0}};
}

[[noreturn]] void throwOutputError(int error) {
  throw std::system_error(error, std::generic_category(), "cannot write to standard output");
}

}  // namespace

Terminal::Terminal()
    : outputIsTerminal_(::isatty(STDOUT_FILENO) == 1),
      errorIsTerminal_(::isatty(STDERR_FILENO) == 1),
      nextProgress_(Clock::now() + kProgressDelay) {}

Style Terminal::outputStyle() const noexcept { return styleOf(STDOUT_FILENO, outputIsTerminal_); }
Style Terminal::errorStyle() const noexcept { return styleOf(STDERR_FILENO, errorIsTerminal_); }

void Terminal::print(std::string_view text) {
  if (outputIsTerminal_) eraseProgress();
  if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size()) throwOutputError(errno);
}

void Terminal::printError(std::string_view text) noexcept {
  eraseProgress();
  if (std::fflush(stdout) != 0) outputError_ = errno;
  static_cast<void>(std::fwrite(text.data(), 1, text.size(), stderr));
}

void Terminal::showProgress(std::size_t done, std::size_t total) {
  if (!errorIsTerminal_ || Clock::now() < nextProgress_) return;
  nextProgress_ = Clock::now() + kProgressInterval;
  const Colours colours = errorStyle().colours;
  printError(std::string("\r").append(colours.aside) + std::to_string(done) + " of " +
             std::to_string(total) + " messages" + std::string(colours.end));
  progressShown_ = true;
}

void Terminal::finish() {
  eraseProgress();
  if (std::fflush(stdout) != 0) outputError_ = errno;
  if (outputError_ != 0) throwOutputError(outputError_);
}

void Terminal::eraseProgress() noexcept {
  if (progressShown_) static_cast<void>(std::fputs("\r\033[K", stderr));
  progressShown_ = false;
}

}  // namespace ironmoat::inspect
