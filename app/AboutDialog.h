#pragma once

#include "PictureFrame.h"

#include <QDialog>
#include <QPair>
#include <QPoint>
#include <QStringList>
#include <QVector>

// The About picture with the list of the program's components. A click anywhere closes it.
class AboutDialog : public QDialog
{
public:
    using Cell = QPair<QPoint, QString>;

    AboutDialog(const QString& imagePath, const QString& notice, const QString& version, QWidget* parent = nullptr);

    // Appends rows of tab-separated parts, such as a name and a version.
    void setComponents(const QStringList& rows);

    // Where each part of the rows is drawn: base-line positions, one row per 20 pixels from
    // y 200, the parts of a row at x 30, 170, 310 ... Empty parts take no column.
    static QVector<Cell> componentCells(const QStringList& rows);

protected:
    void paintEvent(QPaintEvent* event) override;
    void mouseReleaseEvent(QMouseEvent* event) override;

private:
    PictureFrame m_frame;
    QStringList m_components;
};
