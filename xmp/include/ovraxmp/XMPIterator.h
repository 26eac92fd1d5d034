// ovraxmp: walking the nodes of a packet.
#pragma once

#include <string>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPMeta.h>

namespace ovraxmp {

// Visits the nodes of a whole packet (schema nodes carry kXMP_SchemaNode
// and an empty path), of one namespace, or of one property's subtree, in
// document order. Options: kXMP_IterJustChildren, kXMP_IterJustLeafNodes,
// kXMP_IterJustLeafName, kXMP_IterOmitQualifiers. An unregistered namespace
// or a missing property gives an empty iteration. The iterator holds a
// reference on the packet; the packet must not change while it runs.
class XMPIterator {
 public:
  explicit XMPIterator(const XMPMeta& xmpObj, XMP_OptionBits options = 0);
  XMPIterator(const XMPMeta& xmpObj, const std::string& schemaNS, XMP_OptionBits options = 0);
  XMPIterator(const XMPMeta& xmpObj, const std::string& schemaNS, const std::string& propName,
              XMP_OptionBits options = 0);
  ~XMPIterator();
  XMPIterator(const XMPIterator&) = delete;
  XMPIterator& operator=(const XMPIterator&) = delete;

  // False when the iteration is over; the out values may be null.
  bool Next(std::string* schemaNS = nullptr, std::string* propPath = nullptr, std::string* propValue = nullptr,
            XMP_OptionBits* options = nullptr);

 private:
  void Open(const std::string& schemaNS, const std::string& propName, XMP_OptionBits options);

  XMPMeta mMeta;
  void* mIter = nullptr;
};

}  // namespace ovraxmp
