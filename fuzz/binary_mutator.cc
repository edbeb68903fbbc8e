// libFuzzer's mutator for binary messages. Half of the mutations change the graph of objects; the
// other half change plain bytes, which reaches messages that no writer produces.

#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>

#include "binary_edits.h"

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);
extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t maxSize, unsigned seed);
extern "C" std::size_t LLVMFuzzerCustomCrossOver(const std::uint8_t* a, std::size_t aSize,
                                                 const std::uint8_t* b, std::size_t bSize,
                                                 std::uint8_t* out, std::size_t maxSize,
                                                 unsigned seed);

namespace {

using ironmoat::fuzz::BinaryEditor;
using ironmoat::fuzz::BinaryGraph;

std::string_view textOf(const std::uint8_t* data, std::size_t size) {
  return {reinterpret_cast<const char*>(data), size};
}

/// True also for input so short that it may become a binary message.
bool isBinary(std::string_view message) {
  return message.size() < 8 || message.starts_with("bplist");
}

void mutateBytes(std::string& bytes) {
  const std::size_t size = bytes.size();
  bytes.resize(size + 16);
  bytes.resize(LLVMFuzzerMutate(reinterpret_cast<std::uint8_t*>(bytes.data()), size, bytes.size()));
}

/// Writes the graph, or nothing if it is too large.
std::size_t write(const BinaryGraph& graph, std::uint8_t* out, std::size_t maxSize) {
  const std::string bytes = graph.write();
  if (bytes.size() > maxSize) return 0;
  std::copy(bytes.begin(), bytes.end(), out);
  return bytes.size();
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t maxSize, unsigned seed) {
  if (seed % 2 == 0 && isBinary(textOf(data, size))) {
    BinaryGraph graph = BinaryGraph::parse(textOf(data, size));
    BinaryEditor editor(graph, seed, mutateBytes);
    for (unsigned edits = 1 + seed / 2 % 4; edits > 0; --edits) editor.edit();
    if (const std::size_t written = write(graph, data, maxSize); written != 0) return written;
  }
  return LLVMFuzzerMutate(data, size, maxSize);
}

extern "C" std::size_t LLVMFuzzerCustomCrossOver(const std::uint8_t* a, std::size_t aSize,
                                                 const std::uint8_t* b, std::size_t bSize,
                                                 std::uint8_t* out, std::size_t maxSize,
                                                 unsigned seed) {
  if (!isBinary(textOf(a, aSize)) || !isBinary(textOf(b, bSize))) return 0;
  BinaryGraph graph = BinaryGraph::parse(textOf(a, aSize));
  BinaryEditor(graph, seed, mutateBytes).adopt(BinaryGraph::parse(textOf(b, bSize)));
  return write(graph, out, maxSize);
}
