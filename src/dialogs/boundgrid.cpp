#include "dialogs/boundgrid.h"

#include "localdb/database.h"
#include "platform/prompt.h"

#include <QComboBox>
#include <QHeaderView>
#include <QPainter>
#include <QPixmap>

#include <algorithm>

namespace tagora {

QIcon ItemCardIcon()
{
    QPixmap pm(16, 16);
    pm.fill(Qt::transparent);
    QPainter p(&pm);
    p.setPen(QColor(0x2b, 0x6c, 0xb0));
    p.setBrush(QColor(0xe8, 0xf0, 0xfa));
    p.drawRect(1, 2, 13, 11);
    p.drawLine(4, 6, 11, 6);
    p.drawLine(4, 9, 9, 9);
    return QIcon(pm);
}


namespace {
// A grid answers a click: when another program holds the file, a short wait
// rides out its commit, and a long one would only freeze the screen before
// the same message.
constexpr int kGridBusyWaitMs = 2000;
} // namespace

BoundTableModel::BoundTableModel(QObject* parent)
    : QAbstractTableModel(parent)
{
}

void BoundTableModel::setSource(const QString& dbPath, const QString& baseTable, const QStringList& keyFields,
                                const QVector<BoundColumn>& columns)
{
    beginResetModel();
    m_dbPath = dbPath;
    m_base = baseTable;
    m_keys = keyFields;
    m_columns = columns;
    m_rows.clear();
    m_fields.clear();
    endResetModel();
}

bool BoundTableModel::setQuery(const QString& sql)
{
    return setQuery(sql, {});
}

bool BoundTableModel::setQuery(const QString& sql, const QVariantList& params)
{
    // A query that fails keeps the rows, and the query, shown before.
    const QString oldSql = m_sql;
    const QVariantList oldParams = m_params;
    m_sql = sql;
    m_params = params;
    if (refresh())
        return true;
    m_sql = oldSql;
    m_params = oldParams;
    return false;
}

bool BoundTableModel::refresh()
{
    Database db;
    db.setBusyWait(kGridBusyWaitMs);
    DbError e = db.open(m_dbPath);
    Statement s;
    if (!e)
        s = db.prepare(m_sql, &e);
    for (int i = 0; !e && i < m_params.size(); ++i)
        s.bind(i + 1, m_params[i]);
    if (e) {
        m_error = e.message;
        return false;
    }
    QStringList fields;
    for (int i = 0; i < s.columnCount(); ++i)
        fields << s.columnName(i);
    QVector<QVector<QVariant>> rows;
    Statement::Step st;
    while ((st = s.step()) == Statement::Step::Row) {
        QVector<QVariant> r(fields.size());
        for (int i = 0; i < fields.size(); ++i)
            r[i] = s.value(i);
        rows.push_back(std::move(r));
    }
    if (st == Statement::Step::Error) {
        m_error = s.error().message;
        return false;
    }
    beginResetModel();
    m_fields = fields;
    m_rows = std::move(rows);
    m_error.clear();
    endResetModel();
    return true;
}

int BoundTableModel::fieldIndex(const QString& field) const
{
    for (int i = 0; i < m_fields.size(); ++i)
        if (m_fields[i].compare(field, Qt::CaseInsensitive) == 0)
            return i;
    return -1;
}

QVariant BoundTableModel::value(int row, const QString& field) const
{
    const int f = fieldIndex(field);
    if (row < 0 || row >= m_rows.size() || f < 0)
        return QVariant();
    return m_rows[row][f];
}

int BoundTableModel::rowCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_rows.size());
}

int BoundTableModel::columnCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_columns.size());
}

QString BoundTableModel::choiceText(const BoundColumn& c, const QVariant& v) const
{
    for (const auto& [stored, shown] : c.choices)
        if (stored.toString() == v.toString())
            return shown;
    return v.toString();
}

