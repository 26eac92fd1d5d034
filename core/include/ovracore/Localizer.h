// ovracore: the localiser. Texts of the form "$$$/area/key=default text" are
// looked up in the dictionaries added so far; any other text is returned
// unchanged (apart from placeholders and escapes).
#pragma once

#include <initializer_list>
#include <string_view>

#include <ovracore/Strings.h>

namespace ovracore {

// Localises a text:
//  1. When it begins with "$$$/", the key is everything before the first
//     "=" and the default text everything after it; the text is the
//     dictionary entry of the key when one exists, else the default text
//     (a key without "=" has no default and stands for itself).
//  2. "#{quot}" becomes a quotation mark, "#{U+XXXX}" (hex) that code point.
//  3. "@0", "@1", "@2" (up to "@9") are replaced by the matching argument (a
//     placeholder without an argument stays as it is).
// Steps 2 and 3 are one pass: neither arguments nor the text an escape
// produces are scanned again. Safe to call from any thread.
UTF8String ZStringUTF8(std::string_view text, std::initializer_list<std::string_view> args = {});
UTF16String ZString(std::string_view text, std::initializer_list<std::string_view> args = {});

// Dictionaries: UTF-8 files of lines "$$$/area/key=text"; lines that begin
// with "#" and blank lines are ignored; a later entry for a key wins, also
// across files. Returns false when the file cannot be read.
bool AddDictionaryFile(const UTF16String& path);
void AddDictionaryEntry(std::string_view key, std::string_view text);
void ClearDictionaries();

// The application language, e.g. "en_US". Taken on first use from LC_ALL,
// LC_MESSAGES or LANG (the part before any "." or "@"; "C"/"POSIX"/unset
// give "en_US"); the host may set it explicitly (an empty value goes back to
// the environment).
UTF8String ApplicationLanguage();
void SetApplicationLanguage(std::string_view language);

}  // namespace ovracore
