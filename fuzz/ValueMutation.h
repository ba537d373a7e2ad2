#pragma once

#include <cstddef>
#include <cstdint>

namespace fuzz {

/// A mutator for inputs that are property lists: changes values of the list mostly, and its bytes now and then. Answers
/// the new size. An input that is no list is changed in its bytes.
std::size_t mutateList(std::uint8_t* data, std::size_t size, std::size_t maximumSize, unsigned seed);

}  // namespace fuzz
