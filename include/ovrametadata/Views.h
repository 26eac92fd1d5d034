// ovrametadata: views, the named layouts from which a host builds its
// metadata panels, their registry, their file format and the walk over a
// view for the host's builder.
#pragma once

#include <cstdint>
#include <map>
#include <vector>

#include <boost/shared_ptr.hpp>

#include <ovrametadata/Common.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Export.h>
#include <ovrametadata/Extensions.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

// One entry of a view: a property, a structure field, or a widget of its own
// (section, separator, note, formatter).
struct OVRAMETADATA_EXPORT ViewItem {
  ViewItem() = default;
  explicit ViewItem(Path path);
  explicit ViewItem(QualifiedName name);
  explicit ViewItem(UTF8String widget);

  void AddItem(boost::shared_ptr<ViewItem> item);
  Path GetPath() const;
  // The item's own text, localised when it is a localisation key, or else
  // the localised text of its property's definition; empty when neither.
  UTF16String GetLabel() const;
  UTF16String GetDescription() const;

  // The property the item stands for: namespace URI in `prefix`, local name.
  QualifiedName qualifiedName;
  Path path;
  // Empty: the host picks the widget from the property's type.
  UTF8String widget;
  UTF8String label;
  UTF8String description;
  std::vector<boost::shared_ptr<ViewItem>> items;
  // Free parameters for the host's widget.
  std::map<UTF8String, UTF8String> params;
  std::vector<boost::shared_ptr<ChoiceDefinition>> choices;
};

struct OVRAMETADATA_EXPORT ViewDefinition {
  ViewDefinition() = default;

  UTF8String name;
  UTF8String label;
  UTF8String description;
  std::vector<boost::shared_ptr<ViewItem>> items;
  // Carried for the host, which decides what hiding empty items means.
  bool pruneEmptyProperties = false;
};

using ViewItemPtr = boost::shared_ptr<ViewItem>;
using ViewDefinitionPtr = boost::shared_ptr<ViewDefinition>;

// Implemented by the host: BuildView calls it once per view and once per
// top-level item; the builder descends into nested items itself.
class OVRAMETADATA_EXPORT ViewBuilderInterface {
 public:
  struct ViewInfo {
    UTF8String name;
    UTF8String label;
    UTF8String description;
    std::uint64_t itemCount = 0;
    bool pruneEmptyProperties = false;
  };

  virtual void BeginView(const ViewInfo& info) = 0;
  virtual void EndView(const ViewDefinition& definition) = 0;
  virtual void BuildItem(const boost::shared_ptr<ViewItem>& item) = 0;
  virtual ~ViewBuilderInterface();
};

// ---- The registered views (filled at start-up; read-only afterwards) ----

// Every registered view, in registration order.
OVRAMETADATA_EXPORT Range<ViewDefinitionPtr> CommonViewDefinitions();
// The first registered view of exactly that name, or null.
OVRAMETADATA_EXPORT ViewDefinitionPtr GetViewDefinitionForName(const UTF8String& name);
// Registers a view. False for null and for a name already registered (the
// first one stays; the duplicate is reported with `source` as context).
OVRAMETADATA_EXPORT bool AddViewDefinition(ViewDefinitionPtr def, UTF16String source);
// The source a registered view came with (a resource name or a file's path);
// empty for a view that is not registered.
OVRAMETADATA_EXPORT UTF16String ViewDefinitionSource(const ViewDefinitionPtr& def);
// Walks def for builder: BeginView, BuildItem per top-level item, EndView.
// Nothing happens for null.
OVRAMETADATA_EXPORT void BuildView(ViewDefinitionPtr def, ViewBuilderInterface& builder);

// ---- View definitions files ----
// Problems are reported through SendError with `source` (or the path) as
// context; the views completed before a fault are returned all the same.
OVRAMETADATA_EXPORT std::vector<ViewDefinitionPtr> ParseViewDefinitionsFromBuffer(
    const UTF8String& buffer, const UTF16String& source);
OVRAMETADATA_EXPORT std::vector<ViewDefinitionPtr> ParseViewDefinitionsFromDocument(
    const UTF16String& path);
// Registers the built-in views and those of extension packages; only the
// first call after start-up does anything.
OVRAMETADATA_EXPORT void LoadAllViewDefinitions();
// True when a resource name is not that of a view file ("NAME_view.EXT").
OVRAMETADATA_EXPORT bool IsNotViewDefinition(const UTF16String& resourceName);

// ---- Writing view files ----

// What the file writer hands to the writer of each property.
struct ViewDefinitionWriterInfo {
  UTF16String viewName;
  UTF16String viewLabel;
  UTF16String viewDescription;
  UTF16String localizationFile;
  UTF8String currentPrefix;               // of the schema being written
  UTF16String currentSectionLabel;        // its label as written
  UTF16String currentSectionDescription;  // its description as written
  std::vector<SchemaDefinitionPtr> baseSchemas;
};

// Writes one view (named, labelled and described by the manifest) that shows
// every property of schemas, a section per labelled schema. A property is
// written by its name alone unless it differs from the registered
// definition (or, for an unregistered namespace, from the base schemas).
// False only when the folder cannot be made; an empty list writes the
// declaration alone.
OVRAMETADATA_EXPORT bool WriteViewDefinitionsFileFromSchema(const std::vector<SchemaDefinitionPtr>& schemas,
                                                            const std::vector<SchemaDefinitionPtr>& baseSchemas,
                                                            const GenericPanelManifestParser::ManifestInfo& manifest,
                                                            const UTF16String& path);

}  // namespace ovrametadata
