#pragma once

#include <optional>
#include <utility>

namespace ironmoat {

namespace detail {

/// Specialised by types that have a bit pattern to spare for "absent" (String, Data): an optional
/// one is then no larger than the value, and a record of absent fields is all zero bytes, which is
/// known while compiling.
template <class T>
struct Niche {
  static constexpr bool exists = false;
};

template <class T, bool HasNiche = Niche<T>::exists>
class OptionalStorage {
 public:
  constexpr OptionalStorage() noexcept = default;
  explicit OptionalStorage(T&& value) : value_(std::move(value)) {}
  [[nodiscard]] bool present() const noexcept { return value_.has_value(); }
  [[nodiscard]] T& value() noexcept { return *value_; }
  [[nodiscard]] const T& value() const noexcept { return *value_; }

 private:
  std::optional<T> value_;
};

template <class T>
class OptionalStorage<T, true> {
 public:
  constexpr OptionalStorage() noexcept : value_(Niche<T>::absent()) {}
  explicit OptionalStorage(T&& value) noexcept : value_(std::move(value)) {}
  [[nodiscard]] bool present() const noexcept { return !Niche<T>::isAbsent(value_); }
  [[nodiscard]] T& value() noexcept { return value_; }
  [[nodiscard]] const T& value() const noexcept { return value_; }

 private:
  T value_;
};

}  // namespace detail

/// A value or its absence. Absent differs from zero, false, empty text, empty bytes and the empty
/// list. Read as a std::optional is: test it, then `*` or `->`, which need a value to be present.
/// Mind Optional<Bool>: `if (field)` asks whether there is one, `field.value_or(false)` what it is.
template <class T>
class Optional {
 public:
  using value_type = T;

  constexpr Optional() noexcept = default;
  constexpr Optional(std::nullopt_t) noexcept {}     // NOLINT(google-explicit-constructor)
  Optional(T value) : storage_(std::move(value)) {}  // NOLINT(google-explicit-constructor)

  [[nodiscard]] bool has_value() const noexcept { return storage_.present(); }
  explicit operator bool() const noexcept { return has_value(); }

  [[nodiscard]] T& operator*() noexcept { return storage_.value(); }
  [[nodiscard]] const T& operator*() const noexcept { return storage_.value(); }
  [[nodiscard]] T* operator->() noexcept { return &storage_.value(); }
  [[nodiscard]] const T* operator->() const noexcept { return &storage_.value(); }

  /// Throws std::bad_optional_access when absent.
  [[nodiscard]] const T& value() const {
    if (!has_value()) throw std::bad_optional_access();
    return **this;
  }
  [[nodiscard]] T value_or(T fallback) const { return has_value() ? **this : std::move(fallback); }

  void reset() noexcept { *this = Optional(); }

  friend bool operator==(const Optional& a, const Optional& b) {
    return a.has_value() == b.has_value() && (!a.has_value() || *a == *b);
  }

 private:
  detail::OptionalStorage<T> storage_;
};

}  // namespace ironmoat
