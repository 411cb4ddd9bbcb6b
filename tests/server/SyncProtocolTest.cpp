// The sync endpoint as clients meet it.
#include "ServerTestSupport.h"

#include <algorithm>
#include <fstream>
#include <sstream>
#include <thread>

namespace servertest {
namespace {

// Object members in name order, array elements too when `sorted` (storages list in any order).
JsonValue canonical(const JsonValue& value, bool sorted = false) {
  if (value.isObject()) {
    std::vector<JsonValue::Member> members;
    for (const auto& [name, member] : value.members()) members.emplace_back(name, canonical(member));
    std::sort(members.begin(), members.end(), [](auto& a, auto& b) { return a.first < b.first; });
    return JsonValue::object(std::move(members));
  }
  if (!value.isArray() || !sorted) return value;
  std::vector<JsonValue> elements = value.elements();
  std::sort(elements.begin(), elements.end(), [](auto& a, auto& b) { return a.dump() < b.dump(); });
  return JsonValue::array(std::move(elements));
}

// A reply in short: "save 2", "code 4 at 0", or "head 3 {records} [deleted]" ("i" and "u" if they differ).
std::string describe(const Reply& reply) {
  if (reply.status != 200 || !reply.json) return "status " + std::to_string(reply.status);
  if (reply.code() != 0) {
    EXPECT_TRUE(reply["error"]->isString()) << reply.body;
    return "code " + std::to_string(reply.code()) +
           (reply["iteration"] ? " at " + reply["iteration"]->dump() : "");
  }
  std::string out =
      (reply["action"] ? reply["action"]->text() : "?") + " " + std::to_string(reply.integer("iteration"));
  const JsonValue* result = reply["result"];
  if (!result) return out;
  const std::string i = canonical(*result->find("i")).dump(), u = canonical(*result->find("u")).dump();
  return out + " " + (i == u ? u : i + " " + u) + " " + canonical(*result->find("x"), true).dump();
}

const std::string kEmpty = "head 0 {} []";

class SyncProtocolTest : public ServerTest {
 protected:
  void SetUp() override {
    ServerTest::SetUp();
    // Every request here comes from one address; throttling it has tests of its own.
    options.authentication.firstLock = std::chrono::milliseconds(0);
    if (!IsSkipped()) startServer();
  }
  std::string post(const std::string& body) { return describe(servertest::post(port(), kSyncPath, body)); }
  std::string ask(const std::string& user, const std::string& action, int64_t base,
                  const std::string& device = {}, const std::string& data = {}) {
    return describe(sync(user, action, base, device, data));
  }
};

// Each block of tests/data/sync-conversations.txt is one account's conversation, a step a line.
TEST_P(SyncProtocolTest, EveryConversationGetsTheExpectedReplies) {
  std::ifstream file(TESSAL_TEST_DATA_DIR "/sync-conversations.txt");
  std::string user, line;
  int steps = 0;
  for (int number = 1; std::getline(file, line); ++number) {
    if (line.empty()) user.clear();
    if (line.empty() || line[0] == '#') continue;
    if (line == "restart") {
      stopServer();
      startServer();
      continue;
    }
    if (user.empty()) user = newUser("from-line-" + std::to_string(number));
    std::istringstream step(line.substr(0, line.find(" => ")));
    std::string device, action, data;
    int64_t base = 0;
    step >> device >> action >> base >> std::ws;
    std::getline(step, data);
    EXPECT_EQ(ask(user, action, base, device == "-" ? "" : device, data == "-" ? "" : data),
              line.substr(line.find(" => ") + 4))
        << "line " << number << ": " << line;
    ++steps;
  }
  EXPECT_GE(steps, 60);
}

// Each line of tests/data/sync-refused-requests.txt, and a device that is no UTF-8.
TEST_P(SyncProtocolTest, RefusedRequestsStoreNothing) {
  const std::string user = newUser("refused");
  std::ifstream file(TESSAL_TEST_DATA_DIR "/sync-refused-requests.txt");
  int rows = 0;
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line[0] == '#') continue;
    ++rows;
    std::string body = line.substr(line.find('\t') + 1);
    for (const auto& [name, value] : {std::pair{"$USER", user}, {"$PASSWORD", "password-of-" + user}})
      if (const size_t at = body.find(name); at != std::string::npos) body.replace(at, strlen(name), value);
    EXPECT_EQ(post(body), line.substr(0, line.find('\t'))) << body;
  }
  EXPECT_EQ(rows, 44);
  // A body of a million tiny values is refused as it is parsed, before it becomes a gigabyte of them.
  std::string zeros = requestBody(user, "password-of-" + user, "head", 0, "observer");
  std::string many(2'000'000, '0');
  for (size_t i = 1; i < many.size(); i += 2) many[i] = ',';
  zeros.insert(zeros.rfind('}'), ",\"pad\":[" + many + "0]");
  EXPECT_EQ(post(zeros), "code 1");
  EXPECT_EQ(post(requestBody(user, "password-of-" + user, "head", 0, "\xff")), "code 1");
  EXPECT_EQ(ask(user, "head", 0, "observer"), kEmpty);
}