QVariant BoundTableModel::data(const QModelIndex& index, int role) const
{
    if (!index.isValid() || index.row() >= m_rows.size() || index.column() >= m_columns.size())
        return QVariant();
    const BoundColumn& c = m_columns[index.column()];
    const QVariant v = c.field.isEmpty() ? QVariant() : value(index.row(), c.field);
    switch (role) {
    case Qt::DisplayRole:
        if (c.kind == BoundColumn::Kind::Check || c.kind == BoundColumn::Kind::Picture)
            return QVariant();
        if (c.kind == BoundColumn::Kind::Button)
            return c.buttonText;
        if (c.kind == BoundColumn::Kind::Choice)
            return choiceText(c, v);
        return v.isNull() ? QVariant(QString()) : v;
    case Qt::EditRole:
        return v;
    case Qt::CheckStateRole:
        if (c.kind != BoundColumn::Kind::Check)
            return QVariant();
        return v.toLongLong() != 0 ? Qt::Checked : Qt::Unchecked;
    case Qt::DecorationRole:
        if (c.kind == BoundColumn::Kind::Picture || c.kind == BoundColumn::Kind::Button)
            return c.icon.isNull() ? QVariant() : QVariant(c.icon);
        return QVariant();
    case Qt::TextAlignmentRole:
        return QVariant::fromValue(alignment(c, index));
    default:
        return QVariant();
    }
}

Qt::Alignment BoundTableModel::alignment(const BoundColumn& c, const QModelIndex& index) const
{
    if (c.alignment)
        return c.alignment;
    // Absolute sides: the grid is right to left, but a Latin text still
    // starts at the left and a number's units still line up at the right.
    switch (c.kind) {
    case BoundColumn::Kind::Number:
        return Qt::AlignRight | Qt::AlignAbsolute | Qt::AlignVCenter;
    case BoundColumn::Kind::Text:
    case BoundColumn::Kind::Choice:
        return (data(index, Qt::DisplayRole).toString().isRightToLeft() ? Qt::AlignRight : Qt::AlignLeft)
            | Qt::AlignAbsolute | Qt::AlignVCenter;
    default:
        return Qt::AlignCenter;
    }
}

Qt::ItemFlags BoundTableModel::flags(const QModelIndex& index) const
{
    if (!index.isValid())
        return Qt::NoItemFlags;
    Qt::ItemFlags f = Qt::ItemIsEnabled | Qt::ItemIsSelectable;
    const BoundColumn& c = m_columns[index.column()];
    if (c.editable) {
        if (c.kind == BoundColumn::Kind::Check)
            f |= Qt::ItemIsUserCheckable;
        else if (c.kind != BoundColumn::Kind::Picture && c.kind != BoundColumn::Kind::Button)
            f |= Qt::ItemIsEditable;
    }
    return f;
}

bool BoundTableModel::setData(const QModelIndex& index, const QVariant& value, int role)
{
    if (!index.isValid() || index.row() >= m_rows.size())
        return false;
    const BoundColumn& c = m_columns[index.column()];
    if (!c.editable || c.field.isEmpty())
        return false;
    QVariant stored;
    if (c.kind == BoundColumn::Kind::Check) {
        if (role != Qt::CheckStateRole && role != Qt::EditRole)
            return false;
        const bool on = role == Qt::CheckStateRole ? value.toInt() == Qt::Checked : value.toBool();
        stored = on ? 1 : 0;
    } else {
        if (role != Qt::EditRole)
            return false;
        stored = value;
        if (c.kind == BoundColumn::Kind::Number) {
            const QString typed = value.toString().trimmed();
            bool ok = false;
            const qlonglong n = typed.toLongLong(&ok);
            if (!ok || n < c.minimum || n > c.maximum) {
                m_error = QStringLiteral("בעמודה \"%1\" יש להקליד מספר שלם בין %2 ל-%3; הערך \"%4\" לא נשמר")
                              .arg(c.header)
                              .arg(c.minimum)
                              .arg(c.maximum)
                              .arg(typed);
                emit writeFailed(m_error);
                return false;
            }
            stored = n;
        }
    }
    return setField({index.row()}, c.field, stored);
}

