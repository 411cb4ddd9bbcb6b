#pragma once

#include <QList>
#include <QSet>

// Brings `current` to the order of `target` in small steps (removals, then moves and insertions),
// telling `ops` about each step before it happens, so an item model can announce exact row changes
// instead of resetting (views keep their selection, expansion and scroll position).
//
// Ops needs: remove(first, last) for a run of rows of `current` that are not in `target`;
// move(from, to) for one row; insert(at, value) for one value of `target` missing from `current`.
// Each op must apply the change to `current` itself (after announcing it). Values are unique.
template <class T, class Ops>
void applyOrderedDiff(const QList<T>& current, const QList<T>& target, Ops&& ops) {
  QSet<T> wanted(target.begin(), target.end());
  for (qsizetype last = current.size() - 1; last >= 0;) {
    if (wanted.contains(current[last])) {
      --last;
      continue;
    }
    qsizetype first = last;
    while (first > 0 && !wanted.contains(current[first - 1])) --first;
    ops.remove(static_cast<int>(first), static_cast<int>(last));
    last = first - 1;
  }
  for (qsizetype i = 0; i < target.size(); ++i) {
    if (i < current.size() && current[i] == target[i]) continue;
    const qsizetype from = current.indexOf(target[i], i + 1);
    if (from >= 0) {
      ops.move(static_cast<int>(from), static_cast<int>(i));
    } else {
      ops.insert(static_cast<int>(i), target[i]);
    }
  }
}
