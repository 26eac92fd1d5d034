#include <clocale>
#include <limits>
#include <locale>

#include <gtest/gtest.h>

#include <ovracore/Strings.h>

using namespace ovracore;

TEST(Conversions, ValidTextRoundTripsThroughUTF16) {
  const std::string text = "A\xC3\xA9\xE2\x82\xAC\xF0\x9F\x8E\xA5z";  // A é € 🎥 z
  const UTF16String wide = ToUTF16(text);
  EXPECT_EQ(wide, (UTF16String{u'A', 0xE9, 0x20AC, 0xD83C, 0xDFA5, u'z'}));
  EXPECT_EQ(ToUTF8(wide), text);
}

TEST(Conversions, InvalidUTF8BecomesReplacementWithoutEatingValidText) {
  // Stray continuation, truncated sequence, overlong "/", encoded surrogate,
  // value above U+10FFFF, impossible lead byte.
  EXPECT_EQ(ToUTF16("a\x80z"), u"a\uFFFDz");
  EXPECT_EQ(ToUTF16("a\xE2\x82z"), u"a\uFFFDz");
  EXPECT_EQ(ToUTF16("\xE2\x82"), u"\uFFFD");
  EXPECT_EQ(ToUTF16("\xC0\xAF"), u"\uFFFD\uFFFD");
  EXPECT_EQ(ToUTF16("\xED\xA0\x80"), u"\uFFFD");
  EXPECT_EQ(ToUTF16("\xF4\x90\x80\x80"), u"\uFFFD");
  EXPECT_EQ(ToUTF16("\xFF"), u"\uFFFD");
  EXPECT_EQ(ToUTF16(std::string("a\0b", 3)), UTF16String(u"a\0b", 3));
}

TEST(Conversions, LoneSurrogatesBecomeReplacementAndPairsSurvive) {
  EXPECT_EQ(ToUTF8(UTF16String{0xD800}), "\xEF\xBF\xBD");
  EXPECT_EQ(ToUTF8(UTF16String{u'x', 0xDC00, u'y'}), "x\xEF\xBF\xBDy");
  EXPECT_EQ(ToUTF8(UTF16String{0xDBFF, 0xDFFF}), "\xF4\x8F\xBF\xBF");  // U+10FFFF
  // High surrogate followed by a non-surrogate keeps the second character.
  EXPECT_EQ(ToUTF8(UTF16String{0xD83C, u'A'}), "\xEF\xBF\xBD" "A");
  std::string out;
  AppendCodePoint(out, 0x110000);
  AppendCodePoint(out, 0xDFFF);
  EXPECT_EQ(out, "\xEF\xBF\xBD\xEF\xBF\xBD");
}

TEST(Coercion, StrictFormsAcceptWholeNumbersOnly) {
  EXPECT_EQ(ToDouble(" 1.5 "), 1.5);
  EXPECT_EQ(ToDouble("+2"), 2.0);
  EXPECT_EQ(ToDouble("-1e3"), -1000.0);
  EXPECT_FALSE(ToDouble(""));
  EXPECT_FALSE(ToDouble("1.5x"));
  EXPECT_FALSE(ToDouble("1,5"));
  EXPECT_FALSE(ToDouble("nan"));
  EXPECT_FALSE(ToDouble("1e999"));
  EXPECT_FALSE(ToDouble("+-1"));

  EXPECT_EQ(ToInt64("-9223372036854775808"), INT64_MIN);
  EXPECT_FALSE(ToInt64("9223372036854775808"));
  EXPECT_EQ(ToInt32("\t+42\n"), 42);
  EXPECT_FALSE(ToInt32("2147483648"));
  EXPECT_FALSE(ToInt32("1.0"));
  EXPECT_FALSE(ToInt32("0x10"));
  EXPECT_EQ(ToUInt8("255"), 255);
  EXPECT_FALSE(ToUInt8("256"));
  EXPECT_FALSE(ToUInt8("-1"));
}

TEST(Coercion, LenientFormTakesLongestPrefix) {
  EXPECT_EQ(CoerceToDouble("5.6 mm"), 5.6);
  EXPECT_EQ(CoerceToDouble("  -3/4"), -3.0);
  EXPECT_EQ(CoerceToDouble("f/2.8"), 0.0);
  EXPECT_EQ(CoerceToDouble(""), 0.0);
  EXPECT_EQ(CoerceToDouble("inf"), 0.0);
}

TEST(NumberFormatting, FixedDecimalsRoundHalfAwayFromZero) {
  EXPECT_EQ(NumberToString(2.5, 2), "2.50");
  EXPECT_EQ(NumberToString(2.675, 2), "2.68");
  EXPECT_EQ(NumberToString(0.125, 2), "0.13");
  EXPECT_EQ(NumberToString(-0.125, 2), "-0.13");
  EXPECT_EQ(NumberToString(2.5, 0), "3");
  EXPECT_EQ(NumberToString(-2.5, 0), "-3");
  EXPECT_EQ(NumberToString(9.995, 2), "10.00");
  EXPECT_EQ(NumberToString(999.96, 1), "1000.0");
  EXPECT_EQ(NumberToString(0.0005, 3), "0.001");
  EXPECT_EQ(NumberToString(0.0004, 2), "0.00");
  EXPECT_EQ(NumberToString(1.0 / 3.0, 4), "0.3333");
  EXPECT_EQ(NumberToString(1e20, 1), "100000000000000000000.0");
  EXPECT_EQ(NumberToString(123456789.0, 0), "123456789");
}

TEST(NumberFormatting, SignsAndSpecialValues) {
  EXPECT_EQ(NumberToString(-0.0, 1), "0.0");
  EXPECT_EQ(NumberToString(-0.001, 2), "0.00");
  EXPECT_EQ(NumberToString(0.0, 0), "0");
  EXPECT_EQ(NumberToString(std::numeric_limits<double>::quiet_NaN(), 2), "nan");
  EXPECT_EQ(NumberToString(-std::numeric_limits<double>::infinity(), 2), "-inf");
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
  EXPECT_EQ(Tokenize("1/250", "/"), (std::vector<UTF8String>{"1", "250"}));
  EXPECT_EQ(Tokenize("a//b/", "/"), (std::vector<UTF8String>{"a", "", "b", ""}));
  EXPECT_EQ(Tokenize("a, b;;c", ",; ", false), (std::vector<UTF8String>{"a", "b", "c"}));
  EXPECT_EQ(Tokenize("", "/"), (std::vector<UTF8String>{""}));
  EXPECT_TRUE(Tokenize("//", "/", false).empty());
  EXPECT_EQ(Tokenize("abc", ""), (std::vector<UTF8String>{"abc"}));
}

TEST(XMLReserved, EncodeDecodeRoundTrip) {
  const std::string text = "a<b>&\"c\" 'd' \xC3\xA9";
  const std::string encoded = EncodeXMLReserved(text);
  EXPECT_EQ(encoded, "a&lt;b&gt;&amp;&quot;c&quot; &apos;d&apos; \xC3\xA9");
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
