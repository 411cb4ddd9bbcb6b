#pragma once

#include <QColor>
#include <QString>
#include <QWidget>

// A view that paints its background as a gradient from its top edge down, the colours given as
// hexadecimal text.
class RZBackgroundView : public QWidget {
  Q_OBJECT
 public:
  explicit RZBackgroundView(QWidget* parent = nullptr) : QWidget(parent) {}

  void setIBGradientBeginHexColor(const QString& hex);
  void setIBGradientEndHexColor(const QString& hex);

  // Paints the background into `painter` over `rect` (what paintEvent does).
  void drawBackground(QPainter& painter, const QRect& rect);

 protected:
  void paintEvent(QPaintEvent* event) override;

 private:
  QColor beginColor_ = Qt::white;
  QColor endColor_ = Qt::gray;
};
