// XMP dates shown in the application language and the local time zone.
#include <ctime>
#include <string>

#include <gtest/gtest.h>
#include <unicode/timezone.h>
#include <unicode/unistr.h>

#include <ovracore/Localizer.h>

#include "TestSupport.h"
#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

// ICU 72 puts a narrow no-break space before the day period.
const std::string kNNBSP = "\xE2\x80\xAF";

// Pins the application language and the local time zone (for the C library
// and for ICU, which caches its default zone) for one test.
class PinnedLocaleAndZone {
 public:
  PinnedLocaleAndZone(const char* language, const char* zone) : mZone("TZ", zone) {
    ovracore::SetApplicationLanguage(language);
    tzset();
    icu::TimeZone::adoptDefault(icu::TimeZone::createTimeZone(icu::UnicodeString::fromUTF8(zone)));
  }
  ~PinnedLocaleAndZone() { ovracore::SetApplicationLanguage(mLanguage); }
  PinnedLocaleAndZone(const PinnedLocaleAndZone&) = delete;
  PinnedLocaleAndZone& operator=(const PinnedLocaleAndZone&) = delete;

 private:
  // Destroyed after mZone has restored TZ: both libraries follow it again.
  struct FollowRestoredZone {
    ~FollowRestoredZone() {
      tzset();
      icu::TimeZone::adoptDefault(icu::TimeZone::detectHostTimeZone());
    }
  };
  std::string mLanguage = ovracore::ApplicationLanguage();
  FollowRestoredZone mFollow;
  ovratest::ScopedEnv mZone;
};

TEST(FormatDate, ShownInTheApplicationLanguageAndLocalZone) {
  const std::string pm = kNNBSP + "PM";
  const std::string am = kNNBSP + "AM";
  const struct {
    const char* language;
    const char* zone;
    const char* value;
    std::string expected;
  } cases[] = {
      {"en_US", "UTC", "2024-01-05T15:04:05Z", "Jan 5, 2024, 3:04:05" + pm},
      // An offset is moved to UTC first, possibly across midnight.
      {"en_US", "UTC", "2024-01-05T15:04:05-05:00", "Jan 5, 2024, 8:04:05" + pm},
      {"en_US", "UTC", "2024-01-05T23:30:00-02:00", "Jan 6, 2024, 1:30:00" + am},
      // A zero offset counts as UTC whatever its sign.
      {"en_US", "UTC", "2024-01-05T15:04:05-00:00", "Jan 5, 2024, 3:04:05" + pm},
      {"en_US", "UTC", "2024-01-05T15:04:05+00:00", "Jan 5, 2024, 3:04:05" + pm},
      // The local zone applies to the UTC instant, with summer time.
      {"en_US", "America/New_York", "2024-01-05T15:04:05Z", "Jan 5, 2024, 10:04:05" + am},
      {"en_US", "America/New_York", "2024-07-01T12:00:00+00:00", "Jul 1, 2024, 8:00:00" + am},
      {"en_US", "America/New_York", "2024-07-01T12:00:00+04:00", "Jul 1, 2024, 4:00:00" + am},
      // A date-time without zone counts as UTC.
      {"en_US", "Asia/Tokyo", "2024-01-05T15:04:05", "Jan 6, 2024, 12:04:05" + am},
      // A date alone uses the date style and keeps its day; a time alone the time style.
      {"en_US", "America/Los_Angeles", "2024-01-05", "Jan 5, 2024"},
      {"en_US", "America/Los_Angeles", "1999-12-31", "Dec 31, 1999"},
      {"en_US", "UTC", "T15:04:05Z", "3:04:05" + pm},
      {"de_DE", "Europe/Berlin", "2024-01-05T15:04:05Z", "05.01.2024, 16:04:05"},
      {"de_DE", "Europe/Berlin", "2024-01-05", "05.01.2024"},
  };
  for (const auto& c : cases) {
    PinnedLocaleAndZone pin(c.language, c.zone);
    EXPECT_EQ(FormatDate(c.value), c.expected) << c.language << " " << c.zone << " " << c.value;
  }
}

TEST(FormatDate, RefusesUnreadableOrInvalidValues) {
  PinnedLocaleAndZone pin("en_US", "UTC");
  // A year or a month alone names no day.
  for (const char* value : {"", "yesterday", "2024-13-01", "2024-01-32", "2024-01-05T24:00:00Z",
                            "2024-01-05T12:60:00Z", "2024-01-05T12:00:60Z", "2024", "2024-01"})
    EXPECT_EQ(FormatDate(value), "") << value;
}

}  // namespace
}  // namespace ovrametadata
