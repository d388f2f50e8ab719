#pragma once

#include "platform/pageviewer.h"

#include <QStringList>

// Pages the control would open in a browser, noted instead.
struct RecordingViewer : tagora::PageViewer {
    QStringList shown;
    bool showPage(const QString& path, QString*) override
    {
        shown << path;
        return true;
    }
    // A window moved on to another page shows that page too.
    bool navigate(const QString&, const QString& to, QString*) override
    {
        shown << to;
        return true;
    }
};
