// Text forms of values and date arithmetic.
#include <string>
#include <utility>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;

namespace {

std::string RoundTrip(const std::string& text) {
  XMP_DateTime date;
  date = XMPUtils::ConvertToDate(text);
  std::string back;
  back = XMPUtils::ConvertFromDate(date);
  return back;
}

}  // namespace

TEST(XMPConversions, EveryIsoFormXmpAllowsRoundTrips) {
  for (const char* text : {"2024", "2024-03", "2024-03-05", "2024-03-05T07:08", "2024-03-05T07:08:09",
                           "2024-03-05T07:08:09.5", "2024-03-05T07:08:09.123456789", "2024-03-05T07:08Z",
                           "2024-03-05T07:08:09+02:00", "2024-03-05T07:08:09.25-05:30", "0850-01-01",
                           "T07:08:09Z"}) {
    EXPECT_EQ(RoundTrip(text), text);
  }
  EXPECT_EQ(RoundTrip(" 2024-03-05T07:08:09+0200 "), "2024-03-05T07:08:09+02:00");
  EXPECT_EQ(RoundTrip("2024-03-05T07:08:09+00:00"), "2024-03-05T07:08:09Z");
  EXPECT_EQ(RoundTrip("2024-03-05T07:08:00"), "2024-03-05T07:08");
  EXPECT_EQ(RoundTrip("07:08"), "T07:08");
}

TEST(XMPConversions, DateFieldsAndFlags) {
  XMP_DateTime d;
  d = XMPUtils::ConvertToDate("2024-03");
  EXPECT_TRUE(d.hasDate);
  EXPECT_FALSE(d.hasTime);
  EXPECT_EQ(d.year, 2024);
  EXPECT_EQ(d.month, 3);
  EXPECT_EQ(d.day, 0);
  d = XMPUtils::ConvertToDate("2024-03-05T23:59:58.000000001-08:30");
  EXPECT_TRUE(d.hasTime);
  EXPECT_TRUE(d.hasTimeZone);
  EXPECT_EQ(d.tzSign, -1);
  EXPECT_EQ(d.tzHour, 8);
  EXPECT_EQ(d.tzMinute, 30);
  EXPECT_EQ(d.nanoSecond, 1);
  d = XMPUtils::ConvertToDate("2024-03-05T10:00");
  EXPECT_FALSE(d.hasTimeZone);
}

TEST(XMPConversions, MalformedDatesRaiseBadValue) {
  for (const char* text : {"", "hello", "2024-13", "2024-00-10", "2024-02-32", "2024-03-05T25:00",
                           "2024-03-05T10:61", "2024-03-05T10:00:60", "2024-03-05 10:00", "2024-03-05T10",
                           "2024-03-05T10:00+25:00", "2024-03-05T10:00Zjunk", "2024/03/05", "2024-3-5",
                           "2024-03-05T10:00:00."}) {
    XMP_DateTime d;
    EXPECT_EQ(xmptest::ErrorIdOf([&] { d = XMPUtils::ConvertToDate(text); }), kXMPErr_BadValue) << text;
  }
}

TEST(XMPConversions, UtcConversionCarriesAcrossDaysMonthsAndYears) {
  const std::pair<const char*, const char*> cases[] = {{"2024-01-01T01:30:00+02:00", "2023-12-31T23:30Z"},
                                                       {"2024-02-28T22:00:00-05:00", "2024-02-29T03:00Z"},  // leap year
                                                       {"2024-03-05", "2024-03-05"}};  // no time: unchanged
  for (const auto& [local, utc] : cases) {
    XMP_DateTime d;
    d = XMPUtils::ConvertToDate(local);
    d = XMPUtils::ConvertToUTCTime(d);
    std::string text;
    text = XMPUtils::ConvertFromDate(d);
    EXPECT_EQ(text, utc) << local;
  }
}

TEST(XMPConversions, LocalTimeAndNowCarryAZone) {
  XMP_DateTime d;
  d = XMPUtils::ConvertToDate("2024-06-15T12:00:00Z");
  XMP_DateTime local = d;
  local = XMPUtils::ConvertToLocalTime(local);
  EXPECT_TRUE(local.hasTimeZone);
  local = XMPUtils::ConvertToUTCTime(local);
  std::string text;
  text = XMPUtils::ConvertFromDate(local);
  EXPECT_EQ(text, "2024-06-15T12:00Z");
  XMP_DateTime now;
  now = XMPUtils::CurrentDateTime();
  EXPECT_TRUE(now.hasDate && now.hasTime && now.hasTimeZone);
}

TEST(XMPConversions, NumbersAndBooleans) {
  EXPECT_EQ(XMPUtils::ConvertToInt64(" -9223372036854775808 "), INT64_MIN);
  EXPECT_EQ(XMPUtils::ConvertToInt64("+17"), 17);
  EXPECT_EQ(XMPUtils::ConvertToInt64("0x1F"), 31);
  EXPECT_EQ(XMPUtils::ConvertToInt("-2147483648"), INT32_MIN);
  EXPECT_DOUBLE_EQ(XMPUtils::ConvertToFloat(" 1.5e3 "), 1500.0);
  EXPECT_DOUBLE_EQ(XMPUtils::ConvertToFloat("-0.25"), -0.25);
  for (const char* text : {"True", " t", "1"}) EXPECT_TRUE(XMPUtils::ConvertToBool(text)) << text;
  for (const char* text : {"FALSE", "0"}) EXPECT_FALSE(XMPUtils::ConvertToBool(text)) << text;
  std::string text;
  text = XMPUtils::ConvertFromInt64(INT64_MIN);
  EXPECT_EQ(text, "-9223372036854775808");
  text = XMPUtils::ConvertFromBool(false);
  EXPECT_EQ(text, "False");
  text = XMPUtils::ConvertFromFloat(1.0 / 3, "");
  EXPECT_EQ(text, "0.333333");
  text = XMPUtils::ConvertFromFloat(1.0 / 3, "%.3g");
  EXPECT_EQ(text, "0.333");
  for (const char* text : {"9223372036854775808", "12abc", ""})
    EXPECT_EQ(xmptest::ErrorIdOf([&] { XMPUtils::ConvertToInt64(text); }), kXMPErr_BadValue) << text;
  for (const char* text : {"1.5x", "--1"})
    EXPECT_EQ(xmptest::ErrorIdOf([&] { XMPUtils::ConvertToFloat(text); }), kXMPErr_BadValue) << text;
  EXPECT_EQ(xmptest::ErrorIdOf([] { XMPUtils::ConvertToInt("2147483648"); }), kXMPErr_BadValue);
  EXPECT_EQ(xmptest::ErrorIdOf([] { XMPUtils::ConvertToBool("yes"); }), kXMPErr_BadValue);
}
