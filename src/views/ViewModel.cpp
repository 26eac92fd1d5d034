// The view model, the registry of views and the walk over a view.
#include <utility>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Views.h>

#include "views/ViewsInternal.h"

namespace ovrametadata {

namespace {

// Filled at start-up, read afterwards; a host that registers views later
// must not let that overlap with lookups, hence no lock.
std::vector<ViewDefinitionPtr> sViewDefinitions;
// Where each view came from, by position in the list.
std::vector<UTF16String> sViewSources;

UTF16String ItemText(const UTF8String& own, const Path& path, UTF16String LocalizedDefinition::*field) {
  if (!own.empty()) return ovracore::ZString(own);
  const boost::shared_ptr<EntryDefinition> entry = PathEntryDefinition(path);
  return entry ? (*entry).*field : UTF16String();
}

}  // namespace

ViewItem::ViewItem(Path path) : path(std::move(path)) {}
ViewItem::ViewItem(QualifiedName name) : qualifiedName(std::move(name)) {}
ViewItem::ViewItem(UTF8String widget) : widget(std::move(widget)) {}

void ViewItem::AddItem(boost::shared_ptr<ViewItem> item) { items.push_back(std::move(item)); }

Path ViewItem::GetPath() const { return path; }

UTF16String ViewItem::GetLabel() const { return ItemText(label, path, &LocalizedDefinition::label); }

UTF16String ViewItem::GetDescription() const {
  return ItemText(description, path, &LocalizedDefinition::description);
}

ViewBuilderInterface::~ViewBuilderInterface() = default;

Range<ViewDefinitionPtr> CommonViewDefinitions() { return Range<ViewDefinitionPtr>(sViewDefinitions); }

ViewDefinitionPtr GetViewDefinitionForName(const UTF8String& name) {
  for (const ViewDefinitionPtr& view : sViewDefinitions)
    if (view->name == name) return view;
  return {};
}

bool AddViewDefinition(ViewDefinitionPtr def, UTF16String source) {
  if (!def) return false;
  if (GetViewDefinitionForName(def->name)) {
    SendError(kViewDefinitionRegistrationError,
              ovracore::ZString("$$$/ovrametadata/ViewDefinitions/DuplicateViewDefinition=View definition for "
                                "#{quot}@0#{quot} already exists.",
                                {def->name}),
              source);
    return false;
  }
  sViewDefinitions.push_back(std::move(def));
  sViewSources.push_back(std::move(source));
  return true;
}

UTF16String ViewDefinitionSource(const ViewDefinitionPtr& def) {
  for (std::size_t i = 0; i < sViewDefinitions.size(); ++i)
    if (sViewDefinitions[i] == def) return sViewSources[i];
  return {};
}

void BuildView(ViewDefinitionPtr def, ViewBuilderInterface& builder) {
  if (!def) return;
  ViewBuilderInterface::ViewInfo info;
  info.name = def->name;
  info.label = def->label;
  info.description = def->description;
  info.itemCount = def->items.size();
  info.pruneEmptyProperties = def->pruneEmptyProperties;
  builder.BeginView(info);
  for (const ViewItemPtr& item : def->items) builder.BuildItem(item);
  builder.EndView(*def);
}

void ClearViewDefinitions() {
  sViewDefinitions.clear();
  sViewSources.clear();
  ResetViewLoadCount();
}

}  // namespace ovrametadata
