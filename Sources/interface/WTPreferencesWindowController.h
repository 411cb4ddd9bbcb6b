#pragma once

#include <QDialog>
#include <QPointer>
#include <QString>
#include <QUrl>

class QCheckBox;
class QComboBox;
class QLabel;
class QLineEdit;
class QPlainTextEdit;
class QPushButton;
class QSpinBox;
class QTabWidget;
class RZSyncManager;
class UserDefaults;
class WTPasswordStore;

// The preferences window. General: the sync account (e-mail address and password), the button that starts
// syncing, the sync status as a light and the way to an account on the server's sign-up page; then the
// server's address, idle handling, whether starting a timer stops the others, and the default hourly
// rate. Billing: the user's own details for the head of a report (name, address, tax number, payment
// terms), and what clients bill by unless they set their own: the currency and the rounding rule.
//
// The account is stored only by "Start Sync"; the other settings are stored as they are edited (a text
// field when editing ends, or when the window closes). One window per application, not modal: make it
// once and call showWindow() each time the user asks for it.
class WTPreferencesWindowController : public QDialog {
  Q_OBJECT
 public:
  // None is owned; all must outlive the window. `syncManager` may be null (syncing not set up): the
  // light then stays blue and "Start Sync" only stores the account.
  WTPreferencesWindowController(UserDefaults* defaults, RZSyncManager* syncManager,
                                WTPasswordStore* passwords, QWidget* parent = nullptr);
  ~WTPreferencesWindowController() override;

  // Shows the window, brought to the front.
  void showWindow();

  // The light: "green" when there is an account and syncing is on, "red" when there is an account and
  // syncing is off, "blue" without an account (the sync client's own test: user and password not blank).
  void refreshStatusImageView();
  QString statusImageName() const { return statusImageName_; }

  // With both fields filled in: stores the e-mail address under "WTSyncUser" and the password in the
  // password store, then switches syncing on. Otherwise does nothing.
  void startSync();
  // Opens the server's sign-up page in the user's browser; false when no valid server is set.
  bool signUp();

  // The sign-up page on a server given as RZSyncManager::endpointURL takes it; invalid for an
  // unusable address.
  static QUrl signUpURL(const QString& server);

  QLineEdit* emailTextField() const { return emailTextField_; }
  QLineEdit* passwordTextField() const { return passwordTextField_; }
  QLabel* statusImageView() const { return statusImageView_; }
  // Says, when the keyring did not take the password, that it stays in the settings file.
  QLabel* keychainNoteLabel() const { return keychainNoteLabel_; }
  QPushButton* startSyncButton() const { return startSyncButton_; }
  QPushButton* signUpButton() const { return signUpButton_; }
  QLineEdit* serverField() const { return serverField_; }
  QLineEdit* defaultRateField() const { return defaultRateField_; }
  QTabWidget* pages() const { return pages_; }
  QLineEdit* billingNameField() const { return billingNameField_; }
  QPlainTextEdit* billingAddressField() const { return billingAddressField_; }
  QLineEdit* billingTaxNumberField() const { return billingTaxNumberField_; }
  QLineEdit* billingPaymentTermsField() const { return billingPaymentTermsField_; }
  // Editable: an ISO 4217 code typed in any case is taken when ICU knows it, anything else refused.
  QComboBox* currencyComboBox() const { return currencyComboBox_; }
  // 1 minute (shown as "None") bills the minutes as they are.
  QSpinBox* roundingMinutesSpinBox() const { return roundingMinutesSpinBox_; }
  QComboBox* roundingModeComboBox() const { return roundingModeComboBox_; }

 protected:
  void hideEvent(QHideEvent* event) override;
  bool eventFilter(QObject* watched, QEvent* event) override;

 private:
  void buildInterface();
  void loadValues();
  // Stores the text fields' values when they are acceptable; a refused one is marked and not stored.
  void commitServer();
  void commitDefaultRate();
  QWidget* buildBillingPage();
  // Stores the billing details as the fields show them (none for an empty field).
  void commitBillingDetails();
  // Stores the currency typed or chosen when ICU knows it; marks it refused otherwise.
  void commitCurrency();
  QString billingCurrency() const;
  void updateSignUpButton();
  void passwordDidLoad();
  void updateKeychainNote();

  UserDefaults* defaults_;
  QPointer<RZSyncManager> syncManager_;
  WTPasswordStore* passwords_;
  QString statusImageName_;

  QLineEdit* emailTextField_ = nullptr;
  QLineEdit* passwordTextField_ = nullptr;
  QLabel* statusImageView_ = nullptr;
  QLabel* keychainNoteLabel_ = nullptr;
  QLabel* statusLabel_ = nullptr;
  QPushButton* startSyncButton_ = nullptr;
  QPushButton* signUpButton_ = nullptr;
  QLineEdit* serverField_ = nullptr;
  QCheckBox* shouldIdleCheckBox_ = nullptr;
  QSpinBox* idleTimeSpinBox_ = nullptr;
  QCheckBox* stopsOtherTimesCheckBox_ = nullptr;
  QLineEdit* defaultRateField_ = nullptr;
  QTabWidget* pages_ = nullptr;
  QLineEdit* billingNameField_ = nullptr;
  QPlainTextEdit* billingAddressField_ = nullptr;
  QLineEdit* billingTaxNumberField_ = nullptr;
  QLineEdit* billingPaymentTermsField_ = nullptr;
  QComboBox* currencyComboBox_ = nullptr;
  QSpinBox* roundingMinutesSpinBox_ = nullptr;
  QComboBox* roundingModeComboBox_ = nullptr;
};
