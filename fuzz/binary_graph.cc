#include "binary_graph.h"

#include <algorithm>
#include <map>

#include "plist/binary_format.h"
#include "support/binary_builder.h"

namespace ironmoat::fuzz {

namespace {

using testing::bigEndianBytes;

constexpr std::size_t kMaxObjects = 5000;
constexpr std::size_t kHeader = plist::binary::kHeader.size();
constexpr std::size_t kTrailer = plist::binary::kTrailerSize;

/// At most `count` bytes of `bytes` from `at`, as many as exist.
std::string_view piece(std::string_view bytes, std::uint64_t at, std::uint64_t count) {
  if (at >= bytes.size()) return {};
  return bytes.substr(static_cast<std::size_t>(at), static_cast<std::size_t>(count));
}

std::uint64_t number(std::string_view bytes) {
  std::uint64_t value = 0;
  for (const char byte : bytes) value = value << 8 | static_cast<unsigned char>(byte);
  return value;
}

GraphObject parseObject(std::string_view area, std::uint64_t at, std::size_t referenceSize) {
  GraphObject object;
  const std::string_view first = piece(area, at, 1);
  if (first.empty()) return object;
  object.marker = static_cast<std::uint8_t>(first[0]);
  const unsigned low = object.marker & 0x0FU;
  std::uint64_t body = at + 1;
  if (!object.hasLength()) {
    const bool power = object.kind() >= 1 && object.kind() <= 3;
    const std::size_t size = object.kind() == 0 ? 0 : power ? std::size_t{1} << (low & 7) : low + 1;
    object.body = piece(area, body, size);
    return object;
  }
  std::uint64_t length = low;
  if (low == 0x0F) {
    const std::string_view marker = piece(area, body, 1);
    object.lengthBytes = std::size_t{1} << (marker.empty() ? 0 : marker[0] & 3);
    length = number(piece(area, body + 1, object.lengthBytes));
    body += 1 + object.lengthBytes;
  }
  const std::size_t unit = object.isContainer() ? referenceSize : object.kind() == 6 ? 2 : 1;
  const std::size_t units = object.kind() == 0xD ? 2 : 1;
  const std::size_t left = body < area.size() ? area.size() - static_cast<std::size_t>(body) : 0;
  const std::uint64_t there = std::min<std::uint64_t>(length, left / (unit * units));
  const std::string_view bytes = piece(area, body, there * unit * units);
  if (object.isContainer()) {
    for (std::size_t i = 0; i + referenceSize <= bytes.size(); i += referenceSize) {
      object.references.push_back(number(bytes.substr(i, referenceSize)));
    }
  } else {
    object.body = bytes;
  }
  if (there != length) object.length = length;
  return object;
}

}  // namespace

BinaryGraph BinaryGraph::parse(std::string_view bytes) {
  BinaryGraph graph;
  if (bytes.size() < kHeader + kTrailer) {  // substitutes the smallest message
    graph.objects = {
        {0xD0, {}, {1, 2}, {}, 0, {}}, {0x50, "c", {}, {}, 0, {}}, {0x10, {1}, {}, {}, 0, {}}};
    return graph;
  }
  const std::string_view trailer = bytes.substr(bytes.size() - kTrailer);
  bytes.remove_suffix(kTrailer);
  graph.offsetSize = std::clamp<std::size_t>(number(trailer.substr(6, 1)), 1, 8);
  graph.referenceSize = std::clamp<std::size_t>(number(trailer.substr(7, 1)), 1, 8);
  const std::uint64_t count = number(trailer.substr(8, 8));
  graph.root = number(trailer.substr(16, 8));
  const std::uint64_t table = std::min<std::uint64_t>(number(trailer.substr(24, 8)), bytes.size());
  const std::string_view area = bytes.substr(0, static_cast<std::size_t>(table));
  const std::uint64_t entries =
      std::min<std::uint64_t>({count, (bytes.size() - table) / graph.offsetSize, kMaxObjects});
  std::map<std::uint64_t, std::size_t> known;
  for (std::uint64_t i = 0; i < entries; ++i) {
    const std::uint64_t at = number(
        bytes.substr(static_cast<std::size_t>(table + i * graph.offsetSize), graph.offsetSize));
    const auto [same, isNew] = known.try_emplace(at, graph.objects.size());
    graph.objects.push_back(parseObject(area, at, graph.referenceSize));
    if (!isNew) graph.objects.back().sameAs = same->second;
  }
  if (graph.objects.empty()) graph.objects.emplace_back();
  return graph;
}

std::string BinaryGraph::write() const {
  std::string out(plist::binary::kHeader);
  std::vector<std::uint64_t> offsets;
  for (const GraphObject& object : objects) {
    if (object.sameAs && *object.sameAs < offsets.size()) {
      offsets.push_back(offsets[*object.sameAs]);
      continue;
    }
    offsets.push_back(out.size());
    if (!object.hasLength()) {
      out += static_cast<char>(object.marker);
      out += object.body;
      continue;
    }
    const std::size_t units = object.isContainer()
                                  ? object.references.size() / (object.kind() == 0xD ? 2 : 1)
                                  : object.body.size() / (object.kind() == 6 ? 2 : 1);
    const std::uint64_t length = object.length.value_or(units);
    const auto head = static_cast<char>(object.marker & 0xF0U);
    if (object.lengthBytes == 0 && length < 15) {
      out += static_cast<char>(head | static_cast<char>(length));
    } else {
      std::size_t power = 0;
      while (power < 3 && (std::size_t{1} << power) < object.lengthBytes) ++power;
      while (power < 3 && length >> (8U << power) != 0) ++power;
      out += static_cast<char>(head | '\x0F');
      out += static_cast<char>(0x10U | power);
      out += bigEndianBytes(length, std::size_t{1} << power);
    }
    for (const std::uint64_t reference : object.references) {
      out += bigEndianBytes(reference, referenceSize);
    }
    out += object.body;
  }
  const std::size_t end = out.size();
  for (std::size_t i = 0; i < offsets.size(); ++i) {
    const bool lies = offset && offset->first == i;
    out += bigEndianBytes(lies ? offset->second : offsets[i], offsetSize);
  }
  out.append(6, '\0');
  out += static_cast<char>(saidOffsetSize.value_or(static_cast<std::uint8_t>(offsetSize)));
  out += static_cast<char>(saidReferenceSize.value_or(static_cast<std::uint8_t>(referenceSize)));
  out += bigEndianBytes(count.value_or(offsets.size()), 8);
  out += bigEndianBytes(root, 8);
  out += bigEndianBytes(table.value_or(end), 8);
  return out;
}

}  // namespace ironmoat::fuzz
