// The clause builders with documents that no store builds: whatever statement
// somebody makes of their text, SQLite refuses it, and no row changes.

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::Row;
using support::SystemLog;
using ::testing::IsEmpty;

enum class Builder { kInsert, kPairs, kCondition, kUpdate };

struct Foreign {
  const char* name;
  Builder builder;
  const char* doc;
};

void PrintTo(const Foreign& foreign, std::ostream* out) {
  *out << foreign.doc;
}

/// Where the text of a clause can stand.
const std::vector<std::pair<std::string, std::string>> kPlaces = {
    {"DELETE FROM oauth_log", ""},
    {"DELETE FROM oauth_log WHERE ", ""},
    {"DELETE FROM oauth_log WHERE id='1' and ", ""},
    {"DELETE FROM oauth_log WHERE id='1' or ", ""},
    {"DELETE FROM oauth_log WHERE ", " or id='1'"},
    {"UPDATE oauth_log", ""},
    {"UPDATE oauth_log SET ", ""},
    {"UPDATE oauth_log SET ", " WHERE id='1'"},
    {"UPDATE oauth_log SET timestamp='9', ", ""},
    {"UPDATE oauth_log SET msg='x'", ""},
    {"UPDATE oauth_log SET msg='x' WHERE ", ""},
    {"SELECT * FROM oauth_log", ""},
    {"SELECT * FROM oauth_log WHERE ", ""},
    {"SELECT * FROM oauth_log", " ORDER BY id"},
    {"INSERT INTO oauth_log", ""},
    {"INSERT INTO oauth_log (timestamp, ", ") VALUES('1', 'x')"},
    {"INSERT INTO oauth_log (timestamp, msg) VALUES('1', ", ")"},
    {"INSERT INTO oauth_log (timestamp, msg) VALUES('1', 'x')", ""},
    {"SELECT ", ""},
    {"", ""},
};

class RefusedClauseTest : public CoreTest, public ::testing::WithParamInterface<Foreign> {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_log");
    sql("INSERT INTO oauth_log VALUES(1, 'a', 1); INSERT INTO oauth_log VALUES(2, 'b', 2)");
    before = rows();
  }

  static std::vector<Row> rows() { return sql("SELECT * FROM oauth_log ORDER BY id"); }

  std::vector<std::string> texts() {
    switch (GetParam().builder) {
      case Builder::kInsert:
        return {store->GetInsertParam(doc)};
      case Builder::kPairs:
        return {store->ConcateParam(doc, ", "), store->ConcateParam(doc, " and ")};
      case Builder::kCondition:
        return {store->GetConditionParam(doc)};
      default:
        return {store->GetUpdateParam(doc)};
    }
  }

  const Json::Value doc = json(GetParam().doc);
  std::optional<Table> store;
  std::vector<Row> before;
};

TEST_P(RefusedClauseTest, RunsNowhere) {
  for (const std::string& text : texts()) {
    EXPECT_NE(text, "");
    for (const auto& [head, tail] : kPlaces) {
      const std::string statement = head + text + tail + ";";
      EXPECT_EQ(store->DBCmd(statement, nullptr, nullptr), 0) << statement;
      EXPECT_EQ(store->GetErrCode(), 1) << statement;
      EXPECT_EQ(rows(), before) << statement;
    }
  }
}

