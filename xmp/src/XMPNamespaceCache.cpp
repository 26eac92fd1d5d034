// The cache of registered namespaces that lets the layer test registration
// before calling the toolkit (which complains on stderr about unknown ones).
#include <atomic>
#include <mutex>
#include <shared_mutex>
#include <string>
#include <unordered_map>
#include <unordered_set>

#include "XMPPacket.h"

namespace ovraxmp {
namespace detail {
namespace {

std::shared_mutex sCacheMutex;
std::unordered_map<std::string, std::string> sPrefixes;  // URI -> prefix with colon
// Bumped whenever the cache is emptied, so that per-thread shortcuts expire.
std::atomic<unsigned> sGeneration{0};

}  // namespace

bool LookupPrefix(const std::string& namespaceURI, std::string* prefix) {
  {
    std::shared_lock<std::shared_mutex> lock(sCacheMutex);
    const auto found = sPrefixes.find(namespaceURI);
    if (found != sPrefixes.end()) {
      if (prefix) *prefix = found->second;
      return true;
    }
  }
  if (namespaceURI.empty()) return false;
  EnsureStarted();
  XmpString text;
  if (!xmp_namespace_prefix(namespaceURI.c_str(), text)) return false;
  std::string value = text.str();
  if (prefix) *prefix = value;
  std::unique_lock<std::shared_mutex> lock(sCacheMutex);
  sPrefixes.emplace(namespaceURI, std::move(value));
  return true;
}

bool NamespaceKnown(const std::string& namespaceURI) { return LookupPrefix(namespaceURI, nullptr); }

bool NamespaceKnown(XMPPacket& packet, const std::string& namespaceURI) {
  const unsigned generation = sGeneration.load(std::memory_order_acquire);
  if (packet.mKnownGeneration == generation && packet.mKnownNS == namespaceURI) return true;
  if (!LookupPrefix(namespaceURI, nullptr)) return false;
  packet.mKnownGeneration = generation;
  packet.mKnownNS = namespaceURI;
  return true;
}

std::string RequirePrefix(const std::string& namespaceURI) {
  std::string prefix;
  if (!LookupPrefix(namespaceURI, &prefix)) Throw(kXMPErr_BadSchema, "namespace \"" + namespaceURI + "\"");
  return prefix;
}

void ForgetNamespaces() {
  std::unique_lock<std::shared_mutex> lock(sCacheMutex);
  sPrefixes.clear();
  sGeneration.fetch_add(1, std::memory_order_acq_rel);
}

std::string NormalizedPath(const std::string& schemaNS, const std::string& path) {
  const auto colon = path.find(':');
  if (colon == std::string::npos) return path;
  const auto stop = path.find_first_of("/[");
  if (stop != std::string::npos && stop < colon) return path;
  std::string prefix;
  if (LookupPrefix(schemaNS, &prefix) && path.compare(0, prefix.size(), prefix) == 0)
    return path.substr(prefix.size());
  return path;
}

XMPPacket& Require(XMPMetaRef ref) {
  if (!ref) Throw(kXMPErr_BadObject, "no XMP packet");
  return *ref;
}

}  // namespace detail
}  // namespace ovraxmp
