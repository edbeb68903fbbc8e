// write_records FOLDER: writes generated records of all types in both formats, as
// KIND-NUMBER.FORMAT, to test other readers. Two payloads are large enough for wide offsets and
// references.

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>
#include <string_view>
#include <utility>

#include "plist/encoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "support/wire_fields.h"

namespace ironmoat {

namespace {

template <class R>
void writeRecord(const std::filesystem::path& name, const R& record) {
  for (const auto form : {plist::Format::binary, plist::Format::xml}) {
    const Data message = plist::PropertyListEncoder(form).encode(record);
    std::ofstream file(name.string() + (form == plist::Format::xml ? ".xml" : ".binary"));
    file.exceptions(std::ios::failbit | std::ios::badbit);
    file << message.view() << std::flush;
  }
}

template <class R>
void writeKind(const std::filesystem::path& prefix) {
  constexpr double kPresences[] = {0, 0.1, 0.5, 1};
  for (std::uint64_t seed = 0; seed < 100; ++seed) {
    testing::RecordGenerator generator(seed, kPresences[seed % std::size(kPresences)]);
    writeRecord(prefix.string() + std::to_string(seed), generator.make<R>(2));
  }
}

void writeAll(const std::filesystem::path& folder) {
  writeKind<VeskCorvelProtocolPayload>(folder / "payload-");
  writeKind<VeskCommandResponseSchema>(folder / "command-response-");
  writeKind<VeskCommandWebTunnelResponseSchema>(folder / "web-tunnel-response-");

  VeskCorvelProtocolPayload blob;
  blob.payload = Data(std::string_view(std::string(1 << 20, '\xA5')));
  writeRecord(folder / "payload-blob", blob);

  VeskCorvelProtocolPayload texts;
  List<String> urls;
  for (int i = 0; i < 70'000; ++i) urls.emplace_back(std::string_view(std::to_string(i)));
  texts.KibbDownloadUrlList = std::move(urls);
  writeRecord(folder / "payload-texts", texts);
}

}  // namespace
}  // namespace ironmoat

int main(int argc, char** argv) {
  if (argc != 2) {
    std::cerr << "usage: write_records FOLDER\n";
    return EXIT_FAILURE;
  }
  ironmoat::writeAll(argv[1]);
  return EXIT_SUCCESS;
}
