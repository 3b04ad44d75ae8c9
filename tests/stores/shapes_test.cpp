// Documents of another shape than an operation needs, and null pointers.

#include <gmock/gmock.h>
#include <json/value.h>

#include <functional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using support::id64;
using support::Row;
using ::testing::Contains;
using ::testing::Each;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;

namespace {

// Result documents that cannot take members ---------------------------------------

struct WriterCase {
  const char* name;
  std::function<Aftermath(Json::Value& out)> run;
};
void PrintTo(const WriterCase& writer, std::ostream* out) {
  *out << writer.name;
}

struct ShapeCase {
  const char* name;
  Json::Value document;
};
void PrintTo(const ShapeCase& shape, std::ostream* out) {
  *out << shape.name;
}

Json::Value arrayOfOne() {
  Json::Value document(Json::arrayValue);
  document.append("element");
  return document;
}

const WriterCase kWriters[] = {
    {"ClientAdd", [](Json::Value& out) { return addClient({}, out); }},
    {"ClientAddGenerated", [](Json::Value& out) { return addGeneratedClient({}, out); }},
    {"ClientAddWithSecret", [](Json::Value& out) { return addClientWithSecret({}, out); }},
    {"CodeAdd", [](Json::Value& out) { return addCode({}, out); }},
    {"CodeIssue", [](Json::Value& out) { return issueCode({}, out); }},
    {"TokenAdd", [](Json::Value& out) { return addToken({}, out); }},
    {"TokenIssue", [](Json::Value& out) { return issueToken({}, out); }},
    {"VerifyValidToken",
     [](Json::Value& out) {
       return onTokens([&](auto& store) { return store.Verify(id64('a'), out); });
     }},
    {"VerifyUnknownToken",
     [](Json::Value& out) {
       return onTokens([&](auto& store) { return store.Verify(id64('z'), out); });
     }},
    {"VerifyShortToken",
     [](Json::Value& out) {
       return onTokens([&](auto& store) { return store.Verify("short", out); });
     }},
};

const ShapeCase kShapes[] = {
    {"Array", arrayOfOne()},       {"EmptyArray", Json::Value(Json::arrayValue)},
    {"Text", Json::Value("text")}, {"Number", Json::Value(7)},
    {"Real", Json::Value(7.5)},    {"Boolean", Json::Value(true)},
};

class WrongShapeTest : public OperationsTest,
                       public ::testing::WithParamInterface<std::tuple<WriterCase, ShapeCase>> {
 protected:
  static const WriterCase& writer() { return std::get<0>(GetParam()); }
  static const ShapeCase& shape() { return std::get<1>(GetParam()); }
};

TEST_P(WrongShapeTest, IsRefusedBeforeAnythingIsWritten) {
  const std::vector<Row> before = everything();
  Json::Value out = shape().document;
  const Aftermath outcome = writer().run(out);
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.statements, Each(Not(StartsWith("INSERT"))));
  EXPECT_EQ(out, shape().document);
  EXPECT_EQ(everything(), before);
}

INSTANTIATE_TEST_SUITE_P(Stores, WrongShapeTest,
                         ::testing::Combine(::testing::ValuesIn(kWriters),
                                            ::testing::ValuesIn(kShapes)),
                         [](const auto& row) {
                           return std::string(std::get<0>(row.param).name) + "_" +
                                  std::get<1>(row.param).name;
                         });

using WrongShapeOrderTest = OperationsTest;

TEST_F(WrongShapeOrderTest, FullTableIsReportedFirst) {
  writeSettings(R"({"token_max": 1})");
  Json::Value out("text");
  EXPECT_TRUE(failed(addToken({}, out), -5, "Token Table is full"));
}

TEST_F(WrongShapeOrderTest, BadAddressIsReportedFirst) {
  Json::Value out("text");
  EXPECT_TRUE(failedSilently(addCode({{"ip", "nonsense"}}, out)));
}

TEST_F(WrongShapeOrderTest, EmptyDocumentBecomesAnObject) {
  for (Json::Value out : {Json::Value(), Json::Value(Json::objectValue)}) {
    startAfresh();
    EXPECT_TRUE(succeeded(addCode({}, out)));
    EXPECT_TRUE(out.isObject());
  }
}

