#include "WTMainWindowController.h"

#include "RZDate.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTAlertPresenter.h"
#include "WTAppDelegate.h"
#include "WTClientsViewController.h"
#include "WTEditCommitter.h"
#include "WTExportController.h"
#include "WTHelpDialogs.h"
#include "WTImages.h"
#include "WTImportPlan.h"
#include "WTItemsViewController.h"
#include "WTNavigationController.h"
#include "WTObject.h"
#include "WTObjectContext.h"
#include "WTObjectListModel.h"
#include "WTPreferencesWindowController.h"
#include "WTProject.h"
#include "WTProjectsViewController.h"
#include "WTTask.h"

#include <QAction>
#include <QActionGroup>
#include <QApplication>
#include <QCloseEvent>
#include <QFile>
#include <QFileDialog>
#include <QFileInfo>
#include <QMenuBar>
#include <QMessageBox>
#include <QPushButton>
#include <QScreen>
#include <QStatusBar>
#include <QStatusTipEvent>
#include <QStyle>
#include <QThread>
#include <QTimeZone>
#include <QToolBar>
#include <QToolButton>
#include <QVBoxLayout>

WTMainWindowController::WTMainWindowController(WTAppDelegate& delegate, QWidget* parent)
    : QMainWindow(parent), delegate_(delegate) {
  setWindowTitle(QStringLiteral("Tessal"));
  setWindowIcon(WTImages::icon(QStringLiteral("tessal")));
  setObjectName(QStringLiteral("MainWindow"));
  setMinimumSize(640, 360);

  WTObjectContext* context = delegate_.managedObjectContext();
  if (UserDefaults* defaults = context->userDefaults()) registerDefaults(*defaults);
  restoreWindowGeometry();
  // A save (the autosave, a sync merge, quitting) stores what the user is typing without ending the edit.
  delegate_.setCommitEditingHandler([] {
    WTEditCommitter::commitWithoutEnding(QApplication::focusWidget());
    return true;
  });

  projectsNavigationController_ = new WTNavigationController(this);
  clientsNavigationController_ = new WTNavigationController(this);
  projectsViewController_ = new WTProjectsViewController(context, this);
  clientsViewController_ = new WTClientsViewController(context, this);
  projectsViewController_->setArchivedPredicate(delegate_.archivedPredicate());
  clientsViewController_->setArchivedPredicate(delegate_.archivedPredicate());
  connect(&delegate_, &WTAppDelegate::archivedPredicateChanged, this, [this] {
    projectsViewController_->setArchivedPredicate(delegate_.archivedPredicate());
    clientsViewController_->setArchivedPredicate(delegate_.archivedPredicate());
  });

  contentView_ = new QWidget(this);
  contentView_->setObjectName(QStringLiteral("contentView"));
  auto* layout = new QVBoxLayout(contentView_);
  layout->setContentsMargins(0, 0, 0, 0);
  setCentralWidget(contentView_);

  validation_.setSingleShot(true);
  validation_.setInterval(0);
  connect(&validation_, &QTimer::timeout, this, &WTMainWindowController::validateToolbarItems);
  buildActions();

  // As the window loads: both roots pushed, the projects shown. The lists show what a new store was
  // filled with (WTAppDelegate::fillNewStore) from the first paint on, not a turn later.
  projectsViewController_->arrayController()->rearrangeObjects();
  setSelectedToolbarItemIdentifier(QStringLiteral("projects"));
  projectsNavigationController_->pushViewController(projectsViewController_);
  clientsNavigationController_->pushViewController(clientsViewController_);
  showProjects();

  watch(projectsViewController_);
  watch(clientsViewController_);
  for (WTNavigationController* stack : {projectsNavigationController_, clientsNavigationController_}) {
    connect(stack, &WTNavigationController::topViewControllerChanged, this, [this, stack] {
      if (WTViewController* top = stack->topViewController()) watch(top);
      scheduleValidation();
    });
  }
  connect(context, &WTObjectContext::objectsDidChange, this, &WTMainWindowController::scheduleValidation);
  validateToolbarItems();
}

