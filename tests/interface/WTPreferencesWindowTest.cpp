#include "MemoryKeychain.h"
#include "SyncTestSupport.h"
#include "WTPasswordStore.h"
#include "WTPreferencesWindowController.h"
#include "WTRateField.h"

#include <gtest/gtest.h>

#include <QCheckBox>
#include <QDesktopServices>
#include <QImage>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QSpinBox>
#include <QTest>

namespace {

using synctest::HttpRequest;
using synctest::LoopbackHttpServer;
using synctest::waitUntil;

const QString kUser = QStringLiteral("ann@example.org");
const QString kPassword = QStringLiteral("correct horse battery");

// The account the way the application delegate answers it: the user from the settings, the password
// from the password store.
class StoreCredentials final : public RZSyncNetworkCredentialDelegate {
 public:
  StoreCredentials(UserDefaults& defaults, WTPasswordStore& passwords)
      : defaults_(defaults), passwords_(passwords) {}
  QString syncNetworkRequestsUser(RZSyncNetwork*) override {
    return defaults_.stringForKey(QStringLiteral("WTSyncUser"));
  }
  QString syncNetworkRequestsPassword(RZSyncNetwork*) override { return passwords_.password(); }

 private:
  UserDefaults& defaults_;
  WTPasswordStore& passwords_;
};

class UrlCatcher : public QObject {
  Q_OBJECT
 public slots:
  void open(const QUrl& url) { opened.append(url); }

 public:
  QList<QUrl> opened;
};

class WTPreferencesWindowTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(dir.isValid());
    defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
    passwords = std::make_unique<WTPasswordStore>(defaults.get(), std::make_unique<SharedKeychain>(keychain));
    credentials = std::make_unique<StoreCredentials>(*defaults, *passwords);
    context = std::make_unique<WTObjectContext>(defaults.get());
    auto store = WTStore::open(dir.filePath(QStringLiteral("Tessal.sqlite")));
    ASSERT_TRUE(store.ok()) << store.error().message.toStdString();
    ASSERT_TRUE(context->attachStore(std::move(store.value())).ok());
    manager = std::make_unique<RZSyncManager>(context.get(), dir.filePath(QStringLiteral("Tessal.sync")));
    manager->syncNetwork()->setCredentialDelegate(credentials.get());
    manager->setErrorPresenter(&presenter);
    // Only the polls a test asks for.
    manager->setIntervals({600000, 600000, 600000});
  }
  void TearDown() override {
    window.reset();
    manager.reset();
    context.reset();
  }

  // The stored account, as an earlier session left it.
  void storeAccount(const QString& user = kUser, const QString& password = kPassword) {
    defaults->setValue(QStringLiteral("WTSyncUser"), user);
    passwords->setPassword(password);
  }
  WTPreferencesWindowController* open() {
    window = std::make_unique<WTPreferencesWindowController>(defaults.get(), manager.get(), passwords.get());
    window->showWindow();
    EXPECT_TRUE(QTest::qWaitForWindowExposed(window.get()));
    return window.get();
  }
  // The light's name, after checking that the label shows that image: a light of the right colour.
  QString light() const {
    QLabel* view = window->findChild<QLabel*>(QStringLiteral("statusImageView"));
    EXPECT_NE(view, nullptr);
    if (!view) return {};
    const QString name = view->property("imageName").toString();
    EXPECT_EQ(name, window->statusImageName());
    const QImage image = view->pixmap().toImage();
    const QColor centre = image.pixelColor(image.width() / 2, image.height() * 2 / 3);
    const int channels[] = {centre.red(), centre.green(), centre.blue()};
    const int strongest =
        int(std::max_element(std::begin(channels), std::end(channels)) - std::begin(channels));
    const QString colour = QStringList{"red", "green", "blue"}.at(strongest);
    EXPECT_EQ(colour, name) << "the light shows " << colour.toStdString();
    EXPECT_EQ(centre.alpha(), 255);
    return name;
  }
  QByteArray settingsBytes() const {
    QFile file(defaults->fileName());
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
  }
  static void type(QLineEdit* field, const QString& text) {
    field->setFocus();
    field->selectAll();
    QTest::keyClicks(field, text);
  }
  static void typeAndReturn(QLineEdit* field, const QString& text) {
    type(field, text);
    QTest::keyClick(field, Qt::Key_Return);
  }

  QTemporaryDir dir;
  MemoryKeychain keychain;
  std::unique_ptr<UserDefaults> defaults;
  std::unique_ptr<WTPasswordStore> passwords;
  std::unique_ptr<StoreCredentials> credentials;
  std::unique_ptr<WTObjectContext> context;
  std::unique_ptr<RZSyncManager> manager;
  synctest::RecordingPresenter presenter;
  std::unique_ptr<WTPreferencesWindowController> window;
};

