// ovraxmp: document history kept in the packet (xmpMM:History and ids).
#pragma once

#include <string>
#include <vector>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPMeta.h>

namespace ovraxmp {

// Records the parts of a document that changed and, before saving, writes a
// "saved" event into the attached packet. Not thread-safe; one per save.
class XMPDocOps {
 public:
  XMPDocOps() = default;
  // Attaches to the packet (adds a reference); mimeType may be empty. Drops
  // changes noted for a previous packet.
  void OpenXMP(const XMPMeta& xmpObj, const std::string& mimeType);
  // Parts such as "/metadata" or "/metadata/dc/title"; duplicates count once.
  void NoteChange(const std::string& part);
  void NoteChange(const std::vector<std::string>& parts);
  // With changes noted: appends to xmpMM:History a "saved" event (new
  // instance id "xmp.iid:<uuid>", when = now with local offset,
  // softwareAgent = the client name, changed = the parts joined by ";"),
  // sets xmpMM:InstanceID and xmp:MetadataDate, gives a packet without
  // xmpMM:DocumentID a new "xmp.did:<uuid>" (also as OriginalDocumentID),
  // and sets dc:format when a MIME type is known. Clears the noted changes.
  // Answers false (and changes nothing) when nothing was noted; throws
  // kXMPErr_BadObject when no packet is attached.
  bool PrepareForSave(const std::string& mimeType);

  // A fresh "xmp.iid:" / "xmp.did:" identifier.
  static std::string NewInstanceID();
  static std::string NewDocumentID();

 private:
  XMPMeta mMeta{XMPMetaRef(nullptr)};
  std::string mMimeType;
  std::vector<std::string> mParts;
};

}  // namespace ovraxmp
