// The Qt panel driven as a user would, on copies of the samples: widgets,
// edits of several files at once, refused values, reports and a real window
// under Xvfb. Files are checked through the library and with ExifTool.
#include <cstdlib>
#include <filesystem>
#include <set>

#include <QApplication>
#include <QCheckBox>
#include <QComboBox>
#include <QCompleter>
#include <QDateTimeEdit>
#include <QDoubleSpinBox>
#include <QFocusEvent>
#include <QGroupBox>
#include <QImage>
#include <QLineEdit>
#include <QListWidget>
#include <QPlainTextEdit>
#include <QPushButton>
#include <QSpinBox>
#include <QStringListModel>
#include <QTabWidget>
#include <QTest>
#include <QToolButton>

#include <boost/make_shared.hpp>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "../xmp/XMPMediaFiles.h"
#include "TestSupport.h"
#include "Window.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovrapanel::Field;
using ovrapanel::FieldKind;
using ovrapanel::Window;

const std::string kDC = "http://purl.org/dc/elements/1.1/";
const std::string kXMP = "http://ns.adobe.com/xap/1.0/";
const std::string kPhotoshop = "http://ns.adobe.com/photoshop/1.0/";

class PanelTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    setenv("QT_QPA_PLATFORM", "offscreen", 1);
    static int argc = 1;
    static char name[] = "panel_tests";
    static char* argv[] = {name, nullptr};
    // Ended before the process exits: Qt's own globals go at exit.
    sApp = new QApplication(argc, argv);
    Initialize();
    LoadAllViewDefinitions();
  }
  static void TearDownTestSuite() {
    Terminate();
    delete sApp;
  }
  static inline QApplication* sApp = nullptr;

  fs::path Copy(const std::string& sample, const std::string& as) {
    const fs::path target = mDir / as;
    fs::copy_file(fs::path(OVRA_SAMPLES_DIR) / sample, target);
    return target;
  }

  ovratest::TempDir mDir;
};

QString Q(const fs::path& path) { return QString::fromStdString(path.string()); }

Field* One(const Window& window, const char* name) {
  const auto fields = window.Fields(name);
  return fields.empty() ? nullptr : fields.front();
}

template <class W>
W* Part(Field* field) {
  if (auto* widget = qobject_cast<W*>(field->Widget())) return widget;
  return field->Widget()->findChild<W*>();
}

// The library's answers, through a provider of its own.
std::string Read(const fs::path& file, const std::string& ns, const std::string& name, bool raw = false) {
  auto provider = boost::make_shared<FileProvider>(file.u16string());
  MetaDataReadAccess reader(provider);
  UTF8String text;
  const Path path = PathForSchemaNameAndPropertyName(ns, name);
  raw ? GetRawStringValue(*reader, path, text) : GetValue(*reader, path, text);
  return text;
}

void Write(const fs::path& file, const std::string& ns, const std::string& name, const std::string& value,
           const std::string& language = "") {
  auto provider = boost::make_shared<FileProvider>(file.u16string());
  MetaDataUpdateAccess update(provider);
  const Path path = PathForSchemaNameAndPropertyName(ns, name);
  ASSERT_TRUE(language.empty() ? SetValue(*update, path, value) : SetAltTextValue(*update, path, language, value));
  update.AddChange(path);
}

// ExifTool's reading of every tag, by group and name (file-system tags left out).
std::map<std::string, nlohmann::json> ExifTool(const fs::path& file) {
  const auto all = nlohmann::json::parse(xmptest::media::RunCommand("LC_ALL=C exiftool -j -a -G1 -struct '" + file.string() + "' 2>/dev/null"));
  std::map<std::string, nlohmann::json> tags;
  for (const auto& [key, value] : all.at(0).items())
    if (key.rfind("System:", 0) && key.rfind("File:", 0) && key.rfind("ExifTool:", 0) && key != "SourceFile")
      tags[key] = value;
  return tags;
}