TEST_F(WTPreferencesWindowTest, TheLightIsBlueWithoutAnAccountRedWhenSyncingIsOffAndGreenWhenOn) {
  open();
  EXPECT_EQ(light(), "blue");
  // Syncing on without an account is still blue: there is nothing to sync with.
  manager->enableSync();
  EXPECT_EQ(light(), "blue");
  manager->disableSync();

  storeAccount();
  window->refreshStatusImageView();
  EXPECT_EQ(light(), "red");
  // The manager's announcements move the light, whoever switched syncing.
  manager->enableSync();
  EXPECT_EQ(light(), "green");
  manager->disableSync();
  EXPECT_EQ(light(), "red");
  EXPECT_FALSE(window->statusImageView()->toolTip().isEmpty());
}

TEST_F(WTPreferencesWindowTest, AStoredAccountShowsInTheFieldsButAUserNameAloneLeavesBothEmpty) {
  defaults->setValue(QStringLiteral("WTSyncUser"), kUser);
  open();
  EXPECT_TRUE(window->emailTextField()->text().isEmpty());
  EXPECT_TRUE(window->passwordTextField()->text().isEmpty());
  EXPECT_EQ(light(), "blue");
  window.reset();

  passwords->setPassword(kPassword);
  open();
  EXPECT_EQ(window->emailTextField()->text(), kUser);
  EXPECT_EQ(window->passwordTextField()->text(), kPassword);
  EXPECT_EQ(window->passwordTextField()->echoMode(), QLineEdit::Password);
  EXPECT_EQ(light(), "red");
}

TEST_F(WTPreferencesWindowTest, AUserNameOfSpacesIsNoAccount) {
  storeAccount(QStringLiteral("   "));
  manager->enableSync();
  open();
  EXPECT_EQ(light(), "blue");

  // Typed and started, it is stored as typed, and still lights blue.
  type(window->emailTextField(), QStringLiteral("  "));
  type(window->passwordTextField(), kPassword);
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncUser")), QStringLiteral("  "));
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "blue");
}

TEST_F(WTPreferencesWindowTest, StartSyncStoresTheAccountWithThePasswordInTheKeychainOnly) {
  open();
  EXPECT_EQ(light(), "blue");
  // Half an account is not stored and starts nothing.
  type(window->emailTextField(), kUser);
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncUser")));
  EXPECT_FALSE(manager->syncEnabled());
  EXPECT_EQ(keychain.writes, 0);

  type(window->passwordTextField(), kPassword);
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncUser")), kUser);
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), kPassword);
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "green");
  EXPECT_TRUE(settingsBytes().contains("ann@example.org"));
  EXPECT_FALSE(settingsBytes().contains("horse"));
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncPassword")));

  // Return in the password field starts syncing too.
  manager->disableSync();
  type(window->passwordTextField(), QStringLiteral("battery staple"));
  QTest::keyClick(window->passwordTextField(), Qt::Key_Return);
  EXPECT_EQ(keychain.entries.value(QStringLiteral("sync-password")), QStringLiteral("battery staple"));
  EXPECT_EQ(light(), "green");
}

// A keyring that did not take the password is said under the password field, not in a dialog: also when
// that happened at start, before the window was made.
TEST_F(WTPreferencesWindowTest, AKeyringThatDidNotTakeThePasswordIsSaidUnderIt) {
  keychain.available = false;
  defaults->setValue(QStringLiteral("WTSyncUser"), kUser);
  defaults->setValue(QStringLiteral("WTSyncPassword"), kPassword);
  passwords->load();
  open();
  EXPECT_TRUE(window->keychainNoteLabel()->isVisible());
  EXPECT_TRUE(window->keychainNoteLabel()->text().contains(QStringLiteral("settings file")));
  EXPECT_EQ(QApplication::activeModalWidget(), nullptr);

  keychain.available = true;
  typeAndReturn(window->passwordTextField(), QStringLiteral("battery staple"));
  EXPECT_FALSE(window->keychainNoteLabel()->isVisible());
  keychain.available = false;
  typeAndReturn(window->passwordTextField(), kPassword);
  EXPECT_TRUE(window->keychainNoteLabel()->isVisible());
}

