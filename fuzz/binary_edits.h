#pragma once

#include <cstddef>
#include <functional>
#include <random>
#include <string>

#include "binary_graph.h"

namespace ironmoat::fuzz {

/// Random edits, after most of which a message is nearly valid.
class BinaryEditor {
 public:
  /// `mutate` is the mutator for plain bytes.
  BinaryEditor(BinaryGraph& graph, unsigned seed, std::function<void(std::string&)> mutate)
      : graph_(graph), random_(seed), mutate_(std::move(mutate)) {}

  void edit();
  /// Appends the objects of another message and adds a reference to its root.
  void adopt(const BinaryGraph& other);

 private:
  std::size_t below(std::size_t bound) { return bound == 0 ? 0 : random_() % bound; }
  bool oneIn(std::size_t chances) { return below(chances) == 0; }
  std::uint64_t edge();
  std::uint64_t someObject() { return below(graph_.objects.size()); }
  GraphObject* someContainer();
  std::uint64_t* someReference();

  std::uint64_t add(GraphObject object);
  std::uint64_t addText(std::string_view text);
  std::uint64_t addInteger();
  std::uint64_t addDictionary();
  std::uint64_t addScalar();
  std::uint64_t addContainer(std::uint64_t element, std::size_t times);

  void addEntry(GraphObject& dictionary, std::uint64_t key, std::uint64_t value);
  void editEntries();
  void editReferences();
  void editObject();
  void editOrder();
  void editSizes();
  void editTrailer();
  void share();

  BinaryGraph& graph_;
  std::minstd_rand random_;
  std::function<void(std::string&)> mutate_;
};

}  // namespace ironmoat::fuzz
