// The library's row callbacks with arguments that no statement of its own has:
// called by hand, and handed to the executor. This file is also built into a
// program at a fixed address, where the callbacks that the program names are
// not at the addresses that the library knows, unless the linker is told.

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

struct Callback {
  const char* name;
  OAUTHDBBasic::RowCallback call;
  const char* fills;   // the empty document that it fills
  const char* filled;  // by "SELECT 7 AS id"
};

void PrintTo(const Callback& callback, std::ostream* out) {
  *out << callback.name;
}

const Callback kCallbacks[] = {
    {"Count", OAUTHDBBasic::TabCountCallback, "[]", "['7']"},
    {"Exist", OAUTHDBBasic::IsTabExistCallback, "{}", "{'exist': true}"},
    {"Get", OAUTHDBBasic::TabGetCallback, "[]", "[{'id': '7'}]"},
};

class CallbackTest : public CoreTest, public ::testing::WithParamInterface<Callback> {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace();
    Engine::onExec([this](const std::string& sql) { ran.push_back(sql); });
  }

  /// Documents that the callback cannot fill.
  static std::vector<Json::Value> foreign() {
    std::vector<Json::Value> documents = {json("7"), json("'text'"), json("true")};
    documents.push_back(GetParam().fills[0] == '[' ? json("{'a': '1'}") : json("['1']"));
    return documents;
  }
  static Json::Value suitable() { return json(GetParam().fills); }

  char column[3] = "id";
  char value[2] = "7";
  char* columns[1] = {column};
  char* values[1] = {value};
  std::optional<OAUTHDBBasic> store;
  std::vector<std::string> ran;
};

INSTANTIATE_TEST_SUITE_P(Core, CallbackTest, ::testing::ValuesIn(kCallbacks), support::CaseName());

// By hand ---------------------------------------------------------------------

TEST_P(CallbackTest, FillsItsDocument) {
  Json::Value doc = suitable();
  EXPECT_EQ(GetParam().call(&doc, 1, values, columns), 0);
  EXPECT_EQ(doc, json(GetParam().filled));
}

TEST_P(CallbackTest, FillsANullDocument) {
  Json::Value doc;
  EXPECT_EQ(GetParam().call(&doc, 1, values, columns), 0);
  EXPECT_EQ(doc, json(GetParam().filled));
}

TEST_P(CallbackTest, WithoutADocumentDoesNothing) {
  EXPECT_EQ(GetParam().call(nullptr, 1, values, columns), 0);
  EXPECT_THAT(traced(-1, [&] { GetParam().call(nullptr, 1, values, columns); }), IsEmpty());
}

TEST_P(CallbackTest, LeavesAForeignDocumentAlone) {
  for (const Json::Value& document : foreign()) {
    Json::Value doc = document;
    EXPECT_NO_THROW(EXPECT_EQ(GetParam().call(&doc, 1, values, columns), 0)) << document;
    EXPECT_EQ(doc, document);
  }
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_P(CallbackTest, TakesARowWithoutValuesOrColumns) {
  withDiagnostics(-1, [&] {
    for (const int count : {-2147483647 - 1, -1, 0, 1, 2147483647}) {
      Json::Value doc = suitable();
      EXPECT_NO_THROW({
        EXPECT_EQ(GetParam().call(&doc, count, nullptr, nullptr), 0) << count;
        EXPECT_EQ(GetParam().call(&doc, count, nullptr, columns), 0) << count;
      });
    }
  });
}

TEST_P(CallbackTest, ReadsNoColumnOfANegativeCount) {
  withDiagnostics(-1, [&] {
    Json::Value doc = suitable();
    EXPECT_EQ(GetParam().call(&doc, -1, values, columns), 0);
    for (const Json::Value& member : doc) EXPECT_FALSE(member.isString());
  });
}

// Through the executor --------------------------------------------------------

TEST_P(CallbackTest, ExecutorFillsItsDocument) {
  for (Json::Value doc : {suitable(), Json::Value()}) {
    EXPECT_EQ(store->DBCmd("SELECT 7 AS id", GetParam().call, &doc), 1);
    EXPECT_EQ(doc, json(GetParam().filled));
  }
  expectNoError(*store);
}

TEST_P(CallbackTest, ExecutorRefusesAForeignDocumentBeforeTheStatement) {
  for (const Json::Value& document : foreign()) {
    store->SetErrCode(255);
    Json::Value doc = document;
    EXPECT_EQ(store->DBCmd("DELETE FROM oauth_meta; SELECT 1", GetParam().call, &doc), 0);
    expectError(*store, -2, "Bad parameters");
    EXPECT_EQ(doc, document);
  }
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_P(CallbackTest, ExecutorRefusesNoDocumentBeforeTheStatement) {
  EXPECT_EQ(store->DBCmd("DELETE FROM oauth_meta; SELECT 1", GetParam().call, nullptr), 0);
  expectError(*store, -2, "Bad parameters");
  EXPECT_EQ(store->DBCmdRun("DELETE FROM oauth_meta; SELECT 1", GetParam().call, nullptr), 0);
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta"), "3");
}

TEST_P(CallbackTest, ObjectThatIsNotReadyRefusesFirst) {
  hideFolder();
  OAUTHDBBasic closed;
  SystemLog::clear();
  EXPECT_EQ(closed.DBCmd("SELECT 1", GetParam().call, nullptr), 0);
  expectError(closed, 14, "Open DB failed!!");
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

TEST_F(CoreTest, CallbackOfTheCallersOwnMayHaveNoDocument) {
  OAUTHDBBasic store;
  const auto skip = [](void*, int, char**, char**) { return 0; };
  EXPECT_EQ(store.DBCmd("SELECT 1", skip, nullptr), 1);
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectNoError(store);
}

}  // namespace
