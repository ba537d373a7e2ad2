#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tsd {

/// What the daemon reports of one app's asset, if that differs from an ordinary download.
struct AssetReport {
  enum class Path : std::uint8_t {
    absolute,
    relative,  // to the public staging directory
    none,
    recorded,  // no path, but the restore state has it
    text,      // whatever `pathText` says
  };

  std::optional<bool> isDownload;
  std::optional<bool> isRestore;
  std::optional<std::int64_t> completedAssetParts;
  Path path = Path::absolute;
  std::string pathText;
  bool stall = false;  // progress without an end
};

/// By bundle identifier.
using AssetReports = std::map<std::string, AssetReport, std::less<>>;

/// Adds what one `APP:KEY=VALUE,…` says. Throws a usage `CommandError` that names what is not understood.
void addAssetReport(AssetReports& reports, std::string_view text);

/// What can stand behind an app's identifier there.
std::vector<std::string> assetReportWords();

}  // namespace tsd
