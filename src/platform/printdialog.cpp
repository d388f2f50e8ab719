#include "platform/printdialog.h"

#include "platform/filedialog.h"

#include <QPrintDialog>
#include <QPrinter>

namespace tagora {

bool WidgetPrintDialog::setUp(QPrinter& printer)
{
    QPrintDialog dialog(&printer, m_parent);
    return dialog.exec() == QDialog::Accepted;
}

bool ScriptedPrintDialog::setUp(QPrinter& printer)
{
    if (!m_files)
        return false;
    FileRequest request;
    request.title = QStringLiteral("הדפסה");
    request.filter = QStringLiteral("PDF (*.pdf)|*.pdf");
    const auto path = m_files->openFile(request);
    if (!path || path->isEmpty())
        return false;
    printer.setOutputFormat(QPrinter::PdfFormat);
    printer.setOutputFileName(*path);
    return true;
}

} // namespace tagora
