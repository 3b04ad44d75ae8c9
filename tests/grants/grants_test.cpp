#include "tests/grants/grants_test.h"

#include <algorithm>
#include <stdexcept>

namespace grants_test {
namespace {

/// A test that goes on without what it asked for would only say the same again.
template <typename Value>
Value granted(const Outcome<Value>& outcome) {
  if (!outcome) throw std::runtime_error(wordOf(outcome));
  return *outcome;
}

}  // namespace

void GrantsTest::SetUp() {
  World::SetUp();
  support::Clock::setTo(kNow);
  grants_.emplace();
}

void GrantsTest::open(const Policy& policy) {
  grants_.emplace(policy);
}

Registered GrantsTest::add(const std::string& name, ApplicationKind kind) {
  return granted(
      grants().applications.add({ApplicationName(name), {kAddress}, kScope, kind}, kAdmin));
}

CodeRequest GrantsTest::request(const ApplicationId& application, const User& user) const {
  CodeRequest request{user, application, kScope, kAddress};
  request.pkce = Pkce{kChallenge};
  return request;
}

Code GrantsTest::issue(const ApplicationId& application, const User& user) {
  return granted(grants().codes.issue(request(application, user))).code;
}

Redemption GrantsTest::redemption(const ApplicationId& application, const Code& code) const {
  return {application, code, kAddress, kVerifier};
}

Pair GrantsTest::login(const ApplicationId& application, const User& user) {
  return granted(grants().codes.redeem(redemption(application, issue(application, user))));
}

Pair GrantsTest::refresh(const ApplicationId& application, const Pair& pair) {
  return granted(grants().tokens.refresh({application, *pair.refresh}));
}

std::vector<std::string> GrantsTest::entries() {
  std::vector<std::string> texts;
  for (const AuditEntry& entry : grants().audit.list({})) texts.push_back(entry.text);
  std::reverse(texts.begin(), texts.end());
  return texts;
}

}  // namespace grants_test
