#pragma once

#include <optional>
#include <utility>

#include "ironmoat/optional.h"
#include "ironmoat/sparse_values.h"

namespace ironmoat {

/// A field of the sparse record `R` that may be absent. Reads as Optional<T> does and converts to
/// one; it is not copied itself, having no memory of its own:
///
///     if (payload.traceId) use(payload.traceId->view());
///     const Optional<String> kept = payload.traceId;  // `auto` would not compile
///
/// It is an empty member at the address of `R`, whose first base holds the values. References to a
/// value last until a field of the record is set or reset.
template <class R, class T, std::size_t Index>
class SparseField {
 public:
  using value_type = T;
  static constexpr std::size_t index = Index;
  static_assert(Index < detail::SparseValues::kMostFields);

  SparseField() noexcept {}  // NOLINT(modernize-use-equals-default): must not write a byte
  SparseField& operator=(const SparseField& other) { return *this = Optional<T>(other); }
  SparseField& operator=(T value) {
    values().set(Index, detail::Cell::of(std::move(value)));
    return *this;
  }
  SparseField& operator=(Optional<T> value) {
    if (value) return *this = std::move(*value);
    reset();
    return *this;
  }

  [[nodiscard]] bool has_value() const noexcept { return values().has(Index); }
  explicit operator bool() const noexcept { return has_value(); }
  // NOLINTNEXTLINE(google-explicit-constructor)
  operator Optional<T>() const { return has_value() ? Optional<T>(**this) : Optional<T>(); }

  /// Requires a value.
  [[nodiscard]] T& operator*() noexcept { return values().at(Index).template as<T>(); }
  [[nodiscard]] const T& operator*() const noexcept { return values().at(Index).template as<T>(); }
  [[nodiscard]] T* operator->() noexcept { return &**this; }
  [[nodiscard]] const T* operator->() const noexcept { return &**this; }

  /// Throws std::bad_optional_access when absent.
  [[nodiscard]] const T& value() const {
    if (!has_value()) throw std::bad_optional_access();
    return **this;
  }
  [[nodiscard]] T value_or(T fallback) const { return has_value() ? **this : std::move(fallback); }

  /// Internal: sets it; requires what SparseValues::append does.
  void append(T value) noexcept { values().append(Index, detail::Cell::of(std::move(value))); }
  void reset() noexcept { values().erase(Index); }

  template <class OtherR, std::size_t OtherIndex>
  friend bool operator==(const SparseField& a, const SparseField<OtherR, T, OtherIndex>& b) {
    return a == Optional<T>(b);
  }
  friend bool operator==(const SparseField& a, const Optional<T>& b) {
    return a.has_value() == b.has_value() && (!b.has_value() || *a == *b);
  }

 private:
  friend R;  // what the record's own copying and moving do with its fields: nothing
  SparseField(const SparseField&) noexcept {}  // NOLINT(modernize-use-equals-default)
  SparseField(SparseField&&) noexcept {}
  SparseField& operator=(SparseField&&) noexcept { return *this; }

  detail::SparseValues& values() noexcept { return *reinterpret_cast<detail::SparseValues*>(this); }
  [[nodiscard]] const detail::SparseValues& values() const noexcept {
    return *reinterpret_cast<const detail::SparseValues*>(this);
  }
};

}  // namespace ironmoat

/// Declares a field of a sparse record, in a struct of the shape
///
///     struct Example : detail::SparseValues {
///       using Sparse = Example;
///       static constexpr std::size_t kFirstLine = __LINE__ + 1;
///       Int command = 0;
///       IRONMOAT_SPARSE(String) name;
///       List<Example> parts;
///     };
///
/// A field's index is its place among all fields, told by its line: one line for each.
#define IRONMOAT_SPARSE(T) \
  [[no_unique_address]] ::ironmoat::SparseField<Sparse, T, __LINE__ - kFirstLine>
