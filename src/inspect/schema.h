#pragma once

#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/terminal_text.h"

namespace ironmoat::inspect {

struct FieldSchema {
  std::string_view key;   ///< in messages, and in the paths of errors
  std::string_view name;  ///< in the record, and in this tool's output
  std::string_view type;  ///< Int, Int64, Bool, String, Data, or a record's name
  bool list;
  bool required;  ///< if true, the service rejects messages without it
};

struct RecordSchema {
  std::string_view name;
  std::vector<FieldSchema> fields;
};

std::string schemasAsText(const std::vector<RecordSchema>& records, const Colours& colours);
/// One line.
std::string schemasAsJson(const std::vector<RecordSchema>& records);

}  // namespace ironmoat::inspect
