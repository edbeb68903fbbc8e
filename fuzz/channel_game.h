#pragma once

#include <algorithm>
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "client/channel.h"
#include "frames/frame_assembler.h"
#include "sandbox_parts/sandbox_parts.h"

namespace ironmoat::testing {

/// A channel between requests and a service that are both played by events, one letter each:
///
///     a b c ...  a request of that name is added; a capital asks for its cancellation
///     0          the process starts and says hello      1  it starts and says nothing yet
///     2          a start fails for now                  3  a start fails for good
///     4          it answers the oldest request          5  it answers with another id
///     6          it dies                                7  the front's time passes
///     8          the socket takes one byte only         9  the process is let go, if it is idle
///     -          half a deadline passes
///
/// What can be sent is sent after each event. Events that cannot happen are ignored. Throws
/// std::logic_error when the channel breaks one of its promises.
class ChannelGame {
 public:
  static constexpr auto kDeadline = std::chrono::milliseconds(100);

  void play(std::string_view events) {
    for (const char event : events) play(event);
  }
  void play(char event) {
    if (event >= 'a' && event <= 'z') {
      add(event);
    } else if (event >= 'A' && event <= 'Z') {
      cancel(static_cast<char>(event - 'A' + 'a'));
    } else {
      happen(event);
    }
    if (event != '8') send(100'000);
    collect();
    check();
  }
  /// A service that answers everything brings the rest to an end.
  void finish() {
    for (int i = 0; !channel_.empty(); ++i) {
      require(i < 1000, "a request has no outcome");
      happen(channel_.state() == client::Channel::State::absent ? '0' : '4');
      if (channel_.state() == client::Channel::State::greeting) sayHello();
      send(100'000);
      collect();
    }
    for (const Asked& each : asked_) {
      require(each.outcomes == (each.cancelled ? 0 : 1), "not exactly one outcome");
    }
  }
  /// "a record, b crashed", in the order of asking; of a request without an outcome the name alone.
  [[nodiscard]] std::string outcomes() const {
    std::string all;
    for (const Asked& each : asked_) {
      all += (all.empty() ? "" : ", ") + std::string(1, each.name);
      if (!each.outcome.empty()) all += " " + each.outcome;
    }
    return all;
  }
  /// Names of the requests that the process has whole and has not answered.
  [[nodiscard]] std::string unanswered() const { return begun(); }
  /// What each process was given, as in "ab|a|b".
  [[nodiscard]] const std::string& given() const noexcept { return given_; }

 private:
  struct Asked {
    char name;
    std::string outcome{};
    int outcomes = 0;
    int losses = 0;  // processes lost with it in flight
    bool cancelled = false;
    bool mayCrash = false;    // it was alone in a process that was lost, and not for the first time
    bool mayTimeOut = false;  // its time has passed
    std::weak_ptr<client::Request> request{};
  };

  class GameRequest final : public client::Request {
   public:
    GameRequest(client::Counters& counters, std::vector<Asked>& asked, std::size_t index)
        : Request(counters, "R", Data(std::string_view(&asked[index].name, 1)), kDeadline),
          asked_(asked),
          index_(index) {}
    [[nodiscard]] bool hasCompletion() const noexcept override { return false; }

   private:
    void callCompletion() noexcept override {}
    const client::Failure* read(const frames::Reply& reply) override {
      const std::string_view name = asked_[index_].name == reply.body.view()[0] ? "record" : "LIE";
      give(std::string(name));
      return nullptr;
    }
    void set(client::Failure failure) noexcept override {
      const auto& error = std::get<ServiceError>(failure);
      give(std::string(nameOf(error.kind())));
    }
    void give(std::string outcome) {
      asked_[index_].outcome = std::move(outcome);
      ++asked_[index_].outcomes;
    }
    std::vector<Asked>& asked_;
    std::size_t index_;
  };

  static void require(bool holds, const char* what) {
    if (!holds) throw std::logic_error(what);
  }

  void add(char name) {
    if (std::any_of(asked_.begin(), asked_.end(),
                    [name](const Asked& each) { return each.name == name; })) {
      return;
    }
    asked_.push_back({.name = name});
    auto request = std::make_shared<GameRequest>(counters_, asked_, asked_.size() - 1);
    asked_.back().request = request;
    channel_.add({std::move(request)}, now_);
  }
  void cancel(char name) {
    for (Asked& each : asked_) {
      const auto request = each.request.lock();
      if (each.name != name || request == nullptr || each.outcomes > 0 || each.cancelled) continue;
      each.cancelled = true;
      request->cancel();
    }
  }

  void happen(char event) {
    using State = client::Channel::State;
    const State state = channel_.state();
    switch (event) {
      case '0':
      case '1':
        now_ = std::max(now_, std::min(channel_.wakeAt(), now_ + std::chrono::seconds(1)));
        expire();
        if (!channel_.wantsProcess(now_)) break;
        startProcess();
        if (event == '0') sayHello();
        break;
      case '2':
      case '3':
        if (state == State::absent && !channel_.empty()) {
          ++failedStarts_;
          unavailable_ = unavailable_ || event == '3' || failedStarts_ >= 5;
          channel_.startFailed("no start", event == '3', now_);
        }
        break;
      case '4':
      case '5':
        if (state == State::greeting) sayHello();
        if (!received_.empty()) answer(event == '5');
        break;
      case '6':
        if (state != State::absent) lose({client::Loss::Why::ended, "was killed by SIGKILL"});
        break;
      case '7':
        if (!channel_.empty() && channel_.wakeAt() != client::TimePoint::max()) {
          const bool absent = state == State::absent;
          now_ = absent ? now_ + kDeadline : std::max(now_, channel_.wakeAt());
          expire();
        }
        break;
      case '8':
        send(1);
        break;
      case '-':
        now_ += kDeadline / 2;
        expire();
        break;
      case '9':
        if (state == State::ready && channel_.empty() && channel_.inFlight() == 0) {
          channel_.dismissed();
          endProcess();
        }
        break;
      default:
        break;
    }
  }

  void startProcess() {
    channel_.started(now_);
    if (!given_.empty()) given_ += '|';
    assembler_.emplace(frames::kMaxRequestBody, Sharing::oneThread);
  }
  void sayHello() {
    if (channel_.state() != client::Channel::State::greeting) return;
    frames::Hello hello = frames::Hello::ours();
    hello.sandbox = sandbox::kRequiredParts;
    BlockBuilder frame;
    frames::appendHello(frame, hello);
    channel_.receive(Data(std::string_view(frame.bytes(), frame.size()).substr(4)), now_);
  }
  void answer(bool withAnotherId) {
    const auto [id, name] = received_.front();
    BlockBuilder frame;
    frames::beginReply(frame, withAnotherId ? id ^ 1 : id, frames::Status::record);
    frame.push(name);
    const Data body(std::string_view(frame.bytes(), frame.size()).substr(4));
    try {
      channel_.receive(body, now_);
      require(!withAnotherId, "a reply with another id is accepted");
      received_.erase(received_.begin());
      failedStarts_ = 0;
      answered_ = true;
    } catch (const frames::FrameError&) {
      require(withAnotherId, "a good reply is not accepted");
      lose({client::Loss::Why::violation, "sent a broken frame: another id"});
    }
  }
  void expire() {
    for (Asked& each : asked_) {
      const auto request = each.request.lock();
      if (request != nullptr && !channel_.empty() && request.get() == &channel_.front())
        each.mayTimeOut = true;
    }
    if (auto loss = channel_.expire(now_)) lose(*loss);
  }

  void lose(const client::Loss& loss) {
    const bool greeting = channel_.state() == client::Channel::State::greeting;
    const bool alone = givenToThis_ == 1 && begun().size() == 1;
    for (const char name : begun()) {
      Asked& each = *std::find_if(asked_.begin(), asked_.end(),
                                  [name](const Asked& one) { return one.name == name; });
      each.mayCrash = alone && each.losses > 0;
      ++each.losses;
      require(each.losses <= 3 || loss.why == client::Loss::Why::deadline,
              "a request has lost more than three processes");
    }
    const bool lasting = greeting && loss.why == client::Loss::Why::violation;
    if (greeting || !answered_) ++failedStarts_;
    unavailable_ = unavailable_ || lasting || failedStarts_ >= 5;
    channel_.lost(loss, now_);
    endProcess();
  }
  void endProcess() {
    received_.clear();
    assembler_.reset();
    partly_ = 0;
    givenToThis_ = 0;
    answered_ = false;
  }
  /// Names of the requests that the process has any byte of and that are not answered.
  [[nodiscard]] std::string begun() const {
    std::string names;
    for (const auto& each : received_) names += each.second;
    if (partly_ != 0) names += partly_;
    return names;
  }

  void send(std::size_t most) {
    while (channel_.hasOutput() && most > 0) {
      std::size_t count = 0;
      for (const iovec& part : channel_.output()) {
        const std::size_t taken = std::min(part.iov_len, most);
        receiveBytes({static_cast<const char*>(part.iov_base), taken});
        count += taken;
        most -= taken;
      }
      channel_.sent(count);
    }
  }
  void receiveBytes(std::string_view bytes) {
    for (const char byte : bytes) {
      if (!assembler_->midFrame()) {
        ++givenToThis_;
        partly_ = nextToSend();
        given_ += partly_;
      }
      assembler_->room()[0] = byte;
      assembler_->commit(1);
      if (const auto body = assembler_->next()) {
        const frames::Request request = frames::parseRequest(*body);
        require(request.message.view() == std::string_view(&partly_, 1), "sent out of order");
        received_.emplace_back(request.id, partly_);
        partly_ = 0;
      }
    }
    bool retried = false;
    for (const char name : begun()) {
      for (const Asked& each : asked_) retried |= each.name == name && each.losses > 0;
    }
    require(!retried || begun().size() == 1, "a request that is retried is not alone");
  }
  /// The first request of those that are open and not yet with the process.
  [[nodiscard]] char nextToSend() const {
    for (const Asked& each : asked_) {
      const bool isSent = begun().find(each.name) != std::string::npos;
      const auto request = each.request.lock();
      if (!isSent && request != nullptr && !request->isDone()) return each.name;
    }
    throw std::logic_error("sent what nobody asks for");
  }

  void collect() { channel_.finished().clear(); }
  void check() const {
    for (const Asked& each : asked_) {
      require(each.outcomes <= 1, "two outcomes");
      require(!each.cancelled || each.outcomes == 0, "an outcome of a cancelled request");
      require(each.outcome != "LIE", "another request's record");
      require(each.outcome != "crashed" || each.mayCrash, "crashed without having been alone");
      require(each.outcome != "timedOut" || each.mayTimeOut, "timed out before its time");
      require(each.outcome != "unavailable" || unavailable_, "unavailable without failed starts");
    }
  }

  client::Counters counters_;
  client::Channel channel_{std::chrono::seconds(2), counters_};
  client::TimePoint now_ = client::TimePoint() + std::chrono::hours(1);
  std::vector<Asked> asked_ = [] {
    std::vector<Asked> all;
    all.reserve(26);  // requests refer to their place
    return all;
  }();
  std::string given_;
  int failedStarts_ = 0;
  bool unavailable_ = false;

  // The process.
  std::optional<frames::FrameAssembler> assembler_;
  std::vector<std::pair<std::uint64_t, char>> received_;  // ids and names, not answered
  char partly_ = 0;                                       // received in part
  int givenToThis_ = 0;
  bool answered_ = false;
};

}  // namespace ironmoat::testing
