#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// How an app stands in the demoted-apps list.
struct Demotion {
  bool byHand = false;
  bool automatically = false;

  bool isAny() const { return byHand || automatically; }
};

/// What the restore list has of an app.
struct RestoredApp {
  std::string id;
  platform::Bytes metadata;  // the store metadata, a property list
  platform::Bytes rights;    // empty: none
  platform::Bytes icon;      // PNG; empty: none
};

/// Puts an app into the restore list, a dictionary, in the place of an older entry of it.
void putRestored(platform::Value& list, const RestoredApp& app);

/// Puts an app into the demoted-apps list, a dictionary, behind those that are there, whether it is one of them or not.
void appendDemoted(platform::Value& list, const std::string& id, const Demotion& demotion);

/// Lets an app stand in the demoted-apps list in these ways and no other.
void putDemoted(platform::Value& list, const std::string& id, const Demotion& demotion);

}  // namespace tsd
