#include <cstdio>
#include <exception>
#include <string_view>

#include "bench/Benchmarks.h"
#include "bench/PeakMemory.h"

/// usage: in_memory_benchmarks [--short | --only PATTERN]
///
/// --only measures what matches, as for a profile, and prints times instead of rows. It calls itself with --edit.
int main(int count, char** arguments) try {
  if (count == 4 && arguments[1] == std::string_view("--edit")) return !bench::runEdit(arguments[2], arguments[3]);
  bench::isShort = count > 1 && arguments[1] == std::string_view("--short");
  bench::PropertyListBenchmarks propertyLists;
  bench::PluginBenchmarks plugin;
  bench::IconBenchmarks icons;
  propertyLists.add();
  plugin.add();
  icons.add();
  bench::Measurements taken;
  if (count == 3 && arguments[1] == std::string_view("--only")) {
    taken.run(arguments[2]);
    taken.print();
    return 0;
  }
  taken.run();
  propertyLists.printRows(taken);
  plugin.printRows(taken);
  icons.printRows(taken);
  bench::printPeakMemoryRows();
  return 0;
} catch (const std::exception& problem) {
  std::fprintf(stderr, "in_memory_benchmarks: %s\n", problem.what());
  return 1;
}
