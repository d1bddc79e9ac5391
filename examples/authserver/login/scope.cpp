#include "scope.h"

#include <algorithm>
#include <sstream>

#include "joined.h"
#include "refusal.h"

namespace authserver {
namespace {

// Bytes. A list must fit into the column "state" behind a digest.
constexpr std::size_t kLongestList = 1024;

bool isScopeCharacter(char c) { return c == '!' || (c >= '#' && c <= '~' && c != '\\'); }

bool isScope(const std::string& word) {
  return std::all_of(word.begin(), word.end(), isScopeCharacter);
}

}  // namespace

const std::vector<ScopeMeaning>& knownScopes() {
  static const std::vector<ScopeMeaning> scopes = {
      {"read", "See your photos and albums"},
      {"write", "Add, change and delete your photos and albums"},
      {kProfileScope, "Know your name"},
  };
  return scopes;
}

std::string meaningOf(const std::string& scope) {
  for (const ScopeMeaning& known : knownScopes())
    if (known.name == scope) return known.words;
  return scope;
}

void checkScopes(const std::string& list) {
  for (const std::string& word : scopesOf(list))
    if (!isScope(word)) throw invalidScope("The scope holds characters that no scope has.");
}

std::vector<std::string> scopesOf(const std::string& list) {
  std::vector<std::string> scopes;
  std::istringstream words(list);
  for (std::string scope; std::getline(words, scope, ' ');)
    if (!scope.empty() && std::find(scopes.begin(), scopes.end(), scope) == scopes.end())
      scopes.push_back(scope);
  return scopes;
}

bool contains(const std::string& list, const std::string& scope) {
  const std::vector<std::string> scopes = scopesOf(list);
  return std::find(scopes.begin(), scopes.end(), scope) != scopes.end();
}

std::string grantable(const std::string& requested, const std::string& registered) {
  checkScopes(requested);
  std::vector<std::string> scopes = scopesOf(requested.empty() ? registered : requested);
  scopes.erase(std::remove_if(scopes.begin(), scopes.end(),
                              [&](const std::string& scope) {
                                return scope == kIntrospectScope || !isScope(scope) ||
                                       !contains(registered, scope);
                              }),
               scopes.end());
  if (scopes.empty()) throw invalidScope("The client is registered for none of these scopes.");
  std::string list = joined(scopes, " ");
  if (list.size() > kLongestList) throw invalidScope("The list of scopes is too long.");
  return list;
}

std::string narrowed(const std::string& requested, const std::string& granted) {
  checkScopes(requested);
  const std::vector<std::string> scopes = scopesOf(requested);
  for (const std::string& scope : scopes)
    if (!contains(granted, scope)) throw invalidScope("A scope was not granted.");
  return scopes.empty() ? granted : joined(scopes, " ");
}

}  // namespace authserver
