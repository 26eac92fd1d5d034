// Views: the file reader's states and reports, name resolution, the
// registry and the walk a host's builder sees.
#include <functional>

#include <boost/range/empty.hpp>
#include <boost/range/size.hpp>

#include <ovrametadata/Views.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"
#include "views/ViewsInternal.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U8;

namespace {

const std::u16string kSource = u"/views/test_view.xml";
const std::string kParsing = "Error parsing view definitions file: ";
const char* const kDC = "http://purl.org/dc/elements/1.1/";
const char* const kIptc = "http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/";

std::string Document(const std::string& body) {
  return std::string("<views xmlns=\"http://ns.ovrametadata.org/metadata/ui/1.0/\" xmlns:dc=\"") + kDC +
         "\" xmlns:Iptc4xmpCore=\"" + kIptc + "\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\">" + body +
         "</views>";
}

class Views : public ::testing::Test {
 protected:
  ovratest::LibraryScope library;
};

// How each kind of fault in a file is told, and what still comes through.
TEST_F(Views, EveryFileFaultIsReportedOnceAndTheRestIsKept) {
  struct Case {
    const char* what;
    std::string document;
    std::vector<std::string> reports;
    std::size_t views;
  };
  const std::vector<Case> cases = {
      {"root in another namespace", "<views xmlns=\"urn:other\"><view name=\"a\"/></views>",
       {"missing namespace \"http://ns.ovrametadata.org/metadata/ui/1.0/\", views in the file will be skipped."},
       0},
      {"root of another name", "<panels xmlns=\"http://ns.ovrametadata.org/metadata/ui/1.0/\"/>",
       {"outermost Tag has to be <views/>."}, 0},
      {"foreign root of another name", "<panels/>", {"outermost Tag has to be <views/>."}, 0},
      {"no view", Document(""), {"the view definition file has no <view> tag."}, 0},
      {"view without a name", Document("<view label=\"x\"><property name=\"dc:title\"/></view><view name=\"b\"/>"),
       {"<view> tag needs a name attribute."}, 1},
      {"property without a name at top level",
       Document("<view name=\"a\"><property label=\"x\"/><separator/></view>"),
       {"found XMP property without a 'name' attribute."}, 1},
      {"undeclared prefix", Document("<view name=\"a\"><property name=\"zz:CreateDate\"/></view>"),
       {"invalid prefix in XMP property \"zz:CreateDate\"."}, 1},
      {"no prefix", Document("<view name=\"a\"><property name=\"title\"/></view>"),
       {"invalid prefix in XMP property \"title\"."}, 1},
      {"three parts fail silently", Document("<view name=\"a\"><property name=\"dc:x:y\"/></view>"), {}, 1},
      {"unknown property", Document("<view name=\"a\"><property name=\"dc:nothing\"/></view>"),
       {"invalid XMP property \"dc:nothing\"."}, 1},
      {"unknown structure", Document("<view name=\"a\"><property name=\"dc:nothing/dc:x\"/></view>"),
       {"invalid Structure in XMP property \"dc:nothing/dc:x\"."}, 1},
      {"field in another namespace",
       Document("<view name=\"a\"><property name=\"Iptc4xmpCore:CreatorContactInfo/dc:CiAdrCity\"/></view>"),
       {"invalid Structure Field in XMP property \"Iptc4xmpCore:CreatorContactInfo/dc:CiAdrCity\"."}, 1},
      {"malformed XML keeps the views before it",
       Document("<view name=\"a\"/><view name=\"b\"><property name=\"dc:title\">"),
       {"invalid XML."}, 1},
  };
  for (const Case& c : cases) {
    ErrorsSince since;
    const auto views = ParseViewDefinitionsFromBuffer(c.document, kSource);
    std::vector<std::string> expected;
    for (const std::string& report : c.reports) expected.push_back(kParsing + report);
    since.Expect(kViewDefinitionParsingError, kSource, expected);
    EXPECT_EQ(views.size(), c.views) << c.what;
  }
}

TEST_F(Views, ItemsCarryPathsWidgetsParamsAndChoices) {
  ErrorsSince since;
  const auto views = ParseViewDefinitionsFromBuffer(Document(R"(
    <view name="Main" label="Main panel" description="d" pruneEmptyProperties="true">
      <section label="Who">
        <property name="dc:creator" label="By" columns="2"/>
        <property name="Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity"/>
        <item labelRef="dc:title" descriptionRef="dc:title"/>
      </section>
      <separator widget="thin"/>
      <property name="xmp:Label" widget="combo">
        <paramMap><param name="width" value="80"/></paramMap>
        <paramList><choice value="Red" label="$$$/test/red=Rot"/></paramList>
        <choice value="Blue" label="Blue"/>
      </property>
      <item widget="contact" contact_path="Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity" other_path="dc:title"/>
      <item label="no path, no widget: dropped"><note label="lifted"/></item>
    </view>)"),
                                                     kSource);
  since.ExpectNone();
  ASSERT_EQ(views.size(), 1u);
  const ViewDefinition& view = *views[0];
  EXPECT_EQ(view.name, "Main");
  EXPECT_EQ(view.label, "Main panel");
  EXPECT_TRUE(view.pruneEmptyProperties);
  ASSERT_EQ(view.items.size(), 5u);

  const ViewItem& section = *view.items[0];
  EXPECT_EQ(section.widget, "section");
  ASSERT_EQ(section.items.size(), 3u);
  const ViewItem& creator = *section.items[0];
  EXPECT_EQ(creator.qualifiedName.prefix, kDC);
  EXPECT_EQ(creator.qualifiedName.localName, "creator");
  EXPECT_EQ(creator.path.description, "creator");
  EXPECT_EQ(U8(creator.GetLabel()), "By");
  EXPECT_EQ(creator.params, (std::map<std::string, std::string>{{"columns", "2"}}));
  // A structure field has a path but no qualified name.
  const ViewItem& city = *section.items[1];
  EXPECT_EQ(city.path.description, "CreatorContactInfo/Iptc4xmpCore:CiAdrCity");
  EXPECT_TRUE(city.qualifiedName.localName.empty());
  EXPECT_EQ(U8(city.GetLabel()), "City");
  const ViewItem& borrowed = *section.items[2];
  EXPECT_TRUE(borrowed.path.description.empty());
  EXPECT_EQ(U8(borrowed.GetLabel()), "Title");
  EXPECT_FALSE(borrowed.description.empty());

  // A widget element keeps its own widget; the attribute becomes a param.
  EXPECT_EQ(view.items[1]->widget, "separator");
  EXPECT_EQ(view.items[1]->params.at("widget"), "thin");

  const ViewItem& label = *view.items[2];
  EXPECT_EQ(label.widget, "combo");
  EXPECT_EQ(label.params.at("width"), "80");
  ASSERT_EQ(label.choices.size(), 2u);
  EXPECT_EQ(label.choices[0]->rawValue, "Red");
  EXPECT_EQ(U8(label.choices[0]->label), "Rot");
  EXPECT_EQ(U8(label.choices[0]->labelSource), "$$$/test/red=Rot");

  const std::map<std::string, std::string> derived = {
      {"contact_path", "Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity"},
      {"contact_path_uri", kIptc},
      {"contact_path_name", "CreatorContactInfo"},
      {"contact_path_field", "CiAdrCity"},
      {"other_path", "dc:title"},
      {"other_path_uri", kDC},
      {"other_path_name", "title"}};
  EXPECT_EQ(view.items[3]->params, derived);
  EXPECT_EQ(view.items[3]->widget, "contact");
  // The dropped item's child stands in the view.
  EXPECT_EQ(view.items[4]->widget, "note");
  EXPECT_EQ(view.items[4]->label, "lifted");
}

TEST_F(Views, NestedPropertyWithoutNameIsKeptAndInnerPrefixesEndWithTheirElement) {
  ErrorsSince since;
  const auto views = ParseViewDefinitionsFromBuffer(Document(R"(
    <view name="a">
      <section><property label="empty"/>
        <property xmlns:dc="urn:elsewhere" name="dc:title"/>
        <property name="dc:title"/>
      </section>
    </view>)"),
                                                     kSource);
  since.Expect(kViewDefinitionParsingError, kSource,
               {kParsing + "found XMP property without a 'name' attribute.",
                kParsing + "invalid XMP property \"dc:title\"."});
  ASSERT_EQ(views.size(), 1u);
  ASSERT_EQ(views[0]->items.size(), 1u);
  const auto& items = views[0]->items[0]->items;
  ASSERT_EQ(items.size(), 3u);
  EXPECT_EQ(items[0]->label, "empty");
  EXPECT_TRUE(items[1]->path.description.empty());
  EXPECT_EQ(items[2]->path.namespaceURI, kDC);
}

class Recorder : public ViewBuilderInterface {
 public:
  void BeginView(const ViewInfo& info) override {
    calls.push_back("begin " + info.name + " " + std::to_string(info.itemCount) +
                    (info.pruneEmptyProperties ? " prune" : ""));
  }
  void EndView(const ViewDefinition& def) override { calls.push_back("end " + def.name); }
  void BuildItem(const ViewItemPtr& item) override { calls.push_back("item " + item->widget); }
  std::vector<std::string> calls;
};

TEST_F(Views, RegistryKeepsTheFirstOfANameAndBuildVisitsTopLevelItemsOnly) {
  auto first = boost::make_shared<ViewDefinition>();
  first->name = "Test.Registry";
  auto section = boost::make_shared<ViewItem>(std::string("section"));
  section->AddItem(boost::make_shared<ViewItem>(std::string("note")));
  first->items = {section, boost::make_shared<ViewItem>(std::string("separator"))};
  auto second = boost::make_shared<ViewDefinition>(*first);
  auto otherCase = boost::make_shared<ViewDefinition>();
  otherCase->name = "test.registry";

  ErrorsSince since;
  EXPECT_FALSE(AddViewDefinition(nullptr, u"x"));
  EXPECT_TRUE(AddViewDefinition(first, u"one.xml"));
  EXPECT_FALSE(AddViewDefinition(second, u"two.xml"));
  EXPECT_TRUE(AddViewDefinition(otherCase, u"three.xml"));
  since.Expect(kViewDefinitionRegistrationError, u"two.xml",
               {"Error registering view definition: View definition for \"Test.Registry\" already exists."});
  EXPECT_EQ(GetViewDefinitionForName("Test.Registry"), first);
  EXPECT_EQ(U8(ViewDefinitionSource(first)), "one.xml");
  EXPECT_EQ(U8(ViewDefinitionSource(second)), "");
  EXPECT_FALSE(GetViewDefinitionForName("Test.Missing"));

  Recorder recorder;
  BuildView(first, recorder);
  BuildView(otherCase, recorder);
  BuildView(nullptr, recorder);
  EXPECT_EQ(recorder.calls, (std::vector<std::string>{"begin Test.Registry 2", "item section", "item separator",
                                                       "end Test.Registry", "begin test.registry 0",
                                                       "end test.registry"}));
}

TEST_F(Views, BuiltInViewsLoadOnceWithoutAReportAndAgainAfterRestart) {
  EXPECT_TRUE(IsNotViewDefinition(u"camera.xml"));
  EXPECT_FALSE(IsNotViewDefinition(u"Basic_View.xml"));
  EXPECT_FALSE(IsNotViewDefinition(u"camera_view"));

  ErrorsSince since;
  LoadAllViewDefinitions();
  since.ExpectNone();
  std::vector<std::string> names;
  for (const ViewDefinitionPtr& view : CommonViewDefinitions()) {
    names.push_back(view->name);
    // Every property item of a built-in view resolves to a definition with a
    // label, so a panel never shows an empty caption.
    std::function<void(const ViewItemPtr&)> check = [&](const ViewItemPtr& item) {
      if (!item->path.description.empty()) {
        EXPECT_FALSE(item->GetLabel().empty()) << view->name;
      }
      for (const ViewItemPtr& child : item->items) check(child);
    };
    for (const ViewItemPtr& item : view->items) check(item);
  }
  EXPECT_GE(names.size(), 10u);
  LoadAllViewDefinitions();
  EXPECT_EQ(static_cast<std::size_t>(boost::size(CommonViewDefinitions())), names.size());

  // After the last Terminate the next start-up loads them again.
  Terminate();
  Initialize();
  EXPECT_TRUE(boost::empty(CommonViewDefinitions()));
  LoadAllViewDefinitions();
  EXPECT_EQ(static_cast<std::size_t>(boost::size(CommonViewDefinitions())), names.size());
}

}  // namespace

