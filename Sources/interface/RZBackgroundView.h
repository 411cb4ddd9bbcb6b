#pragma once

#include <QColor>
#include <QImage>
#include <QString>
#include <QVariantMap>
#include <QWidget>

// A view that paints its background as a solid colour (mode 0), a linear gradient (mode 1) or an
// image (mode 2) at its natural size (scale mode 0), stretched (1) or tiled from the top edge (2). Its
// settings can be given as hexadecimal colour strings and image names, and archived and restored.
class RZBackgroundView : public QWidget {
  Q_OBJECT
 public:
  enum Mode { SolidColor = 0, Gradient = 1, Image = 2 };
  enum ScaleMode { NaturalSize = 0, Stretched = 1, Tiled = 2 };

  explicit RZBackgroundView(QWidget* parent = nullptr);
  // A view with the archived settings of `archive` (see encodeWithCoder).
  static RZBackgroundView* initWithCoder(const QVariantMap& archive, QWidget* parent = nullptr);

  QColor beginColor() const { return beginColor_; }
  void setBeginColor(const QColor& color);
  QColor endColor() const { return endColor_; }
  void setEndColor(const QColor& color);
  QColor solidColor() const { return solidColor_; }
  void setSolidColor(const QColor& color);
  double gradientAngle() const { return gradientAngle_; }
  void setGradientAngle(double degrees);
  QImage image() const { return image_; }
  void setImage(const QImage& image);
  QString imageName() const { return imageName_; }
  // Stores the name and loads the application's image of that name (a null image when there is none).
  void setImageName(const QString& name);
  int backgroundMode() const { return mode_; }
  void setBackgroundMode(int mode);
  int scaleMode() const { return scaleMode_; }
  void setScaleMode(int mode);

  // Settings from an interface description: each sets its value and switches the mode.
  void setIBImageName(const QString& name);
  void setIBTiledImageName(const QString& name);
  void setIBStrechedImageName(const QString& name);
  void setIBSolidHexColor(const QString& hex);
  void setIBGradientBeginHexColor(const QString& hex);
  void setIBGradientEndHexColor(const QString& hex);

  // The settings under the keys "BeginColor", "EndColor", "SolidColor", "ImageName", "GradientAngle",
  // "Mode" and "ScaleMode". The image itself is not archived: it is loaded again by name.
  QVariantMap encodeWithCoder() const;

  void invalidateTiledImage() { tiledImage_ = QImage(); }

  // Paints the background into `painter` over `rect` (what paintEvent does).
  void drawBackground(QPainter& painter, const QRect& rect);

 protected:
  void paintEvent(QPaintEvent* event) override;
  void resizeEvent(QResizeEvent* event) override;

 private:
  void drawImageInRect(QPainter& painter, const QRect& rect);
  void drawTiledImage(QPainter& painter);

  QColor beginColor_ = Qt::white;
  QColor endColor_ = Qt::gray;
  QColor solidColor_ = Qt::white;
  double gradientAngle_ = 270.0;
  QImage image_;
  QImage tiledImage_;
  QString imageName_;
  int mode_ = SolidColor;
  int scaleMode_ = Stretched;
};
