#pragma once

#include <concepts>
#include <utility>
#include <variant>

#include "ironmoat/errors.h"
#include "ironmoat/message_schema.h"
#include "ironmoat/output_record.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// What came of a message: the output record `R`, or why the message is refused.
template <MessageSchema R>
class [[nodiscard]] Unpacked {
 public:
  Unpacked(DecodingError refusal)  // NOLINT(google-explicit-constructor)
      : outcome_(std::move(refusal)) {}
  /// The record is made in place, of the arguments that `make` returns. Throws what its initialiser
  /// does.
  template <MakerOf<typename R::Arguments> Make>
  explicit Unpacked(Make&& make) : outcome_(std::in_place_type<R>, make) {}

  explicit operator bool() const noexcept { return std::holds_alternative<R>(outcome_); }
  [[nodiscard]] const R& operator*() const { return std::get<R>(outcome_); }
  [[nodiscard]] const R* operator->() const { return &**this; }
  [[nodiscard]] const DecodingError& refusal() const { return std::get<DecodingError>(outcome_); }
  /// Throws the refusal.
  [[nodiscard]] R value() && {
    if (!*this) throw refusal();
    return std::get<R>(std::move(outcome_));
  }

 private:
  std::variant<DecodingError, R> outcome_;
};

/// Turns the bytes of one message into one output record, or refuses them, or throws what the
/// record's initialiser does. Called on threads of the host's choosing, many at once; a call must
/// not depend on another.
template <class U>
concept MessageUnpacker = MessageSchema<typename U::MessageSchemaType> &&
    requires(const U& unpacker, const Data& message) {
  { unpacker.unpack(message) } -> std::same_as<Unpacked<typename U::MessageSchemaType>>;
};

}  // namespace ironmoat
