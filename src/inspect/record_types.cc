#include "inspect/record_types.h"

#include <algorithm>
#include <array>

#include "inspect/json.h"
#include "inspect/schema.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat::inspect {

namespace {

template <class T>
std::size_t valuesIn(const T& value) {
  std::size_t values = 0;
  if constexpr (kIsList<T>) {
    for (const auto& element : value) values += valuesIn(element);
  } else if constexpr (Record<T>) {
    forEachPresentField(value,
                        [&](std::string_view, const auto& field) { values += valuesIn(field); });
  } else {
    values = 1;
  }
  return values;
}

template <MessageSchema R>
class RecordOf : public UnpackedRecord {
 public:
  explicit RecordOf(Pending<R>& pending) : record_(pending.get()) {}

  [[nodiscard]] std::size_t values() const override { return valuesIn(record_); }
  void show(Format format, const Style& style, std::string& out) const override {
    if (format == Format::json) {
      appendJson(out, record_);
    } else {
      TextView(out, style).record(record_, 2);
    }
  }

 private:
  R record_;
};

template <MessageSchema R>
PendingRecord submitAs(Client& client, const Data& message) {
  return [pending = std::make_shared<Pending<R>>(client.submit<R>(message))] {
    return std::make_unique<RecordOf<R>>(*pending);
  };
}

template <MessageSchema R>
constexpr RecordType row(std::string_view name) {
  return {name, submitAs<R>, showSchemaOf<R>};
}

constexpr std::array kRecordTypes = {
    row<VeskCommandResponse>("command-response"),
    row<VeskCommandWebTunnelResponse>("web-tunnel-response"),
    row<DrelUserPayload>("payload"),
};

}  // namespace

std::span<const RecordType> recordTypes() noexcept { return kRecordTypes; }

const RecordType* recordType(std::string_view name) noexcept {
  const auto* found = std::find_if(kRecordTypes.begin(), kRecordTypes.end(),
                                   [name](const RecordType& type) { return type.name == name; });
  return found == kRecordTypes.end() ? nullptr : found;
}

}  // namespace ironmoat::inspect
