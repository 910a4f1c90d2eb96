#include "SecuritySettings.h"

#include "EnablementQuery.h"
#include "GatewayCall.h"
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
    m_busy = true;
    _lockButton->setEnabled(false);
    _unlockModeLabel->setText(tr("Asking the device..."));
    _expiresLabel->clear();
    setCursor(Qt::BusyCursor);
    const QSharedPointer<_ZantDevice> device = m_device;
    GatewayCall::run(
        this, [device] { return EnablementQuery::ask(*device, true); },
        [this](const EnablementQuery& answer) { showAnswer(answer); });
}

void SecuritySettings::showAnswer(const EnablementQuery& answer)
{
    m_busy = false;
    unsetCursor();
    if (answer.failed()) {
        _unlockModeLabel->setText(GatewayCall::failureText(answer.code, answer.reason));
        return;
    }
    m_serviceEnabled = answer.serviceEnabled;
    m_signatureEnabled = answer.signatureEnabled;
    _lockButton->setEnabled(true);
    switch (answer.mode) {
    case EnablementQuery::Signature:
        _unlockModeLabel->setText(tr("Developer Enabled Signature"));
        break;
    case EnablementQuery::Service:
        _unlockModeLabel->setText(tr("Developer Enabled Service"));
        break;
    case EnablementQuery::None:
        _unlockModeLabel->setText(tr("Disabled???"));
        break;
    }
    _expiresLabel->setText(answer.expiry);

    // Sorting waits until the rows are in, then reads by value, A to Z (a fresh header would
    // sort Z to A).
    _priviledgeTable->setSortingEnabled(false);
    for (const PriviledgeRecord& record : answer.privileges) {
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
    if (!m_device || m_busy)
        return;
    // From the modes as last asked: the service first, while the display names the signature
    // first. The request travels with the next call, so nothing is sent here.
    if (m_serviceEnabled)
        m_device->serviceLockRequest = true;
    else if (m_signatureEnabled)
        m_device->signatureLockRequest = true;
}