std::set<std::string> Changed(const std::map<std::string, nlohmann::json>& before,
                              const std::map<std::string, nlohmann::json>& after) {
  std::set<std::string> changed;
  for (const auto& [key, value] : before)
    if (!after.count(key) || after.at(key) != value) changed.insert(key);
  for (const auto& [key, value] : after)
    if (!before.count(key)) changed.insert(key);
  return changed;
}

TEST_F(PanelTest, EveryViewOfEverySampleAndFolder) {
  for (const char* sample : {"harbour.jpg", "interview.mp4", "ambience.wav"}) Copy(sample, sample);
  ovratest::WriteFile(mDir / "notes.txt", "not media");
  Window window;
  ASSERT_EQ(window.OpenPaths({Q(mDir.path())}), 3);  // the text file is skipped
  for (int row = 0; row < 3; ++row) {
    window.SelectRows({row});
    QStringList tabs;
    for (int i = 0; i < window.Tabs()->count(); ++i) tabs << window.Tabs()->tabText(i);
    EXPECT_GE(tabs.size(), 10) << row;
    for (const char* label : {"Description", "IPTC Core", "Camera Data", "Video", "Audio"})
      EXPECT_TRUE(tabs.contains(label)) << label;
    EXPECT_GT(window.Fields().size(), 100u);
    for (Field* field : window.Fields()) EXPECT_FALSE(field->Edited()) << field->Name().toStdString();
  }
}

TEST_F(PanelTest, WidgetsFollowTheDefinitions) {
  const fs::path jpg = Copy("harbour.jpg", "a.jpg");
  Write(jpg, kDC, "title", "Port à l'aube", "fr");
  Window window;
  ASSERT_EQ(window.OpenPaths({Q(jpg), Q(Copy("interview.mp4", "b.mp4"))}), 2);
  const auto kind = [&](const char* name) {
    Field* field = One(window, name);
    return field ? field->Kind() : FieldKind::kReadOnly;
  };
  EXPECT_EQ(kind("dc:title"), FieldKind::kAltText);
  EXPECT_EQ(Part<QLineEdit>(One(window, "dc:title"))->text(), "Harbour at dawn");
  EXPECT_NE(Part<QPlainTextEdit>(One(window, "dc:description")), nullptr);  // the view's multi-line hint
  EXPECT_EQ(kind("dc:subject"), FieldKind::kList);
  EXPECT_EQ(Part<QListWidget>(One(window, "dc:subject"))->count(), 3);
  EXPECT_EQ(kind("xmp:Rating"), FieldKind::kClosedChoice);
  EXPECT_EQ(Part<QComboBox>(One(window, "xmp:Rating"))->currentText(), "Four Stars");
  EXPECT_EQ(kind("xmp:Label"), FieldKind::kOpenChoice);
  EXPECT_TRUE(Part<QComboBox>(One(window, "xmp:Label"))->isEditable());
  EXPECT_EQ(kind("xmpRights:Marked"), FieldKind::kClosedChoice);  // the view's choices
  EXPECT_EQ(kind("Iptc4xmpExt:MaxAvailHeight"), FieldKind::kInteger);
  EXPECT_EQ(kind("Iptc4xmpExt:ImageRating"), FieldKind::kReal);
  EXPECT_EQ(Part<QDoubleSpinBox>(One(window, "Iptc4xmpExt:ImageRating"))->maximum(), 5);
  EXPECT_EQ(kind("photoshop:DateCreated"), FieldKind::kDate);
  EXPECT_EQ(kind("exif:ExposureTime"), FieldKind::kReadOnly);
  EXPECT_EQ(Part<QLineEdit>(One(window, "exif:ExposureTime"))->text(), "1/250 sec");
  EXPECT_EQ(kind("Iptc4xmpExt:LocationShown"), FieldKind::kStructArray);  // items are structures
  Field* city = One(window, "Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity");
  ASSERT_NE(city, nullptr);
  EXPECT_EQ(Part<QLineEdit>(city)->text(), "San Francisco");
  EXPECT_NE(qobject_cast<QGroupBox*>(city->Widget()->parentWidget()), nullptr);

  // Another language: shown when picked, and written alone.
  Field* title = One(window, "dc:title");
  auto* languages = Part<QComboBox>(title);
  ASSERT_GE(languages->findText("fr"), 0);
  languages->setCurrentIndex(languages->findText("fr"));
  auto* line = Part<QLineEdit>(title);
  EXPECT_EQ(line->text(), "Port à l'aube");
  line->selectAll();
  QTest::keyClicks(line, "Port");
  ASSERT_TRUE(window.Save());
  UTF8String french, fallback;
  auto provider = boost::make_shared<FileProvider>(jpg.u16string());
  MetaDataReadAccess reader(provider);
  GetAltTextValue(*reader, PathForSchemaNameAndPropertyName(kDC, "title"), "fr", french);
  EXPECT_EQ(french, "Port");
  EXPECT_EQ(Read(jpg, kDC, "title"), "Harbour at dawn");

  window.SelectRows({1});
  ASSERT_NE(One(window, "xmpDM:good"), nullptr);
  EXPECT_EQ(kind("xmpDM:good"), FieldKind::kBoolean);
  EXPECT_TRUE(Part<QCheckBox>(One(window, "xmpDM:good"))->isChecked());
}

