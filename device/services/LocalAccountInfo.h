#pragma once

#include <optional>
#include <string>

#include "device/boundary/Boundary.h"
#include "platform/TSAccountInfo.h"

namespace device {

/// An account record that can also be read.
class LocalAccountInfo final : public platform::TSMutableAccountInfo {
 public:
  explicit LocalAccountInfo(Boundary& boundary) : _boundary(boundary) {}

  void setVantorID(std::optional<std::string> identifier) override;
  void setDSID(platform::Value number) override;
  void setAltDSID(std::optional<std::string> identifier) override;
  std::string describe() const override;

  const std::optional<std::string>& vantorID() const { return _vantorID; }
  const platform::Value& dsid() const { return _dsid; }
  const std::optional<std::string>& altDSID() const { return _altDSID; }

 private:
  Boundary& _boundary;
  std::optional<std::string> _vantorID;
  platform::Value _dsid;
  std::optional<std::string> _altDSID;
};

}  // namespace device
