#include "grants/rows/notes.h"

#include <charconv>
#include <cstdint>
#include <string_view>

#include "grants/audit.h"
#include "grants/rows/quotes.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr std::size_t kShortForm = 8;
constexpr std::string_view kCountStart = " (";
constexpr std::string_view kCountEnd = " times)";

std::string counted(long long times) {
  return std::string(kCountStart) + std::to_string(times) + std::string(kCountEnd);
}

/// How often an entry with this behind it has been written; 0 when it is
/// another's.
long long timesIn(std::string_view rest) {
  if (rest.empty()) return 1;
  if (rest.substr(0, kCountStart.size()) != kCountStart) return 0;
  const std::string_view digits = rest.substr(kCountStart.size());
  std::uint32_t times = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), times);
  return counted(times) == rest ? times : 0;
}

/// Where the count of an entry begins: behind its detail, when it has one. An
/// entry that only begins so has no count, wherever it is looked for.
std::size_t countAt(std::string_view text, std::size_t subject, bool hasDetail) {
  if (!hasDetail) return subject;
  const std::size_t end = text.rfind(']');
  return end == std::string_view::npos ? 0 : end + 1;
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
    const long long times = timesIn(std::string_view(text).substr(at));
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

/// Not by the log's own Add: that drops whole seconds, oldest first by the
/// clock, and so, after one that was set back, the entry itself.
void write(Store& store, const std::string& text) {
  Json::Value row;
  row[names::kMsg] = doubled(text);
  row[names::kTimestamp] = Json::Value();
  row[names::kId] = Json::Value();
  Store::insert(store.log, row);
  const std::string oldest = "(SELECT id FROM " + std::string(names::kLogTable) + " " +
                             kNewestFirst + " LIMIT 1 OFFSET " +
                             std::to_string(getTableRowMax(names::kLogMax)) + ")";
  store.eraseWhere(names::kLogTable, "id<=" + oldest);
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
  if (!countAgain(store, subject, !detail.empty())) write(store, subject + detail);
}

void noteEnd(Store& store, const Subject& application, const std::optional<std::string>& user,
             const std::string& by, const std::string& what) {
  const std::string word = applicationWord(application.name, application.identifier);
  if (application.registeredItself) {
    note(store, what + " of one that registered itself" + userWord(user) + by, word);
  } else {
    note(store, what + word + userWord(user) + by);
  }
}

}  // namespace KELDOAUTHSERVER::grants::rows
