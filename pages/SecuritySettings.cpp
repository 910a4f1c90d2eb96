#include "SecuritySettings.h"

#include "Portlex.h"

#include <QHeaderView>

SecuritySettings::SecuritySettings(QWidget* parent)
    : QWidget(parent)
{
    Portlex::Ref();
    setupUi(this);
    connect(_lockButton, &QPushButton::clicked, this, &SecuritySettings::onLockPressed);
}

SecuritySettings::~SecuritySettings()
{
    m_device.reset();
    Portlex::Deref();
}

void SecuritySettings::setDevice(const QString& deviceId)
{
    m_device = Portlex::GetDevice(deviceId);
    if (!m_device)
        return;

    QString mode, owner, expiry;
    QVector<PriviledgeRecord> priviledges;
    if (m_device->GlobalTestSigStatus(mode, owner, expiry) == EnablementEnabled) {
        _unlockModeLabel->setText(tr("Developer Enabled Signature"));
        _expiresLabel->setText(expiry);
    } else if (m_device->TepStatus(mode, owner, expiry) == EnablementEnabled) {
        _unlockModeLabel->setText(tr("Developer Enabled Service"));
        _expiresLabel->setText(expiry);
        m_device->GetTepSigPrivs(priviledges);
    } else {
        _unlockModeLabel->setText(tr("Disabled???"));
        _expiresLabel->clear();
    }

    // Sorting waits until the rows are in, then reads by value, A to Z (a fresh header would
    // sort Z to A).
    _priviledgeTable->setSortingEnabled(false);
    for (const PriviledgeRecord& record : priviledges) {
        const int row = _priviledgeTable->rowCount();
        _priviledgeTable->insertRow(row);
        int column = 0;
        for (const QString& text : {record.id, record.name, record.family, record.subFamily})
            _priviledgeTable->setItem(row, column++, new QTableWidgetItem(text));
        _priviledgeTable->setRowHeight(row, 20);
    }
    _priviledgeTable->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
    _priviledgeTable->setSortingEnabled(true);
    _priviledgeTable->resizeColumnsToContents();
}

void SecuritySettings::onLockPressed()
{
    if (!m_device)
        return;
    // The service is asked first here, while the display asks the signature first.
    QString mode, owner, expiry;
    if (m_device->TepStatus(mode, owner, expiry) == EnablementEnabled)
        m_device->serviceLockRequest = true;
    else if (m_device->GlobalTestSigStatus(mode, owner, expiry) == EnablementEnabled)
        m_device->signatureLockRequest = true;
}
