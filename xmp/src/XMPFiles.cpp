// Media files through the toolkit's handlers; .xmp sidecars by the layer.
#include <ovraxmp/XMPFiles.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <sstream>
#include <utility>
#include <vector>

#include <boost/crc.hpp>

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

// The keyword of the PNG text chunk that carries XMP: "XML:", the host of
// the XMP namespaces with its labels reversed and without "ns", ".xmp".
const std::string& PNGPacketKeyword() {
  static const std::string keyword = [] {
    const std::string uri = kXMP_NS_XMP;
    const std::size_t hostStart = uri.find("//") + 2;
    std::string host = uri.substr(hostStart, uri.find('/', hostStart) - hostStart);
    std::string reversed;
    for (std::size_t dot; (dot = host.rfind('.')) != std::string::npos; host.erase(dot))
      reversed += host.substr(dot + 1) + ".";
    return "XML:" + reversed + "xmp";
  }();
  return keyword;
}

// The first chunk of a PNG file that carries XMP as plain text (the one the
// toolkit reads), as the byte range [begin, end). False when there is none
// or the file does not start as a PNG file does.
bool FindPNGPacketChunk(int fd, off_t size, off_t* begin, off_t* end) {
  static const unsigned char kSignature[8] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};
  // The keyword with its NUL, then the flag for no compression.
  const std::string expected = PNGPacketKeyword() + std::string(2, '\0');
  unsigned char head[8];
  if (::pread(fd, head, sizeof head, 0) != 8 || std::memcmp(head, kSignature, 8) != 0) return false;
  for (off_t pos = 8; pos + 12 <= size;) {
    if (::pread(fd, head, sizeof head, pos) != 8) break;
    const off_t length = (off_t(head[0]) << 24) | (off_t(head[1]) << 16) | (off_t(head[2]) << 8) | off_t(head[3]);
    if (pos + 12 + length > size) break;
    std::string start(expected.size(), '\0');
    if (std::memcmp(head + 4, "iTXt", 4) == 0 && length >= off_t(start.size()) &&
        ::pread(fd, start.data(), start.size(), pos + 8) == off_t(start.size()) && start == expected) {
      *begin = pos;
      *end = pos + 12 + length;
      return true;
    }
    if (std::memcmp(head + 4, "IEND", 4) == 0) break;
    pos += 12 + length;
  }
  return false;
}

// Writes all of data to out.
bool WriteAll(int out, const char* data, std::size_t length) {
  for (std::size_t done = 0; done < length;) {
    const ssize_t put = ::write(out, data + done, length - done);
    if (put < 0 && errno != EINTR) return false;
    if (put > 0) done += static_cast<std::size_t>(put);
  }
  return true;
}

// A new, empty file beside path (same folder, so that a rename replaces the
// original atomically; same extension, which the handlers look at), under
// a hidden name stored in name. -1 when it cannot be made.
int CreateBeside(const fs::path& path, std::string* name) {
  const std::string ext = path.extension().u8string();
  *name = (path.parent_path() / ("." + path.filename().u8string() + ".ovra-XXXXXX" + ext)).u8string();
  return ::mkstemps(name->data(), static_cast<int>(ext.size()));
}

// Copies the bytes [from, to) of in (to < 0: up to the end) to the end of out.
bool CopyRange(int in, int out, off_t from, off_t to, char* buffer, std::size_t size) {
  for (off_t at = from; to < 0 || at < to;) {
    const std::size_t want = to < 0 ? size : static_cast<std::size_t>(std::min<off_t>(to - at, off_t(size)));
    const ssize_t got = ::pread(in, buffer, want, at);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return false;
    if (got == 0) return to < 0;
    if (!WriteAll(out, buffer, static_cast<std::size_t>(got))) return false;
    at += got;
  }
  return true;
}

// A copy of the file beside it (see CreateBeside) with the original's
// permission bits. Empty when it cannot be made.
std::string CopyBeside(const std::string& target) {
  const fs::path path = PathOf(target);
  std::string name;
  const int out = CreateBeside(path, &name);
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
    ok = ok && CopyRange(in, out, 0, -1, buffer.get(), size);
  }
  if (in >= 0) ::close(in);
  if (::close(out) != 0) ok = false;
  if (!ok) {
    ::unlink(name.c_str());
    return std::string();
  }
  return name;
}

