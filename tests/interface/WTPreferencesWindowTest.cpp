#include "MemoryKeychain.h"
#include "SyncTestSupport.h"
#include "UiFixture.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"
#include "WTRateField.h"

#include <QCheckBox>
#include <QDesktopServices>
#include <QLabel>
#include <QPushButton>
#include <QSpinBox>

namespace {

using synctest::LoopbackHttpServer;

const QString kUser = QStringLiteral("ann@example.org");
const QString kPassword = QStringLiteral("correct horse battery");

// The account the way the application delegate answers it: the user from the settings, the password
// from the password store.
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

// An installation with no account yet whose manager asks the password store for the password, as the
// application delegate's does, and polls only when a test makes it.
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
  // The light's name, after checking that the label shows that image: a light of the right colour.
  QString light() const {
    QLabel* view = window->statusImageView();
    const QString name = view->property("imageName").toString();
    EXPECT_EQ(name, window->statusImageName());
    const QImage image = view->pixmap().toImage();
    const QColor centre = image.pixelColor(image.width() / 2, image.height() * 2 / 3);
    const int r = centre.red(), g = centre.green(), b = centre.blue();
    const QString colour = r >= g && r >= b ? "red" : g >= b ? "green" : "blue";
    EXPECT_EQ(colour, name) << "the light shows " << colour.toStdString();
    EXPECT_EQ(centre.alpha(), 255);
    return name;
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

// Blue without an account (a user name alone, or one of spaces, is none), red when syncing is off and
// green when on, whoever switched it; a stored account shows in the fields.
TEST_F(WTPreferencesWindowTest, TheLightIsBlueWithoutAnAccountRedWhenSyncingIsOffAndGreenWhenOn) {
  defaults->setValue("WTSyncUser", kUser);
  open();
  EXPECT_EQ(window->emailTextField()->text() + window->passwordTextField()->text(), "");
  EXPECT_EQ(light(), "blue");
  manager->enableSync();
  EXPECT_EQ(light(), "blue");
  manager->disableSync();

  passwords->setPassword(kPassword);
  open();
  EXPECT_EQ(window->emailTextField()->text(), kUser);
  EXPECT_EQ(window->passwordTextField()->text(), kPassword);
  EXPECT_EQ(window->passwordTextField()->echoMode(), QLineEdit::Password);
  EXPECT_EQ(light(), "red");
  manager->enableSync();
  EXPECT_EQ(light(), "green");
  manager->disableSync();
  EXPECT_EQ(light(), "red");
  EXPECT_FALSE(window->statusImageView()->toolTip().isEmpty());

  // Spaces typed and started are stored as typed, and still light blue.
  startSync("  ", kPassword);
  EXPECT_EQ(defaults->stringForKey("WTSyncUser"), "  ");
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "blue");
  defaults->setValue("WTSyncUser", "   ");
  window->refreshStatusImageView();
  EXPECT_EQ(light(), "blue");
}

TEST_F(WTPreferencesWindowTest, StartSyncStoresTheAccountWithThePasswordInTheKeychainOnly) {
  open();
  startSync(kUser, QString());  // half an account is not stored and starts nothing
  EXPECT_FALSE(defaults->hasStoredValue("WTSyncUser"));
  EXPECT_FALSE(manager->syncEnabled());
  EXPECT_EQ(keychain.writes, 0);

  startSync(kUser, kPassword);
  EXPECT_EQ(defaults->stringForKey("WTSyncUser"), kUser);
  EXPECT_EQ(keychain.entries.value("sync-password"), kPassword);
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "green");
  QFile settings(defaults->fileName());
  ASSERT_TRUE(settings.open(QIODevice::ReadOnly));
  const QByteArray bytes = settings.readAll();
  EXPECT_TRUE(bytes.contains("ann@example.org"));
  EXPECT_FALSE(bytes.contains("horse"));

  manager->disableSync();
  type(window->passwordTextField(), "battery staple", true);
  EXPECT_EQ(keychain.entries.value("sync-password"), "battery staple");
  EXPECT_EQ(light(), "green");
}