WTMainWindowController::~WTMainWindowController() {
  // The stacks go first: their views hold the controllers' views.
  delete projectsNavigationController_;
  delete clientsNavigationController_;
}

void WTMainWindowController::registerDefaults(UserDefaults& defaults) {
  const Date now = Date::now();
  defaults.registerDefaults(
      {{SettingsKeys::kCustomRangeBegin, QVariant::fromValue(RZDate::addMonth(now, -1))},
       {SettingsKeys::kCustomRangeEnd, QVariant::fromValue(now)}});
}

void WTMainWindowController::watch(WTViewController* controller) {
  // Connected once per controller, however often it is pushed.
  connect(controller, &WTViewController::validationChanged, this, &WTMainWindowController::scheduleValidation,
          Qt::UniqueConnection);
  if (auto* items = qobject_cast<WTItemsViewController*>(controller)) {
    connect(items, &WTItemsViewController::backRequested, this, &WTMainWindowController::goBack,
            Qt::UniqueConnection);
  }
}

void WTMainWindowController::buildActions() {
  auto make = [this](const QString& identifier, const QString& title, const QString& image,
                     const QKeySequence& shortcut, void (WTMainWindowController::*slot)()) {
    auto* action = new QAction(title, this);
    action->setObjectName(identifier);
    if (!image.isEmpty()) action->setIcon(WTImages::icon(image));
    if (!shortcut.isEmpty()) action->setShortcut(shortcut);
    if (slot) connect(action, &QAction::triggered, this, slot);
    actions_.append(action);
    return action;
  };
  QAction* projects = make(QStringLiteral("projects"), tr("Projects"), QStringLiteral("tb_projects"),
                           QKeySequence(Qt::CTRL | Qt::Key_1), &WTMainWindowController::showProjects);
  QAction* clients = make(QStringLiteral("clients"), tr("Clients"), QStringLiteral("tb_clients"),
                          QKeySequence(Qt::CTRL | Qt::Key_2), &WTMainWindowController::showClients);
  for (QAction* action : {projects, clients}) action->setCheckable(true);
  stackGroup_ = new QActionGroup(this);
  stackGroup_->addAction(projects);
  stackGroup_->addAction(clients);
  QAction* add = make(QStringLiteral("add"), tr("Add"), QStringLiteral("tb_add"), QKeySequence::New,
                      &WTMainWindowController::addObject);
  QAction* remove = make(QStringLiteral("remove"), tr("Remove"), QStringLiteral("tb_remove"),
                         QKeySequence::Delete, &WTMainWindowController::removeSelectedObjects);
  QAction* archive = make(QStringLiteral("archive"), tr("Archive"), QStringLiteral("tb_archive"),
                          QKeySequence(Qt::CTRL | Qt::Key_E), &WTMainWindowController::toggleArchive);
  QAction* report = make(QStringLiteral("report"), tr("Report"), QStringLiteral("tb_report"),
                         QKeySequence(Qt::CTRL | Qt::Key_R), &WTMainWindowController::report);
  QAction* timer = make(QStringLiteral("toggleTimer"), tr("Start/Stop Timer"), QStringLiteral("StopWatch"),
                        QKeySequence(Qt::CTRL | Qt::Key_T), &WTMainWindowController::toggleTimer);
  QAction* back = make(QStringLiteral("back"), tr("Back"), QStringLiteral("back"), QKeySequence::Back,
                       &WTMainWindowController::goBack);
  QAction* showArchived = make(QStringLiteral("showArchived"), tr("Show Archived"), QString(),
                               QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_A), nullptr);
  showArchived->setCheckable(true);
  showArchived->setChecked(delegate_.displayArchived());
  connect(showArchived, &QAction::triggered, this, [this] { delegate_.toggleArchived(); });
  connect(&delegate_, &WTAppDelegate::archivedPredicateChanged, showArchived,
          [this, showArchived] { showArchived->setChecked(delegate_.displayArchived()); });

  toolbar_ = addToolBar(tr("Toolbar"));
  toolbar_->setObjectName(QStringLiteral("toolbar"));
  toolbar_->setMovable(false);
  toolbar_->setFloatable(false);
  toolbar_->setIconSize(QSize(28, 28));
  toolbar_->setToolButtonStyle(Qt::ToolButtonTextUnderIcon);
  toolbar_->setContextMenuPolicy(Qt::PreventContextMenu);
  toolbar_->addAction(projects);
  toolbar_->addAction(clients);
  toolbar_->addSeparator();
  toolbar_->addAction(add);
  toolbar_->addAction(remove);
  auto* spacer = new QWidget(toolbar_);
  spacer->setSizePolicy(QSizePolicy::Expanding, QSizePolicy::Preferred);
  toolbar_->addWidget(spacer);
  toolbar_->addAction(archive);
  toolbar_->addAction(report);
  runningTimeButton_ = new QToolButton(toolbar_);
  runningTimeButton_->setObjectName(QStringLiteral("runningTime"));
  runningTimeButton_->setIcon(WTImages::icon(QStringLiteral("StopWatch")));
  runningTimeButton_->setToolButtonStyle(Qt::ToolButtonTextUnderIcon);
  runningTimeButton_->setToolTip(tr("Running timers and recent tasks"));
  connect(runningTimeButton_, &QToolButton::clicked, this, [this] {
    emit runningTimeButtonClicked(
        QRect(runningTimeButton_->mapToGlobal(QPoint(0, 0)), runningTimeButton_->size()));
  });
  runningTimeItem_ = toolbar_->addWidget(runningTimeButton_);
  runningTimeItem_->setVisible(false);
  setRunningTime(QString());

  QMenu* file = menuBar()->addMenu(tr("&File"));
  file->addAction(add);
  file->addSeparator();
  file->addAction(tr("&Save"), QKeySequence::Save, [this] { delegate_.saveAction(); });
  file->addSeparator();
  QAction* exportAction = file->addAction(tr("&Export…"), QKeySequence(Qt::CTRL | Qt::SHIFT | Qt::Key_E),
                                          this, &WTMainWindowController::exportData);
  exportAction->setObjectName(QStringLiteral("export"));
  file->addAction(tr("&Import…"), this, &WTMainWindowController::importData)
      ->setObjectName(QStringLiteral("import"));
  file->addSeparator();
  file->addAction(tr("&Quit"), QKeySequence::Quit, this, &WTMainWindowController::quit);

  QMenu* edit = menuBar()->addMenu(tr("&Edit"));
  QAction* undo = undo_ = edit->addAction(tr("&Undo"), QKeySequence::Undo, [this] {
    // Typing is undone where it was typed; only then the records, with the keyboard focus kept.
    QWidget* focus = QApplication::focusWidget();
    if (WTEditCommitter::undoTyping(focus)) return;
    WTEditCommitter::closeUntouchedEditor(focus);
    delegate_.managedObjectContext()->undoManager().undo();
  });
  undo->setObjectName(QStringLiteral("undo"));
  QAction* redo = redo_ = edit->addAction(tr("&Redo"), QKeySequence::Redo, [this] {
    QWidget* focus = QApplication::focusWidget();
    if (WTEditCommitter::redoTyping(focus)) return;
    WTEditCommitter::closeUntouchedEditor(focus);
    delegate_.managedObjectContext()->undoManager().redo();
  });
  redo->setObjectName(QStringLiteral("redo"));
  edit->addSeparator();
  // Ctrl+, as desktops spell it; Qt's standard Preferences key differs from one desktop to the next.
  QAction* preferences = edit->addAction(tr("Pr&eferences…"), QKeySequence(Qt::CTRL | Qt::Key_Comma), this,
                                         &WTMainWindowController::showPreferences);
  preferences->setObjectName(QStringLiteral("preferences"));
  preferences->setMenuRole(QAction::PreferencesRole);
  connect(edit, &QMenu::aboutToShow, this, [this, undo, redo] {
    WTUndoManager& manager = delegate_.managedObjectContext()->undoManager();
    QWidget* focus = QApplication::focusWidget();
    undo->setEnabled(manager.canUndo() || WTEditCommitter::hasTypingToUndo(focus));
    redo->setEnabled(manager.canRedo() || WTEditCommitter::hasTypingToRedo(focus));
    updateUndoTitles();
  });
  connect(delegate_.managedObjectContext(), &WTObjectContext::undoStateChanged, this,
          &WTMainWindowController::updateUndoTitles);
  updateUndoTitles();
  connect(edit, &QMenu::aboutToHide, this, [undo, redo] {
    // Shortcuts stay live; an empty stack simply does nothing.
    undo->setEnabled(true);
    redo->setEnabled(true);
  });
  edit->addSeparator();
  edit->addAction(remove);

  QMenu* view = menuBar()->addMenu(tr("&View"));
  view->addAction(projects);
  view->addAction(clients);
  view->addAction(back);
  view->addSeparator();
  view->addAction(showArchived);

  QMenu* record = menuBar()->addMenu(tr("&Record"));
  record->addAction(archive);
  record->addAction(report);
  record->addSeparator();
  record->addAction(timer);

  QMenu* help = menuBar()->addMenu(tr("&Help"));
  help->setObjectName(QStringLiteral("helpMenu"));
  QAction* shortcuts = help->addAction(tr("&Keyboard Shortcuts"), [this] {
    QDialog* dialog = WTHelpDialogs::makeShortcutsDialog(menuBar(), this);
    dialog->setAttribute(Qt::WA_DeleteOnClose);
    dialog->open();
  });
  shortcuts->setObjectName(QStringLiteral("keyboardShortcuts"));
  QAction* about = help->addAction(tr("&About Tessal"), [this] {
    QDialog* dialog = WTHelpDialogs::makeAboutDialog(this);
    dialog->setAttribute(Qt::WA_DeleteOnClose);
    dialog->open();
  });
  about->setObjectName(QStringLiteral("about"));
  about->setMenuRole(QAction::AboutRole);
}

