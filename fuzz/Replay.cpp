// Runs a target over the files of folders: what a build without a fuzzer makes of it.

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

int main(int count, char** arguments) {
  std::size_t replayed = 0;
  for (int at = 1; at < count; ++at) {
    for (const auto& entry : std::filesystem::directory_iterator(arguments[at])) {
      std::ifstream file(entry.path(), std::ios::binary);
      std::string bytes(std::istreambuf_iterator<char>(file), {});
      // Said before it runs, so that the last line names what broke it.
      std::printf("%s\n", entry.path().c_str());
      std::fflush(stdout);
      LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
      ++replayed;
    }
  }
  std::printf("%zu inputs replayed\n", replayed);
  return replayed > 0 ? 0 : 1;
}
