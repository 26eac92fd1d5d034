// ovrametadata: providers, the owners of XMP packets. Clients reach a
// provider's packet only through the read and update guards below; an update
// guard writes the changed paths back when it ends. Providers, their guards
// and their callbacks are used from one thread at a time; nothing here takes
// a lock.
#pragma once

#include <cstddef>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include <boost/shared_ptr.hpp>
#include <boost/smart_ptr/owner_less.hpp>

#include <ovrametadata/Common.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

// What QueryPathStatus is asked about a path.
enum PathStatus : int {
  kPathStatusReadable = 0,
  kPathStatusWritable = 1,
};

// Called with the provider's new packet (possibly null) whenever the packet
// is replaced. A client withdraws its callback by emptying the function
// object it shares with the provider (`*callback = nullptr`).
using MetaDataChangedCallback = std::function<void(XMPMetaRef)>;
using MetaDataChangedCallbackPtr = std::shared_ptr<MetaDataChangedCallback>;

// The abstract provider. Virtual operations keep this order; subclasses
// append theirs after them.
class OVRAMETADATA_EXPORT MetaDataProvider {
 public:
  MetaDataProvider();
  MetaDataProvider(const MetaDataProvider&) = delete;
  MetaDataProvider& operator=(const MetaDataProvider&) = delete;
  // Empties the function object of every registered callback, so that
  // every other holder sees it as withdrawn.
  virtual ~MetaDataProvider();

  // Whether the path may be read or written. The base answers false only
  // for kPathStatusWritable while XMP writing is disabled; the path itself
  // is not examined.
  virtual bool QueryPathStatus(const Path& path, PathStatus status) const;
  // True when WriteChanges needs no change history recorded in the packet
  // by the base driver. Base: false.
  virtual bool WritesOwnChangeList();
  // Fills outProperties (cleared first where a provider overrides it) with
  // definitions of the properties the provider holds in a dynamic
  // namespace. Base: leaves the vector as it is.
  virtual void GetAllPathsForDynamicSchema(
      const UTF8String& namespaceURI,
      std::vector<boost::shared_ptr<PropertyDefinition>>& outProperties);
  // Debugging aids; the base returns empty strings.
  virtual std::string DebugSerializedXMP() const;
  virtual std::string DebugDescription(bool verbose, int indent) const;
  // The packet, without adding a reference; null when there is none. Use a
  // guard instead of calling this directly.
  virtual XMPMetaRef MetaDataAccess() const = 0;
  // Writes the whole packet (or the given paths) back to where it came
  // from. Must not throw: it runs from an update guard's destructor.
  virtual void WriteChanges(const std::vector<Path>& paths) = 0;
  // The write-back driver called by the update guard. Does nothing for an
  // empty list, a null packet or while this provider is already writing.
  // Records the change history in the packet unless WritesOwnChangeList();
  // a toolkit failure while recording is thrown as the toolkit's error.
  virtual void DoWriteChanges(const std::vector<Path>& paths);

  // Appends a callback after dropping the withdrawn ones. Neither null nor
  // duplicates are refused: a pointer registered twice is called twice.
  void NotifyWhenMetaDataChanged(const MetaDataChangedCallbackPtr& callback);
  // Removes the first entry holding the same function object; no-op when
  // there is none.
  void RemoveMetaDataChangedNotification(const MetaDataChangedCallbackPtr& callback);
  // Calls every callback that is still set with the current packet, on a
  // snapshot of the list (callbacks may register or withdraw callbacks).
  // Silent while the provider is writing its own changes back. An exception
  // thrown by a callback propagates and stops the remaining ones.
  void MetaDataChanged();

  // Dynamic schemas known to this provider (besides the global registry).
  bool DoesDynamicNamespaceExist(const UTF8String& namespaceURI) const;
  // Adds the schema unless one with the same namespace is already known,
  // and registers it globally when the registry lacks its namespace. A null
  // schema is ignored.
  void AddDynamicSchemaDefinition(boost::shared_ptr<SchemaDefinition> schema);
  // The provider's dynamic schemas in the order added; valid until the next
  // AddDynamicSchemaDefinition.
  Range<boost::shared_ptr<SchemaDefinition>> DynamicSchemaDefinitions() const;

 protected:
  bool mWriting;

 private:
  std::vector<boost::shared_ptr<SchemaDefinition>> mDynamicSchemas;
  std::set<UTF8String> mDynamicNamespaces;
  std::list<MetaDataChangedCallbackPtr> mNotifications;
  bool mClearCallbacksOnDestruction;
};

