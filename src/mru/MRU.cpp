// Recently used values and their file, read and written with
// Boost.PropertyTree's XML parser and writer.
#include <sstream>

#include <boost/property_tree/ptree.hpp>
#include <boost/property_tree/xml_parser.hpp>

#include <ovracore/FileSupport.h>
#include <ovracore/Strings.h>
#include <ovrametadata/MRU.h>

namespace ovrametadata {

namespace {

namespace pt = boost::property_tree;
namespace fs = ovracore::filesupport;

const char* const kPropsheetNamespace = "http://ns.ovrametadata.org/xmp/propsheet/";
const char16_t* const kMRUFolder = u"Orlex/XMP/Propsheet/";
const char16_t* const kMRUFileName = u"PropsheetMRU.xml";
// Far beyond any list a person types; a guard against a file that is not one.
constexpr std::size_t kMaxFileBytes = 64u * 1024u * 1024u;

// The caller serialises its use of the lists.
MRULists sMruLists;

UTF16String MRUFilePath() {
  const UTF16String folder = MRUDirectory();
  return folder.empty() ? UTF16String() : fs::Dir(folder).FileNamed(kMRUFileName).FullPath();
}

}  // namespace

MRULists GetMRULists() { return sMruLists; }

void UpdateMRULists(UTF8String key, std::list<UTF16String> values) { sMruLists[std::move(key)] = std::move(values); }

void ClearMRUList() { sMruLists.clear(); }

void LoadMRUFile() {
  try {
    const UTF16String folder = MRUDirectory();
    if (folder.empty() || !fs::FileUtils::EnsureDirectoryExists(fs::Dir(folder))) return;
    const UTF16String path = MRUFilePath();
    if (!fs::File(path).Exists()) return;
    const std::optional<std::string> contents = fs::ReadFileToString(path, kMaxFileBytes);
    if (!contents) return;
    std::istringstream in(*contents);
    pt::ptree tree;
    pt::read_xml(in, tree);
    // Everything is read before anything in memory changes.
    MRULists read;
    for (const auto& [name, list] : tree.get_child("xps:propsheet").get_child("xps:mruLists")) {
      if (name != "xps:mruList") continue;
      const boost::optional<std::string> key = list.get_optional<std::string>("<xmlattr>.key");
      if (!key) continue;
      std::list<UTF16String>& values = read[*key];
      for (const auto& [itemName, item] : list)
        if (itemName == "item") values.push_back(ovracore::ToUTF16(item.data()));
    }
    for (auto& [key, values] : read) sMruLists[key] = std::move(values);
  } catch (...) {
    // A file that is not a list file leaves the lists as they were.
  }
}

bool SerializeMRUList() {
  try {
    const UTF16String folder = MRUDirectory();
    if (folder.empty() || !fs::FileUtils::EnsureDirectoryExists(fs::Dir(folder))) return false;
    // Children are appended in place: adding by path parses the path for
    // each of thousands of items, and a subtree handed over is copied.
    const auto child = [](pt::ptree& parent, const char* name) -> pt::ptree& {
      return parent.push_back({name, pt::ptree()})->second;
    };
    pt::ptree tree;
    pt::ptree& root = child(tree, "xps:propsheet");
    child(child(root, "<xmlattr>"), "xmlns:xps").data() = kPropsheetNamespace;
    pt::ptree& lists = child(root, "xps:mruLists");
    for (const auto& [key, values] : sMruLists) {
      pt::ptree& list = child(lists, "xps:mruList");
      child(child(list, "<xmlattr>"), "key").data() = key;
      for (const UTF16String& value : values) child(list, "item").data() = ovracore::ToUTF8(value);
    }
    std::ostringstream out;
    pt::write_xml(out, tree, pt::xml_writer_make_settings<std::string>(' ', 0, "utf-8"));
    return fs::SafeSave(MRUFilePath(), out.str());
  } catch (...) {
    return false;
  }
}

bool RemoveMRUFile() {
  const UTF16String folder = MRUDirectory();
  if (folder.empty() || !fs::FileUtils::EnsureDirectoryExists(fs::Dir(folder))) return false;
  std::error_code ec;
  return std::filesystem::remove(fs::File(MRUFilePath()).FSPath(), ec);
}

UTF16String MRUDirectory() {
  try {
    return fs::ApplicationSupportFolder_User().SubDir(kMRUFolder).FullPath();
  } catch (...) {
    return {};
  }
}

}  // namespace ovrametadata
