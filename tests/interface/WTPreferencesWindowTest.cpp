#include "MemoryKeychain.h"
#include "MoneyFormat.h"
#include "SyncTestSupport.h"
#include "UiFixture.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"

#include <QCheckBox>
#include <QComboBox>
#include <QPlainTextEdit>
#include <QSpinBox>
#include <QTabWidget>

namespace {

const QString kUser = QStringLiteral("ann@example.org");
const QString kPassword = QStringLiteral("correct horse battery");

// The account as the application delegate answers it: the password from the password store.
class StoreCredentials final : public RZSyncNetworkCredentialDelegate {
 public:
  StoreCredentials(UserDefaults& defaults, WTPasswordStore& passwords)
      : defaults_(defaults), passwords_(passwords) {}
  QString syncNetworkRequestsUser(RZSyncNetwork*) override { return defaults_.stringForKey("WTSyncUser"); }
  QString syncNetworkRequestsPassword(RZSyncNetwork*) override { return passwords_.password(); }

 private:
  UserDefaults& defaults_;
  WTPasswordStore& passwords_;
};

// An installation with no account yet, whose manager polls only when a test makes it.
class WTPreferencesWindowTest : public ::testing::Test {
 protected:
  void SetUp() override {
    for (const char* key : {"WTSyncServer", "WTSyncUser", "WTSyncPassword"}) defaults->removeValue(key);
    manager->syncNetwork()->setCredentialDelegate(&credentials);
    manager->setIntervals({600000, 600000, 600000});
  }
  void TearDown() override {
    window.reset();
    installation.close();
  }

  void open() {
    window = std::make_unique<WTPreferencesWindowController>(defaults.get(), manager.get(), passwords.get());
    window->showWindow();
    EXPECT_TRUE(QTest::qWaitForWindowExposed(window.get()));
  }
  // The light shown once `change` is made.
  template <class Change>
  QString lightAfter(Change change) {
    change();
    return window->statusImageName();
  }
  void startSync(const QString& user, const QString& password) {
    type(window->emailTextField(), user);
    type(window->passwordTextField(), password);
    QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  }

