#include "LockStatusWidget.h"

#include "EnablementExpiry.h"
#include "EnablementQuery.h"
#include "GatewayCall.h"
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
    m_busy = true;
    const int question = ++m_question;
    GatewayCall::run(
        this, [device] { return EnablementQuery::ask(*device, false); },
        [this, question](const EnablementQuery& answer) {
            if (question != m_question)
                return;
            m_busy = false;
            showAnswer(answer);
        });
}

void LockStatusWidget::showAnswer(const EnablementQuery& answer)
{
    setEnabled(true);
    if (answer.failed()) {
        const QString text = GatewayCall::failureText(answer.code, answer.reason);
        setToolTip(text);
        _modeStatus->setText(tr("Not known"));
        showLed(QStringLiteral(":/LockStatusWidget/Resources/UnlitLED.png"));
        emit failed(answer.code, text);
        return;
    }
    switch (answer.mode) {
    case EnablementQuery::Signature:
        setToolTip(tr("Developer Enabled Signature expires:\n") + answer.expiry);
        showLed(QStringLiteral(":/LockStatusWidget/Resources/Globe.png"));
        _modeStatus->setText(tr("Sig Enabled"));
        return;
    case EnablementQuery::Service:
        setToolTip(tr("Developer Enabled Service expires:\n") + answer.expiry);
        showLed(serviceLedPicture(answer.expiry, QDate::currentDate()));
        _modeStatus->setText(tr("DES Enabled"));
        return;
    case EnablementQuery::None:
        break;
    }
    // Asked again after a lock, the expiry of a mode that has ended must not linger.
    setToolTip(QString());
    _modeStatus->setText(tr("Simulator Enabled"));
    showLed(QStringLiteral(":/LockStatusWidget/Resources/UnlitLED.png"));
}

void LockStatusWidget::showDisconnected()
{
    // An answer still under way belongs to the device that left.
    ++m_question;
    m_busy = false;
    setToolTip(tr("The device is not connected"));
    _modeStatus->setText(tr("Disconnected"));
    showLed(QStringLiteral(":/LockStatusWidget/Resources/UnlitLED.png"));
    setEnabled(false);
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
