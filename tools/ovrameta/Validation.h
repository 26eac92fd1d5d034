// Private to the ovrameta tool (not part of the library's interface):
// checking a value against the definitions before anything is written.
#pragma once

#include <string>

#include <ovrametadata/ovrametadata.h>

namespace ovrameta {

// Checks value for the property at path. Returns an empty string when the
// definitions accept it (value may then be normalised: "true" becomes
// "True", "+007" becomes "7"), else the reason it is refused.
std::string CheckValue(const ovrametadata::Path& path, const ovrametadata::EntryDefinition& entry,
                       std::string& value);

}  // namespace ovrameta
