#include "WTIdleSourceChain.h"

#include "WTWaylandIdleSource.h"
#include "WTX11IdleSource.h"

std::unique_ptr<WTIdleSource> makeDesktopIdleSource(const QDBusConnection& bus) {
  auto chain = std::make_unique<WTIdleSourceChain>();
  chain->append(std::make_unique<WTDBusIdleSource>(bus));
  if (!qEnvironmentVariableIsEmpty("WAYLAND_DISPLAY")) {
    auto wayland = std::make_unique<WTWaylandIdleSource>();
    if (wayland->isAvailable()) chain->append(std::move(wayland));
  }
  if (WTX11IdleSource::sessionIsX11()) {
    auto x11 = std::make_unique<WTX11IdleSource>();
    if (x11->isAvailable()) chain->append(std::move(x11));
  }
  return chain;
}
