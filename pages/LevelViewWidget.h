#pragma once

#include "GatewayComponentWidget.h"
#include "IdRecord.h"
#include "ui_LevelViewWidget.h"

#include <memory>

struct DeviceCache;

// The level page: checks the device's classes against a level definition chosen from the
// "Levels" folder, showing each required class under its family and sub-family as found or
// not found. When the choice changes, a pool thread reads the definition, checks it and
// builds the tree's items; the GUI thread only puts them in. Reads are numbered: the tree
// shows the latest choice, and what an earlier one brings late is dropped.
class LevelViewWidget : public GatewayComponentWidget, public Ui::LevelViewWidgetClass
{
    Q_OBJECT

public:
    explicit LevelViewWidget(QWidget* parent = nullptr);

    // Offers the level files for record's device (the record stays the device's), sorted by
    // name; null offers nothing. The files are those of the level folders (see
    // DataFolders), or of levelsDirectory.
    void setDeviceRecord(const DeviceCache* record);
    void setDeviceRecord(const DeviceCache* record, const QString& levelsDirectory);

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

    void onCurrentLevelChanged(int index);

private:
    struct LevelRead;

    void offerLevelFiles(const DeviceCache* record, QStringList files);
    static std::shared_ptr<LevelRead> read(const QString& path, const IdRecordMap& classes);
    void showLevel(LevelRead& level);
    // Takes the level shown out of the tree, for deletion off the GUI thread; false when
    // there was none.
    bool takeShownLevel();

    const DeviceCache* m_record = nullptr;
    QString m_report;
    quint64 m_request = 0;
};
