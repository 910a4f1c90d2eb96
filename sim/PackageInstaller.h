#pragma once

#include "PackageExtractor.h"

#include <QString>

#include <functional>

// Installs a received package into a volume's install folder: unpacks it into a hidden
// staging folder there and moves its top-level entries into place only when the whole
// package unpacked cleanly, so a refused or failed install leaves nothing behind. An
// entry already installed under the same name is replaced. Names the device keeps for its
// own temporary files are refused at any depth.
class PackageInstaller
{
public:
    struct Rules
    {
        quint64 spaceLimit = 0;               // the most bytes the package may unpack to
        PackageExtractor::EntryCheck refuse;  // the device's own reasons to refuse an entry
        std::function<void()> keepAlive;      // called while a long package unpacks
    };

    // statusText: what the device tells the user, on success and on refusal.
    static bool install(const QString& packagePath, const QString& packageName, const QString& installFolder,
                        const Rules& rules, QString* statusText);

private:
    static bool moveIntoPlace(const QString& staging, const QStringList& names, const QString& installFolder);
};
