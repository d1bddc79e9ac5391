#include "form_encoding.h"

#include <charconv>

namespace authserver {
namespace {

bool isUnreserved(unsigned char c) {  // RFC 3986, section 2.3
  return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

std::string encoded(const std::string& value) {
  constexpr char kHexDigits[] = "0123456789ABCDEF";
  std::string result;
  for (const unsigned char c : value) {
    if (isUnreserved(c))
      result += static_cast<char>(c);
    else
      result.append({'%', kHexDigits[c >> 4], kHexDigits[c & 15]});
  }
  return result;
}

}  // namespace

std::string formEncoded(const Fields& fields) {
  std::string result;
  for (const auto& [name, value] : fields) {
    if (!result.empty()) result += '&';
    result += encoded(name) + '=' + encoded(value);
  }
  return result;
}

std::optional<std::string> formDecoded(const std::string& text) {
  std::string result;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '%') {
      result += text[i] == '+' ? ' ' : text[i];
      continue;
    }
    if (text.size() - i < 3) return std::nullopt;
    unsigned char byte = 0;
    const char* const digits = text.data() + i + 1;
    if (std::from_chars(digits, digits + 2, byte, 16).ptr != digits + 2) return std::nullopt;
    result += static_cast<char>(byte);
    i += 2;
  }
  return result;
}

}  // namespace authserver
