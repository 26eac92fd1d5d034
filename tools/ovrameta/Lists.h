// Private to the ovrameta tool (not part of the library's interface): the
// recently used values of set, and path lists (the fields a user chose).
#pragma once

#include <string>
#include <utility>
#include <vector>

#include <boost/shared_ptr.hpp>

#include <ovrametadata/ovrametadata.h>

namespace ovrameta {

// The tool keeps this many values per property, newest first.
constexpr std::size_t kRecentValues = 20;

// Adds each (name, value) to the front of its property's list and saves
// the file. Nothing is reported: a list that cannot be saved costs no edit.
void RecordRecentValues(const std::vector<std::pair<std::string, std::string>>& values);

// recent [NAME], recent --clear.
int RecentCommand(const std::string& name, bool clear);
// fields NAME...: a path list of every leaf below those properties.
int FieldsCommand(const std::vector<std::string>& names);

// Reads a path list; false (after a message on standard error) when the
// file cannot be read.
bool ReadFieldList(const std::string& file, std::vector<ovrametadata::Path>& paths);
// The values of those paths in the provider's packet, one per line.
std::string FieldsText(const boost::shared_ptr<ovrametadata::MetaDataProvider>& provider,
                       const std::vector<ovrametadata::Path>& paths);

}  // namespace ovrameta
