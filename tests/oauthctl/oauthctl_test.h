// The fixture of oauthctl's tests. They run the real program, with other paths, on a real database
// that the stores have written in a new folder.

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
  int code = -1;  // the exit code, or 128 plus the signal
  std::string out, err;
  bool echo = true;  // whether the terminal shows what is typed afterwards
};

// The arguments of one run.
using Words = std::vector<std::string>;

class OauthctlTest : public StoreTest {
 protected:
  OauthctlTest();

  // Runs without a terminal. The text is standard input.
  Outcome run(const Words& words, const std::string& input = "") const;
  // Runs on a new terminal, and types the text after the prompt appears. out is all that the
  // terminal showed.
  Outcome runOnTerminal(const Words& words, const std::string& typed = "",
                        const std::string& prompt = "") const;
  // Runs as user 65534, if the tests run as root.
  Outcome runAsNobody(const Words& words) const;
  // Gives the folder and all its files to user 65534, if the tests run as root.
  void giveToNobody() const;
  // Runs with "--json", and returns the document that was printed.
  Json::Value json(const Words& words) const;

  // The exit code and the line on standard error, as "2 FILE is empty". Expects no other output.
  static std::string complaint(const Outcome& outcome);

  // Add rows through the stores; identifiers and tokens are times(64, c).
  void addClient(char identifier, const std::string& name = "Photo album") const;
  void addToken(char token, const std::string& user = "alice", std::int64_t expiry = kNow + 600,
                char client = 'c') const;
  void addCode(char code, const std::string& user = "alice", std::int64_t expiry = kNow + 600,
               char client = 'c') const;
  // Writes a value that no store would write into every row of a table.
  void plant(const std::string& table, const std::string& column, const std::string& value) const;

  std::string path(const std::string& name) const { return files_.directory() + "/" + name; }
  std::string bytesOf(const std::string& file) const;
  // Like query(), but in another file.
  static Lines queryIn(const std::string& file, const std::string& sql);
  // Every row of every table in the file.
  static Lines rowsIn(const std::string& file);

  // The program then encrypts with a key in the folder, as an installed program does.
  void useRealCipher();

  std::vector<std::string> environment_;  // additional variables, as "NAME=value"
  std::function<void()> beforeTyping_;    // called after the prompt, before the text is typed
  std::function<void()> beforeExec_;      // called in the process of the program

 private:
  pid_t start(const Words& words, int in, int out, int err, bool asNobody) const;

  std::string program_;  // run by an emulator if the machine needs one
};
