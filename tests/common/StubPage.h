#pragma once

#include "GatewayComponentWidget.h"

// A page with every duty stubbed; tests derive from it and override what they look at.
class StubPage : public GatewayComponentWidget
{
public:
    using GatewayComponentWidget::GatewayComponentWidget;

    QString componentName() override { return QStringLiteral("Stub"); }
    void startComponent(const QString&) override {}
    bool canSearch() override { return false; }
    bool search(const QString&) override { return false; }
    void raisePriority() override {}
    void lowerPriority() override {}
    QString xmlReport() override { return QString(); }
};
