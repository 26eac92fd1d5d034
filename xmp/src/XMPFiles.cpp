// Media files through the toolkit's handlers; .xmp sidecars by the layer.
#include <ovraxmp/XMPFiles.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <utility>

#include <ovracore/FileSupport.h>
#include <ovracore/Strings.h>
#include <ovraxmp/XMPUtils.h>

#include "XMPPacket.h"
#include "XMPScan.h"

namespace ovraxmp {
namespace {

namespace fs = std::filesystem;

XmpFilePtr F(void* file) { return static_cast<XmpFilePtr>(file); }

fs::path PathOf(const std::string& utf8) { return fs::u8path(utf8); }

bool IsRegularFile(const std::string& utf8) {
  std::error_code ec;
  return !utf8.empty() && fs::is_regular_file(PathOf(utf8), ec);
}

// The toolkit's file handlers mishandle relative paths with a folder part
// ("c/x.jpg"): they only ever see absolute ones, resolved the way the
// system resolves them ("link/.." is not simply dropped).
std::string ToolkitPath(const std::string& utf8) {
  std::error_code ec;
  const fs::path resolved = fs::weakly_canonical(PathOf(utf8), ec);
  if (!ec) return resolved.u8string();
  const fs::path absolute = fs::absolute(PathOf(utf8), ec);
  return ec ? utf8 : absolute.lexically_normal().u8string();
}

// A copy of the file beside it (same folder, so that a rename replaces the
// original atomically; same extension, which the handlers look at), with
// the original's permission bits. Empty when it cannot be made.
std::string CopyBeside(const std::string& target) {
  const fs::path path = PathOf(target);
  const std::string ext = path.extension().u8string();
  std::string name = (path.parent_path() / ("." + path.filename().u8string() + ".ovra-XXXXXX" + ext)).u8string();
  const int out = ::mkstemps(name.data(), static_cast<int>(ext.size()));
  if (out < 0) return std::string();
  bool ok = false;
  const int in = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  struct stat info {};
  if (in >= 0 && ::fstat(in, &info) == 0) {
    ok = ::fchmod(out, info.st_mode & 07777) == 0;
    // Sized to the file (at most 1 MiB) and left uninitialised: filling it
    // cost more than the copy itself for small files.
    const std::size_t size = static_cast<std::size_t>(
        std::clamp<off_t>(info.st_size, off_t(4096), off_t(1) << 20));
    const std::unique_ptr<char[]> buffer(new char[size]);
    for (ssize_t got; ok && (got = ::read(in, buffer.get(), size)) != 0;) {
      if (got < 0) {
        ok = errno == EINTR;
        continue;
      }
      for (ssize_t done = 0; ok && done < got;) {
        const ssize_t put = ::write(out, buffer.get() + done, static_cast<std::size_t>(got - done));
        if (put < 0) {
          ok = errno == EINTR;
        } else {
          done += put;
        }
      }
    }
  }
  if (in >= 0) ::close(in);
  if (::close(out) != 0) ok = false;
  if (!ok) {
    ::unlink(name.c_str());
    return std::string();
  }
  return name;
}

bool SyncFile(const std::string& utf8) {
  const int fd = ::open(PathOf(utf8).c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  const bool ok = ::fsync(fd) == 0;
  return ::close(fd) == 0 && ok;
}

bool IsSidecarPath(const std::string& utf8) {
  std::string ext = PathOf(utf8).extension().u8string();
  for (char& c : ext)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  return ext == ".xmp";
}

constexpr XMP_OptionBits kSidecarHandlerFlags = kXMPFiles_CanInjectXMP | kXMPFiles_CanExpand |
                                                kXMPFiles_CanRewrite | kXMPFiles_AllowsOnlyXMP |
                                                kXMPFiles_ReturnsRawPacket | kXMPFiles_AllowsSafeUpdate;

// The packet without its transient data, as a file must receive it.
XMPMeta WithoutTransient(const XMPMeta& xmpObj) {
  if (!xmpObj.DoesPropertyExist(kXMP_NS_Transient, "MultiFileCount") &&
      !xmpObj.DoesPropertyExist(kXMP_NS_Transient, "DeletedProperties")) {
    bool any = false;
    if (detail::NamespaceKnown(kXMP_NS_Transient)) {
      XmpIteratorPtr it = xmp_iterator_new(detail::Require(xmpObj.GetInternalRef()).Xmp(), kXMP_NS_Transient,
                                           nullptr, XMP_ITER_JUSTCHILDREN);
      any = it && xmp_iterator_next(it, nullptr, nullptr, nullptr, nullptr);
      if (it) xmp_iterator_free(it);
    }
    if (!any) return xmpObj;
  }
  XMPMeta copy = xmpObj.Clone();
  XMPUtils::RemoveProperties(&copy, kXMP_NS_Transient, std::string(), kXMPUtil_DoAllProperties);
  return copy;
}

}  // namespace

XMPFiles::XMPFiles(const std::string& filePath, XMP_FileFormat format, XMP_OptionBits openFlags) {
  if (!OpenFile(filePath, format, openFlags)) throw XMP_Error(kXMPErr_BadFileFormat, "OpenFile returned false");
}

XMPFiles::~XMPFiles() {
  if (mFile) xmp_files_free(F(mFile));
  if (!mWorkCopy.empty()) ::unlink(PathOf(mWorkCopy).c_str());
}

bool XMPFiles::OpenFile(const std::string& filePath, XMP_FileFormat format, XMP_OptionBits openFlags) {
  if (mOpen) detail::Throw(kXMPErr_BadObject, "a file is already open");
  detail::EnsureStarted();
  if (!IsRegularFile(filePath)) return false;
  const bool forUpdate = (openFlags & kXMPFiles_OpenForUpdate) != 0;
  const auto markOpen = [&](std::string refusal) {
    mRefusal = std::move(refusal);
    mOpen = true;
    mPath = filePath;
    mOpenFlags = openFlags;
    mHasPending = false;
    mPending.clear();
    return true;
  };
  if (IsSidecarPath(filePath)) {
    if (access(PathOf(filePath).c_str(), forUpdate ? (R_OK | W_OK) : R_OK) != 0) return false;
    mSidecar = true;
    mFormat = kXMP_XMLFile;
    mHandlerFlags = kSidecarHandlerFlags;
  } else {
    if (format != kXMP_UnknownFile && format != XMPFiles::CheckFileFormat(filePath)) return false;
    std::string problem;
    if (!detail::MediaFileIsSane(filePath, &problem)) {
      // The handlers would crash, hang or exhaust memory on this file, or
      // silently replace XMP they could not read: it is never handed to
      // them. Read, it answers its format and has no XMP; it is never
      // opened for update.
      if (forUpdate) return false;
      mFile = nullptr;
      mSidecar = false;
      mFormat = XMPFiles::CheckFileFormat(filePath);
      mHandlerFlags = 0;
      if (mFormat != kXMP_UnknownFile) XMPFiles::GetFormatInfo(mFormat, &mHandlerFlags);
      return markOpen(problem);
    }
    // An update goes to a copy beside the file, which replaces the original
    // in one rename at close: a failed or interrupted write leaves the
    // original as it was. (The toolkit's own safe update moves the original
    // aside first, so an interruption can leave nothing under its name.)
    // Formats spread over folders, or whose handler cannot rewrite a whole
    // file, are updated by the handler in place.
    std::string target = ToolkitPath(filePath);
    std::string workCopy;
    if (forUpdate) {
      if (access(PathOf(target).c_str(), W_OK) != 0) return false;
      XMP_OptionBits handler = 0;
      if (GetFormatInfo(CheckFileFormat(target), &handler) && (handler & kXMPFiles_AllowsSafeUpdate) &&
          !(handler & kXMPFiles_FolderBasedFormat)) {
        workCopy = CopyBeside(target);
        if (workCopy.empty()) return false;
      }
    }
    XmpFilePtr file = xmp_files_new();
    if (!file) {
      if (!workCopy.empty()) ::unlink(PathOf(workCopy).c_str());
      detail::ThrowLastError(kXMPErr_NoMemory, "creating a file object");
    }
    const std::string& toolkitPath = workCopy.empty() ? target : workCopy;
    if (!xmp_files_open(file, toolkitPath.c_str(), static_cast<XmpOpenFileOptions>(openFlags))) {
      xmp_files_free(file);
      if (!workCopy.empty()) ::unlink(PathOf(workCopy).c_str());
      return false;
    }
    mWorkCopy = workCopy;
    mTarget = target;
    mPut = false;
    // The toolkit stores flag combinations outside the enums' ranges: read
    // them as plain integers.
    std::uint32_t options = 0, type = XMP_FT_UNKNOWN, handler = 0;
    if (!xmp_files_get_file_info(file, nullptr, reinterpret_cast<XmpOpenFileOptions*>(&options),
                                 reinterpret_cast<XmpFileType*>(&type),
                                 reinterpret_cast<XmpFileFormatOptions*>(&handler))) {
      xmp_files_free(file);
      if (!mWorkCopy.empty()) ::unlink(PathOf(std::exchange(mWorkCopy, std::string())).c_str());
      return false;
    }
    mFile = file;
    mSidecar = false;
    mFormat = type;
    mHandlerFlags = handler;
  }
  return markOpen(std::string());
}

void XMPFiles::CloseFile(XMP_OptionBits closeFlags) {
  if (!mOpen) return;
  mOpen = false;
  if (mSidecar) {
    const bool write = mHasPending;
    mHasPending = false;
    if (write && !ovracore::filesupport::SafeSave(ovracore::ToUTF16(mPath), mPending))
      detail::Throw(kXMPErr_ExternalFailure, "writing \"" + mPath + "\"");
    mPending.clear();
    return;
  }
  if (!mFile) return;  // refused: nothing was opened
  XmpFilePtr file = F(mFile);
  mFile = nullptr;
  const std::string workCopy = std::exchange(mWorkCopy, std::string());
  // The work copy is written in place; the original is replaced below.
  if (!workCopy.empty()) closeFlags &= ~kXMPFiles_UpdateSafely;
  const bool ok = xmp_files_close(file, static_cast<XmpCloseFileOptions>(closeFlags));
  const int id = ok ? 0 : xmp_get_error();
  xmp_files_free(file);
  if (workCopy.empty()) {
    if (!ok) detail::Throw(id != 0 ? id : kXMPErr_ExternalFailure, "closing \"" + mPath + "\"");
    return;
  }
  const auto copy = PathOf(workCopy);
  if (!ok) {
    ::unlink(copy.c_str());
    detail::Throw(id != 0 ? id : kXMPErr_ExternalFailure, "closing \"" + mPath + "\"");
  }
  if (!mPut) {  // nothing was written: the original stays, untouched
    ::unlink(copy.c_str());
    return;
  }
  if (!SyncFile(workCopy) || ::rename(copy.c_str(), PathOf(mTarget).c_str()) != 0) {
    ::unlink(copy.c_str());
    detail::Throw(kXMPErr_ExternalFailure, "writing \"" + mPath + "\"");
  }
}

bool XMPFiles::GetFileInfo(std::string* filePath, XMP_OptionBits* openFlags, XMP_FileFormat* format,
                           XMP_OptionBits* handlerFlags) const {
  if (!mOpen) return false;
  if (filePath) *filePath = mPath;
  if (openFlags) *openFlags = mOpenFlags;
  if (format) *format = mFormat;
  if (handlerFlags) *handlerFlags = mHandlerFlags;
  return true;
}

bool XMPFiles::GetXMP(XMPMeta* xmpObj, std::string* rawPacket) {
  if (!mOpen) detail::Throw(kXMPErr_BadObject, "no file open");
  if (mSidecar) {
    std::error_code ec;
    const auto size = fs::file_size(PathOf(mPath), ec);
    if (!ec && size > detail::kMaxPacketBytes) detail::Throw(kXMPErr_BadXML, "reading \"" + mPath + "\": packet too large");
    std::ifstream in(PathOf(mPath), std::ios::binary);
    std::ostringstream content;
    content << in.rdbuf();
    const std::string text = content.str();
    if (text.find_first_not_of(" \t\r\n") == std::string::npos) return false;
    if (xmpObj) xmpObj->ParseFromBuffer(text);
    if (rawPacket) *rawPacket = text;
    return true;
  }
  if (!mFile) return false;  // refused: its XMP counts as unreadable
  XmpFilePtr file = F(mFile);
  if (rawPacket) {
    detail::XmpString raw;
    if (!xmp_files_get_xmp_xmpstring(file, raw, nullptr)) {
      if (xmp_get_error() != 0) detail::ThrowLastError(kXMPErr_BadFileFormat, "reading XMP");
      return false;
    }
    *rawPacket = raw.str();
  }
  if (xmpObj) {
    XMPPacket& packet = detail::Require(xmpObj->GetInternalRef());
    XmpPtr fresh = xmp_new_empty();
    if (!fresh) detail::ThrowLastError(kXMPErr_NoMemory, "creating an XMP packet");
    if (!xmp_files_get_xmp(file, fresh)) {
      const int id = xmp_get_error();
      xmp_free(fresh);
      if (id != 0) detail::Throw(id, "reading XMP");
      return false;
    }
    // The handler drops what it cannot parse and hands over the rest (or an
    // empty packet), which a write would then store over the original: a
    // stored packet that does not parse means the file has no readable XMP.
    // A packet of the plain shapes writers produce always parses; only
    // others are parsed a second time to find out.
    detail::XmpString raw;
    if (xmp_files_get_xmp_xmpstring(file, raw, nullptr) && xmp_string_len(raw) > 0) {
      try {
        if (detail::PacketIsPlainRDF(xmp_string_cstr(raw), xmp_string_len(raw))) {
          detail::RequireSanePacket(xmp_string_cstr(raw), xmp_string_len(raw));
        } else {
          XMPMeta probe;
          probe.ParseFromBuffer(xmp_string_cstr(raw), xmp_string_len(raw));
        }
      } catch (const XMP_Error&) {
        xmp_free(fresh);
        return false;
      }
    }
    packet.ReplaceXmp(fresh);
    packet.Marks().clear();
  }
  if (!xmpObj && !rawPacket) {
    detail::XmpString raw;
    return xmp_files_get_xmp_xmpstring(file, raw, nullptr);
  }
  return true;
}

bool XMPFiles::CanPutXMP(const XMPMeta& xmpObj) {
  if (!mOpen) detail::Throw(kXMPErr_BadObject, "no file open");
  detail::Require(xmpObj.GetInternalRef());
  if (!(mOpenFlags & kXMPFiles_OpenForUpdate)) return false;
  if (mSidecar) return true;
  if (!mFile) return false;
  const XMPMeta clean = WithoutTransient(xmpObj);
  return xmp_files_can_put_xmp(F(mFile), clean.GetInternalRef()->Xmp());
}

void XMPFiles::PutXMP(const XMPMeta& xmpObj) {
  if (!mOpen) detail::Throw(kXMPErr_BadObject, "no file open");
  detail::Require(xmpObj.GetInternalRef());
  if (!(mOpenFlags & kXMPFiles_OpenForUpdate)) detail::Throw(kXMPErr_BadObject, "file not opened for update");
  if (mSidecar) {
    xmpObj.SerializeToBuffer(&mPending, kXMP_OmitPacketWrapper);
    mHasPending = true;
    return;
  }
  const XMPMeta clean = WithoutTransient(xmpObj);
  if (!xmp_files_put_xmp(F(mFile), clean.GetInternalRef()->Xmp()))
    detail::ThrowLastError(kXMPErr_BadFileFormat, "writing XMP into \"" + mPath + "\"");
  mPut = true;
}

std::string XMPFiles::GetVersionInfo() {
  return std::string("Exempi ") + OVRAXMP_EXEMPI_VERSION + ", XMP Files with " + XMPMeta::GetVersionInfo();
}

XMP_FileFormat XMPFiles::CheckFileFormat(const std::string& filePath) {
  if (!IsRegularFile(filePath)) return kXMP_UnknownFile;
  if (IsSidecarPath(filePath)) return kXMP_XMLFile;
  detail::EnsureStarted();
  return static_cast<XMP_FileFormat>(xmp_files_check_file_format(ToolkitPath(filePath).c_str()));
}

bool XMPFiles::GetFormatInfo(XMP_FileFormat format, XMP_OptionBits* handlerFlags) {
  if (format == kXMP_XMLFile) {
    if (handlerFlags) *handlerFlags = kSidecarHandlerFlags;
    return true;
  }
  if (format == kXMP_UnknownFile) return false;
  detail::EnsureStarted();
  std::uint32_t options = 0;
  if (!xmp_files_get_format_info(static_cast<XmpFileType>(format), reinterpret_cast<XmpFileFormatOptions*>(&options)))
    return false;
  if (handlerFlags) *handlerFlags = options;
  return true;
}

bool XMPFiles::GetAssociatedResources(const std::string& filePath, std::vector<std::string>* resourceList,
                                      XMP_FileFormat, XMP_OptionBits) {
  if (!resourceList) detail::Throw(kXMPErr_BadParam, "no resource list");
  if (!IsRegularFile(filePath)) return false;
  resourceList->push_back(filePath);
  if (IsSidecarPath(filePath)) return true;
  const fs::path sidecar = PathOf(filePath).replace_extension(".xmp");
  std::error_code ec;
  if (fs::is_regular_file(sidecar, ec)) resourceList->push_back(sidecar.u8string());
  return true;
}

}  // namespace ovraxmp