// Unknown accounts are refused; addresses compare without case, and credentials are trimmed.
TEST_P(SyncProtocolTest, AccountsNeverSeeEachOther) {
  const std::string alice = newUser("Alice"), bob = newUser("bob");
  EXPECT_EQ(post(requestBody("nobody@example.com", "whatever-it-is", "head", 0)), "code 2");
  EXPECT_EQ(post(requestBody("  ALICE@EXAMPLE.com\n", " password-of-" + alice + " ", "head", 0)), kEmpty);
  ASSERT_EQ(ask(alice, "save", 0, "a", R"({"i":{"shared@WTClient":{"name":"Alice's"}}})"), "save 1");
  // The same identity in another account is another record.
  ASSERT_EQ(ask(bob, "save", 0, "b", R"({"i":{"shared@WTClient":{"name":"Bob's"}},"x":["gone@WTNote"]})"),
            "save 1");
  ASSERT_EQ(ask(bob, "save", 1, "b", R"({"x":["shared@WTClient"]})"), "save 2");
  EXPECT_EQ(ask(alice, "head", 0, "other"), R"(head 1 {"shared@WTClient":{"name":"Alice's"}} [])");
  EXPECT_EQ(ask(bob, "head", 0, "other"), R"(head 2 {} ["gone@WTNote","shared@WTClient"])");
}

// Every save is based on 0: each reply is 0 once others had saved, or the save's own iteration.
TEST_P(SyncProtocolTest, ConcurrentSavesGetOneIterationEach) {
  constexpr int kDevices = 6, kSaves = 8;
  const std::string user = newUser("concurrent");
  std::vector<std::thread> threads;
  for (int d = 0; d < kDevices; ++d) {
    threads.emplace_back([&, d] {
      for (int s = 0; s < kSaves; ++s) {
        const std::string uuid = "d" + std::to_string(d) + "s" + std::to_string(s) + "@WTNote";
        EXPECT_GE(
            sync(user, "save", 0, "device" + std::to_string(d), R"({"i":{")" + uuid + R"(":{"name":"x"}}})")
                .integer("iteration"),
            0);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  const Reply all = sync(user, "head", 0, "observer");
  EXPECT_EQ(all.integer("iteration"), kDevices * kSaves);
  EXPECT_EQ(all["result"]->find("i")->members().size(), static_cast<size_t>(kDevices * kSaves));
}

// Accounts made on the sign-up page sign in; the data survives a restart, and sign-up can be turned off.
TEST_P(SyncProtocolTest, SignUpPageCreatesAccountsAndARestartKeepsTheData) {
  const Reply page = get(port(), "/sync/tessal/signup.php");
  EXPECT_EQ(page.status, 200);
  for (const char* field : {"name=\"email\"", "name=\"password\"", "name=\"password2\"", "method=\"post\""})
    EXPECT_NE(page.body.find(field), std::string::npos) << field;
  auto submit = [&](const std::string& email, const std::string& password, const std::string& again) {
    return servertest::post(port(), "/sync/tessal/signup.php",
                            "email=" + email + "&password=" + password + "&password2=" + again,
                            "application/x-www-form-urlencoded");
  };
  // What the visitor typed comes back inside the page as text, never as markup.
  const struct {
    const char *email, *password, *again;
    int status;
    const char* says;  // a fragment of the page
  } rows[] = {
      {"New%40Example.com", "long+enough", "long+enough", 201, "new@example.com"},
      {"new%40example.com", "other+password", "other+password", 409, ""},
      {"short%40example.com", "short", "short", 400, ""},
      {"two%40example.com", "long+enough", "long+enougj", 400, ""},
      {"%3Cscript%3E", "long+enough", "long+enough", 400, "&lt;script&gt;"},
  };
  for (const auto& row : rows) {
    const Reply reply = submit(row.email, row.password, row.again);
    EXPECT_EQ(reply.status, row.status) << row.email;
    EXPECT_NE(reply.body.find(row.says), std::string::npos) << reply.body;
    EXPECT_EQ(reply.body.find("<script>"), std::string::npos);
  }
  EXPECT_EQ(post(requestBody("two@example.com", "long enough", "head", 0)), "code 2");
  const std::string kept = R"({"i":{"p@WTProject":{"name":"kept","rate":80.00}}})";
  EXPECT_EQ(post(requestBody("new@example.com", "long enough", "save", 0, "a", kept)), "save 1");

  stopServer();
  options.signUp = false;
  startServer();
  EXPECT_EQ(get(port(), "/sync/tessal/signup.php").status, 404);
  EXPECT_EQ(submit("a%40b.c", "12345678", "12345678").status, 404);
  EXPECT_EQ(post(requestBody("new@example.com", "long enough", "head", 0, "b")),
            R"(head 1 {"p@WTProject":{"name":"kept","rate":80.00}} [])");
}

INSTANTIATE_TEST_SUITE_P(Storage, SyncProtocolTest, testing::Values(Storage::SQLite, Storage::PostgreSQL),
                         storageName);

}  // namespace
}  // namespace servertest
