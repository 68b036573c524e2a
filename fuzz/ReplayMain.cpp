// Runs a fuzz target over every file of its seed corpus (folders given on the command line are
// walked in name order, files run as they are), so that the corpus is an ordinary regression test.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

int main(int argc, char** argv) {
  namespace fs = std::filesystem;
  int count = 0, failures = 0;
  for (int i = 1; i < argc; ++i) {
    std::vector<fs::path> paths;
    std::error_code error;
    if (!fs::is_directory(argv[i], error)) paths.push_back(argv[i]);
    for (fs::recursive_directory_iterator it(argv[i], error), end; !error && it != end; it.increment(error)) {
      if (it->is_regular_file()) paths.push_back(it->path());
    }
    std::sort(paths.begin(), paths.end());
    for (const fs::path& path : paths) {
      std::ifstream in(path, std::ios::binary);
      if (!in) {
        std::fprintf(stderr, "cannot read %s\n", path.c_str());
        ++failures;
        continue;
      }
      std::vector<uint8_t> bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
      LLVMFuzzerTestOneInput(bytes.empty() ? nullptr : bytes.data(), bytes.size());
      ++count;
    }
  }
  std::printf("replayed %d inputs\n", count);
  return failures == 0 ? 0 : 1;
}
