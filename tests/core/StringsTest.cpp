#include <clocale>
#include <limits>
#include <locale>
#include <optional>
#include <utility>

#include <gtest/gtest.h>

#include <ovracore/Strings.h>

using namespace ovracore;

TEST(Conversions, ValidTextRoundTripsThroughUTF16) {
  const std::string text = "A\xC3\xA9\xE2\x82\xAC\xF0\x9F\x8E\xA5z";  // A é € 🎥 z
  const UTF16String wide = ToUTF16(text);
  EXPECT_EQ(wide, (UTF16String{u'A', 0xE9, 0x20AC, 0xD83C, 0xDFA5, u'z'}));
  EXPECT_EQ(ToUTF8(wide), text);

  // Long texts: characters and faults at every offset of the ASCII runs
  // (the converter takes ASCII in blocks).
  for (std::size_t at = 0; at <= 17; ++at) {
    std::string mixed(at, 'x');
    mixed += "\xC3\xA9" + std::string(9, 'y') + "\xF0\x9F\x8E\xA5\x80" + std::string(at, 'z');
    UTF16String expected(at, u'x');
    expected += u"\u00E9" + UTF16String(9, u'y') + u"\U0001F3A5\uFFFD" + UTF16String(at, u'z');
    EXPECT_EQ(ToUTF16(mixed), expected) << at;
  }
}

TEST(Conversions, InvalidUTF8BecomesReplacementWithoutEatingValidText) {
  // Stray continuation, truncated sequence, overlong "/", encoded surrogate,
  // value above U+10FFFF, impossible lead byte, embedded NUL.
  const std::pair<std::string, UTF16String> cases[] = {
      {"a\x80z", u"a\uFFFDz"},    {"a\xE2\x82z", u"a\uFFFDz"},   {"\xE2\x82", u"\uFFFD"},
      {"\xC0\xAF", u"\uFFFD\uFFFD"}, {"\xED\xA0\x80", u"\uFFFD"}, {"\xF4\x90\x80\x80", u"\uFFFD"},
      {"\xFF", u"\uFFFD"},        {std::string("a\0b", 3), UTF16String(u"a\0b", 3)}};
  for (const auto& [in, out] : cases) EXPECT_EQ(ToUTF16(in), out) << in;
}

TEST(Conversions, LoneSurrogatesBecomeReplacementAndPairsSurvive) {
  const std::pair<UTF16String, std::string> cases[] = {
      {{0xD800}, "\xEF\xBF\xBD"},
      {{u'x', 0xDC00, u'y'}, "x\xEF\xBF\xBDy"},
      {{0xDBFF, 0xDFFF}, "\xF4\x8F\xBF\xBF"},  // U+10FFFF
      // High surrogate followed by a non-surrogate keeps the second character.
      {{0xD83C, u'A'}, "\xEF\xBF\xBD" "A"}};
  for (const auto& [in, out] : cases) EXPECT_EQ(ToUTF8(in), out);
  std::string out;
  AppendCodePoint(out, 0x110000);
  AppendCodePoint(out, 0xDFFF);
  EXPECT_EQ(out, "\xEF\xBF\xBD\xEF\xBF\xBD");
}

TEST(Coercion, StrictFormsAcceptWholeNumbersOnly) {
  const std::pair<const char*, std::optional<double>> doubles[] = {
      {" 1.5 ", 1.5}, {"+2", 2.0}, {"-1e3", -1000.0}, {"", {}}, {"1.5x", {}}, {"1,5", {}}, {"nan", {}},
      {"1e999", {}},  {"+-1", {}}};
  for (const auto& [text, value] : doubles) EXPECT_TRUE(ToDouble(text) == value) << text;
  EXPECT_EQ(ToInt64("-9223372036854775808"), INT64_MIN);
  EXPECT_FALSE(ToInt64("9223372036854775808"));
  EXPECT_EQ(ToInt32("\t+42\n"), 42);
  for (const char* text : {"2147483648", "1.0", "0x10"}) EXPECT_FALSE(ToInt32(text)) << text;
  EXPECT_EQ(ToUInt8("255"), 255);
  EXPECT_FALSE(ToUInt8("256"));
  EXPECT_FALSE(ToUInt8("-1"));
}

TEST(Coercion, LenientFormTakesLongestPrefix) {
  const std::pair<const char*, double> cases[] = {{"5.6 mm", 5.6}, {"  -3/4", -3.0}, {"f/2.8", 0.0}, {"", 0.0},
                                                  {"inf", 0.0}};
  for (const auto& [text, value] : cases) EXPECT_EQ(CoerceToDouble(text), value) << text;
}

