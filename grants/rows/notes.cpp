#include "grants/rows/notes.h"

#include <charconv>
#include <string_view>

#include "core/oauth_errors.h"
#include "grants/audit.h"
#include "grants/rows/quotes.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr std::size_t kShortForm = 8;
constexpr std::string_view kCountStart = " (";
constexpr std::string_view kCountEnd = " times)";

std::string counted(int times) {
  return std::string(kCountStart) + std::to_string(times) + std::string(kCountEnd);
}

/// How often an entry with this behind it has been written; 0 when it is
/// another's.
int timesIn(std::string_view rest) {
  if (rest.empty()) return 1;
  const std::size_t frame = kCountStart.size() + kCountEnd.size();
  if (rest.size() <= frame || rest.substr(0, kCountStart.size()) != kCountStart) return 0;
  const std::string_view digits = rest.substr(kCountStart.size(), rest.size() - frame);
  int times = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), times);
  return counted(times) == rest ? times : 0;
}

/// Where the count of an entry begins: behind its detail, when it has one.
std::size_t countAt(std::string_view text, std::size_t subject, bool hasDetail) {
  if (!hasDetail) return subject;
  const std::size_t end = text.rfind(']');
  return end == std::string_view::npos || end < subject ? text.size() : end + 1;
}

/// Entries of the subject, newest first. The log's time is the database's.
Json::Value recent(Store& store, const std::string& subject) {
  const std::string now = "CAST(strftime('%s','now') AS INTEGER)";
  const std::string isRecent = std::string(names::kTimestamp) + " BETWEEN " + now + "-" +
                               std::to_string(store.policy.auditPause) + " AND " + now;
  return Store::rowsWhere(store.log, isRecent + " AND " + beginsWith(names::kMsg, doubled(subject)),
                          kNewestFirst);
}

bool countAgain(Store& store, const std::string& subject, bool hasDetail) {
  for (const Json::Value& row : recent(store, subject)) {
    const std::string text = undoubled(row[names::kMsg].asString());
    const std::size_t at = countAt(text, subject.size(), hasDetail);
    const int times = timesIn(std::string_view(text).substr(at));
    if (times == 0) continue;
    Json::Value condition;
    condition[names::kId] = row[names::kId];
    condition[names::kMsg] = row[names::kMsg];
    Json::Value modified;
    modified[names::kMsg] = doubled(text.substr(0, at) + counted(times + 1));
    return Store::change(store.log, condition, modified);
  }
  return false;
}

}  // namespace

std::string applicationWord(const std::optional<ApplicationName>& name,
                            const std::string& identifier) {
  return "[" + harmless(name ? name->text() : "removed") + " " +
         harmless(identifier.substr(0, kShortForm)) + "]";
}

std::string userWord(const std::optional<std::string>& user) {
  return user ? " for [" + harmless(*user) + "]" : "";
}

std::string actorWord(const Actor& by) {
  return " by [" + harmless(by.text()) + "]";
}

void note(Store& store, const std::string& subject, const std::string& detail) {
  if (countAgain(store, subject, !detail.empty())) return;
  store.log.SetErrCode(errors::kNone.code);
  store.log.SetErrMsg("");
  if (store.log.Add(subject + detail) == 0) {
    throw Trouble(store.log.GetErrCode(), store.log.GetErrMsg());
  }
}

}  // namespace KELDOAUTHSERVER::grants::rows
