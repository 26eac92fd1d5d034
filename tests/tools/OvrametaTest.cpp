// End-to-end tests of the ovrameta tool: the built program runs on copies of
// the bundled samples in temporary folders, and ExifTool checks what it wrote.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <tuple>
#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "ToolTestSupport.h"

namespace {

using namespace ovratest::tool;
using OvrametaTest = ToolTest;

TEST_F(OvrametaTest, ShowListsValuesThroughTheViewsThenEveryOtherSchemaEachOnce) {
  Sample("harbour.jpg");
  const Result result = Run({"show", "harbour.jpg"});
  ASSERT_EQ(result.status, 0) << result.err;
  ExpectContains(result.out, {"Description\n  Title: Harbour at dawn\n",
                              "  Keywords:\n    - harbour\n    - dawn\n    - boats\n  Rating: Four Stars\n",
                              "  Flash\n    Fired: Did not fire\n", "    Make: Orlex\n",
                              "    Latitude: 37\xC2\xB0 46' 30", "    ISO Country Code: US\n",
                              "    Creator Contact Info\n      City: San Francisco\n",
                              // What no view shows comes under its schema.
                              "EXIF\n  EXIF Version: EXIF 2.32\n"});
  // Each value once, no empty items, notes or separators.
  EXPECT_EQ(result.out.find("Title: Harbour at dawn"), result.out.rfind("Title: Harbour at dawn"));
  EXPECT_EQ(result.out.find("--"), std::string::npos);
  EXPECT_EQ(result.out.find("Copyright Status"), std::string::npos);
  EXPECT_EQ(result.out.find("Video"), std::string::npos);

  Sample("interview.mp4");
  Sample("ambience.wav");
  const Result clip = Run({"show", "interview.mp4"});
  ASSERT_EQ(clip.status, 0) << clip.err;
  ExpectContains(clip.out, {"Video\n  Shot\n    Scene: 12\n", "    Duration:\n      Value: 12000\n",
                            "    Markers:\n      [1]\n", "        Comment: Boat enters\n"});
  const Result recording = Run({"show", "ambience.wav"});
  ASSERT_EQ(recording.status, 0) << recording.err;
  ExpectContains(recording.out, {"    Album: Harbour sounds\n", "  Title: Harbour ambience\n"});
}

TEST_F(OvrametaTest, ShowViewLaysOutOneViewAndViewsListsThem) {
  Sample("harbour.jpg");
  const Result view = Run({"show", "--view", "Description", "harbour.jpg"});
  ASSERT_EQ(view.status, 0) << view.err;
  ExpectContains(view.out, {"Description\n  Title: Harbour at dawn\n",
                            "    - boats\n  Each keyword is kept as an entry of its own.\n  --\n",
                            "  Label: Selected\n  --\n  Copyright\n    Copyright Status:\n"});

  Sample("interview.mp4", "a.mp4");
  Sample("interview.mp4", "b.mp4");
  ASSERT_EQ(Run({"set", "b.mp4", "xmpDM:scene=7"}).status, 0);
  const Result mixed = Run({"show", "--view", "Video", "a.mp4", "b.mp4"});
  ASSERT_EQ(mixed.status, 0) << mixed.err;
  ExpectContains(mixed.out, {"    Scene: (mixed)\n", "    Shot Name: Pier wide\n"});

  const Result unknown = Run({"show", "--view", "Nothing", "harbour.jpg"});
  EXPECT_EQ(unknown.status, 2);
  ExpectContains(unknown.err, {"no view is named \"Nothing\""});

  const Result list = Run({"views"});
  ASSERT_EQ(list.status, 0) << list.err;
  ExpectContains(list.out, {"CameraData  Camera Data  built-in", "Description  Description  built-in"});
  const Result layout = Run({"views", "Description"});
  ASSERT_EQ(layout.status, 0) << layout.err;
  ExpectContains(layout.out, {"  property xmp:Label  \"Label\"  choices: Red=Red", "  separator\n",
                              "  section  \"Copyright\"\n    property xmpRights:Marked"});
}

TEST_F(OvrametaTest, TheSamplePackageAddsItsSchemaViewAndDictionaries) {
  const fs::path packages = mDir / "user/Orlex/XMP/Metadata Extensions";
  fs::create_directories(packages);
  fs::copy(fs::path(OVRA_SAMPLES_DIR) / "packages/PhotoArchive", packages / "PhotoArchive",
           fs::copy_options::recursive);
  fs::create_directories(packages / "Broken");
  const std::string user = "OVRAMETADATA_USER_ROOT=" + Quote((mDir / "user").string());
  Sample("harbour.jpg");

  const Result listed = Run({"packages"}, user);
  ASSERT_EQ(listed.status, 0) << listed.err;
  ExpectContains(listed.out, {"PhotoArchive  1  " + (packages / "PhotoArchive").string() + "\n",
                              "Problems:\n  " + (packages / "Broken/manifest.xml").string() +
                                  ": Error parsing manifest file: manifest file is missing from extension package.\n"});

  ASSERT_EQ(Run({"set", "harbour.jpg", "photoArchive:AccessionNumber=1987.041.12",
                 "photoArchive:Location/photoArchive:Box=B-17", "photoArchive:Condition=good"},
                user)
                .status,
            0);
  const Result shown = Run({"show", "--view", "PhotoArchive", "harbour.jpg"}, user);
  ASSERT_EQ(shown.status, 0) << shown.err;
  ExpectContains(shown.out, {"Photo Archive\n  Identification\n    Accession Number: 1987.041.12\n",
                             "    Original Title: Harbour at dawn\n", "    Box: B-17\n    Folder:\n",
                             "    Condition: Good\n", "  --\n"});
  const Result german = Run({"show", "--view", "PhotoArchive", "harbour.jpg"}, user + " LC_ALL=de_DE.UTF-8");
  ExpectContains(german.out, {"Fotoarchiv\n", "    Zustand: Gut\n"});
  // Without the package its values read as stored, and are not written.
  const Result raw = Run({"get", "harbour.jpg", "photoArchive:Condition"});
  EXPECT_EQ(raw.status, 0) << raw.err;
  EXPECT_EQ(raw.out, "good\n");
  const Result refused = Run({"set", "harbour.jpg", "photoArchive:Condition=poor"});
  EXPECT_EQ(refused.status, 2);
  ExpectContains(refused.err, {"can be read but not written"});
}

TEST_F(OvrametaTest, WrittenSchemasAndGeneratedViewsLoadAsCustomFilesAndPackages) {
  const std::string user = "OVRAMETADATA_USER_ROOT=" + Quote((mDir / "user").string());
  // A copy of a built-in schema under a namespace of one's own.
  Result xml = Run({"schemas", "--xml", "xmpRights"});
  ASSERT_EQ(xml.status, 0) << xml.err;
  for (const auto& [from, to] : {std::pair<std::string, std::string>{"http://ns.adobe.com/xap/1.0/rights/",
                                                                     "http://example.com/myrights/"},
                                 {"prefix=\"xmpRights\"", "prefix=\"myRights\""}})
    xml.out.replace(xml.out.find(from), from.size(), to);
  const fs::path custom = mDir / "user/Orlex/XMP/Custom Propsheet Panels/4.0/custom";
  fs::create_directories(custom);
  WriteFile(custom / "myrights.xml", xml.out);
  const Result listed = Run({"schemas", "myRights"}, user);
  ASSERT_EQ(listed.status, 0) << listed.err;
  ExpectContains(listed.out, {"myRights:UsageTerms", "Copyright Status"});

  // A generated view dropped into a package.
  const Result view = Run({"views", "--generate", "Mine", "myRights", "dc"}, user);
  ASSERT_EQ(view.status, 0) << view.err;
  const fs::path package = mDir / "user/Orlex/XMP/Metadata Extensions/Mine";
  fs::create_directories(package / "view");
  WriteFile(package / "manifest.xml",
            "<extension xmlns=\"http://ns.ovrametadata.org/metadata/extension/1.0/\" name=\"Mine\" version=\"1\"/>");
  WriteFile(package / "view/mine.xml", view.out);
  Sample("harbour.jpg");
  ASSERT_EQ(Run({"set", "harbour.jpg", "myRights:Marked=True"}, user).status, 0);
  const Result shown = Run({"show", "--view", "Mine", "harbour.jpg"}, user);
  ASSERT_EQ(shown.status, 0) << shown.err;
  EXPECT_EQ(shown.err, "");
  ExpectContains(shown.out, {"Mine\n  XMP Rights Management\n", "    Copyright Status: True\n",
                             "  Dublin Core\n", "    Title: Harbour at dawn\n"});
}

TEST_F(OvrametaTest, SetRemembersRecentValuesAndFieldListsNarrowShow) {
  Sample("harbour.jpg");
  const std::string user = "OVRAMETADATA_USER_ROOT=" + Quote((mDir / "user").string());
  for (const char* title : {"One", "Two", "One"}) ASSERT_EQ(Run({"set", "harbour.jpg", std::string("dc:title=") + title}, user).status, 0);
  for (int i = 0; i < 25; ++i) ASSERT_EQ(Run({"set", "harbour.jpg", "xmp:Label=L" + std::to_string(i)}, user).status, 0);
  // Newest first, each value once, at most twenty.
  EXPECT_EQ(Run({"recent", "dc:title"}, user).out, "dc:title\n  One\n  Two\n");
  const Result labels = Run({"recent", "xmp:Label"}, user);
  EXPECT_EQ(std::count(labels.out.begin(), labels.out.end(), '\n'), 21);
  EXPECT_EQ(labels.out.rfind("xmp:Label\n  L24\n  L23\n", 0), 0u);
  EXPECT_TRUE(fs::exists(mDir / "user/Orlex/XMP/Propsheet/PropsheetMRU.xml"));
  EXPECT_EQ(Run({"recent", "--clear"}, user).status, 0);
  EXPECT_EQ(Run({"recent"}, user).out, "");

  const Result list = Run({"fields", "dc:title", "Iptc4xmpCore:CreatorContactInfo"});
  ASSERT_EQ(list.status, 0) << list.err;
  WriteFile(mDir / "list.xml", list.out);
  const Result shown = Run({"show", "--fields", "list.xml", "harbour.jpg"});
  ASSERT_EQ(shown.status, 0) << shown.err;
  EXPECT_EQ(shown.out, "Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity: San Francisco\n"
                       "Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiEmailWork: ada@example.org\n"
                       "dc:title: One\n");
  EXPECT_EQ(Run({"show", "--fields", "missing.xml", "harbour.jpg"}).status, 2);

  // The raw converter's tone curve is no panel's business.
  ExpectContains(Run({"schemas", "crs"}).out, {"crs:ToneCurve", "(not shown in panels)"});
}

TEST_F(OvrametaTest, AMalformedPacketHidTheFilesOtherMetadata) {
  // The packet's closing tag broken, the EXIF block intact.
  std::string bytes = ReadFile(fs::path(OVRA_SAMPLES_DIR) / "harbour.jpg");
  const auto at = bytes.find("</rdf:Description>");
  ASSERT_NE(at, std::string::npos);
  bytes.replace(at, 18, "</rdf:Descriptiox>");
  WriteFile(mDir / "bad.jpg", bytes);
  const Result shown = Run({"show", "bad.jpg"});
  EXPECT_EQ(shown.status, 0);
  ExpectContains(shown.out, {"    Make: Orlex\n"});
  const std::string notice = "the file's XMP packet cannot be read; only the metadata stored outside it is shown.";
  ExpectContains(shown.err, {"bad.jpg", notice});
  EXPECT_EQ(shown.err.find(notice), shown.err.rfind(notice));
  EXPECT_EQ(Run({"set", "bad.jpg", "xmp:Label=Red"}).status, 2);
  EXPECT_EQ(ReadFile(mDir / "bad.jpg"), bytes);
}

TEST_F(OvrametaTest, ShowOfSeveralFilesMarksDifferingValuesAsMixed) {
  Sample("harbour.jpg", "a.jpg");
  Sample("harbour.jpg", "b.jpg");
  ASSERT_EQ(Run({"set", "b.jpg", "xmp:Rating=1"}).status, 0);
  const Result result = Run({"show", "a.jpg", "b.jpg"});
  ASSERT_EQ(result.status, 0) << result.err;
  ExpectContains(result.out, {"  Rating: (mixed)\n", "  Title: Harbour at dawn\n"});

  const Result each = Run({"show", "--each", "a.jpg", "b.jpg"});
  ASSERT_EQ(each.status, 0) << each.err;
  ExpectContains(each.out, {"== a.jpg ==\n", "  Rating: One Star\n"});
  EXPECT_EQ(each.out.find("(mixed)"), std::string::npos);
}

TEST_F(OvrametaTest, GetGivesDisplayValuesRawTextAndFieldsOfStructures) {
  Sample("harbour.jpg");
  Sample("interview.mp4");
  ExpectValues({{"harbour.jpg", "dc:title", "Harbour at dawn"},
                {"harbour.jpg", "xmp:Rating", "Four Stars"},
                {"harbour.jpg", "dc:subject", "harbour; dawn; boats"},
                {"harbour.jpg", "exif:Flash/exif:Fired", "Did not fire"},
                {"interview.mp4", "xmpDM:markers[2]/xmpDM:name", "Action"}});

  const Result raw = Run({"get", "--raw", "harbour.jpg", "xmp:Rating", "exif:Flash/exif:Fired"});
  ASSERT_EQ(raw.status, 0) << raw.err;
  EXPECT_EQ(raw.out, "xmp:Rating = 4\nexif:Flash/exif:Fired = False\n");

  const Result structure = Run({"get", "interview.mp4", "xmpDM:startTimecode"});
  ASSERT_EQ(structure.status, 0) << structure.err;
  ExpectContains(structure.out, {"xmpDM:startTimecode/xmpDM:timeValue = 01:00:00:00\n"});
}

TEST_F(OvrametaTest, GetOfAnAbsentValueExitsWithOneAndNamesFileAndProperty) {
  Sample("harbour.jpg");
  Sample("interview.mp4");
  const Result result = Run({"get", "harbour.jpg", "interview.mp4", "xmpDM:scene"});
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.out, "interview.mp4: xmpDM:scene = 12\n");
  ExpectContains(result.err, {"harbour.jpg: xmpDM:scene: no value"});
}

