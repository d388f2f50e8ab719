#pragma once

#include <QDialog>
#include <memory>

namespace Ui {
class FrmEditRangesForm;
}

namespace tagora {

class BoundTableModel;
class Prompt;

// Where each document type's next import starts: the last movement read and
// the next to read, typed straight into the configuration database.
class FrmEditRanges : public QDialog {
    Q_OBJECT
public:
    explicit FrmEditRanges(const QString& dataFolder, std::shared_ptr<Prompt> prompt = {}, QWidget* parent = nullptr);
    ~FrmEditRanges() override;

    BoundTableModel* model() const { return m_model; }

private:
    void Form_Load();
    void cmdNoneItems_Click();

    std::unique_ptr<Ui::FrmEditRangesForm> ui;
    BoundTableModel* m_model;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
