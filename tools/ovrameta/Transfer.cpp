#include "Transfer.h"

#include <algorithm>
#include <fstream>
#include <sstream>

#include <nlohmann/json.hpp>

namespace ovrameta {

namespace {

using Json = nlohmann::ordered_json;

std::string StoredText(const ValueNode& node) { return node.raw ? *node.raw : node.value; }

bool AllSimple(const std::vector<ValueNode>& items) {
  for (const auto& item : items)
    if (item.kind != ValueNode::kSimple) return false;
  return true;
}

std::string JsonText(const Json& value) {
  if (value.is_string()) return value.get<std::string>();
  if (value.is_boolean()) return value.get<bool>() ? "True" : "False";
  return value.dump();
}

// A property as get --json writes it, back into cells.
void FlattenJson(const Json& property, std::vector<Cell>& cells) {
  if (!property.is_object() || !property.contains("name") || property.value("mixed", false)) return;
  const std::string name = property["name"].get<std::string>();
  if (property.contains("fields")) {
    for (const auto& field : property["fields"]) FlattenJson(field, cells);
    return;
  }
  if (property.contains("items")) {
    const auto& items = property["items"];
    const bool simple = std::all_of(items.begin(), items.end(), [](const Json& item) {
      return !item.contains("fields") && !item.contains("items");
    });
    if (!simple) {
      for (const auto& item : items) FlattenJson(item, cells);
      return;
    }
    std::vector<std::string> texts;
    for (const auto& item : items) {
      const Json& text = item.contains("raw") && !item["raw"].is_null() ? item["raw"] : item.value("value", Json());
      if (text.is_null()) return;
      texts.push_back(JsonText(text));
    }
    cells.emplace_back(name, ItemsText(texts));
    return;
  }
  const Json& text = property.contains("raw") ? property["raw"] : Json();
  // Constructed values are not stored, so there is nothing to put back.
  if (!text.is_null()) cells.emplace_back(name, JsonText(text));
  if (property.contains("languages")) {
    for (const auto& [language, other] : property["languages"].items())
      if (language != "x-default") cells.emplace_back(name + "[@" + language + "]", JsonText(other));
  }
}

bool ReadJsonRows(const std::string& text, std::vector<Row>& rows, std::string& error) {
  const Json all = Json::parse(text, nullptr, false);
  if (all.is_discarded() || !(all.is_array() || all.is_object())) {
    error = "not JSON (an array of objects with \"file\" and values is expected)";
    return false;
  }
  const Json list = all.is_array() ? all : Json::array({all});
  for (const auto& object : list) {
    Row row;
    if (!object.is_object()) continue;
    for (const auto& [key, value] : object.items()) {
      if (key == "file" || key == "SourceFile") {
        row.file = JsonText(value);
      } else if (key == "properties" && value.is_array()) {
        for (const auto& property : value) FlattenJson(property, row.cells);
      } else if (value.is_array()) {
        std::vector<std::string> items;
        for (const auto& item : value) items.push_back(JsonText(item));
        row.cells.emplace_back(key, ItemsText(items));
      } else if (!value.is_null() && !value.is_object()) {
        row.cells.emplace_back(key, JsonText(value));
      }
    }
    if (row.file.empty()) {
      error = "an entry names no \"file\"";
      return false;
    }
    rows.push_back(std::move(row));
  }
  return true;
}

bool ReadCSVRows(const std::string& text, std::vector<Row>& rows, std::string& error) {
  const auto records = ParseCSV(text);
  if (records.empty()) {
    error = "empty";
    return false;
  }
  const auto& header = records.front();
  std::size_t fileColumn = header.size();
  for (std::size_t i = 0; i < header.size(); ++i)
    if (header[i] == "file" || header[i] == "SourceFile") fileColumn = i;
  if (fileColumn == header.size()) {
    error = "no \"file\" column";
    return false;
  }
  for (std::size_t r = 1; r < records.size(); ++r) {
    const auto& record = records[r];
    if (record.size() == 1 && record[0].empty()) continue;
    Row row;
    for (std::size_t i = 0; i < record.size() && i < header.size(); ++i) {
      if (i == fileColumn) {
        row.file = record[i];
      } else if (!record[i].empty()) {
        row.cells.emplace_back(header[i], record[i]);
      }
    }
    if (!row.file.empty()) rows.push_back(std::move(row));
  }
  return true;
}

}  // namespace

std::string ItemsText(const std::vector<std::string>& items) {
  std::string text;
  for (const auto& item : items) {
    if (!text.empty()) text += "; ";
    const bool quote = item.find_first_of(";\"") != std::string::npos || item.empty() || item.front() == ' ' ||
                       item.back() == ' ';
    if (!quote) {
      text += item;
      continue;
    }
    text += '"';
    for (const char c : item) text += c == '"' ? std::string("\"\"") : std::string(1, c);
    text += '"';
  }
  return text;
}

void Flatten(const ValueNode& node, std::vector<Cell>& cells) {
  if (node.mixed) return;
  if (node.kind == ValueNode::kStruct || (node.kind == ValueNode::kArray && !AllSimple(node.children))) {
    for (const auto& child : node.children) Flatten(child, cells);
    return;
  }
  if (node.kind == ValueNode::kArray && !node.children.empty()) {
    std::vector<std::string> items;
    for (const auto& item : node.children) items.push_back(StoredText(item));
    cells.emplace_back(node.name, ItemsText(items));
    return;
  }
  if (!node.raw) return;  // constructed, not stored
  cells.emplace_back(node.name, *node.raw);
  for (const auto& [language, text] : node.languages)
    if (language != "x-default") cells.emplace_back(node.name + "[@" + language + "]", text);
}

std::vector<std::vector<std::string>> ParseCSV(const std::string& text) {
  std::vector<std::vector<std::string>> records;
  std::vector<std::string> record;
  std::string field;
  bool quoted = false, any = false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    any = true;
    if (quoted) {
      if (c == '"' && i + 1 < text.size() && text[i + 1] == '"') {
        field += '"';
        ++i;
      } else if (c == '"') {
        quoted = false;
      } else {
        field += c;
      }
    } else if (c == '"') {
      quoted = true;
    } else if (c == ',') {
      record.push_back(std::move(field));
      field.clear();
    } else if (c == '\n' || c == '\r') {
      if (c == '\r' && i + 1 < text.size() && text[i + 1] == '\n') ++i;
      record.push_back(std::move(field));
      field.clear();
      records.push_back(std::move(record));
      record.clear();
      any = false;
    } else {
      field += c;
    }
  }
  if (any) {
    record.push_back(std::move(field));
    records.push_back(std::move(record));
  }
  return records;
}

std::string CSVField(const std::string& text) {
  if (text.find_first_of(",\"\r\n") == std::string::npos) return text;
  std::string out = "\"";
  for (const char c : text) out += c == '"' ? std::string("\"\"") : std::string(1, c);
  return out + "\"";
}

bool ReadRows(const std::string& path, bool csv, std::vector<Row>& rows, std::string& error) {
  std::ifstream in(path, std::ios::binary);
  if (!in) {
    error = "cannot be read";
    return false;
  }
  std::ostringstream text;
  text << in.rdbuf();
  return csv ? ReadCSVRows(text.str(), rows, error) : ReadJsonRows(text.str(), rows, error);
}

}  // namespace ovrameta
