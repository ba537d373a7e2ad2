#pragma once

#include <optional>
#include <string_view>

#include "platform/Value.h"

namespace platform {

/// Dates have a text from 0001-01-01T00:00:00Z to 9999-12-31T23:59:59Z, in the proleptic Gregorian calendar.
inline constexpr double earliestDateWithText = -63113904000;
inline constexpr double endOfDatesWithText = 252423993600;

/// Written so that NaN has no text either.
constexpr bool hasText(Date date) noexcept {
  return date.seconds >= earliestDateWithText && date.seconds < endOfDatesWithText;
}

/// "YYYY-MM-DDThh:mm:ssZ".
struct DateText {
  char characters[20];
  operator std::string_view() const noexcept { return {characters, sizeof(characters)}; }
};

/// The second the date lies in. Nothing for a date outside the range above, finite or not.
std::optional<DateText> dateText(Date date) noexcept;
/// Nothing for text of any other shape, or for a moment that does not exist (30 February, second 60).
std::optional<Date> dateFromText(std::string_view text) noexcept;

}  // namespace platform
