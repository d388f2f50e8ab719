#pragma once

#include "platform/services.h"

#include <QDialog>
#include <memory>

namespace Ui {
class FrmLogonForm;
}

namespace tagora {

// The ERP connection dialog: edits the six connection values, checks them
// against the ERP, and stores them on OK.
class FrmLogon : public QDialog {
    Q_OBJECT
public:
    FrmLogon(const Services& services, QWidget* parent = nullptr);
    ~FrmLogon() override;

    // Moves the six fields to (1) or from (2) the settings store.
    void SetGetRegConnParams(int action);

private:
    void Form_Load();
    void CmdCheck_Click();
    void cmdOK_Click();
    void cmdCancel_Click();
    void lblConnPath_DblClick();
    short chosenType() const;

    std::unique_ptr<Ui::FrmLogonForm> ui;
    Services m_services;
};

} // namespace tagora
