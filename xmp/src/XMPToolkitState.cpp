// Process-wide start and stop of the toolkit, the client name, the
// assertion callback and the namespace registry.
#include <atomic>
#include <mutex>
#include <string>

#include <ovraxmp/XMPFiles.h>
#include <ovraxmp/XMPMeta.h>

#include "ToolkitOutput.h"
#include "XMPPacket.h"

namespace ovraxmp {
namespace {

std::mutex sStateMutex;
std::mutex sRegistrationMutex;
int sInitializationCount = 0;
int sFilesInitializationCount = 0;
std::atomic<bool> sToolkitUp{false};
std::string sClientName;
XMP_AssertNotifyProc sAssertProc = nullptr;
void* sAssertRefCon = nullptr;

// Caller holds sStateMutex.
void StartLocked() {
  if (sToolkitUp.load(std::memory_order_acquire)) return;
  if (!xmp_init()) detail::Throw(kXMPErr_InternalFailure, "starting the XMP toolkit");
  detail::StartCollectingToolkitOutput();
  // The transient namespace carries aggregate bookkeeping; it must be known
  // before anything is written into it.
  detail::XmpString registered;
  xmp_register_namespace(kXMP_NS_Transient, kXMP_NS_Transient_Prefix, registered);
  sToolkitUp.store(true, std::memory_order_release);
}

// A prefix the toolkit accepts: an XML name without colon.
bool IsValidPrefix(const std::string& prefix) {
  if (prefix.empty()) return false;
  for (std::size_t i = 0; i < prefix.size(); ++i) {
    const unsigned char c = static_cast<unsigned char>(prefix[i]);
    const bool letter = (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c == '_' || c >= 0x80;
    const bool other = (c >= '0' && c <= '9') || c == '-' || c == '.';
    if (!(letter || (i > 0 && other))) return false;
  }
  return true;
}

std::string WithoutColon(const std::string& prefix) {
  if (!prefix.empty() && prefix.back() == ':') return prefix.substr(0, prefix.size() - 1);
  return prefix;
}

}  // namespace

namespace detail {
void EnsureStarted() {
  if (sToolkitUp.load(std::memory_order_acquire)) return;
  std::lock_guard<std::mutex> lock(sStateMutex);
  StartLocked();
}
}  // namespace detail

bool XMPMeta::Initialize() {
  std::lock_guard<std::mutex> lock(sStateMutex);
  StartLocked();
  ++sInitializationCount;
  return true;
}

void XMPMeta::Terminate() {
  std::lock_guard<std::mutex> lock(sStateMutex);
  if (sInitializationCount == 0) return;
  if (--sInitializationCount == 0 && sToolkitUp.load(std::memory_order_acquire)) {
    xmp_terminate();
    detail::StopCollectingToolkitOutput();
    detail::ForgetNamespaces();
    sToolkitUp.store(false, std::memory_order_release);
  }
}

void XMPMeta::SetClientName(const std::string& name) {
  std::lock_guard<std::mutex> lock(sStateMutex);
  sClientName = name;
}

std::string XMPMeta::GetClientName() {
  std::lock_guard<std::mutex> lock(sStateMutex);
  return sClientName;
}

void XMPMeta::RegisterAssertNotify(XMP_AssertNotifyProc proc, void* refCon) {
  std::lock_guard<std::mutex> lock(sStateMutex);
  sAssertProc = proc;
  sAssertRefCon = proc ? refCon : nullptr;
}

bool XMPMeta::RegisterNamespace(const std::string& namespaceURI,
                                const std::string& suggestedPrefix,
                                std::string* registeredPrefix) {
  detail::EnsureStarted();
  const std::string bare = WithoutColon(suggestedPrefix);
  if (namespaceURI.empty()) detail::Throw(kXMPErr_BadParam, "empty namespace URI");
  if (!IsValidPrefix(bare)) detail::Throw(kXMPErr_BadParam, "invalid namespace prefix \"" + suggestedPrefix + "\"");
  detail::XmpString actual;
  {
    // The toolkit's registry is process-wide; registrations from several
    // threads are taken one at a time.
    std::lock_guard<std::mutex> lock(sRegistrationMutex);
    xmp_register_namespace(namespaceURI.c_str(), bare.c_str(), actual);
  }
  // The toolkit's answer mixes "prefix taken" and failure; ask the registry.
  detail::XmpString now;
  if (!xmp_namespace_prefix(namespaceURI.c_str(), now))
    detail::ThrowLastError(kXMPErr_BadParam, "registering namespace \"" + namespaceURI + "\"");
  const std::string inUse = now.str();
  if (registeredPrefix) *registeredPrefix = inUse;
  return WithoutColon(inUse) == bare;
}

std::optional<std::string> XMPMeta::GetNamespacePrefix(const std::string& namespaceURI) {
  std::string prefix;
  if (!detail::LookupPrefix(namespaceURI, &prefix)) return std::nullopt;
  return prefix;
}

std::string XMPMeta::GetVersionInfo() {
  detail::EnsureStarted();
  // The core names itself in the x:xmptk attribute of every packet it writes.
  XmpPtr empty = xmp_new_empty();
  detail::XmpString out;
  const bool ok = empty && xmp_serialize(empty, out, kXMP_OmitPacketWrapper, 0);
  if (empty) xmp_free(empty);
  if (!ok) detail::ThrowLastError(kXMPErr_InternalFailure, "reading the toolkit version");
  const std::string text = out.str();
  const std::string key = "x:xmptk=\"";
  const auto start = text.find(key);
  if (start == std::string::npos) return std::string();
  const auto end = text.find('"', start + key.size());
  return text.substr(start + key.size(), end - start - key.size());
}

bool XMPFiles::Initialize(const std::string&) {
  XMPMeta::Initialize();
  std::lock_guard<std::mutex> lock(sStateMutex);
  ++sFilesInitializationCount;
  return true;
}

void XMPFiles::Terminate() {
  {
    std::lock_guard<std::mutex> lock(sStateMutex);
    if (sFilesInitializationCount == 0) return;
    --sFilesInitializationCount;
  }
  XMPMeta::Terminate();
}

}  // namespace ovraxmp
