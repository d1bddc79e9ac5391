// The fixture of every store test: a fresh directory, a fake clock, a fake host, fake ids and a
// captured system log, around the shared library that ships.

#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <functional>
#include <string>
#include <vector>

#include "captured_syslog.h"
#include "fake_clock.h"
#include "fake_host.h"
#include "fake_ids.h"
#include "oauth_db_basic.h"
#include "redirected_files.h"

using Lines = std::vector<std::string>;

class StoreTest : public testing::Test {
 protected:
  // Replaces the settings file.
  void writeSettings(const std::string& text) const;
  void createDebugMarker() const;

  // Runs the body on a new thread with diagnostics on and this level mask. The switch and the
  // level are kept per thread, so tests never turn them on for the main one.
  template <class Body>
  void withDiagnostics(int mask, Body body) const {
    writeSettings("{\"log_level\": " + std::to_string(mask) + "}");
    createDebugMarker();
    onFreshThread(body);
  }
  template <class Body>
  static void onFreshThread(Body body) {
    runOnThread(body);
  }

  // Statements on the database file by a connection of the test's own. query() gives each row
  // with its values joined by '|', an SQL NULL as "NULL".
  Lines query(const std::string& sql) const;
  void execute(const std::string& sql) const;
  // The number of rows of a table, -1 if there is no such table.
  int rowCount(const std::string& table) const;
  // Every row of every table as "<table>|<values>", in order; without the time of a log row, which
  // the database's own clock wrote.
  Lines everyRow() const;
  // The whole file's bytes; "" if there is none.
  std::string databaseBytes() const;

  // For failures that must not change the error state.
  static void recordEarlierError(ZEVOOAUTHSERVER::OAUTHDBBasic& store);
  static void expectEarlierError(const ZEVOOAUTHSERVER::OAUTHDBBasic& store);
  static void expectError(const ZEVOOAUTHSERVER::OAUTHDBBasic& store, int code,
                          const std::string& msg);

  // The factor in ZEVOOAUTH_ROUNDS, 1 by default, for longer runs by hand.
  static int rounds();

  RedirectedFiles files_;
  FakeClock clock_;
  FakeHost host_;
  FakeIds ids_;
  CapturedSyslog log_;

 private:
  static void runOnThread(const std::function<void()>& body);
};

// The character n times.
inline std::string times(int n, char c = 'a') {
  return std::string(static_cast<std::size_t>(n), c);
}
