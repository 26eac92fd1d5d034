// The provider bases, the access guards and the change notifications.
#include <ovrametadata/Providers.h>

#include <algorithm>
#include <utility>

#include <ovraxmp/XMPDocOps.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Initialize.h>

#include "values/ValuesInternal.h"

namespace ovrametadata {

namespace {

// Clears mWriting on every way out of a write-back.
class WritingScope {
 public:
  explicit WritingScope(bool& flag) : mFlag(flag) { mFlag = true; }
  ~WritingScope() { mFlag = false; }
  WritingScope(const WritingScope&) = delete;
  WritingScope& operator=(const WritingScope&) = delete;

 private:
  bool& mFlag;
};

// The part name under which the change history records a changed path.
UTF8String ChangePartForPath(const Path& path) {
  static const UTF8String kMetadataPart("/metadata");
  static const UTF8String kSeparator("/");
  UTF8String part = kMetadataPart;
  const boost::shared_ptr<SchemaDefinition> schema = NamespaceDefinition(path.namespaceURI);
  if (schema) {
    part += kSeparator;
    part += schema->prefix;
    part += kSeparator;
    part += path.description;
  }
  return part;
}

// Reporting must not throw either: the guard's destructor calls it.
void ReportWriteBackFailure(const MetaDataProvider& provider, const std::vector<Path>& paths) noexcept {
  try {
    const auto* file = dynamic_cast<const FileProvider*>(&provider);
    ReportInvalidData(kErrorWritingXMP, paths.empty() ? Path() : paths.front(),
                      file ? file->FilePath() : UTF16String());
  } catch (...) {
    // Out of memory while reporting: the write-back is abandoned all the same.
  }
}

}  // namespace

// ---------------------------------------------------------------------------
// MetaDataProvider

MetaDataProvider::MetaDataProvider() : mWriting(false), mClearCallbacksOnDestruction(true) {}

MetaDataProvider::~MetaDataProvider() {
  if (mClearCallbacksOnDestruction) {
    for (const MetaDataChangedCallbackPtr& callback : mNotifications) {
      if (callback) *callback = nullptr;
    }
  }
}

bool MetaDataProvider::QueryPathStatus(const Path& /*path*/, PathStatus status) const {
  return !(IsXMPWritingDisabled() && status == kPathStatusWritable);
}

bool MetaDataProvider::WritesOwnChangeList() { return false; }

void MetaDataProvider::GetAllPathsForDynamicSchema(
    const UTF8String& /*namespaceURI*/,
    std::vector<boost::shared_ptr<PropertyDefinition>>& /*outProperties*/) {}

std::string MetaDataProvider::DebugSerializedXMP() const { return std::string(); }

std::string MetaDataProvider::DebugDescription(bool /*verbose*/, int /*indent*/) const {
  return std::string();
}

void MetaDataProvider::DoWriteChanges(const std::vector<Path>& paths) {
  const XMPMetaRef xmp = MetaDataAccess();
  if (!xmp) return;
  if (paths.empty() || mWriting) return;
  if (WritesOwnChangeList()) {
    WritingScope scope(mWriting);
    WriteChanges(paths);
    return;
  }
  {
    // The toolkit records which parts changed in the packet's history
    // before the provider writes it out.
    ovraxmp::XMPDocOps docOps;
    docOps.OpenXMP(ovraxmp::XMPMeta(xmp), "");
    for (const Path& path : paths) docOps.NoteChange(ChangePartForPath(path));
    docOps.PrepareForSave("");
  }
  WritingScope scope(mWriting);
  WriteChanges(paths);
}

void MetaDataProvider::NotifyWhenMetaDataChanged(const MetaDataChangedCallbackPtr& callback) {
  mNotifications.remove_if(
      [](const MetaDataChangedCallbackPtr& entry) { return !entry || !*entry; });
  mNotifications.push_back(callback);
}

void MetaDataProvider::RemoveMetaDataChangedNotification(
    const MetaDataChangedCallbackPtr& callback) {
  const auto found = std::find(mNotifications.begin(), mNotifications.end(), callback);
  if (found != mNotifications.end()) mNotifications.erase(found);
}

void MetaDataProvider::MetaDataChanged() {
  if (mWriting) return;
  const XMPMetaRef xmp = MetaDataAccess();
  const std::vector<MetaDataChangedCallbackPtr> snapshot(mNotifications.begin(),
                                                          mNotifications.end());
  for (const MetaDataChangedCallbackPtr& entry : snapshot) {
    if (!entry || !*entry) continue;
    MetaDataChangedCallback call = *entry;
    call(xmp);
  }
}

bool MetaDataProvider::DoesDynamicNamespaceExist(const UTF8String& namespaceURI) const {
  return mDynamicNamespaces.count(namespaceURI) != 0;
}

void MetaDataProvider::AddDynamicSchemaDefinition(boost::shared_ptr<SchemaDefinition> schema) {
  if (!schema) return;
  if (mDynamicNamespaces.insert(schema->namespaceURI).second) mDynamicSchemas.push_back(schema);
  if (!NamespaceDefinition(schema->namespaceURI)) {
    RegisterSchemaDefinition(schema, UTF16String(), false);
  }
}

Range<boost::shared_ptr<SchemaDefinition>> MetaDataProvider::DynamicSchemaDefinitions() const {
  return Range<boost::shared_ptr<SchemaDefinition>>(mDynamicSchemas);
}

// ---------------------------------------------------------------------------
// TypicalProviderImpl

TypicalProviderImpl::TypicalProviderImpl(XMPMetaRef xmp) : mMetaData(nullptr) {
  ResetMetaData(xmp, true);
}

TypicalProviderImpl::~TypicalProviderImpl() { ovraxmp::XMPMetaRefRelease(mMetaData); }

XMPMetaRef TypicalProviderImpl::MetaDataAccess() const { return mMetaData; }

void TypicalProviderImpl::ResetMetaData(XMPMetaRef xmp, bool notify) {
  ovraxmp::XMPMetaRefAddRef(xmp);
  ovraxmp::XMPMetaRefRelease(mMetaData);
  mMetaData = xmp;
  if (notify) MetaDataChanged();
}

void TypicalProviderImpl::ResetToEmptyMetaData(bool notify) {
  // The holder's reference is dropped when it goes, leaving the provider as
  // the only owner.
  const ovraxmp::XMPMeta empty;
  ResetMetaData(empty.GetInternalRef(), notify);
}

// ---------------------------------------------------------------------------
// ProxyProviderImpl

ProxyProviderImpl::ProxyProviderImpl() : TypicalProviderImpl(nullptr) {}

ProxyProviderImpl::ProxyProviderImpl(Range<boost::shared_ptr<MetaDataProvider>> providers)
    : TypicalProviderImpl(nullptr) {
  for (const boost::shared_ptr<MetaDataProvider>& provider : providers) {
    AddProxyProvider(provider);
  }
}

ProxyProviderImpl::~ProxyProviderImpl() {
  // The members may outlive this proxy; a callback left set would call into
  // a destroyed object.
  for (const std::weak_ptr<MetaDataChangedCallback>& weak : mIssuedCallbacks) {
    if (const MetaDataChangedCallbackPtr callback = weak.lock()) *callback = nullptr;
  }
}

bool ProxyProviderImpl::WritesOwnChangeList() {
  for (const boost::shared_ptr<MetaDataProvider>& provider : mProxyProviders) {
    if (!provider->WritesOwnChangeList()) return false;
  }
  return true;
}

void ProxyProviderImpl::DoWriteChanges(const std::vector<Path>& paths) {
  if (!MetaDataAccess()) return;
  if (paths.empty() || mWriting) return;
  WritingScope scope(mWriting);
  WriteChanges(paths);
}

void ProxyProviderImpl::AddProxyProvider(const boost::shared_ptr<MetaDataProvider>& provider) {
  if (!provider) return;
  mProxyProviders.push_back(provider);
  auto callback = std::make_shared<MetaDataChangedCallback>(
      [this](XMPMetaRef changed) { OnProxyMetaDataChange(changed); });
  mProxyCallbacks.push_back(callback);
  // Pruned lazily: expired entries cost one weak pointer each.
  mIssuedCallbacks.erase(
      std::remove_if(mIssuedCallbacks.begin(), mIssuedCallbacks.end(),
                     [](const std::weak_ptr<MetaDataChangedCallback>& w) { return w.expired(); }),
      mIssuedCallbacks.end());
  mIssuedCallbacks.push_back(callback);
  provider->NotifyWhenMetaDataChanged(callback);
}

void ProxyProviderImpl::ResetProxyProviders() {
  mProxyCallbacks.clear();
  mProxyProviders.clear();
}

void ProxyProviderImpl::ResetProxyProviders(Range<boost::shared_ptr<MetaDataProvider>> providers) {
  ResetProxyProviders();
  for (const boost::shared_ptr<MetaDataProvider>& provider : providers) {
    AddProxyProvider(provider);
  }
}

// ---------------------------------------------------------------------------
// Guards

MetaDataReadAccess::MetaDataReadAccess(const boost::shared_ptr<MetaDataProvider>& provider)
    : mMetaData(provider ? provider->MetaDataAccess() : nullptr) {
  ovraxmp::XMPMetaRefAddRef(mMetaData);
}

MetaDataReadAccess::~MetaDataReadAccess() { ovraxmp::XMPMetaRefRelease(mMetaData); }

MetaDataUpdateAccess::MetaDataUpdateAccess(const boost::shared_ptr<MetaDataProvider>& provider)
    : MetaDataReadAccess(provider), mProvider(provider) {}

MetaDataUpdateAccess::~MetaDataUpdateAccess() {
  // An exception escaping the write-back would end the process (destructors
  // are noexcept): a toolkit failure while recording the history or
  // distributing the changes is reported instead, and nothing is written.
  if (!mProvider) return;
  try {
    mProvider->DoWriteChanges(mChanges);
  } catch (...) {
    ReportWriteBackFailure(*mProvider, mChanges);
  }
}

void MetaDataUpdateAccess::AddChange(const Path& path) { mChanges.push_back(path); }

}  // namespace ovrametadata
