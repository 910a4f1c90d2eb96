#pragma once

#include <QString>

// Writes a large synthetic device image for benchmarks and load tests: N modules with
// MIFs below usermod/, N classes spread over them, N files in one folder (/shared/bulk)
// and N resident processes. The same counts always give the same image.
class ImageGenerator
{
public:
    struct Counts
    {
        int modules = 100;
        int classes = 200;
        int files = 100;
        int processes = 10;
    };

    bool generate(const QString& imageDir, const Counts& counts);
    QString errorString() const { return m_error; }

    static constexpr int ModulesPerFolder = 100;
    static constexpr quint32 FirstClassId = 0x7E000001;

private:
    bool writeProfile(const QString& imageDir, const Counts& counts);

    QString m_error;
};
