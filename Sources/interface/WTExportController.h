#pragma once

#include "Result.h"
#include "WTCSVExport.h"
#include "WTRangePredicate.h"
#include "WTSaveLocation.h"

#include <QDialog>

#include <functional>

class QButtonGroup;
class QComboBox;
class QLabel;
class WTObjectContext;
class WTProject;
class WTRangePopUpButton;

// File › Export…: the time entries of a date range, of every project or only of the one selected in
// the main window, written as CSV to a file the user picks; or, as the other format, the spreadsheet of
// every billable item of that range. The dialog holds the choices; accepting it asks for the file and
// writes it.
class WTExportController : public QDialog {
  Q_OBJECT
 public:
  // Tags of the project choice; 1 means the selected project only.
  enum ProjectFilter { AllProjects = 0, SelectedProject = 1 };

  // `context` is not owned. `selectedProject` names the project selected or open in the main window
  // when asked (null for none).
  WTExportController(WTObjectContext* context, std::function<WTProject*()> selectedProject,
                     QWidget* parent = nullptr);
  ~WTExportController() override;

  WTRangePopUpButton* rangeButton() const { return rangeButton_; }
  QButtonGroup* projectChoice() const { return projectChoice_; }
  // The time-entry CSV first, and chosen when the dialog is made; the spreadsheet second.
  QComboBox* formatChoice() const { return formatChoice_; }
  WTCSVExport::Format format() const;

  // The project the export is limited to: the selected one when that choice is made and a project is
  // selected, otherwise none (every project).
  WTProject* projectLimit() const;
  // Writes the entries of the chosen range (and project) to `path`; gives how many were written.
  Result<int> exportToPath(const QString& path) const;

  void setSaveLocationChooser(WTSaveLocationChooser chooser) { chooseSaveLocation_ = std::move(chooser); }

  // Asks for the file, then writes; a failure is shown in a message box.
  void accept() override;

 protected:
  void showEvent(QShowEvent* event) override;

 private:
  void updateSelectedProjectLabel();
  void updateFormatNote();

  WTObjectContext* context_;
  std::function<WTProject*()> selectedProject_;
  WTRangePopUpButton* rangeButton_;
  QButtonGroup* projectChoice_;
  QLabel* selectedProjectLabel_;
  QComboBox* formatChoice_;
  QLabel* formatNote_;
  WTSaveLocationChooser chooseSaveLocation_;
};
