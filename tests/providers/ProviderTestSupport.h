// Helpers of the provider and value-editing tests: the test schemas, packets
// written as RDF text, recording providers and media files with XMP.
#pragma once

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include <boost/make_shared.hpp>
#include <boost/shared_ptr.hpp>

#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"

namespace ovratest {

// Two schemas registered for every test of this program (after the
// library's own definitions): "pt" with simple, array and structure
// properties, and "pu" with one text property.
constexpr char kTestNS[] = "http://ns.example.org/provtest/1.0/";
constexpr char kOtherNS[] = "http://ns.example.org/provtest2/1.0/";

ovrametadata::Path TestPath(const std::string& property);
ovrametadata::Path OtherPath(const std::string& property);
// A field of a structure property of type PTPoint or PTOuter.
ovrametadata::Path FieldPath(const ovrametadata::Path& parent, const std::string& typeId,
                             const std::string& field);

// A whole packet whose rdf:Description holds `properties` (RDF/XML with
// the prefixes pt, pu, xmp and dc declared).
std::string PacketText(const std::string& properties);
ovraxmp::XMPMeta Packet(const std::string& properties);
std::string Serialize(XMPMetaRef xmp);

// The text read through the typed reader, and its result code.
std::string Text(XMPMetaRef xmp, const ovrametadata::Path& path);
ovrametadata::GetValueResult ResultOf(XMPMetaRef xmp, const ovrametadata::Path& path);
// The stored text of a simple property, read directly from the toolkit;
// "<absent>" when it is not there.
std::string Raw(XMPMetaRef xmp, const std::string& ns, const std::string& name);

// A buffer provider that records every write-back.
class RecordingBufferProvider : public ovrametadata::BufferProviderImpl {
 public:
  struct Write {
    std::vector<ovrametadata::Path> changes;
    std::string bytes;
  };
  explicit RecordingBufferProvider(const std::string& packetText);
  static boost::shared_ptr<RecordingBufferProvider> FromProperties(const std::string& properties);

  void WriteBuffer(const std::vector<ovrametadata::Path>& changes, const char* data,
                   std::size_t length) override;

  std::vector<Write> writes;
  bool throwOnWrite = false;
  // Called at the start of WriteBuffer, to test re-entrant use.
  std::function<void()> duringWrite;
};

class WritingDisabledScope {
 public:
  WritingDisabledScope() { ovrametadata::DisableXMPWriting(true); }
  ~WritingDisabledScope() { ovrametadata::DisableXMPWriting(false); }
};

// Sets one text property through an update guard, which writes it back;
// false when the value was already stored (nothing is then written).
bool Edit(const boost::shared_ptr<ovrametadata::MetaDataProvider>& provider,
          const ovrametadata::Path& path, const std::string& value);
// Notes a change of path in an update guard and closes it.
void Touch(const boost::shared_ptr<ovrametadata::MetaDataProvider>& provider,
           const ovrametadata::Path& path);

// What a recorded write-back holds for one simple property (see Raw).
std::string WrittenRaw(const RecordingBufferProvider::Write& write, const std::string& ns,
                       const std::string& name);

// A shared callback that counts its calls and keeps the handles it got.
struct CallCounter {
  CallCounter();
  ovrametadata::MetaDataChangedCallbackPtr callback;
  std::shared_ptr<int> calls;
  std::shared_ptr<std::vector<XMPMetaRef>> handles;
};

// ---- Media files ----
enum class MediaKind { JPEG, MP4, WAV };
// Writes a fresh media file; with properties non-empty, also embeds a packet
// with them (through the toolkit, so no provider is involved).
std::filesystem::path MakeMediaFile(const std::filesystem::path& folder, const std::string& stem,
                                    MediaKind kind, const std::string& properties);
// Embeds the packet in an existing file through the toolkit.
void PutXMPIntoFile(const std::filesystem::path& file, const ovraxmp::XMPMeta& packet);
std::u16string U16Path(const std::filesystem::path& path);
boost::shared_ptr<ovrametadata::FileProvider> OpenFile(const std::filesystem::path& path);


}  // namespace ovratest