TEST_F(OvrametaTest, GetJsonGivesEveryPropertyWithItsType) {
  Sample("interview.mp4");
  const Result result = Run({"get", "--json", "interview.mp4"});
  ASSERT_EQ(result.status, 0) << result.err;
  const auto json = nlohmann::json::parse(result.out);
  ASSERT_EQ(json.size(), 1u);
  EXPECT_EQ(json[0]["file"], "interview.mp4");
  const auto& properties = json[0]["properties"];
  auto find = [&](const std::string& name) {
    for (const auto& property : properties) {
      if (property["name"] == name) return property;
    }
    return nlohmann::json();
  };
  const auto good = find("xmpDM:good");
  ASSERT_FALSE(good.is_null()) << result.out;
  EXPECT_EQ(good["type"], "boolean");
  EXPECT_EQ(good["raw"], "True");
  const auto markers = find("xmpDM:markers");
  ASSERT_FALSE(markers.is_null());
  EXPECT_EQ(markers["type"], "seq of Marker (structure)");
  ASSERT_EQ(markers["items"].size(), 2u);
  EXPECT_EQ(markers["items"][1]["fields"][0]["name"], "xmpDM:markers[2]/xmpDM:comment");

  const Result named = Run({"get", "--json", "interview.mp4", "xmpDM:scene", "xmpDM:album"});
  EXPECT_EQ(named.status, 1);
  const auto namedJson = nlohmann::json::parse(named.out);
  EXPECT_EQ(namedJson[0]["properties"][0]["value"], "12");
  EXPECT_TRUE(namedJson[0]["properties"][1]["value"].is_null());
}

