// Media files and sidecars: the stored packet read and written by the
// layer, the toolkit's handlers only for the native metadata shown beside
// it (see XMPFiles.h).
#include <ovraxmp/XMPFiles.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <set>
#include <system_error>

#include <ovracore/SafeWrite.h>
#include <ovraxmp/XMPIterator.h>
#include <ovraxmp/XMPUtils.h>

#include "XMPNodeTree.h"
#include "XMPPacket.h"
#include "files/Container.h"
#include "files/PacketEditor.h"
#include "files/PacketScan.h"

namespace ovraxmp {
namespace {

namespace fs = std::filesystem;
using ovracore::filesupport::FileReplacement;

fs::path PathOf(const std::string& utf8) { return fs::u8path(utf8); }

bool IsRegularFile(const std::string& utf8) {
  std::error_code ec;
  return !utf8.empty() && fs::is_regular_file(PathOf(utf8), ec);
}

// The toolkit's file handlers mishandle relative paths with a folder part
// ("c/x.jpg"): they only ever see absolute ones, resolved the way the
// system resolves them ("link/.." is not simply dropped).
std::string AbsolutePath(const std::string& utf8) {
  std::error_code ec;
  const fs::path resolved = fs::weakly_canonical(PathOf(utf8), ec);
  if (!ec) return resolved.u8string();
  const fs::path absolute = fs::absolute(PathOf(utf8), ec);
  return ec ? utf8 : absolute.lexically_normal().u8string();
}

bool IsSidecarPath(const std::string& utf8) {
  std::string ext = PathOf(utf8).extension().u8string();
  for (char& c : ext) c = static_cast<char>(c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c);
  return ext == ".xmp";
}

std::string SystemText(const detail::IOError& e) {
  return e.Error() ? std::string(e.what()) + ": " + std::generic_category().message(e.Error()) : e.what();
}

// An open descriptor, closed when it goes.
class Descriptor {
 public:
  explicit Descriptor(int fd) : mFd(fd) {}
  ~Descriptor() {
    if (mFd >= 0) ::close(mFd);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  int get() const { return mFd; }

 private:
  int mFd;
};

// A holder of a fresh packet whose only reference it keeps.
XMPMeta OwnPacket(XmpPtr xmp) {
  XMPPacket* packet = detail::NewPacket(xmp);
  XMPMeta meta(packet);
  XMPMetaRefRelease(packet);
  return meta;
}

using Key = detail::TopLevel;  // namespace URI, "prefix:name"

std::string LocalName(const std::string& name) {
  const std::size_t colon = name.find(':');
  return colon == std::string::npos ? name : name.substr(colon + 1);
}

std::vector<Key> Properties(const XMPMeta& meta) {
  std::vector<Key> keys = detail::TopLevelProperties(meta);
  keys.erase(std::remove_if(keys.begin(), keys.end(), [](const Key& k) { return k.ns == kXMP_NS_Transient; }),
             keys.end());
  return keys;
}

std::optional<std::string> CanonicalOf(const XMPMeta& meta, const Key& key) {
  detail::Node node;
  if (!detail::ReadNode(meta, key.ns, key.name, &node)) return std::nullopt;
  return detail::Canonical(node);
}

// The top-level properties that differ between two packets.
std::vector<Key> Differences(const XMPMeta& before, const XMPMeta& after) {
  std::vector<Key> keys = Properties(before);
  for (const Key& key : Properties(after)) {
    if (std::none_of(keys.begin(), keys.end(), [&](const Key& k) { return k.ns == key.ns && k.name == key.name; }))
      keys.push_back(key);
  }
  std::vector<Key> changed;
  for (const Key& key : keys)
    if (CanonicalOf(before, key) != CanonicalOf(after, key)) changed.push_back(key);
  return changed;
}

// One property as RDF/XML, written by the toolkit's serialiser.
detail::Fragment FragmentOf(const XMPMeta& source, const Key& key) {
  detail::Node node;
  detail::ReadNode(source, key.ns, key.name, &node);
  XMPMeta single;
  detail::WriteNode(single, key.ns, key.name, node);
  std::string text;
  single.SerializeToBuffer(&text, kXMP_OmitPacketWrapper);
  detail::Fragment fragment;
  const std::size_t description = text.find("<rdf:Description");
  const std::size_t open = text.find('>', description);
  const std::size_t close = text.rfind("</rdf:Description>");
  if (description == std::string::npos || open == std::string::npos || close == std::string::npos || close < open)
    throw XMP_Error(kXMPErr_BadSerialize, "writing \"" + key.name + "\"");
  const std::string tag = text.substr(description, open - description);
  for (std::size_t at = 0; (at = tag.find("xmlns:", at)) != std::string::npos;) {
    const std::size_t equals = tag.find('=', at);
    const char quote = tag[equals + 1];
    const std::size_t end = tag.find(quote, equals + 2);
    fragment.namespaces.emplace_back(tag.substr(at + 6, equals - at - 6), tag.substr(equals + 2, end - equals - 2));
    at = end;
  }
  fragment.namespaces.emplace_back("rdf", kXMP_NS_RDF);
  fragment.text = text.substr(open + 1, close - open - 1);
  const std::size_t first = fragment.text.find('<');
  const std::size_t lineStart = fragment.text.rfind('\n', first);
  fragment.text.erase(0, lineStart == std::string::npos ? 0 : lineStart + 1);
  fragment.text.erase(fragment.text.find_last_not_of(" \t\r\n") + 1);
  return fragment;
}

// Dates the toolkit derives from a movie header that holds none.
bool IsEmptyDerivedValue(const detail::Node& node) {
  return !(node.options & kXMP_PropCompositeMask) && node.value.rfind("1904-01-01T00:00", 0) == 0;
}

}  // namespace

struct XMPFiles::State {
  std::string path;    // as given
  std::string target;  // absolute
  XMP_OptionBits openFlags = 0;
  bool open = false;
  bool sidecar = false;
  std::string refusal;
  mutable std::optional<XMP_FileFormat> format;

