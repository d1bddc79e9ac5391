// The fixture of oauthctl's tests: the real program, apart from its fixed paths, against a real
// database that the stores have written in a fresh folder.

#pragma once

#include <json/value.h>
#include <sys/types.h>

#include <cstdint>
#include <string>
#include <vector>

#include "oauth_clientInfo.h"
#include "oauth_grantCode.h"
#include "oauth_token.h"
#include "store_test.h"

constexpr std::int64_t kNow = 1'700'000'000;  // for the program, the stores, and the database
constexpr std::int64_t kDay = 24 * 60 * 60;

struct Outcome {
  int code = -1;  // of the exit; 128 and more: the signal
  std::string out, err;
};

// The arguments of one run.
using Words = std::vector<std::string>;

class OauthctlTest : public StoreTest {
 protected:
  OauthctlTest();

  // Without a terminal: standard input is the text given.
  Outcome run(const Words& words, const std::string& input = "") const;
  // On a terminal of its own, where the text is typed once the prompt stands there; out is all that
  // the terminal showed.
  Outcome runOnTerminal(const Words& words, const std::string& typed = "",
                        const std::string& prompt = "") const;
  // run() as user 65534, if the tests run as root.
  Outcome runAsNobody(const Words& words) const;
  // The folder and all it holds now belong to user 65534, if the tests run as root.
  void giveToNobody() const;
  // The document that a run with "--json" printed.
  Json::Value json(const Words& words) const;

  // Whole outcomes, as tests want them most: a line of its own on standard error, nothing else.
  static std::string complaint(const Outcome& outcome);

  // Rows by the stores themselves; identifiers and tokens are times(64, c).
  void addClient(char identifier, const std::string& name = "Photo album") const;
  void addToken(char token, const std::string& user = "alice", std::int64_t expiry = kNow + 600,
                char client = 'c') const;
  void addCode(char code, const std::string& user = "alice", std::int64_t expiry = kNow + 600,
               char client = 'c') const;
  // A value that no store would write, into every row of a table.
  void plant(const std::string& table, const std::string& column, const std::string& value) const;

  std::string path(const std::string& name) const { return files_.directory() + "/" + name; }
  std::string bytesOf(const std::string& file) const;
  // As query() of the fixture, in another file.
  static Lines queryIn(const std::string& file, const std::string& sql);
  // Every row of the file, of whatever table.
  static Lines rowsIn(const std::string& file);

  // The program encrypts with a key in the folder, as it does where it is installed.
  void useRealCipher();

  std::vector<std::string> environment_;  // more of it, as "NAME=value"
  std::function<void()> beforeTyping_;    // while the program runs already
  std::function<void()> beforeExec_;      // in the process that becomes the program

 private:
  pid_t start(const Words& words, int in, int out, int err, bool asNobody) const;

  std::string program_;  // runs behind an emulator where the machine needs one
};
