#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/StringSet.h"
#include "platform/TextTable.h"

namespace appsync {

/// An app whose package the host may have to send. Immutable once it is made.
struct Candidate {
  std::string bundleIdentifier;
  std::optional<std::string> bundleVersion;
  std::optional<std::string> container;  // directory of the store metadata and the artwork
  std::optional<std::string> path;       // directory of the bundle
  std::optional<std::string> nameFromHarlune;
  bool isRestore = false;
  bool intentionallyDemoted = false;
  bool autoDemoted = false;
  bool isSystemApp = false;

  /// One line for the log.
  std::string describe() const;
};
using CandidateRef = std::shared_ptr<const Candidate>;

/// Candidates by identifier, in the order in which the identifiers were first set.
class Candidates {
 public:
  /// Replaces an older candidate of the identifier in its place.
  void set(std::string_view identifier, CandidateRef candidate);
  /// Null when there is none.
  CandidateRef find(std::string_view identifier) const;
  void erase(std::string_view identifier);
  std::vector<std::string> identifiers() const { return _order.members(); }
  std::size_t size() const { return _order.size(); }

  /// One line for the log.
  std::string describe() const;

 private:
  platform::StringSet _order;
  platform::TextMap<CandidateRef> _candidates;
};

}  // namespace appsync
