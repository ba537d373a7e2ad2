#pragma once

#include <string>

namespace tsd {

/// What can be told of an app's package before it is sent, by a look at its manifest.
struct PackageForecast {
  std::string problem;  // why its install will fail; empty: nothing speaks against it
  std::string version;  // that the package has; empty: none
};

PackageForecast forecastOf(const std::string& host, const std::string& app);

/// "4.5 over 4.6, a downgrade": what an install of the one version over the other is. `listed` is what the host's list
/// says, which may differ from what the package has.
std::string updateText(const std::string& listed, const std::string& packaged, const std::string& present);

}  // namespace tsd