  // Update: the original, its layout and what CloseFile writes.
  std::unique_ptr<FileReplacement> replacement;
  std::unique_ptr<detail::FileReader> reader;
  std::unique_ptr<detail::Container> container;
  std::optional<std::string> stored;  // the stored packet
  std::unique_ptr<detail::PacketEditor> editor;
  std::optional<std::string> whole;   // a packet written whole
  std::optional<XMPMeta> expected;    // what the written packet must read back as
  std::vector<Key> changed;
  std::vector<std::pair<Key, detail::Fragment>> fragments;  // what the editor puts in

  bool ForUpdate() const { return (openFlags & kXMPFiles_OpenForUpdate) != 0; }
  bool Refuse(std::string why) {
    refusal = std::move(why);
    return false;
  }

  // Reads the structure of the file open as fd and its stored packet.
  bool Examine(int fd, std::uint64_t size) {
    try {
      reader = std::make_unique<detail::FileReader>(fd, size);
      if (sidecar) {
        stored = reader->ReadText(0, size);
        if (stored->find_first_not_of(std::string(" \t\r\n\0", 5)) == std::string::npos) stored.reset();
        return true;
      }
      container = detail::ContainerFor(*reader);
      std::string problem;
      if (!container->Walk(*reader, &problem)) return Refuse(problem);
      if (container->Packet()) stored = container->PacketText(*reader);
      return true;
    } catch (const detail::IOError& e) {
      return Refuse(SystemText(e));
    }
  }

