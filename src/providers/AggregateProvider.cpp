// The aggregate provider: one packet merged from several providers, and
// write-back by distributing the edited packet to each of them.
#include <ovrametadata/Providers.h>

#include <set>
#include <string>

#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/ValueEditing.h>
#include <ovrametadata/Values.h>

namespace ovrametadata {

namespace {

// Distribution leaves a member's old value in place when the user cleared
// the value in the aggregate; delete it explicitly. A multi-valued property
// is not cleared, only untouched.
void DeletePropertyIfAggregatedIsEmpty(XMPMetaRef aggregate, ovraxmp::XMPMeta& member,
                                       const Path& path) {
  UTF8String value;
  GetValueResult result = ValueAbsent;
  GetValue(aggregate, path, value, &result);
  if (result == ValueMixed || !value.empty()) return;
  // A structure or an array of structures has no text of its own: it was
  // cleared only when the aggregate no longer holds it.
  if (result != ValueFound && HasValue(aggregate, path)) return;
  member.DeleteProperty(path.namespaceURI, path.description);
}

// The part of a property path after its prefix ("dc:title" gives "title").
UTF8String LocalName(const UTF8String& path) {
  const std::string::size_type colon = path.find(':');
  return colon == std::string::npos ? path : path.substr(colon + 1);
}

}  // namespace

AggregateProvider::AggregateProvider() = default;

AggregateProvider::AggregateProvider(Range<boost::shared_ptr<MetaDataProvider>> providers) {
  ResetProviders(providers);
}

void AggregateProvider::AddProvider(const boost::shared_ptr<MetaDataProvider>& provider,
                                    bool rebuild) {
  if (!provider) return;
  mProviders.push_back(provider);
  AddProxyProvider(provider);
  if (rebuild) OnProxyMetaDataChange(nullptr);
}

void AggregateProvider::ResetProviders() {
  mProviders.clear();
  ResetProxyProviders();
  OnProxyMetaDataChange(nullptr);
}

void AggregateProvider::ResetProviders(Range<boost::shared_ptr<MetaDataProvider>> providers) {
  mProviders.clear();
  ResetProxyProviders();
  for (const boost::shared_ptr<MetaDataProvider>& provider : providers) {
    AddProvider(provider, false);
  }
  OnProxyMetaDataChange(nullptr);
}

bool AggregateProvider::QueryPathStatus(const Path& path, PathStatus status) const {
  for (const boost::shared_ptr<MetaDataProvider>& provider : mProviders) {
    if (provider && provider->QueryPathStatus(path, status)) return true;
  }
  return false;
}

void AggregateProvider::OnProxyMetaDataChange(XMPMetaRef /*changed*/) {
  ovraxmp::XMPMeta target;
  XMPMetaRef result = nullptr;
  if (mProviders.size() >= 2) {
    bool collected = false;
    for (const boost::shared_ptr<MetaDataProvider>& provider : mProviders) {
      if (!provider) {
        // Only the members after the last null entry count; kept on purpose.
        collected = false;
        continue;
      }
      const XMPMetaRef member = provider->MetaDataAccess();
      if (!member) continue;
      try {
        ovraxmp::XMPUtils::MultiFileCollect(&target, ovraxmp::XMPMeta(member), 0);
        collected = true;
      } catch (const ovraxmp::XMP_Error&) {
        // A member that cannot be collected is left out, without a report.
      }
    }
    if (collected) result = target.GetInternalRef();
  } else if (mProviders.size() == 1 && mProviders.front()) {
    // Shared, not copied: edits through the aggregate land in the member.
    result = mProviders.front()->MetaDataAccess();
  }
  if (result) {
    for (const boost::shared_ptr<MetaDataProvider>& provider : mProviders) {
      if (provider) GetAllDynamicSchemas(provider->MetaDataAccess());
    }
  }
  ResetMetaData(result, true);
}

void AggregateProvider::WriteChanges(const std::vector<Path>& paths) {
  if (mProviders.empty()) return;
  if (mProviders.size() == 1) {
    if (!mProviders.front()) return;
    MetaDataUpdateAccess access(mProviders.front());
    for (const Path& path : paths) access.AddChange(path);
    return;
  }
  const XMPMetaRef aggregateRef = MetaDataAccess();
  if (!aggregateRef) return;
  const ovraxmp::XMPMeta aggregate(aggregateRef);
  for (const boost::shared_ptr<MetaDataProvider>& provider : mProviders) {
    if (!provider) continue;
    bool acceptsAll = true;
    for (const Path& path : paths) {
      if (!provider->QueryPathStatus(path, kPathStatusWritable)) {
        acceptsAll = false;
        break;
      }
    }
    // A member that cannot take every change takes none.
    if (!acceptsAll) continue;
    MetaDataUpdateAccess access(provider);
    if (!*access) continue;
    ovraxmp::XMPMeta member(*access);
    ovraxmp::XMPUtils::MultiFileDistribute(aggregate, &member, 0);
    for (const Path& path : paths) DeletePropertyIfAggregatedIsEmpty(aggregateRef, member, path);
    for (const Path& path : paths) access.AddChange(path);
  }
}

void AggregateProvider::GetAllDynamicSchemas(XMPMetaRef packet) {
  for (const boost::shared_ptr<SchemaDefinition>& schema : ovrametadata::DynamicSchemaDefinitions()) {
    if (schema && !DoesDynamicNamespaceExist(schema->namespaceURI)) {
      AddDynamicSchemaDefinition(schema);
    }
  }
  if (!packet) return;
  try {
    DiscoverDynamicSchemas(packet);
  } catch (const ovraxmp::XMP_Error&) {
    // A packet the toolkit cannot walk contributes no schemas.
  }
}

void AggregateProvider::DiscoverDynamicSchemas(XMPMetaRef packet) {
  const ovraxmp::XMPMeta meta(packet);
  ovraxmp::XMPIterator namespaces(meta, ovraxmp::kXMP_IterJustChildren);
  std::string namespaceURI, propertyPath, value;
  ovraxmp::XMP_OptionBits options = 0;
  while (namespaces.Next(&namespaceURI, &propertyPath, &value, &options)) {
    if (namespaceURI.empty() || !IsDynamicNamespace(namespaceURI) ||
        DoesDynamicNamespaceExist(namespaceURI)) {
      continue;
    }
    UTF8String prefix;
    ovraxmp::XMPIterator properties(meta, namespaceURI, ovraxmp::kXMP_IterProperties);
    std::string ns, path;
    while (properties.Next(&ns, &path, &value, &options)) {
      if (path.empty()) continue;
      const std::string::size_type colon = path.find(':');
      prefix = colon == std::string::npos ? path : path.substr(0, colon);
      break;
    }
    if (prefix.empty()) continue;
    const UTF16String uri16 = ovracore::ToUTF16(namespaceURI);
    const UTF16String prefix16 = ovracore::ToUTF16(prefix);
    boost::shared_ptr<SchemaDefinition> schema =
        CreateNewSchema(namespaceURI, prefix, prefix16, prefix16, uri16, uri16);
    schema->isDynamic = true;
    schema->isCustom = false;
    AddDynamicSchemaDefinition(schema);
  }
}

void AggregateProvider::GetAllPathsForDynamicSchema(
    const UTF8String& namespaceURI,
    std::vector<boost::shared_ptr<PropertyDefinition>>& outProperties) {
  outProperties.clear();
  std::set<std::string> seen;
  for (const boost::shared_ptr<MetaDataProvider>& provider : mProviders) {
    if (!provider || !provider->MetaDataAccess()) continue;
    try {
      const ovraxmp::XMPMeta meta(provider->MetaDataAccess());
      ovraxmp::XMPIterator properties(meta, namespaceURI, ovraxmp::kXMP_IterProperties);
      // Only the paths are needed: values are not fetched.
      std::string path;
      ovraxmp::XMP_OptionBits options = 0;
      while (properties.Next(nullptr, &path, nullptr, &options)) {
        if (path.empty() || !seen.insert(path).second) continue;
        const UTF8String name = LocalName(path);
        const UTF16String name16 = ovracore::ToUTF16(name);
        outProperties.push_back(CreateNewProperty(kPrimitiveType_text, name, UTF16String(), name16,
                                                  UTF16String(), name16));
      }
    } catch (const ovraxmp::XMP_Error&) {
      // A namespace the toolkit does not know has no properties to offer.
    }
  }
}

}  // namespace ovrametadata
