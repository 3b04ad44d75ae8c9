// Nothing escapes: documents that no store builds, and memory that runs out.

#include <sqlite3.h>

#include <algorithm>
#include <cstdio>

#include "tests/core/core_test.h"
#include "tests/support/allocations.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::Platform;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::IsEmpty;
using ::testing::Not;

// Documents of other shapes ---------------------------------------------------

enum class Operation { kAdd, kGet, kEdit, kDel };

struct Shape {
  const char* name;
  Operation operation;
  const char* doc;
};

void PrintTo(const Shape& shape, std::ostream* out) {
  *out << shape.doc;
}

class ShapeTest : public CoreTest, public ::testing::WithParamInterface<Shape> {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_clientInfo");
    Engine::onExec([this](const std::string& sql) { ran.push_back(sql); });
  }

  bool run() {
    switch (GetParam().operation) {
      case Operation::kAdd:
        return store->DBAdd(doc);
      case Operation::kGet:
        return store->DBGet(doc, &rows);
      case Operation::kEdit:
        return store->DBEdit(doc);
      default:
        return store->DBDel(doc);
    }
  }

  std::optional<Table> store;
  Json::Value doc = json(GetParam().doc);
  Json::Value rows = json("['untouched']");
  std::vector<std::string> ran;
};

TEST_P(ShapeTest, IsRefusedWithoutAStatementOrALine) {
  EXPECT_FALSE(run());
  expectError(*store, -2, "Bad parameters");
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_THAT(Platform::encrypted(), IsEmpty());
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_P(ShapeTest, LeavesTheCallersDocuments) {
  run();
  EXPECT_EQ(doc, json(GetParam().doc));
  EXPECT_EQ(rows, json("['untouched']"));
}

const Shape kShapes[] = {
    {"AddOfAnArray", Operation::kAdd, "['a']"},
    {"AddOfAnEmptyArray", Operation::kAdd, "[]"},
    {"AddOfAText", Operation::kAdd, "'a'"},
    {"AddOfANumber", Operation::kAdd, "7"},
    {"AddOfAnObjectValue", Operation::kAdd, "{'scope': {'a': '1'}}"},
    {"AddOfAnArrayValue", Operation::kAdd, "{'scope': ['a']}"},
    {"AddOfAnArraySecret", Operation::kAdd, "{'client_id': []}"},
    {"GetOfAnArray", Operation::kGet, "[]"},
    {"GetOfAText", Operation::kGet, "'condition'"},
    {"GetWithATextCondition", Operation::kGet, "{'condition': 'id=1'}"},
    {"GetWithAnArrayCondition", Operation::kGet, "{'condition': ['id']}"},
    {"GetWithABooleanCondition", Operation::kGet, "{'condition': true}"},
    {"GetWithANestedCondition", Operation::kGet, "{'condition': {'id': {'a': '1'}}}"},
    {"GetWithAnObjectLike", Operation::kGet, "{'condition_like': {}}"},
    {"GetWithAnArrayLike", Operation::kGet, "{'condition_like': ['1']}"},
    {"GetWithAnObjectOption", Operation::kGet, "{'option': {'limit': '1'}}"},
    {"GetWithAnArrayOption", Operation::kGet, "{'option': []}"},
    {"EditOfAnArray", Operation::kEdit, "[{'modified': {'a': '1'}}]"},
    {"EditWithATextCondition", Operation::kEdit, "{'condition': 'x', 'modified': {'scope': 'a'}}"},
    {"EditWithANestedCondition", Operation::kEdit,
     "{'condition': {'id': []}, 'modified': {'scope': 'a'}}"},
    {"EditWithATextModified", Operation::kEdit, "{'modified': 'scope'}"},
    {"EditWithAnArrayModified", Operation::kEdit, "{'modified': ['scope']}"},
    {"EditWithANestedModified", Operation::kEdit, "{'modified': {'scope': {}}}"},
    {"DelOfANumber", Operation::kDel, "7"},
    {"DelOfAnArray", Operation::kDel, "[]"},
    {"DelWithANumberCondition", Operation::kDel, "{'condition': 7}"},
    {"DelWithAnArrayCondition", Operation::kDel, "{'condition': []}"},
    {"DelWithANestedCondition", Operation::kDel, "{'condition': {'client_id': {}}}"},
};

INSTANTIATE_TEST_SUITE_P(Core, ShapeTest, ::testing::ValuesIn(kShapes), support::CaseName());

class ExceptionsTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_clientInfo");
  }

  std::optional<Table> store;
};

TEST_F(ExceptionsTest, RefusedDocumentIsTracedByItsEntryAlone) {
  Json::Value doc = json("[]");
  EXPECT_THAT(traced(-1, [&] { store->DBDel(doc); }), ElementsAre("==> DBDel"));
}

