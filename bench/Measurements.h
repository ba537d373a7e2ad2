#pragma once

#include <benchmark/benchmark.h>

#include <map>
#include <string>
#include <string_view>

namespace bench {

/// Whether this run is a short one, whose figures say nothing.
inline bool isShort = false;

/// How long one iteration of each benchmark takes, in seconds: the least over its repetitions, which are interleaved
/// with those of all others. The thread's processor time, or what the benchmark itself says it was.
class Measurements final : public benchmark::BenchmarkReporter {
 public:
  bool ReportContext(const Context&) override { return true; }
  void ReportRuns(const std::vector<Run>& runs) override;

  /// Runs what is registered and matches the pattern. A short run takes one repetition and as few iterations as there
  /// can be.
  void run(const std::string& pattern = ".");
  /// What was measured, for people.
  void print() const;
  double operator[](const std::string& benchmark) const { return _least.at(benchmark); }

 private:
  std::map<std::string, double> _least;
};

/// One row of the table. Of a short run nothing is met or missed.
void printRow(std::string_view work, const std::string& figure, std::string_view goal, bool met);
/// A row without a goal.
void printRow(std::string_view work, const std::string& figure);

/// With so many digits behind the point.
std::string decimal(double number, int digits = 2);

}  // namespace bench
