// ovrametadata: display texts for raw XMP values, and values constructed
// for properties that are not stored themselves.
#pragma once

#include <boost/function.hpp>

#include <ovrametadata/Common.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Values.h>

namespace ovrametadata {

// ---------------------------------------------------------------------------
// Formatter registry and constructed values

// Sets the application-wide value formatter, consulted by FormatValue before
// the library's own formatters. It receives the packet (may be null), the
// path and the raw text, and returns the display text or an empty string when
// it has nothing to offer. An empty function unregisters it. The library keeps
// a copy. Must not be called while another thread runs FormatValue.
OVRAMETADATA_EXPORT void RegisterValueFormatter(
    const boost::function<UTF8String(XMPMetaRef, const Path&, const UTF8String&)>& formatter);

// A copy of the application-wide value formatter; empty when none is set.
OVRAMETADATA_EXPORT boost::function<UTF8String(XMPMetaRef, const Path&, const UTF8String&)>
RegisteredValueFormatter();

// The display text of `rawValue`, the raw text stored at `path` in `xmp`
// (which may be null). Asks, in this order, the application-wide formatter
// (its text wins only when non-empty), the library's formatter for the path,
// and the formatter for the type of the path's definition ("date",
// "rational", "gpscoordinate"). An empty result means: show the raw value.
// Never throws for bad input.
OVRAMETADATA_EXPORT UTF8String FormatValue(XMPMetaRef xmp, const Path& path,
                                           const UTF8String& rawValue);

// A value for a property that is not stored: the text at the path's fallback
// path when there is one and it can be read, else what the path's value
// aggregator constructs from other properties. Returns false and leaves
// `outValue` untouched when the path has neither or nothing could be read;
// `outResult` (may be null) receives the outcome of the last read.
OVRAMETADATA_EXPORT bool GetConstructedValue(XMPMetaRef xmp, const Path& path,
                                             UTF8String& outValue, GetValueResult* outResult);

// ---------------------------------------------------------------------------
// Formatters for raw texts, independent of any packet. Each returns the
// empty string when the text cannot be read, and never throws.

// An XMP date, time or date-time in the medium style of the application
// language, shown in the local time zone. A value with a zone is converted
// from that zone; a date-time without a zone is taken as UTC; a date alone
// is shown as that calendar date.
OVRAMETADATA_EXPORT UTF8String FormatDate(const UTF8String& value);

// "numerator/denominator" as a decimal number with `decimals` places.
// Empty for a text without "/", with an empty part, or with denominator 0.
OVRAMETADATA_EXPORT UTF8String FormatRational(const UTF8String& value, unsigned long decimals);

// An EXIF GPS coordinate ("37,46.5N" or "122,25,10W") as degrees, minutes
// and seconds with their marks, followed by the direction letter. Degrees
// and minutes above 255 are shown as 255. A coordinate of zero gives "0°"
// without direction.
OVRAMETADATA_EXPORT UTF8String FormatGPSCoordinate(const UTF8String& value);

}  // namespace ovrametadata
