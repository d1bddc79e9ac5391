#include "oauthctl_test.h"

#include <json/reader.h>
#include <pty.h>
#include <sqlite3.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <thread>

using namespace ZEVOOAUTHSERVER;

namespace {

constexpr unsigned kNobody = 65534;

std::string readAll(int descriptor) {
  std::string text;
  char block[4096];
  // If the other side of a terminal is closed, read() fails instead of returning 0.
  for (ssize_t count = 0; (count = read(descriptor, block, sizeof block)) > 0;)
    text.append(block, static_cast<std::size_t>(count));
  close(descriptor);
  return text;
}

void writeAll(int descriptor, const std::string& text) {
  std::size_t done = 0;
  while (done < text.size()) {
    const ssize_t count = write(descriptor, text.data() + done, text.size() - done);
    if (count <= 0) return;
    done += static_cast<std::size_t>(count);
  }
}

int exitOf(pid_t child) {
  int status = 0;
  waitpid(child, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

struct Pipe {
  Pipe() {
    if (pipe(ends) != 0) throw std::runtime_error("no pipe");
  }
  int ends[2];
};

// The leak checker cannot trace a program that takes the ids of another user.
void skipLeakCheck(const std::string& folder) {
  struct stat status = {};
  if (getuid() != 0 || stat(folder.c_str(), &status) != 0 || status.st_uid == 0) return;
  const char* const options = std::getenv("ASAN_OPTIONS");
  const std::string more = (options == nullptr ? "" : options + std::string(":"));
  setenv("ASAN_OPTIONS", (more + "detect_leaks=0").c_str(), 1);
}

}  // namespace

OauthctlTest::OauthctlTest() : program_(OAUTHCTL_PROGRAM) { clock_.set(kNow); }

void OauthctlTest::useRealCipher() { program_ = OAUTHCTL_PROGRAM_WITH_KEY; }

pid_t OauthctlTest::start(const Words& words, int in, int out, int err, bool asNobody) const {
  Words all;
  std::istringstream emulator(OAUTHCTL_EMULATOR);
  for (std::string word; emulator >> word;) all.push_back(word);
  all.push_back(program_);
  all.insert(all.end(), words.begin(), words.end());
  std::vector<char*> arguments;
  arguments.reserve(all.size() + 1);
  for (std::string& word : all) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  const pid_t child = fork();
  if (child != 0) return child;
  // Keys such as Ctrl-C only reach a program that controls the terminal.
  if (setsid() > 0 && isatty(in) != 0) ioctl(in, TIOCSCTTY, 0);
  dup2(in, STDIN_FILENO);
  dup2(out, STDOUT_FILENO);
  dup2(err, STDERR_FILENO);
  for (int descriptor = 3; descriptor < 64; ++descriptor) close(descriptor);
  setenv("OAUTHCTL_FOLDER", files_.directory().c_str(), 1);
  setenv("OAUTHCTL_NOW", std::to_string(clock_.now()).c_str(), 1);
  setenv("TZ", "UTC", 1);
  setenv("LC_ALL", "C.UTF-8", 1);
  for (const char* const variable : {"NO_COLOR", "TERM"}) unsetenv(variable);
  skipLeakCheck(files_.directory());
  for (const std::string& variable : environment_)
    putenv(strdup(variable.c_str()));  // the new program inherits it
  if (asNobody) setenv("OAUTHCTL_USER", std::to_string(kNobody).c_str(), 1);
  // The tests may run with these signals ignored, for example in the background of a shell.
  for (const int ending : {SIGINT, SIGTERM, SIGHUP}) std::signal(ending, SIG_DFL);
  alarm(120);  // ends a program that waits for ever
  if (beforeExec_) beforeExec_();
  execvp(arguments.front(), arguments.data());
  _exit(98);
}

Outcome OauthctlTest::run(const Words& words, const std::string& input) const {
  Pipe in, out, err;
  const pid_t child = start(words, in.ends[0], out.ends[1], err.ends[1], false);
  close(out.ends[1]);
  close(err.ends[1]);
  writeAll(in.ends[1], input);  // no SIGPIPE: this process also has the reading end open
  close(in.ends[0]);
  close(in.ends[1]);
  Outcome outcome;
  std::thread errors([&] { outcome.err = readAll(err.ends[0]); });
  outcome.out = readAll(out.ends[0]);
  errors.join();
  outcome.code = exitOf(child);
  return outcome;
}

Outcome OauthctlTest::runOnTerminal(const Words& words, const std::string& typed,
                                    const std::string& prompt) const {
  int master = -1, slave = -1;
  if (openpty(&master, &slave, nullptr, nullptr, nullptr) != 0)
    throw std::runtime_error("no terminal");
  const pid_t child = start(words, slave, slave, slave, false);
  close(slave);
  Outcome outcome;
  for (char c = 0; outcome.out.find(prompt) == std::string::npos && read(master, &c, 1) == 1;)
    outcome.out += c;
  if (beforeTyping_) beforeTyping_();
  writeAll(master, typed);
  const int terminal = dup(master);
  outcome.out += readAll(master);  // closes it
  outcome.code = exitOf(child);
  termios settings = {};
  EXPECT_EQ(0, tcgetattr(terminal, &settings));
  close(terminal);
  outcome.echo = (settings.c_lflag & static_cast<tcflag_t>(ECHO)) != 0;
  return outcome;
}

Outcome OauthctlTest::runAsNobody(const Words& words) const {
  Pipe out, err;
  const pid_t child = start(words, STDIN_FILENO, out.ends[1], err.ends[1], getuid() == 0);
  close(out.ends[1]);
  close(err.ends[1]);
  Outcome outcome;
  outcome.out = readAll(out.ends[0]);
  outcome.err = readAll(err.ends[0]);
  outcome.code = exitOf(child);
  return outcome;
}

void OauthctlTest::giveToNobody() const {
  if (getuid() != 0) return;
  EXPECT_EQ(0, chown(files_.directory().c_str(), kNobody, kNobody));
  for (const auto& entry : std::filesystem::directory_iterator(files_.directory()))
    EXPECT_EQ(0, lchown(entry.path().c_str(), kNobody, kNobody));
}

Json::Value OauthctlTest::json(const Words& words) const {
  Words all = words;
  all.emplace_back("--json");
  const Outcome outcome = run(all);
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value document;
  std::string errors;
  const char* const text = outcome.out.c_str();
  EXPECT_TRUE(reader->parse(text, text + outcome.out.size(), &document, &errors))
      << errors << outcome.out << outcome.err;
  return document;
}

std::string OauthctlTest::complaint(const Outcome& outcome) {
  constexpr char kName[] = "oauthctl: ";
  EXPECT_EQ("", outcome.out);
  EXPECT_EQ(1, std::count(outcome.err.begin(), outcome.err.end(), '\n')) << outcome.err;
  if (outcome.err.rfind(kName, 0) != 0) return "unnamed: " + outcome.err;
  const std::string line = outcome.err.substr(std::strlen(kName));
  return std::to_string(outcome.code) + " " + line.substr(0, line.find('\n'));
}

void OauthctlTest::addClient(char identifier, const std::string& name) const {
  Json::Value result;
  OAUTHDBClientInfo clients("oauth_clientInfo");
  EXPECT_TRUE(clients.Add(times(64, identifier), times(64, 's'), "https://album.example/callback",
                          "read write", name, "1", result));
}

void OauthctlTest::addToken(char token, const std::string& user, std::int64_t expiry,
                            char client) const {
  Json::Value result;
  OAUTHDBToken tokens("oauth_token");
  EXPECT_TRUE(tokens.Add(user, times(64, client), "read", times(64, 'r'), times(64, token),
                         std::to_string(expiry), "code", "xyz", "192.0.2.7", result));
}

void OauthctlTest::addCode(char code, const std::string& user, std::int64_t expiry,
                           char client) const {
  Json::Value result;
  OAUTHDBGrantCode codes("oauth_grantCode");
  EXPECT_TRUE(codes.Add(user, times(64, client), "read", times(64, code), std::to_string(expiry),
                        "xyz", "192.0.2.7", result));
}

void OauthctlTest::plant(const std::string& table, const std::string& column,
                         const std::string& value) const {
  std::string hexadecimal;
  for (const char c : value) {
    char digits[3];
    std::snprintf(digits, sizeof digits, "%02x", static_cast<unsigned char>(c));
    hexadecimal += digits;
  }
  std::string sql = "UPDATE ";
  sql.append(table).append(" SET ").append(column);
  execute(sql.append(" = CAST(x'").append(hexadecimal).append("' AS TEXT)"));
}

std::string OauthctlTest::bytesOf(const std::string& file) const {
  std::ifstream stream(file, std::ios::binary);
  std::ostringstream bytes;
  bytes << stream.rdbuf();
  return bytes.str();
}

Lines OauthctlTest::queryIn(const std::string& file, const std::string& sql) {
  sqlite3* handle = nullptr;
  Lines rows;
  const auto collect = [](void* context, int columns, char** values, char**) {
    std::string row;
    for (int i = 0; i < columns; ++i)
      row.append(i > 0 ? "|" : "").append(values[i] == nullptr ? "NULL" : values[i]);
    static_cast<Lines*>(context)->push_back(row);
    return 0;
  };
  const bool done =
      sqlite3_open_v2(file.c_str(), &handle, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK &&
      sqlite3_exec(handle, sql.c_str(), collect, &rows, nullptr) == SQLITE_OK;
  if (!done) rows = {std::string("failed: ") + sqlite3_errmsg(handle)};
  sqlite3_close_v2(handle);
  return rows;
}

Lines OauthctlTest::rowsIn(const std::string& file) {
  Lines all;
  for (const std::string& table :
       queryIn(file, "SELECT name FROM sqlite_master WHERE type='table'"))
    for (const std::string& row : queryIn(file, "SELECT * FROM " + table))
      all.push_back(std::string(table).append("|").append(row));
  std::sort(all.begin(), all.end());
  return all;
}
