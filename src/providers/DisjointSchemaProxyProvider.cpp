// The disjoint-schema proxy: a base provider plus one provider per routed
// schema, shown as one packet and written back per owner.
#include <ovrametadata/Providers.h>

#include <list>

#include <ovraxmp/XMPToolkit.h>

namespace ovrametadata {

namespace {

constexpr ovraxmp::XMP_OptionBits kAppendAllReplacing =
    ovraxmp::kXMPUtil_DoAllProperties | ovraxmp::kXMPUtil_ReplaceOldValues;  // 3

}  // namespace

DisjointSchemaProxyProvider::DisjointSchemaProxyProvider() = default;

void DisjointSchemaProxyProvider::RegisterBaseProvider(
    const boost::shared_ptr<MetaDataProvider>& base) {
  mBaseProvider = base;
  if (!base) return;
  AddProxyProvider(base);
  OnProxyMetaDataChange(nullptr);
}

void DisjointSchemaProxyProvider::RegisterProvider(
    const boost::shared_ptr<SchemaDefinition>& schema,
    const boost::shared_ptr<MetaDataProvider>& provider) {
  if (!schema || !provider) return;
  mRoutes[schema] = provider;
  AddProxyProvider(provider);
  OnProxyMetaDataChange(nullptr);
}

void DisjointSchemaProxyProvider::ClearProviders() {
  mBaseProvider.reset();
  mRoutes.clear();
  ResetProxyProviders();
  OnProxyMetaDataChange(nullptr);
}

bool DisjointSchemaProxyProvider::QueryPathStatus(const Path& path, PathStatus status) const {
  const boost::shared_ptr<SchemaDefinition> schema = NamespaceDefinition(path.namespaceURI);
  if (schema) {
    const RouteMap::const_iterator route = mRoutes.find(schema);
    if (route != mRoutes.end()) return route->second->QueryPathStatus(path, status);
  }
  if (mBaseProvider) return mBaseProvider->QueryPathStatus(path, status);
  return MetaDataProvider::QueryPathStatus(path, status);
}

bool DisjointSchemaProxyProvider::CollectRoutes(XMPMetaRef packet) {
  bool collected = false;
  ovraxmp::XMPMeta destination(packet);
  for (const RouteMap::value_type& route : mRoutes) {
    const XMPMetaRef routed = route.second->MetaDataAccess();
    if (!routed) continue;
    try {
      ovraxmp::XMPUtils::AppendProperties(ovraxmp::XMPMeta(routed), &destination,
                                          kAppendAllReplacing);
      collected = true;
    } catch (const ovraxmp::XMP_Error&) {
      // A route whose packet cannot be appended is left out of the view.
    }
  }
  return collected;
}

void DisjointSchemaProxyProvider::OnProxyMetaDataChange(XMPMetaRef /*changed*/) {
  ovraxmp::XMPMeta fresh;
  XMPMetaRef packet = fresh.GetInternalRef();
  const XMPMetaRef basePacket = mBaseProvider ? mBaseProvider->MetaDataAccess() : nullptr;
  // The base's own packet object, shared: the routed schemas are appended
  // into it.
  if (basePacket) packet = basePacket;
  const bool collected = CollectRoutes(packet);
  ResetMetaData(basePacket || collected ? packet : nullptr, true);
}

void DisjointSchemaProxyProvider::WriteChanges(const std::vector<Path>& paths) {
  const XMPMetaRef proxyRef = MetaDataAccess();
  if (!proxyRef) return;
  ovraxmp::XMPMeta proxy(proxyRef);
  std::list<Path> remaining(paths.begin(), paths.end());

  for (const RouteMap::value_type& route : mRoutes) {
    MetaDataUpdateAccess access(route.second);
    if (!*access) continue;
    ovraxmp::XMPMeta routed(*access);
    const UTF8String& routedNamespace = route.first->namespaceURI;
    for (std::list<Path>::iterator it = remaining.begin(); it != remaining.end();) {
      if (it->namespaceURI != routedNamespace) {
        ++it;
        continue;
      }
      routed.DeleteProperty(it->namespaceURI, it->description);
      // A property cleared in the proxy is simply gone from the owner too.
      if (proxy.DoesPropertyExist(it->namespaceURI, it->description)) {
        ovraxmp::XMPUtils::DuplicateSubtree(proxy, &routed, it->namespaceURI, it->description,
                                            it->namespaceURI, it->description, 0);
      }
      access.AddChange(*it);
      it = remaining.erase(it);
    }
  }

  if (mBaseProvider && !remaining.empty()) {
    // The base must never write the routed schemas into its own store.
    for (const RouteMap::value_type& route : mRoutes) {
      ovraxmp::XMPUtils::RemoveProperties(&proxy, route.first->namespaceURI, "",
                                          ovraxmp::kXMPUtil_DoAllProperties);
    }
    {
      MetaDataUpdateAccess access(mBaseProvider);
      for (const Path& path : remaining) access.AddChange(path);
    }
    CollectRoutes(proxyRef);
  }
}

}  // namespace ovrametadata