TEST_F(OvrametaTest, SetAndDeleteRoundTripOnEverySampleKind) {
  for (const std::string name : {"harbour.jpg", "interview.mp4", "ambience.wav"}) {
    SCOPED_TRACE(name);
    Sample(name);
    const Result set = Run({"set", name, "dc:title=Edited " + name, "xmpDM:scene=42",
                            "dc:subject=one; two", "--delete", "xmp:Rating"});
    ASSERT_EQ(set.status, 0) << set.err;
    ExpectValues({{name, "dc:title", "Edited " + name}, {name, "xmpDM:scene", "42"}, {name, "dc:subject", "one; two"}});
    EXPECT_EQ(Run({"get", name, "xmp:Rating"}).status, 1);
    // Deleting what is already gone is an absent value.
    EXPECT_EQ(Run({"set", name, "--delete", "xmp:Rating"}).status, 1);
  }
  // Values the edit did not name are kept.
  ExpectValues({{"interview.mp4", "xmpDM:markers[1]/xmpDM:name", "Slate"},
                {"ambience.wav", "xmpDM:album", "Harbour sounds"}});
}

TEST_F(OvrametaTest, SetOnAFileWithoutMetadataCreatesIt) {
  WriteFile(mDir / "bare.jpg", xmptest::media::Jpeg());
  const Result empty = Run({"show", "bare.jpg"});
  EXPECT_EQ(empty.status, 0);
  EXPECT_EQ(empty.out, "(no metadata)\n");
  EXPECT_EQ(Run({"get", "bare.jpg", "dc:title"}).status, 1);
  ASSERT_EQ(Run({"set", "bare.jpg", "dc:title=First words"}).status, 0);
  EXPECT_EQ(Get("bare.jpg", "dc:title"), "First words");
}

