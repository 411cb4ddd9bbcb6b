// libFuzzer target over the journal file's text, as an older version left it beside the store (see
// README.md): whatever is taken, written out as those versions wrote it, is taken again as the same.
#include "FuzzCheck.h"
#include "RZSyncJSON.h"
#include "RZSyncTrack.h"

#include <QSet>

#include <cstddef>
#include <cstdint>

namespace {

QVariantMap section(const RZSyncTrack::Entries& entries) {
  QVariantMap map;
  for (auto it = entries.begin(); it != entries.end(); ++it) map.insert(it.key(), it.value());
  return map;
}

// {"iteration", "track": {"i", "u", "x"}}, pretty, as the file was written.
QByteArray written(const RZSyncTrack::FileContents& contents) {
  const QVariantMap track{{QStringLiteral("i"), section(contents.inserted)},
                          {QStringLiteral("u"), section(contents.updated)},
                          {QStringLiteral("x"), contents.deleted}};
  return RZSyncJSON::write(
      QVariantMap{{QStringLiteral("iteration"), contents.iteration}, {QStringLiteral("track"), track}},
      RZSyncJSON::Style::Pretty);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  QString problem;
  const std::optional<RZSyncTrack::FileContents> contents =
      RZSyncTrack::fromJSON(QByteArrayView(reinterpret_cast<const char*>(data), qsizetype(size)), &problem);
  if (!contents) {
    check(!problem.isEmpty());
    return 0;
  }
  // A deletion is taken once, however often the file names it.
  check(QSet<QString>(contents->deleted.begin(), contents->deleted.end()).size() == contents->deleted.size());
  const QByteArray text = written(*contents);
  const std::optional<RZSyncTrack::FileContents> again = RZSyncTrack::fromJSON(text);
  check(again && again->iteration == contents->iteration && again->deleted == contents->deleted);
  check(RZSyncJSON::sameValue(section(again->inserted), section(contents->inserted)) &&
        RZSyncJSON::sameValue(section(again->updated), section(contents->updated)));
  return 0;
}
