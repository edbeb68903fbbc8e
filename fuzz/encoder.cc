// Target: the encoders. A record made of the input, encoded in either format and decoded again,
// must be equal. The first byte chooses the type, the second how many fields are present. (S10)

#include "plist/encoder.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>

#include "plist/property_list_decoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "require.h"
#include "slow_decode.h"

namespace {

using namespace ironmoat;

/// The input as a source of random numbers. Past its end all are zero, which makes fields absent
/// and lists empty.
class InputNumbers {
 public:
  using result_type = std::uint64_t;
  explicit InputNumbers(std::span<const std::uint8_t> bytes) : left_(bytes) {}
  static constexpr result_type min() { return 0; }
  static constexpr result_type max() { return ~result_type{}; }
  result_type operator()() {
    if (left_.empty()) return 0;
    const std::uint64_t byte = left_.front();
    left_ = left_.subspan(1);
    return byte * 0x9E3779B97F4A7C15U;
  }

 private:
  std::span<const std::uint8_t> left_;
};

/// The path of the first field in which two records differ, or nothing.
template <class T>
std::string difference(const T& a, const T& b) {
  std::string found;
  if constexpr (testing::Record<T>) {
    testing::FieldsOf<T>::List::forEach([&](auto field) {
      if (!found.empty()) return;
      found = difference(field.in(a), field.in(b));
      if (!found.empty()) found = std::string(field.name) + " " + found;
    });
  } else if constexpr (requires { a.has_value(); }) {
    if (a.has_value() != b.has_value()) return "presence";
    if (a) found = difference(*a, *b);
  } else if constexpr (requires { a.front(); }) {
    if (a.size() != b.size()) return "length";
    for (std::size_t i = 0; found.empty() && i < a.size(); ++i) found = difference(a[i], b[i]);
  } else if (!(a == b)) {
    found = "value";
  }
  return found;
}

template <class Wire>
void roundTrip(std::span<const std::uint8_t> bytes, double presence) {
  const Wire record =
      testing::BasicRecordGenerator(InputNumbers(bytes), presence).template make<Wire>(3);
  for (const plist::Format form : {plist::Format::binary, plist::Format::xml}) {
    const Data message = plist::PropertyListEncoder(form).encode(record);
    Wire again;
    fuzz::require(!plist::PropertyListDecoder().decode(message, again));
    fuzz::require(difference(record, again).empty());
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 2) return 0;
  const double presence = data[1] / 255.0;
  const std::span bytes(data + 2, size - 2);
  switch (data[0] % 3) {
    case 0:
      roundTrip<VeskCommandResponseSchema>(bytes, presence);
      break;
    case 1:
      roundTrip<VeskCommandWebTunnelResponseSchema>(bytes, presence);
      break;
    default:
      roundTrip<VeskCorvelProtocolPayload>(bytes, presence);
  }
  return 0;
}
