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
  constexpr uid_t kOther = 1;
  struct Row {
    bool othersFile;
    mode_t file;
    bool othersFolder;
    mode_t folder;
    bool trusted;
  };
  const Row rows[] = {
      {false, 0755, false, 0755, true},  {false, 0775, false, 0755, false},
      {false, 0757, false, 0755, false}, {false, 01757, false, 0755, false},
      {false, 0755, false, 0775, false}, {false, 0755, false, 0757, false},
      {false, 0755, false, 01777, true}, {true, 0755, false, 0755, false},
      {true, 0755, false, 01777, false}, {false, 0755, true, 0755, false},
      {false, 0755, true, 01777, false},
  };
  std::string name = fs::canonical(testing::TempDir()) / "trusted_path.XXXXXX";
  const fs::path folder = ::mkdtemp(name.data());
  const fs::path file = folder / "sub" / "file";
  fs::create_directory(folder / "sub");
  std::ofstream(file).close();
  for (const Row& row : rows) {
    if ((row.othersFile || row.othersFolder) && ::geteuid() != 0) continue;
    if (::geteuid() == 0) {
      ASSERT_EQ(::chown(file.c_str(), row.othersFile ? kOther : 0, 0), 0);
      ASSERT_EQ(::chown((folder / "sub").c_str(), row.othersFolder ? kOther : 0, 0), 0);
    }
    ASSERT_EQ(::chmod(file.c_str(), row.file), 0);
    ASSERT_EQ(::chmod((folder / "sub").c_str(), row.folder), 0);
    EXPECT_EQ(isOutOfOthersReach(file), row.trusted) << &row - rows;
  }
  EXPECT_FALSE(isOutOfOthersReach(folder / "missing"));
  fs::remove_all(folder);
}

}  // namespace
}  // namespace ironmoat::process
