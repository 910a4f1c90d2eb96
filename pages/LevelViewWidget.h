#pragma once

#include "GatewayComponentWidget.h"
#include "IdRecord.h"
#include "ui_LevelViewWidget.h"

struct DeviceCache;

// The level page: checks the device's classes against a level definition chosen from the
// "Levels" folder, showing each required class under its family and sub-family as found or
// not found. A definition is read on the GUI thread when the choice changes; no worker.
class LevelViewWidget : public GatewayComponentWidget, public Ui::LevelViewWidgetClass
{
    Q_OBJECT

public:
    explicit LevelViewWidget(QWidget* parent = nullptr);

    // Offers the level files for record's device (the record stays the device's), sorted by
    // name; null offers nothing. The files are those of the level folders (see
    // DataFolders), or of levelsDirectory.
    void setDeviceRecord(DeviceCache* record);
    void setDeviceRecord(DeviceCache* record, const QString& levelsDirectory);

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    bool isComplete() override;
    QString xmlReport() override;

    void onCurrentLevelChanged(int index);

private:
    void offerLevelFiles(DeviceCache* record, QStringList files);
    void insertEntry(const IdRecord& entry);

    DeviceCache* m_record = nullptr;
    QString m_report;
};