void WTMainWindowController::updateUndoTitles() {
  const WTUndoManager& manager = delegate_.managedObjectContext()->undoManager();
  QWidget* focus = QApplication::focusWidget();
  // A name may hold "&" (“R&D”): in a menu title it must stay a character, not a mnemonic.
  const auto title = [](const QString& bare, const QString& named, const QString& name) {
    if (name.isEmpty()) return bare;
    return named.arg(QString(name).replace(u'&', QLatin1String("&&")));
  };
  undo_->setText(title(tr("&Undo"), tr("&Undo %1"),
                       WTEditCommitter::hasTypingToUndo(focus) ? tr("Typing") : manager.undoActionName()));
  redo_->setText(title(tr("&Redo"), tr("&Redo %1"),
                       WTEditCommitter::hasTypingToRedo(focus) ? tr("Typing") : manager.redoActionName()));
}

bool WTMainWindowController::confirmDeletion(const QString& question, const QString& detail) {
  return delegate_.alertPresenter()->confirmDeletion(question, detail);
}

WTProject* WTMainWindowController::selectedProject() const {
  // The projects stack answers whichever stack is on screen: an open project, else the selected row.
  WTViewController* top =
      projectsNavigationController_ ? projectsNavigationController_->topViewController() : nullptr;
  if (auto* items = qobject_cast<WTItemsViewController*>(top)) return items->project();
  return dynamic_cast<WTProject*>(projectsViewController_->selectedObject());
}

