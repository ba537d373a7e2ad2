#include "bench/Measurements.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <vector>

namespace bench {

void Measurements::ReportRuns(const std::vector<Run>& runs) {
  for (const auto& run : runs) {
    if (run.run_type != Run::RT_Iteration) continue;
    if (run.error_occurred) {
      std::fprintf(stderr, "%s: %s\n", run.run_name.str().c_str(), run.error_message.c_str());
      std::exit(1);
    }
    bool saysItself = !run.run_name.time_type.empty();
    double seconds = (saysItself ? run.real_accumulated_time : run.cpu_accumulated_time) /
                     static_cast<double>(std::max<benchmark::IterationCount>(run.iterations, 1));
    auto [place, isNew] = _least.emplace(run.run_name.function_name, seconds);
    if (!isNew) place->second = std::min(place->second, seconds);
  }
}

void Measurements::run(const std::string& pattern) {
  std::vector<std::string> options = {"benchmarks", "--benchmark_enable_random_interleaving=true",
                                      "--benchmark_filter=" + pattern,
                                      isShort ? "--benchmark_repetitions=1" : "--benchmark_repetitions=15",
                                      isShort ? "--benchmark_min_time=0.000001" : "--benchmark_min_time=0.05"};
  std::vector<char*> arguments;
  for (auto& option : options) arguments.push_back(option.data());
  int count = static_cast<int>(arguments.size());
  benchmark::Initialize(&count, arguments.data());
  benchmark::RunSpecifiedBenchmarks(this);
}

void Measurements::print() const {
  for (const auto& [name, seconds] : _least) std::printf("%-40s %14.3f microseconds\n", name.c_str(), seconds * 1e6);
}

static void print(std::string_view work, const std::string& figure, std::string_view goal, const char* met) {
  std::printf(R"({"work": "%.*s", "figure": "%s", "goal": "%.*s", "met": %s})"
              "\n",
              static_cast<int>(work.size()), work.data(), figure.c_str(), static_cast<int>(goal.size()), goal.data(),
              met);
  std::fflush(stdout);
}

void printRow(std::string_view work, const std::string& figure, std::string_view goal, bool met) {
  print(work, figure, goal, isShort ? "null" : met ? "true" : "false");
}

void printRow(std::string_view work, const std::string& figure) { print(work, figure, "", "null"); }

std::string decimal(double number, int digits) {
  char text[64];
  std::snprintf(text, sizeof text, "%.*f", digits, number);
  return text;
}

}  // namespace bench
