#include "RZBackgroundView.h"

#include "RZColor.h"
#include "WTImages.h"

#include <QLinearGradient>
#include <QPaintEvent>
#include <QPainter>

#include <cmath>

RZBackgroundView::RZBackgroundView(QWidget* parent) : QWidget(parent) {
  setImageName(QStringLiteral("NSComputer"));
}

RZBackgroundView* RZBackgroundView::initWithCoder(const QVariantMap& archive, QWidget* parent) {
  auto* view = new RZBackgroundView(parent);
  view->setBackgroundMode(archive.value(QStringLiteral("Mode")).toInt());
  view->setSolidColor(archive.value(QStringLiteral("SolidColor")).value<QColor>());
  view->setBeginColor(archive.value(QStringLiteral("BeginColor")).value<QColor>());
  view->setEndColor(archive.value(QStringLiteral("EndColor")).value<QColor>());
  view->setGradientAngle(archive.value(QStringLiteral("GradientAngle")).toFloat());
  view->setImageName(archive.value(QStringLiteral("ImageName")).toString());
  view->setScaleMode(archive.value(QStringLiteral("ScaleMode")).toInt());
  return view;
}

QVariantMap RZBackgroundView::encodeWithCoder() const {
  return {{QStringLiteral("BeginColor"), beginColor_},
          {QStringLiteral("EndColor"), endColor_},
          {QStringLiteral("SolidColor"), solidColor_},
          {QStringLiteral("ImageName"), imageName_},
          {QStringLiteral("GradientAngle"), static_cast<float>(gradientAngle_)},
          {QStringLiteral("Mode"), mode_},
          {QStringLiteral("ScaleMode"), scaleMode_}};
}

void RZBackgroundView::setBeginColor(const QColor& color) {
  beginColor_ = color;
  update();
}

void RZBackgroundView::setEndColor(const QColor& color) {
  endColor_ = color;
  update();
}

void RZBackgroundView::setSolidColor(const QColor& color) {
  solidColor_ = color;
  update();
}

void RZBackgroundView::setGradientAngle(double degrees) {
  gradientAngle_ = degrees;
  update();
}

void RZBackgroundView::setImage(const QImage& image) {
  image_ = image;
  invalidateTiledImage();
  update();
}

void RZBackgroundView::setImageName(const QString& name) {
  imageName_ = name;
  QImage image;
  if (WTImages::contains(name)) image = WTImages::pixmap(name, QSize(32, 32)).toImage();
  setImage(image);
}

void RZBackgroundView::setBackgroundMode(int mode) {
  mode_ = mode;
  invalidateTiledImage();
  update();
}

void RZBackgroundView::setScaleMode(int mode) {
  scaleMode_ = mode;
  invalidateTiledImage();
  update();
}

void RZBackgroundView::setIBImageName(const QString& name) {
  setImageName(name);
  setBackgroundMode(Image);
  setScaleMode(NaturalSize);
}

void RZBackgroundView::setIBTiledImageName(const QString& name) {
  setImageName(name);
  setBackgroundMode(Image);
  setScaleMode(Tiled);
}

void RZBackgroundView::setIBStrechedImageName(const QString& name) {
  setImageName(name);
  setBackgroundMode(Image);
  setScaleMode(Stretched);
}

void RZBackgroundView::setIBSolidHexColor(const QString& hex) {
  setSolidColor(RZColor::colorFromHexRGB(hex));
  setBackgroundMode(SolidColor);
}

void RZBackgroundView::setIBGradientBeginHexColor(const QString& hex) {
  setBeginColor(RZColor::colorFromHexRGB(hex));
  setBackgroundMode(Gradient);
}

void RZBackgroundView::setIBGradientEndHexColor(const QString& hex) {
  setEndColor(RZColor::colorFromHexRGB(hex));
  setBackgroundMode(Gradient);
}

void RZBackgroundView::resizeEvent(QResizeEvent* event) {
  QWidget::resizeEvent(event);
  invalidateTiledImage();
}

void RZBackgroundView::paintEvent(QPaintEvent* event) {
  QPainter painter(this);
  drawBackground(painter, event->rect());
}

void RZBackgroundView::drawBackground(QPainter& painter, const QRect& rect) {
  switch (mode_) {
    case SolidColor:
      painter.fillRect(rect, solidColor_);
      break;
    case Gradient: {
      // The angle counts counter-clockwise from the x axis with y up, as drawings do; 270 runs from
      // the top edge down. The gradient spans the whole view whatever part is repainted.
      const QRectF bounds = this->rect();
      const double radians = gradientAngle_ * M_PI / 180.0;
      const QPointF direction(std::cos(radians), -std::sin(radians));
      const double half =
          std::abs(bounds.width() * direction.x()) / 2.0 + std::abs(bounds.height() * direction.y()) / 2.0;
      QLinearGradient gradient(bounds.center() - direction * half, bounds.center() + direction * half);
      gradient.setColorAt(0, beginColor_);
      gradient.setColorAt(1, endColor_);
      painter.fillRect(rect, gradient);
      break;
    }
    case Image:
      drawImageInRect(painter, rect);
      break;
    default:
      break;
  }
}

void RZBackgroundView::drawImageInRect(QPainter& painter, const QRect& rect) {
  if (image_.isNull()) return;
  switch (scaleMode_) {
    case NaturalSize:
      painter.drawImage(rect.topLeft(), image_);
      break;
    case Stretched:
      painter.drawImage(rect, image_);
      break;
    case Tiled:
      drawTiledImage(painter);
      break;
    default:
      break;
  }
}

void RZBackgroundView::drawTiledImage(QPainter& painter) {
  const QSize imageSize = image_.deviceIndependentSize().toSize();
  const int imageWidth = imageSize.width();
  const int imageHeight = imageSize.height();
  if (imageWidth * imageHeight == 0) return;
  const QRect bounds = rect();
  // A size change of a hidden view reaches resizeEvent only when it shows: check the cache still covers.
  if (tiledImage_.width() < bounds.width() || tiledImage_.height() < bounds.height()) tiledImage_ = QImage();
  if (tiledImage_.isNull()) {
    // One tile more than fits each way, filled once; later paints only copy from it.
    const int columns = bounds.width() / imageWidth;
    const int rows = bounds.height() / imageHeight;
    tiledImage_ =
        QImage((columns + 1) * imageWidth, (rows + 1) * imageHeight, QImage::Format_ARGB32_Premultiplied);
    tiledImage_.fill(Qt::transparent);
    QPainter tiles(&tiledImage_);
    tiles.fillRect(tiledImage_.rect(), QBrush(image_.scaled(imageSize)));
  }
  // Tiles line up with the top edge of the view.
  painter.drawImage(bounds.topLeft(), tiledImage_, QRect(bounds.x(), 0, bounds.width(), bounds.height()));
}
