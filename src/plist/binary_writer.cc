#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "plist/binary_format.h"
#include "plist/writer.h"
#include "values/block_builder.h"
#include "values/utf8.h"

namespace ironmoat::plist {

namespace {

using binary::Marker;

/// The size of `value` in the format: 1, 2, 4 or 8 bytes.
std::size_t bytesFor(std::uint64_t value) {
  if (value <= 0xFF) return 1;
  if (value <= 0xFFFF) return 2;
  return value <= 0xFFFFFFFF ? 4 : 8;
}

class BinaryWriter {
 public:
  explicit BinaryWriter(const Document& document) : document_(document) {}

  Data write() {
    number(document_.root());
    const std::size_t referenceSize = bytesFor(order_.size());
    out_.append(binary::kHeader);
    std::vector<std::size_t> offsets;
    offsets.reserve(order_.size());
    for (const NodeIndex node : order_) {
      offsets.push_back(out_.size());
      writeObject(document_.node(node), referenceSize);
    }
    const std::size_t table = out_.size();
    const std::size_t offsetSize = bytesFor(table);
    for (const std::size_t offset : offsets) put(offset, offsetSize);
    put(0, 6);
    put(offsetSize, 1);
    put(referenceSize, 1);
    put(order_.size(), 8);
    put(0, 8);  // the root was numbered first
    put(table, 8);
    const BlockRef block = out_.finish();
    return Data(detail::Slice(block.get(), 0, block->size()));
  }

 private:
  /// Numbers the nodes below `root` as objects, parents before children. Equal texts share a
  /// number.
  void number(NodeIndex root) {
    static constexpr std::uint32_t kNone = UINT32_MAX;
    const auto visit = [&](NodeIndex index) {
      if (index >= objects_.size()) objects_.resize(index + 1, kNone);
      if (objects_[index] != kNone) return;
      const auto next = static_cast<std::uint32_t>(order_.size());
      if (const Node& node = document_.node(index); node.kind == Kind::string) {
        const auto [known, isNew] = texts_.try_emplace(document_.text(node), next);
        objects_[index] = known->second;
        if (!isNew) return;
      } else {
        objects_[index] = next;
      }
      order_.push_back(index);
    };
    visit(root);
    for (std::size_t i = 0; i < order_.size(); ++i) {  // order_ grows while it is walked
      forChildren(document_.node(order_[i]), visit);
    }
  }

  template <class Visitor>
  void forChildren(const Node& node, Visitor&& visit) const {
    if (node.kind == Kind::array) {
      for (const NodeIndex child : document_.elements(node)) visit(child);
    } else if (node.kind == Kind::dictionary) {
      for (const NodeIndex child : document_.keys(node)) visit(child);
      for (const NodeIndex child : document_.values(node)) visit(child);
    }
  }

  void writeObject(const Node& node, std::size_t referenceSize) {
    switch (node.kind) {
      case Kind::boolean:
        return put(node.payload != 0 ? binary::kTrue : binary::kFalse, 1);
      case Kind::integer:
        return writeInteger(node.payload);
      case Kind::data:
        writeHead(Marker::data, node.count);
        return out_.append(document_.text(node));
      case Kind::string:
        return writeText(document_.text(node));
      case Kind::array:
      case Kind::dictionary:
        writeHead(node.kind == Kind::array ? Marker::array : Marker::dictionary, node.count);
        return forChildren(node, [&](NodeIndex child) { put(objects_[child], referenceSize); });
      default:
        throw std::invalid_argument("value kind not allowed: " + std::string(nameOf(node.kind)));
    }
  }

  void writeInteger(std::uint64_t bits) {
    const std::size_t size = bytesFor(bits);  // 8 for a negative one, whose top bit is set
    std::uint8_t marker = static_cast<std::uint8_t>(Marker::integer) << 4;
    for (std::size_t n = size; n > 1; n /= 2) ++marker;
    put(marker, 1);
    put(bits, size);
  }

  void writeHead(Marker marker, std::uint64_t length) {
    const auto high = static_cast<std::uint8_t>(static_cast<std::uint8_t>(marker) << 4);
    if (length < binary::kLengthFollows) return put(high | length, 1);
    put(high | binary::kLengthFollows, 1);
    writeInteger(length);
  }

  void writeText(std::string_view text) {
    if (asciiPrefix(text) == text.size()) {
      writeHead(Marker::ascii, text.size());
      return out_.append(text);
    }
    const std::u16string units = utf16FromUtf8(text);
    writeHead(Marker::utf16, units.size());
    for (const char16_t unit : units) put(unit, 2);
  }

  void put(std::uint64_t value, std::size_t size) {
    char* place = out_.extend(size);
    for (std::size_t i = size; i-- > 0; value >>= 8) place[i] = static_cast<char>(value);
  }

  const Document& document_;
  BlockBuilder out_;
  std::vector<NodeIndex> order_;        // by object number
  std::vector<std::uint32_t> objects_;  // by node
  std::unordered_map<std::string_view, std::uint32_t> texts_;
};

}  // namespace

Data writeBinary(const Document& document) { return BinaryWriter(document).write(); }

}  // namespace ironmoat::plist
