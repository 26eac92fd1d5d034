// XMP dates as display text in the application's language and the local
// time zone.
#include "format/FormatInternal.h"

#include <map>
#include <memory>
#include <tuple>
#include <utility>

#include <unicode/datefmt.h>
#include <unicode/gregocal.h>
#include <unicode/locid.h>
#include <unicode/timezone.h>
#include <unicode/unistr.h>

#include <ovracore/Localizer.h>
#include <ovraxmp/XMPUtils.h>

namespace ovrametadata {

namespace {

using ovraxmp::XMP_DateTime;

bool IsValidDateTime(const XMP_DateTime& dt) {
  if (!dt.hasDate && !dt.hasTime) return false;
  if (dt.hasDate) {
    if (dt.year < 0 || dt.month < 1 || dt.month > 12 || dt.day < 1 || dt.day > 31) return false;
  }
  if (dt.hasTime) {
    if (dt.hour < 0 || dt.hour > 23 || dt.minute < 0 || dt.minute > 59 || dt.second < 0 ||
        dt.second >= 60)
      return false;
    const bool zeroOffset = dt.tzHour == 0 && dt.tzMinute == 0;
    if (zeroOffset != (dt.tzSign == ovraxmp::kXMP_TimeIsUTC)) return false;
  }
  return true;
}

// The instant of a UTC date-time record, in ICU's milliseconds.
bool ComposeUTCInstant(const XMP_DateTime& dt, UDate& instant) {
  // Building a calendar costs far more than using one; each thread keeps its
  // own because ICU calendars are not thread-safe.
  thread_local std::unique_ptr<icu::GregorianCalendar> calendar;
  UErrorCode status = U_ZERO_ERROR;
  if (!calendar) {
    calendar = std::make_unique<icu::GregorianCalendar>(*icu::TimeZone::getGMT(),
                                                         icu::Locale::getRoot(), status);
    if (U_FAILURE(status)) {
      calendar.reset();
      return false;
    }
  }
  calendar->clear();
  if (dt.hasDate) {
    calendar->set(dt.year, dt.month - 1, dt.day, dt.hour, dt.minute, dt.second);
  } else {
    // A time alone still needs a day to be an instant. Day 0 of year 0 would
    // pick up the zone's historic local mean time, so a modern day is used.
    calendar->set(1970, UCAL_JANUARY, 1, dt.hour, dt.minute, dt.second);
  }
  instant = calendar->getTime(status);
  return U_SUCCESS(status);
}

// A medium-style formatter for the language, kept per thread and style; the
// caller sets its time zone before each use.
icu::DateFormat* MediumFormatter(const UTF8String& language, bool withDate, bool withTime) {
  using Key = std::tuple<UTF8String, bool, bool>;
  thread_local std::map<Key, std::unique_ptr<icu::DateFormat>> formatters;
  Key key(language, withDate, withTime);
  const auto found = formatters.find(key);
  if (found != formatters.end()) return found->second.get();

  const icu::Locale locale(language.c_str());
  if (locale.isBogus()) return nullptr;
  std::unique_ptr<icu::DateFormat> formatter(icu::DateFormat::createDateTimeInstance(
      withDate ? icu::DateFormat::kMedium : icu::DateFormat::kNone,
      withTime ? icu::DateFormat::kMedium : icu::DateFormat::kNone, locale));
  if (!formatter) return nullptr;
  return formatters.emplace(std::move(key), std::move(formatter)).first->second.get();
}

}  // namespace

UTF8String FormatDate(const UTF8String& value) {
  XMP_DateTime dt;
  try {
    dt = ovraxmp::XMPUtils::ConvertToDate(value);
  } catch (...) {
    // Unreadable dates are shown raw by the caller.
    return UTF8String();
  }
  if (dt.tzHour == 0 && dt.tzMinute == 0) dt.tzSign = ovraxmp::kXMP_TimeIsUTC;
  if (!IsValidDateTime(dt)) return UTF8String();
  try {
    dt = ovraxmp::XMPUtils::ConvertToUTCTime(dt);
  } catch (...) {
    return UTF8String();
  }

  UDate instant = 0;
  if (!ComposeUTCInstant(dt, instant)) return UTF8String();

  icu::DateFormat* formatter =
      MediumFormatter(ovracore::ApplicationLanguage(), dt.hasDate, dt.hasTime);
  if (!formatter) return UTF8String();
  // A date without a time names a calendar day, not an instant: shifting it
  // into the local zone would show the day before west of UTC.
  if (dt.hasTime)
    formatter->adoptTimeZone(icu::TimeZone::createDefault());
  else
    formatter->setTimeZone(*icu::TimeZone::getGMT());

  icu::UnicodeString text;
  formatter->format(instant, text);
  UTF8String result;
  text.toUTF8String(result);
  return result;
}

}  // namespace ovrametadata
