#include "Comparison.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <latch>
#include <map>
#include <thread>
#include <utility>
#include <vector>

namespace {

using Peer = std::pair<std::string, std::string>;

std::map<Peer, double>& bounds() {
  static std::map<Peer, double> all;
  return all;
}

double median(std::vector<double> values) {
  std::ranges::sort(values);
  const std::size_t middle = values.size() / 2;
  return values.size() % 2 == 1 ? values[middle] : (values[middle - 1] + values[middle]) / 2;
}

// Prints Google Benchmark's own report without the single repetitions, and stores their times.
class ComparingReporter : public benchmark::ConsoleReporter {
 public:
  using benchmark::ConsoleReporter::ConsoleReporter;

  void ReportRuns(const std::vector<Run>& runs) override {
    std::vector<Run> shown;
    for (const Run& run : runs) {
      if (run.error_occurred) {
        failed_ = true;
        shown.push_back(run);
      } else if (run.run_type == Run::RT_Iteration) {
        times_[run.run_name.function_name].push_back(run.GetAdjustedRealTime() /
                                                     benchmark::GetTimeUnitMultiplier(run.time_unit));
      } else if (run.aggregate_name == "median" || run.aggregate_name == "cv") {
        shown.push_back(run);
      }
    }
    benchmark::ConsoleReporter::ReportRuns(shown);
  }

  // Prints a line for each peer. Returns whether every benchmark ran and every bound holds.
  bool reportRatios() const {
    bool holds = !failed_;
    const std::map<Peer, double>& limits = bounds();
    for (const auto& [name, times] : times_) {
      const std::size_t slash = name.rfind('/');
      if (slash == std::string::npos || name.substr(slash + 1) == "ours") continue;
      const std::string caseName = name.substr(0, slash);
      const auto ours = times_.find(caseName + "/ours");
      if (ours == times_.end()) continue;
      const Peer peer{caseName, name.substr(slash + 1)};
      const double ourMedian = median(ours->second);
      const double peerMedian = median(times);
      const double ratio = ourMedian / peerMedian;
      std::printf("%-40s %12.1f ns   %-24s %12.1f ns   ratio %.2f", caseName.c_str(), ourMedian * 1e9,
                  peer.second.c_str(), peerMedian * 1e9, ratio);
      if (const auto bound = limits.find(peer); bound != limits.end()) {
        std::printf(ratio <= bound->second ? "   (at most %.2f)" : "   OVER %.2f", bound->second);
        holds = holds && ratio <= bound->second;
      }
      std::printf("\n");
    }
    return holds;
  }

 private:
  // Times in seconds. The key is a case's name, without the options that Google Benchmark appends to it.
  std::map<std::string, std::vector<double>> times_;
  bool failed_ = false;
};

}  // namespace

SecondThread::SecondThread() {
  std::thread([] { std::latch(1).wait(); }).detach();
}

Bound::Bound(std::string caseName, std::string peer, double ratio) {
  bounds()[{std::move(caseName), std::move(peer)}] = ratio;
}

int main(int argumentCount, char** arguments) {
  // Options on the command line come later, so they override these.
  std::vector<std::string> defaults = {"--benchmark_repetitions=11", "--benchmark_min_time=0.05",
                                       "--benchmark_enable_random_interleaving=true"};
  std::vector<char*> all = {arguments[0]};
  for (std::string& option : defaults) all.push_back(option.data());
  all.insert(all.end(), arguments + 1, arguments + argumentCount);
  int count = static_cast<int>(all.size());
  all.push_back(nullptr);

  benchmark::Initialize(&count, all.data());
  if (benchmark::ReportUnrecognizedArguments(count, all.data())) return 2;
  ComparingReporter reporter(benchmark::ConsoleReporter::OO_Tabular);
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();
  return reporter.reportRatios() ? 0 : 1;
}
