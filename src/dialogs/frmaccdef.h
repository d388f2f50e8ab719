#pragma once

#include <QDialog>
#include <QVariant>
#include <QVector>
#include <memory>

namespace Ui {
class FrmAccDefForm;
}

namespace tagora {

class BoundTableModel;
class CommonDialog;
class FileDialogProvider;
class Prompt;

using ChoiceList = QVector<QPair<QVariant, QString>>;

// The ERP's price lists as a grid column offers them: number and name, the
// description when there is one; a list with neither is left out. Empty when
// the ERP cannot be reached (the cells can still be typed).
ChoiceList FillCmbPriceFieldInGrid(const QString& connString);
// The fields an account's alternative label is chosen by.
ChoiceList FillCmbLabelFieldInGrid();

// Per-account label definitions: which price list and label files a card
// prints with, typed straight into the items database.
class FrmAccDef : public QDialog {
    Q_OBJECT
public:
    FrmAccDef(const QString& dataFolder, int labelProgram, const ChoiceList& priceLists,
              std::shared_ptr<Prompt> prompt, std::shared_ptr<FileDialogProvider> files, QWidget* parent = nullptr);
    ~FrmAccDef() override;

    BoundTableModel* model() const { return m_model; }

public slots:
    // The "..." of a label file cell (columns 3 and 6): the chosen file's full name.
    void chooseLabelFile(int row, int column);
    void cmdAddAccount_Click();
    void DelAccountDef_Click();

private:
    std::unique_ptr<Ui::FrmAccDefForm> ui;
    BoundTableModel* m_model;
    int m_labelProgram;
    std::shared_ptr<Prompt> m_prompt;
    std::shared_ptr<FileDialogProvider> m_files;
    CommonDialog* m_fileDialog;
};

} // namespace tagora