TEST_F(OvrametaTest, RefusedValuesLeaveEveryFileUntouched) {
  Sample("harbour.jpg");
  Sample("interview.mp4");
  const std::string photoBefore = ReadFile(mDir / "harbour.jpg");
  const std::string clipBefore = ReadFile(mDir / "interview.mp4");
  const std::pair<std::string, std::string> cases[] = {
      {"exif:ExposureProgram=42", "is not one of the allowed values"},  // closed choice
      {"xmpDM:audioSampleRate=fast", "is not an integer"},
      {"xmpDM:good=yes", "is not a boolean"},
      {"xmpDM:duration=12", "structure"},
      {"xmp:CreateDate=yesterday", "is not a date"},
  };
  for (const auto& [assignment, reason] : cases) {
    SCOPED_TRACE(assignment);
    // A valid assignment beside the refused one is not written either.
    const Result result = Run({"set", "harbour.jpg", "interview.mp4", "dc:title=Changed", assignment});
    EXPECT_EQ(result.status, 2);
    const std::string name = assignment.substr(0, assignment.find('='));
    ExpectContains(result.err, {"harbour.jpg, interview.mp4: " + name + ": refused: ", reason});
  }
  EXPECT_EQ(ReadFile(mDir / "harbour.jpg"), photoBefore);
  EXPECT_EQ(ReadFile(mDir / "interview.mp4"), clipBefore);
}

