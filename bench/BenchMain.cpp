// Runs the registered benchmarks, then prints each one's Mpixel/s and its ratio to the memcpy
// benchmark of the same frame size measured in the same run.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <string>
#include <vector>

namespace {

class CollectingReporter : public benchmark::ConsoleReporter {
 public:
  struct Row {
    std::string name;
    double mpixPerSec;
  };
  void ReportRuns(const std::vector<Run>& runs) override {
    ConsoleReporter::ReportRuns(runs);
    for (const Run& run : runs) {
      if (run.error_occurred) continue;
      auto it = run.counters.find("items_per_second");
      if (it == run.counters.end()) continue;
      if (run.run_type == Run::RT_Iteration) {
        rows.push_back({run.benchmark_name(), it->second.value / 1e6});
      } else if (run.aggregate_name == "median") {
        medians[run.run_name.str()] = it->second.value / 1e6;
      }
    }
  }
  std::vector<Row> rows;
  // With --benchmark_repetitions: each benchmark's median, by its name without the suffix.
  std::map<std::string, double> medians;
};

// "BM_Name/4K/..." -> "4K": the size label is the first path segment after the name.
std::string SizeOf(const std::string& name) {
  const size_t a = name.find('/');
  if (a == std::string::npos) return "";
  const size_t b = name.find('/', a + 1);
  return name.substr(a + 1, b == std::string::npos ? std::string::npos : b - a - 1);
}

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  CollectingReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);

  std::map<std::string, double> memcpyRate;
  for (const auto& row : reporter.rows)
    if (row.name.rfind("BM_Memcpy", 0) == 0) memcpyRate[SizeOf(row.name)] = row.mpixPerSec;

  // "memcpys": the time of one frame in copies of it, the inverse of "x memcpy".
  std::printf("\n%-48s %14s %12s %10s\n", "benchmark", "Mpixel/s", "x memcpy", "memcpys");
  for (const auto& row : reporter.rows) {
    auto ref = memcpyRate.find(SizeOf(row.name));
    if (ref != memcpyRate.end() && ref->second > 0 && row.mpixPerSec > 0)
      std::printf("%-48s %14.1f %12.4f %10.2f\n", row.name.c_str(), row.mpixPerSec,
                  row.mpixPerSec / ref->second, ref->second / row.mpixPerSec);
    else
      std::printf("%-48s %14.1f %12s\n", row.name.c_str(), row.mpixPerSec, "-");
  }
  // A benchmark of another path to the same work ("BM_Frei0r/...") beside its reference
  // ("BM_Running/...", the same size and case): the ratio of their times, from the medians when
  // the benchmarks were repeated.
  std::map<std::string, double> rates;
  for (const auto& row : reporter.rows) rates[row.name] = row.mpixPerSec;
  for (const auto& [name, rate] : reporter.medians) rates[name] = rate;
  bool header = false;
  for (const auto& [name, rate] : rates) {
    if (name.rfind("BM_Frei0r/", 0) != 0 || rate <= 0) continue;
    auto ref = rates.find("BM_Running/" + name.substr(10));
    if (ref == rates.end()) continue;
    if (!header) std::printf("\n%-48s %14s\n", "benchmark", "time x Running");
    header = true;
    std::printf("%-48s %14.4f\n", name.c_str(), ref->second / rate);
  }
  benchmark::Shutdown();
  return 0;
}
