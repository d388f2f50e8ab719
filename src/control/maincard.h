#pragma once

#include "erp/odbc.h"
#include "labels/itemquery.h"
#include "labels/labelpreview.h"
#include "platform/progress.h"
#include "platform/services.h"

#include <QPointer>
#include <QVariant>
#include <QVariantMap>
#include <QWidget>
#include <memory>
#include <optional>
#include <vector>

class QLabel;
class QFrame;
class QTabWidget;
class QDialog;

namespace Ui {
class MainCardForm;
}

namespace tagora {

class CommonDialog;
struct ReadError;
struct ErpReadContext;
struct DocImportOptions;
struct CaselessKeysReport;
struct PlateFieldRow;

// What the control hands to a dialog before it opens it.
struct SharedDialogState {
    QString dataFolder;
    short labelProgram = 0;
    QString itemRangeCriteria;
    bool itemTextRtl = false;
    QPointer<QObject> objectRef;
};

// The label printing control: ten tabs of settings and commands, a status line
// and a progress bar, and the public methods a host drives it with. The
// controls are the settings: every command reads its values from them.
class MainCard : public QWidget, public ProgressSink, public ControlCommands {
    Q_OBJECT
public:
    // The creation steps run here, with the services given (or the defaults).
    explicit MainCard(QWidget* parent = nullptr, Services services = {});
    ~MainCard() override;

    // ---- Public automation methods, in their published order ----
    Q_INVOKABLE void cmdPrintItmes_Click();
    Q_INVOKABLE void cmdSelectItems_Click();
    Q_INVOKABLE short GetOLEOption();
    Q_INVOKABLE short RunOLE(const QString& DefaultLabelName, short Copies, uchar pQueryType, short pServerType,
                             const QString& pDBName, bool pPrintHeadLab, bool ByPlate = false);
    Q_INVOKABLE void SetGetRegPrm(uchar Action, const QString& pRegApp, const QString& pRegSection,
                                  const QString& pParName, QObject* pObjRef, uchar pObjType, const QVariant& pDefault);
    Q_INVOKABLE void SetGetRegParams(uchar MySection, uchar Action);
    Q_INVOKABLE QVariant BuildItemQuery(uchar pQueryType, uchar pOrderBy);
    Q_INVOKABLE void ClearMessage();
    Q_INVOKABLE void FillCmbPriceField();
    Q_INVOKABLE short ReadAlterKeyPRIORITY(const QString& CompPath, const QString& pDBFullName,
                                           const QVariant& pFromItemSort, const QVariant& pToItemSort, bool pByDocs,
                                           const QString& pTableName);
    Q_INVOKABLE short ReadAlterKeySupPRIORITY(const QString& CompPath, const QString& pDBFullName,
                                              const QVariant& pFromItemSort, const QVariant& pToItemSort,
                                              bool pByDocs, const QString& pTableName);
    Q_INVOKABLE QString BuildDocRangeCriteria(const QVariantMap& rsDT, const QVariant& FromDate,
                                              const QVariant& ToDate, const QString& FromDocNum,
                                              const QString& ToDocNum, int Indx, bool pIncludeDraft);
    Q_INVOKABLE QString BuildItemByDocCriteria(const QString& HeadTable, const QString& LineTable,
                                               const QString& FldID);
    Q_INVOKABLE short ImportItemsByDocs(const QString& WizPath, const QString& MyDBName,
                                        const QVariant& pFromItemKey, const QVariant& pToItemKey, short UseFName,
                                        short pCopies, int pPriceField, bool pImportPackUnits, bool pByDocs);
    Q_INVOKABLE short ReadItemPriority(const QString& CompPath, const QString& pDBPath,
                                       const QVariant& pFromItemSort, const QVariant& pToItemSort, short GetForeign,
                                       short pCopies, int pPriceField, bool pImportPackUnits, bool pByDocs,
                                       bool pWithWhouseData);
    Q_INVOKABLE void UpdateMainItemTables(const QString& pTempItemDB);
    Q_INVOKABLE void FillCmbUser();
    Q_INVOKABLE short ReadLabelDefPriority(const QString& CompPath, const QString& pDBPath);
    Q_INVOKABLE int GetUserNum();
    Q_INVOKABLE short ReadLabelDataPriority(const QString& CompPath, const QString& pDBPath);
    Q_INVOKABLE QVariant BuildItemQueryFromPlate(uchar pQueryType, uchar pOrderBy);
    Q_INVOKABLE short ReadPriceListPriority(const QString& CompPath, const QString& pDBFullName,
                                            const QVariant& pFromItemSort, const QVariant& pToItemSort, bool pByDocs,
                                            const QString& pTableName);
    Q_INVOKABLE int ReadStockPriority(const QString& CompPath, const QString& pDBName, short DocTypeID,
                                      const QVariantMap& rsDT, const QVariant& FromDate, const QVariant& ToDate,
                                      bool pDraftDocs = false, bool pWithExport = false);
    Q_INVOKABLE short ReadAlterPricePRIORITY(const QString& CompPath, const QString& pDBFullName,
                                             const QVariant& pFromItemSort, const QVariant& pToItemSort,
                                             bool pByDocs, const QString& pTableName);
    Q_INVOKABLE bool CreateLabFile(const QString& pFileName, const QString& pDBName, uchar pQueryType,
                                   uchar pOrderBy);
    Q_INVOKABLE short ReadPriceListNamePriority(const QString& CompPath, const QString& pDBPath);
    Q_INVOKABLE void CreateListFile(const QString& pFileName, const QString& pDBName, uchar pQueryType,
                                    uchar pOrderBy);
    Q_INVOKABLE short ReadItemFName(const QString& CompPath, const QString& pDBPath, const QVariant& pFromItemSort,
                                    const QVariant& pToItemSort, bool pByDocs);
    Q_INVOKABLE void UpdateDocsAlterKeys(const QString& pTempItemDB);

