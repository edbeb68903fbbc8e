// Both directions of the connection full. Part of faults_test.

#include <poll.h>
#include <sys/socket.h>

#include <string_view>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "process/service_process.h"
#include "support/fault_load.h"
#include "support/request_frame.h"

namespace ironmoat::testing {
namespace {

constexpr int kRequests = 64;

/// What the test server answers with itself as the token and `number` as the command.
std::string large(int number) {
  std::string text = "tell " + std::to_string(number) + ' ';
  text.resize(static_cast<std::size_t>(sized(2, 16)) << 20, 'x');
  return text;
}
void expectEcho(const VeskCommandResponse& record, int number) {
  EXPECT_EQ(record.command, number);
  EXPECT_EQ(record.token.value().view(), large(number));
}

/// The most memory that a process has had, in MiB; of a confined one, too, anybody may know.
std::size_t peakMemory(pid_t pid) {
  std::ifstream status("/proc/" + std::to_string(pid) + "/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with("VmHWM:")) return std::stoul(line.substr(6)) >> 10;
  }
  return 0;
}
constexpr std::size_t kMostMemory = confinement::kSanitizedBuild ? 4096 : 256;  // MiB

/// Writes first, until nothing more is taken; then reads a little at a time. The server neither
/// grows nor gives up.
TEST_F(FaultsTest, APeerThatHardlyReads) {
  const auto server = process::ServiceProcess::start(TEST_SERVER);
  const pid_t pid = [] {
    std::ifstream children("/proc/self/task/" + std::to_string(::getpid()) + "/children");
    pid_t child = 0;
    children >> child;
    return child;
  }();
  BlockBuilder requests;
  for (int i = 0; i < kRequests; ++i) {
    frames::appendRequest(requests, static_cast<std::uint64_t>(i), VeskCommandResponse::schemaName,
                          large(i));
  }
  std::string_view left(requests.bytes(), requests.size());
  frames::FrameAssembler assembler(frames::kMaxReplyBody, Sharing::anyThread);
  const auto ready = [&](short events, std::chrono::milliseconds wait) {
    pollfd socket = {server.socket(), events, 0};
    return ::poll(&socket, 1, static_cast<int>(wait.count())) > 0;
  };
  const auto write = [&] {
    const ssize_t count = ::send(server.socket(), left.data(), left.size(), MSG_NOSIGNAL);
    if (count > 0) left.remove_prefix(static_cast<std::size_t>(count));
  };
  while (!left.empty() && ready(POLLOUT, 500ms)) write();
  const std::size_t unread = requests.size() - left.size();
  EXPECT_FALSE(left.empty()) << "took in all there was, with its replies unread";

  bool greeted = false;
  std::vector<int> replies(kRequests, 0);
  int count = -1;  // the hello
  while (count < kRequests) {
    ASSERT_TRUE(ready(left.empty() ? POLLIN : POLLIN | POLLOUT, 60s)) << "stuck";
    write();
    const auto room = assembler.room();
    const ssize_t got = ::recv(server.socket(), room.data(), room.size(), 0);
    ASSERT_NE(got, 0) << "gone";
    if (got < 0) continue;
    assembler.commit(static_cast<std::size_t>(got));
    while (const auto body = assembler.next()) {
      if (++count == 0) {
        greeted = frames::parseHello(*body).replyBytes == limits::replyBytes;
        continue;
      }
      const frames::Reply reply = frames::parseReply(*body);
      ASSERT_LT(reply.id, replies.size());
      ++replies[reply.id];
      expectEcho(frames::decodeRecord<VeskCommandResponse>(reply.body), static_cast<int>(reply.id));
      std::this_thread::sleep_for(5ms);
    }
  }
  EXPECT_TRUE(greeted);
  EXPECT_EQ(replies, std::vector<int>(kRequests, 1));
  const std::size_t peak = peakMemory(pid);
  std::printf("written before any reply was read: %zu MiB; service at most %zu MiB\n", unread >> 20,
              peak);
  EXPECT_LT(peak, kMostMemory);
}

}  // namespace
}  // namespace ironmoat::testing
