#include "Fields.h"

#include <charconv>
#include <climits>
#include <cmath>
#include <algorithm>
#include <set>

#include <QCheckBox>
#include <QComboBox>
#include <QCompleter>
#include <QDateTimeEdit>
#include <QDoubleSpinBox>
#include <QEvent>
#include <QFormLayout>
#include <QGroupBox>
#include <QHBoxLayout>
#include <QLabel>
#include <QLineEdit>
#include <QListWidget>
#include <QPlainTextEdit>
#include <QPushButton>
#include <QRegularExpression>
#include <QSignalBlocker>
#include <QSpinBox>
#include <QToolButton>
#include <QVBoxLayout>

namespace ovrapanel {

using namespace ovrametadata;

namespace {

const QString kMixed = QStringLiteral("(mixed)");

QString Q(const UTF8String& text) { return QString::fromStdString(text); }
QString Q(const UTF16String& text) { return QString::fromStdU16String(text); }
UTF8String U(const QString& text) { return text.toStdString(); }

const std::vector<boost::shared_ptr<ChoiceDefinition>>& ChoicesOf(const EntryDefinition& entry) {
  if (!entry.constraints.choices.empty() || !entry.type) return entry.constraints.choices;
  if (const auto type = TypeIdDefinition(*entry.type)) return type->constraints.choices;
  return entry.constraints.choices;
}

std::vector<boost::shared_ptr<ChoiceDefinition>> ChoicesFor(const EntryDefinition& entry, const FieldHints& hints) {
  return hints.choices.empty() ? ChoicesOf(entry) : hints.choices;
}

QString ChoiceLabel(const ChoiceDefinition& choice) {
  return choice.label.empty() ? Q(choice.rawValue) : Q(choice.label);
}

// The choice a stored value stands for: the same text, or the same number
// written another way ("5.0" for "5").
int FindChoice(const std::vector<boost::shared_ptr<ChoiceDefinition>>& choices, const QString& value) {
  for (std::size_t i = 0; i < choices.size(); ++i)
    if (choices[i] && Q(choices[i]->rawValue) == value) return static_cast<int>(i);
  bool isNumber = false;
  const double number = value.toDouble(&isNumber);
  for (std::size_t i = 0; isNumber && i < choices.size(); ++i) {
    bool ok = false;
    if (choices[i] && Q(choices[i]->rawValue).toDouble(&ok) == number && ok) return static_cast<int>(i);
  }
  return -1;
}

boost::optional<PrimitiveType> ElementKind(const EntryDefinition& entry) {
  const auto element = ElementTypeIdOf(entry);
  return element ? PrimitiveTypeOf(*element) : boost::none;
}

// What a stored text reads as, with its outcome.
QString ReadText(XMPMetaRef xmp, const Path& path, GetValueResult& result) {
  UTF8String text;
  result = ValueAbsent;
  GetValue(xmp, path, text, &result);
  return result == ValueFound ? Q(text) : QString();
}

QString ShortestNumber(double value) {
  char buffer[64];
  const auto end = std::to_chars(buffer, buffer + sizeof buffer, value).ptr;
  return QString::fromLatin1(buffer, static_cast<int>(end - buffer));
}

// Constraints of the entry, else of its registered type.
template <class T>
boost::optional<T> Limit(const EntryDefinition& entry, boost::optional<T> EntryConstraints::*member) {
  if (entry.constraints.*member) return entry.constraints.*member;
  if (entry.type)
    if (const auto type = TypeIdDefinition(*entry.type)) return type->constraints.*member;
  return boost::none;
}

QString Bounds(const EntryDefinition& limits, double number, const QString& text) {
  const auto min = Limit(limits, &EntryConstraints::min);
  const auto max = Limit(limits, &EntryConstraints::max);
  if (min && number < *min) return QStringLiteral("%1 is below %2").arg(text, ShortestNumber(*min));
  if (max && number > *max) return QStringLiteral("%1 is above %2").arg(text, ShortestNumber(*max));
  return {};
}

QString CheckScalar(const std::string& typeId, const EntryDefinition& limits, const QString& text) {
  static const QRegularExpression date(
      "^\\d{4}(-\\d{2}(-\\d{2}(T\\d{2}:\\d{2}(:\\d{2}(\\.\\d+)?)?(Z|[+-]\\d{2}:\\d{2})?)?)?)?$");
  static const QRegularExpression rational("^[+-]?\\d+/0*[1-9]\\d*$");
  static const QRegularExpression gps("^\\d{1,3},\\d{1,2}(\\.\\d+|,\\d{1,2}(\\.\\d+)?)?[NSEW]$");
  static const QRegularExpression integer("^[+-]?\\d+$");
  if (typeId == "date" && !date.match(text).hasMatch()) return text + " is not a date (2024-05-01T14:30:00)";
  if (typeId == "rational" && !rational.match(text).hasMatch()) return text + " is not a fraction (1/250)";
  if (typeId == "gpscoordinate" && !gps.match(text).hasMatch())
    return text + " is not a coordinate (37,46.5N)";
  if (const auto pattern = Limit(limits, &EntryConstraints::pattern)) {
    const QRegularExpression shape(QRegularExpression::anchoredPattern(Q(*pattern)));
    if (shape.isValid() && !shape.match(text).hasMatch()) return text + " does not have the form " + Q(*pattern);
  }
  const auto kind = PrimitiveTypeOf(typeId);
  if (!kind) return {};
  bool ok = false;
  switch (*kind) {
    case kPrimitiveType_integer:
      if (!integer.match(text).hasMatch()) return text + " is not a whole number";
      return Bounds(limits, text.toDouble(), text);
    case kPrimitiveType_real: {
      const double number = text.toDouble(&ok);
      if (!ok || !std::isfinite(number)) return text + " is not a number";
      return Bounds(limits, number, text);
    }
    case kPrimitiveType_boolean:
      return text == "True" || text == "False" ? QString() : text + " is not True or False";
    default:
      return {};
  }
}

// An item is written in quotes when it holds the separator, a quote or
// blanks at its ends, so that it comes back as one item.
QString JoinItems(const QStringList& items) {
  QStringList parts;
  for (const QString& item : items) {
    const bool quote = item.contains(';') || item.contains('"') || item.trimmed() != item;
    parts << (quote ? '"' + QString(item).replace("\"", "\"\"") + '"' : item);
  }
  return parts.join("; ");
}

// The background that marks a value the definitions refuse.
const char kInvalidStyle[] =
    "QLineEdit, QPlainTextEdit, QComboBox, QListWidget, QAbstractSpinBox { background: #ffd6d6; }";

}  // namespace

const char* FieldKindName(FieldKind kind) {
  switch (kind) {
    case FieldKind::kText: return "text";
    case FieldKind::kMultiLine: return "multiline";
    case FieldKind::kClosedChoice: return "closedchoice";
    case FieldKind::kOpenChoice: return "openchoice";
    case FieldKind::kBoolean: return "boolean";
    case FieldKind::kInteger: return "integer";
    case FieldKind::kReal: return "real";
    case FieldKind::kDate: return "date";
    case FieldKind::kAltText: return "alt";
    case FieldKind::kList: return "list";
    case FieldKind::kStructArray: return "structarray";
    case FieldKind::kReadOnly: return "readonly";
  }
  return "";
}

QString NameOfPath(const Path& path) {
  const auto schema = NamespaceDefinition(path.namespaceURI);
  return schema ? Q(schema->prefix) + ':' + Q(path.description) : Q(path.description);
}

FieldKind KindOf(const Path& path, const EntryDefinition& entry, const FieldHints& hints) {
  if (path.internal || !hints.writable) return FieldKind::kReadOnly;
  if (entry.type && *entry.type == "date") return FieldKind::kDate;
  const auto primitive = PrimitiveTypeOfPath(path);
  if (!primitive) return FieldKind::kReadOnly;
  const bool choices = !ChoicesFor(entry, hints).empty();
  const auto scalar = [&](PrimitiveType kind) {
    switch (kind) {
      case kPrimitiveType_integer: return choices ? FieldKind::kOpenChoice : FieldKind::kInteger;
      case kPrimitiveType_real: return choices ? FieldKind::kOpenChoice : FieldKind::kReal;
      case kPrimitiveType_boolean: return choices ? FieldKind::kClosedChoice : FieldKind::kBoolean;
      default: break;
    }
    if (choices) return FieldKind::kOpenChoice;
    const auto* property = dynamic_cast<const PropertyDefinition*>(&entry);
    const bool multiLine = hints.multiLine || (property && property->uiHints && property->uiHints->multiLine);
    return multiLine ? FieldKind::kMultiLine : FieldKind::kText;
  };
  switch (*primitive) {
    case kPrimitiveType_bag:
    case kPrimitiveType_seq: {
      // Items that are structures are edited as groups where the library
      // adds and deletes items (top-level arrays), else only shown.
      const auto element = PropertyTypeOf(entry);
      if (!element || element->fields.empty()) return FieldKind::kList;
      return path.parent_id == path.namespaceURI ? FieldKind::kStructArray : FieldKind::kReadOnly;
    }
    case kPrimitiveType_alt: return FieldKind::kAltText;
    case kPrimitiveType_closedchoice:
    case kPrimitiveType_openchoice: {
      if (choices) return *primitive == kPrimitiveType_closedchoice ? FieldKind::kClosedChoice : FieldKind::kOpenChoice;
      // A choice without a list: its element type decides.
      const auto element = ElementKind(entry);
      return scalar(element ? *element : kPrimitiveType_text);
    }
    default: return scalar(*primitive);
  }
}

QString CheckText(const EntryDefinition& entry, const QString& text) {
  if (text.isEmpty()) return {};
  const std::string typeId = entry.type ? *entry.type : std::string("text");
  const auto primitive = PrimitiveTypeOf(entry);
  if (typeId == "date" || !primitive) return CheckScalar(typeId, entry, text);
  const auto element = ElementTypeIdOf(entry);
  switch (*primitive) {
    case kPrimitiveType_closedchoice:
      if (!ChoicesOf(entry).empty()) {
        for (const auto& choice : ChoicesOf(entry))
          if (choice && Q(choice->rawValue) == text) return {};
        return text + " is not one of the allowed values";
      }
      [[fallthrough]];
    case kPrimitiveType_openchoice:
    case kPrimitiveType_bag:
    case kPrimitiveType_seq: {
      if (!element) return {};
      const auto type = TypeIdDefinition(*element);
      return CheckScalar(*element, type ? static_cast<const EntryDefinition&>(*type) : entry, text);
    }
    case kPrimitiveType_alt: return {};
    default: return CheckScalar(typeId, entry, text);
  }
}

QString DisplayText(XMPMetaRef xmp, const Path& path, const EntryDefinition& entry, bool* mixed) {
  if (mixed) *mixed = false;
  const auto element = PropertyTypeOf(entry);
  const auto primitive = PrimitiveTypeOf(entry);
  const bool array = primitive && (*primitive == kPrimitiveType_bag || *primitive == kPrimitiveType_seq);
  if (array && element && !element->fields.empty()) {
    // One line per item: its fields as "Label: value".
    QStringList lines;
    for (int index = 1; index <= 10000; ++index) {
      Path item;
      try {
        item = CreatePathFromArrayItem(path, index);
      } catch (const std::exception&) {
        break;
      }
      if (item.description.empty() || !HasValue(xmp, item)) break;
      QStringList parts;
      for (const auto& field : element->fields) {
        Path fieldPath;
        try {
          fieldPath = CreatePathFromArrayedStructureField(item, field);
        } catch (const std::exception&) {
          continue;
        }
        const auto fieldEntry = fieldPath.description.empty() ? nullptr : PathEntryDefinition(fieldPath);
        const QString text = fieldEntry ? DisplayText(xmp, fieldPath, *fieldEntry) : QString();
        if (!text.isEmpty()) parts << (field->label.empty() ? Q(field->name) : Q(field->label)) + ": " + text;
      }
      lines << QStringLiteral("%1. %2").arg(index).arg(parts.join(", "));
    }
    return lines.join('\n');
  }
  GetValueResult result = ValueAbsent;
  QString text = ReadText(xmp, path, result);
  if (result == ValueMixed) {
    if (mixed) *mixed = true;
    return kMixed;
  }
  if (result != ValueFound) {
    UTF8String constructed;
    if (!path.internal || !GetConstructedValue(xmp, path, constructed, nullptr)) return {};
    text = Q(constructed);
  }
  const auto& choices = ChoicesOf(entry);
  const int choice = FindChoice(choices, text);
  if (choice >= 0) return ChoiceLabel(*choices[static_cast<std::size_t>(choice)]);
  // The library formats internal values itself; editorial dates and
  // coordinates are formatted here.
  if (!path.internal && entry.type && (*entry.type == "date" || *entry.type == "gpscoordinate")) {
    const UTF8String formatted = FormatValue(xmp, path, U(text));
    if (!formatted.empty()) return Q(formatted);
  }
  return text;
}

// ---------------------------------------------------------------------------
// Field

Field::Field(Path path, boost::shared_ptr<EntryDefinition> entry, FieldKind kind, QString name)
    : mPath(std::move(path)), mEntry(std::move(entry)), mKind(kind), mName(std::move(name)) {}

Field::~Field() = default;

void Field::MarkEdited() {
  mEdited = true;
  const QString problem = Check();
  if (problem != mProblem && mWidget) {
    mWidget->setStyleSheet(problem.isEmpty() ? QString() : QString(kInvalidStyle));
    mWidget->setToolTip(problem.isEmpty() ? (mEntry ? Q(mEntry->description) : QString()) : problem);
  }
  mProblem = problem;
  emit Changed();
}

bool Field::Delete(XMPMetaRef xmp) { return HasValue() && DeleteValue(xmp, mPath); }

namespace {

void AttachCompleter(QLineEdit* line, const QStringList& recent) {
  if (recent.isEmpty()) return;
  auto* completer = new QCompleter(recent, line);
  completer->setCaseSensitivity(Qt::CaseInsensitive);
  completer->setFilterMode(Qt::MatchContains);
  line->setCompleter(completer);
}

class TextField : public Field {
 public:
  TextField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry, FieldKind kind,
            const QStringList& recent)
      : Field(path, entry, kind, NameOfPath(path)) {
    GetValueResult result;
    const QString text = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    if (kind == FieldKind::kMultiLine) {
      mArea = new QPlainTextEdit(text);
      mArea->setTabChangesFocus(true);
      mArea->setFixedHeight(mArea->fontMetrics().lineSpacing() * 4 + 12);
      if (mMixed) mArea->setPlaceholderText(kMixed);
      connect(mArea, &QPlainTextEdit::textChanged, this, &TextField::MarkEdited);
      mWidget = mArea;
    } else {
      mLine = new QLineEdit(text);
      if (mMixed) mLine->setPlaceholderText(kMixed);
      AttachCompleter(mLine, recent);
      connect(mLine, &QLineEdit::textEdited, this, &TextField::MarkEdited);
      // A completion picked from the list is an edit too.
      connect(mLine, &QLineEdit::editingFinished, this, [this] {
        if (mLine->isModified()) MarkEdited();
      });
      mWidget = mLine;
    }
  }

