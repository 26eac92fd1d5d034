// ovrametadata: types shared by every part of the interface.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include <boost/range/any_range.hpp>

#include <ovrametadata/Export.h>
#include <ovrametadata/XMPMetaRef.h>

namespace ovrametadata {

using UTF8String = std::string;     // XMP names, type ids and values
using UTF16String = std::u16string; // display texts and file paths
using ::XMPMetaRef;
using ::XMP_FileFormat;

// Type-erased bidirectional range, used wherever the interface hands out or
// takes a sequence (paths, providers, schemas, types).
template <class T>
using Range = boost::any_range<T, boost::bidirectional_traversal_tag, T, std::ptrdiff_t>;

}  // namespace ovrametadata
