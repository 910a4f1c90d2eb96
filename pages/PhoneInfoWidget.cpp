#include "PhoneInfoWidget.h"

#include "DeviceCache.h"
#include "DisplayText.h"
#include "NameLibrary.h"
#include "PhoneInfoReport.h"

#include <QHeaderView>

PhoneInfoWidget::PhoneInfoWidget(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    initializeLibrary();
    setupUi(this);
    // Sorting follows the header's indicator, which starts descending.
    for (QTableWidget* table : {_imageFormats, _audioFormats, _videoFormats})
        table->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
}

void PhoneInfoWidget::setDeviceRecord(const DeviceCache* record)
{
    m_record = record;
    if (!record)
        return;
    const DeviceData& data = record->deviceData;
    const auto hardware = [&data](const char* key) { return data.hardwareValue(QLatin1String(key), QString()); };

    _manufacturer->setText(hardware("Manufacturer"));
    _model->setText(hardware("Model"));
    _firmware->setText(hardware("Firmware"));
    _chipID->setText(hardware("ChipID"));
    _platformID->setText(hardware("PlatformID"));
    _qxeVersion->setText(hardware("QXEVersion"));
    _mobileID->setText(hardware("MobileID"));
    _colorDepth->setText(hardware("ColorDepth"));
    _screenWidth->setText(hardware("cxScreen"));
    _screenHeight->setText(hardware("cyScreen"));

    const auto feature = [&data](const char* key) { return DisplayText::hasFeature(data, QLatin1String(key)); };
    _flipPhone->setChecked(feature("FlipPhone"));
    _vibrate->setChecked(feature("Vibrate"));
    _locationSupport->setChecked(feature("LocationSupport"));
    _penSupport->setChecked(feature("PenSupport"));

    _phoneName->setText(data.phoneName);
    _targetID->setText(data.targetId);
    _zantVersion->setText(data.zantVersion);
    _zantBuild->setText(data.zantBuildNumber);
    _staticBuild->setText(data.staticBuildId);
    _dynamicBuild->setText(data.dynamicBuildId);
    _csBuild->setText(data.componentServicesBuild);

    _mdn->setText(hardware("DeviceMDN"));
    _imei->setText(hardware("IMEI"));
    _ruimid->setText(hardware("RUIMID"));
    _hwid->setText(hardware("HWID"));
    _deviceIDHash->setText(hardware("DeviceIDHash"));

    const auto size = [&data](const char* key) { return DisplayText::deviceSize(data, QLatin1String(key)); };
    _totalMemory->setText(size("HeapMemory"));
    _freeMemory->setText(size("HeapFree"));
    _fsSpace->setText(size("FSTotal"));
    _fsFree->setText(size("FSAvail"));

    fillFormats(_imageFormats, data.imageValues());
    fillFormats(_audioFormats, data.audioValues());
    fillFormats(_videoFormats, data.videoValues());

    setState(Complete);
    setStatus(readyStatus());
}

void PhoneInfoWidget::fillFormats(QTableWidget* table, const QMap<QString, QString>& formats)
{
    // Sorting stays off while rows go in: a sorted table would move a row between the
    // setting of its two cells.
    table->setSortingEnabled(false);
    table->setRowCount(0);
    for (auto it = formats.cbegin(); it != formats.cend(); ++it) {
        const int row = table->rowCount();
        table->insertRow(row);
        table->setItem(row, 0, new QTableWidgetItem(it.key()));
        table->setItem(row, 1, new QTableWidgetItem(it.value()));
    }
    table->setSortingEnabled(true);
}

QString PhoneInfoWidget::componentName()
{
    return QStringLiteral("PhoneInformation");
}

void PhoneInfoWidget::startComponent(const QString&)
{
}

bool PhoneInfoWidget::canSearch()
{
    return false;
}

bool PhoneInfoWidget::search(const QString&)
{
    return false;
}

void PhoneInfoWidget::raisePriority()
{
}

void PhoneInfoWidget::lowerPriority()
{
}

QString PhoneInfoWidget::xmlReport()
{
    // The facts the page shows, from the record it shows them from; empty before one came.
    return m_record ? PhoneInfoReport::build(m_record->deviceData).toXml() : QString();
}
