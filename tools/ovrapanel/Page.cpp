#include "Page.h"

#include <QFormLayout>
#include <QFrame>
#include <QGroupBox>
#include <QLabel>
#include <QScrollArea>
#include <QVBoxLayout>

namespace ovrapanel {

using namespace ovrametadata;

QString Localized(const UTF8String& text) {
  // Items localise their own text; the same goes for view labels.
  ViewItem item;
  item.label = text;
  return QString::fromStdU16String(item.GetLabel());
}

namespace {

QString Q(const UTF16String& text) { return QString::fromStdU16String(text); }

// The structure type of a value, null when it is not a structure.
TypeDefinitionPtr StructOf(const EntryDefinition& entry) {
  if (PrimitiveTypeOf(entry) || !entry.type || *entry.type == "date") return {};
  const auto type = TypeIdDefinition(*entry.type);
  return type && !type->fields.empty() ? type : TypeDefinitionPtr();
}

class PageBuilder : public ViewBuilderInterface {
 public:
  PageBuilder(const boost::shared_ptr<MetaDataProvider>& provider, XMPMetaRef xmp, const RecentValues& recent)
      : mProvider(provider), mXmp(xmp), mRecent(recent) {}

  void BeginView(const ViewInfo& info) override {
    mPage.label = Localized(info.label.empty() ? info.name : info.label);
    mPage.description = Localized(info.description);
    mPrune = info.pruneEmptyProperties;
    mBody = new QWidget;
    mForm = NewForm(mBody);
  }
  void BuildItem(const ViewItemPtr& item) override {
    if (item) Build(*item, mForm);
  }
  void EndView(const ViewDefinition&) override {
    if (mForm->rowCount() == 0) mForm->addRow(new QLabel(QStringLiteral("Nothing to show for this file.")));
    auto* scroll = new QScrollArea;
    scroll->setWidgetResizable(true);
    scroll->setFrameShape(QFrame::NoFrame);
    scroll->setWidget(mBody);
    mPage.widget = scroll;
    mPage.widget->setToolTip(mPage.description);
  }

  BuiltPage Take() { return std::move(mPage); }

 private:
  static QFormLayout* NewForm(QWidget* parent) {
    auto* form = new QFormLayout(parent);
    form->setFieldGrowthPolicy(QFormLayout::AllNonFixedFieldsGrow);
    form->setRowWrapPolicy(QFormLayout::DontWrapRows);
    return form;
  }

  // Builds one item into form; false when it added nothing that shows a
  // value (so that a pruned group can go).
  bool Build(const ViewItem& item, QFormLayout* form) {
    if (item.widget == "separator") {
      auto* line = new QFrame;
      line->setFrameShape(QFrame::HLine);
      line->setFrameShadow(QFrame::Sunken);
      form->addRow(line);
      return false;
    }
    if (item.widget == "note") {
      const QString text = Q(item.GetLabel());
      if (text.isEmpty()) return false;
      auto* note = new QLabel(text);
      note->setWordWrap(true);
      note->setEnabled(false);  // the palette's quieter text
      form->addRow(note);
      return false;
    }
    if (!item.path.description.empty()) return BuildProperty(item, item.path, form);
    return BuildGroup(Q(item.GetLabel()), Q(item.GetDescription()), item, nullptr, form);
  }

  // A section, or a structure whose fields the view lists (or, with type,
  // whose fields the definitions give).
  bool BuildGroup(const QString& label, const QString& description, const ViewItem& item,
                  const TypeDefinitionPtr& type, QFormLayout* form, const Path& parent = Path()) {
    QWidget* box = label.isEmpty() ? new QWidget : new QGroupBox(label);
    box->setToolTip(description);
    QFormLayout* inner = NewForm(box);
    if (label.isEmpty()) inner->setContentsMargins(0, 0, 0, 0);
    bool any = false;
    if (!item.items.empty()) {
      for (const ViewItemPtr& child : item.items)
        if (child) any = Build(*child, inner) || any;
    } else if (type) {
      for (const auto& field : type->fields) {
        Path fieldPath;
        try {
          fieldPath = CreatePathFromStructureField(parent, field);
        } catch (const std::exception&) {
          continue;  // a field the toolkit cannot address is left out
        }
        if (fieldPath.description.empty()) continue;
        ViewItem fieldItem(fieldPath);
        any = BuildProperty(fieldItem, fieldPath, inner) || any;
      }
    }
    if ((mPrune && !any) || inner->rowCount() == 0) {
      delete box;
      return false;
    }
    form->addRow(box);
    return any;
  }

  bool BuildProperty(const ViewItem& item, const Path& path, QFormLayout* form) {
    // What panels cannot show is left out, as the library asks.
    if (!IsPropertyUISupported(path)) return false;
    const auto entry = PathEntryDefinition(path);
    if (!entry) return false;
    QString label = Q(item.GetLabel());
    if (label.isEmpty()) label = NameOfPath(path);
    if (const auto type = StructOf(*entry))
      return BuildGroup(label, Q(item.GetDescription()), item, type, form, path);
    FieldHints hints;
    const auto* property = dynamic_cast<const PropertyDefinition*>(entry.get());
    hints.multiLine = item.widget == "multiline" || (property && property->uiHints && property->uiHints->multiLine);
    hints.choices = item.choices;
    hints.writable = mProvider && mProvider->QueryPathStatus(path, kPathStatusWritable);
    const FieldKind kind = KindOf(path, *entry, hints);
    std::unique_ptr<Field> field = MakeField(mXmp, path, entry, kind, hints, mRecent ? mRecent(NameOfPath(path)) : QStringList());
    if (mPrune && !field->HasValue()) return false;
    const QString tip = Q(item.GetDescription());
    if (!tip.isEmpty()) field->Widget()->setToolTip(tip);
    auto* name = new QLabel(label + ':');
    name->setToolTip(NameOfPath(path));
    name->setBuddy(field->Widget());
    form->addRow(name, field->Widget());
    mPage.fields.push_back(std::move(field));
    return true;
  }

  boost::shared_ptr<MetaDataProvider> mProvider;
  XMPMetaRef mXmp;
  RecentValues mRecent;
  BuiltPage mPage;
  bool mPrune = false;
  QWidget* mBody = nullptr;
  QFormLayout* mForm = nullptr;
};

}  // namespace

BuiltPage BuildPage(const ViewDefinitionPtr& view, const boost::shared_ptr<MetaDataProvider>& provider, XMPMetaRef xmp,
                    const RecentValues& recent) {
  PageBuilder builder(provider, xmp, recent);
  BuildView(view, builder);
  return builder.Take();
}

}  // namespace ovrapanel
