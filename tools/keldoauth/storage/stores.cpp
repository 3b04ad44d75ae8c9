#include "tools/keldoauth/storage/stores.h"

#include <charconv>
#include <optional>
#include <system_error>

#include "core/oauth_errors.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

std::optional<long long> rowId(const std::string& text) {
  long long id = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, id);
  if (error != std::errc() || stop != end || id < 0) return {};
  return id;
}

Json::Value rowByIdentifier(Clients& clients, const std::string& identifier) {
  Json::Value rows(Json::arrayValue);
  if (clients.Get(identifier, &rows) == 0) throw libraryFailure(clients);
  if (rows.empty()) throw notFound("client");
  return rows[0U];
}

/// Why the tables could not be made: the library leaves that to the log, but
/// SQLite says it again of the first thing that it cannot do.
Failure startFailure(OAUTHDBBasic& store, int code, const std::string& message) {
  if (code != errors::kCreateTableFailed.code) return libraryFailure(code, message);
  for (const char* step : {"SELECT * FROM sqlite_master", "BEGIN IMMEDIATE"}) {
    if (store.DBCmdRun(step, nullptr, nullptr) != 0) continue;
    return libraryFailure(store.GetErrCode(), message + ": " + store.GetErrMsg());
  }
  store.DBCmdRun("ROLLBACK", nullptr, nullptr);
  return libraryFailure(code, message);
}

}  // namespace

void requireReady(OAUTHDBBasic& store) {
  if (store.GetErrCode() == errors::kNone.code) return;

  // A start-up step may fail and still leave every table there.
  const int code = store.GetErrCode();
  const std::string message = store.GetErrMsg();
  Json::Value count;
  if (store.DBGetRowCount(count) == 0) throw startFailure(store, code, message);
  store.SetErrCode(errors::kNone.code);
}

Clients::Clients() : OAUTHDBClientInfo(names::kClientInfoTable) {
  requireReady(*this);
}
Codes::Codes() : OAUTHDBGrantCode(names::kGrantCodeTable) {
  requireReady(*this);
}
Tokens::Tokens() : OAUTHDBToken(names::kTokenTable) {
  requireReady(*this);
}
Log::Log() : OAUTHDBLog(names::kLogTable) {
  requireReady(*this);
}

Transaction::Transaction(OAUTHDBBasic& store) : store_(store) {
  if (store_.DBCmd("BEGIN IMMEDIATE", nullptr, nullptr) == 0) throw libraryFailure(store_);
}

Transaction::~Transaction() {
  if (isOpen_) store_.DBCmd("ROLLBACK", nullptr, nullptr);
}

void Transaction::commit() {
  if (store_.DBCmd("COMMIT", nullptr, nullptr) == 0) throw libraryFailure(store_);
  isOpen_ = false;
}

Json::Value requireClient(Clients& clients, const std::string& text) {
  if (text.size() == kIdentifierLength) return rowByIdentifier(clients, text);
  if (const auto id = rowId(text)) return rowById(clients, *id);
  throw Failure(kUsage, "CLIENT is a row id or an identifier of 64 characters");
}

Json::Value requireClient(const std::string& text) {
  Clients clients;
  return requireClient(clients, text);
}

std::string clientIdentifier(const std::string& text) {
  if (text.size() == kIdentifierLength) return text;
  return requireClient(text)[names::kClientId].asString();
}

}  // namespace tool
