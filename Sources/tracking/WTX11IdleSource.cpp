#include "WTX11IdleSource.h"

#include <xcb/screensaver.h>
#include <xcb/xcb.h>

#include <cstdlib>
#include <memory>

WTX11IdleSource::WTX11IdleSource(const QByteArray& display) {
  int screenNumber = 0;
  connection_ = xcb_connect(display.isEmpty() ? nullptr : display.constData(), &screenNumber);
  if (xcb_connection_has_error(connection_)) return;
  const xcb_query_extension_reply_t* extension = xcb_get_extension_data(connection_, &xcb_screensaver_id);
  if (!extension || !extension->present) return;
  xcb_screen_iterator_t screens = xcb_setup_roots_iterator(xcb_get_setup(connection_));
  for (int i = 0; i < screenNumber && screens.rem; ++i) xcb_screen_next(&screens);
  if (!screens.rem) return;
  root_ = screens.data->root;
  available_ = true;
}

WTX11IdleSource::~WTX11IdleSource() {
  if (connection_) xcb_disconnect(connection_);
}

qint64 WTX11IdleSource::idleSeconds() {
  if (!available_ || xcb_connection_has_error(connection_)) return -1;
  const xcb_screensaver_query_info_cookie_t cookie = xcb_screensaver_query_info(connection_, root_);
  std::unique_ptr<xcb_screensaver_query_info_reply_t, decltype(&std::free)> reply(
      xcb_screensaver_query_info_reply(connection_, cookie, nullptr), &std::free);
  if (!reply) return -1;
  return qint64(reply->ms_since_user_input / 1000);
}

bool WTX11IdleSource::sessionIsX11() {
  if (qEnvironmentVariableIsEmpty("DISPLAY") || !qEnvironmentVariableIsEmpty("WAYLAND_DISPLAY")) return false;
  const QByteArray type = qgetenv("XDG_SESSION_TYPE");
  return type.isEmpty() || type == "x11";
}
