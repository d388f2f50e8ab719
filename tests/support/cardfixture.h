#pragma once

// A control wired to a private settings file, a scripted prompt and file
// dialog, and a fixed printer list, as every control test needs.
#include "control/maincard.h"
#include "platform/filedialog.h"
#include "platform/pageviewer.h"
#include "platform/printercatalog.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"
#include "support/recordingviewer.h"

#include <QComboBox>
#include <QDialog>
#include <functional>
#include <QFile>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <memory>

// Dialogs opened by a command in a test: each is recorded and handed to the
// test's callback (if any), then closed, so nothing waits for a user.
struct TestDialogRunner : tagora::DialogRunner {
    QStringList opened;
    std::function<void(QDialog&)> drive;
    int run(QDialog& dialog) override
    {
        opened << dialog.objectName();
        dialog.show();
        if (drive)
            drive(dialog);
        if (dialog.isVisible())
            dialog.reject();
        return dialog.result();
    }
};

struct CardFixture {
    QTemporaryDir dir;
    QString settingsPath;
    std::shared_ptr<tagora::IniSettingsStore> store;
    std::shared_ptr<tagora::ScriptedPrompt> prompt = std::make_shared<tagora::ScriptedPrompt>(nullptr);
    std::shared_ptr<tagora::ScriptedFileDialog> files = std::make_shared<tagora::ScriptedFileDialog>();
    std::shared_ptr<TestDialogRunner> dialogs = std::make_shared<TestDialogRunner>();
    std::shared_ptr<RecordingViewer> pages = std::make_shared<RecordingViewer>();
    std::unique_ptr<tagora::MainCard> card;

    // iniText is written to the settings file first when given; priceFields
    // stands in for the price lists an ERP connection would have filled.
    explicit CardFixture(const QByteArray& iniText = {}, const QStringList& printers = {},
                         const QStringList& priceFields = {})
    {
        settingsPath = dir.filePath(QStringLiteral("Tagora.ini"));
        if (!iniText.isNull()) {
            QFile f(settingsPath);
            f.open(QIODevice::WriteOnly);
            f.write(iniText);
        }
        store = std::make_shared<tagora::IniSettingsStore>(settingsPath);
        tagora::Services s;
        s.settings = store;
        s.prompt = prompt;
        s.fileDialog = files;
        s.dialogs = dialogs;
        s.pages = pages;
        s.printers = std::make_shared<tagora::FixedPrinterCatalog>(printers);
        card = std::make_unique<tagora::MainCard>(nullptr, s);
        card->control<QComboBox>(QStringLiteral("cmbPriceField"))->addItems(priceFields);
        card->resize(1280, 600);
        card->show();
        // Without an ERP the show step reports that it cannot connect; the
        // tests look at what their own commands show.
        showMessages = prompt->lines();
        prompt->clear();
    }

    QStringList showMessages;

    template <class T = QObject> T* c(const QString& name) const { return card->control<T>(name); }
};
