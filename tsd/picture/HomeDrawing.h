#pragma once

#include <cstddef>
#include <string>

#include "platform/Value.h"
#include "tsd/picture/Canvas.h"
#include "tsd/picture/HomePages.h"

namespace tsd {

/// Icons that fit on a page of the picture.
constexpr std::size_t homePageSize = 20;
/// Pages that are drawn; if there are more, the picture says how many.
constexpr std::size_t homePagesDrawn = 24;

/// A picture of the home screen as the content of a file: pages of icons side by side, each drawn by the state of its
/// app, and a legend. Throws a `CommandError` when it cannot be drawn.
platform::Bytes drawHome(const HomePages& home, const std::string& title, const Theme& theme, PictureFormat format);

}  // namespace tsd
