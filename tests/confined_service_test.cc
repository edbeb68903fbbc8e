// Servers as processes, looked at from outside: what they report, what the kernel says of them,
// what they do where they cannot be confined and with frames that lie, and how they share their
// limit of memory. (S1, S4, S6, S12)

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
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <string>
#include <thread>

#include "confinement/confinement.h"
#include "support/spoken_to.h"

namespace ironmoat {
namespace {

using frames::Status;
using testing::SpokenTo;

/// By descriptor, for a user who may not search the folder that it is in.
void run(const char* program) {
  static char* const nothing[] = {nullptr};
  fexecve(open(program, O_RDONLY | O_CLOEXEC), nothing, nothing);
}
void runService() { run(IRONMOAT_SERVICE); }
void runTestServer() { run(TEST_SERVER); }

/// Needs what a sanitizer does not stand.
class FullyConfinedService : public ::testing::Test {
 protected:
  void SetUp() override {
    if (confinement::kSanitizedBuild) {
      GTEST_SKIP() << "built with a sanitizer, which needs what the confinement takes";
    }
  }
};

std::string contents(const std::filesystem::path& file) {
  std::ifstream in(file);
  return {std::istreambuf_iterator(in), {}};
}

rlim_t limitOf(pid_t pid, __rlimit_resource resource) {
  rlimit value = {};
  EXPECT_EQ(prlimit(pid, resource, nullptr, &value), 0);
  EXPECT_EQ(value.rlim_cur, value.rlim_max) << resource;
  return value.rlim_max;
}

TEST_F(FullyConfinedService, IsConfinedToTheKernelToo) {
  SpokenTo service(runService);
  ASSERT_TRUE(service.receive());
  for (const auto none : {RLIMIT_CORE, RLIMIT_FSIZE, RLIMIT_NOFILE, RLIMIT_NPROC}) {
    EXPECT_EQ(limitOf(service.pid(), none), 0U) << none;
  }
  EXPECT_EQ(limitOf(service.pid(), RLIMIT_AS), confinement::kAddressSpace);
  int threads = 0;
  const auto process = std::filesystem::path("/proc") / std::to_string(service.pid());
  for (const auto& thread : std::filesystem::directory_iterator(process / "task")) {
    const std::string status = contents(thread.path() / "status");
    EXPECT_NE(status.find("\nSeccomp:\t2\n"), std::string::npos) << status;
    EXPECT_NE(status.find("\nNoNewPrivs:\t1\n"), std::string::npos) << status;
    ++threads;
  }
  EXPECT_EQ(threads, 1);
}

TEST_F(FullyConfinedService, WorksAsAnOrdinaryUser) {
  if (geteuid() != 0) GTEST_SKIP() << "the other tests show it: this user is an ordinary one";
  constexpr id_t kNobody = 65534;
  SpokenTo service([] {
    if (setgroups(0, nullptr) == 0 && setgid(kNobody) == 0 && setuid(kNobody) == 0) runService();
  });
  const std::uint32_t bits = service.reportedConfinement();
  EXPECT_EQ(bits & confinement::kRequiredParts, confinement::kRequiredParts);
  // What can be traced belongs to its user.
  struct stat info = {};
  ASSERT_EQ(stat(("/proc/" + std::to_string(service.pid()) + "/mem").c_str(), &info), 0);
  EXPECT_EQ(info.st_uid, 0U);
}

TEST_F(FullyConfinedService, RefusesToServeUnconfined) {
  struct Denied {
    int call;
    unsigned argument;
    std::uint64_t value;
    int status;
  };
  for (const Denied& denied : {
           Denied{SCMP_SYS(seccomp), 0, SECCOMP_SET_MODE_FILTER, 64},
           Denied{SCMP_SYS(prctl), 0, PR_SET_NO_NEW_PRIVS, 65},
           Denied{SCMP_SYS(prctl), 0, PR_SET_DUMPABLE, 66},
           Denied{SCMP_SYS(prlimit64), 1, RLIMIT_CORE, 67},
           Denied{SCMP_SYS(prlimit64), 1, RLIMIT_FSIZE, 68},
           Denied{SCMP_SYS(prlimit64), 1, RLIMIT_NOFILE, 69},
           Denied{SCMP_SYS(prlimit64), 1, RLIMIT_NPROC, 70},
           Denied{SCMP_SYS(prlimit64), 1, RLIMIT_AS, 71},
           Denied{SCMP_SYS(prctl), 0, PR_SET_PDEATHSIG, 73},
       }) {
    SpokenTo service([&] {
      scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
      const scmp_arg_cmp same = {denied.argument, SCMP_CMP_EQ, denied.value, 0};
      seccomp_rule_add_array(filter, SCMP_ACT_ERRNO(EPERM), denied.call, 1, &same);
      if (seccomp_load(filter) == 0) runService();
    });
    EXPECT_FALSE(service.receive()) << "greeted without " << denied.status;
    const int status = service.end();
    EXPECT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), denied.status);
  }
}

