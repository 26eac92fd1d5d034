// Text forms of the XMP value types: bool, integers, reals and ISO 8601
// dates, plus time-zone arithmetic.
#include <charconv>
#include <cstdio>
#include <ctime>
#include <limits>
#include <string>
#include <tuple>

#include <ovraxmp/XMPUtils.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace {

bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

std::string Trimmed(const std::string& text) {
  std::size_t begin = 0, end = text.size();
  while (begin < end && IsBlank(text[begin])) ++begin;
  while (end > begin && IsBlank(text[end - 1])) --end;
  return text.substr(begin, end - begin);
}

[[noreturn]] void BadValue(const std::string& kind, const std::string& text) {
  detail::Throw(kXMPErr_BadValue, "\"" + text + "\" is not a valid " + kind);
}

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

// Days since 1970-01-01 of a proleptic Gregorian date, and back.
std::int64_t DaysFromCivil(std::int64_t y, unsigned m, unsigned d) {
  y -= m <= 2;
  const std::int64_t era = (y >= 0 ? y : y - 399) / 400;
  const unsigned yoe = static_cast<unsigned>(y - era * 400);
  const unsigned doy = (153 * (m + (m > 2 ? -3 : 9)) + 2) / 5 + d - 1;
  const unsigned doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
  return era * 146097 + static_cast<std::int64_t>(doe) - 719468;
}

void CivilFromDays(std::int64_t z, std::int32_t* y, std::int32_t* m, std::int32_t* d) {
  z += 719468;
  const std::int64_t era = (z >= 0 ? z : z - 146096) / 146097;
  const unsigned doe = static_cast<unsigned>(z - era * 146097);
  const unsigned yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
  const unsigned doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
  const unsigned mp = (5 * doy + 2) / 153;
  const unsigned dd = doy - (153 * mp + 2) / 5 + 1;
  const unsigned mm = mp < 10 ? mp + 3 : mp - 9;
  *y = static_cast<std::int32_t>(static_cast<std::int64_t>(yoe) + era * 400 + (mm <= 2));
  *m = static_cast<std::int32_t>(mm);
  *d = static_cast<std::int32_t>(dd);
}

// Seconds since the epoch of the record's wall-clock fields (zone ignored).
std::int64_t WallSeconds(const XMP_DateTime& t) {
  const std::int64_t days =
      t.hasDate ? DaysFromCivil(t.year, t.month > 0 ? t.month : 1, t.day > 0 ? t.day : 1) : 0;
  return days * 86400 + t.hour * 3600 + t.minute * 60 + t.second;
}

void SetWallSeconds(std::int64_t seconds, XMP_DateTime* t) {
  std::int64_t days = seconds / 86400;
  std::int64_t rest = seconds % 86400;
  if (rest < 0) {
    rest += 86400;
    --days;
  }
  if (t->hasDate) CivilFromDays(days, &t->year, &t->month, &t->day);
  t->hour = static_cast<std::int32_t>(rest / 3600);
  t->minute = static_cast<std::int32_t>(rest / 60 % 60);
  t->second = static_cast<std::int32_t>(rest % 60);
}

// Reads exactly count digits at pos.
bool Digits(const std::string& s, std::size_t& pos, int count, std::int32_t* out) {
  if (pos + count > s.size()) return false;
  std::int32_t value = 0;
  for (int i = 0; i < count; ++i) {
    if (!IsDigit(s[pos + i])) return false;
    value = value * 10 + (s[pos + i] - '0');
  }
  pos += count;
  *out = value;
  return true;
}

bool ParseTime(const std::string& s, std::size_t pos, XMP_DateTime* t) {
  if (!Digits(s, pos, 2, &t->hour) || pos >= s.size() || s[pos] != ':') return false;
  ++pos;
  if (!Digits(s, pos, 2, &t->minute)) return false;
  if (t->hour > 23 || t->minute > 59) return false;
  t->hasTime = true;
  if (pos < s.size() && s[pos] == ':') {
    ++pos;
    if (!Digits(s, pos, 2, &t->second) || t->second > 59) return false;
    if (pos < s.size() && (s[pos] == '.' || s[pos] == ',')) {
      ++pos;
      std::size_t digits = 0;
      std::int32_t nano = 0;
      while (pos < s.size() && IsDigit(s[pos])) {
        if (digits < 9) nano = nano * 10 + (s[pos] - '0');
        ++digits;
        ++pos;
      }
      if (digits == 0) return false;
      for (std::size_t i = digits; i < 9; ++i) nano *= 10;
      t->nanoSecond = nano;
    }
  }
  if (pos == s.size()) return true;
  if (s[pos] == 'Z') {
    t->hasTimeZone = true;
    return pos + 1 == s.size();
  }
  if (s[pos] != '+' && s[pos] != '-') return false;
  const std::int8_t sign = s[pos] == '+' ? 1 : -1;
  ++pos;
  if (!Digits(s, pos, 2, &t->tzHour)) return false;
  if (pos < s.size() && s[pos] == ':') ++pos;
  if (pos < s.size() && !Digits(s, pos, 2, &t->tzMinute)) return false;
  if (pos != s.size() || t->tzHour > 23 || t->tzMinute > 59) return false;
  t->hasTimeZone = true;
  t->tzSign = (t->tzHour == 0 && t->tzMinute == 0) ? 0 : sign;
  return true;
}