  void Write();
  std::vector<std::string> Misread(const std::string& text) const;
};

XMPFiles::XMPFiles() : mState(std::make_unique<State>()) {}

XMPFiles::XMPFiles(const std::string& filePath, XMP_FileFormat format, XMP_OptionBits openFlags) : XMPFiles() {
  if (!OpenFile(filePath, format, openFlags))
    throw XMP_Error(kXMPErr_BadFileFormat, mState->refusal.empty() ? "OpenFile returned false" : mState->refusal);
}

XMPFiles::~XMPFiles() = default;

bool XMPFiles::OpenFile(const std::string& filePath, XMP_FileFormat format, XMP_OptionBits openFlags) {
  if (mState->open) throw XMP_Error(kXMPErr_BadObject, "a file is already open");
  detail::EnsureStarted();
  *mState = State();
  State& s = *mState;
  s.path = filePath;
  s.openFlags = openFlags;
  if (!IsRegularFile(filePath)) return s.Refuse("no such file");
  s.target = AbsolutePath(filePath);
  s.sidecar = IsSidecarPath(filePath);
  if (format != kXMP_UnknownFile && format != CheckFileFormat(filePath)) return s.Refuse("not of the format asked for");
  if (s.ForUpdate()) {
    s.replacement = std::make_unique<FileReplacement>();
    std::string problem;
    if (!s.replacement->Open(s.target, false, &problem)) return s.Refuse(problem);
    if (!s.Examine(s.replacement->ReadFD(), s.replacement->OriginalSize())) return false;
  }
  s.open = true;
  return true;
}

const std::string& XMPFiles::GetRefusal() const { return mState->refusal; }

bool XMPFiles::GetFileInfo(std::string* filePath, XMP_OptionBits* openFlags, XMP_FileFormat* format) const {
  const State& s = *mState;
  if (!s.open) return false;
  if (filePath) *filePath = s.path;
  if (openFlags) *openFlags = s.openFlags;
  if (format) {
    if (!s.format) s.format = s.sidecar ? kXMP_XMLFile : CheckFileFormat(s.target);
    *format = *s.format;
  }
  return true;
}

bool XMPFiles::GetXMP(XMPMeta* xmpObj) {
  State& s = *mState;
  if (!s.open) throw XMP_Error(kXMPErr_BadObject, "no file open");
  if (!xmpObj) throw XMP_Error(kXMPErr_BadParam, "no XMP object");
  if (!s.ForUpdate()) {
    const Descriptor fd(::open(s.target.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
    struct stat info {};
    if (fd.get() < 0 || ::fstat(fd.get(), &info) != 0)
      throw XMP_Error(kXMPErr_ExternalFailure, "cannot read the file: " + std::generic_category().message(errno));
    const bool examined = s.Examine(fd.get(), static_cast<std::uint64_t>(info.st_size));
    s.reader.reset();
    if (!examined) return false;
  }
  if (!s.refusal.empty()) return false;

  XMPMeta shown;
  if (s.stored) {
    try {
      shown.ParseFromBuffer(*s.stored);
    } catch (const XMP_Error&) {
      // A packet that does not parse is XMP nobody can read, and that no
      // write may replace.
      s.refusal = "its XMP packet cannot be read";
      return false;
    }
  }
  bool any = s.stored.has_value();
  if (!s.sidecar && (!s.stored || s.container->HasNativeMetadata())) {
    // The handler's view: the stored packet merged with native metadata.
    XmpFilePtr file = xmp_files_open_new(s.target.c_str(), XMP_OPEN_READ);
    if (file) {
      XmpPtr merged = xmp_files_get_new_xmp(file);
      xmp_files_close(file, XMP_CLOSE_NOOPTION);
      xmp_files_free(file);
      if (merged) {
        const XMPMeta view = OwnPacket(merged);
        for (const Key& key : Properties(view)) {
          if (shown.DoesPropertyExist(key.ns, key.name)) continue;
          detail::Node node;
          if (!detail::ReadNode(view, key.ns, key.name, &node) || IsEmptyDerivedValue(node)) continue;
          detail::WriteNode(shown, key.ns, key.name, node);
          any = true;
        }
      }
    }
  }
  if (!any) return false;
  XMPPacket& packet = detail::Require(xmpObj->GetInternalRef());
  packet.ReplaceXmp(detail::Require(shown.GetInternalRef()).Detach());
  packet.Marks().clear();
  packet.TrackChanges();
  return true;
}

void XMPFiles::PutXMP(const XMPMeta& xmpObj) {
  State& s = *mState;
  if (!s.open) throw XMP_Error(kXMPErr_BadObject, "no file open");
  if (!s.ForUpdate()) throw XMP_Error(kXMPErr_BadObject, "file not opened for update");
  const XMPPacket& packet = detail::Require(xmpObj.GetInternalRef());
  s.editor.reset();
  s.whole.reset();
  s.expected.reset();
  s.fragments.clear();

  // What to write: the changes since the packet was handed out, or, for a
  // packet from elsewhere, its properties over the stored ones.
  std::vector<Key> changed;
  std::set<std::pair<std::string, std::string>> removed;
  if (packet.Tracked()) {
    if (packet.Baseline()) {
      const XMPMeta before = OwnPacket(detail::DeepCopy(packet.Baseline()));
      changed = Differences(before, xmpObj);
    }
  } else {
    changed = Properties(xmpObj);
  }
  if (changed.empty()) return;

  XMPMeta expected;
  if (s.stored) {
    try {
      expected.ParseFromBuffer(*s.stored);
    } catch (const XMP_Error& e) {
      throw XMP_Error(kXMPErr_BadXMP, std::string("its XMP packet cannot be read, so it is left as it is (") +
                                        e.GetErrMsg() + ")");
    }
  }
  for (const Key& key : changed) {
    detail::Node node;
    if (detail::ReadNode(xmpObj, key.ns, key.name, &node)) {
      detail::WriteNode(expected, key.ns, key.name, node);
    } else {
      expected.DeleteProperty(key.ns, key.name);
    }
  }
  if (s.stored) {
    auto editor = std::make_unique<detail::PacketEditor>();
    std::string problem;
    if (editor->Load(*s.stored, &problem) && editor->Editable()) {
      for (const Key& key : changed) {
        if (xmpObj.DoesPropertyExist(key.ns, key.name)) {
          s.fragments.emplace_back(key, FragmentOf(xmpObj, key));
          editor->Put(key.ns, LocalName(key.name), s.fragments.back().second);
        } else {
          editor->Remove(key.ns, LocalName(key.name));
        }
      }
      s.editor = std::move(editor);
    }
  }
  if (!s.editor) {
    // No stored packet, or one written in a form edits cannot follow: the
    // packet is written whole.
    std::string text;
    expected.SerializeToBuffer(&text, 0, 0);
    s.whole = std::move(text);
  }
  s.expected = std::move(expected);
  s.changed = std::move(changed);
}

// The properties the written packet would not read back as intended. A
// packet written whole must read back as expected. An edited one is
// checked in parts, since the toolkit's reader normalises some packets as a
// whole (an rdf:about "uuid:..." also reads as xmpMM:InstanceID): every
// property left alone reads back as it read before, and every fragment put
// in reads, on its own, as the property it stands for.
std::vector<std::string> XMPFiles::State::Misread(const std::string& text) const {
  XMPMeta check;
  check.ParseFromBuffer(text);
  std::vector<std::string> wrong;
  if (!editor) {
    for (const Key& key : Differences(check, *expected)) wrong.push_back(key.name);
    return wrong;
  }
  const auto isChanged = [&](const Key& key) {
    return std::any_of(changed.begin(), changed.end(), [&](const Key& k) { return k.ns == key.ns && k.name == key.name; });
  };
  XMPMeta before;
  before.ParseFromBuffer(*stored);
  for (const Key& key : Differences(before, check)) {
    if (!isChanged(key)) wrong.push_back(key.name);
  }
  for (const Key& key : changed) {
    if (check.DoesPropertyExist(key.ns, key.name) != expected->DoesPropertyExist(key.ns, key.name))
      wrong.push_back(key.name);
  }
  for (const auto& [key, fragment] : fragments) {
    std::string alone = "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"" + std::string(kXMP_NS_RDF) +
                        "\"><rdf:Description rdf:about=\"\"";
    for (const auto& ns : fragment.namespaces) {
      if (ns.first != "rdf") alone += " xmlns:" + ns.first + "=\"" + ns.second + "\"";
    }
    alone += ">" + fragment.text + "</rdf:Description></rdf:RDF></x:xmpmeta>";
    XMPMeta single;
    single.ParseFromBuffer(alone);
    if (CanonicalOf(single, key) != CanonicalOf(*expected, key)) wrong.push_back(key.name);
  }
  return wrong;
}

void XMPFiles::State::Write() {
  std::vector<std::string> candidates;  // the packet at its old length first
  if (editor) {
    if (stored && !sidecar) {
      if (auto same = editor->Render(stored->size())) candidates.push_back(std::move(*same));
    }
    if (auto grown = editor->Render(std::nullopt)) candidates.push_back(std::move(*grown));
    if (candidates.empty()) throw XMP_Error(kXMPErr_InternalFailure, "the XMP packet could not be edited");
  } else {
    if (stored && !sidecar) {
      std::string same;
      try {
        expected->SerializeToBuffer(&same, kXMP_ExactPacketLength, static_cast<std::uint32_t>(stored->size()));
        candidates.push_back(std::move(same));
      } catch (const XMP_Error&) {
        // Too long for the old place: the grown packet below.
      }
    }
    candidates.push_back(*whole);
  }
  // What is written must read back as the stored packet with the changes.
  const std::vector<std::string> wrong = Misread(candidates.back());
  if (!wrong.empty()) {
    std::string names;
    for (const std::string& name : wrong) names += (names.empty() ? "" : ", ") + name;
    throw XMP_Error(kXMPErr_InternalFailure, "the edited XMP did not read back as written (" + names +
                                               "), so the file is left as it is");
  }

  detail::WritePlan plan;
  std::string problem = "the packet cannot be written";
  bool planned = false;
  if (sidecar) {
    plan.Insert(candidates.back());
    planned = true;
  } else {
    for (const std::string& text : candidates) {
      detail::WritePlan attempt;
      if (container->PlanWrite(*reader, text, &attempt, &problem)) {
        plan = std::move(attempt);
        planned = true;
        break;
      }
    }
  }
  if (!planned) throw XMP_Error(kXMPErr_Unimplemented, problem);
  if (!replacement->Begin(plan.Size(), &problem) || !plan.Execute(*replacement, &problem) ||
      !replacement->Commit(&problem))
    throw XMP_Error(kXMPErr_ExternalFailure, problem);
}

void XMPFiles::CloseFile(XMP_OptionBits) {
  State& s = *mState;
  if (!s.open) return;
  s.open = false;
  const bool write = s.ForUpdate() && s.expected.has_value();
  if (write) s.Write();
  s.replacement.reset();
  s.reader.reset();
  s.editor.reset();
  s.expected.reset();
}

std::string XMPFiles::GetVersionInfo() {
  return std::string("Exempi ") + OVRAXMP_EXEMPI_VERSION + ", XMP Files with " + XMPMeta::GetVersionInfo();
}

XMP_FileFormat XMPFiles::CheckFileFormat(const std::string& filePath) {
  if (!IsRegularFile(filePath)) return kXMP_UnknownFile;
  if (IsSidecarPath(filePath)) return kXMP_XMLFile;
  detail::EnsureStarted();
  return static_cast<XMP_FileFormat>(xmp_files_check_file_format(AbsolutePath(filePath).c_str()));
}

bool XMPFiles::GetAssociatedResources(const std::string& filePath, std::vector<std::string>* resourceList,
                                      XMP_FileFormat, XMP_OptionBits) {
  if (!resourceList) throw XMP_Error(kXMPErr_BadParam, "no resource list");
  if (!IsRegularFile(filePath)) return false;
  resourceList->push_back(filePath);
  if (IsSidecarPath(filePath)) return true;
  const fs::path sidecar = PathOf(filePath).replace_extension(".xmp");
  std::error_code ec;
  if (fs::is_regular_file(sidecar, ec)) resourceList->push_back(sidecar.u8string());
  return true;
}

}  // namespace ovraxmp
