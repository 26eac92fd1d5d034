// What ovrameta reads against what ExifTool reads, value by value, on
// files ExifTool makes in the shapes real files have: languages beside the
// default, ratings written as reals, hierarchical keywords, regions, formats
// found by scanning, and namespaces nobody defined.
#include <algorithm>
#include <cctype>
#include <charconv>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "ToolTestSupport.h"

namespace {

using namespace ovratest::tool;
using Json = nlohmann::json;

std::string Lower(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(), [](unsigned char c) { return std::tolower(c); });
  return text;
}

// "mwg-rs:Regions/mwg-rs:AppliedToDimensions" -> "applietodimensions".
std::string LocalName(const std::string& name) {
  const std::string last = name.substr(name.rfind('/') == std::string::npos ? 0 : name.rfind('/') + 1);
  return Lower(last.substr(last.find(':') + 1));
}

// ExifTool's names where they are not the property's own.
std::string ExifToolName(const std::string& name) {
  if (name == "regioninfo") return "regions";
  if (name == "keywordinfo") return "keywords";
  return name;
}

// ExifTool's group names where they are not the namespace's prefix.
std::string ExifToolGroup(const std::string& group) {
  if (group == "iptccore") return "iptc4xmpcore";
  if (group == "iptcext") return "iptc4xmpext";
  return group;
}

// Dates as ExifTool prints them: "2024:05:01 12:00:00".
std::string AsExifToolDate(std::string text) {
  const bool date = text.size() >= 7 && std::isdigit(static_cast<unsigned char>(text[0])) && text[4] == '-';
  if (!date) return text;
  for (std::size_t i = 0; i < std::min<std::size_t>(text.size(), 10); ++i)
    if (text[i] == '-') text[i] = ':';
  if (text.size() > 10 && text[10] == 'T') text[10] = ' ';
  return text;
}

bool SameNumber(const std::string& text, double number) {
  double parsed = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), parsed);
  return error == std::errc() && end == text.data() + text.size() && parsed == number;
}

// Compares ExifTool's value with ovrameta's node; the differences go to why.
void Compare(const Json& theirs, const Json& ours, const std::string& where, std::vector<std::string>& why) {
  if (ours.contains("fields")) {
    if (!theirs.is_object()) return why.push_back(where + ": a structure here, not for ExifTool");
    for (const auto& [key, value] : theirs.items()) {
      const auto& fields = ours["fields"];
      const auto field = std::find_if(fields.begin(), fields.end(), [&](const Json& f) {
        return LocalName(f["name"].get<std::string>()) == ExifToolName(Lower(key));
      });
      if (field == fields.end()) {
        why.push_back(where + "/" + key + ": not read");
      } else {
        Compare(value, *field, where + "/" + key, why);
      }
    }
    return;
  }
  if (ours.contains("items") && !ours["items"].empty()) {
    const Json list = theirs.is_array() ? theirs : Json::array({theirs});
    if (list.size() != ours["items"].size()) return why.push_back(where + ": " + std::to_string(ours["items"].size()) +
                                                                   " items, ExifTool " + std::to_string(list.size()));
    for (std::size_t i = 0; i < list.size(); ++i) Compare(list[i], ours["items"][i], where + "[" + std::to_string(i + 1) + "]", why);
    return;
  }
  const std::string text = ours.contains("raw") && ours["raw"].is_string() ? ours["raw"].get<std::string>()
                                                                           : ours.value("value", std::string());
  const bool same = theirs.is_number() ? SameNumber(text, theirs.get<double>())
                                       : theirs.is_string() && AsExifToolDate(text) == theirs.get<std::string>();
  if (!same) why.push_back(where + ": \"" + text + "\", ExifTool " + theirs.dump());
}

class CorpusTest : public ToolTest {
 protected:
  void Make(const std::string& name, const std::string& contents, const std::string& exiftoolArguments) {
    WriteFile(mDir / name, contents);
    if (!exiftoolArguments.empty())
      RunCommand("cd " + Quote(mDir.path().string()) + " && LC_ALL=C exiftool -q -overwrite_original " +
                 exiftoolArguments + " " + name);
  }
};

