// Logins over grants/ beside bare SQLite with prepared statements. Sides and names
// as in stores_bench.cpp.

#include <benchmark/benchmark.h>

#include <array>
#include <optional>
#include <string>

#include "bench/bare_login.h"
#include "bench/bare_store.h"
#include "bench/sides.h"
#include "bench/world.h"
#include "grants/grants.h"

namespace bench {
namespace {

using namespace KELDOAUTHSERVER::grants;

// What RFC 7636 shows in its appendix B.
const Verifier kVerifier("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
const Challenge kChallenge("E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM");
const RedirectAddress kAddress("https://photos.example.org/callback");
const PeerAddress kPeer("192.0.2.7");

Contents tokensOf(const benchmark::State& state) {
  return {static_cast<int>(state.range(0)), 0, 0};
}

// L1, L2 --------------------------------------------------------------------

/// Every login is another user's, so that none is one too many.
std::optional<Code> issueCode(Grants& grants) {
  CodeRequest request{User("user" + std::to_string(nextSerial())), ApplicationId(applicationId()),
                      Scope("photos.read"), kAddress};
  request.pkce = Pkce{kChallenge};
  request.from = kPeer;
  const auto issued = grants.codes.issue(request);
  return issued ? std::optional<Code>(issued->code) : std::nullopt;
}

std::optional<Pair> redeem(Grants& grants, const Code& code) {
  const auto pair =
      grants.codes.redeem({ApplicationId(applicationId()), code, kAddress, kVerifier, kPeer});
  return pair ? std::optional<Pair>(*pair) : std::nullopt;
}

std::optional<Pair> logIn(Grants& grants) {
  const auto code = issueCode(grants);
  return code ? redeem(grants, *code) : std::nullopt;
}

void loginKeptOpen(benchmark::State& state) {
  install(tokensOf(state));
  Grants grants;
  for (auto _ : state) require(state, logIn(grants).has_value());
}

void loginKeptOpenBare(benchmark::State& state, Sync sync) {
  install(tokensOf(state));
  BareLogin store(sync);
  for (auto _ : state) {
    const long long serial = nextSerial();
    store.issueCode(serial);
    store.redeem(serial);
  }
}

/// As two processes do, which answer a request each.
void loginOpened(benchmark::State& state) {
  install(tokensOf(state));
  for (auto _ : state) {
    const auto code = [] {
      Grants grants;
      return issueCode(grants);
    }();
    Grants grants;
    require(state, code && redeem(grants, *code));
  }
}

void loginOpenedBare(benchmark::State& state, Sync sync) {
  install(tokensOf(state));
  for (auto _ : state) {
    const long long serial = nextSerial();
    BareLogin(sync).issueCode(serial);
    BareLogin(sync).redeem(serial);
  }
}

// L3, L4 --------------------------------------------------------------------

void refresh(benchmark::State& state) {
  install(tokensOf(state));
  Grants grants;
  auto pair = logIn(grants);
  for (auto _ : state) {
    const auto next =
        pair ? grants.tokens.refresh({ApplicationId(applicationId()), *pair->refresh, {}, kPeer})
             : Outcome<Pair>(Refusal{Error::kInvalidGrant, Why::kUnknown});
    require(state, static_cast<bool>(next));
    if (next) pair = *next;
  }
}

void refreshBare(benchmark::State& state, Sync sync) {
  install(tokensOf(state));
  BareLogin store(sync);
  for (auto _ : state) store.refresh(state.range(0) / 2, nextSerial());
}

/// The login's row and the application's, both found by a key.
void lookUpRefresh(benchmark::State& state) {
  install(tokensOf(state));
  Grants grants;
  const auto pair = logIn(grants);
  for (auto _ : state) {
    require(state, pair && grants.tokens.introspect(ApplicationId(applicationId()),
                                                    AnyToken(pair->refresh->text())));
  }
}

void lookUpRefreshBare(benchmark::State& state) {
  install(tokensOf(state));
  BareStore store;
  const std::string token =
      "SELECT * FROM oauth_token WHERE id='" + std::to_string(state.range(0) / 2) + "' ;";
  const std::string application =
      "SELECT * FROM oauth_clientInfo WHERE client_id='" + applicationIdCipher() + "' ;";
  for (auto _ : state) {
    store.select(token);
    store.select(application);
  }
}

// L5 ------------------------------------------------------------------------

void purge(benchmark::State& state) {
  const int rows = static_cast<int>(state.range(0));
  for (auto _ : state) {
    state.PauseTiming();
    install({rows, rows / 2, 0});
    Grants grants;
    state.ResumeTiming();
    require(state, grants.room.purge().tokens == rows / 2);
  }
}

void purgeBare(benchmark::State& state, Sync sync) {
  const int rows = static_cast<int>(state.range(0));
  for (auto _ : state) {
    state.PauseTiming();
    install({rows, rows / 2, 0});
    BareStore store(sync);
    state.ResumeTiming();
    store.run("DELETE FROM oauth_token WHERE CAST(expired_time AS INTEGER) < 2000;");
  }
}

// L6 ------------------------------------------------------------------------

void verify(benchmark::State& state) {
  install(tokensOf(state));
  Grants grants;
  const auto pair = logIn(grants);
  for (auto _ : state) {
    require(state, pair && static_cast<bool>(grants.tokens.verify(pair->access)));
  }
}

void verifyBare(benchmark::State& state) {
  install(tokensOf(state));
  BareStore store;
  const std::string token =
      "SELECT * FROM oauth_token WHERE access_token='" + tokenText(state.range(0) / 2) + "' ;";
  const std::string application =
      "SELECT * FROM oauth_clientInfo WHERE client_id='" + applicationIdCipher() + "' ;";
  for (auto _ : state) {
    store.select(token);
    store.select(application);
  }
}

const bool registered = [] {
  add("L1 login whole, kept open", loginKeptOpen, loginKeptOpenBare, {25, {100, 1000, 9000}});
  add("L2 login whole, opened twice", loginOpened, loginOpenedBare, {25, {100, 1000, 9000}});
  add("L3 refresh", refresh, refreshBare, {50, {100, 1000, 9900}});
  add("L4 look-up of a refresh token", lookUpRefresh, lookUpRefreshBare, {0, {100, 1000, 9900}});
  add("L5 purge of half of the rows", purge, purgeBare, {3, {200, 2000, 10000}});
  add("L6 verification", verify, verifyBare, {0, {100, 1000, 9900}});
  return true;
}();

}  // namespace
}  // namespace bench