TEST_F(ExceptionsTest, NullResultIsRefused) {
  Json::Value request = json("{'condition': {'client_id': 'a'}}");
  EXPECT_FALSE(store->DBGet(request, nullptr));
  expectError(*store, -2, "Bad parameters");
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
  EXPECT_EQ(request, json("{'condition': {'client_id': 'a'}}"));
}

TEST_F(ExceptionsTest, ArgumentThatTheCallbackCannotFillIsRefused) {
  Json::Value object(Json::objectValue);
  EXPECT_EQ(store->DBCmd("SELECT 1", OAUTHDBBasic::TabCountCallback, &object), 0);
  expectError(*store, -2, "Bad parameters");
  Json::Value text("a");
  EXPECT_EQ(store->DBCmd("SELECT 1", OAUTHDBBasic::IsTabExistCallback, &text), 0);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(ExceptionsTest, BuildersTakeAnyDocument) {
  for (const char* text : {"[]", "['a']", "7", "'a'", "true", "{'a': []}", "{'a': {'b': 1}}",
                           "{'modified': 7, 'condition': ['x']}"}) {
    const Json::Value doc = json(text);
    EXPECT_NO_THROW(store->GetInsertParam(doc)) << text;
    EXPECT_NO_THROW(store->ConcateParam(doc, ", ")) << text;
    EXPECT_NO_THROW(store->GetConditionParam(doc)) << text;
    EXPECT_NO_THROW(store->GetUpdateParam(doc)) << text;
  }
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

/// A clause that cannot be built must not widen the statement to every row.
TEST_F(ExceptionsTest, ConditionOfAnotherShapeNeverReadsAsNone) {
  for (const char* text : {"7", "'a'", "true", "['a']"}) {
    EXPECT_EQ(store->GetConditionParam(json(text)).rfind(" WHERE ", 0), 0U) << text;
  }
}

TEST_F(ExceptionsTest, EncryptionTakesAnyDocument) {
  for (const char* text : {"[]", "['client_id']", "7", "'client_id'", "true"}) {
    Json::Value doc = json(text);
    EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1) << text;
    EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(doc), 1) << text;
    EXPECT_EQ(doc, json(text));
  }
}

TEST_F(ExceptionsTest, SecretWithoutATextFormFails) {
  for (const char* text : {"{'client_id': []}", "{'client_id': {}}", "{'client_secret': ['a']}"}) {
    Json::Value doc = json(text);
    EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 0) << text;
    EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(doc), 0) << text;
    EXPECT_EQ(doc, json(text));
  }
}

// Memory ----------------------------------------------------------------------

constexpr int kNoMemory = 7;

const Line kUnexpected{kError, "Unexpected failure[%s]", "Unexpected failure[std::bad_alloc]"};

/// Lets each allocation of an operation fail in turn, starting each time from
/// the same file and a fresh object.
class MemoryTest : public CoreTest {
 protected:
  static constexpr char kRows[] =
      "DELETE FROM oauth_clientInfo;"
      "INSERT INTO oauth_clientInfo VALUES('1', '<a>', '<s>', 'https://a', 'read', 'app', 1)";

  using Run = std::function<bool(Table&)>;

  static void prepare(std::optional<Table>& store) {
    store.emplace("oauth_clientInfo");
    sql(kRows);
    SystemLog::clear();
  }

  /// Returns how many allocations failed.
  static int failEach(const Run& run, const std::function<void()>& checkFile) {
    for (int nth = 1;; ++nth) {
      std::optional<Table> store;
      prepare(store);
      bool succeeded = false;
      {
        const support::FailingAllocation failing(nth);
        succeeded = run(*store);
      }
      if (!support::FailingAllocation::happened()) {
        EXPECT_TRUE(succeeded);
        expectNoError(*store);
        EXPECT_THAT(SystemLog::lines(), IsEmpty());
        return nth - 1;
      }
      EXPECT_FALSE(succeeded) << "allocation " << nth;
      expectError(*store, kNoMemory, "out of memory");
      expectOneUnexpectedLine(nth);
      checkFile();
    }
  }

  /// At most the operation's own line follows, and no other says why.
  static void expectOneUnexpectedLine(int nth) {
    const std::vector<Line> written = lines();
    ASSERT_THAT(written, Not(IsEmpty())) << "allocation " << nth;
    EXPECT_EQ(written[0], kUnexpected) << "allocation " << nth;
    if (written.size() == 1) return;
    EXPECT_EQ(written.size(), 2U) << "allocation " << nth;
    EXPECT_THAT(written[1].message, EndsWith(" failed[oauth_clientInfo]")) << "allocation " << nth;
  }

