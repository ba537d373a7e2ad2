#pragma once

namespace device {

/// From now on the database writes each page of its log together with the page's head, which it hands to the system one
/// after the other: half as many calls.
void pairWritesOfLog();

}  // namespace device