// A provider that holds one packet with one reference of its own.
class OVRAMETADATA_EXPORT TypicalProviderImpl : public MetaDataProvider {
 public:
  // Takes a reference to xmp (null: no metadata) and notifies.
  explicit TypicalProviderImpl(XMPMetaRef xmp);
  ~TypicalProviderImpl() override;

  XMPMetaRef MetaDataAccess() const override;

  // Replaces the packet (adding the new reference before releasing the old
  // one, so the same handle is safe) and notifies when asked. Open guards
  // keep working on the packet they took.
  void ResetMetaData(XMPMetaRef xmp, bool notify);
  // Replaces the packet by a new empty one owned by this provider alone.
  void ResetToEmptyMetaData(bool notify);

 private:
  XMPMetaRef mMetaData;
};

// A provider built from other providers; it is told of each of their
// packet replacements through OnProxyMetaDataChange.
class OVRAMETADATA_EXPORT ProxyProviderImpl : public TypicalProviderImpl {
 public:
  ProxyProviderImpl();
  // Adds each non-null provider of the range, in order.
  explicit ProxyProviderImpl(Range<boost::shared_ptr<MetaDataProvider>> providers);
  // Withdraws every callback this proxy ever registered.
  ~ProxyProviderImpl() override;

  // True when every proxied provider writes its own change list (true for
  // none).
  bool WritesOwnChangeList() override;
  // Like the base driver, without recording a change history at this level.
  void DoWriteChanges(const std::vector<Path>& paths) override;

  // Called whenever a proxied provider's packet is replaced (and by the
  // concrete proxies to rebuild); the argument is the member's new packet.
  virtual void OnProxyMetaDataChange(XMPMetaRef changed) = 0;

  // Ignores null; otherwise keeps the provider and registers a callback
  // with it.
  void AddProxyProvider(const boost::shared_ptr<MetaDataProvider>& provider);
  // Forgets every proxied provider and this proxy's own references to its
  // callbacks; the old providers keep the callbacks registered.
  void ResetProxyProviders();
  void ResetProxyProviders(Range<boost::shared_ptr<MetaDataProvider>> providers);

 protected:
  std::vector<boost::shared_ptr<MetaDataProvider>> mProxyProviders;
  std::vector<MetaDataChangedCallbackPtr> mProxyCallbacks;

 private:
  // Every callback handed out, so that none outlives the proxy in a usable
  // state.
  std::vector<std::weak_ptr<MetaDataChangedCallback>> mIssuedCallbacks;
};

// A read guard: holds a reference to the provider's packet of the moment.
// The handle is null for a null provider or a provider without metadata.
class OVRAMETADATA_EXPORT MetaDataReadAccess {
 public:
  explicit MetaDataReadAccess(const boost::shared_ptr<MetaDataProvider>& provider);
  MetaDataReadAccess(const MetaDataReadAccess&) = delete;
  MetaDataReadAccess& operator=(const MetaDataReadAccess&) = delete;
  virtual ~MetaDataReadAccess();

  // The packet handle, valid while the guard lives; may be null.
  XMPMetaRef operator*() const { return mMetaData; }

 private:
  XMPMetaRef mMetaData;
};

// An update guard: the packet plus the list of changed paths. When it ends,
// the provider writes the changes back (an empty list writes nothing). The
// guard keeps the provider alive.
class OVRAMETADATA_EXPORT MetaDataUpdateAccess : public MetaDataReadAccess {
 public:
  explicit MetaDataUpdateAccess(const boost::shared_ptr<MetaDataProvider>& provider);
  ~MetaDataUpdateAccess() override;

  // Records a changed path (duplicates are kept, in order).
  void AddChange(const Path& path);
  bool HasChanges() const { return !mChanges.empty(); }

 private:
  // Declared in this order so that the change list goes before the
  // provider, and both before the packet reference of the base.
  boost::shared_ptr<MetaDataProvider> mProvider;
  std::vector<Path> mChanges;
};

// A provider over a serialised packet held by the application. The
// subclass receives the re-serialised packet on write-back.
class OVRAMETADATA_EXPORT BufferProviderImpl : public TypicalProviderImpl {
 public:
  // See ResetBuffer; the bytes are not kept.
  BufferProviderImpl(const unsigned char* data, std::size_t length);

  // Parses the bytes into a new packet (null data or zero length: a new
  // empty packet; bytes that do not parse: no metadata, silently) and
  // notifies.
  void ResetBuffer(const unsigned char* data, std::size_t length);
  // Serialises the packet and hands it to WriteBuffer; every failure,
  // including one thrown by WriteBuffer, is dropped. Runs even while XMP
  // writing is disabled: the bytes go to the application, not to a file.
  void WriteChanges(const std::vector<Path>& paths) override;