// A keyring that did not take the password is said under the password field, not in a dialog: also when
// that happened at start, before the window was made.
TEST_F(WTPreferencesWindowTest, AKeyringThatDidNotTakeThePasswordIsSaidUnderIt) {
  keychain.available = false;
  defaults->setValue("WTSyncUser", kUser);
  defaults->setValue("WTSyncPassword", kPassword);
  passwords->load();
  open();
  EXPECT_TRUE(window->keychainNoteLabel()->isVisible());
  EXPECT_TRUE(window->keychainNoteLabel()->text().contains("settings file"));
  EXPECT_EQ(QApplication::activeModalWidget(), nullptr);
  keychain.available = true;
  type(window->passwordTextField(), "battery staple", true);
  EXPECT_FALSE(window->keychainNoteLabel()->isVisible());
  keychain.available = false;
  type(window->passwordTextField(), kPassword, true);
  EXPECT_TRUE(window->keychainNoteLabel()->isVisible());
}

TEST_F(WTPreferencesWindowTest, AServerErrorTurnsTheLightRedAndStartSyncTurnsItGreenAgain) {
  LoopbackHttpServer server;
  bool refuse = true;
  server.handler = [&](const synctest::HttpRequest&) {
    return LoopbackHttpServer::json(
        refuse ? QVariantMap{{"error", "Wrong e-mail address or password."}, {"code", 2}}
               : QVariantMap{{"action", "head"}, {"iteration", 0}, {"result", QVariantMap{}}});
  };
  defaults->setValue("WTSyncServer", server.address());
  open();
  startSync(kUser, kPassword);
  EXPECT_EQ(light(), "green");
  // Switching on polls at once; the server refuses and syncing goes off.
  ASSERT_TRUE(synctest::waitUntil([&] { return !manager->syncEnabled(); }));
  EXPECT_EQ(light(), "red");
  EXPECT_EQ(installation.presenter.syncErrors, QStringList{"Wrong e-mail address or password. - (Code: 2)"});
  ASSERT_EQ(server.requests.size(), 1);
  const QVariantMap sent = server.requests[0].json();
  EXPECT_EQ(QStringList({sent.value("user").toString(), sent.value("password").toString()}),
            QStringList({kUser, kPassword}));

  refuse = false;
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_EQ(light(), "green");
  ASSERT_TRUE(synctest::waitUntil([&] { return server.requests.size() == 2 && installation.idle(); }));
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "green");
}

// What each field takes is stored as it is confirmed (Return, or a click elsewhere), an emptied one is
// unset, and what it refuses stays in it, marked, with nothing stored.
TEST_F(WTPreferencesWindowTest, TheServerAndRateFieldsStoreWhatTheyTakeAndRefuseTheRest) {
  defaults->setValue("WTSyncServer", "sync.example.org");
  open();
  EXPECT_EQ(window->serverField()->text(), "sync.example.org");
  EXPECT_TRUE(window->defaultRateField()->text().isEmpty());
  const struct {
    QLineEdit* field;
    const char* key;
    const char* typed;
    const char* stored;  // nullptr: unset
    bool refused;
  } rows[] = {
      {window->serverField(), "WTSyncServer", "ftp://files.example.org", "sync.example.org", true},
      {window->serverField(), "WTSyncServer", "sync.example.net:8443", "sync.example.net:8443", false},
      {window->serverField(), "WTSyncServer", "", nullptr, false},
      {window->defaultRateField(), "WTDefaultRate", "80.50", "80.50", false},
      {window->defaultRateField(), "WTDefaultRate", "abc", "80.50", true},
      {window->defaultRateField(), "WTDefaultRate", "", nullptr, false},
  };
  for (const auto& row : rows) {
    if (*row.typed) {
      type(row.field, row.typed, true);
    } else {
      row.field->clear();
      QTest::keyClick(row.field, Qt::Key_Return);
    }
    const bool marked = row.field == window->defaultRateField() ? WTRateField::isRefused(row.field)
                                                                : row.field->property("refused").toBool();
    EXPECT_EQ(marked, row.refused) << row.typed;
    EXPECT_EQ(row.refused, !row.field->toolTip().isEmpty()) << row.typed;
    EXPECT_EQ(defaults->hasStoredValue(row.key), row.stored != nullptr) << row.typed;
    if (row.stored && QString(row.key) == "WTDefaultRate") {
      EXPECT_EQ(defaults->decimalForKey(row.key), Decimal::fromString(QString(row.stored))) << row.typed;
    } else if (row.stored) {
      EXPECT_EQ(defaults->stringForKey(row.key), row.stored) << row.typed;
    }
  }
  EXPECT_FALSE(window->signUpButton()->isEnabled());  // no address

  // Typing clears the mark; closing the window stores what was typed without Return, shown again in the
  // user's format; so does the application's quitting with the window open.
  type(window->defaultRateField(), "abc", true);
  type(window->defaultRateField(), "95");
  EXPECT_FALSE(WTRateField::isRefused(window->defaultRateField()));
  QTest::mouseClick(window->findChild<QPushButton*>("closeButton"), Qt::LeftButton);
  EXPECT_FALSE(window->isVisible());
  EXPECT_EQ(defaults->decimalForKey("WTDefaultRate"), Decimal(95));
  window->showWindow();
  EXPECT_TRUE(window->isVisible());
  open();
  EXPECT_EQ(window->defaultRateField()->text(), "95.00");
  type(window->serverField(), "sync.example.com");
  window.reset();
  EXPECT_EQ(defaults->stringForKey("WTSyncServer"), "sync.example.com");
}

