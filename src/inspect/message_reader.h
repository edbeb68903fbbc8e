#pragma once

#include <cstddef>
#include <string>

#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Reads messages from files. Keeps its buffer from one to the next; not thread-safe.
class MessageReader {
 public:
  /// The bytes of `file`, or of standard input for `-`. Throws std::system_error when it cannot be
  /// read, and DecodingError `limitExceeded`, without having read all of it, when it is longer than
  /// any message may be.
  Data read(const std::string& file);

 private:
  // Into `buffer_`, which it only makes longer; returns the bytes read.
  std::size_t readToEnd(int descriptor);

  std::string buffer_;
};

}  // namespace ironmoat::inspect
