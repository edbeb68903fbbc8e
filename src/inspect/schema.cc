#include "inspect/schema.h"

#include <algorithm>

#include "inspect/json.h"

namespace ironmoat::inspect {

namespace {

/// Few keys are longer; they do not widen their column.
constexpr std::size_t kWidestKeys = 12;

void appendPadded(std::string& out, std::string_view text, std::size_t width) {
  out += text;
  out.append(std::max(width, text.size()) - text.size() + 2, ' ');
}

void showAsText(const RecordSchema& record, const Colours& colours, std::string& out) {
  std::size_t keys = 0;
  std::size_t names = 0;
  for (const FieldSchema& field : record.fields) {
    if (field.key.size() <= kWidestKeys) keys = std::max(keys, field.key.size());
    names = std::max(names, field.name.size());
  }
  out.append(colours.title).append(record.name).append(colours.end).append("\n");
  for (const FieldSchema& field : record.fields) {
    out.append("  ").append(colours.label);
    appendPadded(out, field.key, keys);
    out += colours.end;
    appendPadded(out, field.name, names);
    if (field.list) out += "list of ";
    out += field.type;
    if (field.required) out.append(colours.aside).append(" (required)").append(colours.end);
    out += '\n';
  }
}

void showAsJson(const RecordSchema& record, std::string& out) {
  out += "{\"name\": ";
  appendJsonText(out, record.name);
  out += ", \"fields\": [";
  for (const FieldSchema& field : record.fields) {
    if (&field != &record.fields.front()) out += ", ";
    out += "{\"key\": ";
    appendJsonText(out, field.key);
    out += ", \"name\": ";
    appendJsonText(out, field.name);
    out += ", \"label\": ";
    appendJsonText(out, &field == &record.fields.front() ? "with" : field.name);
    out += ", \"type\": ";
    appendJsonText(out, field.type);
    out.append(", \"list\": ").append(field.list ? "true" : "false");
    out.append(", \"required\": ").append(field.required ? "true}" : "false}");
  }
  out += "]}";
}

}  // namespace

void showSchemas(std::span<const RecordSchema> records, Format format, const Colours& colours,
                 std::string& out) {
  if (format == Format::json) out += "{\"records\": [";
  for (const RecordSchema& record : records) {
    const bool first = &record == &records.front();
    if (format == Format::json) {
      if (!first) out += ", ";
      showAsJson(record, out);
    } else {
      if (!first) out += '\n';
      showAsText(record, colours, out);
    }
  }
  if (format == Format::json) out += "]}\n";
}

}  // namespace ironmoat::inspect
