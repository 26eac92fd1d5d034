// The cache of registered namespaces that lets the layer test registration
// before calling the toolkit (which complains on stderr about unknown ones).
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

std::string RequirePrefix(const std::string& namespaceURI) {
  std::string prefix;
  if (!LookupPrefix(namespaceURI, &prefix)) Throw(kXMPErr_BadSchema, "namespace \"" + namespaceURI + "\"");
  return prefix;
}

void ForgetNamespaces() {
  std::unique_lock<std::shared_mutex> lock(sCacheMutex);
  sPrefixes.clear();
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
