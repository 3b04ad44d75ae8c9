#include "grants/rows/room_rules.h"

#include <syslog.h>

#include <algorithm>

#include "core/oauth_errors.h"
#include "grants/rows/digest.h"
#include "grants/rows/quotes.h"
#include "grants/rows/read_rows.h"
#include "grants/rows/registry_words.h"
#include "grants/rows/state.h"
#include "grants/texts.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr char kSource[] = "grants";
constexpr int kFullLine = 10;

/// Conditions that every row meets, and none.
constexpr char kAll[] = "1";
constexpr char kNone[] = "0";

/// Ids above are another program's doing; ours stay where the next is free.
constexpr char kOrdinaryId[] = "4611686018427387904";

std::string expiry() {
  return "CAST(" + std::string(names::kExpiredTime) + " AS INTEGER)";
}

/// When a row was issued or refreshed last. Of another program's row that is its
/// expiry less the lifetime that the settings give.
std::string renewal(const char* digested, const char* lifetimeKey) {
  return "CASE WHEN substr(" + std::string(digested) + ",1,7)='sha256:' THEN " + issuedTime() +
         " ELSE " + expiry() + "-" + std::to_string(getExpiredPeriod(lifetimeKey)) + " END";
}

/// What an insertion asks of its table, in conditions of SQL.
struct Claim {
  const char* table;
  const char* limitKey;
  OAUTHError whenFull;
  std::string isDead;
  std::string isOfPair;  // one user with one application
  std::string isOfUser;
  std::string isOfApplication;
  std::string givesWay;    // what of one's own goes beyond a bound
  std::string (*order)();  // and what of it first; asks the settings
  std::string yields;      // what of anybody's goes when the table is full
  int pairBound;
};

struct Crowd {
  long long rows;
  long long ofPair;
  long long ofUser;
  long long ofApplication;
};

/// Only a row of the user or of the application is looked at closely, so that
/// the others, nearly all in a full table, cost a comparison or two each.
Crowd count(Store& store, const Claim& claim) {
  const std::string from = std::string(" FROM ") + claim.table;
  const std::vector<long long> counts = store.numbers(
      "SELECT (SELECT COUNT(*)" + from + ")," + countIf(claim.isOfPair) + "," +
      countIf(claim.isOfUser) + "," + countIf(claim.isOfApplication) + from + " WHERE (" +
      claim.isOfUser + " OR " + claim.isOfApplication + ") AND NOT " + claim.isDead);
  return {counts[0], counts[1], counts[2], counts[3]};
}

/// The id that the next row gets.
long long nextId(Store& store, const Claim& claim) {
  return store
      .numbers(std::string("SELECT IFNULL(MAX(id),0)+1 FROM ") + claim.table + " WHERE id<" +
               kOrdinaryId)
      .front();
}

/// Removes the first `most` of the rows that meet `condition`; how many went.
long long evict(Store& store, const Claim& claim, const std::string& condition, long long most) {
  return store.countErased(claim.table, "id IN (SELECT id FROM " + std::string(claim.table) +
                                            " WHERE " + condition + " ORDER BY " + claim.order() +
                                            " LIMIT " + std::to_string(most) + ")");
}

/// What one row more would be too many of, and how many of them have to go.
struct Excess {
  std::string condition;
  long long rows;
};

std::optional<Excess> excessOf(const std::string& condition, long long found, long long bound) {
  const long long most = std::max(bound, 1LL);
  if (found < most) return {};
  return Excess{condition, found - most + 1};
}

/// By the first bound that the crowd has reached.
std::optional<Excess> excessOf(const Claim& claim, const Crowd& crowd, long long limit,
                               const Policy& policy) {
  auto excess = excessOf(claim.isOfPair, crowd.ofPair, claim.pairBound);
  if (!excess) {
    excess = excessOf(claim.isOfUser, crowd.ofUser, limit / std::max(policy.userPart, 1));
  }
  if (!excess) {
    excess = excessOf(claim.isOfApplication, crowd.ofApplication,
                      limit / std::max(policy.applicationPart, 1));
  }
  return excess;
}

/// Whether the claimant's own made room.
bool evictOwn(Store& store, const Claim& claim, const Excess& excess) {
  const std::string own =
      "NOT " + claim.isDead + " AND " + excess.condition + " AND " + claim.givesWay;
  return evict(store, claim, own, excess.rows) == excess.rows;
}

