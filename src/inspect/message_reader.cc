#include "inspect/message_reader.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <limits>
#include <string_view>
#include <system_error>

#include "inspect/terminal_text.h"
#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "process/file_descriptor.h"

namespace ironmoat::inspect {

namespace {

namespace fs = std::filesystem;

/// Reads at most `limit` + 1 bytes of `file` into `buffer` and returns their number. Doubles the
/// buffer as needed, so that a small file needs only a small one, and never shrinks it.
std::size_t readInto(std::string& buffer, const std::string& file, std::size_t limit) {
  constexpr std::size_t kFirstRead = std::size_t{64} << 10;
  process::FileDescriptor opened;
  if (file != kStandardInput) {
    opened = process::FileDescriptor(::open(file.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
    if (!opened) throw std::system_error(errno, std::generic_category(), inQuotes(file));
  }
  std::size_t filled = 0;
  while (filled <= limit) {
    if (filled == buffer.size()) {
      buffer.resize(std::min(std::max(kFirstRead, 2 * filled), limit + 1));
    }
    const ssize_t got = ::read(opened ? opened.get() : STDIN_FILENO, buffer.data() + filled,
                               buffer.size() - filled);
    if (got == 0) break;
    if (got < 0 && errno != EINTR)
      throw std::system_error(errno, std::generic_category(), inQuotes(file));
    if (got > 0) filled += static_cast<std::size_t>(got);
  }
  return filled;
}

void addListed(std::vector<std::string>& files, const std::string& list) {
  std::string names;
  names.resize(readInto(names, list, std::numeric_limits<std::size_t>::max() / 4));
  const char separator = names.find('\0') == names.npos ? '\n' : '\0';
  for (std::size_t start = 0; start < names.size();) {
    const std::size_t end = std::min(names.find(separator, start), names.size());
    if (end != start) files.push_back(names.substr(start, end - start));
    start = end + 1;
  }
}

/// Appends the regular files in `folder`. Omits symbolic links, which could lead to files
/// elsewhere, and FIFOs and devices, which could block.
void addFolder(std::vector<std::string>& files, const fs::path& folder) {
  std::vector<std::string> found;
  for (std::vector<fs::path> folders = {folder}; !folders.empty();) {
    const fs::path next = std::move(folders.back());
    folders.pop_back();
    std::error_code error;
    std::error_code ignored;
    fs::directory_iterator entry(next, error);
    for (; !error && entry != fs::directory_iterator(); entry.increment(error)) {
      const fs::file_type type = entry->symlink_status(ignored).type();
      if (type == fs::file_type::directory) folders.push_back(entry->path());
      if (type == fs::file_type::regular) found.push_back(entry->path());
    }
    if (error) found.push_back(next);
  }
  std::sort(found.begin(), found.end());
  files.insert(files.end(), found.begin(), found.end());
}

}  // namespace

Data MessageReader::read(const std::string& file) {
  const std::size_t size = readInto(buffer_, file, limits::messageBytes);
  if (size > limits::messageBytes) {
    throw DecodingError(
        DecodingError::Kind::limitExceeded, "",
        "message exceeds the limit of " + std::to_string(limits::messageBytes) + " bytes");
  }
  return Data(std::string_view(buffer_.data(), size));
}

std::vector<std::string> filesOf(const Options& options) {
  std::vector<std::string> named = options.files;
  if (!options.filesFrom.empty()) addListed(named, options.filesFrom);
  const auto uses = std::count(named.begin(), named.end(), kStandardInput);
  if (uses + (options.filesFrom == kStandardInput ? 1 : 0) > 1) {
    throw UsageError("standard input can be read only once");
  }
  if (!options.recursive) return named;
  std::vector<std::string> files;
  for (const std::string& file : named) {
    std::error_code ignored;
    if (file != kStandardInput && fs::is_directory(file, ignored)) {
      addFolder(files, file);
    } else {
      files.push_back(file);
    }
  }
  return files;
}

}  // namespace ironmoat::inspect
