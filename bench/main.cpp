#include <cstdio>
#include <exception>
#include <string_view>

#include "bench/Benchmarks.h"

/// usage: in_memory_benchmarks [--short]
int main(int count, char** arguments) try {
  bench::isShort = count > 1 && arguments[1] == std::string_view("--short");
  bench::PropertyListBenchmarks propertyLists;
  propertyLists.add();
  bench::Measurements taken;
  taken.run(bench::isShort);
  propertyLists.printRows(taken);
  return 0;
} catch (const std::exception& problem) {
  std::fprintf(stderr, "in_memory_benchmarks: %s\n", problem.what());
  return 1;
}
