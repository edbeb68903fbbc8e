#pragma once

#include <span>
#include <string_view>
#include <variant>
#include <vector>

#include "inspect/schema.h"
#include "ironmoat/client.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat::inspect {

template <class... R>
struct TypesOf {
  using Record = std::variant<R...>;
  using Pending = std::variant<ironmoat::Pending<R>...>;
};
using Types = TypesOf<VeskCommandResponse, VeskCommandWebTunnelResponse, DrelUserPayload>;
/// A record of any type that messages can have.
using AnyRecord = Types::Record;

struct RecordType {
  std::string_view name;  ///< value of `--type`
  Types::Pending (*submit)(Client& client, const Data& message);
  std::vector<RecordSchema> (*schemas)();  ///< of the record, then of its nested records
};

/// All types that messages can have. Of types that fit a message equally well, `--type auto`
/// chooses the first.
std::span<const RecordType> recordTypes() noexcept;

/// Null if no type has that name.
const RecordType* recordType(std::string_view name) noexcept;

}  // namespace ironmoat::inspect
