#include "Lists.h"

#include <algorithm>
#include <iostream>
#include <set>
#include <sstream>

#include "Names.h"
#include "Reading.h"
#include "TextUtil.h"
#include "ViewShow.h"

namespace ovrameta {

using namespace ovrametadata;

void RecordRecentValues(const std::vector<std::pair<std::string, std::string>>& values) {
  if (values.empty()) return;
  // Lists saved by other runs since this one started are kept.
  LoadMRUFile();
  MRULists lists = GetMRULists();
  for (const auto& [name, value] : values) {
    std::list<UTF16String>& list = lists[name];
    const UTF16String text = ToUTF16(value);
    list.remove(text);
    list.push_front(text);
    if (list.size() > kRecentValues) list.resize(kRecentValues);
    UpdateMRULists(name, list);
  }
  SerializeMRUList();
}

int RecentCommand(const std::string& name, bool clear) {
  if (clear) {
    ClearMRUList();
    RemoveMRUFile();
    return 0;
  }
  LoadMRUFile();
  for (const auto& [key, values] : GetMRULists()) {
    if (!name.empty() && key != name) continue;
    std::cout << key << '\n';
    for (const UTF16String& value : values) PrintLines(std::cout, "  ", "", ToUTF8(value));
  }
  return 0;
}

int FieldsCommand(const std::vector<std::string>& names) {
  std::set<Path> paths;
  for (const std::string& name : names) {
    ResolvedName resolved;
    std::string error;
    if (!ResolveName(name, resolved, error)) {
      std::cerr << "ovrameta: " << error << std::endl;
      return 2;
    }
    for (const Path& leaf : DescendantLeafPaths(resolved.path)) paths.insert(leaf);
  }
  UTF8String text;
  IncludedLeafPathsAsXMLString(paths, text);
  std::cout << text;
  return 0;
}

bool ReadFieldList(const std::string& file, std::vector<Path>& paths) {
  std::set<Path> read;
  if (!ReadIncludedLeafPathsAsXMLFile(read, ToUTF16(file))) {
    std::cerr << "ovrameta: " << file << ": cannot read the field list (an md.paths document)" << std::endl;
    return false;
  }
  paths.assign(read.begin(), read.end());
  return true;
}

std::string FieldsText(const boost::shared_ptr<MetaDataProvider>& provider, const std::vector<Path>& paths) {
  MetaDataReadAccess reader(provider);
  XMPMetaRef xmp = *reader;
  std::ostringstream out;
  for (const Path& path : paths) {
    ValueNode node;
    const std::string name = NameOfPath(path);
    if (!xmp || !ReadValue(xmp, path, name, ReadOptions(), node)) continue;
    node.label = name;
    PrintNode(out, node, 0);
  }
  const std::string text = out.str();
  return text.empty() ? "(no values in these fields)\n" : text;
}

}  // namespace ovrameta
