#pragma once

#include "WTIdleSource.h"

#include <QByteArray>

struct xcb_connection_t;

// The X server's own idle counter (the MIT-SCREEN-SAVER extension), for X11 sessions whose desktop
// offers no idle service on the bus. It holds a connection of its own, so it works whatever platform
// the widgets use. A server without the extension, or one that cannot be reached, gives -1.
//
// Not for Wayland sessions: there the X server (Xwayland) sees only the input of X clients and would
// call a user typing in native windows idle. sessionIsX11() tells whether it may be used.
class WTX11IdleSource final : public WTIdleSource {
 public:
  // `display` empty: $DISPLAY.
  explicit WTX11IdleSource(const QByteArray& display = {});
  ~WTX11IdleSource() override;
  WTX11IdleSource(const WTX11IdleSource&) = delete;
  WTX11IdleSource& operator=(const WTX11IdleSource&) = delete;

  qint64 idleSeconds() override;
  // Whether the server answered with the extension when connecting.
  bool isAvailable() const { return available_; }

  // An X11 session: a display and no Wayland compositor (XDG_SESSION_TYPE, when set, must say x11).
  static bool sessionIsX11();

 private:
  xcb_connection_t* connection_ = nullptr;
  unsigned root_ = 0;
  bool available_ = false;
};
