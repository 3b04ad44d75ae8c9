// Addresses of the network as those see them who count and log.

#ifndef KELDOAUTH_SERVICE_PEOPLE_ADDRESS_H
#define KELDOAUTH_SERVICE_PEOPLE_ADDRESS_H

#include <string>

namespace keldoauth::service {

/// Whom an address stands for: an IPv4 address for itself, also as IPv6 writes it
/// (::ffff:192.0.2.1), and an IPv6 address for its /64, of which one household
/// has them all. Other texts, the empty one too, stand for "unknown".
std::string neighbourhood(const std::string& peer);

/// The address in one spelling, "unknown" for what is none.
std::string loggedAddress(const std::string& peer);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_ADDRESS_H
