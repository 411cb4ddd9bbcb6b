#include "WTImages.h"

#include <QFile>
#include <QHash>
#include <QPainter>
#include <QSvgRenderer>

static void initIconResources() {
  // The resources live in a static library: the linker keeps them only when somebody asks for them.
  Q_INIT_RESOURCE(icons);
}

namespace {

QString pathOf(const QString& name) {
  static const bool initialised = (initIconResources(), true);
  Q_UNUSED(initialised);
  return QStringLiteral(":/icons/") + name + QStringLiteral(".svg");
}

}  // namespace

namespace WTImages {

bool contains(const QString& name) {
  return !name.isEmpty() && QFile::exists(pathOf(name));
}

QIcon icon(const QString& name) {
  static QHash<QString, QIcon> cache;
  auto it = cache.constFind(name);
  if (it != cache.constEnd()) return *it;
  QIcon result;
  if (contains(name)) result = QIcon(pathOf(name));
  cache.insert(name, result);
  return result;
}

QPixmap pixmap(const QString& name, const QSize& size, qreal devicePixelRatio) {
  static QHash<QString, QPixmap> cache;
  const QString key = name + u'@' + QString::number(size.width()) + u'x' + QString::number(size.height()) +
                      u'@' + QString::number(devicePixelRatio);
  auto it = cache.constFind(key);
  if (it != cache.constEnd()) return *it;
  QPixmap result;
  if (contains(name)) {
    QSvgRenderer renderer(pathOf(name));
    result = QPixmap(size * devicePixelRatio);
    result.fill(Qt::transparent);
    QPainter painter(&result);
    painter.setRenderHint(QPainter::Antialiasing);
    renderer.render(&painter);
    painter.end();
    result.setDevicePixelRatio(devicePixelRatio);
  }
  cache.insert(key, result);
  return result;
}

}  // namespace WTImages
