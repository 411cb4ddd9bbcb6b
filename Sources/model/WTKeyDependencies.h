#pragma once

#include "WTEntity.h"

#include <QString>
#include <QStringList>

#include <vector>

// Which derived keys depend on which key paths, per entity. An announcement of a key also reaches
// observers of every key that depends on it, in the same record or, for paths through a to-one
// relationship ("project.rate"), in the records on the to-many side of it. The paths are declared with the
// keys, in each entity's key table (WTKeyTable.h). The circular pairs (a project's rate and inherited rate,
// a time entry's duration and end date) are intended: a change of either refreshes observers of both.
namespace WTKeyDependencies {

// The key paths `key` of `entity` depends on, as declared; empty when it depends on nothing.
QStringList keyPathsForValuesAffecting(WTEntity entity, const QString& key);

// Keys of the same record to announce when `key` of a record of `entity` is announced.
const QStringList& dependentKeys(WTEntity entity, const QString& key);

// Keys to announce on the records of `relationship` (a to-many key of `entity`) when `key` of a
// record of `entity` is announced.
struct RelatedDependency {
  QString relationship;
  QString dependentKey;
};
const std::vector<RelatedDependency>& relatedDependents(WTEntity entity, const QString& key);

}  // namespace WTKeyDependencies
