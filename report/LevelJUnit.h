#pragma once

#include "FamilyReport.h"

#include <QByteArray>
#include <QString>

// A level check as the JUnit XML that CI systems read: one test suite per family, one test
// case per class of the level (named after the class, its class name "family.sub-family"),
// a class "Not Found" on the device a failure that names it.
class LevelJUnit
{
public:
    // families hold LevelCheck::cells rows; level and device name the suites' run.
    static QByteArray write(const FamilyReport::Families& families, const QString& level, const QString& device);
};