[[noreturn]] void fail(const OAUTHError& whenFull) {
  syslog(LOG_ERR, "%s:%d %s", kSource, kFullLine, whenFull.message);
  throw Trouble(whenFull.code, whenFull.message);
}

void clearDead(Store& store, const Claim& claim, long long rows, long long limit) {
  rows -= store.countErased(claim.table, claim.isDead);
  if (rows < limit) return;
  if (claim.yields.empty()) fail(claim.whenFull);
  const long long needed = rows - limit + 1;
  if (evict(store, claim, claim.yields, needed) < needed) fail(claim.whenFull);
}

/// The crowd that is left; none when the claimant's own would have to go and may
/// not.
std::optional<Crowd> makeRoom(Store& store, const Claim& claim) {
  const long long limit = getTableRowMax(claim.limitKey);
  Crowd crowd = count(store, claim);
  while (const auto excess = excessOf(claim, crowd, limit, store.policy)) {
    if (!evictOwn(store, claim, *excess)) {
      if (claim.givesWay == kAll) Store::failMissed();
      return {};
    }
    crowd = count(store, claim);
  }
  if (crowd.rows >= limit) clearDead(store, claim, crowd.rows, limit);
  return crowd;
}

/// A code's row that this floor wrote, whose state begins so.
std::string isOursAnd(std::string_view start) {
  return "(" + beginsWith(names::kState, start) + " AND " + beginsWith(names::kCode, kMarkStart) +
         ")";
}

std::string isOf(const std::string& application) {
  return isOneOf(names::kClientId, {Store::sealed(application)});
}

std::string tokenOrder() {
  return renewal(names::kAccessToken, names::kTokenExpired) + ",id";
}

std::string codeOrder() {
  return renewal(names::kCode, names::kGrantCodeExpired) + ",id";
}

std::string spentCodesFirst() {
  return isSpentCode() + " DESC," + codeOrder();
}

Claim tokenClaim(const Store& store, const std::string& application, long long now) {
  Claim claim{names::kTokenTable,
              names::kTokenMax,
              errors::kTokenFull,
              "",
              "",
              "",
              "",
              kAll,
              tokenOrder,
              "",
              1};
  claim.isDead = isDeadToken(store.policy, now);
  claim.isOfApplication = isOf(application);
  return claim;
}

Claim loginClaim(const Store& store, const std::string& user, const std::string& application,
                 Evicts evicts, long long now) {
  Claim claim = tokenClaim(store, application, now);
  claim.isOfUser =
      "(" + isOneOf(names::kUsername, spellings(user)) + " AND NOT " + isOwnToken() + ")";
  claim.isOfPair = "(" + claim.isOfUser + " AND " + claim.isOfApplication + ")";
  claim.pairBound = store.policy.sessionsOfOne;
  if (evicts == Evicts::kNothing) claim.givesWay = kNone;
  return claim;
}

/// For one more than those that wait.
bool hasRoomForLogin(Store& store, const Claim& claim, long long waiting) {
  Crowd crowd = count(store, claim);
  crowd.ofPair += waiting;
  crowd.ofUser += waiting;
  crowd.ofApplication += waiting;
  return !excessOf(claim, crowd, getTableRowMax(claim.limitKey), store.policy);
}

}  // namespace

std::string isDeadCode(long long now, long long grace) {
  return "(" + expiry() + "<=" + std::to_string(now - grace) + ")";
}

std::string isSpentCode() {
  return isOursAnd(kSpentStart);
}

std::string isPushedRequest() {
  return isOursAnd(kPushedStart);
}

std::string isDeadToken(const Policy& policy, long long now, long long grace) {
  return "(" + expiry() + "<" + std::to_string(now - grace) + "-CASE WHEN " + isOwnToken() +
         " THEN 0 ELSE " + std::to_string(policy.idle) + " END)";
}

std::string isOverLogin(const Policy& policy, long long now) {
  return "(NOT " + isOwnToken() + " AND " + expiry() + "<" + std::to_string(now) + " AND " +
         beginsWith(names::kState, kTokenStart) + " AND " +
         beginsWith(names::kAccessToken, kMarkStart) + " AND " + loginTime() + "<" +
         std::to_string(now - policy.family) + ")";
}

std::string isOwnToken() {
  return isOneOf(names::kFlowType, {kOwnFlow});
}

