// The people who can log in, in the folder's users.json:
//   {"decoy": hash, "users": {"<name>": {"display_name": string, "password": hash}, ...}}

#pragma once

#include <optional>
#include <string>

namespace authserver {

struct User {
  std::string name, displayName;
};

// Nobody has the empty name, which stands for "not logged in".
std::optional<User> findUser(const std::string& name);

// The user, if the password is right. Takes as long for an unknown name: the decoy, the hash of a
// password that nobody knows, is tried instead.
std::optional<User> checkPassword(const std::string& name, const std::string& password);

// Argon2id, with its salt and costs in the text.
std::string passwordHash(const std::string& password);

}  // namespace authserver