bool BoundTableModel::setField(const QVector<int>& rows, const QString& field, const QVariant& value)
{
    const int f = fieldIndex(field);
    if (f < 0 || rows.isEmpty())
        return false;
    QStringList where;
    for (int k = 0; k < m_keys.size(); ++k)
        where << QStringLiteral("\"%1\" = ?%2").arg(m_keys[k]).arg(k + 2);
    Database db;
    db.setBusyWait(kGridBusyWaitMs);
    DbError e = db.open(m_dbPath);
    if (!e) {
        Transaction tx(db);
        Statement update = db.prepare(QStringLiteral("UPDATE \"%1\" SET \"%2\" = ?1 WHERE %3")
                                          .arg(m_base, m_fields[f], where.join(QStringLiteral(" AND "))),
                                      &e);
        for (int row : rows) {
            if (e)
                break;
            update.bind(1, value);
            for (int k = 0; k < m_keys.size(); ++k)
                update.bind(k + 2, this->value(row, m_keys[k]));
            e = update.run();
        }
        if (!e)
            e = tx.commit();
    }
    if (e) {
        m_error = e.message;
        emit writeFailed(e.message);
        return false;
    }
    for (int row : rows) {
        m_rows[row][f] = value;
        for (int col = 0; col < m_columns.size(); ++col)
            if (m_columns[col].field.compare(field, Qt::CaseInsensitive) == 0)
                emit dataChanged(index(row, col), index(row, col));
    }
    return true;
}

bool BoundTableModel::setFieldInAllRows(const QString& field, const QVariant& value)
{
    const int f = fieldIndex(field);
    if (f < 0)
        return false;
    QVector<int> rows;
    for (int row = 0; row < m_rows.size(); ++row)
        if (m_rows[row][f].isNull() || m_rows[row][f] != value)
            rows << row;
    return rows.isEmpty() || setField(rows, field, value);
}

void BoundTableModel::clearRows()
{
    if (m_rows.isEmpty())
        return;
    beginResetModel();
    m_rows.clear();
    endResetModel();
}

bool BoundTableModel::addRecord(const QVector<QPair<QString, QVariant>>& values)
{
    m_duplicate = false;
    QStringList names, marks;
    for (const auto& [field, value] : values) {
        names << QStringLiteral("\"%1\"").arg(field);
        marks << QStringLiteral("?");
    }
    Database db;
    db.setBusyWait(kGridBusyWaitMs);
    DbError e = db.open(m_dbPath);
    Statement insert;
    if (!e)
        insert = db.prepare(QStringLiteral("INSERT INTO \"%1\" (%2) VALUES (%3)")
                                .arg(m_base, names.join(QStringLiteral(", ")), marks.join(QStringLiteral(", "))),
                            &e);
    for (int i = 0; !e && i < values.size(); ++i)
        insert.bind(i + 1, values[i].second);
    if (!e)
        e = insert.run();
    if (e) {
        m_error = e.message;
        m_duplicate = e.isDuplicateKey();
        return false;
    }
    db.close();
    refresh();
    return true;
}

bool BoundTableModel::deleteRecord(int row)
{
    if (row < 0 || row >= m_rows.size() || m_keys.isEmpty()) {
        m_error = QStringLiteral("לא נבחרה שורה למחיקה");
        return false;
    }
    QStringList where;
    for (int k = 0; k < m_keys.size(); ++k)
        where << QStringLiteral("\"%1\" = ?").arg(m_keys[k]);
    Database db;
    db.setBusyWait(kGridBusyWaitMs);
    DbError e = db.open(m_dbPath);
    Statement del;
    if (!e)
        del = db.prepare(QStringLiteral("DELETE FROM \"%1\" WHERE %2").arg(m_base, where.join(QStringLiteral(" AND "))), &e);
    for (int k = 0; !e && k < m_keys.size(); ++k)
        del.bind(k + 1, value(row, m_keys[k]));
    if (!e)
        e = del.run();
    // Someone else may have deleted or re-keyed it since it was shown.
    if (!e && db.changes() == 0)
        e = DbError::notFound(QStringLiteral("השורה כבר אינה בטבלה"));
    db.close();
    if (e) {
        m_error = e.message;
        refresh();
        m_error = e.message;
        return false;
    }
    refresh();
    return true;
}

QVariant BoundTableModel::headerData(int section, Qt::Orientation orientation, int role) const
{
    if (orientation == Qt::Horizontal && role == Qt::DisplayRole && section >= 0 && section < m_columns.size())
        return m_columns[section].header;
    return QAbstractTableModel::headerData(section, orientation, role);
}

// ------------------------------------------------------------------ the grid

