#include "WTPreferencesWindowController.h"

#include "MoneyFormat.h"
#include "RZSyncManager.h"
#include "SettingsKeys.h"
#include "UserDefaults.h"
#include "WTClient.h"
#include "WTImages.h"
#include "WTPasswordStore.h"
#include "WTProject.h"
#include "WTRateField.h"
#include "WTRoundingRule.h"

#include <QCheckBox>
#include <QComboBox>
#include <QDesktopServices>
#include <QDialogButtonBox>
#include <QEvent>
#include <QFormLayout>
#include <QGroupBox>
#include <QHBoxLayout>
#include <QLabel>
#include <QLineEdit>
#include <QPlainTextEdit>
#include <QPushButton>
#include <QSpinBox>
#include <QTabWidget>
#include <QVBoxLayout>

#include <unicode/ucurr.h>
#include <unicode/uenum.h>

#include <algorithm>
#include <memory>

namespace {

constexpr const char* kSignUpPath = "/sync/tessal/signup.php";
// What the idle check uses when no usable number of minutes is set.
constexpr int kIdleMinutesWhenUnset = 5;
constexpr QSize kLightSize(16, 16);

// The ISO 4217 codes in use today, as ICU knows them, each with its name in the user's language.
QList<std::pair<QString, QString>> currencies() {
  QList<std::pair<QString, QString>> found;
  UErrorCode status = U_ZERO_ERROR;
  const std::unique_ptr<UEnumeration, decltype(&uenum_close)> codes(
      ucurr_openISOCurrencies(UCURR_COMMON | UCURR_NON_DEPRECATED, &status), &uenum_close);
  if (U_FAILURE(status)) return found;
  int32_t length = 0;
  while (const UChar* code = uenum_unext(codes.get(), &length, &status)) {
    if (U_FAILURE(status)) break;
    UBool isChoiceFormat = false;
    int32_t nameLength = 0;
    UErrorCode nameStatus = U_ZERO_ERROR;
    const UChar* name =
        ucurr_getName(code, nullptr, UCURR_LONG_NAME, &isChoiceFormat, &nameLength, &nameStatus);
    found.append(
        {QString(reinterpret_cast<const QChar*>(code), length),
         U_SUCCESS(nameStatus) ? QString(reinterpret_cast<const QChar*>(name), nameLength) : QString()});
  }
  std::sort(found.begin(), found.end());
  return found;
}

void markRefused(QLineEdit* field, bool refused, const QString& reason) {
  field->setProperty("refused", refused);
  field->setStyleSheet(refused ? QStringLiteral("QLineEdit { border: 2px solid #d03030; }") : QString());
  field->setToolTip(refused ? reason : QString());
}

}  // namespace

WTPreferencesWindowController::WTPreferencesWindowController(UserDefaults* defaults,
                                                             RZSyncManager* syncManager,
                                                             WTPasswordStore* passwords, QWidget* parent)
    : QDialog(parent), defaults_(defaults), syncManager_(syncManager), passwords_(passwords) {
  Q_ASSERT(defaults);
  Q_ASSERT(passwords);
  setObjectName(QStringLiteral("PreferencesWindow"));
  setWindowTitle(tr("Preferences"));
  setModal(false);
  buildInterface();
  loadValues();
  if (syncManager_)
    connect(syncManager_, &RZSyncManager::syncStatusDidChange, this,
            &WTPreferencesWindowController::refreshStatusImageView);
  connect(passwords_, &WTPasswordStore::passwordChanged, this,
          &WTPreferencesWindowController::passwordDidLoad);
  refreshStatusImageView();
  updateKeychainNote();
}

void WTPreferencesWindowController::passwordDidLoad() {
  // The keyring answered after the window was made: the account shows, unless the user is typing one.
  if (emailTextField_->text().isEmpty() && passwordTextField_->text().isEmpty() &&
      !emailTextField_->hasFocus() && !passwordTextField_->hasFocus()) {
    const QString password = passwords_->password();
    if (defaults_->hasStoredValue(SettingsKeys::kSyncUser) && !password.isEmpty()) {
      emailTextField_->setText(defaults_->stringForKey(SettingsKeys::kSyncUser));
      passwordTextField_->setText(password);
    }
  }
  updateKeychainNote();
  refreshStatusImageView();
}

