// A file that appears under its name only when it is whole, and never in another one's place.

#pragma once

#include <string>

namespace oauthctl {

class NewFile {
 public:
  // Makes an empty file of mode 0600 beside the target.
  explicit NewFile(const std::string& target);
  // Removes it, unless it was published. So do signals that end the program.
  ~NewFile();
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;

  // Where it is for now.
  const std::string& path() const { return path_; }
  // Brings its contents to the disk and gives it its name. Throws if the name has been taken.
  void publish();

 private:
  const std::string target_;
  std::string path_;
};

// Throws unless the name is free.
void requireFreeName(const std::string& path);

// The folder part of a path, "." if it has none.
std::string folderOf(const std::string& path);

}  // namespace oauthctl
