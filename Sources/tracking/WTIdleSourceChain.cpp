#include "WTIdleSourceChain.h"

#include "WTX11IdleSource.h"

std::unique_ptr<WTIdleSource> makeDesktopIdleSource(const QDBusConnection& bus) {
  auto chain = std::make_unique<WTIdleSourceChain>();
  chain->append(std::make_unique<WTDBusIdleSource>(bus));
  if (WTX11IdleSource::sessionIsX11()) {
    auto x11 = std::make_unique<WTX11IdleSource>();
    if (x11->isAvailable()) chain->append(std::move(x11));
  }
  return chain;
}