bool ParseDate(const std::string& s, XMP_DateTime* t) {
  std::size_t pos = 0;
  if (s.empty()) return false;
  if (s[0] == 'T') return ParseTime(s, 1, t);
  if (s.size() >= 3 && IsDigit(s[0]) && IsDigit(s[1]) && s[2] == ':') return ParseTime(s, 0, t);
  bool negative = false;
  if (s[0] == '-') {
    negative = true;
    ++pos;
  }
  std::int64_t year = 0;
  const std::size_t yearStart = pos;
  while (pos < s.size() && IsDigit(s[pos])) {
    year = year * 10 + (s[pos] - '0');
    if (year > 999999) return false;
    ++pos;
  }
  if (pos == yearStart) return false;
  t->year = static_cast<std::int32_t>(negative ? -year : year);
  t->hasDate = true;
  if (pos == s.size()) return true;
  if (s[pos++] != '-' || !Digits(s, pos, 2, &t->month) || t->month < 1 || t->month > 12) return false;
  if (pos == s.size()) return true;
  if (s[pos++] != '-' || !Digits(s, pos, 2, &t->day) || t->day < 1 || t->day > 31) return false;
  if (pos == s.size()) return true;
  if (s[pos] != 'T') return false;
  return ParseTime(s, pos + 1, t);
}

}  // namespace

std::string XMPUtils::ConvertFromBool(bool binValue) {
  return binValue ? "True" : "False";
}

std::string XMPUtils::ConvertFromInt(std::int32_t binValue) {
  return std::to_string(binValue);
}

std::string XMPUtils::ConvertFromInt64(std::int64_t binValue) {
  return std::to_string(binValue);
}

std::string XMPUtils::ConvertFromFloat(double binValue, const std::string& format) {
  char buffer[512];
  const int n = std::snprintf(buffer, sizeof buffer, format.empty() ? "%f" : format.c_str(), binValue);
  if (n < 0 || n >= static_cast<int>(sizeof buffer)) detail::Throw(kXMPErr_BadParam, "float format");
  return std::string(buffer, static_cast<std::size_t>(n));
}

std::string XMPUtils::ConvertFromDate(const XMP_DateTime& t) {
  char buffer[128];
  std::string out;
  if (t.hasDate) {
    if (t.year < 0)
      std::snprintf(buffer, sizeof buffer, "-%04d", -t.year);
    else
      std::snprintf(buffer, sizeof buffer, "%04d", t.year);
    out = buffer;
    if (t.month != 0 || t.hasTime) {
      std::snprintf(buffer, sizeof buffer, "-%02d", t.month != 0 ? t.month : 1);
      out += buffer;
      if (t.day != 0 || t.hasTime) {
        std::snprintf(buffer, sizeof buffer, "-%02d", t.day != 0 ? t.day : 1);
        out += buffer;
      }
    }
  }
  if (t.hasTime) {
    std::snprintf(buffer, sizeof buffer, "T%02d:%02d", t.hour, t.minute);
    out += buffer;
    if (t.second != 0 || t.nanoSecond != 0) {
      std::snprintf(buffer, sizeof buffer, ":%02d", t.second);
      out += buffer;
      if (t.nanoSecond != 0) {
        std::snprintf(buffer, sizeof buffer, ".%09d", t.nanoSecond);
        std::string fraction = buffer;
        while (fraction.back() == '0') fraction.pop_back();
        out += fraction;
      }
    }
    if (t.hasTimeZone) {
      if (t.tzSign == 0 || (t.tzHour == 0 && t.tzMinute == 0)) {
        out += 'Z';
      } else {
        std::snprintf(buffer, sizeof buffer, "%c%02d:%02d", t.tzSign < 0 ? '-' : '+', t.tzHour, t.tzMinute);
        out += buffer;
      }
    }
  }
  return out;
}

