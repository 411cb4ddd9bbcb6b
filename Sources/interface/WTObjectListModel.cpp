#include "WTObjectListModel.h"

#include "DurationText.h"
#include "MoneyFormat.h"
#include "WTBudgetBar.h"
#include "WTClient.h"
#include "WTItemsModel.h"
#include "WTObjectContext.h"
#include "WTOrderedDiff.h"
#include "WTProject.h"

#include <algorithm>

namespace {

QString imageOf(const WTObject* object) {
  switch (object->entity()) {
    case WTEntity::Client:
      return static_cast<const WTClient*>(object)->tableImage();
    case WTEntity::Project:
      return static_cast<const WTProject*>(object)->tableImage();
    default:
      return {};
  }
}

bool isRunning(const WTObject* object) {
  return object->entity() == WTEntity::Project && static_cast<const WTProject*>(object)->running();
}

// The keys that decide a record's row: its place in the order, or whether it is listed at all.
bool isSortKey(const QString& key) {
  return key == QLatin1String("name") || key == QLatin1String("archived") || key == QLatin1String("running");
}

bool isShownKey(const QString& key) {
  static const QSet<QString> keys = {
      QStringLiteral("duration"),       QStringLiteral("cost"),           QStringLiteral("tableImage"),
      QStringLiteral("client"),         QStringLiteral("projects"),       QStringLiteral("notes"),
      QStringLiteral("rate"),           QStringLiteral("budget"),         QStringLiteral("billedCost"),
      QStringLiteral("billedDuration"), QStringLiteral("billingCurrency")};
  return keys.contains(key);
}

}  // namespace

WTObjectListModel::WTObjectListModel(WTObjectContext* context, WTEntity entity, QObject* parent)
    : QAbstractListModel(parent), context_(context), entity_(entity) {
  changeTimer_.setSingleShot(true);
  changeTimer_.setInterval(0);
  connect(&changeTimer_, &QTimer::timeout, this, &WTObjectListModel::flushChangedRows);
  rearrangeTimer_.setSingleShot(true);
  rearrangeTimer_.setInterval(0);
  connect(&rearrangeTimer_, &QTimer::timeout, this, &WTObjectListModel::rearrangeObjects);
  connect(context_, &WTObjectContext::objectValueDidChange, this, &WTObjectListModel::objectValueDidChange);
  connect(context_, &WTObjectContext::objectsDidChange, this, &WTObjectListModel::objectsDidChange);
  arranged_ = computeArrangement();
  reindex();
}

WTObjectListModel::~WTObjectListModel() = default;

void WTObjectListModel::setFilterPredicate(std::function<bool(const WTObject*)> predicate) {
  predicate_ = std::move(predicate);
  rearrangeObjects();
}

WTObject* WTObjectListModel::objectAt(int row) const {
  return row >= 0 && row < arranged_.size() ? arranged_[row] : nullptr;
}

int WTObjectListModel::rowOfObject(const WTObject* object) const {
  return rows_.value(object, -1);
}

QModelIndex WTObjectListModel::indexOfObject(const WTObject* object) const {
  const int row = rowOfObject(object);
  return row < 0 ? QModelIndex() : index(row, 0);
}

QList<WTObject*> WTObjectListModel::computeArrangement() const {
  QList<WTObject*> result;
  std::function<bool(const WTObject*)> listed;
  if (predicate_) {
    listed = [this](const WTObject* object) { return predicate_(object) || isRunning(object); };
  }
  const auto fetched = context_->fetchObjectsForEntityName(WTEntities::name(entity_), {}, listed);
  if (fetched) result = *fetched;
  // By name, ignoring case; the identity breaks ties so the order never flickers between equal names.
  std::sort(result.begin(), result.end(), [](const WTObject* a, const WTObject* b) {
    const int order = QString::compare(a->name(), b->name(), Qt::CaseInsensitive);
    if (order != 0) return order < 0;
    return a->uuid() < b->uuid();
  });
  return result;
}

void WTObjectListModel::reindex() {
  rows_.clear();
  rows_.reserve(arranged_.size());
  for (int row = 0; row < arranged_.size(); ++row) rows_.insert(arranged_[row], row);
}

void WTObjectListModel::rearrangeObjects() {
  rearrangeTimer_.stop();
  const QList<WTObject*> target = computeArrangement();
  // Element by element: QList's own == hands two empty lists' null buffers to memcmp.
  if (std::equal(target.cbegin(), target.cend(), arranged_.cbegin(), arranged_.cend())) return;
  struct Ops {
    WTObjectListModel* model;
    void remove(int first, int last) {
      model->beginRemoveRows(QModelIndex(), first, last);
      model->arranged_.remove(first, last - first + 1);
      model->endRemoveRows();
    }
    void move(int from, int to) {
      model->beginMoveRows(QModelIndex(), from, from, QModelIndex(), to);
      model->arranged_.move(from, to);
      model->endMoveRows();
    }
    void insert(int at, WTObject* object) {
      model->beginInsertRows(QModelIndex(), at, at);
      model->arranged_.insert(at, object);
      model->endInsertRows();
    }
  };
  applyOrderedDiff(arranged_, target, Ops{this});
  reindex();
}

void WTObjectListModel::objectValueDidChange(WTObject* object, const QString& key) {
  if (object->entity() == entity_) {
    if (isSortKey(key)) rearrangeTimer_.start();
    if ((isSortKey(key) || isShownKey(key)) && rows_.contains(object)) {
      changed_.insert(object);
      changeTimer_.start();
    }
    return;
  }
  // A project row shows its client's name.
  if (entity_ == WTEntity::Project && object->entity() == WTEntity::Client && key == QLatin1String("name")) {
    for (WTProject* project : static_cast<WTClient*>(object)->projects()) {
      if (rows_.contains(project)) changed_.insert(project);
    }
    changeTimer_.start();
  }
}

