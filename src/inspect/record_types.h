#pragma once

#include <functional>
#include <span>
#include <string>
#include <string_view>

#include "inspect/options.h"
#include "inspect/text_view.h"
#include "ironmoat/client.h"

namespace ironmoat::inspect {

/// Waits for a submitted message's record and appends it to `out`: one JSON value, or lines of
/// text. Throws what Client::unpack throws, with `out` as it was.
using PendingRecord = std::function<void(Format, const Colours&, std::string& out)>;

struct RecordType {
  std::string_view name;  ///< as after `--type`
  PendingRecord (*submit)(Client& client, const Data& message);
};

/// All types of record that can be asked for.
std::span<const RecordType> recordTypes() noexcept;

/// Null when there is none of that name.
const RecordType* recordType(std::string_view name) noexcept;

}  // namespace ironmoat::inspect
