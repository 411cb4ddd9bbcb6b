#include "WTSleepMonitor.h"

namespace {
const QString kService = QStringLiteral("org.freedesktop.login1");
const QString kPath = QStringLiteral("/org/freedesktop/login1");
const QString kInterface = QStringLiteral("org.freedesktop.login1.Manager");
const QString kSignal = QStringLiteral("PrepareForSleep");
}  // namespace

WTSleepMonitor::WTSleepMonitor(const QDBusConnection& bus, QObject* parent) : QObject(parent), bus_(bus) {
  if (bus_.isConnected()) {
    listening_ = bus_.connect(kService, kPath, kInterface, kSignal, this, SLOT(prepareForSleep(bool)));
  }
}

WTSleepMonitor::~WTSleepMonitor() {
  if (listening_) bus_.disconnect(kService, kPath, kInterface, kSignal, this, SLOT(prepareForSleep(bool)));
}

void WTSleepMonitor::prepareForSleep(bool start) {
  if (start) {
    emit willSleep(QStringLiteral("PrepareForSleep(true)"));
  } else {
    emit didWake(QStringLiteral("PrepareForSleep(false)"));
  }
}
