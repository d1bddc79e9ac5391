// A file that appears under its name only when it is whole, and never in another one's place.
//
// It is written and read through the descriptor that made it, and named relative to a folder that
// stays open. So nobody who can write to that folder can put another file in its place.

#pragma once

#include <csignal>
#include <string>

#include "descriptor.h"
#include "effective_ids.h"

namespace oauthctl {

class NewFile {
 public:
  // A file of mode 0600, made and named with the ids that the process has now. Throws if the name
  // is taken.
  explicit NewFile(const std::string& path);
  // The same in a folder that is open already; the path is for messages, its last part the name.
  NewFile(int folder, const std::string& path);
  // Removes it, unless it was published. A signal that ends the program leaves nothing either.
  ~NewFile();
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;

  void append(const char* bytes, std::size_t count);
  void append(const std::string& bytes) { append(bytes.data(), bytes.size()); }
  // What a reader will find in it.
  std::string contents() const;
  // Brings its contents to the disk and gives it its name. Throws if the name has been taken.
  void publish();

 private:
  NewFile(const std::string& path, Descriptor folder);
  void requireFreeName() const;
  void makeUnnamed();
  void makeNamed();
  bool name() const;
  bool nameTemporary();

  const std::string path_, name_;
  const Ids maker_;
  const Descriptor folder_;
  Descriptor file_;
  // Its temporary name, where the file system cannot make a file without one. Signals that end the
  // program are held until that name is gone.
  std::string temporary_;
  sigset_t signalsBefore_ = {};
};

}  // namespace oauthctl
