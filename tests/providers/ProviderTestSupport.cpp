#include "ProviderTestSupport.h"

#include <stdexcept>

#include <gtest/gtest.h>

#include <ovrametadata/Definitions.h>

#include "../xmp/XMPMediaFiles.h"

namespace ovratest {

namespace fs = std::filesystem;
using namespace ovrametadata;

namespace {

const char kTestDefinitions[] = R"(<?xml version="1.0" encoding="UTF-8"?>
<xmp_definitions>
  <xmp_type name="PTPoint" label="Point">
    <xmp_field namespace="http://ns.example.org/provtest/1.0/" prefix="pt" name="X" type="text" label="X"/>
    <xmp_field namespace="http://ns.example.org/provtest/1.0/" prefix="pt" name="Y" type="text" label="Y"/>
  </xmp_type>
  <xmp_type name="PTOuter" label="Outer">
    <xmp_field namespace="http://ns.example.org/provtest/1.0/" prefix="pt" name="Inner" type="PTPoint" label="Inner"/>
    <xmp_field namespace="http://ns.example.org/provtest/1.0/" prefix="pt" name="Tag" type="text" label="Tag"/>
  </xmp_type>
  <xmp_schema namespace="http://ns.example.org/provtest/1.0/" prefix="pt" label="Provider tests">
    <xmp_property name="Title" type="text" label="Title"/>
    <xmp_property name="Note" type="text" label="Note"/>
    <xmp_property name="Count" type="integer" label="Count"/>
    <xmp_property name="Ratio" type="real" label="Ratio"/>
    <xmp_property name="Tags" type="bag" element_type="text" label="Tags"/>
    <xmp_property name="Steps" type="seq" element_type="text" label="Steps"/>
    <xmp_property name="ISteps" type="seq" element_type="text" category="internal" label="Internal steps"/>
    <xmp_property name="Spot" type="PTPoint" label="Spot"/>
    <xmp_property name="Outer" type="PTOuter" label="Outer"/>
    <xmp_property name="Points" type="seq" element_type="PTPoint" label="Points"/>
  </xmp_schema>
  <xmp_schema namespace="http://ns.example.org/provtest2/1.0/" prefix="pu" label="Other tests">
    <xmp_property name="Title" type="text" label="Title"/>
    <xmp_property name="Owner" type="text" label="Owner"/>
  </xmp_schema>
</xmp_definitions>
)";

// Keeps the library started, with the test schemas registered, for the
// whole program.
class ProviderEnvironment : public ::testing::Environment {
 public:
  void SetUp() override {
    Initialize();
    ParseBufferAndRegisterDefinitions(kTestDefinitions, u"provider-tests", false);
    if (!NamespaceDefinition(kTestNS) || !NamespaceDefinition(kOtherNS)) {
      throw std::runtime_error("test schemas did not register");
    }
  }
  void TearDown() override { Terminate(); }
};

::testing::Environment* const kEnvironment =
    ::testing::AddGlobalTestEnvironment(new ProviderEnvironment);

}  // namespace

Path TestPath(const std::string& property) {
  return PathForSchemaNameAndPropertyName(UTF8String(kTestNS), property);
}

Path OtherPath(const std::string& property) {
  return PathForSchemaNameAndPropertyName(UTF8String(kOtherNS), property);
}

Path FieldPath(const Path& parent, const std::string& typeId, const std::string& field) {
  return CreatePathFromStructureField(parent, FieldNameDefinition(TypeIdDefinition(typeId), field));
}

std::string PacketText(const std::string& properties) {
  return std::string(
             "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\">"
             "<rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
             "<rdf:Description rdf:about=\"\""
             " xmlns:pt=\"http://ns.example.org/provtest/1.0/\""
             " xmlns:pu=\"http://ns.example.org/provtest2/1.0/\""
             " xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\""
             " xmlns:dc=\"http://purl.org/dc/elements/1.1/\">") +
         properties + "</rdf:Description></rdf:RDF></x:xmpmeta>";
}

