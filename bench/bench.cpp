// Times every operation beside its floor, or counts their instructions under callgrind.
//
//   bench [GOOGLE BENCHMARK OPTION...]   median of the wall times, in microseconds
//   bench --instructions [NAME...]       the operations named, or all: prints the name, and leaves
//                                        a dump "<operation>/<side>/<runs>" of callgrind for each
//                                        side
//   bench --sizes                        the same at more sizes, for the plot
//
// Both sides of an operation, "<operation>/library" and "<operation>/floor", run in one process,
// each operation in a process of its own: what it costs depends on what the heap went through, and
// callers are short-lived programs. scripts/bench.sh runs all of it.

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

// Runs the body, which answers an exit code, in a child process; false unless that is 0.
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
    _exit(code);  // without the destructors, which are the parent's
  }
  int status = 0;
  return waitpid(child, &status, 0) == child && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

// Measures each operation in a child process, and has its database made in another one before.
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

// Times only run(), not what puts the database back.
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

// What makes the counts the same from run to run: rows, their secrets and those that are drawn
// while counting are fixed, every run starts from a fresh copy of the database, and a run that is
// not counted goes before, which binds symbols and fills what is made once. Several runs even out
// what the allocator makes of the holes in its heap, about 1 %. Instructions are those of the
// process: neither the kernel's nor its caches' state shows, and callgrind places the process alike
// every time.
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

// The operations with these names; all without names.
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