TEST_F(WTPreferencesWindowTest, AServerErrorTurnsTheLightRedAndStartSyncTurnsItGreenAgain) {
  LoopbackHttpServer server;
  bool refuse = true;
  server.handler = [&](const HttpRequest&) {
    return refuse ? LoopbackHttpServer::json(
                        QVariantMap{{"error", "Wrong e-mail address or password."}, {"code", 2}})
                  : LoopbackHttpServer::json(
                        QVariantMap{{"action", "head"}, {"iteration", 0}, {"result", QVariantMap{}}});
  };
  defaults->setValue(QStringLiteral("WTSyncServer"), server.address());
  open();
  type(window->emailTextField(), kUser);
  type(window->passwordTextField(), kPassword);
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_EQ(light(), "green");

  // Switching on polls at once; the server refuses and syncing goes off.
  ASSERT_TRUE(waitUntil([&] { return !manager->syncEnabled(); }));
  EXPECT_EQ(light(), "red");
  EXPECT_EQ(presenter.syncErrors, QStringList{"Wrong e-mail address or password. - (Code: 2)"});
  ASSERT_EQ(server.requests.size(), 1);
  EXPECT_EQ(server.requests[0].json().value("user").toString(), kUser);
  EXPECT_EQ(server.requests[0].json().value("password").toString(), kPassword);

  refuse = false;
  QTest::mouseClick(window->startSyncButton(), Qt::LeftButton);
  EXPECT_EQ(light(), "green");
  ASSERT_TRUE(waitUntil([&] {
    return server.requests.size() == 2 && manager->syncNetwork()->networkAction() == RZSyncNetwork::Idle;
  }));
  EXPECT_TRUE(manager->syncEnabled());
  EXPECT_EQ(light(), "green");
}

TEST_F(WTPreferencesWindowTest, SignUpOpensTheServersPageInTheBrowser) {
  UrlCatcher catcher;
  QDesktopServices::setUrlHandler(QStringLiteral("https"), &catcher, "open");
  QDesktopServices::setUrlHandler(QStringLiteral("http"), &catcher, "open");
  open();
  EXPECT_FALSE(window->signUpButton()->isEnabled());
  EXPECT_FALSE(window->signUp());
  EXPECT_TRUE(catcher.opened.isEmpty());

  type(window->serverField(), QStringLiteral("sync.example.org"));
  EXPECT_TRUE(window->signUpButton()->isEnabled());
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  ASSERT_EQ(catcher.opened.size(), 1);
  EXPECT_EQ(catcher.opened[0], QUrl("https://sync.example.org/sync/tessal/signup.php"));
  // Clicking ended the field's editing, so the address is the sync's too.
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncServer")), "sync.example.org");

  type(window->serverField(), QStringLiteral("http://127.0.0.1:8080/tessal/"));
  QTest::mouseClick(window->signUpButton(), Qt::LeftButton);
  ASSERT_EQ(catcher.opened.size(), 2);
  EXPECT_EQ(catcher.opened[1], QUrl("http://127.0.0.1:8080/tessal/sync/tessal/signup.php"));
  EXPECT_EQ(manager->configuredEndpoint(), QUrl("http://127.0.0.1:8080/tessal/sync/tessal/sync.php"));
  QDesktopServices::unsetUrlHandler(QStringLiteral("https"));
  QDesktopServices::unsetUrlHandler(QStringLiteral("http"));
}

TEST_F(WTPreferencesWindowTest, TheServerFieldRefusesWhatIsNoAddress) {
  defaults->setValue(QStringLiteral("WTSyncServer"), QStringLiteral("sync.example.org"));
  open();
  EXPECT_EQ(window->serverField()->text(), "sync.example.org");
  typeAndReturn(window->serverField(), QStringLiteral("ftp://files.example.org"));
  EXPECT_TRUE(window->serverField()->property("refused").toBool());
  EXPECT_FALSE(window->serverField()->toolTip().isEmpty());
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncServer")), "sync.example.org");
  EXPECT_FALSE(window->signUpButton()->isEnabled());

  typeAndReturn(window->serverField(), QStringLiteral("sync.example.net:8443"));
  EXPECT_FALSE(window->serverField()->property("refused").toBool());
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncServer")), "sync.example.net:8443");

  // Emptied, the address is unset.
  window->serverField()->clear();
  QTest::keyClick(window->serverField(), Qt::Key_Return);
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTSyncServer")));

  // An address typed but not confirmed is kept when the window goes away with the application.
  type(window->serverField(), QStringLiteral("sync.example.com"));
  window.reset();
  EXPECT_EQ(defaults->stringForKey(QStringLiteral("WTSyncServer")), "sync.example.com");
}

