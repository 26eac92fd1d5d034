// Private to the ovrameta tool (not part of the library's interface):
// metadata shown through the library's views, as a host's panel lays it out.
#pragma once

#include <iosfwd>
#include <set>
#include <string>
#include <vector>

#include <boost/shared_ptr.hpp>

#include <ovrametadata/ovrametadata.h>

#include "Reading.h"

namespace ovrameta {

// Loads the registered views and extension packages once. Their problems
// are printed as warnings unless quiet; either way they are returned.
std::vector<ovrametadata::ErrorInfo> LoadViews(bool quiet = false);

// The views `show` uses when none is named: the built-in ones in the order a
// panel reads best, then every other registered view.
std::vector<ovrametadata::ViewDefinitionPtr> ShownViews();

// Values already shown, by namespace URI and path description.
using ShownKeys = std::set<std::string>;
std::string ShownKey(const std::string& namespaceURI, const std::string& description);

// One view of a packet: headings for sections, nested items indented,
// separators and notes, labels from the view or the definitions, choices
// by their label, "(mixed)" where an aggregate's files differ. The view's
// own pruneEmptyProperties leaves out empty items and the sections left
// without values. Compact: only values, each once: empty items, notes and
// separators are left out, and so are values whose key is in shown; every
// value printed is added to it.
std::string ViewText(XMPMetaRef xmp, const ovrametadata::ViewDefinitionPtr& view);
std::string CompactViewText(XMPMetaRef xmp, const ovrametadata::ViewDefinitionPtr& view, ShownKeys& shown);

// The layout of a view, one item per line.
void PrintViewLayout(std::ostream& out, const ovrametadata::ViewDefinition& view);

// prefix:Name for a path of a registered schema.
std::string NameOfPath(const ovrametadata::Path& path);

}  // namespace ovrameta
