// A new file that gets its name only when it is complete.
//
// It is written and read through one descriptor, and named relative to a folder that stays open. So
// nobody who can write to that folder can put another file in its place.

#pragma once

#include <csignal>
#include <string>

#include "database/effective_ids.h"
#include "descriptor.h"

namespace oauthctl {

class NewFile {
 public:
  // What becomes of a file that has the name.
  enum class Existing { kRefuse, kReplace };

  // Makes a file of mode 0600. It is made and named with the current ids of the process. Throws if
  // the name is taken.
  explicit NewFile(const std::string& path);
  // The same in a folder that is open already. The last part of the path is the name; messages show
  // all of it.
  NewFile(int folder, const std::string& path, Existing existing = Existing::kRefuse);
  // Removes the file, unless it was published. A signal that ends the program leaves nothing
  // either.
  ~NewFile();
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;

  void append(const char* bytes, std::size_t count);
  void append(const std::string& bytes) { append(bytes.data(), bytes.size()); }
  // Reads the file again.
  std::string contents() const;
  // Writes the contents to the disk.
  void bringToDisk() const;
  // Writes the contents to the disk and gives the file its name. Throws if the name has been taken,
  // unless that file is to be replaced: then the name is never without a file.
  void publish();

 private:
  NewFile(const std::string& path, ZEVOOAUTHSERVER::Descriptor folder, Existing existing);
  void requireFreeName() const;
  void makeUnnamed();
  void makeNamed();
  void takeTemporaryName();
  bool linkByDescriptor(const std::string& name) const;
  bool renameTemporary() const;
  bool replaceExisting();
  void requireOwnName() const;

  const std::string path_, name_;
  const Existing existing_;
  const Ids maker_;
  const ZEVOOAUTHSERVER::Descriptor folder_;
  ZEVOOAUTHSERVER::Descriptor file_;
  // The temporary name, if the file system cannot make a file without a name, or if a file is
  // replaced. Signals that end the program are blocked until that name is gone.
  std::string temporary_;
  sigset_t signalsBefore_ = {};
};

}  // namespace oauthctl
