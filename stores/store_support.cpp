#include "stores/store_support.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <cerrno>
#include <cstring>

#include "core/oauth_errors.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

bool isIpv6(const char* text) {
  const std::string address(text, std::strcspn(text, "%"));
  in6_addr parsed{};
  return inet_pton(AF_INET6, address.c_str(), &parsed) == 1;
}

bool isIpv4(const char* text) {
  in_addr parsed{};
  return inet_pton(AF_INET, text, &parsed) == 1;
}

}  // namespace

bool fits(const std::string& text, const Bounds& bounds) {
  return checkStrLen(text, bounds.min, bounds.max);
}

Json::Value requestById(long long id) {
  Json::Value request;
  request[names::kCondition][names::kId] = static_cast<Json::Int64>(id);
  return request;
}

Json::Value requestBy(const char* column, const std::string& value) {
  Json::Value request;
  request[names::kCondition][column] = value;
  return request;
}

int firstId(const Json::Value& rows) {
  return rows.empty() ? 0 : static_cast<int>(decimalValue(rows[0U][names::kId]));
}

std::vector<long long> expiredIds(const Json::Value& rows, long long now) {
  std::vector<long long> ids;
  for (const Json::Value& row : rows) {
    if (decimalValue(row[names::kExpiredTime]) < now) ids.push_back(decimalValue(row[names::kId]));
  }
  return ids;
}

bool beginPurge(Transaction& transaction, OAUTHDBBasic& store) {
  const int code = store.GetErrCode();
  const std::string message = store.GetErrMsg();
  if (transaction.Begin()) return true;
  if (store.GetErrCode() == errors::kBusy) return false;

  store.SetErrCode(code);
  store.SetErrMsg(message);
  return true;
}

int addressError(const std::string& ip) {
  return isIpv6(ip.c_str()) || isIpv4(ip.c_str()) ? 0 : EINVAL;
}

}  // namespace KELDOAUTHSERVER
