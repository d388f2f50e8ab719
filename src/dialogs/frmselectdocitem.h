#pragma once

#include "platform/services.h"

#include <QDialog>
#include <memory>

namespace Ui {
class FrmSelectDocItemForm;
}

namespace tagora {

class BoundTableModel;
class Prompt;

// The imported documents and the lines of the current one: which documents
// and which of their lines get labels, and how many copies of each line,
// written straight into the temporary documents database.
class FrmSelectDocItem : public QDialog {
    Q_OBJECT
public:
    // commands (may be null) opens an item's card from a line's picture.
    FrmSelectDocItem(const QString& dataFolder, ControlCommands* commands, std::shared_ptr<Prompt> prompt = {},
                     QWidget* parent = nullptr);
    ~FrmSelectDocItem() override;

    // The lines of one document. The values are the grid's texts of the
    // document's keys; one that is not a whole number selects no line.
    static QString BuildDocLinesQuery(const QString& pWizFileID, const QString& pHeadNumber);

    BoundTableModel* headersModel() const { return m_headers; }
    BoundTableModel* linesModel() const { return m_lines; }

private:
    void Form_Load();
    void RearrangeDocLines();
    void followCurrentDocument();
    void VSDocLines_Click(int row, int column);

    std::unique_ptr<Ui::FrmSelectDocItemForm> ui;
    BoundTableModel* m_headers;
    BoundTableModel* m_lines;
    ControlCommands* m_commands;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