  QString Text() const { return mArea ? mArea->toPlainText() : mLine->text(); }
  bool Write(XMPMetaRef xmp) override {
    const QString text = Text();
    return text.isEmpty() ? Delete(xmp) : SetValue(xmp, mPath, U(text));
  }
  QStringList RecentTexts() const override { return Text().isEmpty() ? QStringList() : QStringList{Text()}; }

 protected:
  QString Check() const override { return CheckText(*mEntry, Text()); }

 private:
  QLineEdit* mLine = nullptr;
  QPlainTextEdit* mArea = nullptr;
};

class ChoiceField : public Field {
 public:
  ChoiceField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry, FieldKind kind,
              const FieldHints& hints)
      : Field(path, entry, kind, NameOfPath(path)), mChoices(ChoicesFor(*entry, hints)) {
    mCombo = new QComboBox;
    const bool open = kind == FieldKind::kOpenChoice;
    mCombo->setEditable(open);
    if (!open) mCombo->addItem(QString(), QString());  // no value
    for (const auto& choice : mChoices)
      if (choice) mCombo->addItem(ChoiceLabel(*choice), Q(choice->rawValue));
    GetValueResult result;
    const QString text = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    const int found = FindChoice(mChoices, text);
    if (mMixed) {
      mCombo->setCurrentIndex(-1);
      if (open) {
        mCombo->setEditText(QString());
        mCombo->lineEdit()->setPlaceholderText(kMixed);
      } else {
        mCombo->setPlaceholderText(kMixed);
      }
    } else if (!mHasValue) {
      mCombo->setCurrentIndex(open ? -1 : 0);
      if (open) mCombo->setEditText(QString());
    } else if (found >= 0) {
      mCombo->setCurrentIndex(mCombo->findData(Q(mChoices[static_cast<std::size_t>(found)]->rawValue)));
    } else if (open) {
      mCombo->setCurrentIndex(-1);
      mCombo->setEditText(text);
    } else {
      // Shown as stored, so that nothing is hidden; kept unless changed.
      mCombo->addItem(text, text);
      mCombo->setCurrentIndex(mCombo->count() - 1);
    }
    connect(mCombo, qOverload<int>(&QComboBox::activated), this, &ChoiceField::MarkEdited);
    if (open) connect(mCombo->lineEdit(), &QLineEdit::textEdited, this, &ChoiceField::MarkEdited);
    mWidget = mCombo;
  }

