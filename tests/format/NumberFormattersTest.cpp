// Rational texts and GPS coordinates.
#include <gtest/gtest.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

const std::string kDegree = "\xC2\xB0";

TEST(RationalText, SplitsAtTheSlashAndRefusesPlainNumbersAndEmptyParts) {
  const struct {
    const char* raw;
    bool ok;
    double numerator, denominator;
  } cases[] = {{"28/10", true, 28, 10},
               {"3/4/5", true, 3, 4},  // only the first two parts count
               {"5", false, 0, 0},     {"", false, 0, 0}, {"/4", false, 0, 0}, {"4/", false, 0, 0}};
  for (const auto& c : cases) {
    double numerator = 0;
    double denominator = 0;
    ASSERT_EQ(CalculateFractionFromRational(c.raw, numerator, denominator), c.ok) << c.raw;
    if (c.ok) {
      EXPECT_DOUBLE_EQ(numerator, c.numerator) << c.raw;
      EXPECT_DOUBLE_EQ(denominator, c.denominator) << c.raw;
    }
  }
}

TEST(RationalText, FractionValueTreatsZeroDenominatorAsOneAndFailureAsZero) {
  EXPECT_DOUBLE_EQ(2.8, GetFractionValue("28/10"));
  EXPECT_DOUBLE_EQ(7.0, GetFractionValue("7/0"));
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("7"));
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("abc"));
  // Unreadable parts coerce to 0 rather than failing the split.
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("x/3"));
}

TEST(FormatRational, GivesTheQuotientOrNothingForUnreadableInputOrZeroDenominator) {
  const struct {
    const char* raw;
    unsigned long decimals;
    const char* expected;
  } cases[] = {{"1/3", 2, "0.33"}, {"2/3", 3, "0.667"}, {"30/10", 0, "3"}, {"-3/2", 2, "-1.50"}, {"5/2", 2, "2.50"},
               {"5", 2, ""},       {"1/0", 2, ""},      {"", 2, ""},       {"/", 2, ""}};
  for (const auto& c : cases) EXPECT_EQ(FormatRational(c.raw, c.decimals), c.expected) << c.raw;
  // An absurd decimal count does not bring the process down.
  const UTF8String text = FormatRational("1/4", static_cast<unsigned long>(-1));
  ASSERT_GT(text.size(), 4u);
  EXPECT_EQ("0.25", text.substr(0, 4));
}

TEST(FormatGPSCoordinate, EveryStoredShape) {
  const std::pair<const char*, std::string> cases[] = {
      // Degrees and decimal minutes show seconds with two decimals.
      {"37,46.5N", "37" + kDegree + " 46' 30.00\" N"},
      {"12,30E", "12" + kDegree + " 30' E"},
      // Degrees, minutes and seconds show whole seconds; minutes are
      // written when only the seconds are non-zero.
      {"122,25,10W", "122" + kDegree + " 25' 10\" W"},
      {"122,25,10.6W", "122" + kDegree + " 25' 11\" W"},
      {"5,0,7N", "5" + kDegree + " 0' 7\" N"},
      {"0,0,0N", "0" + kDegree},
      {"10,0,0S", "10" + kDegree + " S"},
      {"10S", "10" + kDegree + " S"},
      // Degrees and minutes are eight-bit values.
      {"300,0N", "255" + kDegree + " N"},
      {"1,999,0W", "1" + kDegree + " 255' W"},
      {"-4,0,0S", "0" + kDegree},
      // Unexpected shapes; the direction letter is not checked.
      {"", ""},
      {"N", "0" + kDegree},
      {"1,2,3,4N", "0" + kDegree},
      {"north", "0" + kDegree},
      {"8x", "8" + kDegree + " x"},
  };
  for (const auto& [raw, expected] : cases) EXPECT_EQ(FormatGPSCoordinate(raw), expected) << raw;
}

}  // namespace
}  // namespace ovrametadata
