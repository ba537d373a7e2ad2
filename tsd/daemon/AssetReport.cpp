#include "tsd/daemon/AssetReport.h"

#include <charconv>

#include "tsd/CommandError.h"

namespace tsd {
namespace {

[[noreturn]] void refuse(std::string_view part, const std::string& why) {
  throw CommandError(ExitCode::usage, "--asset: '" + std::string(part) + "': " + why);
}

bool flag(std::string_view part, std::string_view value) {
  if (value == "true" || value == "1" || value == "yes") return true;
  if (value == "false" || value == "0" || value == "no") return false;
  refuse(part, "the value is true or false");
}

std::int64_t number(std::string_view part, std::string_view value) {
  std::int64_t result = 0;
  auto [end, problem] = std::from_chars(value.data(), value.data() + value.size(), result);
  if (problem != std::errc() || end != value.data() + value.size()) refuse(part, "the value is a whole number");
  return result;
}

void setPath(AssetReport& report, std::string_view value) {
  using Path = AssetReport::Path;
  report.path = value == "absolute"   ? Path::absolute
                : value == "relative" ? Path::relative
                : value == "none"     ? Path::none
                : value == "recorded" ? Path::recorded
                                      : Path::text;
  if (report.path == Path::text) report.pathText = value;
}

void apply(AssetReport& report, std::string_view part) {
  std::size_t equals = part.find('=');
  std::string_view key = part.substr(0, equals);
  if (key == "stall" && equals == std::string_view::npos) {
    report.stall = true;
    return;
  }
  if (equals == std::string_view::npos) refuse(part, "KEY=VALUE is expected, or 'stall'");
  std::string_view value = part.substr(equals + 1);
  if (key == "isDownload")
    report.isDownload = flag(part, value);
  else if (key == "isRestore")
    report.isRestore = flag(part, value);
  else if (key == "completedAssetParts")
    report.completedAssetParts = number(part, value);
  else if (key == "path")
    setPath(report, value);
  else if (key == "stall")
    report.stall = flag(part, value);
  else
    refuse(part, "the keys are isDownload, isRestore, completedAssetParts, path and stall");
}

}  // namespace

void addAssetReport(AssetReports& reports, std::string_view text) {
  std::size_t colon = text.find(':');
  if (colon == 0 || colon == std::string_view::npos || colon + 1 == text.size())
    refuse(text, "APP:KEY=VALUE is expected");
  AssetReport& report = reports[std::string(text.substr(0, colon))];
  std::string_view rest = text.substr(colon + 1);
  while (true) {
    std::size_t comma = rest.find(',');
    apply(report, rest.substr(0, comma));
    if (comma == std::string_view::npos) return;
    rest.remove_prefix(comma + 1);
  }
}

std::vector<std::string> assetReportWords() {
  return {"isDownload=true", "isDownload=false", "isRestore=true", "isRestore=false", "completedAssetParts=",
          "path=relative",   "path=absolute",    "path=none",      "path=recorded",   "stall"};
}

}  // namespace tsd
