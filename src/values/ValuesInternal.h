// Not part of the interface: helpers the value functions and providers share.
#pragma once

#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

// Sends the "invalid data" report for a path. The namespace URI runs straight
// into the path in the message, on purpose: that is how the message has
// always shown the property.
void ReportInvalidData(ErrorType type, const Path& path, const UTF16String& source = UTF16String());

}  // namespace ovrametadata
