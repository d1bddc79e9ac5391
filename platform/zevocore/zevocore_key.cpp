#include "zevocore_key.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

#include "utils/descriptor.h"

namespace zevocore {
namespace {

using ZEVOOAUTHSERVER::Descriptor;

// Returns nothing on any failure; errno is then ENOENT only if there is no such file.
std::optional<Key> readKey(const std::string& path) {
  // Do not follow a link, and do not wait for a writer if it is a pipe.
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.isOpen()) return std::nullopt;
  errno = EINVAL;
  Key key;
  struct stat status;
  if (fstat(file.value(), &status) != 0 || !S_ISREG(status.st_mode) ||
      status.st_size != static_cast<off_t>(key.size()) ||
      read(file.value(), key.data(), key.size()) != static_cast<ssize_t>(key.size()))
    return std::nullopt;
  return key;
}

bool writeRandomKey(int descriptor) {
  Key key;
  return getentropy(key.data(), key.size()) == 0 && fchmod(descriptor, S_IRUSR | S_IWUSR) == 0 &&
         write(descriptor, key.data(), key.size()) == static_cast<ssize_t>(key.size()) &&
         fsync(descriptor) == 0;
}

// Writes a temporary file and links it to the key's name. The link fails if a key exists already,
// so the first process wins and the others use its key. A process that is killed before the end
// leaves its temporary file behind, with mode 0600 like the key.
void makeKey(const std::string& directory, const std::string& path) {
  std::string temporary = directory + "/.zevocore.key.XXXXXX";
  const Descriptor file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file.isOpen()) return;
  const bool linked = writeRandomKey(file.value()) && link(temporary.c_str(), path.c_str()) == 0;
  unlink(temporary.c_str());
  if (!linked) return;
  const Descriptor folder(open(directory.c_str(), O_RDONLY | O_CLOEXEC | O_DIRECTORY));
  if (folder.isOpen()) fsync(folder.value());
}

}  // namespace

std::optional<Key> loadKey(const std::string& directory) {
  const std::string path = directory + "/zevocore.key";
  const std::optional<Key> key = readKey(path);
  if (key || errno != ENOENT) return key;
  makeKey(directory, path);
  return readKey(path);
}

}  // namespace zevocore
