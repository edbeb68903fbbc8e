#include "process/program.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

namespace ironmoat::process {
namespace {

namespace fs = std::filesystem;

TEST(TrustedPath, HoldsUnlessOthersCanReplaceTheFile) {
  const bool isRoot = ::geteuid() == 0;  // only root can try files of others
  const uid_t self = isRoot ? 1 : ::geteuid();
  const uid_t other = self + 1;
  const struct {
    uid_t owner;
    mode_t mode;
    bool fileIsTrusted;  // with this owner and mode
    bool folderIsTrusted;
  } rows[] = {
      {self, 0755, true, true},   {self, 0775, false, false},  {self, 0757, false, false},
      {self, 01775, false, true}, {self, 01757, false, true},  {0, 0755, true, true},
      {0, 01777, false, true},    {other, 0755, false, false}, {other, 01777, false, false},
  };
  std::string name = fs::canonical(testing::TempDir()) / "trusted_path.XXXXXX";
  const fs::path top = ::mkdtemp(name.data());
  ASSERT_EQ(::chmod(top.c_str(), 0755), 0);
  const fs::path folder = top / "folder";
  const fs::path file = folder / "file";
  fs::create_directory(folder);
  std::ofstream(file).close();
  for (const auto& row : rows) {
    if (row.owner != self && !isRoot) continue;
    for (const bool isFile : {true, false}) {
      for (const fs::path& each : {file, folder}) {
        const bool isMeant = (each == file) == isFile;
        ASSERT_EQ(::chown(each.c_str(), isMeant ? row.owner : self, ::getegid()), 0);
        ASSERT_EQ(::chmod(each.c_str(), isMeant ? row.mode : 0755), 0);
      }
      ASSERT_EQ(isRoot ? ::seteuid(self) : 0, 0);
      EXPECT_EQ(isOutOfOthersReach(file), isFile ? row.fileIsTrusted : row.folderIsTrusted)
          << &row - rows;
      ASSERT_EQ(isRoot ? ::seteuid(0) : 0, 0);
    }
  }
  EXPECT_FALSE(isOutOfOthersReach(top / "missing"));
  fs::remove_all(top);
}

}  // namespace
}  // namespace ironmoat::process
