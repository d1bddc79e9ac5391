// authserver_setup: makes the folder of a server, adds users and registers clients.

#include <sodium.h>
#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>

#include "configuration.h"
#include "control_characters.h"
#include "oauth_clientInfo.h"
#include "random_bytes.h"
#include "redirect_uri.h"
#include "scope.h"
#include "users.h"

namespace authserver {
namespace {

// Replaces the old file in one step: no program ever reads half a file.
void writeFile(const std::string& path, const std::string& content) {
  const std::string unfinished = path + ".new";
  std::ofstream file(unfinished, std::ios::binary | std::ios::trunc);
  file << content;
  file.close();
  if (!file) throw std::runtime_error("cannot write " + unfinished);
  std::filesystem::rename(unfinished, path);
}

void writeJsonFile(const std::string& path, const Json::Value& document) {
  writeFile(path, document.toStyledString());
}

void init(const std::string& folder, const std::string& issuer) {
  if (!isOrigin(issuer))
    throw std::runtime_error("the issuer must be https://HOST[:PORT], or http on this machine");
  std::filesystem::create_directories(folder);
  if (std::filesystem::exists(configurationPath("config.json")))
    throw std::runtime_error(folder + " is set up already");
  Json::Value users;
  users["decoy"] = passwordHash(randomBytes(32));
  users["users"] = Json::Value(Json::objectValue);
  writeJsonFile(configurationPath("users.json"), users);
  writeFile(configurationPath("session.key"), randomBytes(32));
  Json::Value configuration;
  configuration["issuer"] = issuer;
  writeJsonFile(configurationPath("config.json"), configuration);
}

// The first line of standard input. It may end with CR LF.
std::string givenPassword() {
  std::string password;
  std::getline(std::cin, password);
  if (!password.empty() && password.back() == '\r') password.pop_back();
  if (password.size() < 8 || password.size() > 1024 || hasControlCharacters(password))
    throw std::runtime_error("a password has 8 to 1024 bytes and no control characters");
  return password;
}

void addUser(const std::string& name, const std::string& displayName) {
  constexpr std::size_t kLongestName = 256;  // bytes, the limit of the stores
  if (name.empty() || name.size() > kLongestName || hasControlCharacters(name))
    throw std::runtime_error("a name has 1 to 256 bytes and no control characters");
  const std::string password = givenPassword();
  Json::Value document = readJsonFile(configurationPath("users.json"));
  if (document["users"].isMember(name)) throw std::runtime_error("there is a user of that name");
  Json::Value& user = document["users"][name];
  user["display_name"] = displayName;
  user["password"] = passwordHash(password);
  writeJsonFile(configurationPath("users.json"), document);
}

// Prints identifier and secret. The secret is not shown again.
void addClient(const std::string& redirectUri, const std::string& scope, const std::string& name) {
  if (!isRegistrable(redirectUri))
    throw std::runtime_error(
        "the redirect URI must be https, http on this machine, or an app's (com.example.app:/...)");
  checkScopes(scope);
  ZEVOOAUTHSERVER::OAUTHDBClientInfo clients("oauth_clientInfo");
  Json::Value registered;
  if (!clients.Add(redirectUri, scope, name, registered))
    throw std::runtime_error("cannot register: " + clients.GetErrMsg());
  std::cout << registered.toStyledString();
}

int run(int argc, char** argv) {
  umask(S_IRWXG | S_IRWXO);
  std::string folder, issuer, user, redirectUri, scope, name;
  const auto useFolder = [&] { setenv("AUTHSERVER_FOLDER", folder.c_str(), 1); };
  CLI::App program("Sets up the example authorization server.");
  program.require_subcommand(1);

  CLI::App* const makeFolder = program.add_subcommand("init", "Make the server's folder.");
  makeFolder->add_option("FOLDER", folder)->required();
  makeFolder->add_option("--issuer", issuer, "The server's URL")->required();
  makeFolder->callback([&] { useFolder(), init(folder, issuer); });

  CLI::App* const addPerson =
      program.add_subcommand("add-user", "Add a user; the password comes on standard input.");
  addPerson->add_option("FOLDER", folder)->required();
  addPerson->add_option("NAME", user)->required();
  addPerson->add_option("--display-name", name)->required();
  addPerson->callback([&] { useFolder(), addUser(user, name); });

  CLI::App* const addApplication =
      program.add_subcommand("add-client", "Register a client; its secret is told once.");
  addApplication->add_option("--redirect-uri", redirectUri)->required();
  addApplication->add_option("--scope", scope)->required();
  addApplication->add_option("--name", name)->required();
  addApplication->callback([&] { addClient(redirectUri, scope, name); });

  CLI11_PARSE(program, argc, argv);
  return 0;
}

}  // namespace
}  // namespace authserver

int main(int argc, char** argv) try {
  if (sodium_init() < 0) throw std::runtime_error("no randomness");
  return authserver::run(argc, argv);
} catch (const std::exception& error) {
  std::cerr << "authserver_setup: " << error.what() << '\n';
  return 1;
}
