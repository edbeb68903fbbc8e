#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "plist/binary_format.h"
#include "plist/reader.h"
#include "plist/rejection.h"
#include "values/utf8.h"

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace ironmoat::plist {

using binary::Marker;

/// Reads a message in three passes, each linear in its size: make a node of each object in the
/// offset table, check that keys are text, and measure the graph, which must be acyclic and within
/// the nesting limit. Functions return false when they reject the message; callers must then return
/// false at once.
class BinaryReader {
 public:
  BinaryReader(const Data& message, Document& document)
      : bytes_(message.bytes().data()),
        size_(message.size()),
        base_(message.slice().offset()),
        document_(document),
        nodes_(document.nodes_),
        children_(document.children_),
        side_(message.slice().block() == nullptr ? Sharing::anyThread
                                                 : message.slice().block()->sharing()) {
    if (Block* block = message.slice().block(); block != nullptr) {
      block->retain();
      document.source_ = BlockRef::adopt(block);
    }
  }

  /// Returns the rejection if there is one; otherwise the document is complete.
  std::optional<DecodingError> read() {
    if (!readTrailer() || !readObjects() || !checkKeys() || !measure())
      return std::move(rejection_);
    document_.root_ = root_;
    if (side_.size() != 0) side_.reserve(Document::kReadable);
    document_.side_ = side_.finish();
    return std::nullopt;
  }

 private:
  /// `size` bytes (1 to 8) as an unsigned number. Loads 8 bytes at once, which stay inside the
  /// message for any position before the trailer of 32 bytes.
  static std::uint64_t bigEndian(const unsigned char* bytes, std::size_t size) {
    static_assert(binary::kTrailerSize >= 8);
    static_assert(std::endian::native == std::endian::little);
    std::uint64_t word;
    std::memcpy(&word, bytes, sizeof word);
    return __builtin_bswap64(word) >> (64 - 8 * size);
  }

  /// The marker of a length in one byte.
  static constexpr std::uint8_t kByteFollows = 0x10;
  static constexpr std::uint16_t kTooDeep = limits::nestedContainers + 1;
  static constexpr std::uint16_t kOpen = std::numeric_limits<std::uint16_t>::max();

  [[gnu::cold, gnu::noinline]] bool reject(DecodingError rejection) {
    rejection_ = std::move(rejection);
    return false;
  }
  [[gnu::cold, gnu::noinline]] bool reject(std::string_view reason, std::uint64_t offset) {
    return reject(malformed(reason, offset));
  }

  [[nodiscard]] bool readTrailer() {
    constexpr std::size_t kSmallest = binary::kHeader.size() + 1 + 1 + binary::kTrailerSize;
    if (size_ < kSmallest) return reject("unexpected end of message", size_);
    if (!std::equal(binary::kHeader.begin(), binary::kHeader.end(), bytes_)) {
      return reject("not a valid version of the binary format", 6);
    }
    const std::size_t trailer = size_ - binary::kTrailerSize;
    offsetSize_ = bytes_[trailer + 6];
    referenceSize_ = bytes_[trailer + 7];
    if (offsetSize_ < 1 || offsetSize_ > binary::kMaxSize) {
      return reject("not a valid offset size: " + std::to_string(offsetSize_), trailer + 6);
    }
    if (referenceSize_ < 1 || referenceSize_ > binary::kMaxSize) {
      return reject("not a valid reference size: " + std::to_string(referenceSize_), trailer + 7);
    }
    const std::uint64_t count = bigEndian(bytes_ + trailer + 8, 8);
    const std::uint64_t root = bigEndian(bytes_ + trailer + 16, 8);
    const std::uint64_t table =
        bigEndian(bytes_ + trailer + 24, 8);  // the last bytes of the message
    if (table <= binary::kHeader.size() || table >= trailer) {
      return reject("not a valid position of the offset table", trailer + 24);
    }
    // The table must end exactly at the trailer. Division cannot overflow, as a product could.
    if (count != (trailer - table) / offsetSize_ || (trailer - table) % offsetSize_ != 0) {
      return reject("not a valid object count for the offset table", trailer + 8);
    }
    // Each object takes at least one byte, and objects must not overlap. So the size of the message
    // bounds the memory that is allocated for nodes.
    if (count > table - binary::kHeader.size()) {
      return reject("object count exceeds the object area", trailer + 8);
    }
    if (root >= count) return reject("not a valid top object", trailer + 16);
    objectsEnd_ = static_cast<std::size_t>(table);
    objectCount_ = static_cast<std::size_t>(count);
    root_ = static_cast<NodeIndex>(root);
    return true;
  }

  [[nodiscard]] bool readObjects() {
    Node* const nodes = nodes_.extend(objectCount_);
    // Local copies, which the compiler need not reload for each object.
    const unsigned char* const bytes = bytes_;
    const std::size_t end = objectsEnd_;
    const std::size_t count = objectCount_;
    const std::size_t offsetSize = offsetSize_;
    const std::size_t base = base_;
    // The sizes of all objects must not exceed the object area together, which bounds the work by
    // the size of the message.
    std::size_t left = end - binary::kHeader.size();
    std::size_t entry = end;
    for (std::size_t i = 0; i < count; ++i, entry += offsetSize) {
      const std::uint64_t offset = bigEndian(bytes + entry, offsetSize);
      if (offset - binary::kHeader.size() >=
          end - binary::kHeader.size()) {  // wraps below the area
        return reject("not a valid object offset", entry);
      }
      const std::size_t start = static_cast<std::size_t>(offset);
      const std::uint8_t marker = bytes[start];
      const auto kind = static_cast<Marker>(marker >> 4);
      // Most objects are short texts, data or integers, which are read inline. All others, and all
      // rejections, are left to `readObject`.
      std::size_t body = start + 1;
      std::size_t length = marker & 0x0F;
      std::size_t size = 0;
      if (kind == Marker::ascii || kind == Marker::data) {
        bool fits = true;
        if (length == binary::kLengthFollows) {
          fits = bytes[body] == kByteFollows;
          length = bytes[body + 1];  // inside the message, because of the trailer
          body += 2;
        }
        fits = fits && body + length <= end;
        if (fits && (kind == Marker::data || isAsciiInside(bytes + body, length))) {
          size = body + length - start;
          nodes[i] = {kind == Marker::data ? Kind::data : Kind::string, false, 0,
                      static_cast<std::uint32_t>(length), base + body};
        }
      } else if (kind == Marker::integer && length <= 3 &&
                 (std::size_t{1} << length) < end - start) {
        size = 1 + (std::size_t{1} << length);
        nodes[i] = {Kind::integer, false, 0, 0, bigEndian(bytes + body, size - 1)};
      }
      if (size == 0) {
        current_ = static_cast<NodeIndex>(i);
        std::size_t objectEnd = 0;
        if (!readObject(start, nodes[i], objectEnd)) return false;
        size = objectEnd - start;
      }
      if (size > left) return reject("overlapping objects not allowed", start);
      left -= size;
    }
    return true;
  }

  /// Reads the object at `at`, which must be inside the object area, and sets its end.
  [[nodiscard]] bool readObject(std::size_t at, Node& node, std::size_t& end) {
    const std::uint8_t marker = bytes_[at];
    const std::uint8_t low = marker & 0x0F;
    const std::size_t body = at + 1;
    node = {Kind::boolean, false, 0, 0, 0};
    switch (static_cast<Marker>(marker >> 4)) {
      case Marker::simple:
        if (marker != binary::kFalse && marker != binary::kTrue && marker != binary::kNull) break;
        if (marker == binary::kNull) node.kind = Kind::null;
        node.payload = marker == binary::kTrue ? 1 : 0;
        end = body;
        return true;
      case Marker::integer:
        if (low > 4) break;
        return readInteger(at, std::size_t{1} << low, node, end);
      case Marker::real:
        if (low != 2 && low != 3) break;
        node.kind = Kind::real;
        return need(body, std::size_t{1} << low, at, end);
      case Marker::date:
        if (low != 3) break;
        node.kind = Kind::date;
        return need(body, 8, at, end);
      case Marker::uid:
        node.kind = Kind::uid;
        return need(body, low + std::size_t{1}, at, end);
      case Marker::data:
      case Marker::ascii:
        return readBytes(at, node, end);
      case Marker::utf16:
        return readUtf16(at, node, end);
      case Marker::array:
      case Marker::set:
      case Marker::dictionary:
        return readContainer(at, node, end);
    }
    return reject("not a valid object marker", at);
  }

  /// Sets `end` to `start + count`; rejects an end outside the object area.
  [[nodiscard]] bool need(std::size_t start, std::uint64_t count, std::size_t object,
                          std::size_t& end) {
    if (count > objectsEnd_ - start) return reject("object exceeds the object area", object);
    end = start + static_cast<std::size_t>(count);
    return true;
  }

  [[nodiscard]] bool readInteger(std::size_t at, std::size_t size, Node& node, std::size_t& end) {
    if (!need(at + 1, size, at, end)) return false;
    const unsigned char* bytes = bytes_ + at + 1;
    node.kind = Kind::integer;
    if (size <= 8) {
      node.payload = bigEndian(bytes, size);  // of 8 bytes: already in two's complement
      return true;
    }
    node.payload = bigEndian(bytes + 8, 8);
    const bool negative = (node.payload >> 63) != 0;
    if (bigEndian(bytes, 8) != 0 - std::uint64_t{negative}) node.kind = Kind::wideInteger;
    return true;
  }

  /// Reads the length of the object at `at`, and the position of its content.
  [[nodiscard]] bool readLength(std::size_t at, std::uint64_t& length, std::size_t& body) {
    body = at + 1;
    length = bytes_[at] & 0x0F;
    if (length != binary::kLengthFollows) return true;
    const std::size_t marker = body;
    if (!need(marker, 1, at, body)) return false;
    if (bytes_[marker] < 0x10 || bytes_[marker] > 0x13) {
      return reject("not a valid length", marker);
    }
    const std::size_t size = std::size_t{1} << (bytes_[marker] & 0x0F);
    const std::size_t digits = body;
    if (!need(digits, size, at, body)) return false;
    length = bigEndian(bytes_ + digits, size);  // a negative one exceeds any message
    return true;
  }

  [[nodiscard]] bool readBytes(std::size_t at, Node& node, std::size_t& end) {
    std::size_t body = 0;
    std::uint64_t length = 0;
    if (!readLength(at, length, body) || !need(body, length, at, end)) return false;
    node.kind = Kind::data;
    node.count = static_cast<std::uint32_t>(length);
    node.payload = base_ + body;
    if (static_cast<Marker>(bytes_[at] >> 4) == Marker::ascii) {
      node.kind = Kind::string;
      if (!isAscii(textAt(node))) {
        return reject("not a valid ASCII character", body + asciiPrefix(textAt(node)));
      }
    }
    return true;
  }

  [[nodiscard]] std::string_view textAt(const Node& node) const {
    return {reinterpret_cast<const char*>(bytes_) + (node.payload - base_), node.count};
  }

  /// Tests a text of fewer than 16 bytes at once. Reading 16 bytes from any position up to the end
  /// of the object area stays inside the message, because the offset table and the trailer behind
  /// it have at least 33 bytes.
  [[nodiscard]] static bool isAsciiInside(const unsigned char* text, std::size_t length) {
    static_assert(binary::kTrailerSize >= 16);
#if defined(__SSE2__)
    if (length < 16) {
      const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i*>(text));
      return (static_cast<unsigned>(_mm_movemask_epi8(bytes)) & ((1U << length) - 1)) == 0;
    }
#endif
    return isAscii({reinterpret_cast<const char*>(text), length});
  }

  [[nodiscard]] bool readUtf16(std::size_t at, Node& node, std::size_t& end) {
    std::size_t body = 0;
    std::uint64_t units = 0;
    if (!readLength(at, units, body)) return false;
    if (units > objectsEnd_ / 2) return reject("object exceeds the object area", at);
    if (!need(body, units * 2, at, end)) return false;
    const std::size_t start = side_.size();
    // A unit takes at most 3 bytes of UTF-8; a pair takes 4.
    char* out = side_.extend(static_cast<std::size_t>(units) * 3);
    char* const first = out;
    for (std::size_t i = body; i < end; i += 2) {
      char32_t unit = static_cast<char32_t>(bytes_[i] << 8 | bytes_[i + 1]);
      if (unit >= 0xD800 && unit <= 0xDFFF) {
        const bool pair = unit < 0xDC00 && end - i >= 4 && (bytes_[i + 2] & 0xFC) == 0xDC;
        if (!pair) return reject("not a valid surrogate pair", i);
        const auto low = static_cast<char32_t>(bytes_[i + 2] << 8 | bytes_[i + 3]);
        unit = 0x10000 + ((unit - 0xD800) << 10) + (low - 0xDC00);
        i += 2;
      }
      out += writeUtf8(unit, out);
    }
    side_.truncate(start + static_cast<std::size_t>(out - first));
    node = {Kind::string, true, 0, static_cast<std::uint32_t>(out - first), start};
    return true;
  }

  [[nodiscard]] bool readContainer(std::size_t at, Node& node, std::size_t& end) {
    containers_.push(current_);
    const auto marker = static_cast<Marker>(bytes_[at] >> 4);
    const bool dictionary = marker == Marker::dictionary;
    std::size_t body = 0;
    std::uint64_t count = 0;
    if (!readLength(at, count, body)) return false;
    // Each element takes at least one byte, so neither product can overflow.
    if (count > objectsEnd_) return reject("object exceeds the object area", at);
    const std::size_t references = static_cast<std::size_t>(count) * (dictionary ? 2 : 1);
    if (!need(body, references * referenceSize_, at, end)) return false;
    node.kind = dictionary ? Kind::dictionary : marker == Marker::set ? Kind::set : Kind::array;
    node.count = static_cast<std::uint32_t>(count);
    node.payload = children_.size();
    return takeReferences(bytes_ + body, references, children_.extend(references));
  }

  [[nodiscard]] bool takeReferences(const unsigned char* from, std::size_t count,
                                    NodeIndex* children) {
    std::uint64_t lowest = objectCount_;
    std::uint64_t highest = 0;
    for (std::size_t i = 0; i < count; ++i) {
      const std::uint64_t reference = bigEndian(from + i * referenceSize_, referenceSize_);
      children[i] = static_cast<NodeIndex>(reference);
      lowest = std::min(lowest, reference);
      highest = std::max(highest, reference);
    }
    if (highest >= objectCount_) return rejectStray(from, count);
    if (lowest > current_) return true;
    // References to earlier scalars do not matter: they close no cycle, and their height is 0.
    for (std::size_t i = 0; i < count; ++i) {
      if (children[i] <= current_ && isContainer(nodes_[children[i]])) parentsFirst_ = false;
    }
    return true;
  }

  bool rejectStray(const unsigned char* from, std::size_t count) {
    std::size_t i = 0;
    while (i + 1 < count && bigEndian(from + i * referenceSize_, referenceSize_) < objectCount_)
      ++i;
    return reject("not a valid reference",
                  static_cast<std::size_t>(from - bytes_) + i * referenceSize_);
  }

  [[nodiscard]] bool checkKeys() {
    for (const NodeIndex i : containers_.span(0, containers_.size())) {
      if (nodes_[i].kind != Kind::dictionary) continue;
      for (const NodeIndex key : document_.keys(nodes_[i])) {
        if (nodes_[key].kind != Kind::string) {
          return reject("not a valid dictionary key: expected string, found " +
                            std::string(nameOf(nodes_[key].kind)),
                        offsetOf(i));
        }
      }
    }
    return true;
  }

  [[nodiscard]] bool measure() { return parentsFirst_ ? measureBackwards() : measureFromRoot(); }

  /// Values or elements; requires a container.
  [[nodiscard]] std::span<const NodeIndex> childrenOf(const Node& node) const {
    return node.kind == Kind::dictionary ? document_.values(node) : document_.elements(node);
  }
  static bool isContainer(const Node& node) {
    static_assert(std::max({Kind::dictionary, Kind::array, Kind::set}) < Kind::string);
    return node.kind < Kind::string;
  }

  /// For messages with all parents before their children, as most writers emit them. There is no
  /// cycle, and each height is known before it is needed when objects are visited from the last to
  /// the first.
  [[nodiscard]] bool measureBackwards() {
    for (std::size_t i = containers_.size(); i-- > 0;) {
      Node& node = nodes_[containers_[i]];
      std::uint16_t height = 0;
      for (const NodeIndex child : childrenOf(node))
        height = std::max(height, nodes_[child].height);
      node.height = std::min<std::uint16_t>(height + 1, kTooDeep);
    }
    if (nodes_[root_].height == kTooDeep) return reject(tooDeep());
    return true;
  }

  /// For any graph: depth first from the root. Each container is entered once, however often it is
  /// shared. Its height is 0 before, and kOpen during the visit.
  [[nodiscard]] bool measureFromRoot() {
    struct Step {
      NodeIndex node;
      std::uint32_t nextChild;
      std::uint16_t height;
    };
    if (!isContainer(nodes_[root_])) return true;
    ScratchArray<Step, limits::nestedContainers> way;
    const auto enter = [&](NodeIndex index) {
      nodes_[index].height = kOpen;
      way.push({index, 0, 0});
    };
    enter(root_);
    while (true) {
      Step& step = way.back();
      const std::span<const NodeIndex> children = childrenOf(nodes_[step.node]);
      if (step.nextChild == children.size()) {
        const auto height = static_cast<std::uint16_t>(step.height + 1);
        nodes_[step.node].height = height;
        way.shrinkTo(way.size() - 1);
        if (way.empty()) return true;
        way.back().height = std::max(way.back().height, height);
        continue;
      }
      const NodeIndex child = children[step.nextChild++];
      const Node& node = nodes_[child];
      if (!isContainer(node)) continue;
      if (node.height == kOpen) return reject("reference cycle not allowed", offsetOf(child));
      // A child whose height is not known yet has a height of at least 1.
      if (way.size() + std::max<std::size_t>(node.height, 1) > limits::nestedContainers) {
        return reject(tooDeep());
      }
      if (node.height == 0) {
        enter(child);
      } else {
        step.height = std::max(step.height, node.height);
      }
    }
  }

  [[nodiscard]] std::uint64_t offsetOf(std::size_t object) const {
    return bigEndian(bytes_ + objectsEnd_ + object * offsetSize_, offsetSize_);
  }

  const unsigned char* const bytes_;
  const std::size_t size_;
  const std::size_t base_;  // offset of the message in its block
  Document& document_;
  Document::Nodes& nodes_;
  Document::Children& children_;
  ScratchArray<NodeIndex, 128> containers_;  // in the order of the offset table
  BlockBuilder side_;

  std::size_t offsetSize_ = 0;
  std::size_t referenceSize_ = 0;
  std::size_t objectCount_ = 0;
  std::size_t objectsEnd_ = 0;  // also the beginning of the offset table
  NodeIndex root_ = 0;
  NodeIndex current_ = 0;
  bool parentsFirst_ = true;  // no reference to an earlier container
  std::optional<DecodingError> rejection_;
};

std::optional<DecodingError> readBinary(const Data& message, Document& document) {
  return BinaryReader(message, document).read();
}

}  // namespace ironmoat::plist
