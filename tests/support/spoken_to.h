#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <optional>
#include <string_view>
#include <utility>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "ironmoat/command_response.h"
#include "support/request_frame.h"

namespace ironmoat::testing {

/// A process that runs `program` with pipes as its standard input and output, spoken to in frames
/// or in bytes.
class SpokenTo {
 public:
  explicit SpokenTo(const std::function<void()>& program, int pipeFlags = 0) {
    static const auto ignored = std::signal(SIGPIPE, SIG_IGN);
    static_cast<void>(ignored);
    int in[2];
    int out[2];
    EXPECT_EQ(pipe2(in, O_CLOEXEC), 0);
    EXPECT_EQ(pipe2(out, O_CLOEXEC), 0);
    std::fflush(nullptr);
    pid_ = fork();
    if (pid_ == 0) {
      if (pipeFlags != 0) {
        fcntl(in[0], F_SETFL, pipeFlags);
        fcntl(out[1], F_SETFL, pipeFlags);
      }
      dup2(in[0], STDIN_FILENO);
      dup2(out[1], STDOUT_FILENO);
      program();
      _exit(127);
    }
    close(in[0]);
    close(out[1]);
    in_ = in[1];
    out_ = out[0];
  }
  SpokenTo(const SpokenTo&) = delete;
  SpokenTo& operator=(const SpokenTo&) = delete;
  ~SpokenTo() {
    kill(pid_, SIGKILL);
    static_cast<void>(end());
    endInput();
    close(out_);
  }

  [[nodiscard]] pid_t pid() const { return pid_; }

  /// As much as it reads.
  void send(std::string_view bytes) {
    while (!bytes.empty()) {
      const ssize_t count = write(in_, bytes.data(), bytes.size());
      if (count <= 0) return;
      bytes.remove_prefix(static_cast<std::size_t>(count));
    }
  }
  void request(std::uint64_t id, std::string_view message) {
    BlockBuilder frame;
    frames::appendRequest(frame, id, VeskCommandResponse::schemaName, message);
    send({frame.bytes(), frame.size()});
  }
  void endInput() {
    if (in_ >= 0) close(std::exchange(in_, -1));
  }

  /// The next frame's body; nothing at the end, or after 20 seconds.
  std::optional<Data> receive() {
    for (;;) {
      if (auto body = assembler_.next()) return body;
      pollfd ready = {out_, POLLIN, 0};
      if (poll(&ready, 1, 20'000) <= 0) return std::nullopt;
      const auto room = assembler_.room();
      const ssize_t count = read(out_, room.data(), room.size());
      if (count <= 0) return std::nullopt;
      assembler_.commit(static_cast<std::size_t>(count));
    }
  }
  [[nodiscard]] bool midFrame() const { return assembler_.midFrame(); }
  std::uint32_t reportedConfinement() {
    const auto body = receive();
    return body ? frames::parseHello(*body).confinement : 0;
  }
  /// Waits for the process; what waitpid gives.
  int end() {
    if (!status_) {
      status_ = -1;
      waitpid(pid_, &*status_, 0);
    }
    return *status_;
  }

 private:
  pid_t pid_ = 0;
  int in_ = -1;
  int out_ = -1;
  std::optional<int> status_;
  frames::FrameAssembler assembler_{frames::kMaxReplyBody, Sharing::anyThread};
};

}  // namespace ironmoat::testing
