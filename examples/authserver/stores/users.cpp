#include "users.h"

#include <sodium.h>

#include <stdexcept>

#include "configuration.h"

namespace authserver {
namespace {

// An appliance with little memory can serve several logins at once, and each guess still costs some
// ten milliseconds of a fast processor.
constexpr unsigned long long kPasses = 3;
constexpr std::size_t kMemory = 12UL * 1024 * 1024;  // bytes

Json::Value usersFile() { return readJsonFile(configurationPath("users.json")); }

}  // namespace

std::optional<User> findUser(const std::string& name) {
  const Json::Value users = usersFile()["users"];
  if (name.empty() || !users.isMember(name)) return std::nullopt;
  return User{name, users[name]["display_name"].asString()};
}

std::optional<User> checkPassword(const std::string& name, const std::string& password) {
  const Json::Value content = usersFile();
  const Json::Value& users = content["users"];
  const bool known = !name.empty() && users.isMember(name);
  const std::string hash = known ? users[name]["password"].asString() : content["decoy"].asString();
  const bool right = crypto_pwhash_str_verify(hash.c_str(), password.c_str(), password.size()) == 0;
  if (!known || !right) return std::nullopt;
  return User{name, users[name]["display_name"].asString()};
}

std::string passwordHash(const std::string& password) {
  char hash[crypto_pwhash_STRBYTES];
  if (crypto_pwhash_str_alg(hash, password.c_str(), password.size(), kPasses, kMemory,
                            crypto_pwhash_ALG_ARGON2ID13) != 0)
    throw std::runtime_error("not enough memory to hash a password");
  return hash;
}

}  // namespace authserver
