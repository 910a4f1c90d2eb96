#pragma once

#include "PackageExtractor.h"

#include <QString>

#include <functional>

// Installs a received package into a volume's install folder: unpacks it into a hidden
// staging folder there and moves its top-level entries into place only when the whole
// package unpacked cleanly, so a refused or failed install leaves nothing behind. An
// entry already installed under the same name is replaced. Names the device keeps for its
// own temporary files are refused at any depth.
//
// The switch survives a kill at any moment: before the first rename the staging folder
// gets a plan (the names to switch), written and synced; it goes only once every name is
// in place. A staging folder still holding a plan at start is an install cut short, and
// recover() rolls it back from what the folder shows, one rename at a time, so that it
// may itself be cut and run again.
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
    // Rolls back every install below root that a kill cut short in its switch; returns
    // how many. Their staging folders stay for the sweep that follows.
    static int recover(const QString& root);

    // Tests only: called before each step of the switch (0, 1, ...); true stops the
    // install there as a kill would, leaving everything as it is.
    static std::function<bool(int step)> faultHook;

private:
    static bool moveIntoPlace(const QString& staging, const QStringList& names, const QString& installFolder, bool* killed);
    static void rollBack(const QString& staging, const QString& installFolder);
};