TEST_F(WTPreferencesWindowTest, TimerSettingsAreStoredAsTheyAreChanged) {
  defaults->setValue(QStringLiteral("WTIdleTime"), 20);
  open();
  EXPECT_FALSE(window->shouldIdleCheckBox()->isChecked());
  EXPECT_FALSE(window->idleTimeSpinBox()->isEnabled());
  EXPECT_EQ(window->idleTimeSpinBox()->value(), 20);
  EXPECT_FALSE(window->stopsOtherTimesCheckBox()->isChecked());

  QTest::mouseClick(window->shouldIdleCheckBox(), Qt::LeftButton);
  EXPECT_TRUE(defaults->boolForKey(QStringLiteral("WTShouldIdle")));
  EXPECT_TRUE(window->idleTimeSpinBox()->isEnabled());
  window->idleTimeSpinBox()->stepUp();
  EXPECT_EQ(defaults->integerForKey(QStringLiteral("WTIdleTime")), 21);
  QTest::mouseClick(window->stopsOtherTimesCheckBox(), Qt::LeftButton);
  EXPECT_TRUE(defaults->boolForKey(QStringLiteral("WTStopsOtherTimes")));

  // Read back from the file by another window.
  window.reset();
  defaults = std::make_unique<UserDefaults>(dir.filePath(QStringLiteral("settings.conf")));
  passwords = std::make_unique<WTPasswordStore>(defaults.get(), std::make_unique<SharedKeychain>(keychain));
  window = std::make_unique<WTPreferencesWindowController>(defaults.get(), nullptr, passwords.get());
  EXPECT_TRUE(window->shouldIdleCheckBox()->isChecked());
  EXPECT_EQ(window->idleTimeSpinBox()->value(), 21);
  EXPECT_TRUE(window->stopsOtherTimesCheckBox()->isChecked());
  QTest::mouseClick(window->shouldIdleCheckBox(), Qt::LeftButton);
  EXPECT_FALSE(defaults->boolForKey(QStringLiteral("WTShouldIdle")));
  EXPECT_FALSE(window->idleTimeSpinBox()->isEnabled());
  EXPECT_EQ(window->statusImageName(), "blue");
}

TEST_F(WTPreferencesWindowTest, TheDefaultRateTakesNumbersAndRefusesTheRest) {
  open();
  EXPECT_TRUE(window->defaultRateField()->text().isEmpty());
  typeAndReturn(window->defaultRateField(), QStringLiteral("80.50"));
  ASSERT_TRUE(defaults->decimalForKey(QStringLiteral("WTDefaultRate")));
  EXPECT_EQ(*defaults->decimalForKey(QStringLiteral("WTDefaultRate")), *Decimal::fromString(u"80.5"));
  EXPECT_FALSE(WTRateField::isRefused(window->defaultRateField()));

  for (const QString& bad : {QStringLiteral("abc"), QStringLiteral("12abc"), QStringLiteral("-5")}) {
    typeAndReturn(window->defaultRateField(), bad);
    EXPECT_TRUE(WTRateField::isRefused(window->defaultRateField())) << bad.toStdString();
    EXPECT_EQ(*defaults->decimalForKey(QStringLiteral("WTDefaultRate")), *Decimal::fromString(u"80.5"))
        << bad.toStdString();
  }
  // Typing clears the mark; closing the window stores what was typed without Return.
  type(window->defaultRateField(), QStringLiteral("95"));
  EXPECT_FALSE(WTRateField::isRefused(window->defaultRateField()));
  QTest::mouseClick(window->findChild<QPushButton*>(QStringLiteral("closeButton")), Qt::LeftButton);
  EXPECT_FALSE(window->isVisible());
  EXPECT_EQ(*defaults->decimalForKey(QStringLiteral("WTDefaultRate")), Decimal(95));

  // Shown again, money in the user's format; emptied, the built-in rates apply again.
  window->showWindow();
  EXPECT_TRUE(window->isVisible());
  window.reset();
  open();
  EXPECT_EQ(window->defaultRateField()->text(), "95.00");
  window->defaultRateField()->clear();
  QTest::keyClick(window->defaultRateField(), Qt::Key_Return);
  EXPECT_FALSE(defaults->hasStoredValue(QStringLiteral("WTDefaultRate")));
}

TEST_F(WTPreferencesWindowTest, EveryFieldHasItsNameAndTheWindowIsNotModal) {
  open();
  for (const char* name : {"emailTextField", "passwordTextField", "serverField", "defaultRateField"})
    EXPECT_NE(window->findChild<QLineEdit*>(name), nullptr) << name;
  EXPECT_NE(window->findChild<QLabel*>("statusImageView"), nullptr);
  EXPECT_NE(window->findChild<QCheckBox*>("shouldIdleCheckBox"), nullptr);
  EXPECT_NE(window->findChild<QCheckBox*>("stopsOtherTimesCheckBox"), nullptr);
  EXPECT_NE(window->findChild<QSpinBox*>("idleTimeSpinBox"), nullptr);
  EXPECT_EQ(window->startSyncButton()->text(), "Start Sync");
  EXPECT_EQ(window->signUpButton()->text(), QString::fromUtf8("Sign Up…"));
  EXPECT_FALSE(window->isModal());
  EXPECT_EQ(window->windowTitle(), "Preferences");
}

}  // namespace

#include "WTPreferencesWindowTest.moc"
