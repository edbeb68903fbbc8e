// The client's book of requests between a daemon and services that answer in any order, take bytes
// in any pieces and die at any point. Each byte is an act, sometimes with a number behind it.
//
// Oracles: what arrives is what was asked, in frames; a reply is owed for exactly what arrived
// whole and is not answered; whoever is blamed had its process to itself; what a dead process had
// been given is not sent together with anything else; each request gets one outcome, also those
// that are left at the end, from a service that answers. (S15)

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <iterator>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "client/request_queue.h"
#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "require.h"

namespace {

using namespace ironmoat;
using client::RequestQueue;

using fuzz::require;

class Asked final : public client::Request {
 public:
  explicit Asked(std::uint64_t id)
      : Request("R", Data(std::string_view(std::to_string(id)))), id_(id) {}
  void give(const frames::Reply&) override {}
  void giveError(std::exception_ptr) noexcept override {}
  [[nodiscard]] std::uint64_t id() const noexcept { return id_; }

 private:
  std::uint64_t id_;
};

std::uint64_t idOf(const std::shared_ptr<client::Request>& request) {
  return static_cast<const Asked&>(*request).id();
}

class Game {
 public:
  void push() {
    const std::uint64_t id = asked_ + 1;
    require(queue_.push(std::make_unique<Asked>(id), now_) == id);
    open_.insert(asked_ = id);
  }
  void start() {
    if (running_) return;
    queue_.restart(now_);
    running_ = true;
    assembler_ =
        std::make_unique<frames::FrameAssembler>(frames::kMaxRequestBody, Sharing::oneThread);
  }
  /// The socket takes up to `most` bytes. Returns how many.
  std::size_t send(std::size_t most) {
    std::array<iovec, 6> parts;
    const std::size_t used = queue_.gather(parts);
    require(used == 0 || running_);
    std::size_t taken = 0;
    for (std::size_t i = 0; i < used && taken < most; ++i) {
      const std::size_t count = std::min(parts[i].iov_len, most - taken);
      receive({static_cast<const char*>(parts[i].iov_base), count});
      taken += count;
    }
    queue_.sent(taken);
    for (const std::uint64_t id : whole_) require(queue_.owed(id) != nullptr);
    return taken;
  }
  void answer(std::size_t which) {
    if (whole_.empty()) return;
    const auto found =
        std::next(whole_.begin(), static_cast<std::ptrdiff_t>(which % whole_.size()));
    const std::uint64_t id = *found;
    require(idOf(queue_.finish(id, now_)) == id);
    require(queue_.owed(id) == nullptr);
    whole_.erase(found);
    suspects_.erase(id);
    require(open_.erase(id) == 1);
  }
  void die() {
    const auto culprit = queue_.lose();
    if (culprit != nullptr) {
      require(given_ == 1 && begun_.contains(idOf(culprit)));
      suspects_.erase(idOf(culprit));
      require(open_.erase(idOf(culprit)) == 1);
    } else {
      for (const std::uint64_t id : begun_) {
        if (open_.contains(id)) suspects_.insert(id);
      }
    }
    running_ = false;
    begun_.clear();
    whole_.clear();
    given_ = 0;
    next_ = 0;
    cut_ = false;
  }
  void giveUp() {
    if (running_ || queue_.empty()) return;
    const std::uint64_t id = idOf(queue_.takeFront());
    require(open_.erase(id) == 1);
    suspects_.erase(id);
  }
  void wait(int milliseconds) {
    now_ += std::chrono::milliseconds(milliseconds);
    for (std::uint64_t id = 0; id <= asked_ + 1; ++id) {
      require((queue_.owed(id) != nullptr) == whole_.contains(id));
    }
    require(queue_.owed(~std::uint64_t{}) == nullptr);
    const auto expiry = queue_.expiry();
    require(!expiry || (running_ && *expiry <= now_ + kDeadline));
  }
  /// Every request that is open gets its answer.
  void finish() {
    start();
    while (!open_.empty()) {
      while (send(1000) != 0) {
      }
      require(!whole_.empty() && queue_.expiry());
      answer(0);
    }
    require(queue_.empty());
  }

 private:
  static constexpr auto kDeadline = std::chrono::milliseconds(100);

  void receive(std::string_view bytes) {
    while (!bytes.empty()) {
      // The first byte of a frame tells that its request was begun.
      if (!assembler_->midFrame()) {
        ++given_;
        cut_ = true;
      }
      const auto room = assembler_->room();
      bytes.copy(room.data(), 1);
      bytes.remove_prefix(1);
      assembler_->commit(1);
      if (const auto body = assembler_->next()) {
        const frames::Request request = frames::parseRequest(*body);
        require(request.outputType == "R" && request.message.view() == std::to_string(request.id));
        require(open_.contains(request.id) && whole_.insert(request.id).second);
        cut_ = false;
        next_ = request.id;
      }
    }
    begun_ = whole_;
    if (cut_) begun_.insert(firstUnsent());
    const bool suspect = std::any_of(begun_.begin(), begun_.end(),
                                     [&](std::uint64_t id) { return suspects_.contains(id); });
    require(!suspect || begun_.size() == 1);
  }
  /// Requests go in order, those without an outcome.
  [[nodiscard]] std::uint64_t firstUnsent() const {
    const auto after = open_.upper_bound(next_);
    require(after != open_.end());
    return *after;
  }

  RequestQueue queue_{kDeadline};
  RequestQueue::TimePoint now_{};
  std::unique_ptr<frames::FrameAssembler> assembler_;
  bool running_ = false;
  bool cut_ = false;         // the last request arrived in part
  std::size_t given_ = 0;    // requests of which this process had any byte
  std::uint64_t asked_ = 0;  // the last id
  std::uint64_t next_ = 0;   // the last that arrived whole at this process
  std::set<std::uint64_t> open_;
  std::set<std::uint64_t> whole_;  // arrived at this process, not answered
  std::set<std::uint64_t> begun_;  // ... or of which it had a part
  std::set<std::uint64_t> suspects_;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kLongest = 300;
  Game game;
  for (std::size_t i = 0; i < std::min(size, kLongest); ++i) {
    const unsigned number = data[i] >> 3U;
    switch (data[i] & 7U) {
      case 0:
      case 1:
        for (unsigned n = 0; n <= number / 4; ++n) game.push();
        break;
      case 2:
        game.start();
        break;
      case 3:
        game.send(number);
        break;
      case 4:
        game.send(1000);
        break;
      case 5:
        game.answer(number);
        break;
      case 6:
        number < 4 ? game.giveUp() : game.die();
        break;
      default:
        game.wait(static_cast<int>(number));
    }
  }
  game.finish();
  return 0;
}
