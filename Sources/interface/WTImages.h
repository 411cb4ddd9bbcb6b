#pragma once

#include <QIcon>
#include <QPixmap>
#include <QString>

// The application's images by the names the records and cells use ("folder_32", "play_32", ...).
// They are SVG drawings compiled into the library, so they stay sharp at any scale factor.
namespace WTImages {

// True when an image of that name exists.
bool contains(const QString& name);
// The image as an icon; a null icon for an unknown name.
QIcon icon(const QString& name);
// The image rendered at `size` logical pixels for a device pixel ratio; cached per name, size and
// ratio. A null pixmap for an unknown name.
QPixmap pixmap(const QString& name, const QSize& size, qreal devicePixelRatio = 1.0);

}  // namespace WTImages