TEST_F(PanelTest, ThreeFilesEditedAsOne) {
  if (!xmptest::media::HaveExifTool()) GTEST_SKIP() << "ExifTool is not installed";
  std::vector<fs::path> files;
  const char* labels[] = {"Red", "Green", nullptr};
  for (int i = 0; i < 3; ++i) {
    files.push_back(Copy("harbour.jpg", "f" + std::to_string(i) + ".jpg"));
    Write(files.back(), kDC, "title", "Title " + std::to_string(i));
    if (labels[i]) Write(files.back(), kXMP, "Label", labels[i]);
  }
  std::vector<std::map<std::string, nlohmann::json>> before;
  for (const auto& file : files) before.push_back(ExifTool(file));

  Window window;
  window.show();
  ASSERT_EQ(window.OpenPaths({Q(files[0]), Q(files[1]), Q(files[2])}), 3);
  window.SelectRows({0, 1, 2});
  Field* title = One(window, "dc:title");
  Field* label = One(window, "xmp:Label");
  ASSERT_TRUE(title && label);
  EXPECT_TRUE(title->Mixed());
  EXPECT_TRUE(label->Mixed());
  EXPECT_EQ(Part<QLineEdit>(title)->placeholderText(), "(mixed)");
  QTest::keyClicks(Part<QLineEdit>(title), "New title");
  auto* rating = Part<QComboBox>(One(window, "xmp:Rating"));
  const int two = rating->findText("Two Stars");
  rating->setCurrentIndex(two);
  emit rating->activated(two);
  Field* keywords = One(window, "dc:subject");
  for (auto* button : keywords->Widget()->findChildren<QToolButton*>())
    if (button->text() == "+") button->click();
  auto* list = Part<QListWidget>(keywords);
  list->item(list->count() - 1)->setText("fleet");
  ASSERT_TRUE(window.Save()) << window.Messages().toStdString();

  const std::set<std::string> allowed = {"XMP-dc:Title", "XMP-xmp:Rating", "XMP-dc:Subject", "XMP-xmpMM:History",
                                         "XMP-xmpMM:InstanceID", "XMP-xmp:MetadataDate"};
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(Read(files[i], kDC, "title"), "New title");
    EXPECT_EQ(Read(files[i], kXMP, "Rating"), "2");
    EXPECT_EQ(Read(files[i], kDC, "subject"), "harbour; dawn; boats; fleet");
    EXPECT_EQ(Read(files[i], kXMP, "Label"), labels[i] ? labels[i] : "Selected");  // mixed, not edited
    const auto changed = Changed(before[i], ExifTool(files[i]));
    for (const char* tag : {"XMP-dc:Title", "XMP-xmp:Rating", "XMP-dc:Subject"}) EXPECT_TRUE(changed.count(tag)) << tag;
    for (const auto& tag : changed)
      EXPECT_TRUE(allowed.count(tag) || (tag.rfind("XMP-xmpMM:", 0) == 0 && tag.find("DocumentID") != std::string::npos &&
                                         !before[i].count(tag)))
          << files[i] << ": " << tag;
  }
  // The new title is offered again.
  Window next;
  next.OpenPaths({Q(files[0])});
  QCompleter* completer = Part<QLineEdit>(One(next, "dc:title"))->completer();
  ASSERT_NE(completer, nullptr);
  EXPECT_TRUE(qobject_cast<QStringListModel*>(completer->model())->stringList().contains("New title"));
}

