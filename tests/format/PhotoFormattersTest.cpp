// Exposure times, f-numbers, APEX values and distances.
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include <ovracore/Localizer.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

using Formatter = UTF8String (*)(XMPMetaRef, const Path&, const UTF8String&);

void ExpectFormats(Formatter format, const std::vector<std::pair<const char*, const char*>>& cases) {
  for (const auto& [raw, expected] : cases) EXPECT_EQ(format(nullptr, Path(), raw), expected) << "raw " << raw;
}

TEST(ExposureTime, SnapsToStandardSpeedsOrIsRoundedByRange) {
  ExpectFormats(FormatExifExposureTime, {{"1/250", "1/250 sec"}, {"1/247", "1/250 sec"}, {"1/8000", "1/8000 sec"},
                                         {"1/16000", "1/16000 sec"}, {"15/10", "1.5 sec"}, {"30/1", "30.0 sec"},
                                         {"3/10", "0.3 sec"},
                                         // 1/4 is the last speed shown as a fraction.
                                         {"1/4", "1/4 sec"}, {"4/10", "0.4 sec"},
                                         // Powers of two snap in the second pass: more than 2 % from every
                                         // standard speed; from 1/100 to 1/10 the correction is 16/15.
                                         {"1/256", "1/250 sec"}, {"1/1024", "1/1000 sec"}, {"1/8192", "1/8000 sec"},
                                         {"1/64", "1/60 sec"}, {"1/32", "1/30 sec"},
                                         // Unmatched times are rounded by range.
                                         {"40/1", "40.0 sec"},        // whole seconds from 10 s
                                         {"726/100", "7.3 sec"},      // tenths from 0.5 s
                                         {"35/100", "0.3 sec"},       // step 1 gives 1/3, shown as decimal
                                         {"7/100", "1/14 sec"},       // step 1
                                         {"12/1000", "1/85 sec"},     // step 0.2
                                         {"1/700", "1/700 sec"},      // step 0.1
                                         {"1/1110", "1/1100 sec"},    // step 0.02
                                         {"1/14060", "1/14100 sec"},  // step 0.01
                                         {"1/20600", "1/21000 sec"},  // step 0.001
                                         {"2000/1", ">1024 sec"}, {"1024/1", "1024.0 sec"},
                                         // No special case below zero: the reciprocal of the unsnapped 0.
                                         {"0/1", "1/inf sec"}, {"-1/30", "1/inf sec"}, {"garbage", "1/inf sec"}});
}

TEST(ExposureTime, UnitWordIsLocalised) {
  ovracore::AddDictionaryEntry("$$$/ovrametadata/format/unit/second", "@0 s");
  const std::string text = FormatExifExposureTime(nullptr, Path(), "1/250");
  ovracore::AddDictionaryEntry("$$$/ovrametadata/format/unit/second", "@0 sec");
  EXPECT_EQ("1/250 s", text);
}

TEST(ShutterSpeedValue, ApexTimeValueBecomesSeconds) {
  ExpectFormats(FormatExifShutterSpeedValue, {{"8/1", "1/250 sec"}, {"6/1", "1/60 sec"},
                                              {"6965784/1000000", "1/125 sec"}, {"0/1", "1.0 sec"},
                                              {"-1/1", "2.0 sec"}, {"-11/1", ">1024 sec"}});
}

TEST(FNumber, OneDecimalBelowEightNoneFromEightAndOverflowBelowOne) {
  ExpectFormats(FormatExifFNumber, {{"28/10", "2.8"}, {"1/1", "1.0"}, {"79/10", "7.9"}, {"8/1", "8"}, {"11/1", "11"},
                                    {"225/10", "23"}, {"1/2", ">1024"}, {"0/1", ">1024"}, {"f/2.8", ">1024"}});
}

TEST(ApertureValue, ApexApertureValueBecomesFNumber) {
  ExpectFormats(FormatExifApertureValue,
                {{"5/1", "5.7"}, {"6/1", "8"}, {"3/1", "2.8"}, {"0/1", "1.0"}, {"-2/1", ">1024"}});
}

TEST(Distance, MetresWithTwoDecimalsAndMarkersForUnknownAndInfinity) {
  ExpectFormats(FormatExifDistance, {{"0/1", "Unknown"}, {"0/0", "Unknown"}, {"4294967295/1", "\xE2\x88\x9E"},
                                     {"-1/1", "\xE2\x88\x9E"},
                                     // Only the low 32 bits of the numerator count for the markers.
                                     {"4294967296/1000", "Unknown"}, {"1234/1000", "1.23"}, {"10/1", "10.00"},
                                     {"5/0", ""}, {"5", ""}, {"", ""}});
}

}  // namespace
}  // namespace ovrametadata
