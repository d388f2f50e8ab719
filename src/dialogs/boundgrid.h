#pragma once

#include <QAbstractTableModel>
#include <QIcon>
#include <QStyledItemDelegate>
#include <QTableView>
#include <QVariant>
#include <QVector>

#include <limits>

namespace tagora {

// The small card picture of a grid's item-card column: a card with two lines.
QIcon ItemCardIcon();

// One column of a bound grid: which field of the query it shows and how.
struct BoundColumn {
    enum class Kind { Text, Number, Check, Picture, Choice, Button };
    QString field;  // the query's column; empty for a picture or button column
    QString header;
    Kind kind = Kind::Text;
    bool editable = false;
    // None given: texts align to the side their own reading direction starts
    // from (Hebrew right, Latin left), numbers right so their digits line up,
    // check boxes and pictures in the middle.
    Qt::Alignment alignment;
    // Number: the whole numbers a cell takes; anything else typed is refused.
    qlonglong minimum = std::numeric_limits<int>::min();
    qlonglong maximum = std::numeric_limits<int>::max();
    QVector<QPair<QVariant, QString>> choices; // Choice: stored value and the text shown for it
    QIcon icon;                                // Picture and Button
    QString buttonText;                        // Button
};

inline BoundColumn boundColumn(const QString& field, const QString& header, BoundColumn::Kind kind,
                               bool editable = false, Qt::Alignment alignment = {})
{
    BoundColumn c;
    c.field = field;
    c.header = header;
    c.kind = kind;
    c.editable = editable;
    c.alignment = alignment;
    return c;
}

// The rows of a query over a local database file, with every edit written to
// its base table at once (found by the key fields, which the query selects).
// Nothing here shows anything: a failed write, or a typed value the column
// refuses, leaves the row as it was and is reported through writeFailed.
class BoundTableModel : public QAbstractTableModel {
    Q_OBJECT
public:
    explicit BoundTableModel(QObject* parent = nullptr);

    void setSource(const QString& dbPath, const QString& baseTable, const QStringList& keyFields,
                   const QVector<BoundColumn>& columns);
    // Runs the query and shows its rows; false (with lastError) when it failed,
    // leaving the rows shown before.
    bool setQuery(const QString& sql);
    // The same with values for the query's "?" markers, in order: what the
    // user typed reaches the engine as a value, never as query text.
    bool setQuery(const QString& sql, const QVariantList& params);
    bool refresh();
    QString query() const { return m_sql; }
    QString lastError() const { return m_error; }

    const QVector<BoundColumn>& columns() const { return m_columns; }
    QVariant value(int row, const QString& field) const;
    // Writes one field of many rows in one transaction; false when it failed
    // (nothing written then).
    bool setField(const QVector<int>& rows, const QString& field, const QVariant& value);
    // The same for every row shown that holds another value; true when there
    // was nothing to write.
    bool setFieldInAllRows(const QString& field, const QVariant& value);
    // Shows no rows, keeping the query: for a list whose rows belong to
    // something no longer there, which must not go on showing (or taking
    // marks for) what it showed before.
    void clearRows();
    // Adds one row to the base table (field, value pairs) and shows the rows
    // again; false (with lastError, and isDuplicateKey when the key is taken)
    // when nothing was added. Reported by the caller, not through writeFailed.
    bool addRecord(const QVector<QPair<QString, QVariant>>& values);
    bool lastWasDuplicateKey() const { return m_duplicate; }
    // Deletes the row's record from the base table and shows the rows again;
    // false (with lastError) when no record was deleted.
    bool deleteRecord(int row);

    int rowCount(const QModelIndex& parent = QModelIndex()) const override;
    int columnCount(const QModelIndex& parent = QModelIndex()) const override;
    QVariant data(const QModelIndex& index, int role = Qt::DisplayRole) const override;
    bool setData(const QModelIndex& index, const QVariant& value, int role = Qt::EditRole) override;
    Qt::ItemFlags flags(const QModelIndex& index) const override;
    QVariant headerData(int section, Qt::Orientation orientation, int role = Qt::DisplayRole) const override;

signals:
    // Why a change did not reach the file, in words for the user.
    void writeFailed(const QString& message);

private:
    int fieldIndex(const QString& field) const;
    QString choiceText(const BoundColumn& c, const QVariant& v) const;
    Qt::Alignment alignment(const BoundColumn& c, const QModelIndex& index) const;

    QString m_dbPath;
    QString m_base;
    QStringList m_keys;
    QVector<BoundColumn> m_columns;
    QString m_sql;
    QVariantList m_params;
    bool m_duplicate = false;
    QStringList m_fields;              // the query's columns
    QVector<QVector<QVariant>> m_rows; // values by query column
    QString m_error;
};

// The grid a bound model is shown in: check boxes, typed numbers, lists of
// values with shown texts, a picture or button column, a current row, and
// several rows selected at once. Right to left like the screens it sits on.
class BoundGrid : public QTableView {
    Q_OBJECT
public:
    explicit BoundGrid(QWidget* parent = nullptr);

    void setBoundModel(BoundTableModel* model);
    BoundTableModel* boundModel() const { return m_model; }

    int currentRowIndex() const;
    void setCurrentRowIndex(int row, int column = 1);
    void sizeColumns();
    // The column that takes the width the others leave, in place of the last
    // one: a wide check box column reads badly when its box sits far from its title.
    void stretchColumn(int column);
    // The cell's text as the grid shows it.
    QString text(int row, int column) const;

signals:
    // A click on a picture or button cell.
    void cellActivated(int row, int column);

private:
    BoundTableModel* m_model = nullptr;
};

// Draws each cell's text in its own reading direction, so a Latin key keeps
// its punctuation in place on a right-to-left grid.
class BoundItemDelegate : public QStyledItemDelegate {
    Q_OBJECT
public:
    using QStyledItemDelegate::QStyledItemDelegate;

protected:
    void initStyleOption(QStyleOptionViewItem* option, const QModelIndex& index) const override;
};

// Edits a Choice column with a list of the shown texts.
class ChoiceDelegate : public BoundItemDelegate {
    Q_OBJECT
public:
    using BoundItemDelegate::BoundItemDelegate;
    QWidget* createEditor(QWidget* parent, const QStyleOptionViewItem&, const QModelIndex& index) const override;
    void setEditorData(QWidget* editor, const QModelIndex& index) const override;
    void setModelData(QWidget* editor, QAbstractItemModel* model, const QModelIndex& index) const override;
};

class Prompt;

// Deletes the grid's current record after asking the question (No keeps it);
// a delete that fails is reported with the failure text and the engine's
// reason, so it never looks done. The current row stays where it was.
void DeleteCurrentRecord(BoundGrid& grid, BoundTableModel& model, Prompt& prompt, const QString& question,
                         const QString& failure);

} // namespace tagora

using tagora::BoundGrid;
