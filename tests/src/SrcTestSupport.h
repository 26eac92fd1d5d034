// Helpers shared by the tests of the library frame and the definitions.
#pragma once

#include <string>
#include <vector>

#include <boost/make_shared.hpp>
#include <boost/optional/optional_io.hpp>
#include <gtest/gtest.h>

#include <ovracore/Strings.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>

namespace ovratest {

// The errors reported after construction (the list is process-wide and
// only the last Terminate empties it).
class ErrorsSince {
 public:
  ErrorsSince() : mStart(ovrametadata::GetErrorInfos().size()) {}
  std::vector<ovrametadata::ErrorInfo> New() const {
    std::vector<ovrametadata::ErrorInfo> all = ovrametadata::GetErrorInfos();
    if (all.size() < mStart) return all;  // a Terminate emptied the list meanwhile
    return std::vector<ovrametadata::ErrorInfo>(all.begin() + static_cast<std::ptrdiff_t>(mStart),
                                                all.end());
  }
  // The texts of the new errors, in UTF-8 for readable failures.
  std::vector<std::string> Texts() const {
    std::vector<std::string> texts;
    for (const auto& info : New()) texts.push_back(ovracore::ToUTF8(info.message));
    return texts;
  }

 private:
  std::size_t mStart;
};

// Keeps the library initialised for the lifetime of the object.
class LibraryScope {
 public:
  LibraryScope() { ovrametadata::Initialize(); }
  ~LibraryScope() { ovrametadata::Terminate(); }
  LibraryScope(const LibraryScope&) = delete;
  LibraryScope& operator=(const LibraryScope&) = delete;
};

inline std::string U8(const std::u16string& text) { return ovracore::ToUTF8(text); }
inline std::u16string U16(const std::string& text) { return ovracore::ToUTF16(text); }

// Checks one reported error by its exact text, type and source.
inline void ExpectError(const ovrametadata::ErrorInfo& info, ovrametadata::ErrorType type,
                        const std::string& text, const std::u16string& source) {
  EXPECT_EQ(info.type, type);
  EXPECT_EQ(U8(info.message), text);
  EXPECT_EQ(U8(info.source), U8(source));
}

}  // namespace ovratest