void WTObjectListModel::objectsDidChange(const QList<WTObject*>& inserted, const QList<WTObject*>&,
                                         const QList<WTObject*>& deleted) {
  auto concerns = [this](const QList<WTObject*>& objects) {
    return std::any_of(objects.begin(), objects.end(),
                       [this](const WTObject* object) { return object->entity() == entity_; });
  };
  if (concerns(inserted) || concerns(deleted)) rearrangeTimer_.start();
}

void WTObjectListModel::flushChangedRows() {
  const QSet<const WTObject*> changed = std::exchange(changed_, {});
  for (const WTObject* object : changed) {
    const int row = rowOfObject(object);
    if (row >= 0) emit dataChanged(index(row, 0), index(row, 0));
  }
}

int WTObjectListModel::rowCount(const QModelIndex& parent) const {
  return parent.isValid() ? 0 : static_cast<int>(arranged_.size());
}

QVariant WTObjectListModel::data(const QModelIndex& index, int role) const {
  if (!checkIndex(index, CheckIndexOption::IndexIsValid | CheckIndexOption::ParentIsInvalid)) return {};
  const WTObject* object = arranged_[index.row()];
  switch (role) {
    case Qt::DisplayRole:
    case Qt::EditRole:
    case NameRole:
      return object->name();
    case Qt::ToolTipRole:
      if (!object->notes().isEmpty()) return object->notes();
      if (object->archived() && isRunning(object)) return tr("Archived, listed while a timer runs in it");
      return {};
    case ObjectRole:
      return variantFromObject(object);
    case SubtitleRole:
      if (object->entity() == WTEntity::Project) {
        const WTClient* client = static_cast<const WTProject*>(object)->client();
        return client ? client->name() : tr("No Client");
      }
      if (object->entity() == WTEntity::Client) {
        // The rate the client's work is billed at, its own or the one it inherits, and the currency it
        // is billed in where it is the client's own.
        const auto* client = static_cast<const WTClient*>(object);
        const auto count = client->projects().size();
        const QString projects = count == 1 ? tr("1 project") : tr("%1 projects").arg(count);
        const QString rate = MoneyFormat::formatRate(object->inheritedRate(), client->billingCurrency());
        if (client->currency().isEmpty()) return tr("%1 · %2 an hour").arg(projects, rate);
        return tr("%1 · %2 %3 an hour").arg(projects, rate, client->currency());
      }
      return {};
    case DurationTextRole:
      return DurationText::stringWithMinutes(static_cast<const WTBillingRecord*>(object)->duration());
    case CostTextRole:
      return MoneyFormat::format(static_cast<const WTBillingRecord*>(object)->cost(),
                                 static_cast<const WTBillingRecord*>(object)->billingCurrency());
    case BilledTextRole: {
      const auto* record = static_cast<const WTBillingRecord*>(object);
      return WTItemsModel::billedText(std::pair(record->duration(), record->billedDuration()), record->cost(),
                                      record->billedCost(), record->billingCurrency());
    }
    case ImageRole:
      return imageOf(object);
    case ArchivedRole:
      return object->archived();
    case RunningRole:
      return isRunning(object);
    case BudgetRole:
      return WTBudgetBar::variantOf(object);
    case ClientRole:
      if (object->entity() != WTEntity::Project) return {};
      return variantFromObject(static_cast<const WTProject*>(object)->client());
    default:
      return {};
  }
}

bool WTObjectListModel::setData(const QModelIndex& index, const QVariant& value, int role) {
  if (!checkIndex(index, CheckIndexOption::IndexIsValid | CheckIndexOption::ParentIsInvalid)) return false;
  WTObject* object = arranged_[index.row()];
  const WTUndoManager::NamedStep step(context_->undoManager(),
                                      role == ClientRole ? tr("Change Client") : tr("Rename"));
  switch (role) {
    case Qt::EditRole:
    case NameRole: {
      // Spaces typed around a name are not part of it: the commands could not find it by what shows.
      const QString name = value.toString().trimmed();
      if (name == object->name()) return false;
      object->setName(name);
      return true;
    }
    case ClientRole: {
      if (object->entity() != WTEntity::Project) return false;
      WTObject* client = objectFromVariant(value);
      if (client && client->entity() != WTEntity::Client) return false;
      static_cast<WTProject*>(object)->setClient(static_cast<WTClient*>(client));
      return true;
    }
    default:
      return false;
  }
}

Qt::ItemFlags WTObjectListModel::flags(const QModelIndex& index) const {
  if (!index.isValid()) return Qt::NoItemFlags;
  return Qt::ItemIsEnabled | Qt::ItemIsSelectable | Qt::ItemIsEditable | Qt::ItemNeverHasChildren;
}

QHash<int, QByteArray> WTObjectListModel::roleNames() const {
  QHash<int, QByteArray> names = QAbstractListModel::roleNames();
  names.insert(NameRole, "name");
  names.insert(SubtitleRole, "subtitle");
  names.insert(DurationTextRole, "durationText");
  names.insert(CostTextRole, "costText");
  names.insert(ImageRole, "image");
  names.insert(ArchivedRole, "archived");
  names.insert(RunningRole, "running");
  return names;
}

WTObject* WTObjectListModel::objectFromVariant(const QVariant& value) {
  return reinterpret_cast<WTObject*>(value.value<quintptr>());
}

QVariant WTObjectListModel::variantFromObject(const WTObject* object) {
  return object ? QVariant::fromValue(reinterpret_cast<quintptr>(object)) : QVariant();
}
