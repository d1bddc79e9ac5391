// What is measured: each operation as callers feel it (construct, operate, destroy), by the library
// and by hand.

#pragma once

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "sandbox.h"

// An operation made ready, with what it holds open; run() is what is measured.
struct Work {
  std::function<bool()> run;   // true on success
  std::function<void()> undo;  // of a store held open, where it changes the database
};

struct Side {
  std::string name;  // "library", "floor", or "prepared": the floor with its statements kept
  std::function<Work()> prepare;
};

struct Operation {
  std::string name;
  Rows rows;
  std::string changedTable;  // empty: none
  int rowsAfter = 0;         // of that table
  std::vector<Side> sides;
  int countedRuns = 20;  // fewer where one run does so much that chance has no share in it
};

// Those of the table in docs/performance.md.
std::vector<Operation> operations();
// The same at more sizes, for the plot.
std::vector<Operation> sizes();

// Measures around run(), which must succeed and leave the table as it should; then puts the
// database back. Throws what went wrong.
template <class Measure>
void runOnce(Sandbox& sandbox, const Operation& operation, const Work& work, Measure measure) {
  if (!measure(work.run)) throw std::runtime_error(operation.name + ": failed");
  if (operation.changedTable.empty()) return;
  const int rows = sandbox.count(operation.changedTable.c_str());
  if (rows != operation.rowsAfter)
    throw std::runtime_error(operation.name + ": leaves " + std::to_string(rows) + " rows");
  if (work.undo)
    work.undo();
  else
    sandbox.layOut(operation.rows);
}
