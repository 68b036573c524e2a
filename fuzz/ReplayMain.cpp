// Runs a fuzz target over every file of its seed corpus (a folder given on the command
// line, or single files), so that the corpus is an ordinary regression test.
#include <dirent.h>
#include <sys/stat.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

namespace {

bool ReadFile(const std::string& path, std::vector<uint8_t>& out) {
  FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) return false;
  uint8_t block[65536];
  size_t n;
  while ((n = std::fread(block, 1, sizeof block, file)) > 0) out.insert(out.end(), block, block + n);
  std::fclose(file);
  return true;
}

int RunPath(const std::string& path, int& count) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0) {
    std::fprintf(stderr, "cannot stat %s\n", path.c_str());
    return 1;
  }
  if (S_ISDIR(info.st_mode)) {
    DIR* dir = opendir(path.c_str());
    if (dir == nullptr) return 1;
    int failures = 0;
    while (dirent* entry = readdir(dir)) {
      std::string name = entry->d_name;
      if (name == "." || name == "..") continue;
      failures += RunPath(path + "/" + name, count);
    }
    closedir(dir);
    return failures;
  }
  std::vector<uint8_t> bytes;
  if (!ReadFile(path, bytes)) return 1;
  LLVMFuzzerTestOneInput(bytes.empty() ? nullptr : bytes.data(), bytes.size());
  ++count;
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  int count = 0;
  int failures = 0;
  for (int i = 1; i < argc; ++i) failures += RunPath(argv[i], count);
  std::printf("replayed %d inputs\n", count);
  return failures == 0 ? 0 : 1;
}