TEST_F(WTPreferencesWindowTest, SignUpOpensTheServersPageInTheBrowser) {
  UrlCatcher catcher;
  for (const char* scheme : {"https", "http"}) QDesktopServices::setUrlHandler(scheme, &catcher, "open");
  open();
  EXPECT_FALSE(window->signUp());
  type(window->serverField(), "sync.example.org");
  EXPECT_TRUE(window->signUpButton()->isEnabled());
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  // Clicking ended the field's editing, so the address is the sync's too.
  EXPECT_EQ(defaults->stringForKey("WTSyncServer"), "sync.example.org");
  type(window->serverField(), "http://127.0.0.1:8080/tessal/");
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  EXPECT_EQ(catcher.opened, (QList<QUrl>{QUrl("https://sync.example.org/sync/tessal/signup.php"),
                                         QUrl("http://127.0.0.1:8080/tessal/sync/tessal/signup.php")}));
  EXPECT_EQ(manager->configuredEndpoint(), QUrl("http://127.0.0.1:8080/tessal/sync/tessal/sync.php"));
  for (const char* scheme : {"https", "http"}) QDesktopServices::unsetUrlHandler(scheme);
}

TEST_F(WTPreferencesWindowTest, TimerSettingsAreStoredAsTheyAreChanged) {
  defaults->setValue("WTIdleTime", 20);
  open();
  EXPECT_FALSE(window->shouldIdleCheckBox()->isChecked());
  EXPECT_FALSE(window->idleTimeSpinBox()->isEnabled());
  EXPECT_EQ(window->idleTimeSpinBox()->value(), 20);
  EXPECT_FALSE(window->stopsOtherTimesCheckBox()->isChecked());
  QTest::mouseClick(window->shouldIdleCheckBox(), Qt::LeftButton);
  EXPECT_TRUE(defaults->boolForKey("WTShouldIdle"));
  EXPECT_TRUE(window->idleTimeSpinBox()->isEnabled());
  window->idleTimeSpinBox()->stepUp();
  EXPECT_EQ(defaults->integerForKey("WTIdleTime"), 21);
  QTest::mouseClick(window->stopsOtherTimesCheckBox(), Qt::LeftButton);
  EXPECT_TRUE(defaults->boolForKey("WTStopsOtherTimes"));

  // Read back from the file by another window, without a sync manager.
  window.reset();
  UserDefaults again(defaults->fileName());
  WTPasswordStore againPasswords(&again, std::make_unique<SharedKeychain>(keychain));
  WTPreferencesWindowController another(&again, nullptr, &againPasswords);
  EXPECT_TRUE(another.shouldIdleCheckBox()->isChecked());
  EXPECT_EQ(another.idleTimeSpinBox()->value(), 21);
  EXPECT_TRUE(another.stopsOtherTimesCheckBox()->isChecked());
  QTest::mouseClick(another.shouldIdleCheckBox(), Qt::LeftButton);
  EXPECT_FALSE(again.boolForKey("WTShouldIdle"));
  EXPECT_FALSE(another.idleTimeSpinBox()->isEnabled());
  EXPECT_EQ(another.statusImageName(), "blue");
}

}  // namespace
