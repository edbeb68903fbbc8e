#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <string_view>

#include "inspect/options.h"
#include "inspect/text_view.h"
#include "ironmoat/client.h"

namespace ironmoat::inspect {

/// A record of any type.
class UnpackedRecord {
 public:
  UnpackedRecord() = default;
  UnpackedRecord(const UnpackedRecord&) = delete;
  UnpackedRecord& operator=(const UnpackedRecord&) = delete;
  virtual ~UnpackedRecord() = default;

  /// Numbers, texts and so on in it and in the records in it: how much of the message it got.
  [[nodiscard]] virtual std::size_t values() const = 0;
  /// Appends one JSON value, or lines of text.
  virtual void show(Format format, const Style& style, std::string& out) const = 0;
};

/// Waits for a submitted message's record. Throws what Client::unpack throws. Once only.
using PendingRecord = std::function<std::unique_ptr<UnpackedRecord>()>;

struct RecordType {
  std::string_view name;  ///< as after `--type`
  PendingRecord (*submit)(Client& client, const Data& message);
  void (*showSchema)(Format format, const Colours& colours, std::string& out);
};

/// All types of record that can be asked for; a message that fits several alike is taken for the
/// first.
std::span<const RecordType> recordTypes() noexcept;

/// Null when there is none of that name.
const RecordType* recordType(std::string_view name) noexcept;

}  // namespace ironmoat::inspect
