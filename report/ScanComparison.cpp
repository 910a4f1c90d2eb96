#include "ScanComparison.h"

namespace {

QString classCount(qsizetype count)
{
    return QString::number(count) + (count == 1 ? QStringLiteral(" class") : QStringLiteral(" classes"));
}

QString scanAttribute(int scan)
{
    return QStringLiteral("scan%1").arg(scan + 1);
}

} // namespace

void ScanComparison::reserve(qsizetype classes)
{
    m_classes.reserve(classes);
    m_index.reserve(classes);
}

int ScanComparison::addScan(const QString& header)
{
    m_scans.append(header);
    return int(m_scans.size() - 1);
}

int ScanComparison::add(int scan, const QString& name, const QString& id, const QString& family,
    const QString& subFamily, bool* added)
{
    auto found = m_index.constFind(id);
    const bool isNew = found == m_index.constEnd();
    const int index = isNew ? int(m_classes.size()) : *found;
    if (isNew) {
        m_index.insert(id, index);
        m_classes.append({name, id, family, subFamily, QBitArray(int(m_scans.size()))});
    }
    QBitArray& presence = m_classes[index].presence;
    if (presence.size() <= scan)
        presence.resize(scan + 1);
    presence.setBit(scan);
    if (added)
        *added = isNew;
    return index;
}

bool ScanComparison::isPresent(int classIndex, int scan) const
{
    const QBitArray& presence = m_classes.at(classIndex).presence;
    return scan < presence.size() && presence.testBit(scan);
}

bool ScanComparison::isInEveryScan(int classIndex) const
{
    const QBitArray& presence = m_classes.at(classIndex).presence;
    return presence.size() == m_scans.size() && presence.count(true) == m_scans.size();
}

QString ScanComparison::summary() const
{
    if (m_scans.isEmpty())
        return QString();
    QVector<qsizetype> onlyIn(m_scans.size(), 0);
    qsizetype inEvery = 0;
    for (int c = 0; c < m_classes.size(); ++c) {
        const QBitArray& presence = m_classes.at(c).presence;
        if (isInEveryScan(c)) {
            ++inEvery;
        } else if (presence.count(true) == 1) {
            int scan = 0;
            while (!presence.testBit(scan))
                ++scan;
            ++onlyIn[scan];
        }
    }
    if (m_scans.size() == 1)
        return classCount(inEvery) + QStringLiteral(" in ") + m_scans.first();
    QStringList parts {
        classCount(inEvery) + (m_scans.size() == 2 ? QStringLiteral(" in both") : QStringLiteral(" in all"))};
    for (int s = 0; s < m_scans.size(); ++s)
        parts.append(QStringLiteral("%1 only in %2").arg(QString::number(onlyIn.at(s)), m_scans.at(s)));
    return parts.join(QStringLiteral(", "));
}

Report ScanComparison::report() const
{
    Report report(
        QStringLiteral("platform-comparison"), QStringLiteral("PlatformComparison"), QStringLiteral("class"));
    ReportNode& root = report.root();
    root.children.reserve(m_scans.size() + m_classes.size());
    for (int s = 0; s < m_scans.size(); ++s) {
        root.add(QStringLiteral("scan"))
            .set(QStringLiteral("id"), scanAttribute(s))
            .set(QStringLiteral("name"), m_scans.at(s));
    }
    for (int c = 0; c < m_classes.size(); ++c) {
        const Class& entry = m_classes.at(c);
        ReportNode& row = root.add(QStringLiteral("class"))
                              .set(QStringLiteral("name"), entry.name)
                              .set(QStringLiteral("value"), entry.id)
                              .set(QStringLiteral("family"), entry.family)
                              .set(QStringLiteral("subfamily"), entry.subFamily);
        for (int s = 0; s < m_scans.size(); ++s)
            row.set(scanAttribute(s), isPresent(c, s) ? QStringLiteral("yes") : QStringLiteral("no"));
    }
    return report;
}
