// The sandboxed service from outside: what it reports, what the kernel says of it, what it does
// without a part of its sandbox, with invalid frames, with a slow peer and without memory.
// (S1, S4, S6, S12)

#include <grp.h>
#include <gtest/gtest.h>
#include <seccomp.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <thread>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "sandbox/sandbox.h"
#include "support/child_server.h"

namespace ironmoat {
namespace {

using namespace std::chrono_literals;
using frames::Status;
using sandbox::Part;
using testing::ChildServer;

/// By its descriptor, for a user who has no access to its folder.
void run(const char* program) {
  static char* const nothing[] = {nullptr};
  fexecve(open(program, O_RDONLY | O_CLOEXEC), nothing, nothing);
}
void runService() { run(IRONMOAT_SERVICE); }
void runTestServer() { run(TEST_SERVER); }

bool isIn(std::uint32_t bits, Part part) { return (bits & static_cast<std::uint32_t>(part)) != 0; }
bool hasRequiredParts(std::uint32_t bits) {
  return (bits & sandbox::kRequiredParts) == sandbox::kRequiredParts;
}

std::string processFile(pid_t pid, const char* name) {
  std::ifstream in("/proc/" + std::to_string(pid) + '/' + name);
  return {std::istreambuf_iterator(in), {}};
}

std::string request(std::uint64_t id, std::string_view type = VeskCommandResponse::schemaName) {
  BlockBuilder out;
  frames::appendRequest(out, id, type,
                        "<plist><dict><key>c</key><integer>1</integer></dict></plist>");
  return {out.bytes(), out.size()};
}

class SandboxedService : public ::testing::Test {
 protected:
  void SetUp() override {
    if (sandbox::kSanitizedBuild) GTEST_SKIP() << "a sanitizer needs what the sandbox forbids";
  }
};

TEST_F(SandboxedService, HasItsSandboxInTheKernelToo) {
  ChildServer service(runService);
  ASSERT_TRUE(service.receive());
  for (const auto& [resource, expected] :
       std::map<__rlimit_resource, rlim_t>{{RLIMIT_CORE, 0},
                                           {RLIMIT_FSIZE, 0},
                                           {RLIMIT_NOFILE, 0},
                                           {RLIMIT_NPROC, 0},
                                           {RLIMIT_AS, sandbox::kAddressSpace}}) {
    rlimit value = {};
    EXPECT_EQ(prlimit(service.pid(), resource, nullptr, &value), 0);
    EXPECT_TRUE(value.rlim_max == expected && value.rlim_cur == expected) << resource;
  }
  const std::string status = processFile(service.pid(), "status");
  for (const std::string line : {"Seccomp:\t2", "NoNewPrivs:\t1", "Threads:\t1",
                                 "CapPrm:\t0000000000000000", "CapInh:\t0000000000000000"}) {
    EXPECT_NE(status.find('\n' + line + '\n'), std::string::npos) << line << status;
  }
}

TEST_F(SandboxedService, HasItsSandboxWhenAnOrdinaryUserStartsIt) {
  if (geteuid() != 0) GTEST_SKIP() << "the other tests show it: this user is an ordinary one";
  constexpr id_t kNobody = 65534;
  ChildServer service([] {
    if (setgroups(0, nullptr) == 0 && setgid(kNobody) == 0 && setuid(kNobody) == 0) runService();
  });
  EXPECT_TRUE(hasRequiredParts(service.reportedParts()));
  // A process that can be traced belongs to its user.
  struct stat info = {};
  ASSERT_EQ(stat(("/proc/" + std::to_string(service.pid()) + "/mem").c_str(), &info), 0);
  EXPECT_EQ(info.st_uid, 0U);
}

TEST_F(SandboxedService, ExitsWithNumberOfPartThatIsUnavailable) {
  struct Denied {
    int call;
    unsigned argument;
    std::uint64_t value;
    int status;
  };
  for (const Denied& denied : {Denied{SCMP_SYS(seccomp), 0, SECCOMP_SET_MODE_FILTER, 64},
                               Denied{SCMP_SYS(prctl), 0, PR_SET_NO_NEW_PRIVS, 65},
                               Denied{SCMP_SYS(prctl), 0, PR_SET_DUMPABLE, 66},
                               Denied{SCMP_SYS(prlimit64), 1, RLIMIT_CORE, 67},
                               Denied{SCMP_SYS(prlimit64), 1, RLIMIT_FSIZE, 68},
                               Denied{SCMP_SYS(prlimit64), 1, RLIMIT_NOFILE, 69},
                               Denied{SCMP_SYS(prlimit64), 1, RLIMIT_NPROC, 70},
                               Denied{SCMP_SYS(prlimit64), 1, RLIMIT_AS, 71},
                               Denied{SCMP_SYS(prctl), 0, PR_SET_PDEATHSIG, 73}}) {
    ChildServer service([&] {
      scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
      const scmp_arg_cmp same = {denied.argument, SCMP_CMP_EQ, denied.value, 0};
      seccomp_rule_add_array(filter, SCMP_ACT_ERRNO(EPERM), denied.call, 1, &same);
      if (seccomp_load(filter) == 0) runService();
    });
    EXPECT_FALSE(service.receive()) << "sent a hello without " << denied.status;
    EXPECT_EQ(service.end(), W_EXITCODE(denied.status, 0));
  }
}

TEST(Service, EndsWithThreadThatStartedIt) {
  std::unique_ptr<ChildServer> service;
  std::thread([&] {
    service = std::make_unique<ChildServer>(runService);
    EXPECT_TRUE(service->receive());
  }).join();
  EXPECT_EQ(service->end(), W_EXITCODE(0, SIGKILL));
}

TEST_F(SandboxedService, ReportsThatItInheritedALowerLimitOnMemory) {
  ChildServer server([] {
    const rlimit half = {sandbox::kAddressSpace / 2, sandbox::kAddressSpace / 2};
    setrlimit(RLIMIT_AS, &half);
    runTestServer();
  });
  const std::uint32_t bits = server.reportedParts();
  EXPECT_TRUE(hasRequiredParts(bits));
  EXPECT_FALSE(isIn(bits, Part::fullMemory));
}

/// Whether `text` is in the memory of a process, which only root may read.
bool holds(pid_t pid, const std::string& text) {
  std::istringstream maps(processFile(pid, "maps"));
  std::ifstream memory("/proc/" + std::to_string(pid) + "/mem", std::ios::binary);
  std::size_t first = 0;
  std::size_t last = 0;
  char dash = 0;
  for (std::string line; maps >> std::hex >> first >> dash >> last && std::getline(maps, line);) {
    std::string bytes(line.find(" rw") == 0 ? last - first : 0, '\0');
    memory.clear();
    memory.seekg(static_cast<std::streamoff>(first));
    memory.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    if (bytes.find(text) != std::string::npos) return true;
  }
  return false;
}

TEST_F(SandboxedService, WipesMessagesFromItsMemoryWhenIdle) {
  if (geteuid() != 0) GTEST_SKIP() << "needs the right to read another process's memory";
  ChildServer service(runService);
  ASSERT_TRUE(service.receive());
  const std::string mark = "a text that is nowhere else: ";
  for (const std::size_t size : {10, 100, 1000, 5000, 40'000, 70'000, 1'000'000, 300, 20}) {
    std::string text;
    while (text.size() < size) text += mark;
    for (const std::string& entries :
         {"<key>" + text + "</key><true/>",
          "<key>c</key><integer>1</integer><key>qai</key><string>" + text + "</string>",
          "<key>c</key><integer>1</integer><key>qai</key><string>" + text + "&amp;</string>"}) {
      service.request(1, "<plist><dict>" + entries + "</dict></plist>");
      ASSERT_TRUE(service.receive());
    }
  }
  service.send(request(2, mark) + '\x10');  // leaves a part of a frame in the buffer
  ASSERT_TRUE(service.receive());
  EXPECT_TRUE(holds(service.pid(), mark)) << "the search works";
  for (int i = 0; i < 100 && holds(service.pid(), mark); ++i) std::this_thread::sleep_for(100ms);
  EXPECT_FALSE(holds(service.pid(), mark));
}

/// All replies to `input`, by their ids.
std::map<std::uint64_t, frames::Reply> replies(std::string_view input) {
  ChildServer service(runService);
  EXPECT_TRUE(service.receive());
  service.send(input);
  service.endInput();
  std::map<std::uint64_t, frames::Reply> all;
  while (const auto body = service.receive()) {
    const frames::Reply reply = frames::parseReply(*body);
    EXPECT_TRUE(all.emplace(reply.id, reply).second) << "a second reply to " << reply.id;
  }
  EXPECT_FALSE(service.midFrame());
  EXPECT_EQ(service.end(), 0);
  return all;
}

TEST(Service, AnswersInvalidRequestWithErrorAndServesTheNext) {
  std::string lyingName = request(8);
  lyingName[12] = '\xFF';                            // longer than the frame
  const std::string tiny("\x03\x00\x00\x00xyz", 7);  // too short for an id
  const auto all = replies(request(5, "NoSuchType") + lyingName + tiny + request(9));
  ASSERT_EQ(all.size(), 4U);
  for (const std::uint64_t id : {5, 8, 0}) EXPECT_EQ(all.at(id).status, Status::notServed) << id;
  EXPECT_EQ(frames::parseDescription(all.at(5).body), "not a served output type");
  EXPECT_EQ(all.at(9).status, Status::record);
}

TEST(Service, EndsInOrderWhenAFrameIsTooLongOrTruncated) {
  const std::string whole = request(1);
  const std::string tooLong = std::string(4, '\xFF') + std::string(100'000, 'x');
  const auto all = replies(whole + tooLong + request(2));
  EXPECT_TRUE(all.size() == 2 && all.contains(0) && all.contains(1));
  for (const std::size_t length : {std::size_t{1}, std::size_t{4}, whole.size() - 1}) {
    EXPECT_EQ(replies(whole + whole.substr(0, length)).size(), 1U);
  }
}

TEST(Service, EndsInOrderWhenItCannotWrite) {
  ChildServer unread(runService);
  unread.endOutput();
  unread.send(request(1));
  EXPECT_EQ(unread.end(), 0);
  ChildServer toFile([] {
    dup2(open("/tmp", O_TMPFILE | O_WRONLY, 0600), STDOUT_FILENO);
    runService();
  });
  toFile.endInput();
  EXPECT_EQ(toFile.end(), 0);
}

TEST(Service, ServesThroughNonBlockingPipesWhileItIsStoppedAndContinued) {
  ChildServer server(runTestServer, ChildServer::Connection::nonBlockingPipes);
  ASSERT_TRUE(server.receive());
  // While it waits to write, more than a pipe holds, and while it waits to read.
  for (const std::string& message : {std::string(std::size_t{8} << 20, 'x'), std::string("1")}) {
    server.request(1, message);
    for (int i = 0; i < 5; ++i) {
      std::this_thread::sleep_for(5ms);
      kill(server.pid(), SIGSTOP);
      kill(server.pid(), SIGCONT);
    }
    const auto reply = server.receive();
    ASSERT_TRUE(reply);
    EXPECT_GT(reply->size(), message.size());
  }
  server.endInput();
  EXPECT_EQ(server.end(), 0);
}

/// Both directions of the connection are full, and stay so for most of the replies.
TEST(Service, NeitherGrowsNorGivesUpWhenItsPeerHardlyReads) {
  constexpr int kRequests = 48;
  constexpr std::size_t kMaxPeak = sandbox::kSanitizedBuild ? 4096 : 256;  // MiB
  ChildServer server(runTestServer);
  BlockBuilder requests;
  for (int id = 0; id < kRequests; ++id) {
    std::string message = "tell " + std::to_string(id) + ' ';
    message.resize(std::size_t{2} << 20, 'x');
    frames::appendRequest(requests, static_cast<std::uint64_t>(id), VeskCommandResponse::schemaName,
                          message);
  }
  const std::string_view rest = server.send({requests.bytes(), requests.size()}, 500);
  EXPECT_GT(rest.size(), requests.size() / 2) << "it read on, with its replies unread";
  ASSERT_TRUE(server.receive()) << "the hello";
  std::thread sender([&] { EXPECT_EQ(server.send(rest), ""); });
  for (int id = 0; id < kRequests; ++id) {
    const auto body = server.receive();
    if (!body) break;  // which the sender reports
    const auto record = frames::decodeRecord<VeskCommandResponse>(frames::parseReply(*body).body);
    EXPECT_EQ(record.command, id);
    EXPECT_EQ(record.token.value().size(), std::size_t{2} << 20);
    std::this_thread::sleep_for(5ms);
  }
  const std::string status = processFile(server.pid(), "status");
  EXPECT_LT(std::stoul(status.substr(status.find("VmHWM:") + 6)) >> 10, kMaxPeak);
  server.endInput();
  sender.join();
  EXPECT_EQ(server.end(), 0);
}

}  // namespace
}  // namespace ironmoat
