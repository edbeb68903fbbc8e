#include "binary_edits.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "support/binary_builder.h"
#include "wire_keys.h"

namespace ironmoat::fuzz {

using testing::bigEndianBytes;

std::uint64_t BinaryEditor::edge() {
  constexpr std::uint64_t kEdges[] = {
      0,           1,          14,         15,         0x7F,       0x80,         0xFF,
      0x100,       0x7FFF,     0xFFFF,     0x10000,    0x7FFFFFFF, 0x80000000,   0xFFFFFFFF,
      0x100000000, 1ULL << 62, 1ULL << 63, ~0ULL >> 1, ~0ULL,      ~0ULL / 2 - 1};
  if (oneIn(3)) return graph_.objects.size() + below(3) - 1;
  return kEdges[below(std::size(kEdges))] + below(2);
}

GraphObject* BinaryEditor::someContainer() {
  for (int tries = 0; tries < 8; ++tries) {
    GraphObject& object = graph_.objects[someObject()];
    if (object.isContainer() && !object.sameAs) return &object;
  }
  return nullptr;
}
std::uint64_t* BinaryEditor::someReference() {
  GraphObject* container = someContainer();
  if (container == nullptr || container->references.empty()) return nullptr;
  return &container->references[below(container->references.size())];
}

std::uint64_t BinaryEditor::add(GraphObject object) {
  graph_.objects.push_back(std::move(object));
  const std::size_t count = graph_.objects.size();
  if (graph_.referenceSize == 1 && count > 0x100) graph_.referenceSize = 2;
  return count - 1;
}
std::uint64_t BinaryEditor::addText(std::string_view text) {
  for (std::size_t i = 0; i < graph_.objects.size(); ++i) {
    if (graph_.objects[i].kind() == 5 && graph_.objects[i].body == text) return i;
  }
  return add({0x50, std::string(text), {}, {}, 0, {}});
}
std::uint64_t BinaryEditor::addInteger() {
  const std::size_t power = below(5);
  const std::uint64_t value = oneIn(2) ? below(100) : edge();
  std::string bytes = bigEndianBytes(value, std::size_t{1} << std::min<std::size_t>(power, 3));
  if (power == 4) bytes.insert(0, 8, oneIn(3) ? '\xFF' : oneIn(3) ? '\x01' : '\0');
  return add({static_cast<std::uint8_t>(0x10 | power), bytes, {}, {}, 0, {}});
}
std::uint64_t BinaryEditor::addScalar() {
  switch (below(8)) {
    case 0:
      return add({static_cast<std::uint8_t>(oneIn(4) ? 0 : 0x08 + below(2)), {}, {}, {}, 0, {}});
    case 1:
      return addInteger();
    case 2: {
      const std::size_t power = 2 + below(2);
      return add({static_cast<std::uint8_t>(0x20 | power),
                  std::string(1U << power, '\x40'),
                  {},
                  {},
                  0,
                  {}});
    }
    case 3:
      return add({0x33, std::string(8, '\x41'), {}, {}, 0, {}});
    case 4:
      return add({0x40, std::string(below(40), '\xDA'), {}, {}, 0, {}});
    case 5:
      return add({0x50, std::string(below(40), 't'), {}, {}, 0, {}});
    case 6: {
      constexpr std::string_view kUnits[] = {{"\0a", 2},         {"\0\xE9", 2},      "\x4E\x2D",
                                             "\xD8\x3D\xDE\x01", "\xD8\x3D",         "\xDE\x01",
                                             "\xFF\xFE",         "\xDB\xFF\xDF\xFF", {"\0\0", 2}};
      std::string units;
      for (std::size_t n = below(5); n > 0; --n) units += kUnits[below(std::size(kUnits))];
      return add({0x60, units, {}, {}, 0, {}});
    }
    default: {
      const std::size_t size = below(16);
      return add(
          {static_cast<std::uint8_t>(0x80 | size), std::string(size + 1, '\1'), {}, {}, 0, {}});
    }
  }
}
std::uint64_t BinaryEditor::addContainer(std::uint64_t element, std::size_t times) {
  return add({oneIn(8) ? std::uint8_t{0xC0} : std::uint8_t{0xA0},
              {},
              std::vector<std::uint64_t>(times, element),
              {},
              0,
              {}});
}
std::uint64_t BinaryEditor::addDictionary() {
  GraphObject dictionary{0xD0, {}, {}, {}, 0, {}};
  if (!oneIn(5)) dictionary.references = {addText("c"), addInteger()};
  return add(std::move(dictionary));
}

void BinaryEditor::addEntry(GraphObject& dictionary, std::uint64_t key, std::uint64_t value) {
  auto& references = dictionary.references;
  const std::size_t half = references.size() / 2;
  const std::size_t place = below(half + 1);
  references.insert(references.begin() + static_cast<std::ptrdiff_t>(half + place), value);
  references.insert(references.begin() + static_cast<std::ptrdiff_t>(place), key);
}

/// Adds a known key, in most cases with a value of its field's kind.
void BinaryEditor::editEntries() {
  std::size_t which = graph_.objects.size();
  for (int tries = 0; tries < 8 && which == graph_.objects.size(); ++tries) {
    const std::size_t object = someObject();
    if (graph_.objects[object].kind() == 0xD && !graph_.objects[object].sameAs) which = object;
  }
  if (which == graph_.objects.size()) {
    graph_.root = addDictionary();
    return;
  }
  const WireKey& key = wireKeys()[below(wireKeys().size())];
  const std::uint64_t name = addText(key.key);
  std::uint64_t value = someObject();
  if (oneIn(10)) {
    value = addScalar();
  } else if (!oneIn(10)) {
    switch (key.holds) {
      case Holds::integer:
        value = addInteger();
        break;
      case Holds::boolean:
        value = add({static_cast<std::uint8_t>(0x08 + below(2)), {}, {}, {}, 0, {}});
        break;
      case Holds::text:
        value = oneIn(2) ? addText("text") : add({0x60, "\x4E\x2D", {}, {}, 0, {}});
        break;
      case Holds::data:
        value = add({0x40, std::string(below(20), '\xDA'), {}, {}, 0, {}});
        break;
      case Holds::texts:
        value = addContainer(addText("element"), below(4));
        break;
      case Holds::record:
        value = addDictionary();
        break;
      case Holds::records:
        value = addContainer(addDictionary(), below(4));
    }
  }
  addEntry(graph_.objects[which], name, value);
}

void BinaryEditor::editReferences() {
  GraphObject* container = someContainer();
  if (container == nullptr) return editEntries();
  auto& references = container->references;
  const std::size_t place = below(references.size() + 1);
  const auto at = references.begin() + static_cast<std::ptrdiff_t>(place);
  if (at == references.end() || oneIn(4)) {
    references.insert(at, someObject());
  } else if (oneIn(4)) {
    references.erase(at);
  } else if (oneIn(3)) {
    std::swap(*at, references[below(references.size())]);
  } else if (oneIn(3)) {
    references.insert(at, *at);
  } else if (oneIn(8)) {
    *at = edge();
  } else {
    *at = someObject();
  }
}

void BinaryEditor::editObject() {
  const std::size_t which = someObject();
  GraphObject& object = graph_.objects[which];
  switch (below(6)) {
    case 0:
      object.marker = static_cast<std::uint8_t>(random_());
      break;
    case 1:
      if (object.hasLength()) object.length = edge();
      break;
    case 2:
      object.lengthBytes = std::size_t{1} << below(4);
      break;
    case 3: {  // the same bytes as text of the other encoding, or as data
      constexpr std::uint8_t kMarkers[] = {0x40, 0x50, 0x60};
      object.marker = kMarkers[below(3)];
      break;
    }
    case 4: {
      const std::uint64_t other = oneIn(4) ? addDictionary() : addScalar();
      graph_.objects[which] = graph_.objects[other];
      graph_.objects.pop_back();
      break;
    }
    default:
      mutate_(object.body);
  }
}

void BinaryEditor::editOrder() {
  if (graph_.objects.size() < 2) return;
  const std::uint64_t a = someObject();
  const std::uint64_t b = someObject();
  std::swap(graph_.objects[a], graph_.objects[b]);
  if (oneIn(8)) return;  // references meant for one message now lead into the other
  const auto follow = [&](std::uint64_t& reference) {
    reference = reference == a ? b : reference == b ? a : reference;
  };
  follow(graph_.root);
  for (GraphObject& object : graph_.objects) std::ranges::for_each(object.references, follow);
}

void BinaryEditor::editSizes() {
  (oneIn(2) ? graph_.offsetSize : graph_.referenceSize) = 1 + below(8);
}

void BinaryEditor::editTrailer() {
  switch (below(7)) {
    case 0:
      graph_.count = edge();
      break;
    case 1:
      graph_.root = oneIn(2) ? someObject() : edge();
      break;
    case 2:
      graph_.table = edge();
      break;
    case 3:
      graph_.saidOffsetSize = static_cast<std::uint8_t>(below(10));
      break;
    case 4:
      graph_.saidReferenceSize = static_cast<std::uint8_t>(below(10));
      break;
    case 5:
      graph_.offset = {someObject(), edge()};
      break;
    default:
      graph_.objects[someObject()].sameAs = someObject();
  }
}

/// Adds shared subtrees: one value in many places, doubling at each level, a long chain, a cycle.
void BinaryEditor::share() {
  std::uint64_t* reference = someReference();
  if (reference == nullptr) return editEntries();
  const std::uint64_t old = *reference;
  if (oneIn(6)) {
    *reference = graph_.root;
    return;
  }
  std::uint64_t next = oneIn(2) ? old : someObject();
  const bool payloads = oneIn(2);
  const std::size_t levels = oneIn(8) ? 1 + below(600) : 1 + below(4);
  const std::size_t width = levels > 20 ? 1 : 1 + below(3);
  const std::uint64_t here = graph_.objects.size() + 3 + levels * (payloads ? 2 : 1);
  *reference = here - 1;
  const std::uint64_t key = add({0x50, "c", {}, {}, 0, {}});
  const std::uint64_t command = add({0x10, "\1", {}, {}, 0, {}});
  const std::uint64_t list = add({0x50, oneIn(2) ? "mml" : "dtl", {}, {}, 0, {}});
  for (std::size_t i = 0; i < levels; ++i) {
    next = addContainer(next, width);
    if (payloads) next = add({0xD0, {}, {key, list, command, next}, {}, 0, {}});
  }
}

void BinaryEditor::edit() {
  switch (below(16)) {
    case 0:
    case 1:
    case 2:
    case 3:
    case 4:
      return editEntries();
    case 5:
    case 6:
    case 7:
    case 8:
      return editReferences();
    case 9:
    case 10:
    case 11:
      return editObject();
    case 12:
      return editOrder();
    case 13:
      return editSizes();
    case 14:
      return editTrailer();
    default:
      return share();
  }
}

void BinaryEditor::adopt(const BinaryGraph& other) {
  const std::uint64_t shift = graph_.objects.size();
  std::uint64_t* reference = someReference();
  if (reference != nullptr) *reference = other.root + shift;
  for (GraphObject object : other.objects) {
    for (std::uint64_t& child : object.references) child += shift;
    if (object.sameAs) *object.sameAs += shift;
    add(std::move(object));
  }
}

}  // namespace ironmoat::fuzz
