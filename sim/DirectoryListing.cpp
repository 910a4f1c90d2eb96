#include "DirectoryListing.h"

#include <QFile>

#include <algorithm>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

bool DirectoryListing::list(const QString& folder, QVector<Entry>& entries)
{
    entries.clear();
    DIR* dir = ::opendir(QFile::encodeName(folder).constData());
    if (!dir)
        return false;
    const int fd = ::dirfd(dir);
    while (const dirent* d = ::readdir(dir)) {
        const char* name = d->d_name;
        if (qstrcmp(name, ".") == 0 || qstrcmp(name, "..") == 0)
            continue;
        struct stat st;
        if (::fstatat(fd, name, &st, AT_SYMLINK_NOFOLLOW) != 0)
            continue;
        Entry entry;
        entry.link = S_ISLNK(st.st_mode);
        if (entry.link && ::fstatat(fd, name, &st, 0) != 0)
            continue;
        if (!S_ISDIR(st.st_mode) && !S_ISREG(st.st_mode))
            continue;
        entry.name = QFile::decodeName(name);
        entry.directory = S_ISDIR(st.st_mode);
        entry.readable = st.st_mode & S_IRUSR;
        entry.writable = st.st_mode & S_IWUSR;
        entry.size = entry.directory ? 0 : quint64(st.st_size);
        entries.append(entry);
    }
    ::closedir(dir);
    std::sort(entries.begin(), entries.end(), [](const Entry& a, const Entry& b) { return a.name < b.name; });
    return true;
}
