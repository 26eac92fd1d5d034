// The built-in definitions and views are compiled in without their
// indentation (to parse faster at start-up); they must read exactly as the
// files under resources/ do.
#include <filesystem>
#include <set>
#include <sstream>
#include <string>

#include "InitializeInternal.h"
#include "MetadataTestSupport.h"
#include "TestSupport.h"
#include "views/ViewsInternal.h"

using namespace ovrametadata;
using ovratest::U16;
using ovratest::U8;
using ovratest::Describe;

namespace {

namespace fs = std::filesystem;

void DescribeItem(std::ostream& out, const ViewItem& item, const std::string& indent) {
  out << indent << item.widget << " " << item.path.namespaceURI << " " << item.path.description << " "
      << item.qualifiedName.prefix << " " << item.qualifiedName.localName << " label=" << item.label
      << " description=" << item.description << "\n";
  for (const auto& [name, value] : item.params) out << indent << "  param " << name << "=" << value << "\n";
  for (const auto& choice : item.choices)
    out << indent << "  choice " << choice->rawValue << " " << U8(choice->labelSource) << "\n";
  for (const auto& child : item.items) DescribeItem(out, *child, indent + "  ");
}

std::string Describe(const std::vector<ViewDefinitionPtr>& views) {
  std::ostringstream out;
  for (const auto& view : views) {
    out << "view " << view->name << " " << view->label << " " << view->description << " "
        << view->pruneEmptyProperties << "\n";
    for (const auto& item : view->items) DescribeItem(out, *item, "  ");
  }
  return out.str();
}

}  // namespace

TEST(EmbeddedResources, ReadExactlyAsTheFilesTheyWereMadeFrom) {
  const fs::path folder = ovratest::DataDir().parent_path().parent_path() / "resources";
  std::set<std::string> seen;
  for (const auto& item : fs::directory_iterator(folder)) {
    if (item.path().extension() != ".xml") continue;
    const std::string title = item.path().stem().string();
    seen.insert(title);
    const std::string written = ovratest::ReadFile(item.path());
    const auto embedded = ovrametadataResources().Read(title, "xml");
    ASSERT_TRUE(embedded) << title;
    // The indentation really is gone ...
    EXPECT_LT(embedded->size(), written.size()) << title;
    // ... and nothing else: the same definitions, labels and descriptions.
    const ovratest::ErrorsSince errors;
    if (IsNotViewDefinition(U16(title))) {
      const DefinitionsPair fromFile = ParseBufferForDefinitions(written, U16(title));
      const DefinitionsPair fromLibrary = ParseBufferForDefinitions(UTF8String(*embedded), U16(title));
      EXPECT_FALSE(fromFile.first.empty() && fromFile.second.empty()) << title;
      EXPECT_EQ(Describe(fromLibrary), Describe(fromFile)) << title;
    } else {
      // Views name properties, which only resolve once the library runs.
      const ovratest::LibraryScope library;
      const auto fromFile = ParseViewDefinitionsFromBuffer(written, U16(title));
      const auto fromLibrary = ParseViewDefinitionsFromBuffer(UTF8String(*embedded), U16(title));
      EXPECT_FALSE(fromFile.empty()) << title;
      EXPECT_EQ(Describe(fromLibrary), Describe(fromFile)) << title;
    }
    EXPECT_TRUE(errors.New().empty()) << title;
  }
  const auto listed = ovrametadataResources().List("xml");
  EXPECT_EQ(std::set<std::string>(listed.begin(), listed.end()), seen);
}