void WTPreferencesWindowController::updateKeychainNote() {
  const QString error = passwords_->keychainError();
  const WTPasswordStore::Location location = passwords_->location();
  QString note;
  if (!error.isEmpty() && location == WTPasswordStore::Location::SettingsFile) {
    note = tr("The keyring did not take the password (%1). It stays in Tessal's settings file, which only "
              "you can read; Start Sync tries the keyring again.")
               .arg(error);
  } else if (!error.isEmpty() && location == WTPasswordStore::Location::None &&
             defaults_->hasStoredValue(SettingsKeys::kSyncUser)) {
    // Empty account fields would look like an account that is gone.
    note = tr("The keyring could not be read (%1), so the account is not shown; nothing was removed. Type "
              "the account again and press Start Sync to go on syncing.")
               .arg(error);
  }
  keychainNoteLabel_->setText(note);
  keychainNoteLabel_->setVisible(!note.isEmpty());
  // Said while the window is open, the note's lines make it taller: none of them is cut.
  if (isVisible() && layout()->hasHeightForWidth()) {
    layout()->activate();
    resize(width(), std::max(height(), layout()->totalHeightForWidth(width())));
  }
}

WTPreferencesWindowController::~WTPreferencesWindowController() {
  // Hiding ends the edit in the focused field, which stores it. That has to happen while this object is
  // still whole: left to QDialog's destructor, the field's editingFinished would reach a half-destroyed one.
  hide();
  billingAddressField_->removeEventFilter(this);
  for (QObject* child : findChildren<QObject*>()) disconnect(child, nullptr, this, nullptr);
}

