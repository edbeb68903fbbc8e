#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "inspect/options.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Reads messages. Keeps its buffer from one to the next; not thread-safe.
class MessageReader {
 public:
  /// The bytes of `file`, or of standard input for `-`. Throws std::system_error if it cannot be
  /// read, and DecodingError `limitExceeded` as soon as it proves longer than a message may be.
  Data read(const std::string& file);

 private:
  std::string buffer_;
};

/// The files that `options` name, in order: folders are replaced by the regular files in them and
/// in their folders, sorted by path, if it asks for that. A folder that cannot be listed stays, so
/// that reading it fails. Throws std::system_error if the list of files cannot be read, UsageError
/// if standard input would be read twice.
std::vector<std::string> filesOf(const Options& options);

}  // namespace ironmoat::inspect
