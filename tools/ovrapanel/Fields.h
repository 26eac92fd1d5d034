// ovrapanel: one editor per value of a panel. Each field reads its value
// from a packet, shows it in the widget its definition calls for, and writes
// it back only when the user edited it.
#pragma once

#include <memory>
#include <utility>
#include <vector>

#include <QObject>
#include <QString>
#include <QStringList>

#include <ovrametadata/ovrametadata.h>

class QWidget;

namespace ovrapanel {

enum class FieldKind {
  kText,          // line edit
  kMultiLine,     // text area
  kClosedChoice,  // combo box of labels
  kOpenChoice,    // editable combo box
  kBoolean,       // check box
  kInteger,       // spin box
  kReal,          // double spin box
  kDate,          // date-time editor
  kAltText,       // text with a language selector
  kList,          // item list editor (bag, seq)
  kStructArray,   // items of a top-level array of structures, each a group
  kReadOnly       // formatted display value
};

const char* FieldKindName(FieldKind kind);

// What a view item asks of a field beyond its definition.
struct FieldHints {
  bool multiLine = false;
  std::vector<boost::shared_ptr<ovrametadata::ChoiceDefinition>> choices;  // the view's own
  bool writable = true;  // the provider accepts writes to the path
};

// The kind of editor for a value; structures are not fields (the page shows
// them as groups), arrays of structures below the top level are read-only.
FieldKind KindOf(const ovrametadata::Path& path, const ovrametadata::EntryDefinition& entry,
                 const FieldHints& hints);

// Why the definitions refuse text for entry, or an empty string.
QString CheckText(const ovrametadata::EntryDefinition& entry, const QString& text);

// "dc:title", "Iptc4xmpCore:CreatorContactInfo/Iptc4xmpCore:CiAdrCity": the
// name the command-line tool uses, and the key of the recent values.
QString NameOfPath(const ovrametadata::Path& path);

class Field : public QObject {
  Q_OBJECT

 public:
  Field(ovrametadata::Path path, boost::shared_ptr<ovrametadata::EntryDefinition> entry, FieldKind kind,
        QString name);
  ~Field() override;

  QWidget* Widget() const { return mWidget; }
  FieldKind Kind() const { return mKind; }
  const QString& Name() const { return mName; }
  const ovrametadata::Path& GetPath() const { return mPath; }
  // An item added on save gets its index only then.
  void SetPath(ovrametadata::Path path) { mPath = std::move(path); }
  bool Edited() const { return mEdited; }
  bool Mixed() const { return mMixed; }
  // Something is stored (or differs between the files).
  bool HasValue() const { return mHasValue || mMixed; }
  // Why the edited value cannot be written; empty when it can.
  const QString& Problem() const { return mProblem; }

  // Writes the edited value into xmp; true when the packet changed there.
  virtual bool Write(XMPMetaRef xmp) = 0;
  // The paths to name to the update guard after a Write that changed xmp.
  virtual std::vector<ovrametadata::Path> ChangedPaths() const { return {mPath}; }
  // The texts to remember as recently used after a save.
  virtual QStringList RecentTexts() const { return {}; }

 signals:
  void Changed();

 protected:
  // Called by the widgets' signals (never while a value is being shown).
  void MarkEdited();
  virtual QString Check() const { return {}; }
  // Deletes what is stored (the edit emptied the field).
  bool Delete(XMPMetaRef xmp);

  ovrametadata::Path mPath;
  boost::shared_ptr<ovrametadata::EntryDefinition> mEntry;
  FieldKind mKind;
  QString mName;
  QWidget* mWidget = nullptr;
  bool mEdited = false;
  bool mMixed = false;
  bool mHasValue = false;
  QString mProblem;
};

// Makes the field for path, shows its value in xmp (an aggregate's "mixed"
// included) and gives it recent values to complete from.
std::unique_ptr<Field> MakeField(XMPMetaRef xmp, const ovrametadata::Path& path,
                                 const boost::shared_ptr<ovrametadata::EntryDefinition>& entry, FieldKind kind,
                                 const FieldHints& hints, const QStringList& recent);

// The display text of a value that is shown but not edited: choice labels,
// formatted dates and coordinates, constructed values, items of arrays of
// structures one per line. Empty when nothing is stored.
QString DisplayText(XMPMetaRef xmp, const ovrametadata::Path& path, const ovrametadata::EntryDefinition& entry,
                    bool* mixed = nullptr);

}  // namespace ovrapanel
