#include "Cli.h"
#include "Portlex.h"

#include <QCoreApplication>

#include <csignal>

int main(int argc, char* argv[])
{
    // A closed output pipe shows as EPIPE on the write, which ends the command quietly.
    std::signal(SIGPIPE, SIG_IGN);
    QCoreApplication application(argc, argv);
    QCoreApplication::setApplicationName(QStringLiteral("delvix-cli"));
    Portlex::Initialize();
    const int status = Cli(QCoreApplication::arguments()).run();
    Portlex::Destroy();
    return status;
}