// Look-ups without a place for the rows ---------------------------------------------

struct LookUpCase {
  const char* name;
  std::function<Aftermath(Json::Value* rows)> run;
};
void PrintTo(const LookUpCase& c, std::ostream* out) {
  *out << c.name;
}

const LookUpCase kLookUps[] = {
    {"Client",
     [](Json::Value* rows) {
       return onClients([&](auto& store) { return store.Get(id64('c'), rows); });
     }},
    {"ClientById",
     [](Json::Value* rows) {
       return onClients([&](auto& store) { return store.Get(1LL, rows); });
     }},
    {"Clients",
     [](Json::Value* rows) { return onClients([&](auto& store) { return store.Get(rows); }); }},
    {"Code",
     [](Json::Value* rows) {
       return onCodes([&](auto& store) { return store.Get(id64('g'), rows); });
     }},
    {"CodeById",
     [](Json::Value* rows) { return onCodes([&](auto& store) { return store.Get(1LL, rows); }); }},
    {"Codes",
     [](Json::Value* rows) { return onCodes([&](auto& store) { return store.Get(rows); }); }},
    {"AccessToken",
     [](Json::Value* rows) {
       return onTokens([&](auto& store) { return store.GetWithAccessToken(id64('a'), rows); });
     }},
    {"RefreshToken",
     [](Json::Value* rows) {
       return onTokens([&](auto& store) { return store.GetWithRefreshToken(id64('r'), rows); });
     }},
    {"TokenById",
     [](Json::Value* rows) { return onTokens([&](auto& store) { return store.Get(1LL, rows); }); }},
    {"Tokens",
     [](Json::Value* rows) { return onTokens([&](auto& store) { return store.Get(rows); }); }},
    {"Log",
     [](Json::Value* rows) { return onLog([&](auto& store) { return store.Get("", "", rows); }); }},
    {"FilteredLog",
     [](Json::Value* rows) {
       return onLog([&](auto& store) { return store.Get("hello", "LIMIT 1", rows); });
     }},
};

class LookUpShapeTest : public OperationsTest, public ::testing::WithParamInterface<LookUpCase> {};

TEST_P(LookUpShapeTest, NullPointerIsRefused) {
  const Aftermath outcome = GetParam().run(nullptr);
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.statements, IsEmpty());
}

TEST_P(LookUpShapeTest, AnyDocumentBecomesAnArray) {
  for (const ShapeCase& shape : kShapes) {
    Json::Value rows = shape.document;
    EXPECT_TRUE(succeeded(GetParam().run(&rows))) << shape.name;
    ASSERT_TRUE(rows.isArray()) << shape.name;
    ASSERT_FALSE(rows.empty()) << shape.name;
    for (const Json::Value& row : rows) EXPECT_TRUE(row.isObject()) << shape.name;
  }
}

TEST_P(LookUpShapeTest, EveryValueIsAText) {
  Json::Value rows;
  ASSERT_TRUE(succeeded(GetParam().run(&rows)));
  for (const Json::Value& row : rows) {
    for (const Json::Value& value : row) EXPECT_TRUE(value.isString()) << row.toStyledString();
  }
}

INSTANTIATE_TEST_SUITE_P(Stores, LookUpShapeTest, ::testing::ValuesIn(kLookUps),
                         ::testing::PrintToStringParamName());

// Documents of the caller's -----------------------------------------------------------

using SharedDocumentTest = OperationsTest;

TEST_F(SharedDocumentTest, OneDocumentServesOneOperationAfterAnother) {
  Json::Value out;
  ASSERT_TRUE(succeeded(addGeneratedClient({}, out)));
  ASSERT_TRUE(succeeded(issueCode({}, out)));
  ASSERT_TRUE(succeeded(issueToken({}, out)));
  EXPECT_THAT(out.getMemberNames(),
              ::testing::ElementsAre("access_token", "client_id", "client_secret", "code",
                                     "refresh_token"));
}

}  // namespace
