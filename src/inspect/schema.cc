#include "inspect/schema.h"

#include <algorithm>

#include "inspect/json.h"

namespace ironmoat::inspect {

namespace {

/// Longer keys are few and do not widen the column.
constexpr std::size_t kMaxKeyColumns = 12;

std::string padded(std::string_view text, std::size_t width) {
  return std::string(text).append(std::max(width, text.size()) - text.size() + 2, ' ');
}

}  // namespace

std::string schemasAsText(const std::vector<RecordSchema>& records, const Colours& colours) {
  std::string out;
  for (const RecordSchema& record : records) {
    std::size_t keys = 0;
    std::size_t names = 0;
    for (const FieldSchema& field : record.fields) {
      if (field.key.size() <= kMaxKeyColumns) keys = std::max(keys, field.key.size());
      names = std::max(names, field.name.size());
    }
    if (!out.empty()) out += '\n';
    out.append(colours.title).append(record.name).append(colours.end).append("\n");
    for (const FieldSchema& field : record.fields) {
      out.append("  ").append(colours.label).append(padded(field.key, keys)).append(colours.end);
      out.append(padded(field.name, names)).append(field.list ? "list of " : "").append(field.type);
      if (field.required) out.append(colours.aside).append(" (required)").append(colours.end);
      out += '\n';
    }
  }
  return out;
}

std::string schemasAsJson(const std::vector<RecordSchema>& records) {
  std::string out;
  JsonWriter json(out);
  json.open('{').name("records").open('[');
  for (const RecordSchema& record : records) {
    json.open('{').member("name", record.name).name("fields").open('[');
    for (const FieldSchema& field : record.fields) {
      const bool first = &field == &record.fields.front();
      json.open('{').member("key", field.key).member("name", field.name);
      json.member("label", first ? "with" : field.name).member("type", field.type);
      json.member("list", field.list).member("required", field.required).close('}');
    }
    json.close(']').close('}');
  }
  json.close(']').close('}');
  return out += '\n';
}

}  // namespace ironmoat::inspect
