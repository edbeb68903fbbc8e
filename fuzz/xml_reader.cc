// Reads any bytes as XML. The same bytes must give the same tree or rejection every time,
// indices must be in bounds, and the tree must come back equal from both formats. (S1, S2, S8-S10)

#include <cstddef>
#include <cstdint>

#include "document_oracles.h"
#include "support/tight_message.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace ironmoat;
  fuzz::checkReading(plist::readXml,
                     testing::tightMessage({reinterpret_cast<const char*>(data), size}));
  return 0;
}
