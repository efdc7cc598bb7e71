#include "shell/icons.h"

#include <QPainter>
#include <QPainterPath>
#include <QPixmap>

#include "shell/messages.h"

namespace vqm {

namespace {

// A handset: the shape of every phone icon, in the given colour.
void DrawHandset(QPainter& p, const QRectF& box, const QColor& colour) {
    QPainterPath path;
    const qreal w = box.width(), h = box.height(), x = box.x(), y = box.y();
    path.moveTo(x + 0.10 * w, y + 0.35 * h);
    path.cubicTo(x + 0.10 * w, y + 0.15 * h, x + 0.90 * w, y + 0.15 * h, x + 0.90 * w,
                 y + 0.35 * h);
    path.lineTo(x + 0.90 * w, y + 0.45 * h);
    path.lineTo(x + 0.68 * w, y + 0.45 * h);
    path.lineTo(x + 0.65 * w, y + 0.35 * h);
    path.cubicTo(x + 0.55 * w, y + 0.31 * h, x + 0.45 * w, y + 0.31 * h, x + 0.35 * w,
                 y + 0.35 * h);
    path.lineTo(x + 0.32 * w, y + 0.45 * h);
    path.lineTo(x + 0.10 * w, y + 0.45 * h);
    path.closeSubpath();
    p.fillPath(path, colour);
    p.setBrush(colour);
    p.setPen(Qt::NoPen);
    p.drawRoundedRect(QRectF(x + 0.22 * w, y + 0.52 * h, 0.56 * w, 0.36 * h), 0.06 * w, 0.06 * w);
}

QPixmap Canvas(int size) {
    QPixmap pixmap(size, size);
    pixmap.fill(Qt::transparent);
    return pixmap;
}

}  // namespace

QIcon ProgramIcon(int id) {
    QIcon icon;
    for (int size : {16, 32, 48}) {
        QPixmap pixmap = Canvas(size);
        QPainter p(&pixmap);
        p.setRenderHint(QPainter::Antialiasing);
        const QRectF box(0, 0, size, size);
        if (id == kIconConnected) {
            DrawHandset(p, box, QColor(0x1f, 0x9d, 0x3a));
        } else if (id == kIconNotConnected) {
            DrawHandset(p, box, QColor(0x80, 0x80, 0x80));
            p.setPen(QPen(QColor(0xc0, 0x20, 0x20), size / 8.0));
            p.drawLine(QPointF(size * 0.15, size * 0.85), QPointF(size * 0.85, size * 0.15));
        } else {
            p.setBrush(QColor(0x20, 0x50, 0x90));
            p.setPen(Qt::NoPen);
            p.drawRoundedRect(box.adjusted(1, 1, -1, -1), size / 6.0, size / 6.0);
            DrawHandset(p, box.adjusted(size * 0.1, size * 0.1, -size * 0.1, -size * 0.1),
                        Qt::white);
        }
        icon.addPixmap(pixmap);
    }
    return icon;
}

QIcon ViewButtonIcon(int index) {
    const int size = 20;
    QPixmap pixmap = Canvas(size);
    QPainter p(&pixmap);
    p.setRenderHint(QPainter::Antialiasing);
    const QColor ink(0x20, 0x30, 0x50);
    p.setPen(QPen(ink, 1.4));
    p.setBrush(Qt::NoBrush);
    switch (index) {
        case 0:  // dial pad: a grid of keys
            p.setBrush(ink);
            for (int row = 0; row < 4; ++row)
                for (int col = 0; col < 3; ++col)
                    p.drawEllipse(QPointF(5 + col * 5, 3 + row * 4.6), 1.6, 1.6);
            break;
        case 1:  // write: an envelope and a pen
            p.drawRect(QRectF(2, 6, 12, 9));
            p.drawLine(QPointF(2, 6), QPointF(8, 11));
            p.drawLine(QPointF(14, 6), QPointF(8, 11));
            p.setPen(QPen(QColor(0xc0, 0x50, 0x10), 2));
            p.drawLine(QPointF(11, 17), QPointF(18, 3));
            break;
        case 2:  // folder of messages
            p.drawRect(QRectF(2, 4, 16, 12));
            p.drawLine(QPointF(2, 4), QPointF(10, 11));
            p.drawLine(QPointF(18, 4), QPointF(10, 11));
            break;
        case 3:  // contacts: a person
            p.setBrush(ink);
            p.drawEllipse(QPointF(10, 6), 3.5, 3.5);
            p.drawChord(QRectF(3, 11, 14, 14), 0, 180 * 16);
            break;
        case 4:  // settings: a gear
            p.setBrush(ink);
            for (int i = 0; i < 8; ++i) {
                p.save();
                p.translate(10, 10);
                p.rotate(i * 45);
                p.drawRect(QRectF(-1.5, -9, 3, 4));
                p.restore();
            }
            p.drawEllipse(QPointF(10, 10), 6, 6);
            p.setBrush(Qt::white);
            p.drawEllipse(QPointF(10, 10), 2.5, 2.5);
            break;
        case 5:  // call log: lines of a list
            for (int row = 0; row < 4; ++row)
                p.drawLine(QPointF(3, 4 + row * 4), QPointF(17, 4 + row * 4));
            break;
        default:
            DrawHandset(p, QRectF(0, 0, size, size), ink);
    }
    return QIcon(pixmap);
}

}  // namespace vqm
