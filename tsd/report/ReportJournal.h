#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "device/boundary/Boundary.h"
#include "platform/TextTable.h"

namespace tsd {

/// A run's journal in a form for reports: short, with a call into the plug-in and its return in one row; if there are
/// more rows than fit, it keeps those that tell most.
class ReportJournal {
 public:
  static constexpr std::size_t mostRows = 40000;

  /// In their order.
  void hear(const device::CallRecord& record);
  /// Tables of words, rows of indices into them, and what was left out.
  platform::Value document() const;
  /// When the last record was made, counted from the opening of the device.
  std::chrono::microseconds end() const { return _end; }

 private:
  /// How much a row tells, the most first; rows that do not fit are left out in this order, from the end.
  enum class Worth : std::uint8_t { message, pluginCall, deviceCall, file, progress };
  static constexpr std::size_t worths = 5;

  struct Words {
    std::vector<std::string> list;
    platform::TextMap<std::size_t> places;
    std::size_t placeOf(const std::string& word);
  };
  struct Row {
    std::uint64_t number;
    std::int64_t time;
    std::int64_t duration;
    std::size_t thread, service, operation;
    std::int64_t app;
    int kind;
    Worth worth;
    std::string text;
  };

  void hearEnd(const device::CallRecord& record);
  Worth worthOf(const device::CallRecord& record) const;

  Words _threads, _services, _operations, _apps;
  std::vector<Row> _rows;
  std::map<std::string, std::vector<std::size_t>> _open;  // by thread: its calls into the plug-in, as indices of rows
  std::chrono::microseconds _end{};
};

}  // namespace tsd