  synctest::SyncClient installation{QString()};
  std::unique_ptr<UserDefaults>& defaults = installation.defaults;
  std::unique_ptr<RZSyncManager>& manager = installation.manager;
  MemoryKeychain keychain;
  std::unique_ptr<WTPasswordStore> passwords =
      std::make_unique<WTPasswordStore>(defaults.get(), std::make_unique<SharedKeychain>(keychain));
  StoreCredentials credentials{*defaults, *passwords};
  std::unique_ptr<WTPreferencesWindowController> window;
};

// Blue without an account (a user alone, or spaces, is none), red when syncing is off, green when on;
// half an account starts nothing, a whole one is stored with its password in the keychain.
TEST_F(WTPreferencesWindowTest, StartSyncStoresTheAccountAndTheLightFollowsSyncing) {
  open();
  startSync(kUser, QString());
  EXPECT_FALSE(defaults->hasStoredValue("WTSyncUser") || manager->syncEnabled() || keychain.writes > 0);
  defaults->setValue("WTSyncUser", kUser);
  EXPECT_EQ(lightAfter([&] { manager->enableSync(); }), "blue");
  manager->disableSync();
  EXPECT_EQ(lightAfter([&] { startSync(kUser, kPassword); }), "green");
  EXPECT_EQ(keychain.entries.value("sync-password"), kPassword);
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(lightAfter([&] { manager->disableSync(); }), "red");
  EXPECT_EQ(lightAfter([&] { type(window->passwordTextField(), "battery staple", true); }), "green");
  EXPECT_EQ(keychain.entries.value("sync-password"), "battery staple");
  open();
  EXPECT_EQ(window->emailTextField()->text() + ' ' + window->passwordTextField()->text(),
            kUser + " battery staple");
  EXPECT_EQ(window->passwordTextField()->echoMode(), QLineEdit::Password);
  EXPECT_EQ(lightAfter([&] { manager->disableSync(); }), "red");
  EXPECT_EQ(lightAfter([&] { manager->enableSync(); }), "green");  // whoever switches it
  EXPECT_EQ(lightAfter([&] { startSync("  ", kPassword); }), "blue");
  EXPECT_EQ(defaults->stringForKey("WTSyncUser"), "  ");
  EXPECT_TRUE(manager->syncEnabled());
}

// A keyring that could not be read or refused the password is said under the field, not in a dialog,
// even from start.
TEST_F(WTPreferencesWindowTest, AKeyringThatDidNotTakeThePasswordIsSaidUnderIt) {
  keychain.available = false;
  defaults->setValue("WTSyncUser", kUser);
  WTPasswordStore unread(defaults.get(), std::make_unique<SharedKeychain>(keychain));
  unread.load();
  WTPreferencesWindowController shown(defaults.get(), manager.get(), &unread);
  EXPECT_TRUE(shown.keychainNoteLabel()->text().contains("could not be read"));
  defaults->setValue("WTSyncPassword", kPassword);
  passwords->load();
  open();
  EXPECT_TRUE(window->keychainNoteLabel()->isVisible());
  EXPECT_TRUE(window->keychainNoteLabel()->text().contains("settings file"));
  EXPECT_EQ(QApplication::activeModalWidget(), nullptr);
  for (const bool available : {true, false}) {
    keychain.available = available;
    type(window->passwordTextField(), available ? "battery staple" : "horse", true);
    EXPECT_EQ(window->keychainNoteLabel()->isVisible(), !available);
    QCoreApplication::processEvents();  // the window lays the note out: every line of it shows
    const QLabel* note = window->keychainNoteLabel();
    EXPECT_TRUE(available || note->height() >= note->heightForWidth(note->width())) << note->height();
  }
  // Empty fields the user is not in show the account the keyring answers later.
  window->emailTextField()->clear();
  window->passwordTextField()->clear();
  window->startSyncButton()->setFocus();
  passwords->setPassword(kPassword);
  EXPECT_EQ(window->emailTextField()->text() + ' ' + window->passwordTextField()->text(),
            kUser + ' ' + kPassword);
}

// Fields store what they take on Return, closing or quitting, and refuse the rest; sign-up opens the server's
// page.
TEST_F(WTPreferencesWindowTest, TheServerFieldStoresWhatItTakesAndRefusesTheRest) {
  defaults->setValue("WTSyncServer", "sync.example.org");
  open();
  QLineEdit* field = window->serverField();
  EXPECT_EQ(field->text(), "sync.example.org");
  for (const auto& [typed, stored, refused] :
       {std::tuple{"ftp://files.example.org", "sync.example.org", true},
        std::tuple{"sync.example.net:8443", "sync.example.net:8443", false}, std::tuple{"", "", false}}) {
    field->clear();
    type(field, typed, true);
    EXPECT_EQ(std::tuple(field->property("refused").toBool(), !field->toolTip().isEmpty(),
                         defaults->stringForKey("WTSyncServer")),
              std::tuple(refused, refused, QString(stored)))
        << typed;
  }
  EXPECT_FALSE(defaults->hasStoredValue("WTSyncServer"));
  EXPECT_FALSE(window->signUpButton()->isEnabled() || window->signUp());  // no address
  UrlCatcher catcher;
  for (const char* scheme : {"https", "http"}) QDesktopServices::setUrlHandler(scheme, &catcher, "open");
  type(window->serverField(), "sync.example.org");
  EXPECT_TRUE(window->signUpButton()->isEnabled());
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  EXPECT_EQ(defaults->stringForKey("WTSyncServer"), "sync.example.org");
  type(window->serverField(), "http://127.0.0.1:8080/tessal/");
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  EXPECT_EQ(catcher.opened, (QList<QUrl>{QUrl("https://sync.example.org/sync/tessal/signup.php"),
                                         QUrl("http://127.0.0.1:8080/tessal/sync/tessal/signup.php")}));
  for (const char* scheme : {"https", "http"}) QDesktopServices::unsetUrlHandler(scheme);
  type(window->defaultRateField(), "abc", true);
  type(window->defaultRateField(), "95");
  EXPECT_FALSE(WTRateField::isRefused(window->defaultRateField()));  // typing clears the mark
  QTest::mouseClick(window->findChild<QPushButton*>("closeButton"), Qt::LeftButton);
  EXPECT_FALSE(window->isVisible());
  EXPECT_EQ(defaults->decimalForKey("WTDefaultRate"), Decimal(95));
  open();
  EXPECT_EQ(window->defaultRateField()->text(), "95.00");  // in the user's format
  window->defaultRateField()->clear();
  type(window->defaultRateField(), "", true);
  EXPECT_FALSE(defaults->hasStoredValue("WTDefaultRate"));
  type(window->serverField(), "sync.example.com");
  window.reset();
  EXPECT_EQ(defaults->stringForKey("WTSyncServer"), "sync.example.com");
}

// The timer settings are stored as they are changed; the minutes can be set only while idle time is asked.
TEST_F(WTPreferencesWindowTest, TimerSettingsAreStoredAsTheyAreChanged) {
  defaults->setValue("WTIdleTime", 20);
  open();
  auto* idle = window->findChild<QCheckBox*>("shouldIdleCheckBox");
  auto* minutes = window->findChild<QSpinBox*>("idleTimeSpinBox");
  EXPECT_FALSE(idle->isChecked() || minutes->isEnabled());
  QTest::mouseClick(idle, Qt::LeftButton);
  minutes->stepUp();
  QTest::mouseClick(window->findChild<QCheckBox*>("stopsOtherTimesCheckBox"), Qt::LeftButton);
  EXPECT_EQ(std::tuple(defaults->boolForKey("WTShouldIdle"), minutes->isEnabled(),
                       defaults->integerForKey("WTIdleTime"), defaults->boolForKey("WTStopsOtherTimes")),
            std::tuple(true, true, 21, true));
}

// The details for a report's head are stored as each field is left (the address, on several lines, when
// the focus goes), or when the window closes; an emptied field stores none. The currency is a code ICU
// knows, in any case; the rounding rule is stored as it is changed.
TEST_F(WTPreferencesWindowTest, TheBillingPageStoresYourDetailsAndTheBillingDefaults) {
  open();
  QComboBox* currency = window->currencyComboBox();
  EXPECT_EQ(std::tuple(currency->currentText(), window->roundingMinutesSpinBox()->text(),
                       window->roundingModeComboBox()->isEnabled()),
            std::tuple(MoneyFormat::localeCurrency(), QString("None"), false));
  // Confirmed as it shows, the locale's stays unchosen, to follow the locale.
  type(currency->lineEdit(), MoneyFormat::localeCurrency(), true);
  EXPECT_EQ(defaults->stringForKey("WTCurrency"), QString());
  for (const auto& [typed, stored, refused] : {std::tuple{"jpy", "JPY", false}, {"EURO", "JPY", true}}) {
    type(currency->lineEdit(), typed, true);
    EXPECT_EQ(
        std::tuple(defaults->stringForKey("WTCurrency"), currency->lineEdit()->property("refused").toBool()),
        std::tuple(QString(stored), refused))
        << typed;
  }
  window->roundingMinutesSpinBox()->setValue(15);
  window->roundingModeComboBox()->setCurrentIndex(window->roundingModeComboBox()->findData("up"));
  emit window->roundingModeComboBox()->activated(window->roundingModeComboBox()->currentIndex());
  window->pages()->setCurrentIndex(window->pages()->indexOf(window->findChild<QWidget*>("billingPage")));
  type(window->billingNameField(), "Ann Smith", true);
  QPlainTextEdit* address = window->billingAddressField();
  address->setFocus();
  QTest::keyClicks(address, "Main St 1");
  QTest::keyClick(address, Qt::Key_Return);
  QTest::keyClicks(address, "12345 Town ");
  type(window->billingTaxNumberField(), "DE123456789");
  EXPECT_EQ(defaults->stringForKey("WTBillingAddress"), "Main St 1\n12345 Town");
  type(window->billingPaymentTermsField(), "30 days net");
  QTest::mouseClick(window->findChild<QPushButton*>("closeButton"), Qt::LeftButton);
  const char* keys[] = {"WTBillingName", "WTBillingAddress", "WTBillingTaxNumber", "WTBillingPaymentTerms"};
  QStringList stored;
  for (const char* key : keys) stored << defaults->stringForKey(key);
  EXPECT_EQ(stored, QStringList({"Ann Smith", "Main St 1\n12345 Town", "DE123456789", "30 days net"}));
  open();
  EXPECT_EQ(
      QStringList({window->billingNameField()->text(), window->billingAddressField()->toPlainText(),
                   window->billingTaxNumberField()->text(), window->billingPaymentTermsField()->text()}),
      stored);
  window->billingNameField()->clear();
  type(window->billingNameField(), "  ", true);
  EXPECT_FALSE(defaults->hasStoredValue("WTBillingName"));
}

}  // namespace
