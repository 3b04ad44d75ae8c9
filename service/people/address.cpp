#include "service/people/address.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>

namespace keldoauth::service {
namespace {

constexpr char kUnknown[] = "unknown";
constexpr std::size_t kNetworkBytes = 8;  // of the 16

template <typename Address>
std::string spelled(int family, const Address& address) {
  std::array<char, INET6_ADDRSTRLEN> text{};
  const char* spelling = inet_ntop(family, &address, text.data(), text.size());
  return spelling == nullptr ? kUnknown : spelling;
}

std::string spelled(const in6_addr& address) {
  if (!IN6_IS_ADDR_V4MAPPED(&address)) return spelled(AF_INET6, address);
  in_addr mapped{};
  std::copy_n(std::end(address.s6_addr) - sizeof mapped, sizeof mapped,
              reinterpret_cast<unsigned char*>(&mapped));
  return spelled(AF_INET, mapped);
}

}  // namespace

std::string neighbourhood(const std::string& peer) {
  in6_addr address{};
  if (inet_pton(AF_INET6, peer.c_str(), &address) != 1 || IN6_IS_ADDR_V4MAPPED(&address)) {
    return loggedAddress(peer);
  }
  std::fill(std::begin(address.s6_addr) + kNetworkBytes, std::end(address.s6_addr), 0);
  return spelled(address) + "/64";
}

std::string loggedAddress(const std::string& peer) {
  in_addr four{};
  if (inet_pton(AF_INET, peer.c_str(), &four) == 1) return spelled(AF_INET, four);
  in6_addr six{};
  return inet_pton(AF_INET6, peer.c_str(), &six) == 1 ? spelled(six) : kUnknown;
}

}  // namespace keldoauth::service
