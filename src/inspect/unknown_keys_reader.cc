#include "inspect/unknown_keys_reader.h"

#include <algorithm>
#include <memory>
#include <string>

#include "client/record_request.h"

namespace ironmoat::inspect {

std::optional<UnknownKeys> UnknownKeysReader::read(const AnyRecord& record, const Data& message) {
  const std::string outputType = unknownKeysOf(
      std::visit([]<class R>(const R&) -> std::string_view { return R::schemaName; }, record));
  client::RecordRequest<UnknownKeys> request(context_.counters, message, context_.deadline({}), {},
                                             outputType);
  pool_.run({std::shared_ptr<void>(), &request});
  UnknownKeys found = request.takeRecord();
  found.paths.resize(std::min(found.paths.size(), UnknownKeys::kMaxPaths));
  return found.count > 0 ? std::optional(std::move(found)) : std::nullopt;
}

}  // namespace ironmoat::inspect
