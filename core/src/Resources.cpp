#include <ovracore/Resources.h>

namespace ovracore {

ResourceTable::ResourceTable(const EmbeddedResource* entries) {
  for (const EmbeddedResource* e = entries; e && e->name; ++e) {
    if (e->type && e->data) mEntries.push_back(*e);
  }
}

std::vector<UTF8String> ResourceTable::List(std::string_view type) const {
  std::vector<UTF8String> names;
  for (const EmbeddedResource& e : mEntries)
    if (type == e.type) names.emplace_back(e.name);
  return names;
}

std::optional<std::string_view> ResourceTable::Read(std::string_view name, std::string_view type) const {
  for (const EmbeddedResource& e : mEntries) {
    if (name == e.name && type == e.type)
      return std::string_view(reinterpret_cast<const char*>(e.data), e.size);
  }
  return std::nullopt;
}

}  // namespace ovracore