TEST_F(OvrametaTest, NormalisesAcceptedValuesToTheirStoredForm) {
  Sample("interview.mp4");
  ASSERT_EQ(Run({"set", "interview.mp4", "xmpDM:good=false", "xmpDM:audioSampleRate=+044100"}).status,
            0);
  const Result raw = Run({"get", "--raw", "interview.mp4", "xmpDM:good", "xmpDM:audioSampleRate"});
  EXPECT_EQ(raw.out, "xmpDM:good = False\nxmpDM:audioSampleRate = 44100\n");
}

TEST_F(OvrametaTest, UnreadableFilesExitWithTwoAndTheOthersAreStillRead) {
  Sample("harbour.jpg");
  WriteFile(mDir / "notes.txt", "not a media file\n");
  const Result result = Run({"get", "missing.jpg", "notes.txt", "harbour.jpg", "dc:title"});
  EXPECT_EQ(result.status, 2);
  ExpectContains(result.err, {"missing.jpg: cannot read file", "notes.txt: cannot read file"});
  EXPECT_EQ(result.out, "harbour.jpg: dc:title = Harbour at dawn\n");

  if (geteuid() != 0) {
    fs::permissions(mDir / "harbour.jpg", fs::perms::none);
    const Result locked = Run({"show", "harbour.jpg"});
    EXPECT_EQ(locked.status, 2);
    ExpectContains(locked.err, {"harbour.jpg: cannot read file"});
    fs::permissions(mDir / "harbour.jpg", fs::perms::owner_all);
  }
}

TEST_F(OvrametaTest, OneUnreadableFileNoLongerStopsTheBatch) {
  Sample("harbour.jpg");
  const Result result = Run({"set", "harbour.jpg", "missing.jpg", "dc:title=x"});
  EXPECT_EQ(result.status, 2);
  ExpectContains(result.err, {"missing.jpg: cannot read file", "1 file written, 1 not written"});
  EXPECT_EQ(Get(mDir / "harbour.jpg", "dc:title"), "x");
}

TEST_F(OvrametaTest, FilesWorkedOnSideBySideGiveWhatOneThreadGives) {
  // Mixed kinds, differing values and an unreadable file in the middle.
  const char* samples[] = {"harbour.jpg", "interview.mp4", "ambience.wav"};
  std::vector<std::string> files;
  for (int i = 0; i < 12; ++i) {
    const std::string sample = samples[i % 3];
    const std::string name = "f" + std::to_string(i) + sample.substr(sample.find('.'));
    Sample(sample, name);
    ASSERT_EQ(Run({"set", name, "dc:title=Title " + std::to_string(i)}).status, 0);
    files.push_back(name);
    if (i == 6) files.push_back("missing.jpg");
  }
  const auto with = [&](std::vector<std::string> head, const std::string& tail) {
    head.insert(head.end(), files.begin(), files.end());
    if (!tail.empty()) head.push_back(tail);
    return head;
  };
  for (const auto& [command, tail] : {std::pair<std::string, std::string>{"show", ""},
                                      {"get", "dc:title"}}) {
    SCOPED_TRACE(command);
    std::vector<std::string> head = {"-j", "1", command};
    if (command == "show") head.push_back("--each");
    const Result one = Run(with(head, tail));
    head[1] = "4";
    const Result four = Run(with(head, tail));
    EXPECT_EQ(one.status, 2);
    EXPECT_EQ(four.status, one.status);
    EXPECT_EQ(four.out, one.out);
    EXPECT_EQ(four.err, one.err);
    ExpectContains(four.err, {"missing.jpg: cannot read file"});
  }
  const Result shown = Run(with({"show", "--each", "-j", "4"}, ""));
  ExpectContains(shown.out, {"== f0.jpg ==", "Title 0", "== f11.wav ==", "Title 11"});
  EXPECT_LT(shown.out.find("== f6.jpg =="), shown.out.find("== f7.mp4 =="));

  files.erase(std::find(files.begin(), files.end(), "missing.jpg"));
  const Result set = Run(with({"-j", "4", "set"}, "xmp:Label=Checked"));
  ASSERT_EQ(set.status, 0) << set.err;
  for (std::size_t i = 0; i < files.size(); ++i) {
    ExpectValues({{files[i], "xmp:Label", "Checked"},
                  {files[i], "dc:title", "Title " + std::to_string(i)}});
  }
}

