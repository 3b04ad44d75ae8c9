#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// A document with one member of any text.
Json::Value pair(const std::string& column, const Json::Value& value) {
  Json::Value doc;
  doc[column] = value;
  return doc;
}

struct Clause {
  const char* name;
  Json::Value doc;
  std::string sql;
};

void PrintTo(const Clause& clause, std::ostream* out) {
  *out << clause.doc;
}

class ClauseTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace();
  }

  std::optional<OAUTHDBBasic> store;
};

class ClauseTableTest : public ClauseTest, public ::testing::WithParamInterface<Clause> {
 protected:
  void TearDown() override {
    expectNoError(*store);
    EXPECT_THAT(SystemLog::lines(), IsEmpty());
    ClauseTest::TearDown();
  }

  const Json::Value doc = GetParam().doc;
};

// INSERT ----------------------------------------------------------------------

class InsertClauseTest : public ClauseTableTest {};

TEST_P(InsertClauseTest, IsColumnsAndValues) {
  EXPECT_EQ(store->GetInsertParam(doc), GetParam().sql);
  EXPECT_EQ(doc, GetParam().doc);
}

const Clause kInserts[] = {
    {"EmptyRow", json("{}"), " () VALUES()"},
    {"NullRow", Json::Value(), " () VALUES()"},
    {"OneColumn", json("{'a': '1'}"), " (a) VALUES('1')"},
    {"SortedByName", json("{'b': '2', 'a': '1', 'B': '3', '_': '4'}"),
     " (B, _, a, b) VALUES('3', '4', '1', '2')"},
    {"Example",
     [] {
       Json::Value row = pair("msg", "it's");
       row["timestamp"] = Json::Value();
       return row;
     }(),
     " (msg, timestamp) VALUES('it''s', strftime('%s','now'))"},
    {"NullIsNull", json("{'id': null, 'msg': 'a'}"), " (id, msg) VALUES(NULL, 'a')"},
    {"NullOfALookalikeColumn", json("{'Timestamp': null, 'timestamp2': null, 'xtimestamp': null}"),
     " (Timestamp, timestamp2, xtimestamp) VALUES(NULL, NULL, NULL)"},
    {"TimestampWithAValue", json("{'timestamp': '17'}"), " (timestamp) VALUES('17')"},
    {"TimestampWithEmptyText", json("{'timestamp': ''}"), " (timestamp) VALUES('')"},
    {"EmptyText", json("{'a': ''}"), " (a) VALUES('')"},
    {"ColumnGoesInAsItStands", pair("it's, x", "1"), " (it's, x) VALUES('1')"},
    {"Integer", json("{'a': 42, 'b': -7}"), " (a, b) VALUES('42', '-7')"},
    {"Highest", pair("a", Json::Value(Json::UInt64(18446744073709551615U))),
     " (a) VALUES('18446744073709551615')"},
    {"Boolean", json("{'a': true, 'b': false}"), " (a, b) VALUES('true', 'false')"},
    {"QuotesAtBothEnds", pair("a", "'x'"), " (a) VALUES('''x''')"},
};

INSTANTIATE_TEST_SUITE_P(Core, InsertClauseTest, ::testing::ValuesIn(kInserts),
                         support::CaseName());

// Pairs -----------------------------------------------------------------------

class PairsTest : public ClauseTableTest {};

TEST_P(PairsTest, AreJoinedByTheSeparator) {
  EXPECT_EQ(store->ConcateParam(doc, " + "), GetParam().sql);
  EXPECT_EQ(doc, GetParam().doc);
}

const Clause kPairs[] = {
    {"Empty", json("{}"), ""},
    {"NullDocument", Json::Value(), ""},
    {"One", json("{'a': '1'}"), "a='1'"},
    {"SortedByName", json("{'b': '2', 'a': '1', 'ab': '3'}"), "a='1' + ab='3' + b='2'"},
    {"NullValueIsEmptyText", json("{'a': null, 'timestamp': null}"), "a='' + timestamp=''"},
    {"Number", json("{'a': 42}"), "a='42'"},
    {"Boolean", json("{'a': true}"), "a='true'"},
    {"Quote", pair("a", "it's"), "a='it''s'"},
    {"ManyQuotes", pair("a", "'a''b'''"), "a='''a''''b'''''''"},
    {"QuotesAlone", pair("a", "'''"), "a=''''''''"},
    {"OtherQuotesStay", pair("a", "\"`\\"), "a='\"`\\'"},
    {"Separator", pair("a", " + "), "a=' + '"},
    {"Statement", pair("a", "x' OR '1'='1"), "a='x'' OR ''1''=''1'"},
    {"FormatDirectives", pair("a", "%s%n%q"), "a='%s%n%q'"},
    {"InvalidUtf8", pair("a", "\xff'\xfe"), "a='\xff''\xfe'"},
    {"NulByte", pair("a", std::string("x\0'y", 4)), std::string("a='x\0''y'", 9)},
    {"Megabyte", pair("a", std::string(1 << 20, 'x') + "'"),
     "a='" + std::string(1 << 20, 'x') + "'''"},
};

INSTANTIATE_TEST_SUITE_P(Core, PairsTest, ::testing::ValuesIn(kPairs), support::CaseName());

