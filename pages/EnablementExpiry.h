#pragma once

#include <QDate>
#include <QString>

// Reading the developer enablement service's expiry text, as the gateway gives it in the C
// library's ctime layout ("Sun Sep 19 20:00:00 2027").

// The date of an expiry text: the time and its trailing blank (9 characters from position
// 11) are cut out and the rest read as "ddd MMM dd yyyy"; a day of month padded with a blank
// ("Sun Sep  5 20:00:00 2010") reads too. Invalid when the text holds no such date.
QDate enablementExpiryDate(const QString& expiryText);

// At least this many days left show the service's LED green, fewer (or no date) yellow.
constexpr qint64 ServiceGreenDays = 7;

// The LED picture of an enabled service whose expiry text is expiryText, seen on today.
QString serviceLedPicture(const QString& expiryText, const QDate& today);
