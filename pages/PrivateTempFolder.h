#pragma once

#include <QString>

#include <memory>

// The folder device files are opened from. Below base (the system's temporary folder)
// lies a folder only this user can enter: created with mode 0700, or an existing one that
// is a real folder (not a link), owned by this user and closed to everyone else; when the
// usual name is taken by anything else, a fresh folder of a unique name is made instead,
// so nobody can plant a file or a link where the program will write. Inside it each run
// of the program has a folder of its own, removed with its contents when the object goes,
// so that a second running copy keeps its files.
class PrivateTempFolder
{
public:
    explicit PrivateTempFolder(const QString& base);
    ~PrivateTempFolder();
    PrivateTempFolder(const PrivateTempFolder&) = delete;
    PrivateTempFolder& operator=(const PrivateTempFolder&) = delete;

    // This run's folder; empty when none could be had, and error() says why.
    QString path() const;
    QString error() const;
    // The user's own folder that holds the runs' folders.
    QString userFolder() const;

    // The program's folder below the system's temporary folder, made on first use and
    // emptied at exit; made again when it could not be had or is gone.
    static const PrivateTempFolder& forProgram();

private:
    QString m_userFolder;
    QString m_path;
    QString m_error;
    bool m_removeUserFolder = false; // a unique fallback folder is this run's alone
};
