// ovracore: resources compiled into a module (see cmake/EmbedResources.cmake).
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include <ovracore/Strings.h>

namespace ovracore {

struct EmbeddedResource {
  const char* name;            // file title, e.g. "dc_definitions"
  const char* type;            // file extension without dot, e.g. "xml"
  const unsigned char* data;
  std::size_t size;
};

// A module's resources. Built from a table that ends with a null name.
class ResourceTable {
 public:
  explicit ResourceTable(const EmbeddedResource* entries);
  // Names of every resource of a type, in table order.
  std::vector<UTF8String> List(std::string_view type) const;
  // The bytes of a resource; absent when there is none of that name and type.
  std::optional<std::string_view> Read(std::string_view name, std::string_view type) const;

 private:
  std::vector<EmbeddedResource> mEntries;
};

}  // namespace ovracore
