#pragma once

#include <string>

namespace tsd {

/// What an app's manifest tells about its package before it is sent.
struct PackageForecast {
  std::string problem;  // why its install will fail; empty: no reason is known
  std::string version;  // the package's; empty: none
};

PackageForecast forecastOf(const std::string& host, const std::string& app);

/// "4.5 over 4.6, a downgrade": describes the install of one version over another. `listed` is the version in the
/// host's list, which may differ from that of the package.
std::string updateText(const std::string& listed, const std::string& packaged, const std::string& present);

}  // namespace tsd
