#pragma once

#include <QColor>
#include <QString>

// Colours as the interface describes them: hexadecimal RGB text and grey levels.
namespace RZColor {

// "FF8000" is orange. The text is read as one hexadecimal number; bits above the low 24 are ignored,
// a null or unreadable text gives opaque black. Alpha is always 1.
QColor colorFromHexRGB(const QString& hex);
// A grey of that white level (0 black, 1 white), opaque unless `alpha` says otherwise.
QColor calibratedWhite(qreal white, qreal alpha = 1.0);

}  // namespace RZColor
