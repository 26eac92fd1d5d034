#include <ovracore/Localizer.h>

#include <charconv>
#include <cstdlib>
#include <deque>
#include <mutex>
#include <shared_mutex>
#include <unordered_map>

#include <ovracore/FileSupport.h>

namespace ovracore {

namespace {

constexpr std::string_view kKeyPrefix = "$$$/";
// Dictionaries are small text files; anything bigger is not one.
constexpr std::size_t kMaxDictionaryBytes = 64u * 1024u * 1024u;

// Keys are looked up as views of the caller's text, so a lookup costs no
// copy; the keys themselves live in a deque, whose elements never move.
struct Dictionary {
  std::shared_mutex mutex;
  std::deque<std::string> keys;
  std::unordered_map<std::string_view, std::string> entries;

  void Set(std::string_view key, std::string_view text) {
    const auto it = entries.find(key);
    if (it != entries.end()) {
      it->second.assign(text);
      return;
    }
    keys.emplace_back(key);
    entries.emplace(keys.back(), std::string(text));
  }
};

Dictionary& sDictionary() {
  static Dictionary dictionary;
  return dictionary;
}

struct Language {
  std::mutex mutex;
  bool known = false;
  UTF8String value;
};

Language& sLanguage() {
  static Language language;
  return language;
}

UTF8String LanguageFromEnvironment() {
  for (const char* name : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
    const char* value = std::getenv(name);
    if (!value || !*value) continue;
    std::string_view locale(value);
    locale = locale.substr(0, locale.find_first_of(".@"));
    if (locale.empty() || locale == "C" || locale == "POSIX") return "en_US";
    return UTF8String(locale);
  }
  return "en_US";
}

// Replaces escapes and placeholders in one pass, so that neither the text an
// escape produces nor an argument is scanned again.
UTF8String Expand(std::string_view text, std::initializer_list<std::string_view> args) {
  UTF8String out;
  out.reserve(text.size());
  std::size_t pos = 0;
  while (pos < text.size()) {
    const char c = text[pos];
    if (c == '@' && pos + 1 < text.size() && text[pos + 1] >= '0' && text[pos + 1] <= '9') {
      const auto index = static_cast<std::size_t>(text[pos + 1] - '0');
      if (index < args.size()) {
        out.append(*(args.begin() + index));
        pos += 2;
        continue;
      }
    } else if (c == '#' && text.compare(pos, 2, "#{") == 0) {
      const std::size_t close = text.find('}', pos + 2);
      if (close != std::string_view::npos) {
        const std::string_view name = text.substr(pos + 2, close - pos - 2);
        if (name == "quot") {
          out.push_back('"');
          pos = close + 1;
          continue;
        }
        if (name.size() > 2 && name.size() <= 8 && name.compare(0, 2, "U+") == 0) {
          std::uint32_t cp = 0;
          const char* first = name.data() + 2;
          const char* last = name.data() + name.size();
          const auto [end, ec] = std::from_chars(first, last, cp, 16);
          if (ec == std::errc() && end == last) {
            AppendCodePoint(out, cp);
            pos = close + 1;
            continue;
          }
        }
      }
    }
    out.push_back(c);
    ++pos;
  }
  return out;
}

// Calls convert with the text to show for text: the text itself, its
// default text or the dictionary's entry for its key, each expanded.
// Texts without escapes or placeholders are handed over without a copy.
template <class Convert>
auto Localize(std::string_view text, std::initializer_list<std::string_view> args, Convert convert) {
  const auto expanded = [&](std::string_view chosen) {
    // Two scans for one character each: find_first_of tests the set per character.
    if (chosen.find('@') == std::string_view::npos && chosen.find('#') == std::string_view::npos) {
      return convert(chosen);
    }
    return convert(std::string_view(Expand(chosen, args)));
  };
  if (text.compare(0, kKeyPrefix.size(), kKeyPrefix) != 0) return expanded(text);
  const std::size_t equals = text.find('=');
  const std::string_view key = text.substr(0, equals);
  // A key without "=" has no default; the key itself is the least bad text.
  const std::string_view fallback = equals == std::string_view::npos ? text : text.substr(equals + 1);
  Dictionary& dictionary = sDictionary();
  {
    std::shared_lock<std::shared_mutex> lock(dictionary.mutex);
    if (!dictionary.entries.empty()) {
      const auto it = dictionary.entries.find(key);
      if (it != dictionary.entries.end()) return expanded(it->second);
    }
  }
  return expanded(fallback);
}

}  // namespace

UTF8String ZStringUTF8(std::string_view text, std::initializer_list<std::string_view> args) {
  return Localize(text, args, [](std::string_view shown) { return UTF8String(shown); });
}

UTF16String ZString(std::string_view text, std::initializer_list<std::string_view> args) {
  return Localize(text, args, [](std::string_view shown) { return ToUTF16(shown); });
}

bool AddDictionaryFile(const UTF16String& path) {
  const std::optional<std::string> contents = filesupport::ReadFileToString(path, kMaxDictionaryBytes);
  if (!contents) return false;
  std::string_view rest(*contents);
  if (rest.compare(0, 3, "\xEF\xBB\xBF") == 0) rest.remove_prefix(3);

  std::vector<std::pair<std::string_view, std::string_view>> parsed;
  while (!rest.empty()) {
    const std::size_t newline = rest.find('\n');
    std::string_view line = rest.substr(0, newline);
    rest = newline == std::string_view::npos ? std::string_view() : rest.substr(newline + 1);
    if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    if (line.empty() || line.front() == '#') continue;
    const std::size_t equals = line.find('=');
    if (equals == std::string_view::npos) continue;
    const std::string_view key = TrimBlanks(line.substr(0, equals));
    if (key.size() <= kKeyPrefix.size() || key.compare(0, kKeyPrefix.size(), kKeyPrefix) != 0) continue;
    parsed.emplace_back(key, line.substr(equals + 1));
  }

  Dictionary& dictionary = sDictionary();
  std::unique_lock<std::shared_mutex> lock(dictionary.mutex);
  for (const auto& [key, text] : parsed) dictionary.Set(key, text);
  return true;
}

void AddDictionaryEntry(std::string_view key, std::string_view text) {
  Dictionary& dictionary = sDictionary();
  std::unique_lock<std::shared_mutex> lock(dictionary.mutex);
  dictionary.Set(key, text);
}

void ClearDictionaries() {
  Dictionary& dictionary = sDictionary();
  std::unique_lock<std::shared_mutex> lock(dictionary.mutex);
  dictionary.entries.clear();
  dictionary.keys.clear();
}

UTF8String ApplicationLanguage() {
  Language& language = sLanguage();
  std::lock_guard<std::mutex> lock(language.mutex);
  if (!language.known) {
    language.value = LanguageFromEnvironment();
    language.known = true;
  }
  return language.value;
}

void SetApplicationLanguage(std::string_view value) {
  Language& language = sLanguage();
  std::lock_guard<std::mutex> lock(language.mutex);
  // An empty setting hands the choice back to the environment.
  language.value = value.empty() ? LanguageFromEnvironment() : UTF8String(value);
  language.known = true;
}

}  // namespace ovracore
