#pragma once

#include "WTIdleSource.h"

#include <QDBusConnection>

#include <memory>
#include <vector>

// Asks its sources in order; the first that knows (a result of 0 or more) wins. Owns them.
class WTIdleSourceChain final : public WTIdleSource {
 public:
  void append(std::unique_ptr<WTIdleSource> source) { sources_.push_back(std::move(source)); }
  qint64 idleSeconds() override {
    for (const auto& source : sources_) {
      const qint64 seconds = source->idleSeconds();
      if (seconds >= 0) return seconds;
    }
    return -1;
  }

 private:
  std::vector<std::unique_ptr<WTIdleSource>> sources_;
};

// The idle sources of this desktop, in the order they are trusted: the session bus's services (Mutter,
// then the freedesktop screen saver), then a Wayland compositor's ext-idle-notify, then, in an X11
// session, the X server's own counter. Main thread: the Wayland source reads through the event loop.
std::unique_ptr<WTIdleSource> makeDesktopIdleSource(const QDBusConnection& bus);
