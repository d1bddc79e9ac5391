// The operations to measure: each as callers see it (construct, operate, destroy), by the library
// and by hand.

#pragma once

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "sandbox.h"

// An operation that is ready to run, with what it keeps open. run() is measured.
struct Work {
  std::function<bool()> run;   // true on success
  std::function<void()> undo;  // for a store held open that changes the database
};

struct Side {
  std::string name;  // "library", "floor", or "prepared" (the floor with prepared statements)
  std::function<Work()> prepare;
};

struct Operation {
  std::string name;
  Rows rows;
  std::string changedTable;  // empty means none
  int rowsAfter = 0;         // rows of that table
  std::vector<Side> sides;
  int countedRuns = 20;  // fewer if one run is so long that chance has no effect
};

// The operations of the table in docs/performance.md.
std::vector<Operation> operations();
// The same at more sizes, for the plot.
std::vector<Operation> sizes();

// Measures run(), which must succeed and leave the right number of rows, then restores the
// database. Throws if something goes wrong.
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