  // The stored form of what is shown: a choice's raw value for its label.
  QString Value() const {
    if (mCombo->isEditable()) {
      const QString text = mCombo->currentText();
      for (const auto& choice : mChoices)
        if (choice && ChoiceLabel(*choice) == text) return Q(choice->rawValue);
      return text;
    }
    return mCombo->currentData().toString();
  }
  bool Write(XMPMetaRef xmp) override {
    const QString value = Value();
    return value.isEmpty() ? Delete(xmp) : SetValue(xmp, mPath, U(value));
  }
  QStringList RecentTexts() const override { return Value().isEmpty() ? QStringList() : QStringList{Value()}; }

 protected:
  QString Check() const override {
    const QString value = Value();
    if (mKind == FieldKind::kClosedChoice && !value.isEmpty() && FindChoice(mChoices, value) < 0)
      return value + " is not one of the allowed values";
    return CheckText(*mEntry, value);
  }

 private:
  std::vector<boost::shared_ptr<ChoiceDefinition>> mChoices;
  QComboBox* mCombo = nullptr;
};

class BoolField : public Field {
 public:
  BoolField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry)
      : Field(path, entry, FieldKind::kBoolean, NameOfPath(path)) {
    GetValueResult result;
    const QString text = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    mBox = new QCheckBox;
    mBox->setTristate(mMixed);
    mBox->setCheckState(mMixed ? Qt::PartiallyChecked
                               : text.compare("True", Qt::CaseInsensitive) == 0 ? Qt::Checked : Qt::Unchecked);
    if (mMixed) mBox->setText(kMixed);
    connect(mBox, &QCheckBox::clicked, this, [this] {
      // Once clicked, the value is the same in every file.
      mBox->setTristate(false);
      mBox->setText(QString());
      MarkEdited();
    });
    mWidget = mBox;
  }
  bool Write(XMPMetaRef xmp) override {
    return mBox->checkState() != Qt::PartiallyChecked && SetValue(xmp, mPath, mBox->checkState() == Qt::Checked);
  }

 private:
  QCheckBox* mBox = nullptr;
};