void WTPreferencesWindowController::buildInterface() {
  auto* windowLayout = new QVBoxLayout(this);
  pages_ = new QTabWidget(this);
  pages_->setObjectName(QStringLiteral("preferencesPages"));
  auto* general = new QWidget(pages_);
  auto* layout = new QVBoxLayout(general);

  // The account.
  auto* account = new QGroupBox(tr("Sync account"), this);
  auto* accountForm = new QFormLayout(account);
  serverField_ = new QLineEdit(account);
  serverField_->setObjectName(QStringLiteral("serverField"));
  serverField_->setPlaceholderText(tr("sync.example.org"));
  emailTextField_ = new QLineEdit(account);
  emailTextField_->setObjectName(QStringLiteral("emailTextField"));
  emailTextField_->setPlaceholderText(tr("you@example.org"));
  passwordTextField_ = new QLineEdit(account);
  passwordTextField_->setObjectName(QStringLiteral("passwordTextField"));
  passwordTextField_->setEchoMode(QLineEdit::Password);
  accountForm->addRow(tr("Server:"), serverField_);
  accountForm->addRow(tr("E-mail:"), emailTextField_);
  accountForm->addRow(tr("Password:"), passwordTextField_);
  // Said here, not in an alert at start: the keyring may have failed long before anyone looks.
  keychainNoteLabel_ = new QLabel(account);
  keychainNoteLabel_->setObjectName(QStringLiteral("keychainNoteLabel"));
  keychainNoteLabel_->setWordWrap(true);
  keychainNoteLabel_->setVisible(false);
  accountForm->addRow(QString(), keychainNoteLabel_);

  auto* actions = new QHBoxLayout;
  statusImageView_ = new QLabel(account);
  statusImageView_->setObjectName(QStringLiteral("statusImageView"));
  statusImageView_->setFixedSize(kLightSize);
  startSyncButton_ = new QPushButton(tr("Start Sync"), account);
  startSyncButton_->setObjectName(QStringLiteral("startSyncButton"));
  signUpButton_ = new QPushButton(tr("Sign Up…"), account);
  signUpButton_->setObjectName(QStringLiteral("signUpButton"));
  actions->addWidget(statusImageView_);
  actions->addWidget(startSyncButton_);
  actions->addStretch(1);
  actions->addWidget(signUpButton_);
  accountForm->addRow(actions);
  layout->addWidget(account);

  // Timers.
  auto* timers = new QGroupBox(tr("Timers"), this);
  auto* timersLayout = new QVBoxLayout(timers);
  auto* idleRow = new QHBoxLayout;
  shouldIdleCheckBox_ = new QCheckBox(tr("Ask what to do with idle time after"), timers);
  shouldIdleCheckBox_->setObjectName(QStringLiteral("shouldIdleCheckBox"));
  idleTimeSpinBox_ = new QSpinBox(timers);
  idleTimeSpinBox_->setObjectName(QStringLiteral("idleTimeSpinBox"));
  idleTimeSpinBox_->setRange(1, 24 * 60);
  // Stored when the user is done with the number, not at each digit typed.
  idleTimeSpinBox_->setKeyboardTracking(false);
  idleTimeSpinBox_->setAccessibleName(tr("Idle minutes"));
  auto* minutes = new QLabel(tr("minutes"), timers);
  idleRow->addWidget(shouldIdleCheckBox_);
  idleRow->addWidget(idleTimeSpinBox_);
  idleRow->addWidget(minutes);
  idleRow->addStretch(1);
  timersLayout->addLayout(idleRow);
  stopsOtherTimesCheckBox_ = new QCheckBox(tr("Starting a timer stops the other running timers"), timers);
  stopsOtherTimesCheckBox_->setObjectName(QStringLiteral("stopsOtherTimesCheckBox"));
  timersLayout->addWidget(stopsOtherTimesCheckBox_);
  layout->addWidget(timers);

  // Rates.
  auto* rates = new QGroupBox(tr("Rates"), this);
  auto* ratesForm = new QFormLayout(rates);
  defaultRateField_ = new QLineEdit(rates);
  defaultRateField_->setObjectName(QStringLiteral("defaultRateField"));
  defaultRateField_->setAlignment(Qt::AlignRight);
  // Empty, the built-in rates are the ones in use: the field says which.
  defaultRateField_->setPlaceholderText(
      tr("Built in: %1, or %2 for a project without a client")
          .arg(MoneyFormat::format(WTClient::builtInRate()), MoneyFormat::format(WTProject::builtInRate())));
  defaultRateField_->setMinimumWidth(
      defaultRateField_->fontMetrics().horizontalAdvance(defaultRateField_->placeholderText()) + 16);
  ratesForm->addRow(tr("Default hourly rate:"), defaultRateField_);
  layout->addWidget(rates);
  layout->addStretch(1);
  pages_->addTab(general, tr("General"));
  pages_->addTab(buildBillingPage(), tr("Billing"));
  windowLayout->addWidget(pages_);

  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Close, this);
  buttons->button(QDialogButtonBox::Close)->setObjectName(QStringLiteral("closeButton"));
  windowLayout->addWidget(buttons);

  // Return in a text field ends its editing; only in the password field does it also start syncing.
  for (QPushButton* button : findChildren<QPushButton*>()) {
    button->setAutoDefault(false);
    button->setDefault(false);
  }

  connect(buttons, &QDialogButtonBox::rejected, this, &QDialog::reject);
  connect(startSyncButton_, &QPushButton::clicked, this, &WTPreferencesWindowController::startSync);
  connect(passwordTextField_, &QLineEdit::returnPressed, this, &WTPreferencesWindowController::startSync);
  connect(signUpButton_, &QPushButton::clicked, this, &WTPreferencesWindowController::signUp);
  connect(serverField_, &QLineEdit::editingFinished, this, &WTPreferencesWindowController::commitServer);
  connect(serverField_, &QLineEdit::textEdited, this, [this] {
    markRefused(serverField_, false, {});
    updateSignUpButton();
  });
  connect(shouldIdleCheckBox_, &QCheckBox::toggled, this, [this](bool on) {
    defaults_->setValue(SettingsKeys::kShouldIdle, on);
    idleTimeSpinBox_->setEnabled(on);
  });
  connect(idleTimeSpinBox_, &QSpinBox::valueChanged, this,
          [this](int value) { defaults_->setValue(SettingsKeys::kIdleTime, value); });
  connect(stopsOtherTimesCheckBox_, &QCheckBox::toggled, this,
          [this](bool on) { defaults_->setValue(SettingsKeys::kStopsOtherTimes, on); });
  connect(defaultRateField_, &QLineEdit::editingFinished, this,
          &WTPreferencesWindowController::commitDefaultRate);
  connect(defaultRateField_, &QLineEdit::textEdited, this,
          [this] { WTRateField::setRefused(defaultRateField_, {}); });
}

