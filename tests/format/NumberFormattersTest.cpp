// Rational texts and GPS coordinates.
#include <gtest/gtest.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

const std::string kDegree = "\xC2\xB0";

TEST(RationalText, SplitsNumeratorAndDenominatorAtTheSlash) {
  double numerator = -1;
  double denominator = -1;
  ASSERT_TRUE(CalculateFractionFromRational("28/10", numerator, denominator));
  EXPECT_DOUBLE_EQ(28.0, numerator);
  EXPECT_DOUBLE_EQ(10.0, denominator);
  // Only the first two parts count.
  ASSERT_TRUE(CalculateFractionFromRational("3/4/5", numerator, denominator));
  EXPECT_DOUBLE_EQ(3.0, numerator);
  EXPECT_DOUBLE_EQ(4.0, denominator);
}

TEST(RationalText, RefusesPlainNumbersAndEmptyParts) {
  double numerator = 0;
  double denominator = 0;
  EXPECT_FALSE(CalculateFractionFromRational("5", numerator, denominator));
  EXPECT_FALSE(CalculateFractionFromRational("", numerator, denominator));
  EXPECT_FALSE(CalculateFractionFromRational("/4", numerator, denominator));
  EXPECT_FALSE(CalculateFractionFromRational("4/", numerator, denominator));
}

TEST(RationalText, FractionValueTreatsZeroDenominatorAsOneAndFailureAsZero) {
  EXPECT_DOUBLE_EQ(2.8, GetFractionValue("28/10"));
  EXPECT_DOUBLE_EQ(7.0, GetFractionValue("7/0"));
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("7"));
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("abc"));
  // Unreadable parts coerce to 0 rather than failing the split.
  EXPECT_DOUBLE_EQ(0.0, GetFractionValue("x/3"));
}

TEST(FormatRational, GivesTheQuotientWithTheRequestedDecimals) {
  EXPECT_EQ("0.33", FormatRational("1/3", 2));
  EXPECT_EQ("0.667", FormatRational("2/3", 3));
  EXPECT_EQ("3", FormatRational("30/10", 0));
  EXPECT_EQ("-1.50", FormatRational("-3/2", 2));
  EXPECT_EQ("2.50", FormatRational("5/2", 2));
}

TEST(FormatRational, IsEmptyForUnreadableInputOrZeroDenominator) {
  EXPECT_EQ("", FormatRational("5", 2));
  EXPECT_EQ("", FormatRational("1/0", 2));
  EXPECT_EQ("", FormatRational("", 2));
  EXPECT_EQ("", FormatRational("/", 2));
}

TEST(FormatRational, SurvivesAbsurdDecimalCounts) {
  const UTF8String text = FormatRational("1/4", static_cast<unsigned long>(-1));
  ASSERT_GT(text.size(), 4u);
  EXPECT_EQ("0.25", text.substr(0, 4));
}

TEST(FormatGPSCoordinate, DegreesAndDecimalMinutesShowSecondsWithTwoDecimals) {
  EXPECT_EQ("37" + kDegree + " 46' 30.00\" N", FormatGPSCoordinate("37,46.5N"));
  EXPECT_EQ("12" + kDegree + " 30' E", FormatGPSCoordinate("12,30E"));
}

TEST(FormatGPSCoordinate, DegreesMinutesSecondsShowWholeSeconds) {
  EXPECT_EQ("122" + kDegree + " 25' 10\" W", FormatGPSCoordinate("122,25,10W"));
  EXPECT_EQ("122" + kDegree + " 25' 11\" W", FormatGPSCoordinate("122,25,10.6W"));
  // Minutes are written when only the seconds are non-zero.
  EXPECT_EQ("5" + kDegree + " 0' 7\" N", FormatGPSCoordinate("5,0,7N"));
}

TEST(FormatGPSCoordinate, ZeroParts) {
  EXPECT_EQ("0" + kDegree, FormatGPSCoordinate("0,0,0N"));
  EXPECT_EQ("10" + kDegree + " S", FormatGPSCoordinate("10,0,0S"));
  EXPECT_EQ("10" + kDegree + " S", FormatGPSCoordinate("10S"));
}

TEST(FormatGPSCoordinate, DegreesAndMinutesAreEightBitValues) {
  EXPECT_EQ("255" + kDegree + " N", FormatGPSCoordinate("300,0N"));
  EXPECT_EQ("1" + kDegree + " 255' W", FormatGPSCoordinate("1,999,0W"));
  EXPECT_EQ("0" + kDegree, FormatGPSCoordinate("-4,0,0S"));
}

TEST(FormatGPSCoordinate, UnexpectedShapes) {
  EXPECT_EQ("", FormatGPSCoordinate(""));
  EXPECT_EQ("0" + kDegree, FormatGPSCoordinate("N"));
  EXPECT_EQ("0" + kDegree, FormatGPSCoordinate("1,2,3,4N"));
  EXPECT_EQ("0" + kDegree, FormatGPSCoordinate("north"));
  // The direction letter is not checked.
  EXPECT_EQ("8" + kDegree + " x", FormatGPSCoordinate("8x"));
}

}  // namespace
}  // namespace ovrametadata
