// Target: the reader of XML. The same bytes must give the same tree or rejection, indices must be
// in bounds, and the tree must be equal after a round trip through either format. (S1, S2, S8-S10)

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