// Stores packet as the XMP of a PNG file. The toolkit's PNG handler updates
// a packet in place without changing its chunk's length, so a shorter packet
// leaves stale bytes behind it and the file's XMP no longer parses; PNG has
// no other metadata to reconcile, so the layer writes the chunk itself. The
// new chunk takes the place of the one the toolkit reads, or follows the
// header chunk; every other chunk stays. The file is written beside the
// original with its permission bits, synced and renamed over it. False
// when anything fails; the original then stays as it was.
bool WritePNGPacket(const std::string& target, const std::string& packet, unsigned mode) {
  const fs::path path = PathOf(target);
  const int in = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (in < 0) return false;
  struct stat info {};
  unsigned char head[8];
  if (::fstat(in, &info) != 0 || ::pread(in, head, sizeof head, 8) != 8 || std::memcmp(head + 4, "IHDR", 4) != 0) {
    ::close(in);
    return false;
  }
  const off_t headerEnd = 8 + 12 + ((off_t(head[0]) << 24) | (off_t(head[1]) << 16) | (off_t(head[2]) << 8) | off_t(head[3]));
  off_t oldBegin = headerEnd, oldEnd = headerEnd;  // nothing to replace: insert
  FindPNGPacketChunk(in, info.st_size, &oldBegin, &oldEnd);

  // iTXt: keyword, no compression, no language, no translated keyword.
  std::string chunk(4, '\0');
  chunk += "iTXt";
  chunk += PNGPacketKeyword();
  chunk.append(5, '\0');
  chunk += packet;
  const std::uint64_t length = chunk.size() - 8;
  if (length > 0x7FFFFFFFu) {
    ::close(in);
    return false;
  }
  for (int i = 0; i < 4; ++i) chunk[i] = static_cast<char>((length >> (24 - 8 * i)) & 0xFF);
  boost::crc_32_type crc;
  crc.process_bytes(chunk.data() + 4, chunk.size() - 4);
  for (int i = 0; i < 4; ++i) chunk += static_cast<char>((crc.checksum() >> (24 - 8 * i)) & 0xFF);

  std::string name;
  const int out = CreateBeside(path, &name);
  if (out < 0) {
    ::close(in);
    return false;
  }
  const std::size_t size = static_cast<std::size_t>(std::clamp<off_t>(info.st_size, off_t(4096), off_t(1) << 20));
  const std::unique_ptr<char[]> buffer(new char[size]);
  bool ok = ::fchmod(out, mode) == 0 && CopyRange(in, out, 0, oldBegin, buffer.get(), size) &&
            WriteAll(out, chunk.data(), chunk.size());
  ok = ok && CopyRange(in, out, oldEnd, -1, buffer.get(), size) && ::fsync(out) == 0;
  ::close(in);
  if (::close(out) != 0) ok = false;
  if (!ok || ::rename(name.c_str(), path.c_str()) != 0) {
    ::unlink(name.c_str());
    return false;
  }
  return true;
}

