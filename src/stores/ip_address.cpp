#include "ip_address.h"

#include <boost/asio/ip/address.hpp>

namespace ZEVOOAUTHSERVER {

std::string addressError(const std::string& ip) {
  boost::system::error_code error;
  boost::asio::ip::make_address(ip, error);
  return ip.empty() || !error ? std::string() : error.message();
}

}  // namespace ZEVOOAUTHSERVER
