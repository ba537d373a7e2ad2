#include "device/services/LocalAccountInfo.h"

#include <utility>

#include "platform/Describe.h"

namespace device {

void LocalAccountInfo::setVantorID(std::optional<std::string> identifier) {
  _boundary.call({{"TSMutableAccountInfo", "setVantorID"}}, nullptr, {{"identifier", identifier}},
                 [&] { _vantorID = std::move(identifier); });
}

void LocalAccountInfo::setDSID(platform::Value number) {
  _boundary.call({{"TSMutableAccountInfo", "setDSID"}}, nullptr, {{"number", number}},
                 [&] { _dsid = std::move(number); });
}

void LocalAccountInfo::setAltDSID(std::optional<std::string> identifier) {
  _boundary.call({{"TSMutableAccountInfo", "setAltDSID"}}, nullptr, {{"identifier", identifier}},
                 [&] { _altDSID = std::move(identifier); });
}

std::string LocalAccountInfo::describe() const {
  return "<TSMutableAccountInfo vantorID " + _vantorID.value_or("(null)") + " DSID " + platform::describe(_dsid) +
         " altDSID " + _altDSID.value_or("(null)") + ">";
}

}  // namespace device
