// Addresses of callers, kept beside codes and tokens.

#pragma once

#include <boost/asio/ip/address.hpp>
#include <string>

namespace ZEVOOAUTHSERVER {

// Why the text is not an IP address of version 4 or 6; empty if it is one, or if it is empty.
inline std::string addressError(const std::string& ip) {
  boost::system::error_code error;
  boost::asio::ip::make_address(ip, error);
  return ip.empty() || !error ? std::string() : error.message();
}

}  // namespace ZEVOOAUTHSERVER
