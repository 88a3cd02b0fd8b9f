#include "row.h"

#include <benchmark/benchmark.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <utility>
#include <vector>

namespace {

constexpr char kBytes[] = "bytes";

struct Comparison {
  std::string what;
  std::string with;
  double most;
};

std::vector<Comparison> &comparisons() {
  static std::vector<Comparison> all;
  return all;
}

double secondsOf(const std::function<void()> &work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

void measurePrepared(const Work &work, benchmark::State &state) {
  for ([[maybe_unused]] auto iteration : state) {
    work.before();
    state.SetIterationTime(secondsOf(work.work));
  }
}

void measureInARow(const Work &work, benchmark::State &state) {
  for ([[maybe_unused]] auto iteration : state) {
    work.work();
  }
}

void registerWork(const std::string &what, const Work &work) {
  auto *registered = benchmark::RegisterBenchmark(what.c_str(), [work](benchmark::State &state) {
    if (work.setUp) {
      work.setUp();
    }
    (work.before ? measurePrepared : measureInARow)(work, state);
  });
  if (work.before) {
    registered->UseManualTime();
  } else {
    registered->UseRealTime();
  }
}

void registerWork(const std::string &what, const Footprint &footprint) {
  benchmark::RegisterBenchmark(what.c_str(), [footprint](benchmark::State &state) {
    for ([[maybe_unused]] auto iteration : state) {
      state.counters[kBytes] = static_cast<double>(footprint.bytes());
    }
  })->Iterations(1);
}

struct Amount {
  double number;  // seconds or bytes
  bool isBytes;
};

Amount medianOf(std::vector<double> numbers, bool isBytes) {
  std::sort(numbers.begin(), numbers.end());
  return {numbers[numbers.size() / 2], isBytes};
}

class Collector : public benchmark::BenchmarkReporter {
 public:
  bool ReportContext(const Context &context) override {
    static_cast<void>(context);
    return true;
  }

  void ReportRuns(const std::vector<Run> &runs) override {
    std::vector<double> numbers;
    bool isBytes = false;
    std::string name;
    for (const Run &run : runs) {
      if (run.run_type != Run::RT_Iteration) {
        continue;
      }
      name = run.run_name.function_name;
      const auto bytes = run.counters.find(kBytes);
      isBytes = bytes != run.counters.end();
      numbers.push_back(isBytes ? double{bytes->second}
                                : run.real_accumulated_time / static_cast<double>(run.iterations));
    }
    if (!numbers.empty()) {
      measured_[name] = medianOf(std::move(numbers), isBytes);
    }
  }

  bool isEmpty() const { return measured_.empty(); }

  // Null for what the filter left out.
  const Amount *find(const std::string &what) const {
    const auto found = measured_.find(what);
    return found == measured_.end() ? nullptr : &found->second;
  }

 private:
  std::map<std::string, Amount> measured_;
};

struct Unit {
  const char *name;
  double size;
};
constexpr Unit kTimes[] = {{"ns", 1e-9}, {"us", 1e-6}, {"ms", 1e-3}};
constexpr Unit kSizes[] = {{"B", 1}, {"KiB", 1024}, {"MiB", 1024 * 1024}};

std::string written(Amount amount) {
  const auto &units = amount.isBytes ? kSizes : kTimes;
  const Unit *unit = units;
  while (unit + 1 != std::end(units) && amount.number >= unit[1].size) {
    ++unit;
  }
  char text[32];
  snprintf(text, sizeof(text), "%.4g %s", amount.number / unit->size, unit->name);
  return text;
}

// scripts/bench prints the headings, with the same widths.
void print(const Comparison &row, const Amount &what, const Amount &with) {
  const double ratio = what.number / with.number;
  printf("%-46s %10s  %-44s %10s %7.2f %7.2f  %s\n", row.what.c_str(), written(what).c_str(),
         row.with.c_str(), written(with).c_str(), ratio, row.most,
         ratio <= row.most ? "yes" : "no");
}

// Returns how many there are; a row is left out when the filter leaves out a side of it.
int printRows(const Collector &collector) {
  int printed = 0;
  for (const Comparison &row : comparisons()) {
    const Amount *what = collector.find(row.what);
    const Amount *with = collector.find(row.with);
    if (what != nullptr && with != nullptr) {
      print(row, *what, *with);
      ++printed;
    }
  }
  return printed;
}

}  // namespace

Row::Row(const std::string &what, const Work &work) : what_(what) {
  registerWork(what, work);
}

Row::Row(const std::string &what, const Footprint &footprint) : what_(what) {
  registerWork(what, footprint);
}

Row &Row::atMost(double ratio, const std::string &what, const Work &work) {
  registerWork(what, work);
  return atMost(ratio, what);
}

Row &Row::atMost(double ratio, const std::string &what, const Footprint &footprint) {
  registerWork(what, footprint);
  return atMost(ratio, what);
}

Row &Row::atMost(double ratio, const std::string &what) {
  comparisons().push_back({what_, what, ratio});
  return *this;
}

void orDie(bool ok, const char *what) {
  if (!ok) {
    fprintf(stderr, "%s failed", what);
    if (QLIBCErrGet() != 0) {
      fprintf(stderr, ": 0x%04X %s:%d", static_cast<unsigned>(QLIBCErrGet()), QLIBCErrorGetFile(),
              QLIBCErrorGetLine());
    }
    fputc('\n', stderr);
    _exit(EXIT_FAILURE);  // a child must not run the parent's exit handlers
  }
}

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
    return EXIT_FAILURE;
  }
  orDie(getenv("ZELO_SANDBOX") != nullptr, "being in the sandbox (scripts/sandbox)");
  makeRows();
  Collector collector;
  if (benchmark::RunSpecifiedBenchmarks(&collector) == 0) {
    return EXIT_FAILURE;  // it has printed that no name matches
  }
  if (collector.isEmpty()) {
    return EXIT_SUCCESS;  // --benchmark_list_tests
  }
  if (printRows(collector) == 0) {
    fputs("no row has both its sides in the filter\n", stderr);
    return EXIT_FAILURE;
  }
  return EXIT_SUCCESS;
}
