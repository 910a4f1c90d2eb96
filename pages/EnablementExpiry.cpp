#include "EnablementExpiry.h"

QDate enablementExpiryDate(const QString& expiryText)
{
    QString text = expiryText;
    const QString time = expiryText.mid(11, 9);
    if (!time.isEmpty())
        text.remove(time);
    // Day and month names are read in English whatever the user's locale.
    const QDate date = QDate::fromString(text, QStringLiteral("ddd MMM dd yyyy"));
    if (date.isValid())
        return date;
    return QDate::fromString(text.simplified(), QStringLiteral("ddd MMM d yyyy"));
}

QString serviceLedPicture(const QString& expiryText, const QDate& today)
{
    const QDate expiry = enablementExpiryDate(expiryText);
    if (expiry.isValid() && today.daysTo(expiry) >= ServiceGreenDays)
        return QStringLiteral(":/LockStatusWidget/Resources/GreenLED.png");
    return QStringLiteral(":/LockStatusWidget/Resources/YellowLED.png");
}