// A double spin box that shows numbers as they are written, without
// trailing zeros.
class NumberSpin : public QDoubleSpinBox {
 public:
  QString textFromValue(double value) const override { return ShortestNumber(value); }
};

class NumberField : public Field {
 public:
  NumberField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry, FieldKind kind)
      : Field(path, entry, kind, NameOfPath(path)) {
    GetValueResult result;
    const QString text = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    const auto min = Limit(*entry, &EntryConstraints::min);
    const auto max = Limit(*entry, &EntryConstraints::max);
    const bool integer = kind == FieldKind::kInteger;
    const double limit = integer ? INT_MAX - 1 : 1e15;
    double low = min ? std::max(*min, -limit) : -limit;
    double high = max ? std::min(*max, limit) : limit;
    bool parsed = false;
    const double value = text.toDouble(&parsed);
    parsed = parsed && std::isfinite(value) && std::abs(value) <= limit && (!integer || value == std::floor(value));
    // A stored value beyond the limits is shown as it is (and refused
    // only when edited).
    if (parsed) low = std::min(low, value), high = std::max(high, value);
    if (integer) low = std::ceil(low), high = std::floor(high);
    // One below the lowest value stands for "no value".
    mNone = low - 1;
    if (integer) {
      mInt = new QSpinBox;
      mInt->setRange(static_cast<int>(mNone), static_cast<int>(high));
      mSpin = mInt;
    } else {
      mReal = new NumberSpin;
      mReal->setDecimals(10);
      mReal->setRange(mNone, high);
      mSpin = mReal;
    }
    mSpin->setLocale(QLocale::c());
    mSpin->setSpecialValueText(mMixed ? kMixed : (mHasValue && !parsed) ? text : QStringLiteral(" "));
    SetNumber(mHasValue && parsed ? value : mNone);
    if (mInt) connect(mInt, qOverload<int>(&QSpinBox::valueChanged), this, &NumberField::MarkEdited);
    if (mReal) connect(mReal, qOverload<double>(&QDoubleSpinBox::valueChanged), this, &NumberField::MarkEdited);
    mWidget = mSpin;
  }

  double Number() const { return mInt ? mInt->value() : mReal->value(); }
  void SetNumber(double value) {
    if (mInt) mInt->setValue(static_cast<int>(value));
    if (mReal) mReal->setValue(value);
  }
  QString Text() const {
    if (Number() == mNone) return {};
    return mInt ? QString::number(mInt->value()) : ShortestNumber(mReal->value());
  }
  bool Write(XMPMetaRef xmp) override {
    const QString text = Text();
    return text.isEmpty() ? Delete(xmp) : SetValue(xmp, mPath, U(text));
  }

 protected:
  QString Check() const override { return CheckText(*mEntry, Text()); }

 private:
  QAbstractSpinBox* mSpin = nullptr;
  QSpinBox* mInt = nullptr;
  QDoubleSpinBox* mReal = nullptr;
  double mNone = 0;
};

