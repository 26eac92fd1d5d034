// Providers facing odd data: reads through aliases are quiet, and a
// write-back that the toolkit refuses is reported instead of ending the
// process. (Hostile packets and files are refused by the toolkit layer and
// tested there.)
#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "ProviderTestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovratest::Edit;
using ovratest::MediaKind;

TEST(HostileInput, AliasedPropertiesAreReadQuietly) {
  const ovraxmp::XMPMeta packet = ovratest::Packet(
      "<dc:description><rdf:Alt><rdf:li xml:lang=\"x-default\">A harbour</rdf:li></rdf:Alt></dc:description>"
      "<dc:rights><rdf:Alt><rdf:li xml:lang=\"x-default\">(c) Ana</rdf:li></rdf:Alt></dc:rights>"
      "<dc:creator><rdf:Seq><rdf:li>Ana</rdf:li><rdf:li>Ben</rdf:li></rdf:Seq></dc:creator>");
  const UTF8String tiff(ovraxmp::kXMP_NS_TIFF);
  const ovratest::ErrorsSince errors;
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "ImageDescription")),
            "A harbour");
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "Copyright")), "(c) Ana");
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "Artist")), "Ana");
  errors.ExpectNone();
}

// ---------------------------------------------------------------------------
// Write-backs that fail

// A provider whose write-back meets a toolkit error, as history recording or
// distribution to members can.
class FailingProvider : public TypicalProviderImpl {
 public:
  FailingProvider() : TypicalProviderImpl(nullptr) { ResetToEmptyMetaData(false); }
  void WriteChanges(const std::vector<Path>&) override {
    ovraxmp::XMPMeta meta(MetaDataAccess());
    meta.SetProperty("http://ns.example.org/never-registered/", "p", "v");
  }
};

TEST(WriteBackFailure, ToolkitErrorInAGuardIsReportedNotFatal) {
  auto provider = boost::make_shared<FailingProvider>();
  const ovratest::ErrorsSince errors;
  const Path path = ovratest::TestPath("Title");
  EXPECT_NO_THROW({
    MetaDataUpdateAccess access(provider);
    access.AddChange(path);
  });
  const std::vector<ErrorInfo> reported = errors.New();
  ASSERT_EQ(reported.size(), 1u);
  EXPECT_EQ(reported[0].type, kErrorWritingXMP);
  EXPECT_NE(ovracore::ToUTF8(reported[0].message).find(path.namespaceURI + path.description), std::string::npos)
      << ovracore::ToUTF8(reported[0].message);
}

}  // namespace
