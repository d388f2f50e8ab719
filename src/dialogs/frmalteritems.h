#pragma once

#include <QDialog>
#include <QVariant>
#include <memory>

namespace Ui {
class FrmAlterItemsForm;
}

namespace tagora {

class BoundTableModel;
class PrintDialogProvider;
class Prompt;

// A query text and the values of its "?" markers.
struct BoundQuery {
    QString sql;
    QVariantList params;
};

// The alternate keys of a filter: up to two exact values on the listed fields
// (a field position below 0, or an empty value, filters nothing), sorted by
// the listed field (none: below 0), then by item key.
BoundQuery alterKeysQuery(const QVector<QPair<int, QString>>& filters, int sortField, bool descending);

// The customers' and suppliers' own numbers and barcodes for the items,
// filtered, sorted, edited and printed.
class FrmAlterItems : public QDialog {
    Q_OBJECT
public:
    FrmAlterItems(const QString& dataFolder, std::shared_ptr<Prompt> prompt,
                  std::shared_ptr<PrintDialogProvider> printDialog, QWidget* parent = nullptr);
    ~FrmAlterItems() override;

    BoundTableModel* model() const { return m_model; }

public slots:
    void CmdShowAlterKeys_Click();
    void cmdSetAltBar_Click();
    void cmdDelAlterKey_Click();
    void cmdPrintAltKeys_Click();

private:
    void RearrangeAlterItems();

    std::unique_ptr<Ui::FrmAlterItemsForm> ui;
    BoundTableModel* m_model;
    std::shared_ptr<Prompt> m_prompt;
    std::shared_ptr<PrintDialogProvider> m_printDialog;
};

} // namespace tagora
