// ovraxmp: the XMP of media files and of .xmp sidecars.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPMeta.h>

namespace ovraxmp {

// One open media file or sidecar. Paths are UTF-8, relative ones taken
// from the working folder.
//
// Opened for reading (kXMPFiles_OpenForRead), GetXMP hands out the packet
// stored in the file, as stored; where the file holds metadata of its own
// (EXIF, IPTC, movie headers, RIFF INFO, ID3), the toolkit's handler reads
// it and its values fill only the properties the packet lacks. The file is
// never written.
//
// Opened for update (kXMPFiles_OpenForUpdate), PutXMP takes the packet to
// store and CloseFile writes it. A packet that GetXMP handed out carries
// only its changes since: each top-level property that differs is written
// into the packet stored in the file now, and every other byte of that
// packet (properties, languages, namespaces, formatting) stays. Any other
// packet adds or replaces its properties and removes none. Native metadata
// is never written. The packet is written by the layer itself: in its old
// place when it fits, else by the container's own rules; a file the layer
// cannot write that way is refused. The write replaces the file in one
// rename (see ovracore::filesupport::FileReplacement): a failed or
// interrupted write leaves the original byte for byte.
//
// Files are checked before any handler sees them (packets with absurd
// nesting or property counts, XMP that exists but is empty, broken
// container structures): such a file reads as one without XMP and is never
// written; GetRefusal says why.
//
// Not thread-safe; different objects may be used on different threads.
class XMPFiles {
 public:
  XMPFiles();
  // Opens at once; throws XMP_Error with the reason when it cannot.
  explicit XMPFiles(const std::string& filePath, XMP_FileFormat format = kXMP_UnknownFile,
                    XMP_OptionBits openFlags = 0);
  // Closes without writing what CloseFile would have written.
  ~XMPFiles();
  XMPFiles(const XMPFiles&) = delete;
  XMPFiles& operator=(const XMPFiles&) = delete;

  // False, with the reason in GetRefusal, when the file is missing, is not
  // of the given format (kXMP_UnknownFile accepts any), or cannot be opened
  // for update (not writable, its XMP refused or unreadable).
  bool OpenFile(const std::string& filePath, XMP_FileFormat format = kXMP_UnknownFile,
                XMP_OptionBits openFlags = 0);
  // Writes what PutXMP staged, then closes. Throws XMP_Error with the
  // reason when the write fails; the file is then as it was. Closing a
  // closed object does nothing.
  void CloseFile(XMP_OptionBits closeFlags = 0);
  // False when no file is open. Any out pointer may be null.
  bool GetFileInfo(std::string* filePath = nullptr, XMP_OptionBits* openFlags = nullptr,
                   XMP_FileFormat* format = nullptr) const;
  // Reads the file's XMP into xmpObj (replacing its content); false when
  // the file has none or its XMP was refused or does not parse. Throws
  // XMP_Error when the file cannot be read.
  bool GetXMP(XMPMeta* xmpObj);
  // Stages xmpObj for CloseFile (see above); throws XMP_Error with the
  // reason when it cannot be written (kXMPErr_BadObject when the file is
  // not open for update).
  void PutXMP(const XMPMeta& xmpObj);
  // Why the file was refused; empty when it was not.
  const std::string& GetRefusal() const;
  // After GetXMP: whether the file holds an XMP packet that does not parse
  // (GetXMP then gives only the metadata outside it).
  bool PacketUnreadable() const;
  // After GetXMP: what the toolkit said while it read the metadata outside
  // the packet (a damaged EXIF block, for instance), one line each.
  const std::vector<std::string>& ToolkitNotes() const;

  // ---- Process-wide ----
  // Counted start of the file part (it also holds a start of the core).
  // The toolkit loads no handler plug-ins, so the folder is not looked at.
  // Throws XMP_Error on failure.
  static bool Initialize(const std::string& pluginFolder);
  static void Terminate();
  // E.g. "Exempi 2.6.3, XMP Files with Exempi + XMP Core 6.0.0".
  static std::string GetVersionInfo();
  // The format a handler sees in the file; kXMP_UnknownFile when none (also
  // for a missing file). ".xmp" files answer kXMP_XMLFile.
  static XMP_FileFormat CheckFileFormat(const std::string& filePath);
  // The files that make up the document: the file itself, then its sidecar
  // ("stem.xmp" beside it) when one exists. False (list untouched) when the
  // file does not exist. Appends to resourceList. No format or option
  // changes the answer.
  static bool GetAssociatedResources(const std::string& filePath, std::vector<std::string>* resourceList,
                                     XMP_FileFormat format = kXMP_UnknownFile, XMP_OptionBits options = 0);

 private:
  struct State;
  std::unique_ptr<State> mState;
};

}  // namespace ovraxmp