TEST(ConfinedService, EndsWithTheThreadThatStartedIt) {
  std::unique_ptr<SpokenTo> service;
  std::thread starter([&] {
    service = std::make_unique<SpokenTo>(runService);
    EXPECT_TRUE(service->receive());
  });
  starter.join();
  const int status = service->end();
  EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL);
}

TEST_F(FullyConfinedService, RejectsWhatItHasNoMemoryForAndGoesOn) {
  SpokenTo server(runTestServer);
  EXPECT_NE(server.reportedConfinement() & static_cast<unsigned>(confinement::Part::fullMemory),
            0U);
  for (std::uint64_t id = 0; id < 12; ++id) {
    server.request(id, id % 3 == 0 ? "hold 1024" : "hold 600");
    const auto body = server.receive();
    ASSERT_TRUE(body) << id;
    const frames::Reply reply = frames::parseReply(*body);
    if (id % 3 == 0) {
      ASSERT_EQ(reply.status, Status::refused) << id;
      EXPECT_EQ(frames::parseRefusal(reply.body).kind(), DecodingError::Kind::notEnoughMemory);
    } else {
      EXPECT_EQ(reply.status, Status::record) << id;
    }
  }
  server.endInput();
  EXPECT_EQ(server.end(), 0);
}

TEST_F(FullyConfinedService, TellsOfAnInheritedLimitOnItsMemory) {
  SpokenTo server([] {
    const rlimit half = {confinement::kAddressSpace / 2, confinement::kAddressSpace / 2};
    setrlimit(RLIMIT_AS, &half);
    runTestServer();
  });
  const std::uint32_t bits = server.reportedConfinement();
  EXPECT_EQ(bits & confinement::kRequiredParts, confinement::kRequiredParts);
  EXPECT_EQ(bits & static_cast<unsigned>(confinement::Part::fullMemory), 0U);
}

/// How often `text` is found in the memory of a process, which only root may read.
std::size_t occurrences(pid_t pid, const std::string& text) {
  const std::string process = "/proc/" + std::to_string(pid);
  std::ifstream maps(process + "/maps");
  std::ifstream memory(process + "/mem", std::ios::binary);
  std::size_t found = 0;
  for (std::string line; std::getline(maps, line);) {
    if (line.find(" rw") == std::string::npos) continue;
    const std::size_t first = std::stoul(line, nullptr, 16);
    const std::size_t last = std::stoul(line.substr(line.find('-') + 1), nullptr, 16);
    std::string bytes(last - first, '\0');
    memory.clear();
    memory.seekg(static_cast<std::streamoff>(first));
    memory.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    for (std::size_t at = bytes.find(text); at != std::string::npos;
         at = bytes.find(text, at + 1)) {
      ++found;
    }
  }
  return found;
}

