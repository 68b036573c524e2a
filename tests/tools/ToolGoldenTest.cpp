// Process tests of the command-line programs: each folder under tests/tools/cases/ is one case.
// Its `cmd` is a shell script run in that folder with the programs first on PATH, standard input
// from `stdin` (or nothing), and its standard output, standard error and exit status are compared
// byte for byte with the files `stdout`, `stderr` and `status` (a missing file means empty, or 0).
// SARN_UPDATE_GOLDEN=1 writes what the programs did into those files instead, for review.
#include <unistd.h>
#include <sys/wait.h>

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "testutil/TestUtil.h"

namespace {

std::string CasesDir() {
  const char* source = std::getenv("SARN_SOURCE_DIR");
  return std::string(source != nullptr ? source : ".") + "/tests/tools/cases";
}

std::vector<std::string> CaseNames() {
  std::vector<std::string> names;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(CasesDir(), error)) {
    if (entry.path().filename().string()[0] != '.') names.push_back(entry.path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::string ReadOrEmpty(const std::string& path) {
  std::string text;
  sarntest::ReadFile(path, text);
  return text;
}

class ToolGolden : public ::testing::TestWithParam<std::string> {};

TEST_P(ToolGolden, MatchesGoldenFiles) {
  const char* toolDir = std::getenv("SARN_TOOL_DIR");
  if (toolDir == nullptr) GTEST_SKIP() << "the programs are not built (SARN_TOOL_DIR is not set)";
  std::string dir = CasesDir() + "/" + GetParam();
  // Scratch files live in a folder of this process's own, since several builds may run the
  // same cases at once; SCRATCH is a path prefix inside it.
  std::string scratchDir = ::testing::TempDir() + "sarn-golden-" + std::to_string(getpid());
  std::filesystem::create_directories(scratchDir);
  std::string scratch = scratchDir + "/" + GetParam();
  const std::string input = std::filesystem::exists(dir + "/stdin") ? dir + "/stdin" : "/dev/null";
  // The programs' folders first on PATH; SARN_SOURCE_DIR stays set for scripts that use the tree.
  std::string command = "cd '" + dir + "' && PATH='" + toolDir + "':\"$PATH\" SCRATCH='" + scratch +
                        "' exec sh ./cmd <'" + input + "' >'" + scratch + ".out' 2>'" + scratch + ".err'";
  int raw = std::system(command.c_str());
  ASSERT_TRUE(WIFEXITED(raw)) << "the case's shell did not exit normally";
  std::string status = std::to_string(WEXITSTATUS(raw)) + "\n";
  std::string out = ReadOrEmpty(scratch + ".out"), err = ReadOrEmpty(scratch + ".err");
  std::error_code ignored;
  std::filesystem::remove_all(scratchDir, ignored);
  if (const char* update = std::getenv("SARN_UPDATE_GOLDEN"); update != nullptr && std::string(update) == "1") {
    // What the programs did goes into the files, a default (empty, status 0) as no file.
    for (const auto& [name, text] : {std::pair<std::string, std::string>{"stdout", out}, {"stderr", err}, {"status", status == "0\n" ? "" : status}}) {
      if (text.empty()) std::remove((dir + "/" + name).c_str());
      else std::ofstream(dir + "/" + name, std::ios::binary) << text;
    }
    return;
  }
  std::string wantStatus = ReadOrEmpty(dir + "/status");
  EXPECT_EQ(status, wantStatus.empty() ? "0\n" : wantStatus);
  EXPECT_EQ(out, ReadOrEmpty(dir + "/stdout")) << "standard output of " << GetParam();
  EXPECT_EQ(err, ReadOrEmpty(dir + "/stderr")) << "standard error of " << GetParam();
}

INSTANTIATE_TEST_SUITE_P(Cases, ToolGolden, ::testing::ValuesIn(CaseNames()),
                         [](const ::testing::TestParamInfo<std::string>& info) {
                           std::string name = info.param;
                           for (char& c : name) c = std::isalnum(static_cast<unsigned char>(c)) ? c : '_';
                           return name;
                         });

}  // namespace
