#pragma once

#include "platform/services.h"

#include <QDialog>
#include <memory>

namespace Ui {
class FrmSelectItemForm;
}

namespace tagora {

class BoundTableModel;
class Prompt;

// The item selection: a page of items in which the user ticks what to print
// and types copies, writing straight into the items table.
class FrmSelectItem : public QDialog {
    Q_OBJECT
public:
    // dataFolder and itemCriteria come from the control that opens the dialog;
    // commands (may be null) answers the card column and the print button;
    // prompt tells the user why a typed value was not stored (message boxes
    // on this dialog when none is given).
    FrmSelectItem(const QString& dataFolder, const QString& itemCriteria, ControlCommands* commands,
                  std::shared_ptr<Prompt> prompt = {}, QWidget* parent = nullptr);
    ~FrmSelectItem() override;

    QString BuildSelectItemsQuery(const QString& extraConditions, bool onlyMarked, int sortBy, int sortDirection) const;
    BoundTableModel* model() const { return m_model; }

private:
    void Form_Load();
    void refresh(const QString& sql);
    void cmdFindKey_Click();
    void cmdFindByDesc_Click(int index);
    void markListed(bool on);
    void CmdAllCopies_Click();
    void cmdShowMarked_Click();
    void cmdShowAll_Click();
    void cmdPrint_Click();
    void VSSelectItems_Click(int row, int column);
    QString likePattern(const QString& text, bool anywhere) const;

    std::unique_ptr<Ui::FrmSelectItemForm> ui;
    BoundTableModel* m_model;
    QString m_dataFolder;
    QString m_criteria;
    ControlCommands* m_commands;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
