#include "RZSyncReply.h"

#include <QStringList>

#include <algorithm>

namespace {

Error malformed(const QString& what) {
  return Error{1, QStringLiteral("The server's reply is not in the expected form: %1").arg(what)};
}

// JSON integers only: a count the server keeps is never text, a truth value or a fraction, and an
// iteration below zero is one the server never hands out.
std::optional<qint64> nonNegativeInteger(const QVariant& value) {
  if (value.typeId() != QMetaType::LongLong) return std::nullopt;
  const qint64 number = value.toLongLong();
  if (number < 0) return std::nullopt;
  return number;
}

bool isPlain(const QVariant& value) {
  const int type = value.typeId();
  return type != QMetaType::QVariantMap && type != QMetaType::QVariantList;
}

// A record's values are what the journal sends: plain values (null, flags, numbers, text) or lists of
// them (the uuids of a relationship); its "uuid", when given, is its own.
std::optional<QString> recordProblem(const QString& uuid, const QVariantMap& values) {
  for (auto value = values.begin(); value != values.end(); ++value) {
    if (value.key() == QLatin1String("uuid")) {
      if (value.value().typeId() != QMetaType::QString || value.value().toString() != uuid)
        return QStringLiteral("the \"uuid\" of \"%1\" is not its own").arg(uuid);
      continue;
    }
    bool fits = isPlain(value.value());
    if (value.value().typeId() == QMetaType::QVariantList) {
      const QVariantList members = value.value().toList();
      fits = std::all_of(members.begin(), members.end(), isPlain);
    }
    if (!fits)
      return QStringLiteral("the value of \"%1\" in \"%2\" is neither a plain value nor a list of them")
          .arg(value.key(), uuid);
  }
  return std::nullopt;
}

std::optional<QString> changeSetProblem(const QVariant& value) {
  if (value.typeId() != QMetaType::QVariantMap) return QStringLiteral("\"result\" is not an object");
  const QVariantMap changes = value.toMap();
  for (auto it = changes.begin(); it != changes.end(); ++it) {
    const QString& section = it.key();
    if (section == QLatin1String("i") || section == QLatin1String("u")) {
      if (it.value().typeId() != QMetaType::QVariantMap)
        return QStringLiteral("\"%1\" is not an object").arg(section);
      const QVariantMap records = it.value().toMap();
      for (auto record = records.begin(); record != records.end(); ++record) {
        if (record.value().typeId() != QMetaType::QVariantMap)
          return QStringLiteral("the values of \"%1\" in \"%2\" are not an object")
              .arg(record.key(), section);
        if (const std::optional<QString> problem = recordProblem(record.key(), record.value().toMap()))
          return problem;
      }
    } else if (section == QLatin1String("x")) {
      if (it.value().typeId() != QMetaType::QVariantList) return QStringLiteral("\"x\" is not a list");
      for (const QVariant& uuid : it.value().toList()) {
        if (uuid.typeId() != QMetaType::QString)
          return QStringLiteral("\"x\" holds something other than text");
      }
    } else {
      return QStringLiteral("\"result\" has an unknown section \"%1\"").arg(section);
    }
  }
  return std::nullopt;
}

}  // namespace

Result<RZSyncReply> RZSyncReply::fromJSON(const QVariant& document) {
  if (document.typeId() != QMetaType::QVariantMap) return malformed(QStringLiteral("it is not an object"));
  const QVariantMap object = document.toMap();
  RZSyncReply reply;

  const QVariant iteration = object.value(QStringLiteral("iteration"));
  if (iteration.isValid()) {
    reply.iteration = nonNegativeInteger(iteration);
    if (!reply.iteration) return malformed(QStringLiteral("\"iteration\" is not a non-negative integer"));
  }

  const QVariant error = object.value(QStringLiteral("error"));
  if (error.isValid()) {
    if (error.typeId() != QMetaType::QString) return malformed(QStringLiteral("\"error\" is not text"));
    reply.error = error.toString();
    const QVariant code = object.value(QStringLiteral("code"));
    if (code.isValid()) {
      const std::optional<qint64> number = nonNegativeInteger(code);
      if (!number) return malformed(QStringLiteral("\"code\" is not a non-negative integer"));
      reply.code = *number;
    }
    return reply;
  }

  reply.action = object.value(QStringLiteral("action")).toString();
  if (reply.action != QLatin1String("head") && reply.action != QLatin1String("save"))
    return malformed(QStringLiteral("\"action\" is neither \"head\" nor \"save\""));
  if (!reply.iteration) return malformed(QStringLiteral("\"iteration\" is missing"));
  if (reply.action == QLatin1String("head")) {
    const QVariant result = object.value(QStringLiteral("result"));
    if (const std::optional<QString> problem = changeSetProblem(result)) return malformed(*problem);
    reply.result = result.toMap();
  }
  return reply;
}