const char kSidecar[] = R"(<x:xmpmeta xmlns:x="adobe:ns:meta/"><rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">
 <rdf:Description rdf:about="" xmlns:darktable="http://darktable.sf.net/" xmlns:foo="http://example.com/foo/1.0/"
   darktable:xmp_version="5">
  <darktable:history><rdf:Seq>
   <rdf:li darktable:operation="exposure" darktable:enabled="1"/>
   <rdf:li darktable:operation="colorin" darktable:enabled="0"/>
  </rdf:Seq></darktable:history>
  <foo:caption><rdf:Alt><rdf:li xml:lang="x-default">Hi</rdf:li><rdf:li xml:lang="fr">Salut</rdf:li></rdf:Alt></foo:caption>
 </rdf:Description></rdf:RDF></x:xmpmeta>)";

const char kSvg[] = R"(<?xml version="1.0"?>
<svg xmlns="http://www.w3.org/2000/svg" width="1" height="1"><metadata>
<?xpacket begin="" id="W5M0MpCehiHzreSzNTczkc9d"?><x:xmpmeta xmlns:x="adobe:ns:meta/">
<rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#"><rdf:Description rdf:about=""
 xmlns:xmp="http://ns.adobe.com/xap/1.0/" xmp:Label="Green"/></rdf:RDF></x:xmpmeta><?xpacket end="w"?>
</metadata></svg>
)";