QWidget* WTPreferencesWindowController::buildBillingPage() {
  auto* page = new QWidget(pages_);
  page->setObjectName(QStringLiteral("billingPage"));
  auto* layout = new QVBoxLayout(page);

  auto* details = new QGroupBox(tr("Your details"), page);
  auto* form = new QFormLayout(details);
  auto lineField = [&](const char* name, const QString& label, const QString& placeholder) {
    auto* field = new QLineEdit(details);
    field->setObjectName(QLatin1String(name));
    field->setPlaceholderText(placeholder);
    form->addRow(label, field);
    connect(field, &QLineEdit::editingFinished, this, &WTPreferencesWindowController::commitBillingDetails);
    return field;
  };
  billingNameField_ = lineField("billingNameField", tr("Name:"), tr("Your name or your business's"));
  billingAddressField_ = new QPlainTextEdit(details);
  billingAddressField_->setObjectName(QStringLiteral("billingAddressField"));
  billingAddressField_->setPlaceholderText(tr("Street\nPostcode and town\nCountry"));
  billingAddressField_->setTabChangesFocus(true);
  billingAddressField_->setFixedHeight(billingAddressField_->fontMetrics().lineSpacing() * 4 + 12);
  form->addRow(tr("Address:"), billingAddressField_);
  billingTaxNumberField_ =
      lineField("billingTaxNumberField", tr("Tax number:"), tr("VAT or tax identification"));
  billingPaymentTermsField_ =
      lineField("billingPaymentTermsField", tr("Payment terms:"), tr("Payable within 30 days"));
  auto* note = new QLabel(tr("Shown at the head of your reports."), details);
  note->setWordWrap(true);
  form->addRow(QString(), note);
  layout->addWidget(details);

  // What a client bills by when it sets nothing of its own.
  auto* money = new QGroupBox(tr("Billing defaults"), page);
  auto* moneyForm = new QFormLayout(money);
  currencyComboBox_ = new QComboBox(money);
  currencyComboBox_->setObjectName(QStringLiteral("currencyComboBox"));
  currencyComboBox_->setEditable(true);
  currencyComboBox_->setInsertPolicy(QComboBox::NoInsert);
  for (const auto& [code, name] : currencies()) {
    currencyComboBox_->addItem(code, code);
    currencyComboBox_->setItemData(currencyComboBox_->count() - 1, name, Qt::ToolTipRole);
  }
  currencyComboBox_->setToolTip(
      tr("The ISO 4217 code of the currency your clients are billed in, unless a "
         "client has its own"));
  moneyForm->addRow(tr("Currency:"), currencyComboBox_);
  auto* roundingRow = new QHBoxLayout;
  roundingMinutesSpinBox_ = new QSpinBox(money);
  roundingMinutesSpinBox_->setObjectName(QStringLiteral("roundingMinutesSpinBox"));
  roundingMinutesSpinBox_->setRange(1, 24 * 60);
  roundingMinutesSpinBox_->setSpecialValueText(tr("None"));
  roundingMinutesSpinBox_->setSuffix(tr(" min"));
  roundingMinutesSpinBox_->setKeyboardTracking(false);
  roundingMinutesSpinBox_->setAccessibleName(tr("Rounding minutes"));
  roundingModeComboBox_ = new QComboBox(money);
  roundingModeComboBox_->setObjectName(QStringLiteral("roundingModeComboBox"));
  roundingModeComboBox_->addItem(tr("Up"), QStringLiteral("up"));
  roundingModeComboBox_->addItem(tr("To the nearest"), QStringLiteral("nearest"));
  roundingModeComboBox_->addItem(tr("Down"), QStringLiteral("down"));
  roundingModeComboBox_->setAccessibleName(tr("Rounding mode"));
  roundingRow->addWidget(roundingMinutesSpinBox_);
  roundingRow->addWidget(roundingModeComboBox_);
  roundingRow->addStretch(1);
  moneyForm->addRow(tr("Round time entries to:"), roundingRow);
  layout->addWidget(money);
  layout->addStretch(1);

  connect(currencyComboBox_->lineEdit(), &QLineEdit::editingFinished, this,
          &WTPreferencesWindowController::commitCurrency);
  connect(currencyComboBox_, &QComboBox::activated, this, &WTPreferencesWindowController::commitCurrency);
  connect(currencyComboBox_->lineEdit(), &QLineEdit::textEdited, this,
          [this] { markRefused(currencyComboBox_->lineEdit(), false, {}); });
  connect(roundingMinutesSpinBox_, &QSpinBox::valueChanged, this, [this](int minutes) {
    defaults_->setValue(SettingsKeys::kRoundingMinutes, minutes);
    roundingModeComboBox_->setEnabled(minutes > 1);
  });
  connect(roundingModeComboBox_, &QComboBox::activated, this, [this] {
    defaults_->setValue(SettingsKeys::kRoundingMode, roundingModeComboBox_->currentData().toString());
  });
  // A text edit has no end of editing of its own: its text is stored when it loses the focus.
  billingAddressField_->installEventFilter(this);
  return page;
}