  // Stores the serialised packet (UTF-8 bytes, valid during the call only)
  // wherever the buffer came from.
  virtual void WriteBuffer(const std::vector<Path>& changes, const char* data,
                           std::size_t length) = 0;
};

// A provider over the XMP embedded in a media file.
class OVRAMETADATA_EXPORT FileProvider : public TypicalProviderImpl {
 public:
  // Reads the file; an empty path leaves the provider without metadata and
  // touches no file.
  explicit FileProvider(const UTF16String& path);

  const UTF16String& FilePath() const { return mFilePath; }
  // Reloads only when path differs from the current one (code units).
  void ResetFilePath(const UTF16String& path);
  // Reads the file's XMP again and notifies. A file that cannot be opened
  // or has no XMP gives no metadata; nothing is reported.
  void ReloadFile();
  // Writes the packet into the file (the list is not consulted): what
  // changed since the file was read goes into the packet the file holds
  // now, and nothing else in the file changes. Does nothing without
  // metadata or while XMP writing is disabled; a failure is not reported
  // and leaves the file byte for byte as it was.
  void WriteChanges(const std::vector<Path>& paths) override;
  // Why the last write-back left the file as it was, in one line; empty
  // after one that succeeded or had nothing to write.
  const UTF16String& LastWriteFailure() const { return mWriteFailure; }

 private:
  UTF16String mFilePath;
  UTF16String mWriteFailure;
};

// One packet over several providers: differing values are marked as
// multi-valued, and write-back distributes the edited packet to every
// member that accepts all changed paths.
class OVRAMETADATA_EXPORT AggregateProvider : public ProxyProviderImpl {
 public:
  AggregateProvider();
  explicit AggregateProvider(Range<boost::shared_ptr<MetaDataProvider>> providers);

  // True when any member accepts the path; false without members.
  bool QueryPathStatus(const Path& path, PathStatus status) const override;
  // The properties in namespaceURI over all members, one definition per
  // distinct property path, in discovery order (the vector is cleared first).
  void GetAllPathsForDynamicSchema(
      const UTF8String& namespaceURI,
      std::vector<boost::shared_ptr<PropertyDefinition>>& outProperties) override;
  // One member: its own guard writes it. Several: distribute to each member
  // that accepts every path, delete what was cleared, write each back. A
  // distribution failure is thrown as the toolkit's error; members before it
  // are written, later ones are not.
  void WriteChanges(const std::vector<Path>& paths) override;
  // Rebuilds the aggregate packet and notifies.
  void OnProxyMetaDataChange(XMPMetaRef changed) override;

  // Ignores null. Pass rebuild false when adding many and rebuild once.
  void AddProvider(const boost::shared_ptr<MetaDataProvider>& provider, bool rebuild);
  // Drops every member (null metadata afterwards) and notifies.
  void ResetProviders();
  void ResetProviders(Range<boost::shared_ptr<MetaDataProvider>> providers);
  // Learns the dynamic schemas of the registry and those used in packet.
  void GetAllDynamicSchemas(XMPMetaRef packet);

 protected:
  // Members in the order added (protected so that a subclass may hold null
  // entries, which the rebuild treats as a reset of what was collected).
  std::vector<boost::shared_ptr<MetaDataProvider>> mProviders;

 private:
  void DiscoverDynamicSchemas(XMPMetaRef packet);
};

// One packet made of a base provider and providers that each own one
// schema. Reads see the union; writes go to the owner of each path's schema
// and everything else to the base.
class OVRAMETADATA_EXPORT DisjointSchemaProxyProvider : public ProxyProviderImpl {
 public:
  DisjointSchemaProxyProvider();

  // The routed provider's answer for a routed schema, else the base's, else
  // the base class answer.
  bool QueryPathStatus(const Path& path, PathStatus status) const override;
  void WriteChanges(const std::vector<Path>& paths) override;
  void OnProxyMetaDataChange(XMPMetaRef changed) override;

  // Null clears the base and does nothing more.
  void RegisterBaseProvider(const boost::shared_ptr<MetaDataProvider>& base);
  // Routes the schema object (by identity) to provider; ignored when either
  // is null; replaces an earlier route of the same schema object.
  void RegisterProvider(const boost::shared_ptr<SchemaDefinition>& schema,
                        const boost::shared_ptr<MetaDataProvider>& provider);
  void ClearProviders();

 private:
  using RouteMap = std::map<boost::shared_ptr<SchemaDefinition>,
                            boost::shared_ptr<MetaDataProvider>,
                            boost::owner_less<boost::shared_ptr<SchemaDefinition>>>;
  bool CollectRoutes(XMPMetaRef packet);

  RouteMap mRoutes;
  boost::shared_ptr<MetaDataProvider> mBaseProvider;
};

}  // namespace ovrametadata