  static void expectUntouched() {
    EXPECT_EQ(sqlText("SELECT group_concat(client_id || scope || id) FROM oauth_clientInfo"),
              "<a>read1");
  }
};

TEST_F(MemoryTest, AddFailsWholly) {
  const auto add = [](Table& store) {
    Json::Value row;
    {
      const support::Uncounted preparing;
      row = json(
          "{'enable': '1', 'client_id': 'a client identifier of some length',"
          "'client_secret': 's', 'redirect_uri': 'https://a', 'scope': 'r',"
          "'display_name': 'd'}");
    }
    return store.DBAdd(row);
  };
  EXPECT_GT(failEach(add, expectUntouched), 3);
}

TEST_F(MemoryTest, GetFails) {
  const auto get = [](Table& store) {
    Json::Value request;
    Json::Value rows;
    {
      const support::Uncounted preparing;
      request = json("{'condition': {'client_id': 'a'}, 'option': 'ORDER BY display_name DESC'}");
    }
    return store.DBGet(request, &rows);
  };
  EXPECT_GT(failEach(get, expectUntouched), 10);
}

TEST_F(MemoryTest, EditFailsWholly) {
  const auto edit = [](Table& store) {
    Json::Value request;
    {
      const support::Uncounted preparing;
      request = json("{'condition': {'client_id': 'a'}, 'modified': {'scope': 'a longer scope'}}");
    }
    return store.DBEdit(request);
  };
  EXPECT_GT(failEach(edit, expectUntouched), 3);
}

TEST_F(MemoryTest, DelFailsWholly) {
  const auto del = [](Table& store) {
    Json::Value request;
    {
      const support::Uncounted preparing;
      request = json("{'condition': {'client_id': 'a client identifier'}}");
      request["condition"]["client_id"] = "a";
    }
    return store.DBDel(request);
  };
  EXPECT_GT(failEach(del, expectUntouched), 2);
}

TEST_F(MemoryTest, CountFails) {
  const auto count = [](Table& store) {
    Json::Value counts;
    return store.DBGetRowCount(counts) != 0;
  };
  EXPECT_GT(failEach(count, expectUntouched), 2);
}

TEST_F(MemoryTest, DropFails) {
  const auto drop = [](Table& store) { return store.DBDrop() != 0; };
  EXPECT_GT(failEach(drop, expectUntouched), 0);
}

TEST_F(MemoryTest, QuestionForATableFails) {
  const std::string name = "oauth_clientInfo";
  const auto ask = [&](Table& store) { return store.IsDBTabExist(name) != 0; };
  EXPECT_GT(failEach(ask, expectUntouched), 1);
}

/// A row maximum that cannot be checked reads as reached.
TEST_F(MemoryTest, RowMaxReadsAsReached) {
  std::optional<Table> store;
  prepare(store);
  int below = -1;
  const int failed =
      support::failEachAllocation([&] { below = store->DBCheckRowMax(100); },
                                  [&](int nth) {
                                    EXPECT_EQ(below, 0) << "allocation " << nth;
                                    expectError(*store, kNoMemory, "out of memory");
                                    EXPECT_EQ(SystemLog::count(kUnexpected.message), 1);
                                    SystemLog::clear();
                                  });
  EXPECT_GT(failed, 2);
  EXPECT_EQ(below, 1);
}

TEST_F(MemoryTest, CreationFails) {
  std::optional<Table> store;
  prepare(store);
  const std::string statement = "CREATE TABLE IF NOT EXISTS oauth_log(a);";
  int created = -1;
  support::failEachAllocation([&] { created = store->CreateDBTab(statement); },
                              [&](int /*nth*/) { EXPECT_EQ(created, 0); });
  EXPECT_EQ(created, 1);
}

TEST_F(MemoryTest, BuildersGiveATextThatTheEngineRefuses) {
  std::optional<Table> store;
  prepare(store);
  Json::Value row;
  row["scope"] = std::string(100, 'x');
  Json::Value request;
  request["modified"] = row;
  request["condition"] = row;

  std::string text;
  const auto refused = [&](const std::string& head) {
    return [&, head](int nth) {
      EXPECT_EQ(store->DBCmd(head + text + ";", nullptr, nullptr), 0) << nth << ": " << text;
    };
  };
  const std::string table = "oauth_clientInfo";
  EXPECT_GT(support::failEachAllocation([&] { text = store->GetInsertParam(row); },
                                        refused("INSERT INTO " + table)),
            1);
  EXPECT_GT(support::failEachAllocation([&] { text = store->GetConditionParam(row); },
                                        refused("DELETE FROM " + table)),
            1);
  EXPECT_GT(support::failEachAllocation([&] { text = store->GetUpdateParam(request); },
                                        refused("UPDATE " + table)),
            1);
  EXPECT_GT(support::failEachAllocation([&] { text = store->ConcateParam(row, " AND "); },
                                        refused("DELETE FROM " + table + " WHERE ")),
            1);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_clientInfo WHERE scope='read'"), "1");
}

