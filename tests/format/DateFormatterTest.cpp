// XMP dates shown in the application language and the local time zone.
#include <cstdlib>
#include <ctime>
#include <string>

#include <gtest/gtest.h>
#include <unicode/timezone.h>
#include <unicode/unistr.h>

#include <ovracore/Localizer.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

// ICU 72 puts a narrow no-break space before the day period.
const std::string kNNBSP = "\xE2\x80\xAF";

// Pins the application language and the local time zone (for the C library
// and for ICU, which caches its default zone) for one test.
class PinnedLocaleAndZone {
 public:
  PinnedLocaleAndZone(const char* language, const char* zone)
      : mLanguage(ovracore::ApplicationLanguage()) {
    const char* previous = std::getenv("TZ");
    mHadZone = previous != nullptr;
    if (previous) mZone = previous;
    ovracore::SetApplicationLanguage(language);
    Apply(zone);
  }
  ~PinnedLocaleAndZone() {
    ovracore::SetApplicationLanguage(mLanguage);
    if (mHadZone) {
      Apply(mZone.c_str());
    } else {
      unsetenv("TZ");
      tzset();
      icu::TimeZone::adoptDefault(icu::TimeZone::detectHostTimeZone());
    }
  }
  PinnedLocaleAndZone(const PinnedLocaleAndZone&) = delete;
  PinnedLocaleAndZone& operator=(const PinnedLocaleAndZone&) = delete;

 private:
  static void Apply(const char* zone) {
    setenv("TZ", zone, 1);
    tzset();
    icu::TimeZone::adoptDefault(icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(zone)));
  }

  std::string mLanguage;
  bool mHadZone = false;
  std::string mZone;
};

TEST(FormatDate, DateTimeWithZoneIsShownInLocalTime) {
  PinnedLocaleAndZone pin("en_US", "UTC");
  EXPECT_EQ("Jan 5, 2024, 3:04:05" + kNNBSP + "PM", FormatDate("2024-01-05T15:04:05Z"));
  // A five-hour negative offset is moved to UTC first.
  EXPECT_EQ("Jan 5, 2024, 8:04:05" + kNNBSP + "PM", FormatDate("2024-01-05T15:04:05-05:00"));
  // Crossing midnight changes the day.
  EXPECT_EQ("Jan 6, 2024, 1:30:00" + kNNBSP + "AM", FormatDate("2024-01-05T23:30:00-02:00"));
}

TEST(FormatDate, LocalZoneAppliesToTheUTCInstant) {
  PinnedLocaleAndZone pin("en_US", "America/New_York");
  EXPECT_EQ("Jan 5, 2024, 10:04:05" + kNNBSP + "AM", FormatDate("2024-01-05T15:04:05Z"));
  // Summer time.
  EXPECT_EQ("Jul 1, 2024, 8:00:00" + kNNBSP + "AM", FormatDate("2024-07-01T12:00:00+00:00"));
  EXPECT_EQ("Jul 1, 2024, 4:00:00" + kNNBSP + "AM", FormatDate("2024-07-01T12:00:00+04:00"));
}

TEST(FormatDate, ZeroOffsetCountsAsUTCWhateverItsSign) {
  PinnedLocaleAndZone pin("en_US", "UTC");
  EXPECT_EQ("Jan 5, 2024, 3:04:05" + kNNBSP + "PM", FormatDate("2024-01-05T15:04:05-00:00"));
  EXPECT_EQ("Jan 5, 2024, 3:04:05" + kNNBSP + "PM", FormatDate("2024-01-05T15:04:05+00:00"));
}

TEST(FormatDate, DateTimeWithoutZoneCountsAsUTC) {
  PinnedLocaleAndZone pin("en_US", "Asia/Tokyo");
  EXPECT_EQ("Jan 6, 2024, 12:04:05" + kNNBSP + "AM", FormatDate("2024-01-05T15:04:05"));
}

TEST(FormatDate, DateAloneUsesTheDateStyleAndKeepsTheDay) {
  PinnedLocaleAndZone pin("en_US", "America/Los_Angeles");
  EXPECT_EQ("Jan 5, 2024", FormatDate("2024-01-05"));
  EXPECT_EQ("Dec 31, 1999", FormatDate("1999-12-31"));
}

TEST(FormatDate, TimeAloneUsesTheTimeStyle) {
  PinnedLocaleAndZone pin("en_US", "UTC");
  EXPECT_EQ("3:04:05" + kNNBSP + "PM", FormatDate("T15:04:05Z"));
}

TEST(FormatDate, FollowsTheApplicationLanguage) {
  PinnedLocaleAndZone pin("de_DE", "Europe/Berlin");
  EXPECT_EQ("05.01.2024, 16:04:05", FormatDate("2024-01-05T15:04:05Z"));
  EXPECT_EQ("05.01.2024", FormatDate("2024-01-05"));
}

TEST(FormatDate, RefusesUnreadableOrInvalidValues) {
  PinnedLocaleAndZone pin("en_US", "UTC");
  EXPECT_EQ("", FormatDate(""));
  EXPECT_EQ("", FormatDate("yesterday"));
  EXPECT_EQ("", FormatDate("2024-13-01"));
  EXPECT_EQ("", FormatDate("2024-01-32"));
  EXPECT_EQ("", FormatDate("2024-01-05T24:00:00Z"));
  EXPECT_EQ("", FormatDate("2024-01-05T12:60:00Z"));
  EXPECT_EQ("", FormatDate("2024-01-05T12:00:60Z"));
  // A year or a month alone names no day.
  EXPECT_EQ("", FormatDate("2024"));
  EXPECT_EQ("", FormatDate("2024-01"));
}

}  // namespace
}  // namespace ovrametadata
