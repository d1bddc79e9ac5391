#include "configuration.h"

#include <json/reader.h>

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace authserver {

std::string configurationPath(const std::string& name) {
  const char* const folder = std::getenv("AUTHSERVER_FOLDER");
  if (folder == nullptr) throw std::runtime_error("AUTHSERVER_FOLDER is not set");
  return std::string(folder) + '/' + name;
}

std::string readFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::ostringstream content;
  content << file.rdbuf();
  if (!file) throw std::runtime_error("cannot read " + path);
  return content.str();
}

Json::Value readJsonFile(const std::string& path) {
  std::istringstream content(readFile(path));
  Json::Value document;
  std::string problem;
  if (!Json::parseFromStream(Json::CharReaderBuilder(), content, &document, &problem))
    throw std::runtime_error(path + ": " + problem);
  return document;
}

std::string issuer() { return readJsonFile(configurationPath("config.json"))["issuer"].asString(); }

std::string sessionKey() { return readFile(configurationPath("session.key")); }

}  // namespace authserver