bool XMPUtils::ConvertToBool(const std::string& strValue) {
  std::string text = Trimmed(strValue);
  for (char& c : text)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  if (text == "true" || text == "t" || text == "1") return true;
  if (text == "false" || text == "f" || text == "0") return false;
  BadValue("boolean", strValue);
}

std::int64_t XMPUtils::ConvertToInt64(const std::string& strValue) {
  const std::string text = Trimmed(strValue);
  std::size_t pos = 0;
  bool negative = false;
  if (pos < text.size() && (text[pos] == '+' || text[pos] == '-')) negative = text[pos++] == '-';
  int base = 10;
  if (text.size() - pos > 2 && text[pos] == '0' && (text[pos + 1] == 'x' || text[pos + 1] == 'X')) {
    base = 16;
    pos += 2;
  }
  std::uint64_t magnitude = 0;
  const char* first = text.data() + pos;
  const char* last = text.data() + text.size();
  const auto result = std::from_chars(first, last, magnitude, base);
  if (first == last || result.ec != std::errc() || result.ptr != last) BadValue("integer", strValue);
  const std::uint64_t limit = negative ? std::uint64_t(1) << 63 : (std::uint64_t(1) << 63) - 1;
  if (magnitude > limit) BadValue("integer", strValue);
  if (negative) return magnitude == (std::uint64_t(1) << 63) ? std::numeric_limits<std::int64_t>::min()
                                                             : -static_cast<std::int64_t>(magnitude);
  return static_cast<std::int64_t>(magnitude);
}

std::int32_t XMPUtils::ConvertToInt(const std::string& strValue) {
  const std::int64_t value = ConvertToInt64(strValue);
  if (value < std::numeric_limits<std::int32_t>::min() || value > std::numeric_limits<std::int32_t>::max())
    BadValue("32-bit integer", strValue);
  return static_cast<std::int32_t>(value);
}

double XMPUtils::ConvertToFloat(const std::string& strValue) {
  const std::string text = Trimmed(strValue);
  const char* first = text.data();
  const char* last = text.data() + text.size();
  if (first != last && *first == '+') ++first;
  double value = 0;
  const auto result = std::from_chars(first, last, value);
  if (first == last || result.ec != std::errc() || result.ptr != last) BadValue("real number", strValue);
  return value;
}

XMP_DateTime XMPUtils::ConvertToDate(const std::string& strValue) {
  XMP_DateTime parsed;
  if (!ParseDate(Trimmed(strValue), &parsed)) BadValue("date", strValue);
  return parsed;
}

XMP_DateTime XMPUtils::ConvertToUTCTime(XMP_DateTime time) {
  if (!time.hasTime) return time;
  if (time.hasTimeZone && time.tzSign != 0) {
    const std::int64_t offset = time.tzSign * (time.tzHour * 3600 + time.tzMinute * 60);
    SetWallSeconds(WallSeconds(time) - offset, &time);
  }
  time.hasTimeZone = true;
  time.tzSign = 0;
  time.tzHour = 0;
  time.tzMinute = 0;
  return time;
}

XMP_DateTime XMPUtils::ConvertToLocalTime(XMP_DateTime time) {
  if (!time.hasTime) return time;
  time = ConvertToUTCTime(time);
  const std::time_t instant = static_cast<std::time_t>(WallSeconds(time));
  std::tm local{};
  localtime_r(&instant, &local);
  const long offset = local.tm_gmtoff;
  SetWallSeconds(WallSeconds(time) + offset, &time);
  time.hasTimeZone = true;
  time.tzSign = offset == 0 ? 0 : (offset < 0 ? -1 : 1);
  const long magnitude = offset < 0 ? -offset : offset;
  time.tzHour = static_cast<std::int32_t>(magnitude / 3600);
  time.tzMinute = static_cast<std::int32_t>(magnitude / 60 % 60);
  return time;
}

XMP_DateTime XMPUtils::CurrentDateTime() {
  std::timespec now{};
  std::timespec_get(&now, TIME_UTC);
  XMP_DateTime t;
  t.hasDate = t.hasTime = true;
  t.nanoSecond = static_cast<std::int32_t>(now.tv_nsec);
  t.hasTimeZone = true;
  SetWallSeconds(static_cast<std::int64_t>(now.tv_sec), &t);
  return ConvertToLocalTime(t);
}

}  // namespace ovraxmp