TEST_F(ClauseTest, SeparatorGoesInAsItStands) {
  EXPECT_EQ(store->ConcateParam(json("{'a': '1', 'b': '2'}"), ""), "a='1'b='2'");
  EXPECT_EQ(store->ConcateParam(json("{'a': '1', 'b': '2'}"), "'%s'"), "a='1''%s'b='2'");
}

// WHERE -----------------------------------------------------------------------

class ConditionTest : public ClauseTableTest {};

TEST_P(ConditionTest, IsNothingOrAWhereClause) {
  EXPECT_EQ(store->GetConditionParam(doc), GetParam().sql);
  EXPECT_EQ(doc, GetParam().doc);
}

const Clause kConditions[] = {
    {"NullDocument", Json::Value(), ""},
    {"EmptyObject", json("{}"), ""},
    {"EmptyArray", json("[]"), ""},
    {"Example", json("{'enable': '1', 'client_id': 'abc'}"),
     " WHERE client_id='abc' and enable='1'"},
    {"One", json("{'id': '7'}"), " WHERE id='7'"},
    {"NullValue", json("{'id': null}"), " WHERE id=''"},
};

INSTANTIATE_TEST_SUITE_P(Core, ConditionTest, ::testing::ValuesIn(kConditions),
                         support::CaseName());

// UPDATE ----------------------------------------------------------------------

class UpdateClauseTest : public ClauseTableTest {};

TEST_P(UpdateClauseTest, IsSetAndWhere) {
  EXPECT_EQ(store->GetUpdateParam(doc), GetParam().sql);
  EXPECT_EQ(doc, GetParam().doc);
}

const Clause kUpdates[] = {
    {"Example", json("{'modified': {'state': 'x', 'scope': 'read'}, 'condition': {'id': '7'}}"),
     " SET scope='read', state='x' WHERE id='7'"},
    {"NoCondition", json("{'modified': {'a': '1'}}"), " SET a='1'"},
    {"NullCondition", json("{'modified': {'a': '1'}, 'condition': null}"), " SET a='1'"},
    {"EmptyCondition", json("{'modified': {'a': '1'}, 'condition': {}}"), " SET a='1'"},
    {"NoModified", json("{'condition': {'id': '7'}}"), " SET  WHERE id='7'"},
    {"EmptyRequest", json("{}"), " SET "},
    {"NullRequest", Json::Value(), " SET "},
    {"NullIsEmptyText", json("{'modified': {'a': null, 'timestamp': null}}"),
     " SET a='', timestamp=''"},
    {"OtherKeysAreNotRead",
     json("{'modified': {'a': '1'}, 'condition_like': 'x', 'option': 'LIMIT 1', 'limit': '1'}"),
     " SET a='1'"},
};

INSTANTIATE_TEST_SUITE_P(Core, UpdateClauseTest, ::testing::ValuesIn(kUpdates),
                         support::CaseName());

// Traces ----------------------------------------------------------------------

TEST_F(ClauseTest, BuildersTraceThemselvesAndEachOther) {
  const Json::Value row = json("{'a': '1'}");
  Json::Value request;
  request["modified"] = row;
  request["condition"] = row;
  EXPECT_THAT(traced(8, [&] { store->GetInsertParam(row); }), ElementsAre("==> GetInsertParam"));
  EXPECT_THAT(traced(8, [&] { store->ConcateParam(row, ","); }), ElementsAre("==> ConcateParam"));
  EXPECT_THAT(traced(8, [&] { store->GetConditionParam(row); }),
              ElementsAre("==> GetConditionParam", "==> ConcateParam"));
  EXPECT_THAT(traced(8, [&] { store->GetUpdateParam(request); }),
              ElementsAre("==> GetUpdateParam", "==> ConcateParam", "==> GetConditionParam",
                          "==> ConcateParam"));
}

TEST_F(ClauseTest, EmptyConditionIsTracedWithoutPairs) {
  EXPECT_THAT(tracedLines(8, [&] { store->GetConditionParam(Json::Value()); }),
              ElementsAre(Line{kError, "==> %s", "==> GetConditionParam"}));
}

TEST_F(ClauseTest, BuildersAreSilentAtOtherLevels) {
  const Json::Value request = json("{'modified': {'a': '1'}, 'condition': {'a': '1'}}");
  EXPECT_THAT(traced(1 + 2 + 4,
                     [&] {
                       store->GetInsertParam(request["modified"]);
                       store->GetUpdateParam(request);
                     }),
              IsEmpty());
}

TEST_F(ClauseTest, BuildersEncryptNothing) {
  const Json::Value row = json("{'client_id': 'abc', 'client_secret': 'def'}");
  EXPECT_EQ(store->ConcateParam(row, ", "), "client_id='abc', client_secret='def'");
  EXPECT_THAT(support::Platform::encrypted(), IsEmpty());
}

TEST_F(ClauseTest, BuildersWorkWithoutAConnection) {
  hideFolder();
  OAUTHDBBasic closed;
  EXPECT_EQ(closed.GetInsertParam(json("{'a': '1'}")), " (a) VALUES('1')");
  EXPECT_EQ(closed.GetUpdateParam(json("{'modified': {'a': '1'}}")), " SET a='1'");
}

}  // namespace
