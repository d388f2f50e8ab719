#pragma once

#include "labels/directlayout.h"
#include "labels/labelpreview.h"

#include <QDialog>
#include <QString>
#include <QStringList>
#include <functional>
#include <memory>
#include <variant>
#include <vector>

class QCheckBox;
class QComboBox;
class QLabel;
class QLineEdit;
class QProcess;
class QTemporaryDir;
class QTimer;
class QWidget;

namespace Ui {
class FrmLabDefForm;
}

namespace tagora {

class ClickLabel;
class Prompt;

// The direct label designer: the seven label lines, the barcode and the page
// of labels. It edits the layout it is given in memory only; the layout
// reaches the settings with the control's next general save.
class FrmLabDef : public QDialog {
    Q_OBJECT
public:
    // fieldCaptions are the captions of the control's label fields, in field
    // index order.
    FrmLabDef(DirectLabelLayout& layout, const QStringList& fieldCaptions, std::shared_ptr<Prompt> prompt,
              QWidget* parent = nullptr);
    ~FrmLabDef() override;

    // Fills every line's field list; list position k is field index k.
    Q_INVOKABLE void FillXFld(const QStringList& fieldCaptions);
    // Fills the other lists of the line rows.
    Q_INVOKABLE void FillCombos();
    // Layout to controls (1), or controls to layout (2). Action 2 changes the
    // layout only when every box converts; it returns false, and shows which
    // box is wrong, otherwise.
    Q_INVOKABLE bool GetSetFormLabDefs(int action);
    // Copies one line row of controls to another; WithClean then clears the
    // source row's use, field and view.
    Q_INVOKABLE void MoveCell(int FromCell, int ToCell, bool WithClean);

    void lblAdd_Click(int index);
    void lblDel_Click(int index);

    // The record the preview shows, fields by field index: the first marked
    // item, or sample values. Without one every field shows a sample number.
    using PreviewSource = std::function<QVector<PreviewField>()>;
    void setPreviewSource(PreviewSource source, const QString& priceFormat);
    // Draws the preview now, whatever tab is shown; it is ready when
    // previewFinished comes.
    void refreshPreview();
    // The picture of the last preview drawn; empty when it could not be.
    QString previewPicture() const { return m_previewPng; }

signals:
    void previewFinished(bool drawn);

private:
    using FieldRef = std::variant<bool*, uchar*, short*, float*, QString*>;
    struct Binding {
        QWidget* control;
        FieldRef field;
        QString description; // names the box in a message
        int tab;
    };
    struct LineRow {
        QCheckBox* chkXCell;
        QComboBox* cmbXFld;
        QComboBox* cmbVType;
        QComboBox* CmbAlign;
        QComboBox* CmbDirection;
        QLineEdit* txtPrefix;
        ClickLabel* lblAdd;
        ClickLabel* lblDel;
        QLabel* lblFCap;
        QComboBox* CmbFont;
        QLineEdit* txtFontSize;
        QComboBox* CmbWeight;
        QCheckBox* ChkItalic;
        QCheckBox* ChkUL;
        QLineEdit* txtHeight;
        QCheckBox* ChkBorder;
    };

    void buildRows();
    std::vector<Binding> bindings(DirectLabelLayout& layout) const;
    // Moves one value; for Action 2 a text box whose text does not convert
    // gives false with what the box takes in *wanted.
    static bool GetSetFormLabDef(int action, QWidget* pObject, const FieldRef& pProperty, QString* wanted = nullptr);
    void SSTab1_Click(int tab);
    void cmdClose_Click();
    void schedulePreview();
    void previewDone(int generation, bool ok, const QString& why);

    std::unique_ptr<Ui::FrmLabDefForm> ui;
    DirectLabelLayout& m_layout;
    std::shared_ptr<Prompt> m_prompt;
    std::vector<LineRow> m_rows;
    QStringList m_fieldCaptions;
    PreviewSource m_previewSource;
    QString m_priceFormat;
    QTimer* m_previewTimer = nullptr;
    QProcess* m_browser = nullptr;
    std::unique_ptr<QTemporaryDir> m_previewDir;
    QString m_previewPng;
    int m_previewGeneration = 0;
};

} // namespace tagora
