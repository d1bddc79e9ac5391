// Scopes: what they mean in words, and how sets of them are compared (RFC 6749, section 3.3).

#pragma once

#include <string>
#include <vector>

namespace authserver {

// What a client may do by itself, and nobody is asked for: see every access token's data.
inline constexpr char kIntrospectScope[] = "introspect";
// What the user information endpoint asks for.
inline constexpr char kProfileScope[] = "profile";

struct ScopeMeaning {
  std::string name, words;
};
// The scopes that this server knows, for the consent page and the metadata.
const std::vector<ScopeMeaning>& knownScopes();

// In words; the name itself of a scope that this server does not know.
std::string meaningOf(const std::string& scope);

// Refuses characters that a scope cannot have.
void checkScopes(const std::string& list);

// The single scopes of a list, each once.
std::vector<std::string> scopesOf(const std::string& list);
bool contains(const std::string& list, const std::string& scope);

// What a client asks for at first, as far as it is registered and a user can grant it; everything
// so registered if it asks for nothing in particular. Refuses if that leaves nothing. A
// registration may come from other programs, and what is no scope in it is never granted.
std::string grantable(const std::string& asked, const std::string& registered);

// What a refresh asks for, all that was granted if it asks for nothing in particular. Refuses what
// was not granted (RFC 6749, section 6).
std::string narrowed(const std::string& asked, const std::string& granted);

}  // namespace authserver