TEST_F(CorpusTest, EveryValueExifToolReadsIsReadTheSame) {
  if (!HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; it makes the corpus and reads it";
  std::string jpeg = ReadFile(fs::path(OVRA_SAMPLES_DIR) / "harbour.jpg");
  WriteFile(mDir / "plain.jpg", jpeg);
  RunCommand("LC_ALL=C exiftool -q -overwrite_original -all= " + Quote((mDir / "plain.jpg").string()));
  jpeg = ReadFile(mDir / "plain.jpg");
  const std::string gif("GIF89a\x01\0\x01\0\x80\0\0\0\0\0\xff\xff\xff,\0\0\0\0\x01\0\x01\0\0\x02\x02\x44\x01\0;", 35);
  const std::string eps = "%!PS-3.0 EPSF-3.0\n%%BoundingBox: 0 0 1 1\n%%EndComments\nshowpage\n%%EOF\n";
  Make("languages.jpg", jpeg,
       "-EXIF:Artist=Camera -XMP-dc:Title=Harbour -XMP-dc:Title-en=Harbour -XMP-dc:Title-fr=Port "
       "-XMP-dc:Title-de=Hafen -XMP-dc:Title-es=Puerto -XMP-dc:Description=Boats -XMP-dc:Description-de=Boote "
       "-XMP-xmp:Rating=5.0 -XMP-xmp:CreateDate=2024:05:01 '-XMP-tiff:ResolutionUnit#=3' '-XMP-tiff:Compression#=7'");
  Make("regions.jpg", jpeg,
       "'-XMP-lr:HierarchicalSubject=Places|Harbour' '-XMP-lr:HierarchicalSubject=People|Ann' "
       "'-XMP-mwg-rs:RegionInfo={AppliedToDimensions={W=100,H=80,Unit=pixel},RegionList=[{Name=Ann,Type=Face,"
       "Area={X=0.5,Y=0.5,W=0.1,H=0.1,Unit=normalized}}]}' "
       "'-XMP-mwg-kw:KeywordInfo={Hierarchy=[{Keyword=Places,Children=[{Keyword=Harbour}]}]}' "
       "-XMP-iptcExt:PersonInImage=Ann -XMP-iptcCore:CountryCode=NO");
  Make("picture.gif", gif, "-XMP-dc:Title=Gif -XMP-xmp:Label=Red");
  Make("scanned.eps", eps, "-m -XMP-dc:Title=Eps -XMP-xmp:Label=Blue");
  Make("scanned.svg", kSvg, "");
  Make("darktable.xmp", kSidecar, "");
  const std::vector<std::string> files = {"languages.jpg", "regions.jpg", "picture.gif",
                                          "scanned.eps", "scanned.svg", "darktable.xmp"};

  std::string command = "cd " + Quote(mDir.path().string()) + " && LC_ALL=C exiftool -q -j -struct -G1 -n -XMP:all";
  for (const auto& file : files) command += " " + file;
  const Json theirs = Json::parse(RunCommand(command), nullptr, false);
  std::vector<std::string> arguments = {"get", "--json"};
  arguments.insert(arguments.end(), files.begin(), files.end());
  const Result result = Run(arguments);
  ASSERT_EQ(result.status, 0) << result.err;
  EXPECT_EQ(result.err, "");
  const Json ours = Json::parse(result.out);
  ASSERT_TRUE(theirs.is_array() && theirs.size() == files.size() && ours.size() == files.size());

  std::size_t compared = 0;
  std::vector<std::string> why;
  for (std::size_t i = 0; i < files.size(); ++i) {
    const Json& properties = ours[i]["properties"];
    for (const auto& [tag, value] : theirs[i].items()) {
      if (tag == "SourceFile" || tag == "XMP-x:XMPToolkit") continue;
      const std::string where = files[i] + " " + tag;
      // "XMP-dc:Title-fr": group, ExifTool's name, language.
      const std::string group = tag.substr(4, tag.find(':') - 4);
      std::string name = tag.substr(tag.find(':') + 1), language;
      if (name.find('-') != std::string::npos) {
        language = name.substr(name.find('-') + 1);
        name = name.substr(0, name.find('-'));
      }
      // ExifTool names SVG elements after their place in the document.
      if (files[i] == "scanned.svg" && name.rfind("SvgMetadata", 0) == 0) name = name.substr(11);
      if (group.empty() || group == "SVG" || name.rfind("Svg", 0) == 0) continue;
      const auto property = std::find_if(properties.begin(), properties.end(), [&](const Json& p) {
        return Lower(p["schema"].get<std::string>()) == ExifToolGroup(Lower(group)) &&
               LocalName(p["name"].get<std::string>()) == ExifToolName(Lower(name));
      });
      ++compared;
      if (property == properties.end()) {
        why.push_back(where + ": not read");
      } else if (!language.empty() || property->contains("languages")) {
        const Json& languages = (*property)["languages"];
        const std::string key = language.empty() ? "x-default" : language;
        bool found = false;
        for (const auto& [tagLanguage, tagText] : languages.items()) {
          if (Lower(tagLanguage) != Lower(key)) continue;
          found = true;
          if (tagText != value) why.push_back(where + ": " + tagText.dump() + ", ExifTool " + value.dump());
        }
        if (!found) why.push_back(where + ": language not read");
      } else {
        Compare(value, *property, where, why);
      }
    }
  }
  EXPECT_GE(compared, 24u);
  EXPECT_TRUE(why.empty()) << compared << " values compared; these differ:\n" << [&] {
    std::string all;
    for (const auto& line : why) all += "  " + line + "\n";
    return all;
  }();

  // One language read and written alone; the others stay.
  EXPECT_EQ(Get(mDir / "languages.jpg", "dc:title[@fr]"), "Port");
  ASSERT_EQ(Run({"set", "languages.jpg", "dc:description[@de]=Schiffe", "dc:title[@it]=Porto"}).status, 0);
  EXPECT_EQ(ExifToolValue(mDir / "languages.jpg", "XMP-dc:Description-de"), "Schiffe");
  EXPECT_EQ(ExifToolValue(mDir / "languages.jpg", "XMP-dc:Description"), "Boats");
  EXPECT_EQ(ExifToolValue(mDir / "languages.jpg", "XMP-dc:Title-it"), "Porto");
  EXPECT_EQ(ExifToolValue(mDir / "languages.jpg", "XMP-dc:Title-fr"), "Port");
  // Formats found by scanning are read, never written.
  const std::string before = ReadFile(mDir / "scanned.eps");
  const Result refused = Run({"set", "scanned.eps", "xmp:Label=Red"});
  EXPECT_EQ(refused.status, 2);
  ExpectContains(refused.err, {"scanned.eps: can be read but not written (PostScript)"});
  EXPECT_EQ(ReadFile(mDir / "scanned.eps"), before);
}

}  // namespace