    // ---- For hosts and the rest of the system ----
    // The steps of creation and of showing; showing also runs on every show event.
    void UserControl_InitProperties();
    void UserControl_Show();

    // A control of the screen by its name ("txtDBPath", "OptOLE(3)").
    QObject* control(const QString& name) const;
    template <class T> T* control(const QString& name) const { return qobject_cast<T*>(control(name)); }

    // Status line and progress bar.
    void setMessage(const QString& text) override;
    void setProgress(double fraction) override;
    // During an import: Esc cancels it (see CancellableWork).
    bool cancelRequested() override;
    QString message() const;
    double progress() const { return m_progress; }

    const Services& services() const { return m_services; }
    const SharedDialogState& sharedState() const { return m_shared; }

    // The data folder joined with one of the database file names.
    QString dataFile(const QString& fileName) const;

    // Item range criteria of the labels-by-items tab: " And ItemKey >= '..'" and so on.
    QString itemRangeCriteria() const;

    // What the dialogs ask of the control.
    void showItemCard(const QString& itemKey, bool fromErp) override;
    void printMarkedItems() override { cmdPrintItmes_Click(); }

signals:
    // Every change of the status line text.
    void messageChanged(const QString& text);

protected:
    void showEvent(QShowEvent* event) override;
    bool eventFilter(QObject* watched, QEvent* event) override;

private:
    void buildFieldRows();
    void connectHandlers();
    void applyProgressGeometry();

    // Creation and show-time hooks.
    void LoadConnParams();
    void FillPrinterList();
    bool TestConnection();
    void SetGetLabelDefs(int action);
    // The captions of the label fields, LblFldDesc(0) on, in field index order.
    QStringList fieldCaptions() const;
    // The record the designer's preview shows, fields by field index: the
    // first label of the marked items, else of the marked document lines,
    // else sample values of each field's kind.
    QVector<PreviewField> previewRecord() const;
    // The one place that fills the lists whose entries come from the ERP.
    void FillErpLists();
    // Fills them again after a new connection, keeping or loading their positions.
    void RefillErpLists();
    // True (and said in the status line) when saving must not run.
    bool saveBlocked();