/// A sum of conditions would add up the rows that do not meet them, too.
std::string countIf(const std::string& condition) {
  return "COUNT(CASE WHEN " + condition + " THEN 1 END)";
}

bool makeRoomForCode(Store& store, const std::string& user, const std::string& application,
                     Evicts evicts, long long now) {
  const std::string isOfUser = isOneOf(names::kUsername, spellings(user));
  const std::string isOfApplication =
      "(" + isOf(application) + " AND NOT " + isPushedRequest() + ")";
  const auto crowd = makeRoom(
      store, {names::kGrantCodeTable, names::kGrantCodeMax, errors::kGrantCodeFull, isDeadCode(now),
              "(NOT " + isSpentCode() + " AND " + isOfUser + " AND " + isOfApplication + ")",
              isOfUser, isOfApplication, evicts == Evicts::kNothing ? isSpentCode() : kAll,
              spentCodesFirst, isSpentCode(), store.policy.codesOfOne});
  return crowd &&
         (evicts == Evicts::kOldest ||
          hasRoomForLogin(store, loginClaim(store, user, application, evicts, now), crowd->ofPair));
}

std::optional<long long> makeRoomForLogin(Store& store, const std::string& user,
                                          const std::string& application, Evicts evicts,
                                          long long now) {
  const Claim claim = loginClaim(store, user, application, evicts, now);
  if (!makeRoom(store, claim)) return {};
  return nextId(store, claim);
}

long long makeRoomForOwnToken(Store& store, const std::string& application, bool registeredItself,
                              long long now) {
  Claim claim = tokenClaim(store, application, now);
  claim.isOfUser = registeredItself
                       ? "(" + isOwnToken() + " AND client_id IN (SELECT client_id FROM " +
                             names::kClientInfoTable + " WHERE " + selfCondition() + "))"
                       : "0";
  claim.isOfPair = "(" + isOwnToken() + " AND " + claim.isOfApplication + ")";
  claim.pairBound = store.policy.tokensOfItself;
  makeRoom(store, claim);
  return nextId(store, claim);
}

/// All of them together have a part of the table, in which nobody loses any but
/// the own.
void makeRoomForPushed(Store& store, const std::string& application, long long now) {
  const std::string isOfOne = "(" + isPushedRequest() + " AND " + isOf(application) + ")";
  const bool isRoom =
      makeRoom(store, {names::kGrantCodeTable, names::kGrantCodeMax, errors::kGrantCodeFull,
                       isDeadCode(now), isOfOne, isPushedRequest(), kNone, isOfOne, codeOrder,
                       isSpentCode(), store.policy.pushedOfOne})
          .has_value();
  if (!isRoom) fail(errors::kGrantCodeFull);
}

void makeRoomForApplication(Store& store, bool registersItself, long long now) {
  const long long limit = getTableRowMax(names::kClientInfoMax);
  const std::vector<long long> found = store.numbers("SELECT COUNT(*)," + countIf(selfCondition()) +
                                                     " FROM " + names::kClientInfoTable);
  const long long part = std::max(limit / std::max(store.policy.selfRegisteredPart, 1), 1LL);
  const bool isBeyond = registersItself && found[1] >= part;
  if (!isBeyond && found[0] < limit) return;
  if (!isBeyond) fail(errors::kClientInfoFull);

  // An application that nobody uses: neither a code to redeem nor a token.
  const std::string identifier = names::kClientId;
  const std::string live = " AND " + identifier + " NOT IN (SELECT " + identifier + " FROM ";
  const std::string unused = selfCondition() + live + names::kGrantCodeTable + " WHERE NOT " +
                             isDeadCode(now) + " AND NOT " + isSpentCode() + " AND NOT " +
                             isPushedRequest() + ")" + live + names::kTokenTable + " WHERE NOT " +
                             isDeadToken(store.policy, now) + ")";
  const long long gone = store.countErased(
      names::kClientInfoTable, "id IN (SELECT id FROM " + std::string(names::kClientInfoTable) +
                                   " WHERE " + unused + " ORDER BY id LIMIT " +
                                   std::to_string(found[1] - part + 1) + ")");
  if (gone == 0 || found[0] - gone >= limit) fail(errors::kClientInfoFull);
}

}  // namespace KELDOAUTHSERVER::grants::rows