WTExportController* WTMainWindowController::exportData() {
  auto* dialog = new WTExportController(
      delegate_.managedObjectContext(), [this] { return selectedProject(); }, this);
  dialog->setAttribute(Qt::WA_DeleteOnClose);
  dialog->open();
  return dialog;
}

void WTMainWindowController::importData() {
  const QString path = QFileDialog::getOpenFileName(
      this, tr("Import"), QString(), tr("Exports of time trackers (*.csv *.json);;All files (*)"));
  if (!path.isEmpty()) importFile(path);
}

QMessageBox* WTMainWindowController::importFile(const QString& path) {
  auto* dialog = new QMessageBox(this);
  dialog->setAttribute(Qt::WA_DeleteOnClose);
  dialog->setWindowTitle(tr("Import"));
  dialog->setText(tr("Reading “%1”…").arg(QFileInfo(path).fileName()));
  dialog->setStandardButtons(QMessageBox::Cancel);
  dialog->open();
  WTImportFormats::Options options;
  options.zone = QTimeZone::systemTimeZone();
  options.fileTime = Date::fromQDateTime(QFileInfo(path).lastModified());
  // A long history takes a second or two to read: the window stays live meanwhile, and a cancelled
  // dialog simply never hears of the result.
  auto read = std::make_shared<std::optional<Result<WTImportFile>>>();
  QThread* reader = QThread::create([path, options, read] {
    QFile file(path);
    *read = file.open(QIODevice::ReadOnly) ? WTImportFormats::read(file, options)
                                           : Result<WTImportFile>(Error{1, file.errorString()});
  });
  connect(reader, &QThread::finished, reader, &QObject::deleteLater);
  connect(reader, &QThread::finished, dialog, [this, dialog, path, zone = options.zone, read] {
    previewImport(dialog, path, std::move(**read), zone);
  });
  reader->start();
  return dialog;
}

