// The settings in force, and where each value comes from.

#pragma once

#include <string>
#include <vector>

namespace oauthctl {

struct SettingInForce {
  std::string name;
  int value;  // the value that the library uses
  std::string origin;
  bool isIgnored;  // set in the file, but invalid
};

struct SettingsReport {
  std::vector<SettingInForce> settings;
  // What is wrong with the whole file; "" if nothing is wrong or there is no file.
  std::string problem;
  std::vector<std::string> unknownNames;
};

SettingsReport readSettings();

}  // namespace oauthctl
