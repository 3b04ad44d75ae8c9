#include "grants/access.h"

#include <cctype>
#include <map>
#include <utility>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/notes.h"
#include "grants/rows/quotes.h"
#include "grants/rows/read_rows.h"
#include "grants/rows/room_rules.h"
#include "grants/rows/slices.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

using rows::CodeRow;
using rows::TokenRow;

/// So many subjects of one operation get entries of their own in the log.
constexpr std::size_t kMostSubjects = 16;

// Entries -----------------------------------------------------------------------

/// What a row is known by: of a login its family, which refreshing keeps. A
/// code that was redeemed meanwhile is another thing.
std::string markOf(const CodeRow& code) {
  return rows::hexDigest(code.storedCode + code.storedState);
}

std::string markOf(const TokenRow& token) {
  const bool hasFamily = token.isOurs() && !token.state->family.empty();
  return rows::hexDigest(hasFamily ? token.state->family : token.storedAccess);
}

std::optional<ApplicationName> nameOf(Store& store, const std::string& application) {
  auto found = rows::findApplication(store, application);
  return found ? std::optional<ApplicationName>(std::move(found->shown.name)) : std::nullopt;
}

bool isLive(const CodeRow& code, long long now) {
  return code.expires > now && !code.isSpent();
}

bool isLive(const TokenRow& token, const Policy& policy, long long now) {
  return token.ends(policy) >= now || token.expires >= now;
}

// Member by member: of an aggregate with another one written out in it, GCC 12
// destroys the inner members twice when memory runs out behind them.

AccessEntry entryOf(const CodeRow& code, std::optional<ApplicationName> name, long long now) {
  const bool isOurs = code.isOurs();
  AccessEntry entry{};
  entry.handle = {AccessHandle::Table::kCodes, code.row, markOf(code)};
  entry.kind = code.isSpent() ? AccessEntry::Kind::kSpent : AccessEntry::Kind::kCode;
  entry.user = User(code.user);
  entry.application = ApplicationId(code.application);
  entry.applicationName = std::move(name);
  entry.scope = Scope(code.scope);
  entry.since = entry.renewed = isOurs ? code.state->issued : 0;
  entry.expires = entry.ends = code.expires;
  entry.from = PeerAddress(code.from);
  entry.text = CallerText(rows::undoubled(code.storedState));
  if (isOurs) entry.text = CallerText(code.state->text);
  entry.isDead = code.expires <= now;
  entry.isForeign = !isOurs;
  return entry;
}

AccessEntry entryOf(const TokenRow& token, std::optional<ApplicationName> name,
                    const Policy& policy, long long now) {
  const bool isOurs = token.isOurs();
  AccessEntry entry{};
  entry.handle = {AccessHandle::Table::kTokens, token.row, markOf(token)};
  entry.kind = token.isOwn() ? AccessEntry::Kind::kOwn : AccessEntry::Kind::kLogin;
  if (!token.isOwn()) entry.user = User(token.user);
  entry.application = ApplicationId(token.application);
  entry.applicationName = std::move(name);
  entry.scope = Scope(token.loginScope());
  entry.since = isOurs ? token.state->login : 0;
  entry.renewed = isOurs ? token.state->issued : 0;
  entry.expires = token.expires;
  entry.ends = token.ends(policy);
  entry.from = PeerAddress(token.from);
  entry.flow = token.flow;
  entry.text = CallerText(rows::undoubled(token.storedState));
  if (isOurs) entry.text = CallerText(token.state->text);
  entry.isDead = !isLive(token, policy, now);
  entry.isForeign = !isOurs;
  return entry;
}

// Conditions of SQL ---------------------------------------------------------------

struct Conditions {
  std::string codes;
  std::string tokens;
};

constexpr char kEveryRow[] = "1";
constexpr char kNoRow[] = "0";

std::string isIts(const ApplicationId& application) {
  return std::string(names::kClientId) + "=" + rows::literal(Store::sealed(application.text()));
}

Conditions conditionsOf(const std::optional<User>& user,
                        const std::optional<ApplicationId>& application, Rows rows = Rows::kAll) {
  Conditions conditions{rows == Rows::kTokens ? kNoRow : "NOT " + rows::isPushedRequest(),
                        rows == Rows::kCodes ? kNoRow : kEveryRow};
  if (application) {
    conditions.codes += " AND " + isIts(*application);
    conditions.tokens += " AND " + isIts(*application);
  }
  // That a code was redeemed is remembered as long as its login lives.
  if (rows == Rows::kCodes) conditions.codes += " AND NOT " + rows::isSpentCode();
  if (user) {
    const std::string isTheirs =
        " AND " + rows::isOneOf(names::kUsername, rows::spellings(user->text()));
    conditions.codes += isTheirs;
    conditions.tokens += isTheirs + " AND NOT " + rows::isOwnToken();
  }
  return conditions;
}

bool canBe(const std::optional<User>& user, const std::optional<ApplicationId>& application) {
  return (!user || !rows::hasNul(user->text())) &&
         (!application || rows::isWithin(application->text(), bounds::kIdentifier)) &&
         (!application || !rows::hasNul(application->text()));
}

