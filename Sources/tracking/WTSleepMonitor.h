#pragma once

#include <QDBusConnection>
#include <QObject>

// Tells when the machine is about to sleep and when it woke, from logind's PrepareForSleep signal.
class WTSleepMonitor : public QObject {
  Q_OBJECT
 public:
  // `bus` is normally QDBusConnection::systemBus(). Without a bus (or when the match cannot be added)
  // the monitor stays silent and isListening() is false: the application runs on without it.
  explicit WTSleepMonitor(const QDBusConnection& bus, QObject* parent = nullptr);
  ~WTSleepMonitor() override;

  bool isListening() const { return listening_; }

 signals:
  // `name` says which announcement arrived, for the log.
  void willSleep(const QString& name);
  void didWake(const QString& name);

 private slots:
  void prepareForSleep(bool start);

 private:
  QDBusConnection bus_;
  bool listening_ = false;
};
