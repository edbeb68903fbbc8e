// Replays a corpus without libFuzzer. Passes each file, or each file below a folder, of the command
// line to the fuzz target, with some mutations of it if the target has a mutator. After --damaged,
// passes also each prefix of a short file, and the file with each single bit flipped.

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);
extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);
extern "C" __attribute__((weak)) std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data,
                                                                     std::size_t size,
                                                                     std::size_t maxSize,
                                                                     unsigned seed);

/// Stands in for libFuzzer's function, which has more kinds of mutations.
extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t) {
  if (size != 0) data[size / 2] ^= 0x11;
  return size;
}

namespace {

using Bytes = std::vector<std::uint8_t>;

void run(std::span<const std::uint8_t> bytes) {
  // The block has exactly the size of the input, so that a sanitizer notices a read past it.
  const auto exact = std::make_unique<std::uint8_t[]>(bytes.size());
  std::copy(bytes.begin(), bytes.end(), exact.get());
  LLVMFuzzerTestOneInput(exact.get(), bytes.size());
}

void runDamaged(Bytes bytes) {
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    run(std::span(bytes).first(length));
  }
  for (std::size_t bit = 0; bit < 8 * bytes.size(); ++bit) {
    const auto mask = static_cast<std::uint8_t>(1 << (bit % 8));
    bytes[bit / 8] ^= mask;
    run(bytes);
    bytes[bit / 8] ^= mask;
  }
}

bool damaged = false;

void replay(const std::filesystem::path& file) {
  std::ifstream stream(file, std::ios::binary);
  const Bytes bytes((std::istreambuf_iterator<char>(stream)), {});
  run(bytes);
  constexpr std::size_t kShort = 1024;
  if (damaged && bytes.size() <= kShort) runDamaged(bytes);
  constexpr std::size_t kRoom = 4096;
  if (LLVMFuzzerCustomMutator == nullptr || bytes.size() > kRoom) return;
  constexpr unsigned kChanges = 30;
  Bytes changed(bytes);
  std::size_t size = bytes.size();
  for (unsigned seed = 0; seed < kChanges; ++seed) {
    changed.resize(kRoom);
    size = LLVMFuzzerCustomMutator(changed.data(), size, kRoom, seed);
    run(std::span(changed).first(size));
  }
}

}  // namespace

int main(int argc, char** argv) {
  int files = 0;
  for (int i = 1; i < argc; ++i) {
    if (std::string_view(argv[i]) == "--damaged") {
      damaged = true;
      continue;
    }
    if (!std::filesystem::is_directory(argv[i])) {
      replay(argv[i]);
      ++files;
      continue;
    }
    for (const auto& entry : std::filesystem::recursive_directory_iterator(argv[i])) {
      if (!entry.is_regular_file()) continue;
      replay(entry.path());
      ++files;
    }
  }
  std::printf("%d inputs replayed\n", files);
  return files == 0 ? 1 : 0;
}
