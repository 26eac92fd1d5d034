// The providers that take their packet from outside: a serialised buffer
// owned by the application, or the XMP embedded in a media file.
#include <ovrametadata/Providers.h>

#include <cstdint>
#include <limits>
#include <string>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Initialize.h>

namespace ovrametadata {

namespace {

constexpr ovraxmp::XMP_OptionBits kReadOpenFlags =
    ovraxmp::kXMPFiles_OpenForRead | ovraxmp::kXMPFiles_OpenAllowBackgroundFileOpen;  // 0x401
constexpr ovraxmp::XMP_OptionBits kUpdateOpenFlags =
    ovraxmp::kXMPFiles_OpenForUpdate | ovraxmp::kXMPFiles_OpenAllowBackgroundFileOpen;  // 0x402

}  // namespace

// ---------------------------------------------------------------------------
// BufferProviderImpl

BufferProviderImpl::BufferProviderImpl(const unsigned char* data, std::size_t length)
    : TypicalProviderImpl(nullptr) {
  ResetBuffer(data, length);
}

void BufferProviderImpl::ResetBuffer(const unsigned char* data, std::size_t length) {
  ovraxmp::XMPMeta parsed;
  XMPMetaRef result = parsed.GetInternalRef();
  if (data && length != 0) {
    try {
      // The toolkit takes a 32-bit length; a larger buffer cannot be a packet.
      if (length > std::numeric_limits<std::uint32_t>::max()) {
        throw ovraxmp::XMP_Error(ovraxmp::kXMPErr_BadParam, "buffer too large");
      }
      parsed.ParseFromBuffer(reinterpret_cast<const char*>(data),
                             static_cast<std::uint32_t>(length), 0);
    } catch (...) {
      // A buffer that does not parse leaves the provider without metadata,
      // silently: the owner learns it from the null packet.
      result = nullptr;
    }
  }
  ResetMetaData(result, true);
}

void BufferProviderImpl::WriteChanges(const std::vector<Path>& paths) {
  const XMPMetaRef xmp = MetaDataAccess();
  if (!xmp) return;
  try {
    const ovraxmp::XMPMeta meta(xmp);
    const std::string serialized = meta.SerializeToBuffer();
    WriteBuffer(paths, serialized.data(), serialized.size());
  } catch (...) {
    // Write-back runs from a guard's destructor and must not throw; the
    // owner's buffer stays as it was.
  }
}

// ---------------------------------------------------------------------------
// FileProvider

FileProvider::FileProvider(const UTF16String& path) : TypicalProviderImpl(nullptr) {
  ResetFilePath(path);
}

void FileProvider::ResetFilePath(const UTF16String& path) {
  if (path == mFilePath) return;
  mFilePath = path;
  ReloadFile();
}

void FileProvider::ReloadFile() {
  ovraxmp::XMPMeta meta;
  XMPMetaRef result = nullptr;
  if (!mFilePath.empty()) {
    try {
      // Throws "OpenFile returned false" when the file cannot be opened.
      ovraxmp::XMPFiles file(ovracore::ToUTF8(mFilePath), ovraxmp::kXMP_UnknownFile,
                             kReadOpenFlags);
      meta.Erase();
      if (file.GetXMP(&meta)) result = meta.GetInternalRef();
      // Said once per read: the rest of the file's metadata is still shown.
      if (file.PacketUnreadable()) {
        SendError(kErrorReadingXMP,
                  ovracore::ZString("$$$/ovrametadata/FileProvider/UnreadablePacket=the file's XMP packet cannot be "
                                    "read; only the metadata stored outside it is shown."),
                  mFilePath);
      }
      for (const std::string& note : file.ToolkitNotes()) {
        SendError(kErrorReadingXMP,
                  ovracore::ZString("$$$/ovrametadata/FileProvider/NativeMetadataNote=the metadata outside the XMP "
                                    "packet is not read completely (#{quot}@0#{quot}).",
                                    {note}),
                  mFilePath);
      }
      // The handler closes the file when it goes.
    } catch (...) {
      // An unreadable file is a provider without metadata; not reported.
      result = nullptr;
    }
  }
  ResetMetaData(result, true);
}

void FileProvider::WriteChanges(const std::vector<Path>& /*paths*/) {
  mWriteFailure.clear();
  const XMPMetaRef xmp = MetaDataAccess();
  if (!xmp || IsXMPWritingDisabled()) return;
  try {
    const ovraxmp::XMPMeta meta(xmp);
    ovraxmp::XMPFiles file(ovracore::ToUTF8(mFilePath), ovraxmp::kXMP_UnknownFile,
                           kUpdateOpenFlags);
    file.PutXMP(meta);
    file.CloseFile(ovraxmp::kXMPFiles_NoOptions);
  } catch (const std::exception& e) {
    // Write-back must not throw; the layer leaves the file as it was when
    // opening or writing fails, and the reason is kept for the host.
    mWriteFailure = ovracore::ToUTF16(e.what());
  } catch (...) {
    mWriteFailure = u"unknown failure";
  }
}

}  // namespace ovrametadata