TEST_F(PanelTest, ItemsOfAnArrayOfStructures) {
  if (!xmptest::media::HaveExifTool()) GTEST_SKIP() << "ExifTool is not installed";
  const fs::path mp4 = Copy("interview.mp4", "a.mp4");
  const auto before = ExifTool(mp4);
  Window window;
  window.OpenPaths({Q(mp4)});
  Field* markers = One(window, "xmpDM:markers");
  ASSERT_TRUE(markers && markers->Kind() == FieldKind::kStructArray);
  const auto type = [&](const char* name, const char* text) {
    auto* line = markers->Widget()->findChild<QLineEdit*>(name);
    ASSERT_NE(line, nullptr) << name;
    line->selectAll();
    QTest::keyClicks(line, text);
  };
  type("xmpDM:markers[2]/xmpDM:name", "Boat");
  for (auto* button : markers->Widget()->findChildren<QPushButton*>())
    if (button->text() == "Add item") button->click();
  type("xmpDM:markers[3]/xmpDM:name", "Wrap");
  ASSERT_TRUE(window.Save()) << window.Messages().toStdString();

  auto provider = boost::make_shared<FileProvider>(mp4.u16string());
  MetaDataReadAccess reader(provider);
  const Path array = PathForSchemaNameAndPropertyName("http://ns.adobe.com/xmp/1.0/DynamicMedia/", "markers");
  ASSERT_EQ(CountArrayItems(*reader, array), 3);
  const auto name = [&](int index) {
    const Path item = CreatePathFromArrayItem(array, index);
    UTF8String text;
    GetValue(*reader, CreatePathFromArrayedStructureField(item, FieldNameDefinition(TypeEntryDefinition(item), "name")), text);
    return text;
  };
  EXPECT_EQ(name(1), "Slate");
  EXPECT_EQ(name(2), "Boat");
  EXPECT_EQ(name(3), "Wrap");
  const auto after = ExifTool(mp4);
  EXPECT_EQ(after.at("XMP-xmpDM:Markers").size(), 3u);
  EXPECT_EQ(after.at("XMP-xmpDM:Markers")[1].value("Comment", ""), "Boat enters");
  const std::set<std::string> allowed = {"XMP-xmpDM:Markers", "XMP-xmpMM:History", "XMP-xmpMM:InstanceID",
                                         "XMP-xmp:MetadataDate"};
  for (const auto& tag : Changed(before, after))
    EXPECT_TRUE(allowed.count(tag) || (tag.rfind("XMP-xmpMM:", 0) == 0 && !before.count(tag))) << tag;
}

TEST_F(PanelTest, RefusedValuesAreMarkedAndNeverWritten) {
  const fs::path jpg = Copy("harbour.jpg", "a.jpg");
  const std::string bytes = ovratest::ReadFile(jpg);
  Window window;
  window.OpenPaths({Q(jpg)});
  Field* ages = One(window, "Iptc4xmpExt:ModelAge");  // a bag of integers
  ASSERT_NE(ages, nullptr);
  for (auto* button : ages->Widget()->findChildren<QToolButton*>())
    if (button->text() == "+") button->click();
  Part<QListWidget>(ages)->item(0)->setText("old");
  EXPECT_FALSE(ages->Problem().isEmpty());
  QTest::keyClicks(Part<QLineEdit>(One(window, "dc:title")), " again");
  EXPECT_FALSE(window.Save());
  EXPECT_EQ(ovratest::ReadFile(jpg), bytes);
  EXPECT_TRUE(window.Messages().contains("Iptc4xmpExt:ModelAge: old is not a whole number"));
  // Corrected, everything goes in.
  Part<QListWidget>(ages)->item(0)->setText("34");
  EXPECT_TRUE(ages->Problem().isEmpty());
  EXPECT_TRUE(window.Save());
  EXPECT_EQ(Read(jpg, kDC, "title"), "Harbour at dawn again");
}