// Dates keep the precision and the zone they were stored with: a date
// stored without a zone is written back without one.
class DateField : public Field {
 public:
  DateField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry)
      : Field(path, entry, FieldKind::kDate, NameOfPath(path)) {
    static const QRegularExpression form(
        "^(\\d{4})(?:-(\\d{2})(?:-(\\d{2})(?:T(\\d{2}):(\\d{2})(?::(\\d{2})(?:\\.\\d+)?)?(Z|[+-]\\d{2}:\\d{2})?)?)?)?$");
    GetValueResult result;
    const QString text = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    auto* box = new QWidget;
    auto* layout = new QHBoxLayout(box);
    layout->setContentsMargins(0, 0, 0, 0);
    mEdit = new QDateTimeEdit;
    mEdit->setCalendarPopup(true);
    mEdit->setMinimumDateTime(QDateTime(QDate(100, 1, 1), QTime(0, 0)));
    mZoneLabel = new QLabel;
    layout->addWidget(mEdit, 1);
    layout->addWidget(mZoneLabel);
    const QRegularExpressionMatch match = form.match(text);
    const bool parsed = mHasValue && match.hasMatch();
    if (parsed) {
      const auto part = [&](int n, int fallback) { return match.captured(n).isEmpty() ? fallback : match.captured(n).toInt(); };
      mParts = match.captured(6).isEmpty() ? (match.captured(4).isEmpty() ? (match.captured(2).isEmpty() ? 1 : match.captured(3).isEmpty() ? 2 : 3) : 4) : 5;
      mZone = match.captured(7);
      const QDateTime when(QDate(part(1, 1), part(2, 1), part(3, 1)), QTime(part(4, 0), part(5, 0), part(6, 0)));
      mEdit->setDateTime(when.isValid() ? when : mEdit->minimumDateTime());
    } else {
      mEdit->setDateTime(mEdit->minimumDateTime());
    }
    mEdit->setSpecialValueText(mMixed ? kMixed : (mHasValue && !parsed) ? text : QStringLiteral(" "));
    mEdit->setDisplayFormat(mParts <= 3 ? "yyyy-MM-dd" : "yyyy-MM-dd HH:mm:ss");
    mZoneLabel->setText(mZone.isEmpty() ? (mParts > 3 && mHasValue ? QStringLiteral("no zone") : QString())
                                        : mZone == "Z" ? QStringLiteral("UTC") : "UTC" + mZone);
    connect(mEdit, &QDateTimeEdit::dateTimeChanged, this, &DateField::MarkEdited);
    mEdit->installEventFilter(this);
    mWidget = box;
  }

  // An empty editor starts from now rather than from its "no value" date;
  // left unchanged, it is empty again and nothing is written.
  bool eventFilter(QObject* watched, QEvent* event) override {
    const QDateTime none = mEdit->minimumDateTime();
    if (event->type() == QEvent::FocusIn && !mEdited && mEdit->dateTime() == none) {
      const QSignalBlocker block(mEdit);
      mEdit->setDateTime(QDateTime(QDate::currentDate(), QTime::currentTime().addMSecs(-QTime::currentTime().msec())));
      mStarted = true;
    } else if (event->type() == QEvent::FocusOut && mStarted && !mEdited) {
      const QSignalBlocker block(mEdit);
      mEdit->setDateTime(none);
      mStarted = false;
    }
    return Field::eventFilter(watched, event);
  }

  QString Text() const {
    if (mEdit->dateTime() == mEdit->minimumDateTime()) return {};
    static const char* const kForms[] = {"yyyy", "yyyy", "yyyy-MM", "yyyy-MM-dd", "yyyy-MM-ddTHH:mm",
                                         "yyyy-MM-ddTHH:mm:ss"};
    return mEdit->dateTime().toString(kForms[mParts]) + (mParts > 3 ? mZone : QString());
  }
  bool Write(XMPMetaRef xmp) override {
    const QString text = Text();
    return text.isEmpty() ? Delete(xmp) : SetValue(xmp, mPath, U(text));
  }

 private:
  QDateTimeEdit* mEdit = nullptr;
  QLabel* mZoneLabel = nullptr;
  bool mStarted = false;  // showing now, in place of no value
  int mParts = 5;  // year, month, day, minutes, seconds: how much was stored
  QString mZone;
};

