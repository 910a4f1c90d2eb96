#include "AboutDialog.h"

#include <QFont>
#include <QPaintEvent>
#include <QPainter>

AboutDialog::AboutDialog(const QString& imagePath, const QString& notice, const QString& version, QWidget* parent)
    : QDialog(parent)
    , m_frame(imagePath, notice, version)
{
    m_frame.prepare(this);
}

void AboutDialog::setComponents(const QStringList& rows)
{
    m_components += rows;
}

QVector<AboutDialog::Cell> AboutDialog::componentCells(const QStringList& rows)
{
    QVector<Cell> cells;
    int y = 200;
    for (const QString& row : rows) {
        int x = 30;
        for (const QString& part : row.split(QLatin1Char('\t'), Qt::SkipEmptyParts)) {
            cells.append({QPoint(x, y), part});
            x += 140;
        }
        y += 20;
    }
    return cells;
}

void AboutDialog::paintEvent(QPaintEvent* event)
{
    QPainter painter(this);
    m_frame.paintPicture(painter);
    painter.setPen(QColor(128, 128, 128));
    painter.setFont(QFont("Helvetica", 10, QFont::Bold));
    for (const Cell& cell : componentCells(m_components))
        painter.drawText(cell.first, cell.second);
    m_frame.paintNotice(painter, 290);
    event->accept();
}

void AboutDialog::mouseReleaseEvent(QMouseEvent*)
{
    accept();
}
