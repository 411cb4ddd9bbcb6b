// The request and reply shapes of the sync endpoint, its errors, accounts and the sign-up page.
#include "ServerTestSupport.h"

#include <thread>

namespace servertest {
namespace {

class SyncProtocolTest : public ServerTest {
 protected:
  void SetUp() override {
    ServerTest::SetUp();
    if (IsSkipped()) return;
    startServer();
  }

  // Asserts that the account holds nothing: no iteration spent, nothing a fresh device would get.
  void expectNothingStored(const std::string& email) {
    const Reply reply = head(email, 0, "observer");
    EXPECT_EQ(reply.integer("iteration"), 0) << reply.body;
    EXPECT_EQ(reply["result"]->dump(), R"({"i":{},"u":{},"x":[]})");
  }
};

TEST_P(SyncProtocolTest, HeadOfANewAccountIsEmptyAtIterationZero) {
  const std::string user = newUser("fresh");
  const Reply reply = head(user, 0);
  EXPECT_EQ(reply.status, 200);
  EXPECT_EQ(reply.body, R"({"action":"head","iteration":0,"result":{"i":{},"u":{},"x":[]}})");
}

TEST_P(SyncProtocolTest, SavedValuesReachAnotherDeviceExactly) {
  const std::string user = newUser("exact");
  // Money keeps its digits (12.30 is not 12.3), long decimals are not squeezed through a double,
  // texts keep quotes, escapes and non-ASCII characters.
  const std::string values =
      R"({"name":"Caf\u00e9 \"Zur Post\"\n","rate":12.30,"budget":12345678901234567890123456789.123456789,)"
      R"("archived":true,"color":null,"minutes":-7,"tags":["a",1.50,null]})";
  const Reply saved = save(user, 0, "laptop", std::string(R"({"i":{"c1@WTClient":)") + values + "}}");
  ASSERT_EQ(saved.body, R"({"action":"save","iteration":1})");

