// The settings in force, and where each comes from.

#pragma once

#include <string>
#include <vector>

namespace oauthctl {

struct Setting {
  std::string name;
  int value;  // as the library has it
  std::string origin;
  bool isIgnored;  // the file names it in vain
};

struct SettingsReport {
  std::vector<Setting> settings;
  // What is wrong with the file as a whole; "" if nothing is, or if there is no file.
  std::string problem;
  std::vector<std::string> unknownNames;
};

SettingsReport readSettings();

}  // namespace oauthctl
