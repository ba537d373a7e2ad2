#include "tsd/help/HelpText.h"

#include <algorithm>
#include <map>

#include "device/boundary/Injection.h"

namespace tsd {

const std::vector<ExitCodeEntry>& exitCodes() {
  static const std::vector<ExitCodeEntry> codes{
      {ExitCode::done, "done"},
      {ExitCode::failed, "failed"},
      {ExitCode::usage, "usage"},
      {ExitCode::someFailed, "some apps are not as the host wants them"},
      {ExitCode::cancelled, "cancelled by a signal"},
      {ExitCode::deadline, "a deadline passed"},
      {ExitCode::busy, "the device is in use"},
      {ExitCode::differs, "a replay differs"},
  };
  return codes;
}

namespace {

std::string callsOf(const device::InjectionPoint::Name& point) {
  const std::string operation(point.operation), service(point.service);
  if (operation == "step") return "each single change of the device's files and of its store";
  if (operation == "transfer") return "each chunk of a package on its way to the device";
  if (service == "log") return "each message of the plug-in at the level " + operation;
  if (service == "AppsClient") return "a call into the plug-in: " + service + "::" + operation;
  return service + "::" + operation;
}

}  // namespace

std::vector<PointEntry> pointEntries() {
  std::map<std::string, std::vector<device::InjectionPoint::Name>> operations;
  for (const auto& point : device::InjectionPoint::table) operations[std::string(point.operation)].push_back(point);
  std::vector<PointEntry> entries;
  for (const auto& [operation, points] : operations) {
    // The level of a message is not meant by its bare name.
    std::string all;
    for (const auto& point : points) {
      if (point.service != "log") all += (all.empty() ? "" : ", ") + callsOf(point);
      if (points.size() > 1)
        entries.push_back({std::string(point.service) + '.' + operation, callsOf(point)});
      else if (point.service == "log")
        entries.push_back({"log." + operation, callsOf(point)});
    }
    if (!all.empty()) entries.push_back({operation, all});
  }
  std::sort(entries.begin(), entries.end(), [](auto& one, auto& other) { return one.name < other.name; });
  return entries;
}

std::string wrapped(const std::string& text, std::size_t width) {
  std::string result;
  std::size_t lineLength = 0;
  for (std::size_t start = 0; start < text.size();) {
    std::size_t end = std::min(text.find(' ', start), text.size());
    std::size_t word = end - start;
    if (lineLength > 0 && lineLength + 1 + word > width) {
      result += '\n';
      lineLength = 0;
    } else if (lineLength > 0) {
      result += ' ';
      ++lineLength;
    }
    result += text.substr(start, word);
    lineLength += word;
    start = end + 1;
  }
  return result;
}

std::string unwrapped(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return text;
}

}  // namespace tsd
