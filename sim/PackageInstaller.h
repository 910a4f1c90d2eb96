#pragma once

#include <QString>

// Installs a received package into a volume's install folder: unpacks it into a hidden
// staging folder there and moves its top-level entries into place only when the whole
// package unpacked cleanly, so a refused or failed install leaves nothing behind. An
// entry already installed under the same name is replaced.
class PackageInstaller
{
public:
    // statusText: what the device tells the user, on success and on refusal.
    static bool install(const QString& packagePath, const QString& packageName, const QString& installFolder,
                        quint64 spaceLimit, QString* statusText);

private:
    static bool moveIntoPlace(const QString& staging, const QStringList& names, const QString& installFolder);
};