// Lists -------------------------------------------------------------------------

bool canBe(const AccessFilter& filter) {
  return canBe(filter.user, filter.application) && !rows::hasNul(filter.contains);
}

/// The name of the application whose row of `table` it is.
std::string nameIn(const std::string& identifier) {
  return "(SELECT display_name FROM " + std::string(names::kClientInfoTable) +
         " AS its WHERE its.client_id=" + identifier + ")";
}

Conditions conditionsOf(const AccessFilter& filter, const Policy& policy, long long now) {
  Conditions conditions = conditionsOf(filter.user, filter.application);
  if (!filter.withDead) {
    conditions.codes += " AND NOT " + rows::isDeadCode(now);
    conditions.tokens +=
        " AND NOT " + rows::isDeadToken(policy, now) + " AND NOT " + rows::isOverLogin(policy, now);
  }
  if (!filter.withSpent) conditions.codes += " AND NOT " + rows::isSpentCode();
  if (!filter.contains.empty()) {
    const std::string isTheUsers = rows::contains(names::kUsername, filter.contains);
    const auto isIts = [&filter](const char* table) {
      const std::string name = nameIn(std::string(table) + "." + names::kClientId);
      return rows::contains("IFNULL(" + name + ",'')", filter.contains);
    };
    conditions.codes += " AND (" + isTheUsers + " OR " + isIts(names::kGrantCodeTable) + ")";
    conditions.tokens += " AND (NOT " + rows::isOwnToken() + " AND " + isTheUsers + " OR " +
                         isIts(names::kTokenTable) + ")";
  }
  return conditions;
}

/// Codes first: of them "access_token" holds the code.
rows::List listOf(const AccessFilter& filter, const Policy& policy, long long now) {
  const Conditions conditions = conditionsOf(filter, policy, now);
  const std::string ofCodes =
      " FROM " + std::string(names::kGrantCodeTable) + " WHERE " + conditions.codes;
  const std::string ofTokens =
      " FROM " + std::string(names::kTokenTable) + " WHERE " + conditions.tokens;
  const std::string shared =
      ",id,username," + rows::sealedIdentifier() + ",scope,expired_time,state,ip,";
  return {"SELECT 0 AS is_token" + shared +
              "code AS access_token,'' AS refresh_token,'' AS flow_type" + ofCodes +
              " UNION ALL SELECT 1" + shared + "access_token,refresh_token,flow_type" + ofTokens,
          "is_token,id", "(SELECT COUNT(*)" + ofCodes + ")+(SELECT COUNT(*)" + ofTokens + ")",
          "," + nameIn(std::string("part.") + rows::kSealedIdentifier) + " AS display_name"};
}

AccessEntry entryOf(Json::Value row, const Policy& policy, long long now) {
  const std::string stored = row[names::kDisplayName].asString();
  std::optional<ApplicationName> name;
  if (!stored.empty()) name = ApplicationName(rows::undoubled(stored));
  if (row["is_token"].asString() == "1") {
    return entryOf(rows::tokenOf(row), std::move(name), policy, now);
  }
  row[names::kCode] = row[names::kAccessToken];
  return entryOf(rows::codeOf(row), std::move(name), now);
}

std::vector<AccessEntry> entriesOf(const Store& store, const rows::Part& part, long long now) {
  std::vector<AccessEntry> entries;
  entries.reserve(part.rows.size());
  for (const Json::Value& row : part.rows) entries.push_back(entryOf(row, store.policy, now));
  return entries;
}

// Ending ------------------------------------------------------------------------

Ended liveOf(Store& store, const Conditions& conditions) {
  const long long now = currentTime();
  const std::vector<long long> live = store.numbers(
      "SELECT (SELECT COUNT(*) FROM " + std::string(names::kGrantCodeTable) + " WHERE " +
      conditions.codes + " AND NOT " + rows::isDeadCode(now) + " AND NOT " + rows::isSpentCode() +
      "),(SELECT COUNT(*) FROM " + names::kTokenTable + " WHERE " + conditions.tokens +
      " AND NOT " + rows::isDeadToken(store.policy, now) + ")");
  return {static_cast<int>(live[0]), static_cast<int>(live[1])};
}

/// All of it in one transaction, with an entry in the log when some of it was
/// live.
template <typename Note>
Ended endAll(Store& store, const Conditions& conditions, const Note& note) {
  Whole whole(store);
  const Ended ended = liveOf(store, conditions);
  store.eraseWhere(names::kGrantCodeTable, conditions.codes);
  store.eraseWhere(names::kTokenTable, conditions.tokens);
  if (ended.codes + ended.tokens > 0) note();
  whole.commit();
  return ended;
}

rows::Subject subjectOf(Store& store, const std::string& application) {
  const auto found = rows::findApplication(store, application);
  if (!found) return {{}, application, false};
  return {found->shown.name, application, found->shown.registeredItself};
}

std::string endedWord(Rows rows) {
  if (rows == Rows::kAll) return "Access ended";
  return rows == Rows::kCodes ? "Codes ended" : "Tokens ended";
}

