#include <ovraxmp/XMPIterator.h>

#include "XMPPacket.h"

namespace ovraxmp {

XMPIterator::XMPIterator(const XMPMeta& xmpObj, XMP_OptionBits options) : mMeta(xmpObj) {
  Open(std::string(), std::string(), options);
}

XMPIterator::XMPIterator(const XMPMeta& xmpObj, const std::string& schemaNS, XMP_OptionBits options)
    : mMeta(xmpObj) {
  Open(schemaNS, std::string(), options);
}

XMPIterator::XMPIterator(const XMPMeta& xmpObj, const std::string& schemaNS, const std::string& propName,
                         XMP_OptionBits options)
    : mMeta(xmpObj) {
  Open(schemaNS, propName, options);
}

void XMPIterator::Open(const std::string& schemaNS, const std::string& propName, XMP_OptionBits options) {
  XmpPtr xmp = detail::Require(mMeta.GetInternalRef()).Xmp();
  if (!propName.empty() && schemaNS.empty()) detail::Throw(kXMPErr_BadSchema, "a property needs its namespace");
  if (!schemaNS.empty() && !detail::NamespaceKnown(schemaNS)) return;
  if (!propName.empty() && !mMeta.DoesPropertyExist(schemaNS, propName)) return;
  const XMP_OptionBits allowed = kXMP_IterJustChildren | kXMP_IterJustLeafNodes | kXMP_IterJustLeafName |
                                 kXMP_IterOmitQualifiers;
  if (options & ~allowed) detail::Throw(kXMPErr_BadOptions, "iteration options");
  XmpIteratorPtr iter = xmp_iterator_new(xmp, schemaNS.empty() ? nullptr : schemaNS.c_str(),
                                         propName.empty() ? nullptr : propName.c_str(),
                                         static_cast<XmpIterOptions>(options));
  if (!iter) detail::ThrowLastError(kXMPErr_InternalFailure, "starting an iteration");
  mIter = iter;
}

XMPIterator::~XMPIterator() {
  if (mIter) xmp_iterator_free(static_cast<XmpIteratorPtr>(mIter));
}

bool XMPIterator::Next(std::string* schemaNS, std::string* propPath, std::string* propValue,
                       XMP_OptionBits* options) {
  if (!mIter) return false;
  // The toolkit's strings are kept from step to step (a whole packet is
  // walked one node at a time), and only the parts asked for are fetched.
  thread_local detail::XmpString ns, path, value;
  std::uint32_t bits = 0;
  if (!xmp_iterator_next(static_cast<XmpIteratorPtr>(mIter), schemaNS ? ns.get() : nullptr,
                         propPath ? path.get() : nullptr, propValue ? value.get() : nullptr, &bits)) {
    if (xmp_get_error() != 0) detail::ThrowLastError(kXMPErr_InternalFailure, "iterating");
    return false;
  }
  if (schemaNS) schemaNS->assign(xmp_string_cstr(ns), xmp_string_len(ns));
  if (propPath) propPath->assign(xmp_string_cstr(path), xmp_string_len(path));
  if (propValue) propValue->assign(xmp_string_cstr(value), xmp_string_len(value));
  if (options) *options = bits;
  return true;
}

}  // namespace ovraxmp
