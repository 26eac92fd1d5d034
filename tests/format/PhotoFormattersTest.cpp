// Exposure times, f-numbers, APEX values and distances.
#include <string>

#include <gtest/gtest.h>

#include <ovracore/Localizer.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

std::string Exposure(const std::string& raw) { return FormatExifExposureTime(nullptr, Path(), raw); }
std::string ShutterSpeed(const std::string& raw) {
  return FormatExifShutterSpeedValue(nullptr, Path(), raw);
}
std::string FNumber(const std::string& raw) { return FormatExifFNumber(nullptr, Path(), raw); }
std::string Aperture(const std::string& raw) { return FormatExifApertureValue(nullptr, Path(), raw); }
std::string Distance(const std::string& raw) { return FormatExifDistance(nullptr, Path(), raw); }

TEST(ExposureTime, StandardSpeedsWithinTwoPercentSnap) {
  EXPECT_EQ("1/250 sec", Exposure("1/250"));
  EXPECT_EQ("1/250 sec", Exposure("1/247"));  // 1.2 % off
  EXPECT_EQ("1/8000 sec", Exposure("1/8000"));
  EXPECT_EQ("1/16000 sec", Exposure("1/16000"));
  EXPECT_EQ("1.5 sec", Exposure("15/10"));
  EXPECT_EQ("30.0 sec", Exposure("30/1"));
  EXPECT_EQ("0.3 sec", Exposure("3/10"));
  // The boundary between the two number forms: 1/4 is the last fraction.
  EXPECT_EQ("1/4 sec", Exposure("1/4"));
  EXPECT_EQ("0.4 sec", Exposure("4/10"));
}

TEST(ExposureTime, PowersOfTwoSnapInTheSecondPass) {
  // 1/256 and 1/1024 are more than 2 % from every standard speed.
  EXPECT_EQ("1/250 sec", Exposure("1/256"));
  EXPECT_EQ("1/1000 sec", Exposure("1/1024"));
  EXPECT_EQ("1/8000 sec", Exposure("1/8192"));
  // From 1/100 to 1/10 the correction is 16/15 instead of 1.024.
  EXPECT_EQ("1/60 sec", Exposure("1/64"));
  EXPECT_EQ("1/30 sec", Exposure("1/32"));
}

TEST(ExposureTime, UnmatchedTimesAreRoundedByRange) {
  EXPECT_EQ("40.0 sec", Exposure("40/1"));       // whole seconds from 10 s
  EXPECT_EQ("7.3 sec", Exposure("726/100"));     // tenths from 0.5 s
  EXPECT_EQ("0.3 sec", Exposure("35/100"));      // step 1 gives 1/3, shown as decimal
  EXPECT_EQ("1/14 sec", Exposure("7/100"));      // step 1
  EXPECT_EQ("1/85 sec", Exposure("12/1000"));    // step 0.2
  EXPECT_EQ("1/700 sec", Exposure("1/700"));     // step 0.1
  EXPECT_EQ("1/1100 sec", Exposure("1/1110"));   // step 0.02
  EXPECT_EQ("1/14100 sec", Exposure("1/14060"));  // step 0.01
  EXPECT_EQ("1/21000 sec", Exposure("1/20600"));  // step 0.001
}

TEST(ExposureTime, OverflowAndNonPositiveTimes) {
  EXPECT_EQ(">1024 sec", Exposure("2000/1"));
  EXPECT_EQ("1024.0 sec", Exposure("1024/1"));
  // No special case below zero: the reciprocal of the unsnapped 0 shows.
  EXPECT_EQ("1/inf sec", Exposure("0/1"));
  EXPECT_EQ("1/inf sec", Exposure("-1/30"));
  EXPECT_EQ("1/inf sec", Exposure("garbage"));
}

TEST(ExposureTime, UnitWordIsLocalised) {
  ovracore::AddDictionaryEntry("$$$/ovrametadata/format/unit/second", "@0 s");
  const std::string text = Exposure("1/250");
  ovracore::AddDictionaryEntry("$$$/ovrametadata/format/unit/second", "@0 sec");
  EXPECT_EQ("1/250 s", text);
}

TEST(ShutterSpeedValue, ApexTimeValueBecomesSeconds) {
  EXPECT_EQ("1/250 sec", ShutterSpeed("8/1"));      // 2^-8 = 1/256
  EXPECT_EQ("1/60 sec", ShutterSpeed("6/1"));       // 1/64
  EXPECT_EQ("1/125 sec", ShutterSpeed("6965784/1000000"));
  EXPECT_EQ("1.0 sec", ShutterSpeed("0/1"));
  EXPECT_EQ("2.0 sec", ShutterSpeed("-1/1"));
  EXPECT_EQ(">1024 sec", ShutterSpeed("-11/1"));
}

TEST(FNumber, OneDecimalBelowEightAndNoneFromEight) {
  EXPECT_EQ("2.8", FNumber("28/10"));
  EXPECT_EQ("1.0", FNumber("1/1"));
  EXPECT_EQ("7.9", FNumber("79/10"));
  EXPECT_EQ("8", FNumber("8/1"));
  EXPECT_EQ("11", FNumber("11/1"));
  EXPECT_EQ("23", FNumber("225/10"));
}

TEST(FNumber, BelowOneShowsTheOverflowMarker) {
  EXPECT_EQ(">1024", FNumber("1/2"));
  EXPECT_EQ(">1024", FNumber("0/1"));
  EXPECT_EQ(">1024", FNumber("f/2.8"));
}

TEST(ApertureValue, ApexApertureValueBecomesFNumber) {
  EXPECT_EQ("5.7", Aperture("5/1"));   // 2^2.5
  EXPECT_EQ("8", Aperture("6/1"));     // 2^3
  EXPECT_EQ("2.8", Aperture("3/1"));   // 2^1.5 = 2.83
  EXPECT_EQ("1.0", Aperture("0/1"));
  EXPECT_EQ(">1024", Aperture("-2/1"));
}

TEST(Distance, MarkersForUnknownAndInfinity) {
  EXPECT_EQ("Unknown", Distance("0/1"));
  EXPECT_EQ("Unknown", Distance("0/0"));
  EXPECT_EQ("\xE2\x88\x9E", Distance("4294967295/1"));
  EXPECT_EQ("\xE2\x88\x9E", Distance("-1/1"));
  // Only the low 32 bits of the numerator count for the markers.
  EXPECT_EQ("Unknown", Distance("4294967296/1000"));
}

TEST(Distance, MetresWithTwoDecimals) {
  EXPECT_EQ("1.23", Distance("1234/1000"));
  EXPECT_EQ("10.00", Distance("10/1"));
  EXPECT_EQ("", Distance("5/0"));
  EXPECT_EQ("", Distance("5"));
  EXPECT_EQ("", Distance(""));
}

}  // namespace
}  // namespace ovrametadata
