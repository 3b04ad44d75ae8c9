// The library beside bare SQLite, operation by operation. Every measurement
// has a twin under the same name with "/bare", and where it writes a second one
// with "/bare at FULL"; scripts/bench runs all in the same process,
// interleaved, and gives their ratios.

#include <benchmark/benchmark.h>
#include <json/value.h>
#include <sys/random.h>

#include <array>
#include <cstdlib>
#include <functional>
#include <string>

#include "bench/bare_store.h"
#include "bench/sides.h"
#include "bench/world.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace bench {
namespace {

// B1 ------------------------------------------------------------------------

void registerLibrary(benchmark::State& state) {
  install({});
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  for (auto _ : state) {
    require(state, clients.Add("https://photos.example.org/callback", "profile photos.read",
                               "Photo Frame", out) != 0);
  }
}

void registerBare(benchmark::State& state, Sync sync) {
  install({});
  BareStore store(sync);
  for (auto _ : state) store.registerClient(nextSerial());
}

// B2 ------------------------------------------------------------------------

void issueLibrary(benchmark::State& state) {
  install({static_cast<int>(state.range(0)), 0, 0});
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string client = tokenText(1);
  Json::Value out;
  for (auto _ : state) {
    require(state, tokens.Add("alice", client, "photos.read", "authorization_code", "af0ifjsldkj",
                              "192.0.2.7", out) != 0);
  }
}

void issueBare(benchmark::State& state, Sync sync) {
  install({static_cast<int>(state.range(0)), 0, 0});
  BareStore store(sync);
  for (auto _ : state) store.issueToken(nextSerial());
}

// B3, B4 --------------------------------------------------------------------

void verifyLibrary(benchmark::State& state) {
  install({static_cast<int>(state.range(0)), 0, 0});
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = tokenText(state.range(0) / 2);
  for (auto _ : state) {
    Json::Value holder;
    require(state, tokens.Verify(token, holder));
  }
}

void refreshLibrary(benchmark::State& state) {
  install({static_cast<int>(state.range(0)), 0, 0});
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = tokenText(state.range(0) / 2);
  for (auto _ : state) {
    Json::Value rows;
    require(state, tokens.GetWithRefreshToken(token, &rows) && rows.size() == 1);
  }
}

void lookUpBare(benchmark::State& state, const char* column) {
  install({static_cast<int>(state.range(0)), 0, 0});
  BareStore store;
  const std::string sql = std::string("SELECT * FROM oauth_token WHERE ") + column + "='" +
                          tokenText(state.range(0) / 2) + "' ;";
  for (auto _ : state) store.select(sql);
}

void verifyBare(benchmark::State& state) {
  lookUpBare(state, "access_token");
}
void refreshBare(benchmark::State& state) {
  lookUpBare(state, "refresh_token");
}

// B5 ------------------------------------------------------------------------

/// One purge per iteration: the rows are put back outside the measurement.
template <typename Store, typename... Arguments>
void purge(benchmark::State& state, const std::function<bool(Store&)>& work,
           Arguments... arguments) {
  const int rows = static_cast<int>(state.range(0));
  for (auto _ : state) {
    state.PauseTiming();
    install({rows, rows / 2, 0});
    Store store(arguments...);
    state.ResumeTiming();
    require(state, work(store));
  }
}

struct TokenStore : OAUTHDBToken {
  TokenStore() : OAUTHDBToken(names::kTokenTable) {}
};

void purgeLibrary(benchmark::State& state) {
  purge<TokenStore>(state, [](TokenStore& store) { return store.Purge(); });
}

void purgeBare(benchmark::State& state, Sync sync) {
  const auto work = [](BareStore& store) {
    store.run("DELETE FROM oauth_token WHERE CAST(expired_time AS INTEGER) < 2000;");
    return true;
  };
  purge<BareStore>(state, work, sync);
}

void purgeRowByRow(benchmark::State& state, Sync sync) {
  const long long expired = state.range(0) / 2;
  const auto work = [expired](BareStore& store) {
    for (long long id = 1; id <= expired; ++id) {
      store.run("DELETE FROM oauth_token WHERE id='" + std::to_string(id) + "';");
    }
    return true;
  };
  purge<BareStore>(state, work, sync);
}

// B6 ------------------------------------------------------------------------

void auditLibrary(benchmark::State& state) {
  const int rows = static_cast<int>(state.range(0));
  install({0, 0, rows}, rows);
  OAUTHDBLog log(names::kLogTable);
  for (auto _ : state) require(state, log.Add("Token revoked[alice]") != 0);
}

void auditBare(benchmark::State& state, Sync sync) {
  const int rows = static_cast<int>(state.range(0));
  install({0, 0, rows}, rows);
  BareStore store(sync);
  for (auto _ : state) store.writeAuditEntry("Token revoked[alice]", rows);
}

// B7 ------------------------------------------------------------------------

void randomLibrary(benchmark::State& state) {
  for (auto _ : state) benchmark::DoNotOptimize(getRandomStr(64));
}

/// What the system's random source takes for it: 2,496 bytes a piece in one read,
/// of which nothing is computed.
void randomBare(benchmark::State& state) {
  std::array<unsigned char, 2496> bytes{};
  for (auto _ : state) {
    for (int piece = 0; piece < 2; ++piece) {
      if (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
        std::abort();
      }
      benchmark::DoNotOptimize(bytes);
    }
  }
}

// B8 ------------------------------------------------------------------------

void constructLibrary(benchmark::State& state) {
  install({1000, 0, 0});
  for (auto _ : state) OAUTHDBToken tokens(names::kTokenTable);
}

void constructBare(benchmark::State& state, Sync sync) {
  install({1000, 0, 0});
  for (auto _ : state) BareStore store(sync);
}

// B9 ------------------------------------------------------------------------

/// The setting and the five statements alone, on a connection that knows the
/// tables.
void startUpLibrary(benchmark::State& state) {
  install({1000, 0, 0});
  OAUTHDBToken tokens(names::kTokenTable);
  for (auto _ : state) require(state, tokens.DBInit() != 0);
}

void startUpBare(benchmark::State& state) {
  install({1000, 0, 0});
  BareStore store;
  for (auto _ : state) store.startUp();
}

// ---------------------------------------------------------------------------

const bool registered = [] {
  add("B1 register a client", registerLibrary, registerBare, {50, {}});
  add("B2 issue a token pair", issueLibrary, issueBare, {50, {10, 100, 900, 9900}});
  add("B3 verify an access token", verifyLibrary, verifyBare, {0, {10, 100, 1000, 10000}});
  add("B4 look up a refresh token", refreshLibrary, refreshBare, {0, {10, 100, 1000, 10000}});
  add("B5 purge half of the rows", purgeLibrary, purgeBare, {3, {20, 200, 2000, 10000}});
  add("B5 purge, beside row by row", purgeLibrary, purgeRowByRow, {1, {2000}});
  add("B6 audit entry with rotation", auditLibrary, auditBare, {50, {1000, 10000}});
  add("B7 getRandomStr(64)", randomLibrary, randomBare, {0, {}});
  add("B8 construct and destroy", constructLibrary, constructBare, {0, {}});
  add("B9 statements of start-up", startUpLibrary, startUpBare, {0, {}});
  return true;
}();

}  // namespace
}  // namespace bench