class AltTextField : public Field {
 public:
  AltTextField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry, bool multiLine,
               const QStringList& recent)
      : Field(path, entry, FieldKind::kAltText, NameOfPath(path)) {
    GetValueResult result;
    mTexts["x-default"] = ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    QStringList languages{"x-default"};
    for (const UTF8String& language : GetAltTextLanguages(xmp, path)) {
      UTF8String text;
      if (language == "x-default" || !GetAltTextValue(xmp, path, language, text)) continue;
      languages << Q(language);
      mTexts[Q(language)] = Q(text);
    }
    auto* box = new QWidget;
    auto* layout = new QHBoxLayout(box);
    layout->setContentsMargins(0, 0, 0, 0);
    if (multiLine) {
      mArea = new QPlainTextEdit(mTexts["x-default"]);
      mArea->setTabChangesFocus(true);
      mArea->setFixedHeight(mArea->fontMetrics().lineSpacing() * 4 + 12);
      if (mMixed) mArea->setPlaceholderText(kMixed);
      connect(mArea, &QPlainTextEdit::textChanged, this, [this] { TextEdited(mArea->toPlainText()); });
      layout->addWidget(mArea, 1);
    } else {
      mLine = new QLineEdit(mTexts["x-default"]);
      if (mMixed) mLine->setPlaceholderText(kMixed);
      AttachCompleter(mLine, recent);
      connect(mLine, &QLineEdit::textEdited, this, &AltTextField::TextEdited);
      layout->addWidget(mLine, 1);
    }
    // Another language is added by typing its tag.
    mLanguages = new QComboBox;
    mLanguages->setEditable(true);
    mLanguages->addItems(languages);
    mLanguages->setToolTip(QStringLiteral("Language of the text; type a tag (de, fr-CA) to add one"));
    layout->addWidget(mLanguages, 0, Qt::AlignTop);
    connect(mLanguages, &QComboBox::currentTextChanged, this, &AltTextField::ShowLanguage);
    mWidget = box;
  }

  void ShowLanguage(const QString& language) {
    mCurrent = language.trimmed();
    const QString text = mTexts.value(mCurrent);
    QSignalBlocker blockArea(mArea), blockLine(mLine);
    if (mArea) mArea->setPlainText(text);
    if (mLine) mLine->setText(text);
  }
  bool Write(XMPMetaRef xmp) override {
    bool changed = false;
    for (const QString& language : mEditedLanguages) {
      const QString text = mTexts.value(language);
      if (language != "x-default") {
        changed = SetAltTextValue(xmp, mPath, U(language), U(text)) || changed;
        continue;
      }
      bool others = false;
      for (auto it = mTexts.begin(); it != mTexts.end(); ++it) others = others || (it.key() != language && !it.value().isEmpty());
      changed = (text.isEmpty() && !others ? Delete(xmp) : SetValue(xmp, mPath, U(text))) || changed;
    }
    return changed;
  }
  QStringList RecentTexts() const override {
    const QString text = mTexts.value("x-default");
    return mEditedLanguages.count("x-default") && !text.isEmpty() ? QStringList{text} : QStringList();
  }

 protected:
  QString Check() const override {
    static const QRegularExpression tag("^(x-default|[A-Za-z]{1,8}(-[A-Za-z0-9]{1,8})*)$");
    for (const QString& language : mEditedLanguages)
      if (!tag.match(language).hasMatch()) return language + " is not a language tag (de, fr-CA)";
    return {};
  }

 private:
  void TextEdited(const QString& text) {
    mTexts[mCurrent] = text;
    mEditedLanguages.insert(mCurrent);
    MarkEdited();
  }

  QMap<QString, QString> mTexts;
  std::set<QString> mEditedLanguages;
  QString mCurrent = "x-default";
  QLineEdit* mLine = nullptr;
  QPlainTextEdit* mArea = nullptr;
  QComboBox* mLanguages = nullptr;
};

class ListField : public Field {
 public:
  ListField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry)
      : Field(path, entry, FieldKind::kList, NameOfPath(path)) {
    GetValueResult result;
    ReadText(xmp, path, result);
    mMixed = result == ValueMixed;
    mHasValue = result == ValueFound;
    auto* box = new QWidget;
    auto* layout = new QHBoxLayout(box);
    layout->setContentsMargins(0, 0, 0, 0);
    mList = new QListWidget;
    mList->setSelectionMode(QAbstractItemView::ExtendedSelection);
    mList->setMaximumHeight(mList->fontMetrics().lineSpacing() * 5 + 12);
    // The items of a sequence are in an order that means something.
    const auto primitive = PrimitiveTypeOfPath(path);
    if (primitive && *primitive == kPrimitiveType_seq) mList->setDragDropMode(QAbstractItemView::InternalMove);
    if (mMixed) {
      auto* placeholder = new QListWidgetItem(kMixed, mList);
      placeholder->setFlags(Qt::NoItemFlags);
    }
    const int count = mHasValue ? CountArrayItems(xmp, path) : 0;
    for (int index = 1; index <= count; ++index) {
      UTF8String text;
      try {
        GetValue(xmp, CreatePathFromArrayItem(path, index), text);
      } catch (const std::exception&) {
        break;
      }
      AddItem(Q(text));
    }
    auto* buttons = new QVBoxLayout;
    mAdd = new QToolButton;
    mAdd->setText(QStringLiteral("+"));
    mAdd->setToolTip(QStringLiteral("Add an item"));
    mRemove = new QToolButton;
    mRemove->setText(QStringLiteral("\u2212"));
    mRemove->setToolTip(QStringLiteral("Remove the selected items"));
    buttons->addWidget(mAdd);
    buttons->addWidget(mRemove);
    buttons->addStretch();
    layout->addWidget(mList, 1);
    layout->addLayout(buttons);
    connect(mAdd, &QToolButton::clicked, this, [this] {
      DropPlaceholder();
      mList->editItem(AddItem(QString()));
      MarkEdited();
    });
    connect(mRemove, &QToolButton::clicked, this, [this] {
      for (QListWidgetItem* item : mList->selectedItems()) delete item;
      MarkEdited();
    });
    connect(mList, &QListWidget::itemChanged, this, &ListField::MarkEdited);
    connect(mList->model(), &QAbstractItemModel::rowsMoved, this, &ListField::MarkEdited);
    mWidget = box;
  }

  QStringList Items() const {
    QStringList items;
    for (int row = 0; row < mList->count(); ++row) {
      const QListWidgetItem* item = mList->item(row);
      if (item->flags() != Qt::NoItemFlags && !item->text().isEmpty()) items << item->text();
    }
    return items;
  }
  bool Write(XMPMetaRef xmp) override {
    const QStringList items = Items();
    return items.isEmpty() ? Delete(xmp) : SetValue(xmp, mPath, U(JoinItems(items)));
  }
  QStringList RecentTexts() const override { return Items().isEmpty() ? QStringList() : QStringList{JoinItems(Items())}; }

 protected:
  QString Check() const override {
    for (const QString& item : Items()) {
      const QString problem = CheckText(*mEntry, item);
      if (!problem.isEmpty()) return problem;
    }
    return {};
  }

 private:
  QListWidgetItem* AddItem(const QString& text) {
    auto* item = new QListWidgetItem(text, mList);
    item->setFlags(item->flags() | Qt::ItemIsEditable);
    return item;
  }
  void DropPlaceholder() {
    if (mList->count() == 1 && mList->item(0)->flags() == Qt::NoItemFlags) mList->clear();
  }

  QListWidget* mList = nullptr;
  QToolButton* mAdd = nullptr;
  QToolButton* mRemove = nullptr;
};