void WTMainWindowController::previewImport(QMessageBox* dialog, const QString& path,
                                           Result<WTImportFile> read, const QTimeZone& zone) {
  if (!read) {
    dialog->setIcon(QMessageBox::Warning);
    dialog->setText(tr("“%1” cannot be imported: %2").arg(QFileInfo(path).fileName(), read.error().message));
    dialog->setStandardButtons(QMessageBox::Close);
    return;
  }
  auto imported = std::make_shared<WTImportFile>(std::move(read.value()));
  WTObjectContext* context = delegate_.managedObjectContext();
  const WTImportPlan plan = WTImport::plan(*context, *imported, {});
  dialog->setText(
      imported->problems.empty()
          ? tr("Import %n entries from “%1”?", nullptr, plan.entries).arg(QFileInfo(path).fileName())
          : tr("“%1” has rows that cannot be read; nothing is imported.").arg(QFileInfo(path).fileName()));
  dialog->setInformativeText(WTImport::preview(*imported, plan, zone));
  if (!imported->problems.empty() || plan.entries == 0) {
    dialog->setIcon(imported->problems.empty() ? QMessageBox::Information : QMessageBox::Warning);
    dialog->setStandardButtons(QMessageBox::Close);
  } else {
    dialog->setStandardButtons(QMessageBox::Cancel);
    QPushButton* import = dialog->addButton(tr("Import"), QMessageBox::AcceptRole);
    import->setObjectName(QStringLiteral("import"));
    dialog->setDefaultButton(import);
    connect(import, &QPushButton::clicked, this,
            [context, imported] { WTImport::apply(*context, *imported, {}); });
  }
}

QList<WTProject*> WTMainWindowController::fetchProjects() const {
  return WTProject::fetchByPredicate({}, delegate_.managedObjectContext());
}

WTNavigationController* WTMainWindowController::currentNavigationController() const {
  return projectsNavigationController_->view()->parentWidget() ? projectsNavigationController_
                                                               : clientsNavigationController_;
}

void WTMainWindowController::showStack(WTNavigationController* stack, const QString& identifier) {
  if (currentNavigationController() == stack && stack->view()->parentWidget()) return;
  auto* layout = static_cast<QVBoxLayout*>(contentView_->layout());
  // The content holds exactly one stack at a time; the other keeps its depth off screen.
  while (QLayoutItem* item = layout->takeAt(0)) {
    if (QWidget* widget = item->widget()) {
      widget->hide();
      widget->setParent(nullptr);
    }
    delete item;
  }
  QWidget* view = stack->view();
  view->setParent(contentView_);
  view->setGeometry(contentView_->rect());
  layout->addWidget(view);
  view->show();
  setSelectedToolbarItemIdentifier(identifier);
  if (WTViewController* top = stack->topViewController()) {
    if (top->isViewLoaded()) WTNavigationController::focusView(top->view());
  }
  scheduleValidation();
}

