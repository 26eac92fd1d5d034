// ovrapanel: one tab, built from a registered view through the library's
// view walk.
#pragma once

#include <functional>
#include <memory>
#include <vector>

#include <QString>
#include <QStringList>

#include <ovrametadata/ovrametadata.h>

#include "Fields.h"

class QFormLayout;
class QWidget;

namespace ovrapanel {

struct BuiltPage {
  QWidget* widget = nullptr;  // the page, ready to go into a tab
  QString label;
  QString description;
  std::vector<std::unique_ptr<Field>> fields;
};

// Recent values by property name ("dc:title").
using RecentValues = std::function<QStringList(const QString& name)>;

// Builds the page of view for the packet of provider (whose answers decide
// which values are writable).
BuiltPage BuildPage(const ovrametadata::ViewDefinitionPtr& view,
                    const boost::shared_ptr<ovrametadata::MetaDataProvider>& provider, XMPMetaRef xmp,
                    const RecentValues& recent);

// A localisation key ("$$$/key=Text") or a plain text, localised.
QString Localized(const ovrametadata::UTF8String& text);

}  // namespace ovrapanel
