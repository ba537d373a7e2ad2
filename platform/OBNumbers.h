#pragma once

#include <cstdint>

/// The application registry's numbers, as far as they have names. A registry may use others.
namespace platform {

/// Why an app is being installed, or was.
namespace installType {
constexpr std::uint64_t none = 0;
constexpr std::uint64_t storeDownload = 1;
constexpr std::uint64_t restore = 2;
constexpr std::uint64_t automaticDownload = 3;
constexpr std::uint64_t sync = 4;
constexpr std::uint64_t automaticUpdate = 5;
constexpr std::uint64_t migration = 6;
constexpr std::uint64_t downgrade = 7;             // demoted automatically
constexpr std::uint64_t intentionalDowngrade = 8;  // demoted by hand
}  // namespace installType

namespace installState {
constexpr std::uint64_t waiting = 0;
constexpr std::uint64_t active = 1;
constexpr std::uint64_t paused = 2;
constexpr std::uint64_t canceled = 3;
constexpr std::uint64_t failed = 4;
constexpr std::uint64_t finished = 5;
}  // namespace installState

namespace installPhase {
constexpr std::uint64_t loading = 0;
constexpr std::uint64_t installing = 1;
constexpr std::uint64_t restoringData = 2;
constexpr std::uint64_t installingPlaceholder = 3;
}  // namespace installPhase

/// What an enumeration of bundles goes over.
namespace bundleType {
constexpr std::uint64_t every = 0;
constexpr std::uint64_t applications = 1;  // of every application type
constexpr std::uint64_t systemBundles = 7;
}  // namespace bundleType

}  // namespace platform
