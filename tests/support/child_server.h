#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
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

/// A server as a child process, which runs `program`. Tests exchange frames or bytes with it over
/// its standard input and output.
class ChildServer {
 public:
  enum class Connection : std::uint8_t { socket, nonBlockingPipes };

  explicit ChildServer(const std::function<void()>& program,
                       Connection connection = Connection::socket) {
    std::signal(SIGPIPE, SIG_IGN);
    int in[2];  // the server's end, then the test's
    int out[2];
    if (connection == Connection::socket) {
      EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, in), 0);
      for (const int end : {0, 1}) out[end] = fcntl(in[end], F_DUPFD_CLOEXEC, 0);
    } else {
      EXPECT_EQ(pipe2(in, O_CLOEXEC) | pipe2(out, O_CLOEXEC), 0);
      std::swap(out[0], out[1]);
      for (const int end : {in[0], out[0]}) fcntl(end, F_SETFL, O_NONBLOCK);
    }
    std::fflush(nullptr);
    pid_ = fork();
    if (pid_ == 0) {
      std::signal(SIGPIPE, SIG_DFL);
      alarm(60);  // ends a server that a test would wait for
      dup2(in[0], STDIN_FILENO);
      dup2(out[0], STDOUT_FILENO);
      program();
      _exit(127);
    }
    close(in[0]);
    close(out[0]);
    in_ = in[1];
    out_ = out[1];
  }
  ChildServer(const ChildServer&) = delete;
  ChildServer& operator=(const ChildServer&) = delete;
  ~ChildServer() {
    kill(pid_, SIGKILL);
    static_cast<void>(end());
    endInput();
    endOutput();
  }

  [[nodiscard]] pid_t pid() const { return pid_; }

  /// Sends until the server ends, or has read nothing for `patience` milliseconds. Returns the
  /// rest.
  std::string_view send(std::string_view bytes, int patience = -1) {
    for (pollfd ready = {in_, POLLOUT, 0}; !bytes.empty() && poll(&ready, 1, patience) > 0;) {
      const ssize_t count = write(in_, bytes.data(), std::min<std::size_t>(bytes.size(), 4096));
      if (count <= 0) break;
      bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return bytes;
  }
  void request(std::uint64_t id, std::string_view message) {
    BlockBuilder frame;
    frames::appendRequest(frame, id, VeskCommandResponse::schemaName, message);
    send({frame.bytes(), frame.size()});
  }
  void endInput() {
    shutdown(in_, SHUT_WR);
    close(std::exchange(in_, -1));
  }
  void endOutput() {
    shutdown(out_, SHUT_RD);
    close(std::exchange(out_, -1));
  }

  /// The next frame's body; none at the end of the output, or after 20 seconds.
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
  /// The bits of its hello; 0 without one.
  std::uint32_t reportedParts() {
    const auto body = receive();
    return body ? frames::parseHello(*body).sandbox : 0;
  }
  /// Waits for the process; its status as waitpid gives it.
  int end() {
    if (!status_) waitpid(pid_, &status_.emplace(-1), 0);
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
