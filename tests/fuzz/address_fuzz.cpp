// Any text as the address of a requester: taken exactly when the address parser
// of Boost.Asio takes it.

#include <boost/asio/ip/address.hpp>

#include <string>
#include <vector>

#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/fuzz/world.h"
#include "tests/support/system_log.h"
#include "utils/oauth_names.h"

namespace {

namespace names = KELDOAUTHSERVER::names;
using fuzz::expect;
using support::SystemLog;

/// With a user name that is too short: the address is judged before it.
template <typename Issue>
void expectVerdict(const std::string& verdict, const std::string& ip, Issue issue) {
  SystemLog::clear();
  expect(!issue(), "an insertion without user name");
  expect(SystemLog::messages() == std::vector<std::string>{verdict}, verdict.c_str(), ip);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::World::instance();
  static KELDOAUTHSERVER::OAUTHDBGrantCode codes(names::kGrantCodeTable);
  static KELDOAUTHSERVER::OAUTHDBToken tokens(names::kTokenTable);

  const std::string ip(reinterpret_cast<const char*>(data), size);
  boost::system::error_code error;
  boost::asio::ip::make_address(ip, error);
  const std::string verdict =
      ip.empty() || !error ? "Bad parameters" : "Bad IP address[" + error.message() + "]";

  Json::Value out;
  expectVerdict(verdict, ip, [&] { return codes.Add("", "", "", "", ip, out) != 0; });
  expectVerdict(verdict, ip, [&] { return tokens.Add("", "", "", "", "", ip, out) != 0; });
  return 0;
}
