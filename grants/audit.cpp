#include "grants/audit.h"

#include <algorithm>

#include "grants/rows/checks.h"
#include "grants/rows/notes.h"
#include "grants/rows/quotes.h"
#include "grants/rows/store.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

constexpr std::size_t kLongestWhat = 64;

void narrow(std::string& condition, const std::string& more) {
  condition += (condition.empty() ? "" : " AND ") + more;
}

std::string conditionOf(const AuditFilter& filter) {
  std::string condition;
  const std::string time = names::kTimestamp;
  if (filter.since) narrow(condition, time + ">=" + std::to_string(*filter.since));
  if (filter.until) narrow(condition, time + "<=" + std::to_string(*filter.until));
  if (!filter.contains.empty()) {
    const std::string pattern = "%" + rows::doubled(filter.contains) + "%";
    narrow(condition, std::string(names::kMsg) + " LIKE " + rows::literal(pattern));
  }
  return condition;
}

}  // namespace

std::vector<AuditEntry> Audit::list(const AuditFilter& filter) const {
  if (rows::hasNul(filter.contains)) return {};
  const std::string tail = std::string(rows::kNewestFirst) + " LIMIT " +
                           std::to_string(std::max(filter.most, 0)) + " OFFSET " +
                           std::to_string(std::max(filter.skipped, 0));
  std::vector<AuditEntry> entries;
  for (const Json::Value& row : Store::rowsWhere(store_.log, conditionOf(filter), tail)) {
    entries.push_back({decimalValue(row[names::kId]), decimalValue(row[names::kTimestamp]),
                       rows::undoubled(row[names::kMsg].asString())});
  }
  return entries;
}

void Audit::record(const std::string& what, const Actor& by) {
  Whole whole(store_);
  rows::note(store_, harmless(what.substr(0, kLongestWhat)) + rows::actorWord(by));
  whole.commit();
}

long long Audit::clear(const Actor& by) {
  Whole whole(store_);
  const long long gone = store_.countErased(names::kLogTable);
  rows::note(store_, "Audit log cleared" + rows::actorWord(by));
  whole.commit();
  return gone;
}

}  // namespace KELDOAUTHSERVER::grants
