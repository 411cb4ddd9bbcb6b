#include "WTWaylandIdleSource.h"

#include "ext-idle-notify-v1-client-protocol.h"

#include <QSocketNotifier>

#include <wayland-client.h>

#include <cstring>

WTWaylandIdleSource::WTWaylandIdleSource(const QByteArray& display, int notifyAfterMs, QObject* parent)
    : QObject(parent), notifyAfterMs_(notifyAfterMs) {
  display_ = wl_display_connect(display.isEmpty() ? nullptr : display.constData());
  if (!display_) return;
  static const wl_registry_listener registryListener = {&WTWaylandIdleSource::registryGlobal,
                                                        &WTWaylandIdleSource::registryGlobalRemove};
  registry_ = wl_display_get_registry(display_);
  wl_registry_add_listener(registry_, &registryListener, this);
  // One round trip brings the globals; a compositor that does not answer leaves us without a source.
  if (wl_display_roundtrip(display_) < 0 || !seat_ || !notifier_) {
    disconnect();
    return;
  }
  static const ext_idle_notification_v1_listener notificationListener = {&WTWaylandIdleSource::idled,
                                                                         &WTWaylandIdleSource::resumed};
  notification_ = ext_idle_notifier_v1_get_idle_notification(notifier_, uint32_t(notifyAfterMs_), seat_);
  ext_idle_notification_v1_add_listener(notification_, &notificationListener, this);
  wl_display_flush(display_);
  reader_ = new QSocketNotifier(wl_display_get_fd(display_), QSocketNotifier::Read, this);
  connect(reader_, &QSocketNotifier::activated, this, &WTWaylandIdleSource::readEvents);
}

WTWaylandIdleSource::~WTWaylandIdleSource() {
  disconnect();
}

void WTWaylandIdleSource::disconnect() {
  if (reader_) {
    // May run inside the notifier's own signal: it goes once that has returned.
    reader_->setEnabled(false);
    reader_->deleteLater();
    reader_ = nullptr;
  }
  if (notification_) ext_idle_notification_v1_destroy(notification_);
  if (notifier_) ext_idle_notifier_v1_destroy(notifier_);
  if (seat_) wl_seat_destroy(seat_);
  if (registry_) wl_registry_destroy(registry_);
  notification_ = nullptr;
  notifier_ = nullptr;
  seat_ = nullptr;
  registry_ = nullptr;
  if (display_) wl_display_disconnect(display_);
  display_ = nullptr;
}

void WTWaylandIdleSource::registryGlobal(void* data, wl_registry* registry, uint32_t name,
                                         const char* interface, uint32_t) {
  auto* self = static_cast<WTWaylandIdleSource*>(data);
  if (std::strcmp(interface, wl_seat_interface.name) == 0 && !self->seat_) {
    self->seat_ = static_cast<wl_seat*>(wl_registry_bind(registry, name, &wl_seat_interface, 1));
  } else if (std::strcmp(interface, ext_idle_notifier_v1_interface.name) == 0 && !self->notifier_) {
    self->notifier_ = static_cast<ext_idle_notifier_v1*>(
        wl_registry_bind(registry, name, &ext_idle_notifier_v1_interface, 1));
  }
}

void WTWaylandIdleSource::registryGlobalRemove(void*, wl_registry*, uint32_t) {}

void WTWaylandIdleSource::idled(void* data, ext_idle_notification_v1*) {
  auto* self = static_cast<WTWaylandIdleSource*>(data);
  self->idle_ = true;
  self->idleSince_.start();
}

void WTWaylandIdleSource::resumed(void* data, ext_idle_notification_v1*) {
  static_cast<WTWaylandIdleSource*>(data)->idle_ = false;
}

void WTWaylandIdleSource::readEvents() {
  if (!display_) return;
  // The one reader of this connection: read what the socket holds and run the listeners.
  while (wl_display_prepare_read(display_) != 0) wl_display_dispatch_pending(display_);
  if (wl_display_read_events(display_) < 0 || wl_display_dispatch_pending(display_) < 0) {
    // The compositor went away: no more idle time from here.
    disconnect();
  }
}

qint64 WTWaylandIdleSource::idleSeconds() {
  if (!notification_) return -1;
  // Events that arrived but were not yet dispatched still count.
  wl_display_dispatch_pending(display_);
  if (!idle_) return 0;
  return (idleSince_.elapsed() + notifyAfterMs_) / 1000;
}
