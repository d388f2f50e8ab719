#pragma once

#include <QString>

namespace tagora {

// Where long work reports: the status line and the progress bar of the main
// control. Importers and printers take this rather than the widget, so they
// run the same under a screen, the headless host and the tests.
class ProgressSink {
public:
    virtual ~ProgressSink() = default;
    virtual void setMessage(const QString& text) = 0;
    // Done fraction from 0 (nothing shown) to 1 (full bar).
    virtual void setProgress(double fraction) = 0;
    // Asked between rows of long work: true ends the work, and what it was
    // writing is left as it was before it started.
    virtual bool cancelRequested() { return false; }
};

} // namespace tagora
