// Path lists (the leaf properties a user chose to show) and the rules that
// decide which properties panels show at all.
#include <memory>
#include <string_view>

#include <ovracore/SAXParser.h>
#include <ovracore/Strings.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

using namespace std::string_view_literals;

namespace {

const char* const kMetadataPathStr = "metadata_path";
const char* const kInternalStr = "internal";
const char* const kNamespaceStr = "namespace";
const char* const kDescriptionStr = "description";
const char* const kEntryNameStr = "entry_name";
const char* const kParentIDStr = "parent_id";
const char* const kTrueStr = "true";

// Changed from the thread that drives the user interface only.
std::set<Path> sBlacklistedByClient;

void Member(UTF8String& out, const char* name, std::string_view value) {
  out += '<';
  out += name;
  out += '>';
  out += ovracore::EncodeXMLReserved(value);
  out += "</";
  out += name;
  out += ">\n";
}

// Collects each metadata_path's members; a path is kept when it still has a
// definition and is a leaf.
class MetadataPrefsXMLHandler : public ovracore::AbstractParseHandler {
 public:
  explicit MetadataPrefsXMLHandler(std::set<Path>& paths) : mPaths(paths) {}

  void StartElementNoNamespace(const UTF8String& name, const ovracore::Attributes&) override {
    if (name == kMetadataPathStr) {
      for (UTF8String* buffer : {&mInternal, &mNamespace, &mDescription, &mEntryName, &mParentID}) buffer->clear();
      return;
    }
    if (name == kInternalStr) mCurrent = &mInternal;
    else if (name == kNamespaceStr) mCurrent = &mNamespace;
    else if (name == kDescriptionStr) mCurrent = &mDescription;
    else if (name == kEntryNameStr) mCurrent = &mEntryName;
    else if (name == kParentIDStr) mCurrent = &mParentID;
  }
  void EndElementNoNamespace(const UTF8String& name) override {
    mCurrent = nullptr;
    if (name != kMetadataPathStr) return;
    Path path;
    path.internal = mInternal == kTrueStr;
    path.namespaceURI = mNamespace;
    path.description = mDescription;
    path.entry_name = mEntryName;
    path.parent_id = mParentID;
    if (PathEntryDefinition(path) && IsPathLeaf(path)) mPaths.insert(path);
  }
  // Text outside the five members is not collected.
  void Characters(const UTF8String& text) override {
    if (mCurrent) *mCurrent += text;
  }

 private:
  std::set<Path>& mPaths;
  UTF8String mInternal, mNamespace, mDescription, mEntryName, mParentID;
  UTF8String* mCurrent = nullptr;
};

template <class Run>
bool ReadPaths(std::set<Path>& paths, Run run) {
  try {
    MetadataPrefsXMLHandler handler(paths);
    const std::unique_ptr<ovracore::Parser> parser = ovracore::GetParserWithNamespaceSupport(handler);
    return run(*parser);
  } catch (...) {
    return false;
  }
}

// Looked up each time: the namespace is known only once the library runs.
Path ToneCurve() {
  Path path;
  path.namespaceURI = StandardSchemaNamespace(kStandardSchema_rwset);
  path.description = "ToneCurve";
  return path;
}

bool SameLocation(const Path& a, const Path& b) { return !(a < b) && !(b < a); }

}  // namespace

void PathAsXMLFragment(UTF8String& out, const Path& path) {
  out.clear();
  out += "<metadata_path>";
  Member(out, kInternalStr, path.internal ? "true" : "false");
  Member(out, kNamespaceStr, path.namespaceURI);
  Member(out, kDescriptionStr, path.description);
  Member(out, kEntryNameStr, path.entry_name);
  Member(out, kParentIDStr, path.parent_id);
  out += "</metadata_path>\n";
}

void IncludedLeafPathsAsXMLString(const std::set<Path>& paths, UTF8String& out) {
  out.clear();
  out += "<?xml version='1.0'?>\n<md.paths version='1.0'>\n";
  UTF8String fragment;
  for (const Path& path : paths) {
    PathAsXMLFragment(fragment, path);
    out += fragment;
  }
  out += "</md.paths>\n";
}

bool ReadIncludedLeafPathsAsXMLString(std::set<Path>& paths, const UTF8String& document) {
  return ReadPaths(paths, [&](ovracore::Parser& parser) { return parser.ParseBuffer(document); });
}

bool ReadIncludedLeafPathsAsXMLFile(std::set<Path>& paths, const UTF16String& file) {
  return ReadPaths(paths, [&](ovracore::Parser& parser) { return parser.ParseFile(file); });
}

void BlacklistPropertyForClient(const Path& path, bool blocked) {
  if (blocked) {
    sBlacklistedByClient.insert(path);
  } else {
    sBlacklistedByClient.erase(path);
  }
}

bool IsPropertyBlacklistedByClient(const Path& path) { return sBlacklistedByClient.count(path) != 0; }

bool IsPropertyBlacklistedInternally(const Path& path) {
  const Path toneCurve = ToneCurve();
  return !toneCurve.namespaceURI.empty() && SameLocation(path, toneCurve);
}

bool IsPropertyUISupported(const Path& path) {
  if (IsPropertyBlacklistedByClient(path) || IsPropertyBlacklistedInternally(path)) return false;
  const boost::optional<PrimitiveType> primitive = PrimitiveTypeOfPath(path);
  if (!primitive || (*primitive != kPrimitiveType_openchoice && *primitive != kPrimitiveType_closedchoice &&
                     *primitive != kPrimitiveType_alt))
    return true;
  const boost::shared_ptr<EntryDefinition> entry = PathEntryDefinition(path);
  if (!entry) return false;
  boost::optional<UTF8String> elementType = entry->constraints.elementType;
  if (!elementType) {
    if (!entry->type) return false;
    const TypeDefinitionPtr named = TypeIdDefinition(*entry->type);
    if (named) elementType = named->constraints.elementType;
    if (!elementType) return false;
  }
  return DoesElementConformToContainer(*elementType);
}

}  // namespace ovrametadata