// The items of an array of structures, each a group of the editors a
// structure's fields get. Edits stay in the form until written: edited
// fields of kept items in place first, then added items at the end, then
// removed items from the back, so that every index used is the one read.
class StructArrayField : public Field {
 public:
  StructArrayField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry)
      : Field(path, entry, FieldKind::kStructArray, NameOfPath(path)), mType(PropertyTypeOf(*entry)) {
    auto* box = new QWidget;
    mLayout = new QVBoxLayout(box);
    mLayout->setContentsMargins(0, 0, 0, 0);
    mWidget = box;
    GetValueResult result = ValueAbsent;
    const Path probe = Probe(1);
    if (!probe.description.empty()) ReadText(xmp, probe, result);
    // Arrays that differ between files are not merged item by item.
    mMixed = result == ValueMixed;
    if (mMixed) {
      auto* line = new QLineEdit;
      line->setPlaceholderText(kMixed);
      line->setReadOnly(true);
      line->setFrame(false);
      mLayout->addWidget(line);
      return;
    }
    mRead = CountArrayItems(xmp, path);
    mHasValue = mRead > 0;
    for (int index = 1; index <= mRead; ++index) AddItem(xmp, index);
    auto* add = new QPushButton(QStringLiteral("Add item"));
    mLayout->addWidget(add, 0, Qt::AlignLeft);
    connect(add, &QPushButton::clicked, this, [this] {
      AddItem(nullptr, 0);
      MarkEdited();
    });
  }

  bool Write(XMPMetaRef xmp) override {
    mChanged.clear();
    bool changed = false;
    for (const auto& item : mItems)
      if (item->index > 0 && !item->removed) changed = WriteFields(xmp, *item, nullptr) || changed;
    for (const auto& item : mItems) {
      const bool edited = std::any_of(item->fields.begin(), item->fields.end(),
                                      [](const auto& f) { return f.second->Edited(); });
      // An added item left empty, or removed again, is not written.
      if (item->index > 0 || item->removed || !edited) continue;
      const int at = CountArrayItems(xmp, mPath);
      if (!AddArrayItem(xmp, mPath, at)) continue;
      const Path itemPath = CreatePathFromArrayItem(mPath, at + 1);
      WriteFields(xmp, *item, &itemPath);
      changed = true;
    }
    std::vector<int> removed;
    for (const auto& item : mItems)
      if (item->index > 0 && item->removed) removed.push_back(item->index);
    std::sort(removed.rbegin(), removed.rend());
    bool deleted = false;
    for (int index : removed) deleted = DeleteArrayItem(xmp, mPath, index - 1) || deleted;
    if (deleted) {
      // An aggregate clears in its files what reads as empty here, and an
      // array of structures does not read as text: name the array only once
      // it is gone, else a field of its first item.
      const Path probe = Probe(1);
      mChanged.push_back(CountArrayItems(xmp, mPath) == 0 || probe.description.empty() ? mPath : probe);
    }
    return changed || deleted;
  }
  std::vector<Path> ChangedPaths() const override { return mChanged; }

 protected:
  QString Check() const override {
    for (const auto& item : mItems)
      for (const auto& field : item->fields)
        if (!item->removed && !field.second->Problem().isEmpty()) return field.second->Problem();
    return {};
  }

 private:
  struct Item {
    int index = 0;  // 1-based as read; 0 for an added item
    bool removed = false;
    QGroupBox* box = nullptr;
    std::vector<std::pair<boost::shared_ptr<FieldDefinition>, std::unique_ptr<Field>>> fields;
  };

  static Path FieldPath(const Path& item, const boost::shared_ptr<FieldDefinition>& field) {
    try {
      return CreatePathFromArrayedStructureField(item, field);
    } catch (const std::exception&) {
      return {};  // a field the toolkit cannot address is left out
    }
  }
  static Path ItemPath(const Path& array, int index) {
    try {
      return CreatePathFromArrayItem(array, index);
    } catch (const std::exception&) {
      return {};
    }
  }
  // The first plain field of item index: it reads as text in any packet.
  Path Probe(int index) const {
    const Path item = ItemPath(mPath, index);
    if (!mType || item.description.empty()) return {};
    for (const auto& field : mType->fields) {
      const Path path = FieldPath(item, field);
      const auto primitive = path.description.empty() ? boost::none : PrimitiveTypeOfPath(path);
      if (primitive && *primitive != kPrimitiveType_bag && *primitive != kPrimitiveType_seq &&
          *primitive != kPrimitiveType_alt)
        return path;
    }
    return {};
  }

  // Writes the edited fields of item, at itemPath when given (an added item).
  bool WriteFields(XMPMetaRef xmp, Item& item, const Path* itemPath) {
    bool changed = false;
    for (auto& [definition, field] : item.fields) {
      if (!field->Edited()) continue;
      if (itemPath) field->SetPath(FieldPath(*itemPath, definition));
      if (field->GetPath().description.empty() || !field->Write(xmp)) continue;
      mChanged.push_back(field->GetPath());
      changed = true;
    }
    return changed;
  }

  void AddItem(XMPMetaRef xmp, int index) {
    // An added item is named after the index it would take now.
    const int shown = index > 0 ? index : static_cast<int>(mItems.size()) + 1;
    const Path itemPath = ItemPath(mPath, shown);
    if (!mType || itemPath.description.empty()) return;
    auto item = std::make_unique<Item>();
    item->index = index;
    item->box = new QGroupBox(index > 0 ? QStringLiteral("Item %1").arg(index) : QStringLiteral("New item"));
    auto* form = new QFormLayout(item->box);
    form->setFieldGrowthPolicy(QFormLayout::AllNonFixedFieldsGrow);
    for (const auto& definition : mType->fields) {
      const Path path = FieldPath(itemPath, definition);
      if (path.description.empty() || !IsPropertyUISupported(path)) continue;
      const auto entry = PathEntryDefinition(path);
      if (!entry) continue;
      const FieldHints hints;
      auto field = MakeField(xmp, path, entry, KindOf(path, *entry, hints), hints, QStringList());
      connect(field.get(), &Field::Changed, this, &StructArrayField::MarkEdited);
      auto* name = new QLabel((definition->label.empty() ? Q(definition->name) : Q(definition->label)) + ':');
      name->setToolTip(field->Name());
      name->setBuddy(field->Widget());
      form->addRow(name, field->Widget());
      item->fields.emplace_back(definition, std::move(field));
    }
    auto* remove = new QPushButton(QStringLiteral("Remove item"));
    form->addRow(remove);
    Item* raw = item.get();
    connect(remove, &QPushButton::clicked, this, [this, raw] {
      raw->removed = true;
      raw->box->hide();
      MarkEdited();
    });
    // Items go above the "Add item" button.
    mLayout->insertWidget(static_cast<int>(mItems.size()), item->box);
    mItems.push_back(std::move(item));
  }

  TypeDefinitionPtr mType;
  QVBoxLayout* mLayout = nullptr;
  int mRead = 0;
  std::vector<std::unique_ptr<Item>> mItems;
  std::vector<Path> mChanged;
};

