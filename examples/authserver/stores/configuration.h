// The folder that authserver_setup makes. The environment variable AUTHSERVER_FOLDER names it.

#pragma once

#include <json/value.h>

#include <string>

namespace authserver {

// Path of a file in the folder.
std::string configurationPath(const std::string& name);

std::string readFile(const std::string& path);
Json::Value readJsonFile(const std::string& path);

// The server's own name (RFC 8414), without a slash at its end: "https://login.example".
std::string issuer();

// The key that signs sessions, 32 bytes.
std::string sessionKey();

}  // namespace authserver
