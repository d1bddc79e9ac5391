// Every operation of every store, once, on a database with something in every table: for tests that
// make the world below the library fail.

#pragma once

#include <functional>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "store_test.h"

struct Outcome {
  bool success = false;
  int code = 0;  // of the store, afterwards
  std::string msg;
  std::string result;    // the document that the caller gets; random secrets as <random>
  bool answers = false;  // the store can still count its rows
};

struct Operation {
  std::string name;
  // Constructs the store, performs, calls mend, looks whether the store answers, destroys.
  std::function<Outcome(const std::function<void()>& mend)> perform;
  // Several transactions: a failure may leave some rows changed and others not, or be ignored.
  bool inSteps = false;
  bool onEmptyFile = false;
};

std::vector<Operation> everyOperation();
std::ostream& operator<<(std::ostream& out, const Operation& operation);

class EveryOperationTest : public StoreTest, public testing::WithParamInterface<Operation> {
 protected:
  EveryOperationTest();

  // Performs the operation again and again, each time on a fresh copy of the database. The first
  // time the first call fails, then the second, and so on until no call is left that can fail.
  // Returns how many failed. arm() prepares the n-th fault; mend() ends it and tells whether it
  // happened. After every fault:
  // - the operation succeeded as without it, or failed with a code, a message and a log line, or
  //   threw for lack of memory,
  // - the file is sound, holds all of the change or nothing, and the next construction works,
  // - the store still answers, the ids are restored, and SQLite has no memory or file left open.
  int failEverywhere(const std::function<void(int nth)>& arm, const std::function<bool()>& mend);

 private:
  void populate() const;
  void restore();
  Lines rows() const;
  void expectReported(const std::optional<Outcome>& outcome, const Lines& logged) const;
  void expectAllOrNothing(const std::optional<Outcome>& outcome, const Lines& logged,
                          const Lines& now) const;

  std::string prepared_;  // the database file; none for a first construction
  Outcome expected_;
  Lines before_, after_;  // rows without the operation and with it
};

std::string operationName(const testing::TestParamInfo<Operation>& info);
