#include "WTRoundingRule.h"

#include <algorithm>
#include <cstdint>
#include <limits>

int WTRoundingRule::apply(int duration) const {
  if (minutes <= 1 || duration == 0) return duration;
  const std::int64_t length = duration < 0 ? -std::int64_t(duration) : std::int64_t(duration);
  const std::int64_t step = minutes;
  std::int64_t rounded = 0;
  switch (mode) {
    case Mode::Up:
      rounded = (length + step - 1) / step * step;
      break;
    case Mode::Nearest:
      rounded = (length + step / 2) / step * step;
      break;
    case Mode::Down:
      rounded = length / step * step;
      break;
  }
  if (rounded > std::numeric_limits<int>::max()) rounded = length;
  return int(duration < 0 ? -rounded : rounded);
}

std::optional<WTRoundingRule::Mode> WTRoundingRule::modeFromName(QStringView name) {
  if (name == u"up") return Mode::Up;
  if (name == u"nearest") return Mode::Nearest;
  if (name == u"down") return Mode::Down;
  return std::nullopt;
}

QString WTRoundingRule::nameOfMode(Mode mode) {
  switch (mode) {
    case Mode::Up:
      return QStringLiteral("up");
    case Mode::Down:
      return QStringLiteral("down");
    case Mode::Nearest:
      break;
  }
  return QStringLiteral("nearest");
}

QVariantMap WTRoundingRule::toVariantMap() const {
  return {{QStringLiteral("minutes"), minutes}, {QStringLiteral("mode"), nameOfMode(mode)}};
}

QString WTRoundingRule::toText() const {
  return minutes <= 1 ? QStringLiteral("none") : QStringLiteral("%1 %2").arg(minutes).arg(nameOfMode(mode));
}

std::optional<WTRoundingRule> WTRoundingRule::fromText(QStringView text) {
  text = text.trimmed();
  if (text == u"none") return WTRoundingRule{};
  const qsizetype space = text.indexOf(u' ');
  bool number = false;
  const int minutes = space > 0 ? text.left(space).toInt(&number) : 0;
  const std::optional<Mode> mode = space > 0 ? modeFromName(text.mid(space + 1)) : std::nullopt;
  if (!number || minutes < 1 || !mode) return std::nullopt;
  return WTRoundingRule{minutes, *mode};
}

WTRoundingRule WTRoundingRule::refinedBy(const std::optional<qint64>& ownMinutes,
                                         const QString& ownMode) const {
  WTRoundingRule rule = *this;
  if (ownMinutes && *ownMinutes > 0)
    rule.minutes = int(std::min<qint64>(*ownMinutes, std::numeric_limits<int>::max()));
  if (!ownMode.isEmpty()) rule.mode = modeFromName(ownMode).value_or(rule.mode);
  return rule;
}

std::optional<QString> WTRoundingRule::storedMode(const QVariant& value) {
  if (value.isNull()) return QString();
  if (value.typeId() != QMetaType::QString) return std::nullopt;
  const QString text = value.toString();
  if (text.isEmpty()) return QString();
  if (const std::optional<Mode> mode = modeFromName(text)) return nameOfMode(*mode);
  return std::nullopt;
}