void WTMainWindowController::showProjects() {
  showStack(projectsNavigationController_, QStringLiteral("projects"));
}

void WTMainWindowController::showClients() {
  showStack(clientsNavigationController_, QStringLiteral("clients"));
}

void WTMainWindowController::setSelectedToolbarItemIdentifier(const QString& identifier) {
  if (QAction* item = toolbarItem(identifier)) item->setChecked(true);
}

QString WTMainWindowController::selectedToolbarItemIdentifier() const {
  QAction* checked = stackGroup_->checkedAction();
  return checked ? checked->objectName() : QString();
}

QAction* WTMainWindowController::toolbarItem(const QString& identifier) const {
  for (QAction* action : actions_) {
    if (action->objectName() == identifier) return action;
  }
  return nullptr;
}

WTViewController* WTMainWindowController::topViewController() const {
  const QList<WTViewController*>& controllers = currentNavigationController()->viewControllers();
  return controllers.isEmpty() ? nullptr : controllers.first();
}

WTViewController* WTMainWindowController::lastViewController() const {
  return currentNavigationController()->topViewController();
}

void WTMainWindowController::addObject() {
  WTViewController* top = lastViewController();
  if (top && top->respondsTo(WTViewController::Command::AddObject)) top->addObject();
}

void WTMainWindowController::removeSelectedObjects() {
  WTViewController* top = lastViewController();
  if (top && top->respondsTo(WTViewController::Command::RemoveSelectedObjects)) top->removeSelectedObjects();
}

void WTMainWindowController::toggleArchive() {
  WTViewController* top = lastViewController();
  if (top && top->respondsTo(WTViewController::Command::ToggleArchive)) top->toggleArchive();
  scheduleValidation();
}

void WTMainWindowController::report() {
  WTViewController* top = lastViewController();
  if (top && top->respondsTo(WTViewController::Command::Report)) top->report();
}

void WTMainWindowController::toggleTimer() {
  WTViewController* top = lastViewController();
  if (top && top->respondsTo(WTViewController::Command::ToggleTimer)) top->toggleTimer();
}

void WTMainWindowController::goBack() {
  WTNavigationController* stack = currentNavigationController();
  if (stack->viewControllers().size() > 1) stack->popViewController();
}

bool WTMainWindowController::validateToolbarItem(QAction* item) {
  using Command = WTViewController::Command;
  WTViewController* top = lastViewController();
  const QString identifier = item->objectName();
  if (identifier == QLatin1String("archive")) {
    if (!top || !top->respondsTo(Command::ToggleArchive)) return false;
    if (!top->respondsTo(Command::SelectedObject)) return true;
    const WTObject* selected = top->selectedObject();
    item->setText(selected && selected->archived() ? tr("Unarchive") : tr("Archive"));
    return true;
  }
  if (identifier == QLatin1String("report")) return top && top->respondsTo(Command::Report);
  if (identifier == QLatin1String("toggleTimer")) return top && top->respondsTo(Command::ToggleTimer);
  if (identifier == QLatin1String("back")) return currentNavigationController()->viewControllers().size() > 1;
  return true;
}

void WTMainWindowController::validateToolbarItems() {
  validation_.stop();
  for (QAction* action : actions_) action->setEnabled(validateToolbarItem(action));
}

void WTMainWindowController::scheduleValidation() {
  validation_.start();
}

void WTMainWindowController::saveLastSelectedProject(int index) {
  if (UserDefaults* defaults = delegate_.managedObjectContext()->userDefaults()) {
    defaults->setValue(SettingsKeys::kLastSelectedProject, index);
  }
}

void WTMainWindowController::bringToFront() {
  if (isMinimized()) showNormal();
  show();
  raise();
  activateWindow();
}