bool WTPreferencesWindowController::eventFilter(QObject* watched, QEvent* event) {
  if (watched == billingAddressField_ && event->type() == QEvent::FocusOut) commitBillingDetails();
  return QDialog::eventFilter(watched, event);
}

void WTPreferencesWindowController::commitBillingDetails() {
  const std::pair<QLatin1StringView, QString> fields[] = {
      {SettingsKeys::kBillingName, billingNameField_->text()},
      {SettingsKeys::kBillingAddress, billingAddressField_->toPlainText()},
      {SettingsKeys::kBillingTaxNumber, billingTaxNumberField_->text()},
      {SettingsKeys::kBillingPaymentTerms, billingPaymentTermsField_->text()}};
  for (const auto& [key, typed] : fields) {
    const QString text = typed.trimmed();
    if (text == defaults_->stringForKey(key) && defaults_->hasStoredValue(key) == !text.isEmpty()) continue;
    if (text.isEmpty())
      defaults_->removeValue(key);
    else
      defaults_->setValue(key, text);
  }
}

// Unchosen, it is the locale's, and stays so while the user leaves it alone.
QString WTPreferencesWindowController::billingCurrency() const {
  const QString currency = defaults_->stringForKey(SettingsKeys::kCurrency).trimmed().toUpper();
  return currency.isEmpty() ? MoneyFormat::localeCurrency() : currency;
}

void WTPreferencesWindowController::commitCurrency() {
  const QString code = currencyComboBox_->currentText().trimmed().toUpper();
  const int index = currencyComboBox_->findData(code);
  markRefused(currencyComboBox_->lineEdit(), index < 0,
              tr("Not a currency: type its ISO 4217 code, such as EUR, USD or JPY"));
  if (index < 0) return;
  if (currencyComboBox_->currentText() != code) currencyComboBox_->setCurrentIndex(index);
  if (code != billingCurrency()) defaults_->setValue(SettingsKeys::kCurrency, code);
}

void WTPreferencesWindowController::loadValues() {
  // The account shows only when it is complete.
  const QString password = passwords_->password();
  if (defaults_->hasStoredValue(SettingsKeys::kSyncUser) && !password.isEmpty()) {
    emailTextField_->setText(defaults_->stringForKey(SettingsKeys::kSyncUser));
    passwordTextField_->setText(password);
  }
  serverField_->setText(defaults_->stringForKey(SettingsKeys::kSyncServer));
  updateSignUpButton();

  const QSignalBlocker idleBlocker(shouldIdleCheckBox_);
  const QSignalBlocker minutesBlocker(idleTimeSpinBox_);
  const QSignalBlocker stopsBlocker(stopsOtherTimesCheckBox_);
  shouldIdleCheckBox_->setChecked(defaults_->boolForKey(SettingsKeys::kShouldIdle));
  idleTimeSpinBox_->setEnabled(shouldIdleCheckBox_->isChecked());
  const qint64 minutes = defaults_->integerForKey(SettingsKeys::kIdleTime);
  idleTimeSpinBox_->setValue(minutes > 0 ? int(std::min<qint64>(minutes, idleTimeSpinBox_->maximum()))
                                         : kIdleMinutesWhenUnset);
  stopsOtherTimesCheckBox_->setChecked(defaults_->boolForKey(SettingsKeys::kStopsOtherTimes));
  const std::optional<Decimal> rate = defaults_->decimalForKey(SettingsKeys::kDefaultRate);
  defaultRateField_->setText(rate ? WTRateField::text(*rate) : QString());
  billingNameField_->setText(defaults_->stringForKey(SettingsKeys::kBillingName));
  billingAddressField_->setPlainText(defaults_->stringForKey(SettingsKeys::kBillingAddress));
  billingTaxNumberField_->setText(defaults_->stringForKey(SettingsKeys::kBillingTaxNumber));
  billingPaymentTermsField_->setText(defaults_->stringForKey(SettingsKeys::kBillingPaymentTerms));

  const QSignalBlocker currencyBlocker(currencyComboBox_);
  const QSignalBlocker roundingBlocker(roundingMinutesSpinBox_);
  currencyComboBox_->setCurrentIndex(currencyComboBox_->findData(billingCurrency()));
  const qint64 rounding = defaults_->integerForKey(SettingsKeys::kRoundingMinutes);
  roundingMinutesSpinBox_->setValue(int(std::clamp<qint64>(rounding, 1, roundingMinutesSpinBox_->maximum())));
  const WTRoundingRule::Mode mode =
      WTRoundingRule::modeFromName(defaults_->stringForKey(SettingsKeys::kRoundingMode))
          .value_or(WTRoundingRule::Mode::Nearest);
  roundingModeComboBox_->setCurrentIndex(roundingModeComboBox_->findData(WTRoundingRule::nameOfMode(mode)));
  roundingModeComboBox_->setEnabled(roundingMinutesSpinBox_->value() > 1);
}

