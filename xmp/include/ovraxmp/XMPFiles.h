// ovraxmp: access to the XMP embedded in media files and in .xmp sidecars.
#pragma once

#include <string>
#include <vector>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPMeta.h>

namespace ovraxmp {

// One open media file. Paths are UTF-8. Standalone ".xmp" files are read
// and written by the layer itself (parse; serialise and replace the file
// safely), so a sidecar behaves like a media file. Not thread-safe; different
// objects may be used on different threads.
class XMPFiles {
 public:
  XMPFiles() = default;
  // Opens at once; throws XMP_Error "OpenFile returned false" when the file
  // cannot be opened.
  explicit XMPFiles(const std::string& filePath, XMP_FileFormat format = kXMP_UnknownFile,
                    XMP_OptionBits openFlags = 0);
  // Closes without writing pending changes when CloseFile was not called.
  ~XMPFiles();
  XMPFiles(const XMPFiles&) = delete;
  XMPFiles& operator=(const XMPFiles&) = delete;

  // False when the file does not exist, no handler takes it, or it cannot
  // be opened as asked (kXMPFiles_OpenForUpdate on a read-only file).
  // format kXMP_UnknownFile lets the toolkit detect the format. Files are
  // checked before any handler sees them (packets with absurd nesting or
  // property counts, XMP that exists but is empty or malformed, box trees
  // that are too deep or have broken sizes): such a file opens for reading
  // as one without XMP (GetXMP false, GetRefusal says why) and does not
  // open for update.
  bool OpenFile(const std::string& filePath, XMP_FileFormat format = kXMP_UnknownFile,
                XMP_OptionBits openFlags = 0);
  // Writes the packet given to PutXMP (when opened for update) and closes.
  // Whenever the format's handler allows a safe update, the write goes to a
  // copy beside the file that then replaces it in one rename, so a failed or
  // interrupted write leaves the original byte for byte (closeFlags do not
  // matter then). Closing a closed object does nothing.
  void CloseFile(XMP_OptionBits closeFlags = 0);
  // False when no file is open. Any out pointer may be null.
  bool GetFileInfo(std::string* filePath = nullptr, XMP_OptionBits* openFlags = nullptr,
                   XMP_FileFormat* format = nullptr, XMP_OptionBits* handlerFlags = nullptr) const;
  // Reads the file's XMP into xmpObj (replacing its content) and/or the raw
  // packet text; false when the file has none or its XMP was refused.
  bool GetXMP(XMPMeta* xmpObj = nullptr, std::string* rawPacket = nullptr);
  // Whether PutXMP can store this packet (kXMPErr_BadObject when closed).
  bool CanPutXMP(const XMPMeta& xmpObj);
  // Stages the packet for writing at CloseFile (transient data excluded).
  void PutXMP(const XMPMeta& xmpObj);
  // Why the open file was refused to the handlers; empty when it was not.
  const std::string& GetRefusal() const { return mRefusal; }

  // ---- Process-wide ----
  // Counted start of the file part (it also holds a start of the core). The
  // plug-in folder is recorded; no plug-ins are loaded. Throws XMP_Error on
  // failure.
  static bool Initialize(const std::string& pluginFolder);
  static void Terminate();
  // The folder given to the first Initialize, empty when none.
  static std::string GetPluginFolder();
  // E.g. "Exempi 2.6.3, XMP Files with Exempi + XMP Core 6.0.0".
  static std::string GetVersionInfo();
  // The format a handler sees in the file; kXMP_UnknownFile when none (also
  // for a missing file). ".xmp" files answer kXMP_XMLFile.
  static XMP_FileFormat CheckFileFormat(const std::string& filePath);
  // The handler flags of a format; false when no handler takes it.
  static bool GetFormatInfo(XMP_FileFormat format, XMP_OptionBits* handlerFlags);
  // The files that make up the document: the file itself, then its sidecar
  // ("stem.xmp" beside it) when one exists. False (list untouched) when the
  // file does not exist. Appends to resourceList.
  static bool GetAssociatedResources(const std::string& filePath, std::vector<std::string>* resourceList,
                                     XMP_FileFormat format = kXMP_UnknownFile, XMP_OptionBits options = 0);

 private:
  void* mFile = nullptr;  // the toolkit's file object, null for sidecars
  bool mOpen = false;
  bool mSidecar = false;
  std::string mPath;
  XMP_OptionBits mOpenFlags = 0;
  XMP_FileFormat mFormat = kXMP_UnknownFile;
  XMP_OptionBits mHandlerFlags = 0;
  std::string mPending;  // packet the layer writes at close (sidecars, PNG)
  bool mHasPending = false;
  std::string mRefusal;
  // The name an update is written under, empty when in place: a second name
  // of the file (mWorkLinked) or a copy of it.
  std::string mWorkCopy;
  bool mWorkLinked = false;
  bool mPNGWrite = false;  // the layer writes the packet (mPending) itself
  std::string mTarget;               // the file the work copy replaces
  unsigned mTargetMode = 0;          // its permission bits
  unsigned long long mTargetInode = 0;
  bool mPut = false;
};

}  // namespace ovraxmp