TEST_F(OvrametaTest, UsageErrorsExitWithTwo) {
  Sample("harbour.jpg");
  const Result unknownPrefix = Run({"set", "harbour.jpg", "nope:title=x"});
  EXPECT_EQ(unknownPrefix.status, 2);
  ExpectContains(unknownPrefix.err, {"\"nope:title\": no schema is registered with the prefix \"nope\""});
  const Result undeclared = Run({"get", "harbour.jpg", "nope:title"});
  EXPECT_EQ(undeclared.status, 1);
  ExpectContains(undeclared.err, {"nope:title: no value (no definition has the prefix \"nope\", nor does the file)"});
  const Result unknownProperty = Run({"get", "harbour.jpg", "dc:titel"});
  EXPECT_EQ(unknownProperty.status, 2);
  ExpectContains(unknownProperty.err, {"has no property \"titel\""});
  EXPECT_EQ(Run({"get", "harbour.jpg"}).status, 2);
  EXPECT_EQ(Run({"set", "harbour.jpg"}).status, 2);
  EXPECT_EQ(Run({"frobnicate"}).status, 2);
  EXPECT_EQ(Run({"--help"}).status, 0);
}

TEST_F(OvrametaTest, FoldersAreWalkedWithROnlyAndListsAddTheirFiles) {
  fs::create_directories(mDir / "shoot/day2");
  fs::create_directories(mDir / "shoot/.cache");
  Sample("harbour.jpg", "shoot/b.JPG");
  Sample("interview.mp4", "shoot/day2/a.mp4");
  Sample("ambience.wav", "shoot/c.wav");
  Sample("harbour.jpg", "shoot/.cache/hidden.jpg");
  Sample("harbour.jpg", "loose.jpg");
  fs::create_directory_symlink("..", mDir / "shoot/day2/up");
  const Result plain = Run({"get", "shoot", "loose.jpg", "dc:title"});
  EXPECT_EQ(plain.status, 2);
  EXPECT_EQ(plain.err, "ovrameta: shoot: is a folder (use -r to walk it)\n");
  EXPECT_EQ(plain.out, "Harbour at dawn\n");
  // Sorted, hidden and linked folders left out, explicit files always taken.
  const Result walked = Run({"get", "-r", "--ext", "JPG,.mp4", "shoot", "loose.jpg", "dc:title"});
  EXPECT_EQ(walked.status, 0) << walked.err;
  EXPECT_EQ(walked.out, "shoot/b.JPG: dc:title = Harbour at dawn\nshoot/day2/a.mp4: dc:title = Harbour interview\n"
                        "loose.jpg: dc:title = Harbour at dawn\n");

  WriteFile(mDir / "list.txt", "loose.jpg\r\nshoot/c.wav\n\n");
  EXPECT_EQ(Run({"show", "--files-from", "list.txt"}).status, 0);
  ASSERT_EQ(Run({"set", "-r", "--ext", "mp4", "-@", "list.txt", "shoot", "xmp:Label=Picked"}).status, 0);
  EXPECT_EQ(Run({"get", "-r", "shoot", "loose.jpg", "xmp:Label"}).out,
            "shoot/b.JPG: xmp:Label = Selected\nshoot/c.wav: xmp:Label = Picked\n"
            "shoot/day2/a.mp4: xmp:Label = Picked\nloose.jpg: xmp:Label = Picked\n");
  EXPECT_EQ(Run({"get", "-@", "missing.txt", "loose.jpg", "dc:title"}).status, 2);
}

TEST_F(OvrametaTest, NamesAlmostRightAndExifToolsFormsAreAnsweredWithTheRegisteredName) {
  Sample("harbour.jpg");
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{"get", "harbour.jpg", "title"}, "\"title\": did you mean dc:title?"},
      {{"get", "harbour.jpg", "DC:Title[@fr]"}, "\"DC:Title[@fr]\": did you mean dc:title[@fr]?"},
      {{"set", "harbour.jpg", "--delete", "dc:Rating"}, "\"dc:Rating\": did you mean xmp:Rating?"},
      {{"set", "harbour.jpg", "-XMP-dc:Title=x"}, "\"-XMP-dc:Title=x\" is ExifTool's form; ovrameta writes dc:title=x"},
      {{"set", "harbour.jpg", "Rating=3"}, "\"Rating=3\" is ExifTool's form; ovrameta writes xmp:Rating=3"},
      {{"get", "-Keywords", "harbour.jpg"}, "\"-Keywords\" is ExifTool's form; ovrameta reads dc:subject, "},
      {{"set", "harbour.jpg", "nothing=3"}, "\"nothing\" is not a property name"}};
  for (const auto& [arguments, message] : cases) {
    const Result result = Run(arguments);
    EXPECT_EQ(result.status, 2) << message;
    ExpectContains(result.err, {"ovrameta: " + message});
  }
  EXPECT_EQ(Get(mDir / "harbour.jpg", "dc:title"), "Harbour at dawn");
}

