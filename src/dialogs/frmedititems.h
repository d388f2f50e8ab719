#pragma once

#include <QDialog>
#include <memory>

#include "dialogs/frmalteritems.h"

namespace Ui {
class FrmEditItemsForm;
}

namespace tagora {

class BoundTableModel;
class Prompt;

// The items whose listed field (position; below 0 none) contains the text as
// typed, every character taken as itself, sorted by the listed field (none:
// by key).
BoundQuery editItemsQuery(int searchField, const QString& value, int sortField, bool descending);

// The local items, searched, sorted and typed into.
class FrmEditItems : public QDialog {
    Q_OBJECT
public:
    FrmEditItems(const QString& dataFolder, bool itemTextRtl, std::shared_ptr<Prompt> prompt, QWidget* parent = nullptr);
    ~FrmEditItems() override;

    BoundTableModel* model() const { return m_model; }

public slots:
    void cmdShowItems_Click();
    void cmdAddAccount_Click();
    void DelAccountDef_Click();

private:
    void RearrangeItems();

    std::unique_ptr<Ui::FrmEditItemsForm> ui;
    BoundTableModel* m_model;
    bool m_itemTextRtl;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