std::string allEndedWord(Rows rows) {
  std::string word = endedWord(rows);
  word.front() = static_cast<char>(std::tolower(word.front()));
  return "All " + word;
}

/// Whose access ended, for the log: application and user.
using Subjects = std::map<std::pair<std::string, std::optional<std::string>>, int>;

void noteEach(Store& store, const Subjects& subjects, const Actor& by) {
  std::size_t written = 0;
  for (const auto& [subject, count] : subjects) {
    if (++written > kMostSubjects) break;
    rows::noteEnd(store, subjectOf(store, subject.first), subject.second, rows::actorWord(by));
  }
  if (subjects.size() <= kMostSubjects) return;
  rows::note(store, "Access ended of " + std::to_string(subjects.size() - kMostSubjects) + " more" +
                        rows::actorWord(by));
}

void endCode(Store& store, const AccessHandle& handle, long long now, Ended& ended,
             Subjects& subjects) {
  const auto code = rows::findCode(store, names::kId, std::to_string(handle.row));
  if (!code || markOf(*code) != handle.mark) return;
  rows::erase(store, *code);
  if (!isLive(*code, now)) return;
  ++ended.codes;
  ++subjects[{code->application, code->user}];
}

void endToken(Store& store, const AccessHandle& handle, long long now, Ended& ended,
              Subjects& subjects) {
  const auto token = rows::findToken(store, names::kId, std::to_string(handle.row));
  if (!token || markOf(*token) != handle.mark) return;
  rows::erase(store, *token);
  if (!isLive(*token, store.policy, now)) return;
  ++ended.tokens;
  ++subjects[{token->application,
              token->isOwn() ? std::nullopt : std::optional<std::string>(token->user)}];
}

}  // namespace

std::vector<AccessEntry> Access::list(const AccessFilter& filter) const {
  if (!canBe(filter)) return {};
  const long long now = currentTime();
  return entriesOf(store_, rows::wholeOf(store_, listOf(filter, store_.policy, now)), now);
}

Sliced<AccessEntry> Access::page(const AccessFilter& filter, const Slice& slice) const {
  if (!canBe(filter)) return {{}, 0};
  const long long now = currentTime();
  const rows::Part part = rows::partOf(store_, listOf(filter, store_.policy, now), slice);
  return {entriesOf(store_, part, now), part.length};
}

std::optional<AccessEntry> Access::find(const Code& code) const {
  const auto found = rows::findShownCode(store_, code.text());
  if (!found) return {};
  return entryOf(*found, nameOf(store_, found->application), currentTime());
}

std::optional<AccessEntry> Access::find(const AnyToken& token) const {
  const auto found = rows::findShownToken(store_, token.text());
  if (!found) return {};
  return entryOf(*found, nameOf(store_, found->application), store_.policy, currentTime());
}

bool Access::hasLogin(const User& user, const ApplicationId& application,
                      const Scope& scope) const {
  return canBe(user, application) &&
         rows::hasLogin(store_, user.text(), application.text(), scope.text(), currentTime());
}

Ended Access::end(const AccessHandle& handle, const Actor& by) {
  return end(std::vector<AccessHandle>{handle}, by);
}

Ended Access::end(const std::vector<AccessHandle>& handles, const Actor& by) {
  Whole whole(store_);
  const long long now = currentTime();
  Ended ended{0, 0};
  Subjects subjects;
  for (const AccessHandle& handle : handles) {
    const bool isCode = handle.table == AccessHandle::Table::kCodes;
    (isCode ? endCode : endToken)(store_, handle, now, ended, subjects);
  }
  noteEach(store_, subjects, by);
  whole.commit();
  return ended;
}

Ended Access::endUser(const User& user, const Actor& by, Rows rows) {
  if (!canBe(user, {})) return {0, 0};
  return endAll(store_, conditionsOf(user, {}, rows), [&] {
    rows::note(store_, allEndedWord(rows) + rows::userWord(user.text()) + rows::actorWord(by));
  });
}

Ended Access::endUserWith(const User& user, const ApplicationId& application, const Actor& by,
                          Rows rows) {
  if (!canBe(user, application)) return {0, 0};
  return endAll(store_, conditionsOf(user, application, rows), [&] {
    rows::noteEnd(store_, subjectOf(store_, application.text()), user.text(), rows::actorWord(by),
                  endedWord(rows));
  });
}

Ended Access::endApplication(const ApplicationId& application, const Actor& by, Rows rows) {
  if (!canBe({}, application)) return {0, 0};
  return endAll(store_, conditionsOf({}, application, rows), [&] {
    const rows::Subject subject = subjectOf(store_, application.text());
    rows::note(store_, allEndedWord(rows) +
                           rows::applicationWord(subject.name, subject.identifier) +
                           rows::actorWord(by));
  });
}

Ended Access::endEverything(const Actor& by, Rows rows) {
  return endAll(store_, conditionsOf({}, {}, rows),
                [&] { rows::note(store_, allEndedWord(rows) + rows::actorWord(by)); });
}

}  // namespace KELDOAUTHSERVER::grants