TEST(NumberFormatting, FixedDecimalsRoundHalfAwayFromZeroWhateverTheSign) {
  const struct {
    double value;
    int decimals;
    const char* text;
  } cases[] = {{2.5, 2, "2.50"},      {2.675, 2, "2.68"},     {0.125, 2, "0.13"},      {-0.125, 2, "-0.13"},
               {2.5, 0, "3"},         {-2.5, 0, "-3"},        {9.995, 2, "10.00"},     {999.96, 1, "1000.0"},
               {0.0005, 3, "0.001"},  {0.0004, 2, "0.00"},    {1.0 / 3.0, 4, "0.3333"}, {123456789.0, 0, "123456789"},
               {1e20, 1, "100000000000000000000.0"},           {-0.0, 1, "0.0"},        {-0.001, 2, "0.00"},
               {0.0, 0, "0"},         {std::numeric_limits<double>::quiet_NaN(), 2, "nan"},
               {-std::numeric_limits<double>::infinity(), 2, "-inf"}};
  for (const auto& c : cases) EXPECT_EQ(NumberToString(c.value, c.decimals), c.text) << c.value;
  EXPECT_EQ(NumberToUTF16String(5.6, 1), u"5.6");
}

namespace {
struct CommaDecimal : std::numpunct<char> {
  char do_decimal_point() const override { return ','; }
  char do_thousands_sep() const override { return '.'; }
  std::string do_grouping() const override { return "\3"; }
};
}  // namespace

TEST(NumberFormatting, IgnoresProcessLocale) {
  // A host may install a locale with a decimal comma for its own display.
  const std::locale savedGlobal = std::locale::global(std::locale(std::locale::classic(), new CommaDecimal));
  EXPECT_EQ(NumberToString(12345.5, 1), "12345.5");
  EXPECT_EQ(ToDouble("1.5"), 1.5);
  std::locale::global(savedGlobal);

  const char* previous = std::setlocale(LC_NUMERIC, nullptr);
  const std::string saved = previous ? previous : "C";
  if (!std::setlocale(LC_NUMERIC, "de_DE.UTF-8") && !std::setlocale(LC_NUMERIC, "fr_FR.UTF-8"))
    GTEST_SKIP() << "no C locale with a decimal comma installed";
  EXPECT_EQ(NumberToString(1.5, 1), "1.5");
  EXPECT_EQ(ToDouble("1.5"), 1.5);
  EXPECT_EQ(CoerceToDouble("2.25x"), 2.25);
  std::setlocale(LC_NUMERIC, saved.c_str());
}

TEST(Tokenizing, KeepsOrDropsEmptyTokens) {
  const struct {
    const char* text;
    const char* separators;
    bool keepEmpty;
    std::vector<UTF8String> tokens;
  } cases[] = {{"1/250", "/", true, {"1", "250"}}, {"a//b/", "/", true, {"a", "", "b", ""}},
               {"a, b;;c", ",; ", false, {"a", "b", "c"}}, {"", "/", true, {""}}, {"//", "/", false, {}},
               {"abc", "", true, {"abc"}}};
  for (const auto& c : cases) EXPECT_EQ(Tokenize(c.text, c.separators, c.keepEmpty), c.tokens) << c.text;
}

TEST(XMLReserved, EncodeDecodeRoundTrip) {
  const std::string text = "a<b>&\"c\" 'd' \xC3\xA9\tx\n";
  const std::string encoded = EncodeXMLReserved(text);
  EXPECT_EQ(encoded, "a&lt;b&gt;&amp;&quot;c&quot; &apos;d&apos; \xC3\xA9&#9;x&#10;");
  EXPECT_EQ(DecodeXMLReserved(encoded), text);
  // Encoding the encoded text once more must not collapse on decoding.
  EXPECT_EQ(DecodeXMLReserved(EncodeXMLReserved(encoded)), encoded);
}

TEST(XMLReserved, NumericReferencesAndMalformedOnes) {
  EXPECT_EQ(DecodeXMLReserved("&#65;&#x42;&#X43;&#233;"), "ABC\xC3\xA9");
  EXPECT_EQ(DecodeXMLReserved("&#x1F3A5;"), "\xF0\x9F\x8E\xA5");
  // Left alone: unknown names, no terminator, invalid code points, empty refs.
  EXPECT_EQ(DecodeXMLReserved("&nbsp; &amp &#xD800; &#0; &#x110000; &#; &#x; a & b"),
            "&nbsp; &amp &#xD800; &#0; &#x110000; &#; &#x; a & b");
  EXPECT_EQ(DecodeXMLReserved("&&amp;"), "&&");
}

TEST(ASCIIHelpers, CaseAndBlanks) {
  EXPECT_TRUE(EqualsIgnoreCaseASCII("True", "tRUE"));
  EXPECT_FALSE(EqualsIgnoreCaseASCII("true", "trueX"));
  EXPECT_FALSE(EqualsIgnoreCaseASCII("\xC3\xA9", "\xC3\x89"));  // ASCII only
  EXPECT_EQ(TrimBlanks(" \t a b \r\n"), "a b");
  EXPECT_EQ(TrimBlanks("   "), "");
}