// A second name for the file beside it (same folder and extension, so that
// the toolkit picks the same handler). Opened by the toolkit for a safe
// update, the file behind it is only read: the toolkit writes a new file
// and puts it under the second name. Cheaper than a copy; empty when the
// file system has no hard links.
std::string LinkBeside(const std::string& target) {
  static const char kLetters[] = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
  thread_local std::mt19937_64 random{std::random_device{}()};
  const fs::path path = PathOf(target);
  const std::string stem = (path.parent_path() / ("." + path.filename().u8string() + ".ovra-")).u8string();
  const std::string ext = path.extension().u8string();
  for (int attempt = 0; attempt < 16; ++attempt) {
    std::string name = stem;
    for (int i = 0; i < 6; ++i) name += kLetters[random() % (sizeof kLetters - 1)];
    name += ext;
    if (::link(path.c_str(), PathOf(name).c_str()) == 0) return name;
    if (errno != EEXIST) break;
  }
  return std::string();
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
  mPNGWrite = false;
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
    // An update goes to a file beside the original, which replaces it in
    // one rename at close: a failed or interrupted write leaves the
    // original as it was. (The toolkit's own safe update of the original
    // moves it aside first, so an interruption can leave nothing under its
    // name.) Only formats spread over folders are updated in place.
    std::string target = ToolkitPath(filePath);
    std::string workCopy;
    bool linked = false;
    bool pngWrite = false;
    struct stat targetInfo {};
    XMP_OptionBits toolkitFlags = openFlags;
    if (forUpdate) {
      if (access(PathOf(target).c_str(), W_OK) != 0 || ::stat(PathOf(target).c_str(), &targetInfo) != 0)
        return false;
      // A handler that can update safely gets a second name of the file
      // and writes a new one; the others update a private copy in place.
      // PNG packets are written by the layer (see WritePNGPacket): the
      // toolkit only reads the file.
      XMP_OptionBits handler = 0;
      // target is resolved and known to be a regular file already.
      const auto targetFormat = static_cast<XMP_FileFormat>(xmp_files_check_file_format(target.c_str()));
      pngWrite = targetFormat == kXMP_PNGFile;
      if (pngWrite) {
        toolkitFlags = (openFlags & ~kXMPFiles_OpenForUpdate) | kXMPFiles_OpenForRead;
      } else if (GetFormatInfo(targetFormat, &handler) && !(handler & kXMPFiles_FolderBasedFormat)) {
        if (handler & kXMPFiles_AllowsSafeUpdate) {
          workCopy = LinkBeside(target);
          linked = !workCopy.empty();
        }
        if (!linked) workCopy = CopyBeside(target);
        if (workCopy.empty()) return false;
      }
    }
    XmpFilePtr file = xmp_files_new();
    if (!file) {
      if (!workCopy.empty()) ::unlink(PathOf(workCopy).c_str());
      detail::ThrowLastError(kXMPErr_NoMemory, "creating a file object");
    }
    const std::string& toolkitPath = workCopy.empty() ? target : workCopy;
    if (!xmp_files_open(file, toolkitPath.c_str(), static_cast<XmpOpenFileOptions>(toolkitFlags))) {
      xmp_files_free(file);
      if (!workCopy.empty()) ::unlink(PathOf(workCopy).c_str());
      return false;
    }
    mWorkCopy = workCopy;
    mWorkLinked = linked;
    mPNGWrite = pngWrite;
    mTarget = target;
    mTargetMode = static_cast<unsigned>(targetInfo.st_mode & 07777);
    mTargetInode = static_cast<unsigned long long>(targetInfo.st_ino);
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
  if (mPNGWrite) {
    xmp_files_close(file, XMP_CLOSE_NOOPTION);
    xmp_files_free(file);
    const bool write = std::exchange(mHasPending, false);
    const std::string packet = std::exchange(mPending, std::string());
    if (write && !WritePNGPacket(mTarget, packet, mTargetMode))
      detail::Throw(kXMPErr_ExternalFailure, "writing \"" + mPath + "\"");
    return;
  }
  const std::string workCopy = std::exchange(mWorkCopy, std::string());
  // A second name of the original must get a new file, never a write into
  // the one it names; a copy of its own is written in place. Either
  // replaces the original below.
  if (!workCopy.empty()) {
    if (mWorkLinked)
      closeFlags |= kXMPFiles_UpdateSafely;
    else
      closeFlags &= ~kXMPFiles_UpdateSafely;
  }
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
  struct stat written {};
  if (::lstat(copy.c_str(), &written) != 0) detail::Throw(kXMPErr_ExternalFailure, "writing \"" + mPath + "\"");
  if (mWorkLinked && static_cast<unsigned long long>(written.st_ino) == mTargetInode) {
    // The toolkit found nothing to change and left the original's second
    // name as it was.
    ::unlink(copy.c_str());
    return;
  }
  // The toolkit's new file has default permissions; the file keeps its own.
  if (::chmod(copy.c_str(), mTargetMode) != 0 || !SyncFile(workCopy) ||
      ::rename(copy.c_str(), PathOf(mTarget).c_str()) != 0) {
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
  if (mPNGWrite) return true;
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
  if (mPNGWrite) {
    // A read-only packet without padding, as the toolkit's PNG handler
    // writes it.
    clean.SerializeToBuffer(&mPending, kXMP_ReadOnlyPacket, 0);
    mHasPending = true;
    mPut = true;
    return;
  }
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
