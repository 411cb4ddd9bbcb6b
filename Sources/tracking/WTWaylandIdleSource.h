#pragma once

#include "WTIdleSource.h"

#include <QByteArray>
#include <QElapsedTimer>
#include <QObject>

class QSocketNotifier;
struct wl_display;
struct wl_registry;
struct wl_seat;
struct ext_idle_notifier_v1;
struct ext_idle_notification_v1;

// Idle time from a Wayland compositor that speaks ext-idle-notify (wlroots compositors, niri, KWin), on a
// connection of our own beside the one the widgets use. The compositor only says when the user has been
// idle for a set time and when they are back, so the idle seconds are counted from that moment less the
// set time; below it they read 0. A compositor without the protocol, or none at all, gives -1.
class WTWaylandIdleSource final : public QObject, public WTIdleSource {
  Q_OBJECT
 public:
  // How long without input before the compositor tells us; also the smallest idle time we can see.
  static constexpr int kNotifyAfterMs = 10000;

  // `display` empty: $WAYLAND_DISPLAY. Events are read as they arrive through the event loop.
  explicit WTWaylandIdleSource(const QByteArray& display = {}, int notifyAfterMs = kNotifyAfterMs,
                               QObject* parent = nullptr);
  ~WTWaylandIdleSource() override;

  qint64 idleSeconds() override;
  // Whether the compositor offered the protocol and a seat.
  bool isAvailable() const { return notification_ != nullptr; }

 private:
  static void registryGlobal(void* data, wl_registry* registry, uint32_t name, const char* interface,
                             uint32_t version);
  static void registryGlobalRemove(void* data, wl_registry* registry, uint32_t name);
  static void idled(void* data, ext_idle_notification_v1* notification);
  static void resumed(void* data, ext_idle_notification_v1* notification);
  void readEvents();
  void disconnect();

  wl_display* display_ = nullptr;
  wl_registry* registry_ = nullptr;
  wl_seat* seat_ = nullptr;
  ext_idle_notifier_v1* notifier_ = nullptr;
  ext_idle_notification_v1* notification_ = nullptr;
  QSocketNotifier* reader_ = nullptr;
  int notifyAfterMs_;
  bool idle_ = false;
  QElapsedTimer idleSince_;  // started when the compositor said "idled"
};
