// ovraxmp: the XMP packet holder and the process-wide toolkit functions.
#pragma once

#include <cstdint>
#include <string>

#include <ovrametadata/XMPMetaRef.h>
#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>

namespace ovraxmp {

// Called by the toolkit for internal assertions; the layer accepts and keeps
// the registration (the underlying toolkit raises none).
using XMP_AssertNotifyProc = void (*)(void* refCon, const char* message);

// RAII holder of one reference to a packet. All operations throw XMP_Error
// on failure; reads of absent properties answer false instead of throwing.
// A holder without packet (built from a null handle) throws kXMPErr_BadObject
// from every operation that needs one. One packet must not be used from two
// threads at once; different packets may.
class XMPMeta {
 public:
  // A new, empty packet.
  XMPMeta();
  // Adds a reference to ref; a null ref gives a holder without packet.
  explicit XMPMeta(XMPMetaRef ref);
  XMPMeta(const XMPMeta& other);
  XMPMeta(XMPMeta&& other) noexcept;
  XMPMeta& operator=(const XMPMeta& other);
  XMPMeta& operator=(XMPMeta&& other) noexcept;
  ~XMPMeta();

  // The handle, without adding a reference; null when there is no packet.
  XMPMetaRef GetInternalRef() const { return mRef; }

  // ---- Process-wide start and stop (counted; thread-safe) ----
  // Starts the toolkit on the first call; throws XMP_Error when it fails.
  static bool Initialize();
  // Stops the toolkit when the count drops to zero; extra calls are ignored.
  static void Terminate();
  // The core's version text, e.g. "Exempi + XMP Core 6.0.0".
  static std::string GetVersionInfo();
  // The application name used for history events (softwareAgent).
  static void SetClientName(const std::string& name);
  static std::string GetClientName();
  // Records an assertion callback; a null proc unregisters it.
  static void RegisterAssertNotify(XMP_AssertNotifyProc proc, void* refCon);

  // ---- Namespace registry (process-wide) ----
  // Registers namespaceURI with suggestedPrefix (with or without trailing
  // colon). Answers true when the namespace is (now or already) registered
  // under that prefix, false when it got another prefix because the
  // suggested one was taken or the namespace already had one. The prefix in
  // use, with its trailing colon, goes to registeredPrefix when non-null.
  // Throws kXMPErr_BadParam for an empty URI or an invalid prefix.
  static bool RegisterNamespace(const std::string& namespaceURI,
                                const std::string& suggestedPrefix,
                                std::string* registeredPrefix);
  // The prefix with trailing colon ("dc:"); false (prefix untouched) when
  // the namespace is not registered.
  static bool GetNamespacePrefix(const std::string& namespaceURI, std::string* prefix);
  // Accepts the prefix with or without colon; false when it is not registered.
  static bool GetNamespaceURI(const std::string& prefix, std::string* namespaceURI);

 private:
  XMPMetaRef mRef = nullptr;
};

// Reference counting for code that keeps raw handles; both accept null.
void XMPMetaRefAddRef(XMPMetaRef ref);
void XMPMetaRefRelease(XMPMetaRef ref);
// The number of references held on ref (0 for null); for diagnostics and
// tests, since other threads may change it at any time.
std::int32_t XMPMetaRefGetCount(XMPMetaRef ref);

}  // namespace ovraxmp
