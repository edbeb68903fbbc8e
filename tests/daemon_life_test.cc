// What can happen to a daemon, and what then comes of its messages. Linked statically.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "ironmoat/event_loop_client.h"
#include "sandbox_parts/sandbox_parts.h"
#include "support/clients.h"

namespace ironmoat {
namespace {

namespace fs = std::filesystem;
using testing::optionsFor;
using testing::outcome;

/// The outcomes of a good and of a bad message.
std::string outcomes() {
  Client client(optionsFor(SERVICE));
  std::string all = outcome(client, "<plist><dict><key>c</key><integer>7</integer></dict></plist>");
  all += ", " + outcome(client, "<plist><dict><key>c</key><true/></dict></plist>");
  return client.stats().limitedMemory == 0 ? all : all + ", limited memory";
}

bool limit(__rlimit_resource what, rlim_t value) {
  const rlimit both = {value, value};
  return ::setrlimit(what, &both) == 0;
}

/// Of a user who has no other process.
bool becomeLonelyUser() { return ::setgid(54321) == 0 && ::setuid(54321) == 0; }

bool hideProc() {
  return ::unshare(CLONE_NEWNS) == 0 &&
         ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
         ::umount2("/proc", MNT_DETACH) == 0 && ::chroot("/") == 0 && !fs::exists("/proc/self");
}

TEST(DaemonLife, LeavesMessagesTheirOutcomesOrSaysWhatIsMissing) {
  if (::geteuid() != 0) GTEST_SKIP() << "needs privileges to drop";
  if (sandbox::kSanitizedBuild) GTEST_SKIP() << "sanitizers need what is missing here";
  const std::string right = "7, typeMismatch at c: expected integer, found boolean";
  const std::string none = std::string("unavailable: cannot start ") + SERVICE;
  const struct {
    const char* what;
    bool (*happens)();
    std::string outcomes;
  } rows[] = {
      {"a root without /proc", hideProc, right},
      {"tasks for itself only", [] { return limit(RLIMIT_NPROC, 1) && becomeLonelyUser(); },
       none + ": Resource temporarily unavailable"},
      {"a task more", [] { return limit(RLIMIT_NPROC, 2) && becomeLonelyUser(); }, right},
      {"descriptors for half a process", [] { return limit(RLIMIT_NOFILE, 6); },
       none + ": Too many open files"},
      {"descriptors for a process", [] { return limit(RLIMIT_NOFILE, 7); }, right},
      {"half of the address space", [] { return limit(RLIMIT_AS, rlim_t{512} << 20); },
       right + ", limited memory"},
  };
  for (const auto& row : rows) {
    const pid_t child = ::fork();
    if (child == 0) {
      ::close_range(3, ~0U, 0);
      const std::string got = row.happens() ? outcomes() : "cannot be arranged";
      if (got.starts_with(row.outcomes)) ::_exit(0);
      std::fprintf(stderr, "%s: %s\n", row.what, got.c_str());
      ::_exit(1);
    }
    int status = -1;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0) << row.what;
  }
}

/// Descriptors that a program would get that this one executes.
int inheritable() {
  int count = 0;
  for (int each = 0; each < 1024; ++each) {
    const int flags = ::fcntl(each, F_GETFD);
    if (flags >= 0 && (flags & FD_CLOEXEC) == 0) ++count;
  }
  return count;
}

TEST(DaemonLife, ProgramsThatItExecutesGetNoDescriptor) {
  const int before = inheritable();
  Client client(optionsFor(SERVICE));
  EventLoopClient loop(optionsFor(SERVICE));
  auto pending = client.submit<VeskCommandResponse>(Data(std::string_view("junk")));
  EXPECT_TRUE(outcome(client, "junk").starts_with("malformed"));
  loop.submit<VeskCommandResponse>(Data(std::string_view("junk")), [](const auto&) {});
  loop.dispatch();
  EXPECT_EQ(inheritable(), before);
}

TEST(DaemonLife, AnUpgradeOfTheServiceLosesNoMessage) {
  const fs::path folder = fs::path(::testing::TempDir()) / ("upgrade." + std::to_string(getpid()));
  fs::create_directory(folder);
  fs::copy(TEST_SERVER, folder / "service");
  ClientOptions options = optionsFor(folder / "service");
  options.requestsPerProcess = 20;
  options.processes = 1;
  Client client(options);
  std::string course;  // each outcome that differs from the one before it
  for (int i = 0, upgraded = 0; i < 5000 && upgraded < 50; ++i) {
    if (i == 30) {
      fs::copy(SERVICE, folder / "new");
      fs::rename(folder / "new", folder / "service");
    }
    const std::string got = outcome(client, "tell 5") + '\n';
    if (!course.ends_with(got)) course += got;
    if (got != "5\n") ++upgraded;
  }
  EXPECT_EQ(course, "5\nmalformed at : missing plist element at offset 0\n");
  fs::remove_all(folder);
}

}  // namespace
}  // namespace ironmoat
