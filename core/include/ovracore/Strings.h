// ovracore: the platform layer's string types and text helpers.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace ovracore {

// XMP names and values are UTF-8; display texts and file paths are UTF-16.
using UTF8String = std::string;
using UTF16String = std::u16string;

// Conversions never fail: an invalid byte sequence (UTF-8) or a lone
// surrogate (UTF-16) becomes U+FFFD.
UTF16String ToUTF16(std::string_view utf8);
UTF8String ToUTF8(std::u16string_view utf16);
// Appends the UTF-8 form of one code point (invalid code points become U+FFFD).
void AppendCodePoint(UTF8String& out, char32_t codePoint);

// String coercion. Leading and trailing blanks are ignored; the whole rest
// must be a number in the C locale ("1.5", "-3", "1e3"), else the result is
// absent. Integer forms refuse fractions and values out of range.
std::optional<double> ToDouble(std::string_view text);
std::optional<std::int64_t> ToInt64(std::string_view text);
std::optional<std::int32_t> ToInt32(std::string_view text);
std::optional<std::uint8_t> ToUInt8(std::string_view text);  // values above 255 are absent
// Lenient coercion as used by the formatters: the longest numeric prefix,
// 0 when there is none.
double CoerceToDouble(std::string_view text);

// Number to text with a fixed count of decimals in the C locale (whatever the
// process locale is), rounded half away from zero on the shortest decimal
// form of the double, so 2.675 gives "2.68" although its binary value is a
// little below; trailing zeros are kept ("2.50" for 2.5 with 2 decimals).
// A result that rounds to zero has no sign ("-0.001" -> "0.00"). NaN and
// infinities are "nan", "inf" and "-inf".
UTF8String NumberToString(double value, unsigned decimals);
UTF16String NumberToUTF16String(double value, unsigned decimals);

// Splits text at every character that occurs in separators. With
// keepEmpty, adjacent separators yield empty tokens ("a//b" -> a, "", b);
// without, runs of separators count as one and empty tokens are dropped.
// An empty text gives one empty token with keepEmpty, none without.
std::vector<UTF8String> Tokenize(std::string_view text, std::string_view separators,
                                 bool keepEmpty = true);

// XML reserved characters: & < > " ' become entity references, tab, line
// feed and carriage return numeric references (attribute values keep them);
// decoding also resolves numeric references (&#65; &#x41;). Unknown or
// malformed references are left as they stand.
UTF8String EncodeXMLReserved(std::string_view text);
UTF8String DecodeXMLReserved(std::string_view text);

// ASCII-only helpers used for case-insensitive comparisons of keywords.
bool EqualsIgnoreCaseASCII(std::string_view a, std::string_view b);
std::string_view TrimBlanks(std::string_view text);

}  // namespace ovracore
