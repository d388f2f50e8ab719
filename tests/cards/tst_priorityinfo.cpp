#include <QtTest>

class TestPlaceholder : public QObject {
    Q_OBJECT
private slots:
    void nothingYet() {}
};

QTEST_MAIN(TestPlaceholder)
#include "tst_priorityinfo.moc"
