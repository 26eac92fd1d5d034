// ovrapanel: the smallest real host of the library, a metadata panel.
#include <cstdio>

#include <QApplication>
#include <QCommandLineParser>
#include <QTimer>

#include <ovrametadata/ovrametadata.h>

#include "Window.h"

int main(int argc, char** argv) {
  QApplication app(argc, argv);
  QApplication::setApplicationName(QStringLiteral("ovrapanel"));
  QCommandLineParser parser;
  parser.setApplicationDescription(QStringLiteral("Shows and edits the XMP metadata of media files."));
  parser.addHelpOption();
  const QCommandLineOption screenshot(QStringLiteral("screenshot"),
                                      QStringLiteral("Render the window to FILE (PNG) and exit."),
                                      QStringLiteral("FILE"));
  parser.addOption(screenshot);
  parser.addPositionalArgument(QStringLiteral("files"), QStringLiteral("Files or folders to open."), "[FILE...]");
  parser.process(app);

  try {
    ovrametadata::Initialize();
  } catch (const std::exception& error) {
    std::fprintf(stderr, "ovrapanel: cannot start the XMP toolkit: %s\n", error.what());
    return 1;
  }
  ovrametadata::LoadAllViewDefinitions();
  int status = 0;
  {
    ovrapanel::Window window;
    window.OpenPaths(parser.positionalArguments());
    window.show();
    if (parser.isSet(screenshot)) {
      // Once the window has been laid out and painted.
      QTimer::singleShot(200, &window, [&] {
        if (!window.SaveScreenshot(parser.value(screenshot))) {
          std::fprintf(stderr, "ovrapanel: cannot write %s\n", qPrintable(parser.value(screenshot)));
          status = 1;
        }
        QApplication::quit();
      });
    }
    const int code = QApplication::exec();
    if (status == 0) status = code;
  }
  ovrametadata::Terminate();
  return status;
}
