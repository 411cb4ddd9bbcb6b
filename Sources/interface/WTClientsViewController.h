#pragma once

#include "WTObjectListViewController.h"

// Root (and only level) of the clients stack: the clients with their project count, duration and
// cost.
class WTClientsViewController : public WTObjectListViewController {
  Q_OBJECT
 public:
  explicit WTClientsViewController(WTObjectContext* context, QObject* parent = nullptr);

  // Inserts a client; when the list shows it, edits its name (no scrolling).
  void addObject() override;
  // Opens a report window on the selected client's projects.
  void report() override;

 protected:
  // "Set Rate…": a client row has no room for a field of its own.
  void addRowMenuItems(QMenu* menu) override;
};
