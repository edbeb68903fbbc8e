#pragma once

#include <cstddef>
#include <functional>
#include <random>
#include <string>

#include "binary_sketch.h"

namespace ironmoat::fuzz {

/// Edits at random that keep a message near to what the reader and the decoder accept, or take it
/// just past that.
class BinaryEditor {
 public:
  /// `mutate` changes plain bytes.
  BinaryEditor(BinarySketch& sketch, unsigned seed, std::function<void(std::string&)> mutate)
      : sketch_(sketch), random_(seed), mutate_(std::move(mutate)) {}

  void edit();
  /// Puts another message's objects behind the own ones, its root under one of the references.
  void adopt(const BinarySketch& other);

 private:
  std::size_t below(std::size_t bound) { return bound == 0 ? 0 : random_() % bound; }
  bool oneIn(std::size_t chances) { return below(chances) == 0; }
  std::uint64_t edge();
  std::uint64_t someObject() { return below(sketch_.objects.size()); }
  Sketched* someContainer();
  std::uint64_t* someReference();

  std::uint64_t add(Sketched object);
  std::uint64_t addText(std::string_view text);
  std::uint64_t addInteger();
  std::uint64_t addDictionary();
  std::uint64_t addScalar();
  std::uint64_t addContainer(std::uint64_t element, std::size_t times);

  void addEntry(Sketched& dictionary, std::uint64_t key, std::uint64_t value);
  void editEntries();
  void editReferences();
  void editObject();
  void editOrder();
  void editSizes();
  void editTrailer();
  void share();

  BinarySketch& sketch_;
  std::minstd_rand random_;
  std::function<void(std::string&)> mutate_;
};

}  // namespace ironmoat::fuzz
