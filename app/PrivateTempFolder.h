#pragma once

#include <QString>

// A folder below base (the system's temporary folder) that only this user can enter:
// created with mode 0700, or an existing one that is a real folder (not a link), owned by
// this user and closed to everyone else. When the usual name is taken by anything else,
// a fresh folder of a unique name is made instead, so nobody can plant a file or a link
// where the program will write. Empty when no such folder can be had.
QString privateTempFolder(const QString& base);
