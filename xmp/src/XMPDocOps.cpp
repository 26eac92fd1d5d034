#include <ovraxmp/XMPDocOps.h>

#include <algorithm>
#include <mutex>

#include <boost/uuid/random_generator.hpp>
#include <boost/uuid/uuid_io.hpp>

#include <ovraxmp/XMPUtils.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace {

std::string NewUUID() {
  // The generator is not thread-safe; one per thread.
  thread_local boost::uuids::random_generator generator;
  return boost::uuids::to_string(generator());
}

}  // namespace

std::string XMPDocOps::NewInstanceID() { return "xmp.iid:" + NewUUID(); }
std::string XMPDocOps::NewDocumentID() { return "xmp.did:" + NewUUID(); }

void XMPDocOps::OpenXMP(const XMPMeta& xmpObj, const std::string& mimeType) {
  detail::Require(xmpObj.GetInternalRef());
  mMeta = xmpObj;
  mMimeType = mimeType;
  mParts.clear();
}

void XMPDocOps::NoteChange(const std::string& part) {
  if (part.empty()) return;
  if (std::find(mParts.begin(), mParts.end(), part) == mParts.end()) mParts.push_back(part);
}

void XMPDocOps::NoteChange(const std::vector<std::string>& parts) {
  for (const std::string& part : parts) NoteChange(part);
}

bool XMPDocOps::PrepareForSave(const std::string& mimeType) {
  detail::Require(mMeta.GetInternalRef());
  if (!mimeType.empty()) mMimeType = mimeType;
  if (mParts.empty()) return false;

  XMP_DateTime now;
  now = XMPUtils::CurrentDateTime();
  std::string when;
  when = XMPUtils::ConvertFromDate(now);
  std::string changed;
  for (const std::string& part : mParts) {
    if (!changed.empty()) changed += ';';
    changed += part;
  }
  const std::string instanceID = NewInstanceID();

  XMPMeta& meta = mMeta;
  meta.AppendArrayItem(kXMP_NS_XMP_MM, "History", kXMP_PropArrayIsOrdered, std::string(), kXMP_PropValueIsStruct);
  std::string event;
  event = XMPUtils::ComposeArrayItemPath(kXMP_NS_XMP_MM, "History", kXMP_ArrayLastItem);
  const char* evt = kXMP_NS_XMP_ResourceEvent;
  meta.SetStructField(kXMP_NS_XMP_MM, event, evt, "action", "saved");
  meta.SetStructField(kXMP_NS_XMP_MM, event, evt, "instanceID", instanceID);
  meta.SetStructField(kXMP_NS_XMP_MM, event, evt, "when", when);
  meta.SetStructField(kXMP_NS_XMP_MM, event, evt, "softwareAgent", XMPMeta::GetClientName());
  meta.SetStructField(kXMP_NS_XMP_MM, event, evt, "changed", changed);

  meta.SetProperty(kXMP_NS_XMP_MM, "InstanceID", instanceID);
  meta.SetProperty(kXMP_NS_XMP, "MetadataDate", when);
  if (!meta.DoesPropertyExist(kXMP_NS_XMP_MM, "DocumentID")) {
    const std::string documentID = NewDocumentID();
    meta.SetProperty(kXMP_NS_XMP_MM, "DocumentID", documentID);
    if (!meta.DoesPropertyExist(kXMP_NS_XMP_MM, "OriginalDocumentID"))
      meta.SetProperty(kXMP_NS_XMP_MM, "OriginalDocumentID", documentID);
  }
  if (!mMimeType.empty()) meta.SetProperty(kXMP_NS_DC, "format", mMimeType);
  mParts.clear();
  return true;
}

}  // namespace ovraxmp
