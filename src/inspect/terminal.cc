#include "inspect/terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <system_error>
#include <utility>

namespace ironmoat::inspect {

namespace {

constexpr std::size_t kBuffered = std::size_t{64} << 10;
constexpr std::chrono::milliseconds kQuietStart{300};
constexpr std::chrono::milliseconds kBetweenUpdates{100};

std::string_view environment(const char* name) {
  const char* value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): nobody sets any
  return value == nullptr ? "" : value;
}

Colours coloursFor(bool isTerminal) {
  const bool wanted =
      isTerminal && environment("NO_COLOR").empty() && environment("TERM") != "dumb";
  return wanted ? Colours::quiet() : Colours::none();
}

std::size_t widthOf(int descriptor) noexcept {
  winsize size = {};
  return ::ioctl(descriptor, TIOCGWINSZ, &size) == 0 ? size.ws_col : 0;
}

bool writeAll(int descriptor, std::string_view text) noexcept {
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor, text.data(), text.size());
    if (written < 0 && errno != EINTR) return false;
    if (written > 0) text.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

}  // namespace

Terminal::Terminal()
    : outputIsTerminal_(::isatty(STDOUT_FILENO) == 1),
      errorIsTerminal_(::isatty(STDERR_FILENO) == 1),
      outputColours_(coloursFor(outputIsTerminal_)),
      errorColours_(coloursFor(errorIsTerminal_)),
      nextProgress_(Clock::now() + kQuietStart) {}

std::size_t Terminal::outputWidth() const noexcept { return widthOf(STDOUT_FILENO); }
std::size_t Terminal::errorWidth() const noexcept { return widthOf(STDERR_FILENO); }

void Terminal::print(std::string_view text) {
  buffer_ += text;
  if (outputIsTerminal_ || buffer_.size() >= kBuffered) flush();
}

void Terminal::complain(std::string_view text) {
  flush();
  writeAll(STDERR_FILENO, text);  // where could its failure be told?
}

void Terminal::lastWords(std::string_view text) noexcept {
  eraseProgress();
  writeAll(STDOUT_FILENO, std::exchange(buffer_, {}));
  writeAll(STDERR_FILENO, text);
}

void Terminal::showProgress(std::size_t done, std::size_t total) {
  if (!errorIsTerminal_ || Clock::now() < nextProgress_) return;
  nextProgress_ = Clock::now() + kBetweenUpdates;
  std::string line = "\r";
  line += errorColours_.aside;
  line += std::to_string(done) + " of " + std::to_string(total) + " messages";
  line += errorColours_.end;
  writeAll(STDERR_FILENO, line);
  progressShown_ = true;
}

void Terminal::flush() {
  eraseProgress();
  const std::string text = std::exchange(buffer_, {});
  if (!writeAll(STDOUT_FILENO, text)) {
    throw std::system_error(errno, std::generic_category(), "cannot write to standard output");
  }
}

void Terminal::eraseProgress() noexcept {
  if (!progressShown_) return;
  writeAll(STDERR_FILENO, "\r\033[K");
  progressShown_ = false;
}

}  // namespace ironmoat::inspect
