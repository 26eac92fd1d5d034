// Private to the ovrameta tool (not part of the library's interface):
// values as rows of name/text cells, for export (get --csv) and import
// (set --json FILE, set --csv FILE), and the text of an array's items.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "Reading.h"

namespace ovrameta {

using Cell = std::pair<std::string, std::string>;  // name ("dc:title[@fr]"), stored text

// The values a file's rows give it.
struct Row {
  std::string file;
  std::vector<Cell> cells;
};

// Items as one text that the library splits back into exactly these items
// ("a; b", with quotes around an item that holds ";" or a quote).
std::string ItemsText(const std::vector<std::string>& items);

// The cells of a value as stored: simple values and arrays of simple values
// whole, structures field by field, arrays of structures item by item,
// every language but the default as name[@lang].
void Flatten(const ValueNode& node, std::vector<Cell>& cells);

// One CSV record per line of text (RFC 4180: quotes, doubled quotes,
// line breaks inside quotes).
std::vector<std::vector<std::string>> ParseCSV(const std::string& text);
std::string CSVField(const std::string& text);

// Rows from a file written by get --json or get --csv, or written by hand:
// JSON objects naming "file" (or ExifTool's "SourceFile") with either
// "properties" as get --json gives them or "prefix:Name": value members;
// CSV with a "file" (or "SourceFile") column and one column per name. Empty
// CSV cells leave a value alone. False, with the reason, when the file
// cannot be read.
bool ReadRows(const std::string& path, bool csv, std::vector<Row>& rows, std::string& error);

}  // namespace ovrameta
