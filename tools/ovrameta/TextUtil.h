// Private to the ovrameta tool (not part of the library's interface):
// conversions between the library's string types and the terminal's UTF-8.
#pragma once

#include <string>

#include <ovrametadata/ovrametadata.h>

namespace ovrameta {

// UTF-16 to UTF-8; an unpaired surrogate becomes U+FFFD.
std::string ToUTF8(const ovrametadata::UTF16String& text);
// UTF-8 to UTF-16; a malformed byte becomes U+FFFD.
ovrametadata::UTF16String ToUTF16(const std::string& text);

// A label for display: the text, or fallback when the text is empty.
std::string LabelOr(const ovrametadata::UTF16String& label, const std::string& fallback);

}  // namespace ovrameta