BoundGrid::BoundGrid(QWidget* parent)
    : QTableView(parent)
{
    setLayoutDirection(Qt::RightToLeft);
    setSelectionBehavior(QAbstractItemView::SelectRows);
    setSelectionMode(QAbstractItemView::ExtendedSelection);
    setEditTriggers(QAbstractItemView::DoubleClicked | QAbstractItemView::EditKeyPressed
                    | QAbstractItemView::AnyKeyPressed | QAbstractItemView::SelectedClicked);
    verticalHeader()->setVisible(false);
    verticalHeader()->setDefaultSectionSize(22);
    horizontalHeader()->setStretchLastSection(true);
    connect(this, &QAbstractItemView::clicked, this, [this](const QModelIndex& index) {
        if (!m_model || !index.isValid())
            return;
        const auto kind = m_model->columns()[index.column()].kind;
        if (kind == BoundColumn::Kind::Picture || kind == BoundColumn::Kind::Button)
            emit cellActivated(index.row(), index.column());
    });
}

void BoundGrid::setBoundModel(BoundTableModel* model)
{
    m_model = model;
    setModel(model);
    setItemDelegate(new BoundItemDelegate(this));
    for (int c = 0; c < model->columns().size(); ++c)
        if (model->columns()[c].kind == BoundColumn::Kind::Choice)
            setItemDelegateForColumn(c, new ChoiceDelegate(this));
    connect(model, &QAbstractItemModel::modelReset, this, &BoundGrid::sizeColumns);
}

int BoundGrid::currentRowIndex() const
{
    return currentIndex().isValid() ? currentIndex().row() : -1;
}

void BoundGrid::setCurrentRowIndex(int row, int column)
{
    if (!m_model || row < 0 || row >= m_model->rowCount())
        return;
    const QModelIndex i = m_model->index(row, std::min(column, m_model->columnCount() - 1));
    setCurrentIndex(i);
    scrollTo(i);
}

void BoundGrid::sizeColumns()
{
    if (!m_model)
        return;
    for (int c = 0; c < m_model->columnCount(); ++c) {
        if (m_model->columns()[c].kind == BoundColumn::Kind::Picture)
            setColumnWidth(c, 24);
        else
            resizeColumnToContents(c);
    }
}

void BoundGrid::stretchColumn(int column)
{
    horizontalHeader()->setStretchLastSection(false);
    horizontalHeader()->setSectionResizeMode(column, QHeaderView::Stretch);
}

QString BoundGrid::text(int row, int column) const
{
    if (!m_model || row < 0 || row >= m_model->rowCount() || column < 0 || column >= m_model->columnCount())
        return QString();
    const QModelIndex i = m_model->index(row, column);
    if (m_model->columns()[column].kind == BoundColumn::Kind::Check)
        return m_model->data(i, Qt::CheckStateRole).toInt() == Qt::Checked ? QStringLiteral("1") : QStringLiteral("0");
    return m_model->data(i, Qt::DisplayRole).toString();
}

void BoundItemDelegate::initStyleOption(QStyleOptionViewItem* option, const QModelIndex& index) const
{
    QStyledItemDelegate::initStyleOption(option, index);
    if (option->features.testFlag(QStyleOptionViewItem::HasDisplay))
        option->direction = option->text.isRightToLeft() ? Qt::RightToLeft : Qt::LeftToRight;
}

QWidget* ChoiceDelegate::createEditor(QWidget* parent, const QStyleOptionViewItem&, const QModelIndex& index) const
{
    auto* model = qobject_cast<const BoundTableModel*>(index.model());
    auto* box = new QComboBox(parent);
    if (model)
        for (const auto& [stored, shown] : model->columns()[index.column()].choices)
            box->addItem(shown, stored);
    return box;
}

void ChoiceDelegate::setEditorData(QWidget* editor, const QModelIndex& index) const
{
    auto* box = static_cast<QComboBox*>(editor);
    box->setCurrentIndex(box->findData(index.data(Qt::EditRole)));
}

void ChoiceDelegate::setModelData(QWidget* editor, QAbstractItemModel* model, const QModelIndex& index) const
{
    auto* box = static_cast<QComboBox*>(editor);
    if (box->currentIndex() >= 0)
        model->setData(index, box->currentData(), Qt::EditRole);
}

void DeleteCurrentRecord(BoundGrid& grid, BoundTableModel& model, Prompt& prompt, const QString& question,
                         const QString& failure)
{
    const int row = grid.currentRowIndex();
    if (row < 0)
        return;
    if (!prompt.ask(PromptIcon::Question, titles::Attention, question))
        return;
    if (!model.deleteRecord(row))
        prompt.critical(titles::Error, failure + model.lastError());
    else
        grid.setCurrentRowIndex(std::min(row, model.rowCount() - 1));
}

} // namespace tagora
