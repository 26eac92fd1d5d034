#include <ovracore/Strings.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstring>
#include <system_error>

namespace ovracore {

namespace {

constexpr char32_t kReplacement = 0xFFFD;

bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\f' || c == '\v'; }

bool IsSurrogate(char32_t c) { return c >= 0xD800 && c <= 0xDFFF; }

// Decodes one code point at text[pos], advancing pos. Overlong forms,
// surrogates, values above U+10FFFF and truncated sequences yield U+FFFD and
// consume only the bytes that were part of the broken sequence, so that a
// following valid character is never swallowed.
char32_t DecodeUTF8(std::string_view text, std::size_t& pos) {
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned char lead = byte(pos);
  if (lead < 0x80) {
    ++pos;
    return lead;
  }
  std::size_t length;
  char32_t cp;
  char32_t minimum;
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
    cp = lead & 0x1F;
    minimum = 0x80;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    cp = lead & 0x0F;
    minimum = 0x800;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    cp = lead & 0x07;
    minimum = 0x10000;
  } else {
    ++pos;
    return kReplacement;
  }
  std::size_t i = 1;
  for (; i < length; ++i) {
    if (pos + i >= text.size() || (byte(pos + i) & 0xC0) != 0x80) break;
    cp = (cp << 6) | (byte(pos + i) & 0x3F);
  }
  if (i < length) {
    pos += i;
    return kReplacement;
  }
  pos += length;
  if (cp < minimum || cp > 0x10FFFF || IsSurrogate(cp)) return kReplacement;
  return cp;
}

std::string_view StripPlus(std::string_view text) {
  // from_chars refuses a leading '+', which people do write; a sign after it
  // ("+-1") stays refused.
  if (text.size() > 1 && text[0] == '+' && text[1] != '-' && text[1] != '+') text.remove_prefix(1);
  return text;
}

template <class Int>
std::optional<Int> ToInteger(std::string_view text) {
  text = StripPlus(TrimBlanks(text));
  if (text.empty()) return std::nullopt;
  Int value{};
  const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value, 10);
  if (ec != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return value;
}

// Number of digits before the decimal point implied by a scientific form.
struct Decimal {
  bool negative = false;
  std::string digits;  // significant digits, no leading zeros
  int exponent = 0;    // value = 0.d1d2d3... * 10^exponent
};

Decimal ShortestDecimal(double value) {
  // The shortest form that reads back as the same double: rounding that text
  // gives the result a reader of the number expects (2.675 -> "2.68").
  char buf[64];
  const auto [end, ec] = std::to_chars(buf, buf + sizeof buf, value, std::chars_format::scientific);
  Decimal d;
  if (ec != std::errc()) return d;
  std::string_view s(buf, static_cast<std::size_t>(end - buf));
  if (!s.empty() && s[0] == '-') {
    d.negative = true;
    s.remove_prefix(1);
  }
  const std::size_t e = s.find('e');
  const std::string_view mantissa = s.substr(0, e);
  int exp10 = 0;
  std::from_chars(s.data() + e + 1 + (s[e + 1] == '+' ? 1 : 0), s.data() + s.size(), exp10);
  for (char c : mantissa)
    if (c != '.') d.digits.push_back(c);
  d.exponent = exp10 + 1;
  while (!d.digits.empty() && d.digits.back() == '0') d.digits.pop_back();
  if (d.digits.empty()) d.exponent = 0;
  return d;
}

}  // namespace

UTF16String ToUTF16(std::string_view utf8) {
  // Never more code units than bytes, so the result is written in place;
  // ASCII, nearly all of the text, skips the decoder.
  UTF16String out(utf8.size(), u'\0');
  char16_t* const begin = out.data();
  char16_t* next = begin;
  const char* const text = utf8.data();
  const std::size_t size = utf8.size();
  std::size_t pos = 0;
  while (pos < size) {
    // Eight ASCII bytes at a time where possible.
    if (pos + 8 <= size) {
      std::uint64_t block = 0;
      std::memcpy(&block, text + pos, 8);
      if ((block & 0x8080808080808080u) == 0) {
        for (int i = 0; i < 8; ++i) next[i] = static_cast<unsigned char>(text[pos + i]);
        next += 8;
        pos += 8;
        continue;
      }
    }
    if (static_cast<unsigned char>(text[pos]) < 0x80) {
      *next++ = static_cast<unsigned char>(text[pos++]);
      continue;
    }
    char32_t cp = DecodeUTF8(utf8, pos);
    if (cp < 0x10000) {
      *next++ = static_cast<char16_t>(cp);
    } else {
      cp -= 0x10000;
      *next++ = static_cast<char16_t>(0xD800 + (cp >> 10));
      *next++ = static_cast<char16_t>(0xDC00 + (cp & 0x3FF));
    }
  }
  out.resize(static_cast<std::size_t>(next - begin));
  return out;
}

