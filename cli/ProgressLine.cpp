#include "ProgressLine.h"

#include "Cli.h"

#include <cstdio>

namespace {

void writeError(const QString& text)
{
    const QByteArray bytes = text.toLocal8Bit();
    std::fwrite(bytes.constData(), 1, size_t(bytes.size()), stderr);
    std::fflush(stderr);
}

} // namespace

ProgressLine::ProgressLine(Cli& cli)
    : m_cli(cli)
{
    m_cli.setProgressLine(this);
}

ProgressLine::~ProgressLine()
{
    end();
    m_cli.setProgressLine(nullptr);
}

bool ProgressLine::report(void* context, int value, int maximum, const QString& text)
{
    auto* line = static_cast<ProgressLine*>(context);
    if (!line->m_cli.progressToTerminal())
        return false;
    if (value < 0) {
        line->m_maximum = maximum;
        return false;
    }
    QString shown = line->m_maximum > 0 ? QStringLiteral("%1/%2").arg(value).arg(line->m_maximum) : QString::number(value);
    if (!text.isEmpty())
        shown += QLatin1Char(' ') + text;
    // One line, rewritten in place; the erase clears the rest of a longer earlier text.
    writeError(QStringLiteral("\r\x1b[K") + shown);
    line->m_shown = true;
    return false;
}

void ProgressLine::end()
{
    if (m_shown)
        writeError(QStringLiteral("\n"));
    m_shown = false;
}