void WTMainWindowController::restoreWindowGeometry() {
  UserDefaults* defaults = delegate_.managedObjectContext()->userDefaults();
  const QString saved = defaults ? defaults->stringForKey(SettingsKeys::kMainWindowGeometry) : QString();
  if (!saved.isEmpty() && restoreGeometry(QByteArray::fromBase64(saved.toLatin1()))) return;
  // First run: a comfortable size that still fits a small or highly scaled screen, centred on it.
  QSize size(960, 640);
  if (const QScreen* screen = QGuiApplication::primaryScreen()) {
    const QRect available = screen->availableGeometry();
    size = size.boundedTo(available.size() * 0.9).expandedTo(minimumSize());
    setGeometry(QStyle::alignedRect(Qt::LeftToRight, Qt::AlignCenter, size, available));
    return;
  }
  resize(size);
}

void WTMainWindowController::saveWindowGeometry() {
  if (UserDefaults* defaults = delegate_.managedObjectContext()->userDefaults())
    defaults->setValue(SettingsKeys::kMainWindowGeometry, QString::fromLatin1(saveGeometry().toBase64()));
}

WTPreferencesWindowController* WTMainWindowController::showPreferences() {
  if (!preferences_) {
    WTObjectContext* context = delegate_.managedObjectContext();  // makes the sync manager too
    preferences_ = new WTPreferencesWindowController(context->userDefaults(), delegate_.syncManager(),
                                                     delegate_.passwordStore(), this);
  }
  preferences_->showWindow();
  return preferences_;
}

void WTMainWindowController::quit() {
  quitting_ = true;
  const bool closed =
      isVisible() ? close()
                  : (delegate_.applicationShouldTerminate() == WTAppDelegate::TerminateReply::TerminateNow);
  quitting_ = false;
  if (closed) QApplication::quit();
}

void WTMainWindowController::setRunningTimeButtonVisible(bool visible) {
  runningTimeItem_->setVisible(visible);
}

void WTMainWindowController::setRunningTime(const QString& label) {
  runningTimeButton_->setText(label.isEmpty() ? tr("Timers") : label);
}

void WTMainWindowController::showNotice(const QString& text) {
  QStatusBar* line = statusBar();
  if (!line->property("followsNotices").toBool()) {
    line->setProperty("followsNotices", true);
    line->setObjectName(QStringLiteral("statusLine"));
    connect(line, &QStatusBar::messageChanged, line,
            [line](const QString& shown) { line->setVisible(!shown.isEmpty()); });
  }
  line->showMessage(text, kNoticeMilliseconds);
  line->show();
}

void WTMainWindowController::withdrawNotice(const QString& summary) {
  QStatusBar* line = statusBar();
  if (line->currentMessage().startsWith(summary)) line->clearMessage();
}

void WTMainWindowController::renewNotice(const QString& summary, const std::function<QString()>& text) {
  const QString standing = statusBar()->currentMessage();
  if (!standing.startsWith(summary)) return;
  if (const QString renewed = text(); renewed != standing) showNotice(renewed);
}

bool WTMainWindowController::event(QEvent* event) {
  // A menu passed over shows each action's status tip in the status line's place, an empty one too: a
  // notice standing there (a budget line crossed, a server out of reach) would be wiped for good.
  if (event->type() == QEvent::StatusTip && static_cast<QStatusTipEvent*>(event)->tip().isEmpty() &&
      !statusBar()->currentMessage().isEmpty())
    return true;
  return QMainWindow::event(event);
}

void WTMainWindowController::closeEvent(QCloseEvent* event) {
  if (hidesOnClose_ && !quitting_) {
    // Tessal goes on in the tray; the window comes back from there.
    saveWindowGeometry();
    event->accept();
    return;
  }
  if (delegate_.applicationShouldTerminate() == WTAppDelegate::TerminateReply::TerminateCancel) {
    event->ignore();
    return;
  }
  saveWindowGeometry();
  event->accept();
  QApplication::quit();
}
