#include "PlatformComparisonView.h"

#include "NameLibrary.h"
#include "PlatformScanFile.h"
#include "PlatformTools.h"

#include <QGuiApplication>
#include <QHeaderView>
#include <QScopeGuard>
#include <QtConcurrent/QtConcurrentMap>

namespace {

constexpr int ResizeSampleRows = 200;

} // namespace

PlatformComparisonView::PlatformComparisonView(QWidget* parent)
    : QFrame(parent)
    , m_model(new PlatformComparisonModel(this))
{
    initializeLibrary();
    setupUi(this);
    _comparisonTable->setModel(m_model);
    _comparisonTable->verticalHeader()->setDefaultSectionSize(20);
    _comparisonTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    // Loads sort by class name, A to Z (a fresh header would sort Z to A).
    _comparisonTable->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
    connect(_differencesOnly, &QCheckBox::toggled, this, &PlatformComparisonView::showDifferencesOnly);
}

bool PlatformComparisonView::loadScan(const QString& path)
{
    return loadScans({path});
}

bool PlatformComparisonView::loadScans(const QStringList& paths)
{
    QGuiApplication::setOverrideCursor(Qt::WaitCursor);
    const auto restoreCursor = qScopeGuard([] { QGuiApplication::restoreOverrideCursor(); });

    // Parsing is nearly all of the time, and the files are independent: read them at once.
    const QVector<PlatformScanFile> files = QtConcurrent::blockingMapped<QVector<PlatformScanFile>>(
        paths, [](const QString& path) { return PlatformScanFile::read(path); });
    const auto resume = qScopeGuard([this] {
        // Sorts the rows, new ones too, by the header's choice (and shows it from the first load).
        _comparisonTable->setSortingEnabled(true);
        _comparisonTable->resizeColumnsToContents();
        _summaryLabel->setText(m_model->comparison().summary());
    });
    for (int i = 0; i < files.size(); ++i) {
        const PlatformScanFile& file = files.at(i);
        if (file.status == PlatformScanFile::Unreadable)
            return false;
        const int scan = m_model->addScan(file.header);
        if (file.status == PlatformScanFile::WrongFormat) {
            informUser(this, tr("File Format Error"), paths.at(i) + tr(" is not the right format."));
            return false;
        }
        m_model->addEntries(scan, file.entries);
    }
    return true;
}

void PlatformComparisonView::showDifferencesOnly(bool on)
{
    m_model->setDifferencesOnly(on);
}

QString PlatformComparisonView::exportText() const
{
    return comparison().scans().isEmpty() ? QString() : comparison().report().toXml();
}
