// Scopes: their meaning in words, and comparisons of lists of them (RFC 6749, section 3.3).

#pragma once

#include <string>
#include <vector>

namespace authserver {

// Lets a client see the data of every access token. A user cannot grant it.
inline constexpr char kIntrospectScope[] = "introspect";
// The user information endpoint requires it.
inline constexpr char kProfileScope[] = "profile";

struct ScopeMeaning {
  std::string name, words;
};
// The scopes that this server knows, for the consent page and the metadata.
const std::vector<ScopeMeaning>& knownScopes();

// The meaning in words, or the name itself if this server does not know the scope.
std::string meaningOf(const std::string& scope);

// Refuses a list with a character that no scope can have.
void checkScopes(const std::string& list);

// The single scopes of a list, each once.
std::vector<std::string> scopesOf(const std::string& list);
bool contains(const std::string& list, const std::string& scope);

// The part of the requested list that the client is registered for and that a user can grant. An
// empty request means everything registered. Refuses if nothing remains. Other programs can
// register clients too: words of a registration that are not valid scopes are ignored.
std::string grantable(const std::string& requested, const std::string& registered);

// The scopes of a refresh: the requested ones, or all that were granted if the request is empty.
// Refuses a scope that was not granted (RFC 6749, section 6).
std::string narrowed(const std::string& requested, const std::string& granted);

}  // namespace authserver