void AppendCodePoint(UTF8String& out, char32_t cp) {
  if (cp > 0x10FFFF || IsSurrogate(cp)) cp = kReplacement;
  if (cp < 0x80) {
    out.push_back(static_cast<char>(cp));
  } else if (cp < 0x800) {
    out.push_back(static_cast<char>(0xC0 | (cp >> 6)));
    out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
  } else if (cp < 0x10000) {
    out.push_back(static_cast<char>(0xE0 | (cp >> 12)));
    out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
  } else {
    out.push_back(static_cast<char>(0xF0 | (cp >> 18)));
    out.push_back(static_cast<char>(0x80 | ((cp >> 12) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
    out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
  }
}

UTF8String ToUTF8(std::u16string_view utf16) {
  // At most three bytes per code unit, so the result is written in place;
  // ASCII takes one test.
  UTF8String out(utf16.size() * 3, '\0');
  char* next = out.data();
  for (std::size_t i = 0; i < utf16.size(); ++i) {
    char32_t c = utf16[i];
    if (c < 0x80) {
      *next++ = static_cast<char>(c);
      continue;
    }
    if (c >= 0xD800 && c <= 0xDBFF && i + 1 < utf16.size() && utf16[i + 1] >= 0xDC00 &&
        utf16[i + 1] <= 0xDFFF) {
      c = 0x10000 + ((c - 0xD800) << 10) + (utf16[i + 1] - 0xDC00);
      ++i;
    }
    if (IsSurrogate(c)) c = kReplacement;  // a lone surrogate
    if (c < 0x800) {
      *next++ = static_cast<char>(0xC0 | (c >> 6));
    } else if (c < 0x10000) {
      *next++ = static_cast<char>(0xE0 | (c >> 12));
      *next++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
    } else {
      // Two code units made these four bytes.
      *next++ = static_cast<char>(0xF0 | (c >> 18));
      *next++ = static_cast<char>(0x80 | ((c >> 12) & 0x3F));
      *next++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
    }
    *next++ = static_cast<char>(0x80 | (c & 0x3F));
  }
  out.resize(static_cast<std::size_t>(next - out.data()));
  return out;
}

std::optional<double> ToDouble(std::string_view text) {
  text = StripPlus(TrimBlanks(text));
  if (text.empty()) return std::nullopt;
  double value = 0;
  const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (ec != std::errc() || end != text.data() + text.size() || !std::isfinite(value))
    return std::nullopt;
  return value;
}

std::optional<std::int64_t> ToInt64(std::string_view text) { return ToInteger<std::int64_t>(text); }
std::optional<std::int32_t> ToInt32(std::string_view text) { return ToInteger<std::int32_t>(text); }
std::optional<std::uint8_t> ToUInt8(std::string_view text) { return ToInteger<std::uint8_t>(text); }

double CoerceToDouble(std::string_view text) {
  text = StripPlus(TrimBlanks(text));
  double value = 0;
  const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (ec != std::errc() || end == text.data() || !std::isfinite(value)) return 0.0;
  return value;
}

UTF8String NumberToString(double value, unsigned decimals) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value < 0 ? "-inf" : "inf";
  // Absurd counts would only allocate; no double carries more than this.
  constexpr unsigned kMaxDecimals = 340;
  if (decimals > kMaxDecimals) decimals = kMaxDecimals;

  Decimal d = ShortestDecimal(value);
  // Digits kept: everything before the point plus the requested decimals.
  const long keep = static_cast<long>(d.exponent) + static_cast<long>(decimals);
  if (keep < 0) {
    d.digits.clear();
  } else if (static_cast<std::size_t>(keep) < d.digits.size()) {
    const bool roundUp = d.digits[static_cast<std::size_t>(keep)] >= '5';
    d.digits.resize(static_cast<std::size_t>(keep));
    if (roundUp) {
      std::size_t i = d.digits.size();
      while (i > 0 && d.digits[i - 1] == '9') d.digits[--i] = '0';
      if (i == 0) {
        d.digits.insert(d.digits.begin(), '1');
        ++d.exponent;
      } else {
        ++d.digits[i - 1];
      }
    }
  }
  while (!d.digits.empty() && d.digits.back() == '0' &&
         static_cast<long>(d.digits.size()) > std::max(0L, static_cast<long>(d.exponent)))
    d.digits.pop_back();
  const bool zero = d.digits.find_first_not_of('0') == std::string::npos;

  std::string out;
  if (d.negative && !zero) out.push_back('-');
  // Integer part.
  if (d.exponent <= 0 || zero) {
    out.push_back('0');
  } else {
    for (long i = 0; i < d.exponent; ++i)
      out.push_back(static_cast<std::size_t>(i) < d.digits.size() ? d.digits[static_cast<std::size_t>(i)] : '0');
  }
  if (decimals > 0) {
    out.push_back('.');
    for (long i = 0; i < static_cast<long>(decimals); ++i) {
      const long index = (zero ? 0L : static_cast<long>(d.exponent)) + i;
      const bool have = !zero && index >= 0 && index < static_cast<long>(d.digits.size());
      out.push_back(have ? d.digits[static_cast<std::size_t>(index)] : '0');
    }
  }
  return out;
}

UTF16String NumberToUTF16String(double value, unsigned decimals) {
  return ToUTF16(NumberToString(value, decimals));
}

std::vector<UTF8String> Tokenize(std::string_view text, std::string_view separators, bool keepEmpty) {
  std::vector<UTF8String> tokens;
  std::size_t start = 0;
  while (true) {
    const std::size_t end = text.find_first_of(separators, start);
    const std::string_view token =
        text.substr(start, end == std::string_view::npos ? std::string_view::npos : end - start);
    if (keepEmpty || !token.empty()) tokens.emplace_back(token);
    if (end == std::string_view::npos) break;
    start = end + 1;
  }
  return tokens;
}

UTF8String EncodeXMLReserved(std::string_view text) {
  UTF8String out;
  out.reserve(text.size());
  for (char c : text) {
    switch (c) {
      case '&': out += "&amp;"; break;
      case '<': out += "&lt;"; break;
      case '>': out += "&gt;"; break;
      case '"': out += "&quot;"; break;
      case '\'': out += "&apos;"; break;
      // As references, so that line breaks and tabs in attribute values
      // survive the parser's normalisation.
      case '\t': out += "&#9;"; break;
      case '\n': out += "&#10;"; break;
      case '\r': out += "&#13;"; break;
      default: out.push_back(c);
    }
  }
  return out;
}

UTF8String DecodeXMLReserved(std::string_view text) {
  static constexpr std::pair<std::string_view, char> kNamed[] = {
      {"amp", '&'}, {"lt", '<'}, {"gt", '>'}, {"quot", '"'}, {"apos", '\''}};
  UTF8String out;
  out.reserve(text.size());
  std::size_t pos = 0;
  while (pos < text.size()) {
    const char c = text[pos];
    const std::size_t semi = c == '&' ? text.find(';', pos + 1) : std::string_view::npos;
    // Longest reference we recognise is "&#x10FFFF;"; anything longer is text.
    if (semi == std::string_view::npos || semi - pos > 10) {
      out.push_back(c);
      ++pos;
      continue;
    }
    const std::string_view name = text.substr(pos + 1, semi - pos - 1);
    bool decoded = false;
    if (name.size() > 1 && name[0] == '#') {
      const bool hex = name[1] == 'x' || name[1] == 'X';
      const std::string_view digits = name.substr(hex ? 2 : 1);
      std::uint32_t cp = 0;
      const auto [end, ec] = std::from_chars(digits.data(), digits.data() + digits.size(), cp, hex ? 16 : 10);
      if (!digits.empty() && ec == std::errc() && end == digits.data() + digits.size() && cp != 0 &&
          cp <= 0x10FFFF && !IsSurrogate(cp)) {
        AppendCodePoint(out, cp);
        decoded = true;
      }
    } else {
      for (const auto& [entity, ch] : kNamed) {
        if (name == entity) {
          out.push_back(ch);
          decoded = true;
          break;
        }
      }
    }
    if (decoded) {
      pos = semi + 1;
    } else {
      out.push_back(c);
      ++pos;
    }
  }
  return out;
}

bool EqualsIgnoreCaseASCII(std::string_view a, std::string_view b) {
  if (a.size() != b.size()) return false;
  const auto lower = [](char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; };
  for (std::size_t i = 0; i < a.size(); ++i)
    if (lower(a[i]) != lower(b[i])) return false;
  return true;
}

std::string_view TrimBlanks(std::string_view text) {
  while (!text.empty() && IsBlank(text.front())) text.remove_prefix(1);
  while (!text.empty() && IsBlank(text.back())) text.remove_suffix(1);
  return text;
}

}  // namespace ovracore
