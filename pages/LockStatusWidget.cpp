#include "LockStatusWidget.h"

#include "EnablementExpiry.h"
#include "Portlex.h"

#include <QMouseEvent>
#include <QSettings>

LockStatusWidget::LockStatusWidget(QWidget* parent)
    : QAbstractButton(parent)
{
    Portlex::Ref();
    setupUi(this);
    setAttribute(Qt::WA_NoMousePropagation);
    // A button losing the focus reports a release: the dialog it opens would open it again.
    setFocusPolicy(Qt::NoFocus);
    for (EventLabel* label : {_modeStatus, _ledStatus}) {
        connect(label, &QWidget::customContextMenuRequested, this,
            &LockStatusWidget::onCustomContextMenuRequested);
        connect(label, &EventLabel::mouseRelease, this, &LockStatusWidget::onMouseRelease);
    }

    // The first two indicators ever built point out that they can be clicked.
    QSettings settings;
    const int seen = settings.value("lockseen", 0).toInt();
    if (seen < 2) {
        setCursor(QCursor(QPixmap(":/LockStatusWidget/Resources/InfoCursor.png"), 5, 10));
        settings.setValue("lockseen", seen + 1);
    }
}

LockStatusWidget::~LockStatusWidget()
{
    m_device.reset();
    Portlex::Deref();
}

void LockStatusWidget::setDevice(const QString& deviceId)
{
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(deviceId);
    if (!device)
        return;
    m_device = device;

    QString mode, owner, expiry;
    if (m_device->GlobalTestSigStatus(mode, owner, expiry) == EnablementEnabled) {
        setToolTip(tr("Developer Enabled Signature expires:\n") + expiry);
        showLed(QStringLiteral(":/LockStatusWidget/Resources/Globe.png"));
        _modeStatus->setText(tr("Sig Enabled"));
        return;
    }
    if (m_device->TepStatus(mode, owner, expiry) == EnablementEnabled) {
        setToolTip(tr("Developer Enabled Service expires:\n") + expiry);
        showLed(serviceLedPicture(expiry, QDate::currentDate()));
        _modeStatus->setText(tr("DES Enabled"));
        return;
    }
    // Asked again after a lock, the expiry of a mode that has ended must not linger.
    setToolTip(QString());
    _modeStatus->setText(tr("Simulator Enabled"));
    showLed(QStringLiteral(":/LockStatusWidget/Resources/UnlitLED.png"));
}

void LockStatusWidget::showLed(const QString& picture)
{
    _ledStatus->setPixmap(QPixmap(picture));
}

void LockStatusWidget::onCustomContextMenuRequested(QPoint)
{
    emit released();
}

void LockStatusWidget::onMouseRelease(QMouseEvent* event)
{
    event->accept();
    // A right-click has already been reported as a context menu request.
    if (event->button() != Qt::RightButton)
        emit released();
}

void LockStatusWidget::mouseReleaseEvent(QMouseEvent* event)
{
    event->accept();
    emit released();
}

void LockStatusWidget::paintEvent(QPaintEvent*) { }