ovraxmp::XMPMeta Packet(const std::string& properties) {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(PacketText(properties));
  return meta;
}

std::string Serialize(XMPMetaRef xmp) {
  std::string out;
  if (xmp) out = ovraxmp::XMPMeta(xmp).SerializeToBuffer(ovraxmp::kXMP_OmitPacketWrapper);
  return out;
}

std::string Text(XMPMetaRef xmp, const Path& path) {
  UTF8String value;
  GetValue(xmp, path, value);
  return value;
}

GetValueResult ResultOf(XMPMetaRef xmp, const Path& path) {
  UTF8String value;
  GetValueResult result = ValueError;
  GetValue(xmp, path, value, &result);
  return result;
}

std::string Raw(XMPMetaRef xmp, const std::string& ns, const std::string& name) {
  const auto node = xmp ? ovraxmp::XMPMeta(xmp).GetProperty(ns, name) : std::nullopt;
  return node ? node->value : "<absent>";
}

// ---------------------------------------------------------------------------

RecordingBufferProvider::RecordingBufferProvider(const std::string& packetText)
    : BufferProviderImpl(reinterpret_cast<const unsigned char*>(packetText.data()),
                         packetText.size()) {}

boost::shared_ptr<RecordingBufferProvider> RecordingBufferProvider::FromProperties(
    const std::string& properties) {
  return boost::make_shared<RecordingBufferProvider>(PacketText(properties));
}

void RecordingBufferProvider::WriteBuffer(const std::vector<Path>& changes, const char* data,
                                          std::size_t length) {
  if (duringWrite) duringWrite();
  if (throwOnWrite) throw std::runtime_error("the owner refuses the bytes");
  writes.push_back(Write{changes, std::string(data, length)});
}

bool Edit(const boost::shared_ptr<MetaDataProvider>& provider, const Path& path,
          const std::string& value) {
  MetaDataUpdateAccess access(provider);
  if (!SetValue(*access, path, UTF8String(value))) return false;
  access.AddChange(path);
  return true;
}

void Touch(const boost::shared_ptr<MetaDataProvider>& provider, const Path& path) {
  MetaDataUpdateAccess access(provider);
  access.AddChange(path);
}

std::string WrittenRaw(const RecordingBufferProvider::Write& write, const std::string& ns,
                       const std::string& name) {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(write.bytes);
  return Raw(meta.GetInternalRef(), ns, name);
}

CallCounter::CallCounter()
    : calls(std::make_shared<int>(0)), handles(std::make_shared<std::vector<XMPMetaRef>>()) {
  auto count = calls;
  auto seen = handles;
  callback = std::make_shared<MetaDataChangedCallback>([count, seen](XMPMetaRef xmp) {
    ++*count;
    seen->push_back(xmp);
  });
}

// ---------------------------------------------------------------------------

void PutXMPIntoFile(const fs::path& file, const ovraxmp::XMPMeta& packet) {
  ovraxmp::XMPFiles handler(file.string(), ovraxmp::kXMP_UnknownFile,
                            ovraxmp::kXMPFiles_OpenForUpdate);
  handler.PutXMP(packet);
  handler.CloseFile(ovraxmp::kXMPFiles_NoOptions);
}

fs::path MakeMediaFile(const fs::path& folder, const std::string& stem, MediaKind kind,
                       const std::string& properties) {
  const bool jpeg = kind == MediaKind::JPEG, mp4 = kind == MediaKind::MP4;
  const fs::path file = folder / (stem + (jpeg ? ".jpg" : mp4 ? ".mp4" : ".wav"));
  WriteFile(file, jpeg ? xmptest::media::Jpeg() : mp4 ? xmptest::media::Mp4() : xmptest::media::Wav());
  if (!properties.empty()) PutXMPIntoFile(file, Packet(properties));
  return file;
}

std::u16string U16Path(const fs::path& path) { return ovracore::ToUTF16(path.string()); }

boost::shared_ptr<FileProvider> OpenFile(const fs::path& path) {
  return boost::make_shared<FileProvider>(U16Path(path));
}

}  // namespace ovratest
