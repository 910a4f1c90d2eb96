#include "Cli.h"
#include "Portlex.h"

#include <QCoreApplication>

int main(int argc, char* argv[])
{
    QCoreApplication application(argc, argv);
    QCoreApplication::setApplicationName(QStringLiteral("delvix-cli"));
    Portlex::Initialize();
    const int status = Cli(QCoreApplication::arguments()).run();
    Portlex::Destroy();
    return status;
}