  const Reply other = head(user, 0, "desktop");
  EXPECT_EQ(other.integer("iteration"), 1);
  ASSERT_TRUE(other["result"] && other["result"]->find("i")) << other.body;
  const JsonValue* client = other["result"]->find("i")->find("c1@WTClient");
  ASSERT_TRUE(client) << other.body;
  for (const char* name : {"rate", "budget", "minutes", "tags", "name", "archived", "color"}) {
    ASSERT_TRUE(client->find(name)) << name;
    EXPECT_EQ(client->find(name)->dump(), JsonValue::parse(values)->find(name)->dump()) << name;
  }
  EXPECT_NE(other.body.find("\"rate\":12.30"), std::string::npos) << other.body;
  EXPECT_NE(other.body.find("12345678901234567890123456789.123456789"), std::string::npos);
}

TEST_P(SyncProtocolTest, MalformedRequestsAreRefusedWithCode1) {
  const std::string user = newUser("malformed");
  const std::string good = "\"user\":\"" + user + "\",\"password\":\"password-of-" + user + "\"";
  const struct {
    const char* what;
    std::string body;
  } cases[] = {
      {"empty body", ""},
      {"not JSON", "user=a&password=b"},
      {"truncated", "{" + good + ",\"action\":\"head\",\"iteration\":0"},
      {"an array", "[1]"},
      {"a bare string", "\"head\""},
      {"no user", R"({"password":"x","action":"head","iteration":0})"},
      {"user not a string", "{\"user\":7,\"password\":\"x\",\"action\":\"head\",\"iteration\":0}"},
      {"no action", "{" + good + ",\"iteration\":0}"},
      {"no iteration", "{" + good + ",\"action\":\"head\"}"},
      {"negative iteration", "{" + good + ",\"action\":\"head\",\"iteration\":-1}"},
      {"fractional iteration", "{" + good + ",\"action\":\"head\",\"iteration\":1.5}"},
      {"iteration as text", "{" + good + ",\"action\":\"head\",\"iteration\":\"3\"}"},
      {"device not a string", "{" + good + ",\"action\":\"head\",\"iteration\":0,\"device\":5}"},
      {"device with a line break", "{" + good + ",\"action\":\"head\",\"iteration\":0,\"device\":\"a\\nb\"}"},
      {"repeated member", "{" + good + ",\"action\":\"head\",\"action\":\"save\",\"iteration\":0}"},
      {"nested too deeply", "{" + good + ",\"action\":\"head\",\"iteration\":0,\"x\":" +
                                std::string(40, '[') + std::string(40, ']') + "}"},
      {"invalid UTF-8", "{" + good + ",\"action\":\"head\",\"iteration\":0,\"device\":\"\xff\"}"},
  };
  for (const auto& c : cases) {
    const Reply reply = post(port(), "/sync/tessal/sync.php", c.body);
    EXPECT_EQ(reply.status, 200) << c.what;
    EXPECT_EQ(reply.code(), 1) << c.what << ": " << reply.body;
    EXPECT_TRUE(reply["error"] && reply["error"]->isString()) << c.what;
  }
  expectNothingStored(user);
}

TEST_P(SyncProtocolTest, UnknownActionIsCode3AndStoresNothing) {
  const std::string user = newUser("action");
  for (const char* action : {"", "HEAD", "delete", "save "}) {
    const Reply reply = sync(user, action, 0, "d", R"({"i":{"a@WTClient":{"name":"x"}}})");
    EXPECT_EQ(reply.code(), 3) << action << ": " << reply.body;
  }
  expectNothingStored(user);
}

TEST_P(SyncProtocolTest, BadChangeSetsAreCode5AndStoreNothing) {
  const std::string user = newUser("badset");
  // Each starts with a good record, so a server that stored as it went would leave a trace.
  const std::string good = R"("ok@WTClient":{"name":"fine"})";
  const struct {
    const char* what;
    std::string data;
  } cases[] = {
      {"data not an object", "[]"},
      {"unknown section", R"({"i":{)" + good + R"(},"y":{}})"},
      {"i not an object", R"({"i":[]})"},
      {"x not a list", R"({"i":{)" + good + R"(},"x":{}})"},
      {"x holds a number", R"({"i":{)" + good + R"(},"x":[1]})"},
      {"identity without entity", R"({"i":{)" + good + R"(,"abc":{}}})"},
      {"identity of an abstract entity", R"({"i":{)" + good + R"(,"abc@WTItem":{}}})"},
      {"identity of an unknown entity", R"({"u":{)" + good + R"(,"abc@WTUser":{}}})"},
      {"identity with nothing before @", R"({"i":{)" + good + R"(,"@WTTask":{}}})"},
      {"values not an object", R"({"i":{)" + good + R"(,"t@WTTask":"name"}})"},
      {"object value", R"({"i":{)" + good + R"(,"t@WTTask":{"name":{"a":1}}}})"},
      {"nested list value", R"({"i":{)" + good + R"(,"t@WTTask":{"name":[[1]]}}})"},
      {"owner of the wrong entity", R"({"i":{)" + good + R"(,"t@WTTask":{"project":"ok@WTClient"}}})"},
      {"owner not an identity", R"({"i":{)" + good + R"(,"e@WTTime":{"task":17}}})"},
      {"tasks holding a project", R"({"u":{)" + good + R"(,"p@WTProject":{"tasks":["q@WTProject"]}}})"},
      {"tasks not a list", R"({"u":{)" + good + R"(,"p@WTProject":{"tasks":"t@WTTask"}}})"},
      {"uuid field of another record", R"({"i":{)" + good + R"(,"t@WTTask":{"uuid":"s@WTTask"}}})"},
      {"unordered items of a task", R"({"u":{)" + good + R"(,"t@WTTask":{"items":[]}}})"},
      {"unordered projects of a client", R"({"u":{)" + good + R"(,"c@WTClient":{"projects":[]}}})"},
      {"empty field name", R"({"i":{)" + good + R"(,"t@WTTask":{"":1}}})"},
  };
  for (const auto& c : cases) {
    const Reply reply = save(user, 0, "d", c.data);
    EXPECT_EQ(reply.code(), 5) << c.what << ": " << reply.body;
  }
  EXPECT_EQ(sync(user, "save", 0, "d").code(), 5) << "a save without data";
  expectNothingStored(user);
}

TEST_P(SyncProtocolTest, WrongPasswordIsCode2AndRepeatedFailuresAreSlowedDown) {
  const std::string user = newUser("guessed");
  const std::string password = "password-of-" + user;
  auto attempt = [&](const std::string& secret) {
    return post(port(), "/sync/tessal/sync.php", requestBody(user, secret, "head", 0, "d"));
  };
  // A device that signed in before the attack keeps working through it.
  ASSERT_EQ(attempt(password).status, 200);

  const Reply wrong = attempt("not-the-password");
  EXPECT_EQ(wrong.status, 200);
  EXPECT_EQ(wrong.code(), 2);
  EXPECT_NE(wrong.code(), 4);
  // While locked, a second guess is not even tried.
  const Reply locked = attempt("another-guess");
  EXPECT_EQ(locked.status, 429) << locked.body;
  EXPECT_FALSE(locked.json) << "a lock is a transient failure the client retries";
  EXPECT_FALSE(locked.retryAfter.empty());
  EXPECT_EQ(attempt(password).status, 200) << "remembered credentials pass during a lock";

  // The lock doubles with each consecutive failure: after the second failure 300 ms are not enough.
  std::this_thread::sleep_for(std::chrono::milliseconds(350));
  EXPECT_EQ(attempt("third-guess").code(), 2);
  std::this_thread::sleep_for(std::chrono::milliseconds(350));
  EXPECT_EQ(attempt("fourth-guess").status, 429);
  std::this_thread::sleep_for(std::chrono::milliseconds(400));
  EXPECT_EQ(attempt("fourth-guess").code(), 2);
}

TEST_P(SyncProtocolTest, UnknownAccountsAndCaseOfTheAddress) {
  const std::string user = newUser("Mixed.Case");
  EXPECT_EQ(
      post(port(), "/sync/tessal/sync.php", requestBody("nobody@example.com", "whatever-it-is", "head", 0))
          .code(),
      2);
  // Addresses compare without case, and the client trims what it sends; so does the server.
  const Reply reply =
      post(port(), "/sync/tessal/sync.php",
           requestBody("  MIXED.case@EXAMPLE.com\n", " password-of-" + user + " ", "head", 0));
  EXPECT_EQ(reply.status, 200);
  EXPECT_EQ(reply.integer("iteration"), 0) << reply.body;
}

TEST_P(SyncProtocolTest, BodiesOverTheLimitAreRefusedWithCode6) {
  stopServer();
  options.maxBodyBytes = 4096;
  startServer();
  const std::string user = newUser("large");
  const std::string big = R"({"i":{"c@WTClient":{"notes":")" + std::string(5000, 'n') + R"("}}})";
  const Reply reply = save(user, 0, "d", big);
  EXPECT_EQ(reply.status, 413);
  EXPECT_EQ(reply.code(), 6) << reply.body;
  expectNothingStored(user);
  EXPECT_EQ(save(user, 0, "d", R"({"i":{"c@WTClient":{"notes":"short"}}})").integer("iteration"), 1);
}

TEST_P(SyncProtocolTest, AccountsNeverSeeEachOther) {
  const std::string alice = newUser("alice");
  const std::string bob = newUser("bob");
  ASSERT_EQ(save(alice, 0, "a", R"({"i":{"shared@WTClient":{"name":"Alice's"}}})").integer("iteration"), 1);
  // The same identity in another account is another record.
  ASSERT_EQ(save(bob, 0, "b", R"({"i":{"shared@WTClient":{"name":"Bob's"}},"x":["gone@WTNote"]})")
                .integer("iteration"),
            1);
  ASSERT_EQ(save(bob, 1, "b", R"({"x":["shared@WTClient"]})").integer("iteration"), 2);

  const Reply forAlice = head(alice, 0, "other");
  EXPECT_EQ(forAlice.integer("iteration"), 1);
  EXPECT_EQ(
      forAlice["result"]->dump(),
      R"({"i":{"shared@WTClient":{"name":"Alice's"}},"u":{"shared@WTClient":{"name":"Alice's"}},"x":[]})");
  const Reply forBob = head(bob, 0, "other");
  EXPECT_EQ(forBob.integer("iteration"), 2);
  EXPECT_EQ(forBob.body.find("Alice"), std::string::npos);
}

TEST_P(SyncProtocolTest, DataSurvivesARestart) {
  const std::string user = newUser("restart");
  ASSERT_EQ(save(user, 0, "a", R"({"i":{"p@WTProject":{"name":"kept","rate":80.00}}})").integer("iteration"),
            1);
  stopServer();
  startServer();
  const Reply reply = head(user, 0, "b");
  EXPECT_EQ(reply.integer("iteration"), 1);
  EXPECT_NE(reply.body.find(R"("p@WTProject":{"name":"kept","rate":80.00})"), std::string::npos)
      << reply.body;
}

TEST_P(SyncProtocolTest, SignUpPageCreatesAccounts) {
  const Reply page = get(port(), "/sync/tessal/signup.php");
  EXPECT_EQ(page.status, 200);
  for (const char* field : {"name=\"email\"", "name=\"password\"", "name=\"password2\"", "method=\"post\""}) {
    EXPECT_NE(page.body.find(field), std::string::npos) << field;
  }
  const std::string form = "application/x-www-form-urlencoded";
  auto submit = [&](const std::string& fields) {
    return post(port(), "/sync/tessal/signup.php", fields, form);
  };

  const Reply created = submit("email=New%40Example.com&password=long+enough&password2=long+enough");
  EXPECT_EQ(created.status, 201) << created.body;
  EXPECT_NE(created.body.find("new@example.com"), std::string::npos);
  const Reply synced =
      post(port(), "/sync/tessal/sync.php", requestBody("new@example.com", "long enough", "head", 0, "d"));
  EXPECT_EQ(synced.integer("iteration"), 0) << synced.body;

  EXPECT_EQ(submit("email=new%40example.com&password=other+password&password2=other+password").status, 409);
  EXPECT_EQ(submit("email=short%40example.com&password=short&password2=short").status, 400);
  EXPECT_EQ(submit("email=two%40example.com&password=long+enough&password2=long+enougj").status, 400);
  // What the visitor typed comes back inside the page as text, never as markup.
  const Reply bad = submit("email=%3Cscript%3E&password=long+enough&password2=long+enough");
  EXPECT_EQ(bad.status, 400);
  EXPECT_EQ(bad.body.find("<script>"), std::string::npos);
  EXPECT_NE(bad.body.find("&lt;script&gt;"), std::string::npos);
  EXPECT_EQ(
      post(port(), "/sync/tessal/sync.php", requestBody("two@example.com", "long enough", "head", 0)).code(),
      2);
}

TEST_P(SyncProtocolTest, SignUpCanBeSwitchedOff) {
  stopServer();
  options.signUp = false;
  startServer();
  EXPECT_EQ(get(port(), "/sync/tessal/signup.php").status, 404);
  EXPECT_EQ(post(port(), "/sync/tessal/signup.php", "email=a%40b.c&password=12345678&password2=12345678",
                 "application/x-www-form-urlencoded")
                .status,
            404);
}

INSTANTIATE_TEST_SUITE_P(Storage, SyncProtocolTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
