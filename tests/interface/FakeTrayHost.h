#pragma once
#include <QtDBus>

// A desktop tray's StatusNotifierWatcher, noting who registered which item.
class FakeStatusNotifierWatcher : public QObject, protected QDBusContext {
  Q_OBJECT
  Q_CLASSINFO("D-Bus Interface", "org.kde.StatusNotifierWatcher")
 public:
  QStringList registered() const {
    QMutexLocker lock(&mutex_);
    return registered_;
  }

 public slots:
  void RegisterStatusNotifierItem(const QString& service) {
    QMutexLocker lock(&mutex_);
    // An item may name itself by its path alone; then it is the sender's.
    registered_.append(service.startsWith(u'/') ? message().service() : service);
  }

 private:
  mutable QMutex mutex_;
  QStringList registered_;
};

// Hears a tray item's label change.
class LabelListener : public QObject {
  Q_OBJECT
 public:
  QStringList labels;

 public slots:
  void newLabel(const QString& label, const QString&) { labels.append(label); }
};
