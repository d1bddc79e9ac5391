// Measures the time of every operation and its floor, or counts their instructions under callgrind.
//
//   bench [GOOGLE BENCHMARK OPTION...]   prints the median of the wall times, in microseconds
//   bench --instructions [NAME...]       counts the named operations, or all: prints each name, and
//                                        leaves a dump "<operation>/<side>/<runs>" of callgrind for
//                                        each side
//   bench --sizes                        counts operations at more sizes, for the plot
//
// Both sides of an operation, "<operation>/library" and "<operation>/floor", run in one process.
// Each operation runs in a process of its own, because its cost depends on what happened in the
// heap before, and callers are short-lived programs. scripts/bench.sh runs all of it.

#include <benchmark/benchmark.h>
#include <sys/wait.h>
#include <unistd.h>
#include <valgrind/callgrind.h>

#include <algorithm>
#include <chrono>
#include <iostream>
#include <stdexcept>

#include "operations.h"

namespace {

using Run = std::function<bool()>;

// Runs the body in a child process. The body returns an exit code; returns false unless that is 0.
template <class Body>
bool inChild(Body body) {
  const pid_t child = fork();
  if (child < 0) throw std::runtime_error("cannot fork");
  if (child == 0) {
    int code = 1;
    try {
      code = body();
      std::cout.flush();
    } catch (const std::exception& error) {
      std::cerr << "bench: " << error.what() << '\n';
    }
    _exit(code);  // runs no destructors, which are the parent's
  }
  int status = 0;
  return waitpid(child, &status, 0) == child && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

// Measures each operation in a child process. Another child process makes its database before.
template <class Measure>
bool eachInChild(Sandbox& sandbox, const std::vector<Operation>& all, Measure measure) {
  for (const Operation& operation : all) {
    const auto layOut = [&] { return sandbox.layOut(operation.rows), 0; };
    if (!inChild(layOut) || !inChild([&] { return measure(operation); })) return false;
  }
  return true;
}

// --- Wall times ---

// Prints the medians: "<operation>/<side>", a tab, microseconds.
class Medians : public benchmark::BenchmarkReporter {
 public:
  bool ReportContext(const Context&) override { return true; }
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& run : runs) {
      if (run.error_occurred) throw std::runtime_error(run.error_message);
      if (run.aggregate_name == "median")
        std::cout << run.run_name.function_name << '\t' << run.GetAdjustedRealTime() << '\n';
    }
  }
};

// Measures only the time of run(), not of restoring the database.
void time(benchmark::State& state, Sandbox& sandbox, const Operation& operation,
          const Side& side) try {
  sandbox.layOut(operation.rows);
  const Work work = side.prepare();
  while (state.KeepRunning())
    runOnce(sandbox, operation, work, [&state](const ::Run& run) {
      const auto start = std::chrono::steady_clock::now();
      const bool done = run();
      const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
      state.SetIterationTime(elapsed.count());
      return done;
    });
} catch (const std::exception& error) {
  state.SkipWithError(error.what());
}

int timeBothSides(Sandbox& sandbox, const Operation& operation, int argc, char** argv) {
  for (const Side& side : operation.sides)
    benchmark::RegisterBenchmark(
        (operation.name + "/" + side.name).c_str(),
        [&](benchmark::State& state) { time(state, sandbox, operation, side); })
        ->UseManualTime()
        ->Repetitions(7)
        ->Unit(benchmark::kMicrosecond);
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  Medians medians;
  benchmark::RunSpecifiedBenchmarks(&medians);
  return 0;
}

// --- Instructions ---

// The counts are the same from run to run for these reasons. The rows, their secrets, and the
// secrets that are drawn while counting are fixed. Every run starts from a fresh copy of the
// database. A first run, which is not counted, binds symbols and makes what is made only once.
// Several runs even out the allocator's search in its heap, about 1 %. Only instructions of the
// process are counted, so the kernel and its caches have no effect, and callgrind gives the process
// the same addresses every time.
void count(Sandbox& sandbox, const Operation& operation, const Side& side) {
  sandbox.layOut(operation.rows);
  const Work work = side.prepare();
  runOnce(sandbox, operation, work, [](const Run& run) { return run(); });
  CALLGRIND_START_INSTRUMENTATION;
  for (int i = 0; i < operation.countedRuns; ++i)
    runOnce(sandbox, operation, work, [](const Run& run) {
      CALLGRIND_TOGGLE_COLLECT;
      const bool done = run();
      CALLGRIND_TOGGLE_COLLECT;
      return done;
    });
  const std::string label =
      operation.name + "/" + side.name + "/" + std::to_string(operation.countedRuns);
  CALLGRIND_DUMP_STATS_AT(label.c_str());
  CALLGRIND_STOP_INSTRUMENTATION;
}

int countBothSides(Sandbox& sandbox, const Operation& operation) {
  std::cout << operation.name << '\n';
  for (const Side& side : operation.sides) count(sandbox, operation, side);
  return 0;
}

// The operations with these names, or all if there are no names.
std::vector<Operation> named(const std::vector<std::string>& names) {
  if (names.empty()) return operations();
  std::vector<Operation> result;
  for (const Operation& operation : operations())
    if (std::find(names.begin(), names.end(), operation.name) != names.end())
      result.push_back(operation);
  if (result.size() != names.size()) throw std::runtime_error("no such operation");
  return result;
}

}  // namespace

int main(int argc, char** argv) try {
  Sandbox sandbox;
  const std::string mode = argc > 1 ? argv[1] : "";
  if (mode != "--instructions" && mode != "--sizes") {
    const auto measure = [&](const Operation& operation) {
      return timeBothSides(sandbox, operation, argc, argv);
    };
    return eachInChild(sandbox, operations(), measure) ? 0 : 1;
  }
  if (RUNNING_ON_VALGRIND == 0) throw std::runtime_error("instructions are counted by callgrind");
  sandbox.fixEntropy();
  const auto measure = [&](const Operation& operation) {
    return countBothSides(sandbox, operation);
  };
  const std::vector<Operation> all = mode == "--sizes" ? sizes() : named({argv + 2, argv + argc});
  return eachInChild(sandbox, all, measure) ? 0 : 1;
} catch (const std::exception& error) {
  std::cerr << "bench: " << error.what() << '\n';
  return 1;
}
