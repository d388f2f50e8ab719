// The window host: a main window with the control on it.
#include "control/maincard.h"
#include "platform/settingsstore.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QMainWindow>

int main(int argc, char** argv)
{
    QApplication app(argc, argv);
    QApplication::setApplicationName(QStringLiteral("Tagora"));
    QApplication::setApplicationVersion(QStringLiteral(TAGORA_VERSION));
    QApplication::setLayoutDirection(Qt::RightToLeft);

    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral("Tagora label printing"));
    parser.addHelpOption();
    parser.addVersionOption();
    QCommandLineOption settings(QStringLiteral("settings"), QStringLiteral("Settings file (INI)."), QStringLiteral("file"));
    parser.addOption(settings);
    parser.process(app);

    tagora::Services services;
    if (parser.isSet(settings))
        services.settings = std::make_shared<tagora::IniSettingsStore>(parser.value(settings));

    QMainWindow window;
    window.setWindowTitle(QStringLiteral("Tagora"));
    auto* card = new tagora::MainCard(&window, services);
    window.setCentralWidget(card);
    window.resize(card->sizeHint().expandedTo(QSize(1280, 640)));
    window.show();
    return app.exec();
}
