#include "PhoneInfoWidget.h"

#include "DeviceCache.h"
#include "FormatSize.h"
#include "NameLibrary.h"

#include <QHeaderView>

namespace {

// A size text from the device as a byte count; anything but a plain non-negative decimal
// number counts as 0 (a negative count would otherwise show as exabytes).
quint64 sizeValue(const QString& text)
{
    bool ok = false;
    const qint64 value = text.toLongLong(&ok, 10);
    return ok && value > 0 ? quint64(value) : 0;
}

} // namespace

PhoneInfoWidget::PhoneInfoWidget(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    initializeLibrary();
    setupUi(this);
    // Sorting follows the header's indicator, which starts descending.
    for (QTableWidget* table : {_imageFormats, _audioFormats, _videoFormats})
        table->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
}

void PhoneInfoWidget::setDeviceRecord(DeviceCache* record)
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

    // Only the exact text "Yes" counts.
    _flipPhone->setChecked(hardware("FlipPhone") == QLatin1String("Yes"));
    _vibrate->setChecked(hardware("Vibrate") == QLatin1String("Yes"));
    _locationSupport->setChecked(hardware("LocationSupport") == QLatin1String("Yes"));
    _penSupport->setChecked(hardware("PenSupport") == QLatin1String("Yes"));

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

    _totalMemory->setText(formatSize(sizeValue(hardware("HeapMemory"))));
    _freeMemory->setText(formatSize(sizeValue(hardware("HeapFree"))));
    _fsSpace->setText(formatSize(sizeValue(hardware("FSTotal"))));
    _fsFree->setText(formatSize(sizeValue(hardware("FSAvail"))));

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

bool PhoneInfoWidget::isComplete()
{
    return statusIsReady();
}

QString PhoneInfoWidget::xmlReport()
{
    return m_report;
}
