#include "tests/grants/household.h"

#include <cstdio>
#include <regex>

namespace grants_test {
namespace {

NewApplication newcomer() {
  return {ApplicationName("Newcomer"), {kAddress}, kScope};
}

CodeRequest requestOf(const Household& household) {
  CodeRequest request{kBob, household.frame, kScope, kAddress};
  request.pkce = Pkce{kChallenge};
  return request;
}

CodeRequest withoutPage(CodeRequest request) {
  request.user = kAlice;
  request.withoutPage = true;
  return request;
}

CodeRequest forPushed(CodeRequest request, const RequestReference& pushed) {
  request.pushed = pushed;
  return request;
}

ApplicationChange anotherName() {
  ApplicationChange change;
  change.name = ApplicationName("Another name");
  return change;
}

template <typename Value>
std::string said(const Outcome<Value>& outcome) {
  return wordOf(outcome);
}
template <typename Value>
std::string said(const std::optional<Value>& found) {
  return found ? "found" : "nothing";
}
template <typename Value>
std::string said(const std::vector<Value>& list) {
  return std::to_string(list.size());
}
template <typename Value>
std::string said(const Sliced<Value>& sliced) {
  return said(sliced.items) + " of " + std::to_string(sliced.total);
}
std::string said(const Ended& ended) {
  return std::to_string(ended.codes) + " " + std::to_string(ended.tokens);
}
std::string said(const Purged& purged) {
  return std::to_string(purged.codes) + " " + std::to_string(purged.tokens);
}
std::string said(bool is) {
  return is ? "yes" : "no";
}
std::string said(long long number) {
  return std::to_string(number);
}

}  // namespace

std::vector<Operation> everyChange() {
  return {
      {"AddApplication",
       [](auto& g, auto&) { return said(g.applications.add(newcomer(), kAdmin)); }},
      {"ChangeApplication",
       [](auto& g, auto& h) {
         return said(g.applications.change(h.frame, anotherName(), kAdmin));
       }},
      {"RenewSecret",
       [](auto& g, auto& h) { return said(g.applications.renewSecret(h.frame, kAdmin)); }},
      {"Disable", [](auto& g, auto& h) { return said(g.applications.disable(h.frame, kAdmin)); }},
      {"Remove", [](auto& g, auto& h) { return said(g.applications.remove(h.frame, kAdmin)); }},
      {"IssueCode", [](auto& g, auto& h) { return said(g.codes.issue(requestOf(h))); }},
      {"Redeem",
       [](auto& g, auto& h) {
         return said(g.codes.redeem({h.frame, h.code, kAddress, kVerifier}));
       }},
      {"IssueWithoutPage",
       [](auto& g, auto& h) { return said(g.codes.issue(withoutPage(requestOf(h)))); }},
      {"Push",
       [](auto& g, auto& h) {
         return said(g.pushed.push({h.frame, RequestText("state='1'")}));
       }},
      {"OpenPushed", [](auto& g, auto& h) { return said(g.pushed.open(h.frame, h.pushed)); }},
      {"IssueForPushed",
       [](auto& g, auto& h) { return said(g.codes.issue(forPushed(requestOf(h), h.pushed))); }},
      {"RedeemWithoutPage",
       [](auto& g, auto& h) {
         return said(g.codes.redeem({h.frame, h.quietCode, kAddress, kVerifier}));
       }},
      {"ReplayCode",
       [](auto& g, auto& h) {
         return said(g.codes.redeem({h.frame, h.spentCode, kAddress, kVerifier}));
       }},
      {"IssueLogin",
       [](auto& g, auto& h) {
         return said(g.tokens.issue({kBob, h.frame, kScope}));
       }},
      {"Refresh",
       [](auto& g, auto& h) {
         return said(g.tokens.refresh({h.frame, *h.old.refresh}));
       }},
      {"ReplayRefresh",
       [](auto& g, auto& h) {
         return said(g.tokens.refresh({h.other, *h.replaced.refresh}));
       }},
      {"IssueToItself", [](auto& g, auto& h) { return said(g.tokens.issueToItself({h.frame})); }},
      {"Revoke",
       [](auto& g, auto& h) {
         return said(g.tokens.revoke(h.frame, AnyToken(h.old.access.text())));
       }},
      {"EndHandle", [](auto& g, auto& h) { return said(g.access.end(h.handle, kAdmin)); }},
      {"EndUser", [](auto& g, auto&) { return said(g.access.endUser(kAlice, kAdmin)); }},
      {"EndUserWith",
       [](auto& g, auto& h) { return said(g.access.endUserWith(kAlice, h.frame, kAdmin)); }},
      {"EndApplication",
       [](auto& g, auto& h) { return said(g.access.endApplication(h.frame, kAdmin)); }},
      {"EndEverything", [](auto& g, auto&) { return said(g.access.endEverything(kAdmin)); }},
      {"Purge", [](auto& g, auto&) { return said(g.room.purge()); }},
      {"Record",
       [](auto& g, auto&) {
         g.audit.record("Key changed", kAdmin);
         return std::string();
       }},
      {"ClearLog", [](auto& g, auto&) { return said(g.audit.clear(kAdmin)); }},
  };
}

std::vector<Operation> everyLookUp() {
  return {
      {"Verify", [](auto& g, auto& h) { return said(g.tokens.verify(h.old.access)); }},
      {"VerifyForeign",
       [](auto& g, auto&) { return said(g.tokens.verify(AccessToken(support::id64('f')))); }},
      {"Introspect",
       [](auto& g, auto& h) {
         return said(g.tokens.introspect(h.frame, AnyToken(h.old.refresh->text())));
       }},
      {"Authenticate",
       [](auto& g, auto& h) {
         return said(g.applications.authenticate(h.frame, Secret(support::id64('x'))));
       }},
      {"HasLogin",
       [](auto& g, auto& h) { return said(g.access.hasLogin(kAlice, h.frame, kScope)); }},
      {"List", [](auto& g, auto&) { return said(g.access.list({})); }},
      {"AccessPage",
       [](auto& g, auto&) {
         return said(g.access.page({}, {2, 1}));
       }},
      {"ApplicationsPage",
       [](auto& g, auto&) {
         return said(g.applications.page("o", {1, 1}));
       }},
      {"Count", [](auto& g, auto&) { return said(g.room.count().tokens.rows); }},
  };
}

void HouseholdTest::SetUp() {
  GrantsTest::SetUp();
  support::Platform::useReadableCipher();
  household_.frame = add().identifier;
  household_.other = add("Other").identifier;
  CodeRequest brief = request(household_.other, kBob);
  brief.lifetime = 1;
  grants().codes.issue(brief);                                   // dead
  grants().tokens.issueToItself({household_.other, {}, {}, 1});  // dead
  household_.spentCode = issue(household_.frame);
  household_.old = *grants().codes.redeem(redemption(household_.frame, household_.spentCode));
  household_.handle = grants().access.list({kAlice, household_.frame})[0].handle;
  household_.replaced = login(household_.other, kBob);
  household_.current = refresh(household_.other, household_.replaced);
  household_.code = issue(household_.frame);
  household_.quietCode = grants().codes.issue(withoutPage(requestOf(household_)))->code;
  support::Clock::advance(59);
  household_.pushed = grants().pushed.push({household_.frame, RequestText("state='2'")})->reference;
  support::Clock::advance(1);
  close();
  file_ = readFile(kDatabase);
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token"}) {
    for (const auto& row : sql("SELECT * FROM " + std::string(table))) {
      for (const auto& [column, text] : row) seen_ += text + "\n";
    }
  }
  before_ = state();
}

void HouseholdTest::reset() {
  close();
  std::remove((std::string(kDatabase) + "-journal").c_str());
  writeFile(kDatabase, file_);
  support::Clock::setTo(kNow + 60);
}

std::string HouseholdTest::state() const {
  std::string all;
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"}) {
    for (const auto& row : sql("SELECT * FROM " + std::string(table) + " ORDER BY id")) {
      all += table;
      for (const auto& [column, text] : row) all += " " + column + "=" + text;
      all += "\n";
    }
  }
  // The short form of an identifier stands in the log.
  static const std::regex kDrawn("[0-9a-f]{40,}|[0-9a-f]{8}(?=\\])");
  std::string shown;
  auto end = all.cbegin();
  for (auto match = std::sregex_iterator(all.begin(), all.end(), kDrawn);
       match != std::sregex_iterator(); ++match) {
    shown.append(end, (*match)[0].first);
    shown += seen_.find(match->str()) == std::string::npos ? "#new" : "#old";
    end = (*match)[0].second;
  }
  shown.append(end, all.cend());
  return shown;
}

}  // namespace grants_test
