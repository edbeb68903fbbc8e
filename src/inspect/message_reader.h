#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "inspect/options.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Reads messages into one buffer, which it reuses. Not thread-safe.
class MessageReader {
 public:
  /// The bytes of `file`, or of standard input for `-`. Throws std::system_error if it cannot be
  /// read, and DecodingError `limitExceeded` if it is longer than limits::messageBytes.
  Data read(const std::string& file);

 private:
  std::string buffer_;
};

/// The files that `options` name, in order. With `--recursive`, replaces each folder by the regular
/// files below it, sorted by path, but keeps a folder that it cannot list, so that reading it
/// fails. Throws std::system_error if it cannot read the list of files, UsageError if standard
/// input would be read twice.
std::vector<std::string> filesOf(const Options& options);

}  // namespace ironmoat::inspect
