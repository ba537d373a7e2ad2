#pragma once

#include "platform/Value.h"

namespace fuzz {

/// What a host has of "com.example.maps", and what the seeds are made of. The icon is the smallest PNG there is.
struct SampleApp {
  SampleApp();

  platform::Bytes manifest;
  platform::Bytes metadata;
  platform::Bytes icon;
  platform::Bytes package;
};

}  // namespace fuzz
