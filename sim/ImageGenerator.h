#pragma once

#include <QString>

// Writes a large synthetic device image for benchmarks and load tests: N modules with
// MIFs below usermod/, N classes spread over them, N MIME records in those MIFs (the
// registry), N files in /shared/bulk (or spread over N folders below it), N resident
// processes (with N threads and N loaded modules each, a given share of them changing every
// second) and a settings store of N nodes. The same counts always give the same image.
class ImageGenerator
{
public:
    struct Counts
    {
        int modules = 100;
        int classes = 200;
        int files = 100;
        int processes = 10;
        // -1: one MIME record per module that exports a class.
        int mimeTypes = -1;
        // Nodes of the settings store; it always holds the five named branches.
        int settings = 0;
        // Threads and loaded modules of every process.
        int threads = 2;
        int loadedModules = 1;
        // Percent of the processes whose threads or modules change every second; -1 leaves
        // the processes to the default evolution (one change every two seconds).
        int churn = -1;
        // Folders below /shared/bulk that hold the files, in turn; 0: the files lie in it.
        int folders = 0;
    };

    bool generate(const QString& imageDir, const Counts& counts);
    QString errorString() const { return m_error; }

    static constexpr int ModulesPerFolder = 100;
    static constexpr quint32 FirstClassId = 0x7E000001;
    // The branches the settings page treats specially; every generated store has them.
    static constexpr int NamedSettingsBranches = 5;
    // A MIF counts its MIME records in 16 bits.
    static constexpr int MaxMimeTypesPerModule = 0xFFFF;

private:
    bool writeProfile(const QString& imageDir, const Counts& counts);

    QString m_error;
};
