#include "WTExportController.h"

#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTCSVExport.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTRangePopUpButton.h"

#include <QButtonGroup>
#include <QComboBox>
#include <QDialogButtonBox>
#include <QFormLayout>
#include <QLabel>
#include <QMessageBox>
#include <QPushButton>
#include <QRadioButton>
#include <QVBoxLayout>

WTExportController::WTExportController(WTObjectContext* context, std::function<WTProject*()> selectedProject,
                                       QWidget* parent)
    : QDialog(parent),
      context_(context),
      selectedProject_(std::move(selectedProject)),
      chooseSaveLocation_(askForSaveLocation) {
  setObjectName(QStringLiteral("exportWindow"));
  setWindowTitle(tr("Export"));
  setMinimumWidth(420);
  auto* layout = new QVBoxLayout(this);
  auto* form = new QFormLayout;
  rangeButton_ = new WTRangePopUpButton(context ? context->userDefaults() : nullptr, this);
  form->addRow(tr("Date range:"), rangeButton_);

  projectChoice_ = new QButtonGroup(this);
  auto* all = new QRadioButton(tr("All projects"), this);
  all->setObjectName(QStringLiteral("allProjects"));
  auto* selected = new QRadioButton(tr("Selected project"), this);
  selected->setObjectName(QStringLiteral("selectedProject"));
  projectChoice_->addButton(all, AllProjects);
  projectChoice_->addButton(selected, SelectedProject);
  all->setChecked(true);
  selectedProjectLabel_ = new QLabel(this);
  selectedProjectLabel_->setObjectName(QStringLiteral("selectedProjectName"));
  selectedProjectLabel_->setIndent(24);
  auto* choices = new QVBoxLayout;
  choices->addWidget(all);
  choices->addWidget(selected);
  choices->addWidget(selectedProjectLabel_);
  form->addRow(tr("Export:"), choices);
  formatChoice_ = new QComboBox(this);
  formatChoice_->setObjectName(QStringLiteral("exportFormat"));
  formatChoice_->addItem(tr("Time entries"), int(WTCSVExport::Format::Times));
  formatChoice_->addItem(tr("Spreadsheet"), int(WTCSVExport::Format::Spreadsheet));
  form->addRow(tr("Format:"), formatChoice_);
  layout->addLayout(form);

  formatNote_ = new QLabel(this);
  formatNote_->setObjectName(QStringLiteral("exportFormatNote"));
  formatNote_->setWordWrap(true);
  formatNote_->setForegroundRole(QPalette::PlaceholderText);
  layout->addWidget(formatNote_);
  connect(formatChoice_, &QComboBox::currentIndexChanged, this, &WTExportController::updateFormatNote);
  // A month's export is made again next month: the last export's range and format are offered.
  if (const UserDefaults* defaults = context ? context->userDefaults() : nullptr) {
    if (const QVariant range = defaults->value(SettingsKeys::kExportRange); range.isValid())
      rangeButton_->selectTag(range.toInt());
    if (const QVariant format = defaults->value(SettingsKeys::kExportFormat); format.isValid()) {
      const int index = formatChoice_->findData(format.toInt());
      if (index >= 0) formatChoice_->setCurrentIndex(index);
    }
  }
  updateFormatNote();

  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Cancel, this);
  QPushButton* exportButton = buttons->addButton(tr("Export…"), QDialogButtonBox::AcceptRole);
  exportButton->setObjectName(QStringLiteral("exportButton"));
  exportButton->setDefault(true);
  connect(buttons, &QDialogButtonBox::accepted, this, &WTExportController::accept);
  connect(buttons, &QDialogButtonBox::rejected, this, &QDialog::reject);
  layout->addWidget(buttons);
  updateSelectedProjectLabel();
}

WTExportController::~WTExportController() = default;

void WTExportController::showEvent(QShowEvent* event) {
  updateSelectedProjectLabel();
  QDialog::showEvent(event);
}

void WTExportController::updateSelectedProjectLabel() {
  WTProject* project = selectedProject_ ? selectedProject_() : nullptr;
  selectedProjectLabel_->setText(project ? project->name()
                                         : tr("(no project is selected: all are exported)"));
  selectedProjectLabel_->setEnabled(project != nullptr);
}

void WTExportController::updateFormatNote() {
  formatNote_->setText(
      format() == WTCSVExport::Format::Times
          ? tr("Time entries are written as CSV: project, task, rate, name, start, end and "
               "minutes, one entry a line.")
          : tr("Time entries, flat fees and expenses are written as a spreadsheet with a header row: client, "
               "project, task, kind, name, date, start, end, duration, billed duration, rate, amount, "
               "currency, notes and rounding rule."));
  // The spreadsheet's note takes more lines: an open window grows to hold them, or the layout would
  // squeeze the choices above it.
  if (isVisible()) {
    const int needed = layout()->totalHeightForWidth(width());
    if (needed > height()) resize(width(), needed);
  }
}

WTCSVExport::Format WTExportController::format() const {
  return WTCSVExport::Format(formatChoice_->currentData().toInt());
}

WTProject* WTExportController::projectLimit() const {
  if (projectChoice_->checkedId() != SelectedProject || !selectedProject_) return nullptr;
  return selectedProject_();
}

Result<int> WTExportController::exportToPath(const QString& path) const {
  if (!context_) return Error{1, tr("There is no store to export from.")};
  // What is billed takes a billing period, as a report does; the time entries count both ends.
  if (format() == WTCSVExport::Format::Spreadsheet) {
    return WTCSVExport::exportSpreadsheet(
        *context_, WTRangePredicate::predicateForPeriod(rangeButton_->selectedPeriod()), projectLimit(),
        path);
  }
  return WTCSVExport::exportTimes(*context_, rangeButton_->selectedPredicate(), projectLimit(), path);
}

void WTExportController::accept() {
  const WTProject* project = projectLimit();
  const QString suffix = QStringLiteral("csv");
  // Named as the format's choice is: the spreadsheet holds flat fees and expenses too.
  const QString path =
      chooseSaveLocation_(this, {tr("Export"), tr("CSV files (*.csv)"), suffix,
                                 suggestedFileName(project ? project->name() : formatChoice_->currentText(),
                                                   rangeButton_->selectedPeriod(), suffix)});
  if (path.isEmpty()) return;  // the choices stay on screen for another try
  const Result<int> written = exportToPath(path);
  if (!written) {
    QMessageBox::warning(this, tr("Export"), written.error().message);
    return;
  }
  if (UserDefaults* defaults = context_->userDefaults()) {
    defaults->setValue(SettingsKeys::kExportRange, rangeButton_->selectedTag());
    defaults->setValue(SettingsKeys::kExportFormat, int(format()));
  }
  QDialog::accept();
}
