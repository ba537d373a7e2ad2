#pragma once

namespace device {

/// While it is there, the frames of what this thread commits go into the database's log by one call of the system,
/// where it would take two for each page. As soon as the database does anything else to its files, all goes on as
/// without.
class GatheredFrames {
 public:
  GatheredFrames();
  ~GatheredFrames();
  GatheredFrames(const GatheredFrames&) = delete;
  GatheredFrames& operator=(const GatheredFrames&) = delete;
};

}  // namespace device
