// libFuzzer target over the journal's text (see README.md): whatever loads is written out as the
// application writes it and loads again as the same journal.
#include "RZSyncJSON.h"
#include "RZSyncTrack.h"

#include <QSet>
#include <QTemporaryDir>

#include <cstddef>
#include <cstdint>
#include <cstdlib>

namespace {
void check(bool condition) {
  if (!condition) std::abort();
}
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const QTemporaryDir dir;
  static const QString path = dir.filePath(QStringLiteral("Tessal.sync"));
  QString problem;
  const std::optional<RZSyncTrack> track =
      RZSyncTrack::fromJSON(QByteArrayView(reinterpret_cast<const char*>(data), qsizetype(size)), &problem);
  if (!track) {
    check(!problem.isEmpty());
    return 0;
  }
  // A deletion is sent once, however often the file names it.
  const QStringList& deleted = track->deletedIds();
  check(QSet<QString>(deleted.begin(), deleted.end()).size() == deleted.size());
  check(track->writeToFile(path).ok());
  const RZSyncTrack again(path);
  check(again.iteration() == track->iteration());
  check(RZSyncJSON::sameValue(again.dictionary(), track->dictionary()));
  return 0;
}