class ReadOnlyField : public Field {
 public:
  ReadOnlyField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry)
      : Field(path, entry, FieldKind::kReadOnly, NameOfPath(path)) {
    const QString text = DisplayText(xmp, path, *entry, &mMixed);
    mHasValue = !text.isEmpty() && !mMixed;
    if (text.contains('\n')) {
      auto* area = new QPlainTextEdit(text);
      area->setReadOnly(true);
      area->setFixedHeight(area->fontMetrics().lineSpacing() * std::min<int>(6, text.count('\n') + 1) + 12);
      mWidget = area;
    } else {
      auto* line = new QLineEdit(text);
      line->setReadOnly(true);
      line->setFrame(false);
      mWidget = line;
    }
  }
  bool Write(XMPMetaRef) override { return false; }
};

}  // namespace

std::unique_ptr<Field> MakeField(XMPMetaRef xmp, const Path& path, const boost::shared_ptr<EntryDefinition>& entry,
                                 FieldKind kind, const FieldHints& hints, const QStringList& recent) {
  std::unique_ptr<Field> field;
  switch (kind) {
    case FieldKind::kText:
    case FieldKind::kMultiLine: field = std::make_unique<TextField>(xmp, path, entry, kind, recent); break;
    case FieldKind::kClosedChoice:
    case FieldKind::kOpenChoice: field = std::make_unique<ChoiceField>(xmp, path, entry, kind, hints); break;
    case FieldKind::kBoolean: field = std::make_unique<BoolField>(xmp, path, entry); break;
    case FieldKind::kInteger:
    case FieldKind::kReal: field = std::make_unique<NumberField>(xmp, path, entry, kind); break;
    case FieldKind::kDate: field = std::make_unique<DateField>(xmp, path, entry); break;
    case FieldKind::kAltText:
      field = std::make_unique<AltTextField>(xmp, path, entry, hints.multiLine, recent);
      break;
    case FieldKind::kList: field = std::make_unique<ListField>(xmp, path, entry); break;
    case FieldKind::kStructArray: field = std::make_unique<StructArrayField>(xmp, path, entry); break;
    case FieldKind::kReadOnly: field = std::make_unique<ReadOnlyField>(xmp, path, entry); break;
  }
  field->Widget()->setObjectName(field->Name());
  if (!entry->description.empty() && field->Widget()->toolTip().isEmpty()) field->Widget()->setToolTip(Q(entry->description));
  return field;
}

}  // namespace ovrapanel