TEST_F(OvrametaTest, VersionUsageAndMessagesNameTheToolNotThePathItRanBy) {
  const Result version = Run({"--version"});
  EXPECT_EQ(version.status, 0);
  EXPECT_EQ(version.out, "ovrameta " OVRAMETA_VERSION "\n");
  ExpectContains(Run({"show", "--help"}).out, {"\nUsage: ovrameta show [OPTIONS] [FILE...]\n"});
  const Result missing = Run({"show"});
  EXPECT_EQ(missing.status, 2);
  EXPECT_EQ(missing.err, "ovrameta: FILE is required\nRun 'ovrameta --help' for more information.\n");
}

TEST_F(OvrametaTest, SchemasListsPropertiesWithTypesAndStructureFields) {
  const Result all = Run({"schemas"});
  ASSERT_EQ(all.status, 0) << all.err;
  ExpectContains(all.out, {"dc  http://purl.org/dc/elements/1.1/  Dublin Core\n"});
  const Result dm = Run({"schemas", "xmpDM"});
  ASSERT_EQ(dm.status, 0) << dm.err;
  EXPECT_EQ(dm.out.find("Dublin Core"), std::string::npos);
  ExpectContains(dm.out, {"xmpDM:markers", "seq of Marker (structure)", "xmpDM:good"});
  EXPECT_EQ(Run({"schemas", "nope"}).status, 2);
}

TEST_F(OvrametaTest, ProgressBarRunsOnATerminalOnly) {
  std::vector<std::string> arguments = {"get"};
  for (int i = 0; i < 25; ++i) {
    const std::string name = "f" + std::to_string(i) + ".jpg";
    Sample("harbour.jpg", name);
    arguments.push_back(name);
  }
  arguments.push_back("dc:title");
  const Result piped = Run(arguments);
  ASSERT_EQ(piped.status, 0) << piped.err;
  EXPECT_EQ(piped.err.find("files read"), std::string::npos);

  if (std::system("script --version >/dev/null 2>&1") != 0) {
    GTEST_SKIP() << "script(1) is missing; the terminal case is not checked";
  }
  // script(1) gives the program a terminal for its output and error.
  const std::string terminal =
      RunCommand("cd " + Quote(mDir.path().string()) + " && script -qec " + Quote(Command(arguments)) + " /dev/null");
  ExpectContains(terminal, {"25/25 files read", "f9.jpg: dc:title = Harbour at dawn"});
  // The bar follows standard error alone.
  const std::string in = "cd " + Quote(mDir.path().string()) + " && script -qec ";
  ExpectContains(RunCommand(in + Quote(Command(arguments) + " >out.txt") + " /dev/null"), {"25/25 files read"});
  EXPECT_EQ(RunCommand(in + Quote(Command(arguments) + " 2>err.txt") + " /dev/null").find("files read"),
            std::string::npos);
}

