// The store operations that take texts, and what each of them promises about
// its texts.

#ifndef KELDOAUTH_TESTS_FUZZ_STORE_OPERATIONS_H
#define KELDOAUTH_TESTS_FUZZ_STORE_OPERATIONS_H

#include <json/value.h>

#include <cstddef>
#include <string>
#include <vector>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

namespace fuzz {

using Texts = std::vector<std::string>;

struct Stores {
  KELDOAUTHSERVER::OAUTHDBClientInfo clients{KELDOAUTHSERVER::names::kClientInfoTable};
  KELDOAUTHSERVER::OAUTHDBGrantCode codes{KELDOAUTHSERVER::names::kGrantCodeTable};
  KELDOAUTHSERVER::OAUTHDBToken tokens{KELDOAUTHSERVER::names::kTokenTable};
  KELDOAUTHSERVER::OAUTHDBLog log{KELDOAUTHSERVER::names::kLogTable};
};

/// How the file holds an argument.
enum class Stored { kDoubled, kAsGiven };

struct Argument {
  std::string column;
  std::size_t min;
  std::size_t max;
  Stored stored = Stored::kDoubled;
};

constexpr int kNoCode = 0;

/// An operation that writes one row.
struct Change {
  const char* name;
  std::string table;
  std::vector<Argument> arguments;
  int refusalCode;  // kNoCode: a refusal sets none
  bool (*run)(Stores& stores, long long id, const Texts& texts, Json::Value& out);
  std::vector<std::string> generated = {};  // columns that it draws and writes to `out`
};

const std::vector<Change>& insertions();
const std::vector<Change>& edits();

/// An operation that finds one row, and its short form that finds the row's id.
struct LookUp {
  const char* name;
  std::string table;
  Argument argument;
  bool (*rows)(Stores& stores, const std::string& text, Json::Value* rows);
  int (*index)(Stores& stores, const std::string& text);
};

const std::vector<LookUp>& lookUps();

}  // namespace fuzz

#endif  // KELDOAUTH_TESTS_FUZZ_STORE_OPERATIONS_H
