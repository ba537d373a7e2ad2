#pragma once

#include "platform/OBApplicationProxy.h"
#include "platform/TSAsset.h"
#include "platform/Value.h"

namespace device {

/// What the journal shows of an object besides its name where it shows everything: a dictionary with the object's own
/// names for its facts, without those that are absent.
platform::Value factsOf(const platform::TSAsset& asset);
platform::Value factsOf(const platform::OBBundleProxy& bundle);

}  // namespace device
