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

#include "ToolkitOutput.h"
#include "XMPNodeTree.h"
#include "XMPPacket.h"
#include "files/Container.h"
#include "files/StoredPacket.h"

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

// Dates the toolkit derives from a movie header that holds none.
bool IsEmptyDerivedValue(const std::string& value, XMP_OptionBits options) {
  return !(options & kXMP_PropCompositeMask) && value.rfind("1904-01-01T00:00", 0) == 0;
}

}  // namespace

struct XMPFiles::State {
  std::string path;    // as given
  std::string target;  // absolute
  XMP_OptionBits openFlags = 0;
  bool open = false;
  bool sidecar = false;
  std::string refusal;
  bool unreadable = false;  // the stored packet does not parse
  std::vector<std::string> toolkitNotes;  // what the handler printed while reading
  mutable std::optional<XMP_FileFormat> format;

  // The file's layout and stored XMP; for an update, the original and
  // whether PutXMP left anything to write.
  std::unique_ptr<FileReplacement> replacement;
  std::unique_ptr<detail::FileReader> reader;
  std::unique_ptr<detail::Container> container;
  std::unique_ptr<detail::StoredPacket> stored;
  bool pending = false;

  bool ForUpdate() const { return (openFlags & kXMPFiles_OpenForUpdate) != 0; }
  bool Refuse(std::string why) {
    refusal = std::move(why);
    return false;
  }

  // Reads the structure of the file open as fd and its stored packet.
  bool Examine(int fd, std::uint64_t size) {
    try {
      reader = std::make_unique<detail::FileReader>(fd, size);
      std::optional<std::string> packet, extension;
      if (sidecar) {
        packet = reader->ReadText(0, size);
        if (packet->find_first_not_of(std::string(" \t\r\n\0", 5)) == std::string::npos) packet.reset();
      } else {
        container = detail::ContainerFor(*reader);
        std::string problem;
        if (!container->Walk(*reader, &problem)) return Refuse(problem);
        if (container->Packet()) packet = container->PacketText(*reader);
        extension = container->ExtensionText(*reader);
      }
      stored = std::make_unique<detail::StoredPacket>(std::move(packet), std::move(extension));
      return true;
    } catch (const detail::IOError& e) {
      return Refuse(SystemText(e));
    }
  }

  void Write();
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
    try {
      s.stored->Stored();
    } catch (const XMP_Error&) {
      // XMP nobody can read is never replaced.
      return s.Refuse("its XMP packet cannot be read, so it is left as it is");
    }
  }
  s.open = true;
  return true;
}

const std::string& XMPFiles::GetRefusal() const { return mState->refusal; }

bool XMPFiles::PacketUnreadable() const { return mState->unreadable; }

const std::vector<std::string>& XMPFiles::ToolkitNotes() const { return mState->toolkitNotes; }

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
  // A packet that does not parse hides nothing else: the metadata outside it
  // is still shown (no write may replace such a packet, see OpenFile). A
  // packet the checks refuse is kept from the toolkit's handler as well.
  bool handlerMayRead = true;
  s.unreadable = false;
  s.toolkitNotes.clear();
  try {
    shown = s.stored->TakeStored();
  } catch (const XMP_Error& e) {
    s.unreadable = true;
    s.refusal = "its XMP packet cannot be read";
    handlerMayRead = e.GetID() != kXMPErr_BadXMP;
  }
  bool any = s.stored->Exists() && !s.unreadable;
  // Only where there is native metadata, or where the layer does not know
  // the layout, does the toolkit's handler add anything.
  if (!s.sidecar && handlerMayRead && (s.container->HasNativeMetadata() || !s.container->KnowsLayout())) {
    // The handler's view: the stored packet merged with native metadata.
    const detail::ToolkitOutput output;
    {
      const detail::FileHandle file(xmp_files_open_new(s.target.c_str(), XMP_OPEN_READ));
      if (file) {
        XmpPtr merged = xmp_files_get_new_xmp(file.get());
        if (merged) {
          const XMPMeta view = detail::OwnPacket(merged);
          std::set<std::pair<std::string, std::string>> stored;
          for (detail::Key& key : detail::Properties(shown)) stored.emplace(std::move(key.ns), std::move(key.name));
          for (const detail::Key& key : detail::Properties(view)) {
            if (stored.count({key.ns, key.name})) continue;
            detail::Node node;
            if (!detail::ReadNode(view, key.ns, key.name, &node) || IsEmptyDerivedValue(node.value, node.options)) continue;
            detail::WriteNode(shown, key.ns, key.name, node);
            any = true;
          }
        }
      }
    }
    s.toolkitNotes = output.Lines();
  }
  if (!any) return false;
  XMPPacket& packet = detail::Require(xmpObj->GetInternalRef());
  packet.ReplaceXmp(detail::Require(shown.GetInternalRef()).Detach());
  packet.Marks().clear();
  packet.TrackChanges(XMPPacket::Tracking::kProperties);
  return true;
}

void XMPFiles::PutXMP(const XMPMeta& xmpObj) {
  State& s = *mState;
  if (!s.open) throw XMP_Error(kXMPErr_BadObject, "no file open");
  if (!s.ForUpdate()) throw XMP_Error(kXMPErr_BadObject, "file not opened for update");
  const XMPPacket& packet = detail::Require(xmpObj.GetInternalRef());
  // What to write: the changes since the packet was handed out, or, for a
  // packet from elsewhere, its properties over the stored ones.
  const std::vector<detail::PropertyText> now = detail::CachedTexts(xmpObj);
  std::vector<detail::Key> changed;
  if (packet.Tracked() == XMPPacket::Tracking::kProperties) {
    if (const auto* before = packet.BaselineProperties()) changed = detail::Differences(*before, now);
  } else {
    for (const detail::PropertyText& p : now)
      if (p.key.ns != kXMP_NS_Transient) changed.push_back(p.key);
  }
  s.pending = !changed.empty();
  if (s.pending) s.stored->Apply(xmpObj, now, changed, s.sidecar ? std::nullopt : s.container->PacketLimit());
}

void XMPFiles::State::Write() {
  const std::vector<std::string> candidates = stored->Candidates();
  detail::WritePlan plan;
  std::string problem = "the packet cannot be written";
  bool planned = false;
  if (sidecar) {
    plan.Insert(candidates.back());
    planned = true;
  } else {
    container->SetExtension(stored->NewExtension());
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
  const bool write = s.ForUpdate() && s.pending;
  s.pending = false;
  if (write) s.Write();
  s.replacement.reset();
  s.reader.reset();
  s.stored.reset();
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
