#pragma once

#include <QString>

namespace tagora {

// The browser that renders pages to PDF: "chromium" (or "chromium-browser",
// "google-chrome") on the PATH. Empty when there is none.
QString findHeadlessBrowser();

// Renders a page on disk to a PDF as the browser would print it (its pictures
// included, no header or footer lines) with headless Chromium, within
// timeoutSeconds. The PDF is written aside and renamed into place, so a
// failure leaves no PDF at the name. The page must not call window.print()
// on load: headless Chromium then writes nothing. Empty text on success,
// otherwise the reason in Hebrew. browser: the program to run; empty: found.
QString RenderPageToPdf(const QString& page, const QString& pdf, int timeoutSeconds, const QString& browser = {});

} // namespace tagora
