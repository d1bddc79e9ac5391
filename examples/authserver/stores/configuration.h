// The folder that authserver_setup made, named by the variable AUTHSERVER_FOLDER.

#pragma once

#include <json/value.h>

#include <string>

namespace authserver {

// Path of a file in the folder.
std::string configurationPath(const std::string& name);

std::string readFile(const std::string& path);
Json::Value readJsonFile(const std::string& path);

// The server's own name, for example "https://login.example" (RFC 8414): no slash at its end.
std::string issuer();

// What sessions are signed with, 32 bytes.
std::string sessionKey();

}  // namespace authserver