TEST_F(PanelTest, DatesKeepTheirZoneOrItsAbsence) {
  const fs::path plain = Copy("harbour.jpg", "a.jpg");  // stored without a zone
  const fs::path zoned = Copy("harbour.jpg", "b.jpg");
  Write(zoned, kPhotoshop, "DateCreated", "2024-05-18T06:42:10+02:00");
  Window window;
  window.OpenPaths({Q(plain), Q(zoned)});
  for (int row : {0, 1}) {
    window.SelectRows({row});
    auto* edit = Part<QDateTimeEdit>(One(window, "photoshop:DateCreated"));
    edit->setDateTime(edit->dateTime().addDays(1));
    ASSERT_TRUE(window.Save());
  }
  EXPECT_EQ(Read(plain, kPhotoshop, "DateCreated", true), "2024-05-19T06:42:10");
  EXPECT_EQ(Read(zoned, kPhotoshop, "DateCreated", true), "2024-05-19T06:42:10+02:00");

  // An empty date starts from today when entered, and stays empty when left.
  const fs::path wav = Copy("ambience.wav", "c.wav");
  const std::string bytes = ovratest::ReadFile(wav);
  window.OpenPaths({Q(wav)});
  auto* edit = Part<QDateTimeEdit>(One(window, "photoshop:DateCreated"));
  QFocusEvent in(QEvent::FocusIn), out(QEvent::FocusOut);
  QApplication::sendEvent(edit, &in);
  EXPECT_EQ(edit->date(), QDate::currentDate());
  QApplication::sendEvent(edit, &out);
  EXPECT_FALSE(One(window, "photoshop:DateCreated")->Edited());
  EXPECT_TRUE(window.Save());
  EXPECT_EQ(ovratest::ReadFile(wav), bytes);
}

TEST_F(PanelTest, ReportsGoToTheMessagePane) {
  ovratest::WriteFile(mDir / "notes.txt", "not media");
  Window window;
  EXPECT_EQ(window.OpenPaths({Q(mDir / "notes.txt"), Q(mDir / "missing.jpg")}), 0);
  SendError(kPlainError, u"a report from the library", u"");
  const QString messages = window.Messages();
  EXPECT_TRUE(messages.contains("notes.txt: not a media file")) << messages.toStdString();
  EXPECT_TRUE(messages.contains("missing.jpg: cannot be read"));
  EXPECT_TRUE(messages.contains("a report from the library"));
  // What the library says panels cannot show is left out.
  const Path title = PathForSchemaNameAndPropertyName(kDC, "title");
  BlacklistPropertyForClient(title, true);
  Window blocked;
  blocked.OpenPaths({Q(Copy("harbour.jpg", "a.jpg"))});
  BlacklistPropertyForClient(title, false);
  EXPECT_TRUE(blocked.Fields("dc:title").empty());
  EXPECT_FALSE(blocked.Fields("dc:subject").empty());
}

TEST_F(PanelTest, ScreenshotOfARealWindow) {
  if (std::system("command -v xvfb-run >/dev/null 2>&1") != 0) GTEST_SKIP() << "xvfb-run is not installed";
  const fs::path png = fs::path(OVRAPANEL_BUILD_DIR) / "ovrapanel-test.png";
  fs::remove(png);
  const std::string command = "xvfb-run -a -s '-screen 0 1280x900x24' '" OVRAPANEL_EXE "' --screenshot '" +
                              png.string() + "' '" + Copy("harbour.jpg", "a.jpg").string() + "' 2>&1";
  xmptest::media::RunCommand(command);
  QImage image(Q(png));
  ASSERT_FALSE(image.isNull()) << command;
  EXPECT_GE(image.width(), 800);
  std::set<QRgb> colours;
  for (int y = 0; y < image.height(); y += 7)
    for (int x = 0; x < image.width(); x += 7) colours.insert(image.pixel(x, y));
  EXPECT_GT(colours.size(), 20u);  // text and frames, not a blank window
}

}  // namespace