TEST_P(RefusedClauseTest, IsBuiltWithoutALineOrAnError) {
  EXPECT_NO_THROW(texts());
  expectNoError(*store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

const Foreign kForeign[] = {
    {"InsertOfAnEmptyArray", Builder::kInsert, "[]"},
    {"InsertOfAnArray", Builder::kInsert, "['msg']"},
    {"InsertOfANumber", Builder::kInsert, "7"},
    {"InsertOfAText", Builder::kInsert, "'msg'"},
    {"InsertOfAnEmptyText", Builder::kInsert, "''"},
    {"InsertOfABoolean", Builder::kInsert, "true"},
    {"InsertOfAnArrayValue", Builder::kInsert, "{'msg': ['a'], 'timestamp': '1'}"},
    {"InsertOfAnEmptyArrayValue", Builder::kInsert, "{'msg': [], 'timestamp': '1'}"},
    {"InsertOfAnObjectValue", Builder::kInsert, "{'msg': {'a': '1'}, 'timestamp': '1'}"},
    {"InsertOfAnEmptyObjectValue", Builder::kInsert, "{'msg': 'a', 'timestamp': {}}"},
    {"PairsOfAnArray", Builder::kPairs, "['msg']"},
    {"PairsOfANumber", Builder::kPairs, "1"},
    {"PairsOfZero", Builder::kPairs, "0"},
    {"PairsOfAText", Builder::kPairs, "'1'"},
    {"PairsOfAnEmptyText", Builder::kPairs, "''"},
    {"PairsOfTrue", Builder::kPairs, "true"},
    {"PairsOfFalse", Builder::kPairs, "false"},
    {"PairsOfAnEmptyArrayValue", Builder::kPairs, "{'id': '1', 'msg': []}"},
    {"PairsOfAnArrayValue", Builder::kPairs, "{'id': ['1']}"},
    {"PairsOfAnEmptyObjectValue", Builder::kPairs, "{'id': {}}"},
    {"PairsOfAnObjectValueAmongOthers", Builder::kPairs,
     "{'id': '1', 'msg': {'id': '1'}, 'timestamp': '2'}"},
    {"ConditionOfAnArray", Builder::kCondition, "['id']"},
    {"ConditionOfANumber", Builder::kCondition, "1"},
    {"ConditionOfZero", Builder::kCondition, "0"},
    {"ConditionOfAText", Builder::kCondition, "'1'"},
    {"ConditionOfAnEmptyText", Builder::kCondition, "''"},
    {"ConditionOfTrue", Builder::kCondition, "true"},
    {"ConditionOfFalse", Builder::kCondition, "false"},
    {"ConditionOfAnEmptyArrayValue", Builder::kCondition, "{'id': []}"},
    {"ConditionOfAnObjectValueAmongOthers", Builder::kCondition, "{'id': '1', 'msg': {}}"},
    {"UpdateOfAnArray", Builder::kUpdate, "[]"},
    {"UpdateOfANumber", Builder::kUpdate, "7"},
    {"UpdateOfAText", Builder::kUpdate, "'modified'"},
    {"UpdateOfABoolean", Builder::kUpdate, "false"},
    {"UpdateOfATextModified", Builder::kUpdate, "{'modified': 'msg'}"},
    {"UpdateOfAnArrayModified", Builder::kUpdate, "{'modified': ['msg']}"},
    {"UpdateOfANestedModified", Builder::kUpdate,
     "{'modified': {'msg': {}}, 'condition': {'id': '1'}}"},
    {"UpdateWithATextCondition", Builder::kUpdate, "{'modified': {'msg': 'x'}, 'condition': '1'}"},
    {"UpdateWithANumberCondition", Builder::kUpdate, "{'modified': {'msg': 'x'}, 'condition': 1}"},
    {"UpdateWithAnArrayCondition", Builder::kUpdate,
     "{'modified': {'msg': 'x'}, 'condition': ['id']}"},
    {"UpdateWithANestedCondition", Builder::kUpdate,
     "{'modified': {'msg': 'x'}, 'condition': {'id': []}}"},
};

INSTANTIATE_TEST_SUITE_P(Core, RefusedClauseTest, ::testing::ValuesIn(kForeign),
                         support::CaseName());

/// The builder called by itself; the row operations refuse such a condition.
TEST_F(CoreTest, EmptyArrayIsAnEmptyConditionToTheBuilderAlone) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.GetConditionParam(json("[]")), "");
  EXPECT_EQ(store.GetUpdateParam(json("{'modified': {'msg': 'x'}, 'condition': []}")),
            " SET msg='x'");
  EXPECT_EQ(store.ConcateParam(json("[]"), ", "), "");
}

TEST_F(CoreTest, EmptyArrayIsNoConditionToTheRowOperations) {
  Table store("oauth_log");
  sql("INSERT INTO oauth_log VALUES(1, 'a', 1)");
  for (const char* text : {"{'condition': []}", "{'condition': [], 'modified': {'msg': 'x'}}"}) {
    Json::Value request = json(text);
    Json::Value rows = "untouched";
    EXPECT_FALSE(store.DBGet(request, &rows));
    EXPECT_FALSE(store.DBEdit(request));
    EXPECT_FALSE(store.DBDel(request));
    expectError(store, -2, "Bad parameters");
    EXPECT_EQ(rows, Json::Value("untouched"));
    EXPECT_EQ(request, json(text));
  }
  Json::Value row = json("[]");
  EXPECT_FALSE(store.DBAdd(row));
  Json::Value edit = json("{'modified': []}");
  EXPECT_FALSE(store.DBEdit(edit));
  EXPECT_EQ(sqlText("SELECT group_concat(msg) FROM oauth_log"), "a");
}

}  // namespace
