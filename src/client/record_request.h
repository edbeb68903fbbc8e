#pragma once

#include <new>
#include <optional>
#include <utility>

#include "client/request.h"
#include "frames/record_codec.h"
#include "ironmoat/outcome.h"
#include "values/host_rejection.h"

namespace ironmoat::client {

/// A request for a record of type `R`, delivered as `Base` does.
template <MessageSchema R, class Base>
class RecordRequest : public Base {
 public:
  template <class... More>
  RecordRequest(const Data& message, Clock::duration deadline, More... more)
      : Base(R::schemaName, message, deadline, more...) {}

  const Failure* resolve(const frames::Reply& reply) override {
    try {
      take(reply);
    } catch (const std::bad_alloc& error) {
      fail(error);
    }
    return outcome_->error();
  }
  void fail(Failure failure) noexcept override { outcome_.emplace(std::move(failure)); }

  /// The outcome, once; requires that there is one.
  Outcome<R> take() { return *std::move(outcome_); }
  /// Its record; throws the error if that is the outcome.
  R takeRecord() { return (*std::move(outcome_)).value(); }

 private:
  void take(const frames::Reply& reply) {
    switch (reply.status) {
      case frames::Status::record:
        return decode(reply.body);
      case frames::Status::refused:
        return fail(frames::parseRefusal(reply.body));
      case frames::Status::notServed:
      case frames::Status::failed:
        return fail(
            ServiceError(ServiceError::Kind::unavailable, frames::parseSentence(reply.body)));
    }
  }
  void decode(const Data& body) {
    try {
      withHostRejections(
          [&] { outcome_.emplace(std::in_place, [&] { return frames::decodeRecord<R>(body); }); });
    } catch (const DecodingError& rejection) {  // by the record's initialiser
      fail(rejection);
    }
  }

  std::optional<Outcome<R>> outcome_;
};

}  // namespace ironmoat::client