TEST_F(FullyConfinedService, ForgetsMessagesWhenItIsIdle) {
  if (geteuid() != 0) GTEST_SKIP() << "needs the right to read another process's memory";
  SpokenTo service(runService);
  ASSERT_TRUE(service.receive());
  const std::string mark = "a text that is nowhere else: ";
  std::uint64_t id = 0;
  for (const std::size_t size : {10, 100, 1000, 5000, 40'000, 70'000, 1'000'000, 300, 20}) {
    std::string text;
    while (text.size() < size) text += mark;
    for (const char* entity : {"", "&amp;"}) {  // literal, and transformed
      service.request(++id, "<plist><dict><key>c</key><integer>1</integer><key>qai</key><string>" +
                                text + entity + "</string></dict></plist>");
      ASSERT_TRUE(service.receive());
      service.request(++id, "<plist><dict><key>" + text + "</key><true/></dict></plist>");
      ASSERT_TRUE(service.receive());
    }
  }
  EXPECT_GT(occurrences(service.pid(), mark), 0U) << "the search works";
  std::this_thread::sleep_for(std::chrono::milliseconds(1300));
  EXPECT_EQ(occurrences(service.pid(), mark), 0U);
}

/// All that comes back for `input`, by its id, from the hello to the end in order.
std::map<std::uint64_t, frames::Reply> replies(std::string_view input) {
  SpokenTo service(runService);
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
std::string request(std::uint64_t id, std::string_view type = VeskCommandResponse::schemaName) {
  BlockBuilder out;
  frames::appendRequest(out, id, type,
                        "<plist><dict><key>c</key><integer>1</integer></dict></plist>");
  return {out.bytes(), out.size()};
}

TEST(ConfinedService, BadRequestsGetAnErrorAndTheNextIsServed) {
  std::string lyingName = request(8);
  lyingName[12] = '\xFF';                            // longer than the frame
  const std::string tiny("\x03\x00\x00\x00xyz", 7);  // too short for an id
  const auto all = replies(request(5, "NoSuchType") + lyingName + tiny + request(9));
  ASSERT_EQ(all.size(), 4U);
  for (const std::uint64_t id : {5, 8, 0}) EXPECT_EQ(all.at(id).status, Status::notServed) << id;
  EXPECT_EQ(frames::parseSentence(all.at(5).body), "not a served output type");
  EXPECT_EQ(all.at(9).status, Status::record);
}

TEST(ConfinedService, OverLongAndCutFramesEndTheConnectionInOrder) {
  const std::string whole = request(1);
  const std::string tooLong = std::string(4, '\xFF') + std::string(100'000, 'x');
  const auto all = replies(whole + tooLong + request(2));
  EXPECT_EQ(all.size(), 2U);
  EXPECT_TRUE(all.contains(0) && all.contains(1));
  for (const std::size_t length : {std::size_t{1}, std::size_t{4}, whole.size() - 1}) {
    EXPECT_EQ(replies(whole + whole.substr(0, length)).size(), 1U);
  }
}

TEST(ConfinedService, NonBlockingDescriptorsAndStopsDoNotMatter) {
  SpokenTo server(runTestServer, O_NONBLOCK);
  ASSERT_TRUE(server.receive());
  const std::string large(std::size_t{8} << 20, 'x');
  server.request(1, large);
  const auto stopAndGo = [&] {
    for (int i = 0; i < 5; ++i) {
      std::this_thread::sleep_for(std::chrono::milliseconds(5));
      kill(server.pid(), SIGSTOP);
      kill(server.pid(), SIGCONT);
    }
  };
  stopAndGo();  // as it waits to write, more than a pipe holds
  const auto reply = server.receive();
  ASSERT_TRUE(reply);
  EXPECT_GT(reply->size(), large.size());
  stopAndGo();  // as it waits to read
  server.request(2, "hold 1");
  EXPECT_TRUE(server.receive());
  server.endInput();
  EXPECT_EQ(server.end(), 0);
}

}  // namespace
}  // namespace ironmoat
