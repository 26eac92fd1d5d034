#include <atomic>
#include <cstdlib>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <ovracore/Localizer.h>

#include "TestSupport.h"

using namespace ovracore;

namespace {
class Localizer : public ::testing::Test {
 protected:
  void SetUp() override { ClearDictionaries(); }
  void TearDown() override { ClearDictionaries(); }
  ovratest::TempDir mDir;
};
}  // namespace

TEST_F(Localizer, KeyFallsBackToTextAfterFirstEqualsAndPlainTextStaysUnchanged) {
  // Even when a dictionary knows the same words as a key.
  AddDictionaryEntry("Plain", "Other");
  const std::pair<const char*, const char*> cases[] = {
      {"$$$/ovrametadata/x/Unknown=unknown error.", "unknown error."},
      {"$$$/a/b=x=y", "x=y"},
      {"$$$/a/NoDefault", "$$$/a/NoDefault"},
      {"Plain = text $$$/not/a/key=x", "Plain = text $$$/not/a/key=x"},
      {"", ""},
      {"Plain", "Plain"}};
  for (const auto& [text, shown] : cases) EXPECT_EQ(ZStringUTF8(text), shown) << text;
  EXPECT_EQ(ZString("$$$/a/b=\xC3\xA9t\xC3\xA9"), u"\u00E9t\u00E9");
}

TEST_F(Localizer, DictionaryFilesLaterEntriesWinAndCommentsAreIgnored) {
  ovratest::WriteFile(mDir / "first.dat",
                      "\xEF\xBB\xBF# comment $$$/a/One=ignored\r\n"
                      "$$$/a/One=Eins\r\n"
                      "\n"
                      "$$$/a/Two=Zwei\n"
                      "not a key line\n"
                      "$$$/a/One=Erste\n");
  ovratest::WriteFile(mDir / "second.dat", "$$$/a/Two=Deux\n#$$$/a/Three=nope");
  ASSERT_TRUE(AddDictionaryFile(ToUTF16((mDir / "first.dat").string())));
  EXPECT_EQ(ZStringUTF8("$$$/a/One=One"), "Erste");
  EXPECT_EQ(ZStringUTF8("$$$/a/Two=Two"), "Zwei");
  ASSERT_TRUE(AddDictionaryFile(ToUTF16((mDir / "second.dat").string())));
  EXPECT_EQ(ZStringUTF8("$$$/a/Two=Two"), "Deux");
  EXPECT_EQ(ZStringUTF8("$$$/a/Three=Three"), "Three");
  EXPECT_FALSE(AddDictionaryFile(ToUTF16((mDir / "missing.dat").string())));
  ClearDictionaries();
  EXPECT_EQ(ZStringUTF8("$$$/a/One=One"), "One");
}

TEST_F(Localizer, PlaceholdersAreFilledOnceAndMissingOnesStay) {
  EXPECT_EQ(ZStringUTF8("$$$/a/k=@0 of @1 (@2)", {"3", "7", "x"}), "3 of 7 (x)");
  EXPECT_EQ(ZStringUTF8("$$$/a/k=@1 before @0", {"a", "b"}), "b before a");
  EXPECT_EQ(ZStringUTF8("$$$/a/k=@0 and @2", {"only"}), "only and @2");
  // An argument that looks like a placeholder or escape is not expanded.
  EXPECT_EQ(ZStringUTF8("$$$/a/k=[@0] [@1]", {"@1", "#{quot}"}), "[@1] [#{quot}]");
  EXPECT_EQ(ZStringUTF8("mail@0 @", {"x"}), "mailx @");
  AddDictionaryEntry("$$$/a/k", "@1 / @0");
  EXPECT_EQ(ZStringUTF8("$$$/a/k=@0 / @1", {"A", "B"}), "B / A");
}

TEST_F(Localizer, EscapesForQuotesAndCodePoints) {
  EXPECT_EQ(ZStringUTF8("$$$/a/k=invalid tag #{quot}@0#{quot}.", {"x"}), "invalid tag \"x\".");
  EXPECT_EQ(ZStringUTF8("#{U+00E9}#{U+1F3A5}"), "\xC3\xA9\xF0\x9F\x8E\xA5");
  // Code-point escapes are not scanned again as placeholders.
  EXPECT_EQ(ZStringUTF8("#{U+0040}0", {"no"}), "@0");
  EXPECT_EQ(ZStringUTF8("#{U+XYZ} #{quot #{U+} #{U+1234567}"), "#{U+XYZ} #{quot #{U+} #{U+1234567}");
  EXPECT_EQ(ZStringUTF8("#{U+D800}"), "\xEF\xBF\xBD");
}

TEST_F(Localizer, ConcurrentLookupsWhileDictionariesChange) {
  std::atomic<bool> bad{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&bad] {
      for (int i = 0; i < 2000; ++i) {
        const std::string text = ZStringUTF8("$$$/a/Busy=default @0", {"x"});
        if (text != "default x" && text != "busy x") bad = true;
      }
    });
  }
  for (int i = 0; i < 500; ++i) {
    AddDictionaryEntry("$$$/a/Busy", "busy @0");
    if (i % 7 == 0) ClearDictionaries();
  }
  for (std::thread& t : threads) t.join();
  EXPECT_FALSE(bad);
}

TEST(ApplicationLanguage, FromEnvironmentOrHost) {
  // The test main sets LC_ALL=en_US.UTF-8.
  SetApplicationLanguage("");
  EXPECT_EQ(ApplicationLanguage(), "en_US");
  const std::string savedAll = std::getenv("LC_ALL") ? std::getenv("LC_ALL") : "";
  setenv("LC_ALL", "de_DE.UTF-8@euro", 1);
  SetApplicationLanguage("");
  EXPECT_EQ(ApplicationLanguage(), "de_DE");
  setenv("LC_ALL", "", 1);
  setenv("LC_MESSAGES", "POSIX", 1);
  SetApplicationLanguage("");
  EXPECT_EQ(ApplicationLanguage(), "en_US");
  unsetenv("LC_MESSAGES");
  SetApplicationLanguage("fr_FR");
  EXPECT_EQ(ApplicationLanguage(), "fr_FR");
  setenv("LC_ALL", savedAll.c_str(), 1);
  SetApplicationLanguage("");
}
