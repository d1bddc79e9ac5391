// The people who can log in. They are stored in the folder's users.json:
//   {"decoy": hash, "users": {"<name>": {"display_name": string, "password": hash}, ...}}

#pragma once

#include <optional>
#include <string>

namespace authserver {

struct User {
  std::string name, displayName;
};

// The user with that name. No user has the empty name, which means "not logged in".
std::optional<User> findUser(const std::string& name);

// The user, if the password is right. An unknown name takes as long as a wrong password: it is
// checked against the decoy, the hash of a password that nobody knows.
std::optional<User> checkPassword(const std::string& name, const std::string& password);

// The hash by Argon2id, a text that includes salt and costs.
std::string passwordHash(const std::string& password);

}  // namespace authserver
