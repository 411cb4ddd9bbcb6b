#pragma once

// Collects log lines while it lives; given rules ("tessal.sync.debug=true"), turns those categories on.
#include <QLoggingCategory>
#include <QString>
#include <QStringList>
#include <QtGlobal>

#include <algorithm>

class LogCapture {
 public:
  explicit LogCapture(const QString& rules = {}) : rules_(rules) {
    if (!rules_.isEmpty()) QLoggingCategory::setFilterRules(rules_);
    current() = this;
    previous_ =
        qInstallMessageHandler([](QtMsgType type, const QMessageLogContext& context, const QString& text) {
          current()->lines.append(text);
          if (current()->previous_ && type != QtDebugMsg) current()->previous_(type, context, text);
        });
  }
  ~LogCapture() {
    qInstallMessageHandler(previous_);
    current() = nullptr;
    if (!rules_.isEmpty()) QLoggingCategory::setFilterRules(QString());
  }
  bool contains(const QString& text) const {
    return std::any_of(lines.begin(), lines.end(), [&](const QString& line) { return line.contains(text); });
  }
  QStringList lines;

 private:
  static LogCapture*& current() {
    static LogCapture* capture = nullptr;
    return capture;
  }
  QString rules_;
  QtMessageHandler previous_ = nullptr;
};
