#pragma once

#include <QString>

class Cli;

// A progress line on the error stream, shown only when that is a terminal, rewritten in
// place and ended when the object goes out of scope (or when the tool reports a failure),
// so that no command can leave a message glued to it.
class ProgressLine
{
public:
    explicit ProgressLine(Cli& cli);
    ~ProgressLine();
    ProgressLine(const ProgressLine&) = delete;
    ProgressLine& operator=(const ProgressLine&) = delete;

    // The gateway's callback form, with a ProgressLine as context. Never asks to stop.
    static bool report(void* context, int value, int maximum, const QString& text);
    // Ends the line, if one is shown.
    void end();

private:
    Cli& m_cli;
    int m_maximum = 0;
    bool m_shown = false;
};
