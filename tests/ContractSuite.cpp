#include <gtest/gtest.h>

#include <utility>
#include <vector>

#include "contract/Host.h"

// The contract suite in a library of its own, from which nothing is to be seen but its entry point.
namespace {

std::vector<contract::NamedHost> given;

}  // namespace

std::vector<contract::NamedHost> contract::hosts() { return given; }

extern "C" int runContract(int count, char** arguments, const std::vector<contract::NamedHost>& hosts) {
  given = hosts;
  testing::InitGoogleTest(&count, arguments);
  return RUN_ALL_TESTS();
}
