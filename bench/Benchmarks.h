#pragma once

#include "bench/Measurements.h"
#include "bench/TemporaryFolder.h"

namespace bench {

/// Each of these has two halves: what it adds is measured together with everything else, then it prints its rows.

class PropertyListBenchmarks {
 public:
  void add();
  void printRows(const Measurements& taken) const;

 private:
  TemporaryFolder _folder;
};

/// Uses what the one above measured.
class PluginBenchmarks {
 public:
  void add();
  void printRows(const Measurements& taken) const;
};

class IconBenchmarks {
 public:
  void add();
  void printRows(const Measurements& taken) const;
};

}  // namespace bench