namespace {

std::string WriteView(const std::vector<SchemaDefinitionPtr>& schemas,
                      const std::vector<SchemaDefinitionPtr>& base, const std::string& file) {
  GenericPanelManifestParser::ManifestInfo manifest;
  manifest.name = u"Written";
  manifest.label = u"$$$/w/view=Written & read";
  const std::string path = (ovratest::TestRoot() / file).string();
  EXPECT_TRUE(WriteViewDefinitionsFileFromSchema(schemas, base, manifest, ovratest::U16(path)));
  return path;
}

TEST_F(Views, AWrittenViewShowsEveryPropertyAndOverridesOnlyWhatDiffers) {
  const SchemaDefinitionPtr dc = NamespaceDefinition(kDC);
  const SchemaDefinitionPtr dm = NamespaceDefinition("http://ns.adobe.com/xmp/1.0/DynamicMedia/");
  ASSERT_TRUE(dc && dm);
  ErrorsSince since;
  const std::string plain = WriteView({dc, dm}, {}, "plain_view.xml");
  const auto views = ParseViewDefinitionsFromDocument(ovratest::U16(plain));
  since.ExpectNone();
  ASSERT_EQ(views.size(), 1u);
  EXPECT_EQ(views[0]->name, "Written");
  EXPECT_EQ(views[0]->label, "$$$/w/view=Written & read");
  ASSERT_EQ(views[0]->items.size(), 2u);
  EXPECT_EQ(views[0]->items[0]->widget, "section");
  EXPECT_EQ(views[0]->items[0]->items.size(), dc->properties.size());
  // Identical to its definition: the name alone.
  const std::string text = ovratest::ReadFile(plain);
  EXPECT_NE(text.find("\t\t\t<property name=\"dc:title\" />\n"), std::string::npos) << text;

  // An edited copy: a changed label, a text offered as a choice, a
  // multi-line hint, a separator; a second schema of the same prefix.
  auto edited = boost::make_shared<SchemaDefinition>(*dc);
  edited->labelSource.clear();
  edited->properties.clear();
  auto title = boost::make_shared<PropertyDefinition>(*PropertyNameDefinition(dc, "title"));
  title->labelSource = u"Heading";
  title->uiHints = PropertyUIHints{true, true};
  auto format = boost::make_shared<PropertyDefinition>(*PropertyNameDefinition(dc, "format"));
  format->type = "openchoice";
  format->constraints.elementType = "mimetype";
  format->constraints.choices = {boost::make_shared<ChoiceDefinition>(ChoiceDefinition{"image/jpeg", u"JPEG", u"JPEG"})};
  edited->properties = {title, format};
  auto other = boost::make_shared<SchemaDefinition>();
  other->prefix = "dc";
  other->namespaceURI = "http://example.com/other/";
  auto internal = boost::make_shared<PropertyDefinition>();
  internal->name = "Count";
  internal->isInternal = true;
  auto separator = boost::make_shared<PropertyDefinition>();
  separator->uiHints = PropertyUIHints{true, false};
  other->properties = {internal, separator};
  auto base = boost::make_shared<SchemaDefinition>();
  auto external = boost::make_shared<PropertyDefinition>(*internal);
  external->isInternal = false;
  base->properties = {external};

  const std::string written = ovratest::ReadFile(WriteView({edited, other}, {base}, "edited_view.xml"));
  for (const char* piece :
       {"<view xmlns:dc=\"http://purl.org/dc/elements/1.1/\" name=\"Written\" label=\"$$$/w/view=Written &amp; read\">\n",
        "\t\t<property name=\"dc:" /* no section: the schema has no label */,
        "label=\"Heading\" multiLines=\"3\" />\n\t\t<separator/>\n",
        "<property name=\"dc:format\" widget=\"dropdown\" openChoice=\"true\">\n\t\t\t<choice label=\"JPEG\" "
        "value=\"image/jpeg\" />\n\t\t</property>\n",
        "\t\t<property name=\"dc:Count\" readOnly=\"true\" />\n\t\t<separator/>\n\t</view>\n"})
    EXPECT_NE(written.find(piece), std::string::npos) << piece << "\n" << written;
  EXPECT_EQ(written.find("http://example.com/other/"), std::string::npos);

  EXPECT_EQ(ovratest::ReadFile(WriteView({}, {}, "empty_view.xml")), "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n");
}

}  // namespace
