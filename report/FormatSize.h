#pragma once

#include <QString>

// A byte count for people: "9998 bytes" below 9999, else kB, MB or GB with two decimals
// ("10.00 kB"). The bytes/kB threshold is 9999, not 1024.
QString formatSize(quint64 bytes);
