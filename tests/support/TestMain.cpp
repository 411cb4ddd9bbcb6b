// Shared main() of every test binary: no test may touch the developer's data, settings or session.
#include <gtest/gtest.h>

#include <QDir>
#include <QFile>
#include <QTemporaryDir>
#include <cstdlib>

#ifdef TESSAL_TEST_WIDGETS
#include <QApplication>
using TestApplication = QApplication;
#else
#include <QCoreApplication>
using TestApplication = QCoreApplication;
#endif

int main(int argc, char** argv) {
  QTemporaryDir home;
  const QByteArray root = home.path().toUtf8();
  for (const char* sub : {"data", "config", "runtime", "cache"}) QDir(home.path()).mkpath(sub);
  // A runtime folder others may read is refused by Qt (and by Wayland), as a real one would be.
  QFile::setPermissions(home.filePath("runtime"),
                        QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner);
  setenv("XDG_DATA_HOME", (root + "/data").constData(), 1);
  setenv("XDG_CONFIG_HOME", (root + "/config").constData(), 1);
  setenv("XDG_RUNTIME_DIR", (root + "/runtime").constData(), 1);
  setenv("XDG_CACHE_HOME", (root + "/cache").constData(), 1);
  if (!getenv("QT_QPA_PLATFORM")) setenv("QT_QPA_PLATFORM", "offscreen", 1);
  // A bus nobody listens on: an unset address would find the developer's own bus and keyring.
  setenv("DBUS_SESSION_BUS_ADDRESS", ("unix:path=" + root + "/runtime/no-bus").constData(), 1);
  ::testing::InitGoogleTest(&argc, argv);
  TestApplication app(argc, argv);
  return RUN_ALL_TESTS();
}
