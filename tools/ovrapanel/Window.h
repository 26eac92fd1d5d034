// ovrapanel: the main window. Files on the left, one tab per registered
// view, the library's reports below. Several selected files are edited as
// one through an aggregate provider.
#pragma once

#include <vector>

#include <QHash>
#include <QMainWindow>
#include <QStringList>

#include <ovrametadata/ovrametadata.h>

#include "Page.h"

class QAction;
class QListWidget;
class QPlainTextEdit;
class QTabWidget;

namespace ovrapanel {

class Window : public QMainWindow {
  Q_OBJECT

 public:
  // Call after Initialize and LoadAllViewDefinitions.
  explicit Window(QWidget* parent = nullptr);
  ~Window() override;

  // Opens files, and the media files directly inside folders; answers how
  // many were opened. The first one opened is selected.
  int OpenPaths(const QStringList& paths);
  // Selects the files at these rows of the list (and shows them).
  void SelectRows(const QList<int>& rows);

  // Writes every edited value to every selected file. False, with the
  // reasons in the message pane, when a value is refused (then nothing is
  // written) or a file could not be written.
  bool Save();
  // Reads the selected files again; edits are dropped.
  void Revert();

  // The fields of every page, or those of one property ("dc:title").
  std::vector<Field*> Fields(const QString& name = QString()) const;
  QTabWidget* Tabs() const { return mTabs; }
  QString Messages() const;
  // Renders the window into a PNG.
  bool SaveScreenshot(const QString& file);

 protected:
  void dragEnterEvent(QDragEnterEvent* event) override;
  void dropEvent(QDropEvent* event) override;

 private:
  struct OpenedFile {
    QString path;
    boost::shared_ptr<ovrametadata::FileProvider> provider;
  };

  bool OpenFile(const QString& path, bool quiet);
  void ShowSelection();
  void UpdateActions();
  void Report(const QString& text);
  void LoadRecent();
  void RecordRecent(const std::vector<Field*>& fields);
  std::vector<OpenedFile*> Selected();

  QListWidget* mFiles = nullptr;
  QTabWidget* mTabs = nullptr;
  QPlainTextEdit* mMessages = nullptr;
  QAction* mSave = nullptr;
  QAction* mRevert = nullptr;
  std::vector<OpenedFile> mOpened;
  std::vector<BuiltPage> mPages;
  boost::shared_ptr<ovrametadata::MetaDataProvider> mTarget;
  boost::shared_ptr<ovrametadata::ErrorCallback> mErrors;
  QHash<QString, QStringList> mRecent;
  bool mQuietDiscard = false;
};

}  // namespace ovrapanel
