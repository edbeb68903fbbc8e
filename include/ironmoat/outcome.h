#pragma once

#include <new>
#include <utility>
#include <variant>

#include "ironmoat/errors.h"
#include "ironmoat/message_schema.h"

namespace ironmoat {

/// What came of one message: its record or exactly one error.
template <MessageSchema R>
class [[nodiscard]] Outcome {
 public:
  using Error = std::variant<DecodingError, ServiceError, std::bad_alloc>;

  explicit Outcome(Error error) noexcept : state_(std::in_place_type<Error>, std::move(error)) {}
  /// The record is what `make` returns, constructed in place.
  template <class Make>
  Outcome(std::in_place_t, const Make& make) : state_(std::in_place_type<R>, MadeBy<Make>{make}) {}

  explicit operator bool() const noexcept { return std::holds_alternative<R>(state_); }
  /// Require that there is a record.
  [[nodiscard]] const R& operator*() const& noexcept { return *std::get_if<R>(&state_); }
  [[nodiscard]] R&& operator*() && noexcept { return std::move(*std::get_if<R>(&state_)); }
  [[nodiscard]] const R* operator->() const noexcept { return std::get_if<R>(&state_); }

  /// Null when there is a record.
  [[nodiscard]] const Error* error() const noexcept { return std::get_if<Error>(&state_); }
  /// The message was rejected; null if not.
  [[nodiscard]] const DecodingError* decodingError() const noexcept { return as<DecodingError>(); }
  /// The service gave no answer; null if not.
  [[nodiscard]] const ServiceError* serviceError() const noexcept { return as<ServiceError>(); }
  /// The daemon had no memory for the request or its record.
  [[nodiscard]] bool outOfMemory() const noexcept { return as<std::bad_alloc>() != nullptr; }

  /// The record; throws the error when there is none.
  R value() && {
    if (error() != nullptr) {
      std::visit([](const auto& thrown) { throw thrown; }, *error());  // NOLINT(cert-err60-cpp)
    }
    return *std::move(*this);
  }

 private:
  template <class E>
  [[nodiscard]] const E* as() const noexcept {
    return error() == nullptr ? nullptr : std::get_if<E>(error());
  }

  /// Becomes the record where that is to stand, which spares the largest one a move of 2 KB.
  template <class Make>
  struct MadeBy {
    const Make& make;
    operator R() const { return make(); }  // NOLINT(google-explicit-constructor)
  };

  std::variant<Error, R> state_;
};

}  // namespace ironmoat
