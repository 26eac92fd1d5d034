#include "Window.h"

#include <algorithm>

#include <QAction>
#include <QDir>
#include <QDockWidget>
#include <QDragEnterEvent>
#include <QDropEvent>
#include <QFileDialog>
#include <QFileInfo>
#include <QLabel>
#include <QListWidget>
#include <QMimeData>
#include <QPlainTextEdit>
#include <QSplitter>
#include <QTabWidget>
#include <QToolBar>

#include <boost/make_shared.hpp>

namespace ovrapanel {

using namespace ovrametadata;

namespace {

constexpr XMP_FileFormat kUnknownFormat = 0x20202020;
// Recent values kept per property, newest first.
constexpr int kRecentValues = 20;

// The built-in views in the order a reader of a panel expects them: what
// the picture is, where and by whom, then the technical data. Views of
// extension packages follow.
const char* const kViewOrder[] = {"Description", "Origin", "IPTCCore", "IPTCExtension", "Rights",
                                  "CameraData",  "GPS",    "Video",    "Audio",         "FileProperties"};

std::vector<ViewDefinitionPtr> OrderedViews() {
  std::vector<ViewDefinitionPtr> views;
  for (const char* name : kViewOrder)
    if (const ViewDefinitionPtr view = GetViewDefinitionForName(name)) views.push_back(view);
  for (const ViewDefinitionPtr& view : CommonViewDefinitions())
    if (std::find(views.begin(), views.end(), view) == views.end()) views.push_back(view);
  return views;
}

QString Q(const UTF16String& text) { return QString::fromStdU16String(text); }

}  // namespace

Window::Window(QWidget* parent) : QMainWindow(parent) {
  setWindowTitle(QStringLiteral("ovrapanel"));
  setAcceptDrops(true);
  resize(1000, 720);

  mFiles = new QListWidget;
  mFiles->setSelectionMode(QAbstractItemView::ExtendedSelection);
  mTabs = new QTabWidget;
  mTabs->setDocumentMode(true);
  auto* split = new QSplitter;
  split->addWidget(mFiles);
  split->addWidget(mTabs);
  split->setStretchFactor(1, 1);
  split->setSizes({220, 780});
  setCentralWidget(split);

  mMessages = new QPlainTextEdit;
  mMessages->setReadOnly(true);
  mMessages->setMaximumBlockCount(1000);
  mMessages->setFixedHeight(mMessages->fontMetrics().lineSpacing() * 4 + 12);
  auto* dock = new QDockWidget(QStringLiteral("Messages"));
  dock->setObjectName(QStringLiteral("messages"));
  dock->setFeatures(QDockWidget::NoDockWidgetFeatures);
  dock->setWidget(mMessages);
  addDockWidget(Qt::BottomDockWidgetArea, dock);

  QToolBar* bar = addToolBar(QStringLiteral("File"));
  bar->setMovable(false);
  QAction* open = bar->addAction(QStringLiteral("Open…"), this, [this] {
    OpenPaths(QFileDialog::getOpenFileNames(this, QStringLiteral("Open files")));
  });
  open->setShortcut(QKeySequence::Open);
  bar->addAction(QStringLiteral("Open Folder…"), this, [this] {
    const QString folder = QFileDialog::getExistingDirectory(this, QStringLiteral("Open a folder"));
    if (!folder.isEmpty()) OpenPaths({folder});
  });
  bar->addSeparator();
  mSave = bar->addAction(QStringLiteral("Save"), this, [this] { Save(); });
  mSave->setShortcut(QKeySequence::Save);
  mRevert = bar->addAction(QStringLiteral("Revert"), this, [this] { Revert(); });

  connect(mFiles, &QListWidget::itemSelectionChanged, this, &Window::ShowSelection);

  // Reports made while starting (a broken definitions file) come first.
  for (const ErrorInfo& info : GetErrorInfos())
    Report((info.source.empty() ? QString() : Q(info.source) + ": ") + Q(info.message));
  // The library may report from any thread; the pane is written on ours.
  mErrors = boost::make_shared<ErrorCallback>([this](const UTF16String& message) {
    QMetaObject::invokeMethod(this, [this, text = Q(message)] { Report(text); }, Qt::AutoConnection);
  });
  NotifyOnError(mErrors);
  LoadRecent();
  ShowSelection();
}

Window::~Window() {
  // Withdrawn, so that the library never calls into a gone window.
  mErrors->clear();
}

void Window::Report(const QString& text) { mMessages->appendPlainText(text); }

QString Window::Messages() const { return mMessages->toPlainText(); }

int Window::OpenPaths(const QStringList& paths) {
  const std::size_t before = mOpened.size();
  for (const QString& path : paths) {
    const QFileInfo info(path);
    if (info.isDir()) {
      // Only what the toolkit reads; other files of the folder are skipped.
      const QDir folder(path);
      for (const QFileInfo& file : folder.entryInfoList(QDir::Files, QDir::Name)) OpenFile(file.absoluteFilePath(), true);
    } else {
      OpenFile(path, false);
    }
  }
  const int opened = static_cast<int>(mOpened.size() - before);
  if (opened > 0) SelectRows({static_cast<int>(before)});
  return opened;
}

bool Window::OpenFile(const QString& given, bool quiet) {
  const QFileInfo info(given);
  const QString path = info.absoluteFilePath();
  if (!info.isFile() || !info.isReadable()) {
    if (!quiet) Report(given + ": cannot be read");
    return false;
  }
  for (const OpenedFile& file : mOpened)
    if (file.path == path) return false;
  const UTF16String name = path.toStdU16String();
  auto provider = boost::make_shared<FileProvider>(name);
  if (!provider->MetaDataAccess()) {
    if (utility::GetXMPFormat(name) == kUnknownFormat) {
      if (!quiet) Report(given + ": not a media file with metadata support");
      return false;
    }
    // Readable but without XMP: edits start from an empty packet.
    provider->ResetToEmptyMetaData(false);
  }
  mOpened.push_back({path, provider});
  auto* item = new QListWidgetItem(info.fileName(), mFiles);
  item->setToolTip(path);
  return true;
}

void Window::SelectRows(const QList<int>& rows) {
  {
    const QSignalBlocker block(mFiles);
    mFiles->clearSelection();
    for (int row : rows)
      if (QListWidgetItem* item = mFiles->item(row)) item->setSelected(true);
    if (!rows.isEmpty()) mFiles->setCurrentRow(rows.front(), QItemSelectionModel::NoUpdate);
  }
  ShowSelection();
}

std::vector<Window::OpenedFile*> Window::Selected() {
  std::vector<OpenedFile*> files;
  for (int row = 0; row < mFiles->count(); ++row)
    if (mFiles->item(row)->isSelected()) files.push_back(&mOpened[static_cast<std::size_t>(row)]);
  return files;
}

void Window::ShowSelection() {
  if (!mQuietDiscard && !Fields().empty()) {
    const auto fields = Fields();
    if (std::any_of(fields.begin(), fields.end(), [](Field* f) { return f->Edited(); }))
      Report(QStringLiteral("Unsaved edits were dropped."));
  }
  const int tab = std::max(0, mTabs->currentIndex());
  // Tabs do not own their pages.
  while (mTabs->count() > 0) {
    QWidget* page = mTabs->widget(0);
    mTabs->removeTab(0);
    delete page;
  }
  mPages.clear();
  mTarget.reset();
  const auto files = Selected();
  if (files.size() == 1) {
    mTarget = files.front()->provider;
  } else if (files.size() > 1) {
    auto aggregate = boost::make_shared<AggregateProvider>();
    for (OpenedFile* file : files) aggregate->AddProvider(file->provider, false);
    aggregate->OnProxyMetaDataChange(nullptr);
    mTarget = aggregate;
  }
  if (!mTarget) {
    auto* hint = new QLabel(QStringLiteral("Open files or a folder, or drop them here."));
    hint->setAlignment(Qt::AlignCenter);
    mTabs->addTab(hint, QStringLiteral("No file"));
    setWindowTitle(QStringLiteral("ovrapanel"));
    UpdateActions();
    return;
  }
  setWindowTitle(QStringLiteral("ovrapanel — %1").arg(
      files.size() == 1 ? QFileInfo(files.front()->path).fileName() : QStringLiteral("%1 files").arg(files.size())));
  const MetaDataReadAccess reader(mTarget);
  const RecentValues recent = [this](const QString& name) { return mRecent.value(name); };
  for (const ViewDefinitionPtr& view : OrderedViews()) {
    BuiltPage page = BuildPage(view, mTarget, *reader, recent);
    if (!page.widget) continue;
    for (const auto& field : page.fields) connect(field.get(), &Field::Changed, this, &Window::UpdateActions);
    const int index = mTabs->addTab(page.widget, page.label);
    mTabs->setTabToolTip(index, page.description);
    mPages.push_back(std::move(page));
  }
  mTabs->setCurrentIndex(std::min(tab, mTabs->count() - 1));
  UpdateActions();
}

std::vector<Field*> Window::Fields(const QString& name) const {
  std::vector<Field*> fields;
  for (const BuiltPage& page : mPages)
    for (const auto& field : page.fields)
      if (name.isEmpty() || field->Name() == name) fields.push_back(field.get());
  return fields;
}

void Window::UpdateActions() {
  const auto fields = Fields();
  const bool edited = std::any_of(fields.begin(), fields.end(), [](Field* f) { return f->Edited(); });
  const bool refused = std::any_of(fields.begin(), fields.end(), [](Field* f) { return !f->Problem().isEmpty(); });
  mSave->setEnabled(edited && !refused);
  mRevert->setEnabled(edited);
}

bool Window::Save() {
  std::vector<Field*> edited;
  for (Field* field : Fields())
    if (field->Edited()) edited.push_back(field);
  if (edited.empty() || !mTarget) return true;
  bool refused = false;
  for (Field* field : edited) {
    if (field->Problem().isEmpty()) continue;
    Report(field->Name() + ": " + field->Problem());
    refused = true;
  }
  if (refused) {
    Report(QStringLiteral("Nothing was saved: correct the marked values first."));
    return false;
  }
  const auto files = Selected();
  bool ok = true;
  try {
    // The guard writes the changes back when it ends: an aggregate hands
    // them to each of its files.
    MetaDataUpdateAccess update(mTarget);
    if (!*update) {
      Report(QStringLiteral("No metadata could be read; nothing was saved."));
      return false;
    }
    for (Field* field : edited)
      if (field->Write(*update))
        for (const Path& path : field->ChangedPaths()) update.AddChange(path);
  } catch (const std::exception& error) {
    Report(QStringLiteral("Saving failed: %1").arg(QString::fromLocal8Bit(error.what())));
    ok = false;
  }
  int failed = 0;
  for (OpenedFile* file : files) {
    const UTF16String& failure = file->provider->LastWriteFailure();
    if (failure.empty()) continue;
    Report(QFileInfo(file->path).fileName() + ": not saved: " + Q(failure));
    ++failed;
    ok = false;
  }
  if (failed < static_cast<int>(files.size())) RecordRecent(edited);
  Report(QStringLiteral("Saved %1 of %2 files.").arg(static_cast<int>(files.size()) - failed).arg(files.size()));
  mQuietDiscard = true;
  Revert();
  mQuietDiscard = false;
  return ok;
}

void Window::Revert() {
  // The aggregate goes first, so that it is not rebuilt for every reload.
  mPages.clear();
  mTarget.reset();
  for (OpenedFile* file : Selected()) {
    file->provider->ReloadFile();
    if (!file->provider->MetaDataAccess()) file->provider->ResetToEmptyMetaData(false);
  }
  const bool quiet = mQuietDiscard;
  mQuietDiscard = true;
  ShowSelection();
  mQuietDiscard = quiet;
}

void Window::LoadRecent() {
  LoadMRUFile();
  mRecent.clear();
  for (const auto& [key, values] : GetMRULists()) {
    QStringList& list = mRecent[QString::fromStdString(key)];
    for (const UTF16String& value : values) list << Q(value);
  }
}

void Window::RecordRecent(const std::vector<Field*>& fields) {
  // Lists saved by others since start-up are kept.
  LoadMRUFile();
  MRULists lists = GetMRULists();
  for (Field* field : fields) {
    const QStringList texts = field->RecentTexts();
    if (texts.isEmpty()) continue;
    const UTF8String key = field->Name().toStdString();
    std::list<UTF16String>& list = lists[key];
    for (const QString& text : texts) {
      list.remove(text.toStdU16String());
      list.push_front(text.toStdU16String());
    }
    if (list.size() > static_cast<std::size_t>(kRecentValues)) list.resize(kRecentValues);
    UpdateMRULists(key, list);
  }
  if (!SerializeMRUList()) Report(QStringLiteral("The recent values could not be saved."));
  LoadRecent();
}

bool Window::SaveScreenshot(const QString& file) { return grab().save(file, "PNG", 0); }

void Window::dragEnterEvent(QDragEnterEvent* event) {
  if (event->mimeData()->hasUrls()) event->acceptProposedAction();
}

void Window::dropEvent(QDropEvent* event) {
  QStringList paths;
  for (const QUrl& url : event->mimeData()->urls())
    if (url.isLocalFile()) paths << url.toLocalFile();
  if (OpenPaths(paths) > 0) event->acceptProposedAction();
}

}  // namespace ovrapanel