    // Handlers of the screen.
    void MainTab_Click(int tab);
    void CmdDir_Click(int index);
    void cmdPreview_Click(int index);
    void cmdPrintDocButt_Click();
    void cmdUpgrade_Click();
    void lblVarNum_Click(int row);
    void LblToDate_Click();
    void txtFromDocNum_Change();
    void stepPicture_Click(const QString& buttonName);
    void cmdSelectDocItems_Click();
    void CmdDocType_Click();
    void cmdRanges_Click();
    void cmdAccDef_Click();
    void cmdAlterKeys_Click();
    void cmdEditItems_Click();
    void cmdLabDesign_Click();
    void CmdConnect_Click();
    void CmdImportItems_Click();
    void cmdImportDocs_Click();
    void cmdLabByPlate_Click();
    void cmdSaveDef_Click(int section);

    void printLabels(int queryType);
    // Brings a file of an earlier version to keys that ignore case, telling
    // the user of rows set aside; false when that failed (shown unless quiet).
    bool caselessKeys(const QString& path, bool quiet = false, CaselessKeysReport* done = nullptr);

    // Work that other parts of the system do for the commands above.
    bool SetDefaultPrinter(const QString& printer, QString* error);
    void SetBrowserPrinter(const QString& printer);
    // byPlate: the records of the ERP's label list, a field filled by the
    // parameter its row names (empty when it names none).
    bool PrintDirectLabels(uchar queryType, const QString& dbPath, bool byPlate = false);
    bool prepareDirectFields(QString* error);
    // Why the label-data query of the screen's settings cannot run, or empty text.
    QString labelQueryProblem() const;
    // The general tab's line naming where the chosen program's labels go.
    void updateOutputLabel();
    // Seconds each outside step of printing may take (settings, Automation).
    int automationTimeout() const;
    // The label field table as the label-list query reads it.
    std::vector<PlateFieldRow> plateFieldRows() const;
    void ShowItemList(uchar queryType, const QString& dbPath);
    bool prepareLabelData(int queryType);
    // The settings the label-data query is built from; greySent counts a grey
    // send box as ticked, as the item list does.
    LabelQuerySettings labelQuerySettings(bool greySent) const;
    // Writes the item list; empty text on success.
    QString writeItemList(const QString& fileName, const QString& dbPath, uchar queryType, uchar orderBy);
    void ImportItems();
    void ImportDocuments();
    void PrintFromLabelList();
    void showDialog(const QString& formName);
    int runDialog(QDialog& dialog);
    bool reportRead(bool ok, const ReadError& error);
    // A reader's context that carries the current documents' item criteria.
    ErpReadContext docReadContext(const QString& conn);
    ErpReadContext plainContext(const QString& conn);
    // The tab's default copies as a 16-bit number; none when the box holds no such number.
    std::optional<short> defaultCopies() const;
    // The document import's settings as the tab holds them.
    DocImportOptions docImportOptions() const;
    int priceListNumber() const;

    std::unique_ptr<Ui::MainCardForm> ui;
    Services m_services;
    CommonDialog* m_fileDialog = nullptr;
    SharedDialogState m_shared;
    double m_progress = 0.0;
    // While an import runs: the screen keeps painting and takes Esc as a
    // cancel, and no other input reaches the control.
    class CancellableWork;
    CancellableWork* m_work = nullptr;
    // Set by each document import for the item readers that run by documents.
    QString m_currentDocCriteria;
    ErpQuery m_currentItemByDocCriteria;
    // Whether this control has read the direct-label layout from the store.
    bool m_layoutLoaded = false;
    // Set when a write to the settings store failed since the save began, so
    // the status line never calls a partly failed save done.
    bool m_saveFailed = false;
};

} // namespace tagora
