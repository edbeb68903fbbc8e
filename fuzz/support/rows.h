#pragma once

#include <gtest/gtest.h>

#include <fstream>
#include <string>
#include <string_view>

namespace ironmoat::testing {

/// Replaces `\xNN` by bytes.
inline std::string unescaped(std::string_view row) {
  std::string text;
  for (std::size_t end = 0; (end = row.find('\\')) != std::string_view::npos;) {
    text.append(row.substr(0, end));
    text += static_cast<char>(std::stoi(std::string(row.substr(end + 2, 2)), nullptr, 16));
    row.remove_prefix(end + 4);
  }
  return text.append(row);
}

/// Calls `check(outcome, message)` for each row of a file of fuzz/rows/.
template <class Check>
void forEachRow(const char* name, Check check) {
  std::ifstream rows(std::string(READER_ROWS "/") + name);
  for (std::string row; std::getline(rows, row);) {
    const std::size_t tab = row.find('\t');
    if (row[0] == '#') continue;
    check(unescaped({row.data(), tab}), unescaped(std::string_view(row).substr(tab + 1)));
  }
  EXPECT_TRUE(rows.eof());
}

}  // namespace ironmoat::testing
