#pragma once

#include <functional>
#include <new>
#include <optional>
#include <utility>

#include "client/request.h"
#include "frames/record_codec.h"
#include "ironmoat/outcome.h"
#include "values/host_rejection.h"

namespace ironmoat::client {

/// A request for a record of type `R`.
template <MessageSchema R>
class RecordRequest final : public Request {
 public:
  using Completion = std::function<void(Outcome<R>)>;

  RecordRequest(Counters& counters, const Data& message, Clock::duration deadline,
                Completion completion = {}, std::string_view outputType = R::schemaName)
      : Request(counters, outputType, message, deadline), completion_(std::move(completion)) {}
  ~RecordRequest() override { release(); }

  /// The outcome, once; requires that there is one.
  Outcome<R> take() {
    release();
    return *std::move(outcome_);
  }
  /// Its record; throws the error if that is the outcome.
  R takeRecord() {
    release();
    return (*std::move(outcome_)).value();
  }

  /// Releases the completion at once.
  void cancel() noexcept override {
    Request::cancel();
    static_cast<void>(std::exchange(completion_, nullptr));
  }
  [[nodiscard]] bool hasCompletion() const noexcept override { return completion_ != nullptr; }

 private:
  const Failure* read(const frames::Reply& reply) override {
    using Status = frames::Status;
    try {
      if (reply.status == Status::record) {
        std::size_t bytes = 0;
        withHostRejections([&] {
          outcome_.emplace(std::in_place,
                           [&] { return frames::decodeRecord<R>(reply.body, &bytes); });
        });
        held_ = bytes;
        if (!counters().hold(bytes)) {
          set(std::bad_alloc());
          release();
        }
      } else if (reply.status == Status::rejected) {
        set(frames::parseRejection(reply.body));
      } else {  // notServed, failed
        set(ServiceError(ServiceError::Kind::unavailable, frames::parseDescription(reply.body)));
      }
    } catch (const DecodingError& rejection) {  // by the record's initialiser
      set(rejection);
    } catch (const std::bad_alloc& error) {
      set(error);
    }
    return outcome_->error();
  }
  void callCompletion() noexcept override {
    if (const Completion completion = std::exchange(completion_, nullptr)) completion(take());
  }
  void set(Failure failure) noexcept override { outcome_.emplace(std::move(failure)); }
  void release() noexcept { counters().release(std::exchange(held_, 0)); }

  std::optional<Outcome<R>> outcome_;
  std::size_t held_ = 0;  // the record's bytes in the counters
  Completion completion_;
};

}  // namespace ironmoat::client
