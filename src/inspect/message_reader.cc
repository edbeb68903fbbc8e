#include "inspect/message_reader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string_view>
#include <system_error>

#include "inspect/options.h"
#include "ironmoat/errors.h"
#include "ironmoat/limits.h"

namespace ironmoat::inspect {

namespace {

constexpr std::size_t kFirstRead = std::size_t{64} << 10;

[[noreturn]] void throwErrno() { throw std::system_error(errno, std::generic_category()); }

[[noreturn]] void throwTooLong(const std::string& sentence) {
  throw DecodingError(DecodingError::Kind::limitExceeded, "", sentence);
}

class File {
 public:
  explicit File(const std::string& name)
      : descriptor_(::open(name.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY)) {
    if (descriptor_ < 0) throwErrno();
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  ~File() { ::close(descriptor_); }
  [[nodiscard]] int descriptor() const noexcept { return descriptor_; }

 private:
  int descriptor_;
};

}  // namespace

Data MessageReader::read(const std::string& file) {
  const std::size_t size =
      file == kStandardInput ? readToEnd(STDIN_FILENO) : readToEnd(File(file).descriptor());
  return Data(std::string_view(buffer_.data(), size));
}

// Asks for no more than twice what came, so that a small message costs a small buffer.
std::size_t MessageReader::readToEnd(int descriptor) {
  const std::string most = std::to_string(limits::messageBytes);
  struct stat status = {};
  if (::fstat(descriptor, &status) != 0) throwErrno();
  if (S_ISREG(status.st_mode) && status.st_size > static_cast<off_t>(limits::messageBytes)) {
    throwTooLong("message of " + std::to_string(status.st_size) + " bytes, more than " + most);
  }
  std::size_t filled = 0;
  while (filled <= limits::messageBytes) {
    if (filled == buffer_.size()) {
      buffer_.resize(std::min(std::max(kFirstRead, 2 * filled), limits::messageBytes + 1));
    }
    const ssize_t got = ::read(descriptor, buffer_.data() + filled, buffer_.size() - filled);
    if (got == 0) return filled;
    if (got < 0 && errno != EINTR) throwErrno();
    if (got > 0) filled += static_cast<std::size_t>(got);
  }
  throwTooLong("message of more than " + most + " bytes");
}

}  // namespace ironmoat::inspect