TEST_F(MemoryTest, EncryptionFailsWithItsOneLine) {
  const Json::Value clear = json("{'client_id': 'a', 'client_secret': 's'}");
  Platform::useCipher(
      [](const char* /*text*/, char* out, std::size_t /*size*/) {
        std::fill_n(out, 100, 'x');
        return 1;
      },
      {});
  Json::Value doc = clear;
  int done = -1;
  const int failed = support::failEachAllocation([&] { done = OAUTHDBBasic::ParamEncrypt(doc); },
                                                 [&](int /*nth*/) {
                                                   EXPECT_EQ(done, 0);
                                                   EXPECT_THAT(lines(), ElementsAre(kUnexpected));
                                                   SystemLog::clear();
                                                   doc = clear;
                                                 });
  EXPECT_GT(failed, 1);
  EXPECT_EQ(done, 1);
}

// Construction ----------------------------------------------------------------

class ConstructionTest : public MemoryTest {
 protected:
  /// Constructs with each allocation failing in turn, until one gets by.
  /// Returns how many failed.
  static int failEachConstruction(const std::function<void()>& prepareFile) {
    const std::string table = "oauth_clientInfo";
    for (int nth = 1;; ++nth) {
      prepareFile();
      SystemLog::clear();
      std::optional<Table> store;
      {
        const support::FailingAllocation failing(nth);
        store.emplace(table);
      }
      if (!support::FailingAllocation::happened()) return nth - 1;
      expectError(*store, kNoMemory, "out of memory");
      EXPECT_EQ(SystemLog::count(kUnexpected.message), 1) << "allocation " << nth;
      EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 0) << "allocation " << nth;
    }
  }
};

TEST_F(ConstructionTest, OnAnExistingFileLeavesAnObjectThatIsNotReady) {
  { const OAUTHDBBasic store; }
  const std::string file = readFile(kDatabase);
  EXPECT_GT(failEachConstruction([] {}), 3);
  EXPECT_EQ(readFile(kDatabase), file);
}

TEST_F(ConstructionTest, OnAnAbsentFileLeavesAnObjectThatIsNotReady) {
  EXPECT_GT(failEachConstruction([] { std::remove(kDatabase); }), 3);
}

TEST_F(ConstructionTest, DestructionNeedsNoMemory) {
  std::optional<Table> store;
  prepare(store);
  {
    const support::FailingAllocation failing(1);
    store.reset();
  }
  EXPECT_FALSE(support::FailingAllocation::happened());
  EXPECT_EQ(Engine::closed(), Engine::opened());
}

TEST_F(MemoryTest, AccessorsNeverThrow) {
  std::optional<Table> store;
  prepare(store);
  const std::string text(100, 'x');
  support::failEachAllocation(
      [&] { store->SetErrMsg(text); },
      [&](int /*nth*/) { expectError(*store, kNoMemory, "out of memory"); });
  EXPECT_EQ(store->GetErrMsg(), text);
  std::string copy = "untouched";
  support::failEachAllocation([&] { copy = store->GetErrMsg(); },
                              [&](int /*nth*/) { EXPECT_EQ(copy, ""); });
  EXPECT_EQ(copy, text);
}

TEST_F(MemoryTest, TableNameThatCannotBeKeptEndsTheObject) {
  std::optional<Table> store;
  prepare(store);
  const std::string name(100, 'x');
  {
    const support::FailingAllocation failing(1);
    store->SetTabName(name);
  }
  ASSERT_TRUE(support::FailingAllocation::happened());
  expectError(*store, kNoMemory, "out of memory");
  EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 0);
  EXPECT_THAT(lines(), ElementsAre(kUnexpected, plain("DB is not ready!!")));
}

// The engine's own memory -----------------------------------------------------

class EngineMemoryTest : public ExceptionsTest {
 protected:
  void TearDown() override {
    sqlite3_hard_heap_limit64(0);
    ExceptionsTest::TearDown();
  }
};

TEST_F(EngineMemoryTest, StatementWithoutMemoryFailsAsAnyOther) {
  const std::string big(1 << 20, 'x');
  sqlite3_hard_heap_limit64(sqlite3_memory_used() + 65536);
  EXPECT_EQ(store->DBCmd("SELECT '" + big + "' || '" + big + "'", nullptr, nullptr), 0);
  sqlite3_hard_heap_limit64(0);
  expectError(*store, kNoMemory, "out of memory");
  EXPECT_THAT(lines(), ElementsAre(runFailed("out of memory", 7)));
  EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 1);
}

}  // namespace