void WTPreferencesWindowController::showWindow() {
  refreshStatusImageView();
  show();
  raise();
  activateWindow();
}

void WTPreferencesWindowController::refreshStatusImageView() {
  QString name = QStringLiteral("blue");
  QString meaning = tr("No sync account");
  if (syncManager_ && syncManager_->syncNetwork()->hasCredentials()) {
    if (syncManager_->syncEnabled()) {
      name = QStringLiteral("green");
      meaning = tr("Syncing");
    } else {
      name = QStringLiteral("red");
      meaning = tr("Syncing is off");
    }
  }
  statusImageName_ = name;
  statusImageView_->setProperty("imageName", name);
  statusImageView_->setPixmap(WTImages::pixmap(name, kLightSize, devicePixelRatioF()));
  statusImageView_->setToolTip(meaning);
  statusImageView_->setAccessibleName(meaning);
}

void WTPreferencesWindowController::startSync() {
  commitServer();
  const QString user = emailTextField_->text();
  const QString password = passwordTextField_->text();
  if (user.isEmpty() || password.isEmpty()) return;
  defaults_->setValue(SettingsKeys::kSyncUser, user);
  passwords_->setPassword(password);
  // Announces the change of status, which lights the light; without a manager nobody would.
  if (syncManager_)
    syncManager_->enableSync();
  else
    refreshStatusImageView();
}

QUrl WTPreferencesWindowController::signUpURL(const QString& server) {
  QUrl url = RZSyncManager::endpointURL(server);
  if (!url.isValid()) return {};
  QString path = url.path();
  path.chop(qsizetype(qstrlen(RZSyncManager::kEndpointPath)));
  url.setPath(path + QLatin1String(kSignUpPath));
  return url;
}

bool WTPreferencesWindowController::signUp() {
  commitServer();
  const QUrl url = signUpURL(serverField_->text());
  if (!url.isValid()) return false;
  return QDesktopServices::openUrl(url);
}

void WTPreferencesWindowController::updateSignUpButton() {
  const bool usable = signUpURL(serverField_->text()).isValid();
  signUpButton_->setEnabled(usable);
  signUpButton_->setToolTip(usable ? tr("Open the server's sign-up page in your browser")
                                   : tr("Enter the sync server's address first"));
}

void WTPreferencesWindowController::commitServer() {
  const QString text = serverField_->text().trimmed();
  const bool usable = text.isEmpty() || RZSyncManager::endpointURL(text).isValid();
  markRefused(serverField_, !usable,
              tr("Not a server address: type a host name such as sync.example.org, perhaps with a port, "
                 "or an http or https address"));
  updateSignUpButton();
  if (!usable || text == defaults_->stringForKey(SettingsKeys::kSyncServer)) return;
  if (text.isEmpty())
    defaults_->removeValue(SettingsKeys::kSyncServer);
  else
    defaults_->setValue(SettingsKeys::kSyncServer, text);
}

void WTPreferencesWindowController::commitDefaultRate() {
  const WTRateField::Parsed parsed = WTRateField::parse(defaultRateField_->text(), billingCurrency());
  WTRateField::setRefused(defaultRateField_, parsed.refusal);
  if (!parsed.valid) return;
  const std::optional<Decimal> stored = defaults_->decimalForKey(SettingsKeys::kDefaultRate);
  if (parsed.rate == stored &&
      defaults_->hasStoredValue(SettingsKeys::kDefaultRate) == parsed.rate.has_value())
    return;
  if (parsed.rate)
    defaults_->setValue(SettingsKeys::kDefaultRate, QVariant::fromValue(*parsed.rate));
  else
    defaults_->removeValue(SettingsKeys::kDefaultRate);
}

void WTPreferencesWindowController::hideEvent(QHideEvent* event) {
  // Closing the window ends the editing of the field in hand.
  commitServer();
  commitDefaultRate();
  commitBillingDetails();
  commitCurrency();
  QDialog::hideEvent(event);
}
