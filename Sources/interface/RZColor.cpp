#include "RZColor.h"

#include <algorithm>

namespace RZColor {

QColor colorFromHexRGB(const QString& hex) {
  // Read like a scanner reads a hexadecimal unsigned number: leading blanks and an optional "0x" are
  // skipped, the hex digits that follow count, anything after them is ignored; too large saturates.
  auto digitValue = [](QChar c) {
    const char16_t u = c.toLower().unicode();
    if (u >= u'0' && u <= u'9') return int(u - u'0');
    if (u >= u'a' && u <= u'f') return int(u - u'a' + 10);
    return -1;
  };
  const QString text = hex.trimmed();
  qsizetype i = text.startsWith(QLatin1String("0x"), Qt::CaseInsensitive) ? 2 : 0;
  quint64 value = 0;
  for (; i < text.size() && digitValue(text[i]) >= 0; ++i) {
    value = std::min<quint64>(value * 16 + static_cast<quint64>(digitValue(text[i])), 0xFFFFFFFFull);
  }
  const float red = static_cast<float>((value >> 16) & 0xFF) / 255.0f;
  const float green = static_cast<float>((value >> 8) & 0xFF) / 255.0f;
  const float blue = static_cast<float>(value & 0xFF) / 255.0f;
  return QColor::fromRgbF(red, green, blue, 1.0f);
}

QColor calibratedWhite(qreal white, qreal alpha) {
  const float level = static_cast<float>(white);
  return QColor::fromRgbF(level, level, level, static_cast<float>(alpha));
}

}  // namespace RZColor
