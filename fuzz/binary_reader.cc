// Any bytes as the binary form: the same bytes always give the same tree or the same error, what is
// read is within its bounds, and comes back equal from both forms. (S1, S2, S8-S10)

#include <cstddef>
#include <cstdint>

#include "document_oracles.h"
#include "support/tight_message.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace ironmoat;
  fuzz::checkReading(plist::readBinary,
                     testing::tightMessage({reinterpret_cast<const char*>(data), size}));
  return 0;
}