TEST_F(OvrametaTest, OvrametaReadsWhatExifToolWrote) {
  if (!HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; interoperability not checked";
  const fs::path photo = Sample("harbour.jpg");
  const fs::path clip = Sample("interview.mp4");
  RunCommand("LC_ALL=C exiftool -q -overwrite_original '-XMP-dc:Title=Written by ExifTool' "
             "-XMP-xmp:Rating=5 '-XMP-dc:Subject+=east' -XMP-iptcCore:CountryCode=CA " +
             Quote(photo.string()));
  RunCommand("LC_ALL=C exiftool -q -overwrite_original -XMP-xmpDM:TakeNumber=9 "
             "'-XMP-xmpDM:Markers+={Name=Wrap,StartTime=90}' " +
             Quote(clip.string()));
  ExpectValues({{"harbour.jpg", "dc:title", "Written by ExifTool"},
                {"harbour.jpg", "xmp:Rating", "Five Stars"},
                {"harbour.jpg", "dc:subject", "harbour; dawn; boats; east"},
                {"harbour.jpg", "Iptc4xmpCore:CountryCode", "CA"},
                {"interview.mp4", "xmpDM:takeNumber", "9"},
                {"interview.mp4", "xmpDM:markers[3]/xmpDM:name", "Wrap"}});
}

TEST_F(OvrametaTest, ListEditsDryRunsKeptTimesAndNoSplit) {
  Sample("harbour.jpg", "a.jpg");
  Sample("harbour.jpg", "b.jpg");
  ASSERT_EQ(Run({"set", "b.jpg", "dc:subject-=boats"}).status, 0);
  // Each file's own list decides: an item is added where it is missing.
  ASSERT_EQ(Run({"set", "a.jpg", "b.jpg", "dc:subject+=travel", "dc:subject+=dawn", "dc:subject-=harbour"}).status, 0);
  ExpectValues({{"a.jpg", "dc:subject", "dawn; boats; travel"}, {"b.jpg", "dc:subject", "dawn; travel"}});
  EXPECT_EQ(Run({"set", "a.jpg", "xmp:Label+=x"}).status, 2);

  const std::string before = ReadFile(mDir / "a.jpg");
  const Result dry = Run({"set", "--dry-run", "a.jpg", "dc:title=New", "dc:subject+=boats"});
  EXPECT_EQ(dry.status, 0);
  EXPECT_EQ(dry.out, "a.jpg: dc:title: \"Harbour at dawn\" -> \"New\"\n");
  EXPECT_EQ(ReadFile(mDir / "a.jpg"), before);

  struct timespec old[2] = {{1000000000, 0}, {1000000000, 0}};
  ASSERT_EQ(::utimensat(AT_FDCWD, (mDir / "a.jpg").c_str(), old, 0), 0);
  ASSERT_EQ(Run({"set", "-P", "--no-split", "a.jpg", "dc:subject=one; two"}).status, 0);
  struct stat after {};
  ASSERT_EQ(::stat((mDir / "a.jpg").c_str(), &after), 0);
  EXPECT_EQ(after.st_mtim.tv_sec, 1000000000);
  EXPECT_EQ(Get(mDir / "a.jpg", "dc:subject[1]"), "one; two");
  EXPECT_EQ(Get(mDir / "a.jpg", "dc:subject[2]"), "");
}

TEST_F(OvrametaTest, ExportImportCopyAndSidecars) {
  Sample("harbour.jpg", "a.jpg");
  Sample("interview.mp4", "m.mp4");
  // An export read back in changes nothing.
  for (const std::string format : {"--csv", "--json"}) {
    const Result exported = Run({"get", format, "a.jpg", "m.mp4"});
    ASSERT_EQ(exported.status, 0) << exported.err;
    WriteFile(mDir / "rows", exported.out);
    const std::string photo = ReadFile(mDir / "a.jpg"), clip = ReadFile(mDir / "m.mp4");
    const Result imported = Run({"set", format, "rows"});
    EXPECT_EQ(imported.status, 0) << imported.err;
    EXPECT_EQ(ReadFile(mDir / "a.jpg"), photo) << format;
    EXPECT_EQ(ReadFile(mDir / "m.mp4"), clip) << format;
  }
  WriteFile(mDir / "rows.csv", "file,dc:title,dc:subject,xmp:Rating\na.jpg,\"Quay, at dusk\",\"a; \"\"b;c\"\"\",\n");
  ASSERT_EQ(Run({"set", "--csv", "rows.csv"}).status, 0);
  ExpectValues({{"a.jpg", "dc:title", "Quay, at dusk"}, {"a.jpg", "dc:subject[2]", "b;c"},
                {"a.jpg", "xmp:Rating", "Four Stars"}});

  Sample("interview.mp4", "n.mp4");
  ASSERT_EQ(Run({"copy", "a.jpg", "m.mp4", "n.mp4", "dc:title", "dc:subject"}).status, 0);
  ExpectValues({{"n.mp4", "dc:title", "Quay, at dusk"}, {"m.mp4", "dc:subject", "a; \"b;c\""}});

  // Camera raw files take their edits in a sidecar; --sidecar asks for one.
  WriteFile(mDir / "shot.cr2", ReadFile(mDir / "a.jpg"));
  const std::string raw = ReadFile(mDir / "shot.cr2");
  ASSERT_EQ(Run({"set", "shot.cr2", "xmp:Label=Raw"}).status, 0);
  EXPECT_EQ(ReadFile(mDir / "shot.cr2"), raw);
  EXPECT_EQ(Get(mDir / "shot.cr2", "xmp:Label"), "Raw");
  EXPECT_TRUE(fs::exists(mDir / "shot.xmp"));
  ASSERT_EQ(Run({"--sidecar", "--sidecar-name", "full", "set", "a.jpg", "xmp:Label=Beside"}).status, 0);
  EXPECT_EQ(Run({"--sidecar", "get", "a.jpg", "xmp:Label"}).out, "Beside\n");
  EXPECT_EQ(Get(mDir / "a.jpg", "xmp:Label"), "Selected");
  EXPECT_TRUE(fs::exists(mDir / "a.jpg.xmp"));
}

}  // namespace
