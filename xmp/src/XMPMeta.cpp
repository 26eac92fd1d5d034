// The packet holder: lifetime and reference counting.
#include <ovraxmp/XMPMeta.h>

#include <utility>

#include "XMPPacket.h"

namespace ovraxmp {

namespace detail {
XMPPacket* NewPacket(XmpPtr xmp) {
  if (!xmp) ThrowLastError(kXMPErr_NoMemory, "creating an XMP packet");
  return new XMPPacket(xmp);
}
}  // namespace detail

void XMPMetaRefAddRef(XMPMetaRef ref) {
  if (ref) ref->AddRef();
}

void XMPMetaRefRelease(XMPMetaRef ref) {
  if (ref && ref->Release()) delete ref;
}

std::int32_t XMPMetaRefGetCount(XMPMetaRef ref) { return ref ? ref->RefCount() : 0; }

XMPMeta::XMPMeta() {
  detail::EnsureStarted();
  mRef = detail::NewPacket(xmp_new_empty());
}

XMPMeta::XMPMeta(XMPMetaRef ref) : mRef(ref) { XMPMetaRefAddRef(mRef); }

XMPMeta::XMPMeta(const XMPMeta& other) : mRef(other.mRef) { XMPMetaRefAddRef(mRef); }

XMPMeta::XMPMeta(XMPMeta&& other) noexcept : mRef(std::exchange(other.mRef, nullptr)) {}

XMPMeta& XMPMeta::operator=(const XMPMeta& other) {
  if (mRef != other.mRef) {
    XMPMetaRefAddRef(other.mRef);
    XMPMetaRefRelease(mRef);
    mRef = other.mRef;
  }
  return *this;
}

XMPMeta& XMPMeta::operator=(XMPMeta&& other) noexcept {
  if (this != &other) {
    XMPMetaRefRelease(mRef);
    mRef = std::exchange(other.mRef, nullptr);
  }
  return *this;
}

XMPMeta::~XMPMeta() { XMPMetaRefRelease(mRef); }

}  // namespace ovraxmp
