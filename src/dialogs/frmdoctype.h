#pragma once

#include <QDialog>
#include <memory>

namespace Ui {
class FrmDocTypeForm;
}

namespace tagora {

class BoundTableModel;
class Prompt;

// The document types an import reads: which are fetched and whether their
// drafts come too, ticked straight into the configuration database.
class FrmDocType : public QDialog {
    Q_OBJECT
public:
    // dataFolder comes from the control that opens the dialog; prompt says why
    // a tick was not stored (message boxes on this dialog when none is given).
    explicit FrmDocType(const QString& dataFolder, std::shared_ptr<Prompt> prompt = {}, QWidget* parent = nullptr);
    ~FrmDocType() override;

    BoundTableModel* model() const { return m_model; }

private:
    void Form_Load();
    void markAll(bool on);

    std::unique_ptr<Ui::FrmDocTypeForm> ui;
    BoundTableModel* m_model;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
