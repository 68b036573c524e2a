// The schema generator as a compiler: golden table dump of a fixture, one refusal per bad input
// with its exact "file:line: message", the format's limits at N and N+1, and deterministic output.
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "testutil/TestUtil.h"

namespace fs = std::filesystem;

namespace {

std::string SourceDir() { return std::getenv("SARN_SOURCE_DIR") != nullptr ? std::getenv("SARN_SOURCE_DIR") : "."; }

std::string DataDir() { return SourceDir() + "/tests/data/generator"; }

// A folder of its own for one test, removed with it.
struct TempDir {
  std::string pathM = (fs::temp_directory_path() / "schemagen-XXXXXX").string();
  TempDir() { pathM = mkdtemp(pathM.data()) != nullptr ? pathM : ""; }
  ~TempDir() {
    std::error_code ec;
    fs::remove_all(pathM, ec);
  }
  const std::string& Path() const { return pathM; }
  std::string Write(const std::string& name, const std::string& text) const {
    std::ofstream(pathM + "/" + name, std::ios::binary) << text;
    return pathM + "/" + name;
  }
};

struct Outcome {
  int status;
  std::string out;
  std::string err;
  std::string Verdict() const { return std::to_string(status) + " " + err; }
};

// The generator built beside this test (build/tests/X -> build/tools/schemagen/schemagen).
Outcome Schemagen(const std::string& args) {
  TempDir dir;
  std::string tool = (fs::read_symlink("/proc/self/exe").parent_path().parent_path() / "tools/schemagen/schemagen").string();
  FILE* pipe = popen((tool + " " + args + " 2>" + dir.Path() + "/err").c_str(), "r");
  Outcome run{-1, "", ""};
  if (pipe == nullptr) return run;
  char buffer[4096];
  for (size_t n; (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;) run.out.append(buffer, n);
  int status = pclose(pipe);
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  sarntest::ReadFile(dir.Path() + "/err", run.err);
  return run;
}

}  // namespace

// The table dump, and the proto2 mirror of two types (with the closure of their sub-objects).
TEST(Schemagen, FixtureOutputsMatchTheGoldenFiles) {
  std::string fixture = DataDir() + "/fixture.schema";
  for (const char* output : {"dump --dump", "proto --proto holder,empty"}) {
    std::string goldenPath = DataDir() + "/fixture." + std::string(output, std::strchr(output, ' '));
    Outcome run = Schemagen(fixture + std::strchr(output, ' '));
    ASSERT_EQ(run.Verdict(), "0 ");
    if (std::getenv("SARN_UPDATE_GOLDEN") != nullptr) std::ofstream(goldenPath, std::ios::binary) << run.out;
    std::string golden;
    ASSERT_TRUE(sarntest::ReadFile(goldenPath, golden)) << "run with SARN_UPDATE_GOLDEN=1 to create " << goldenPath;
    EXPECT_EQ(run.out, golden) << goldenPath;
  }
  EXPECT_EQ(Schemagen(fixture + " --proto holder,nobody").status, 1);
}

TEST(Schemagen, EveryRefusalNamesItsLine) {
  int cases = 0;
  for (const auto& entry : fs::directory_iterator(DataDir() + "/refusals")) {
    std::string path = entry.path().string(), text, expected, line;
    ASSERT_TRUE(sarntest::ReadFile(path, text));
    // "# expect N: message" (or "# expect -: message" for a problem of the whole file).
    for (std::istringstream lines(text); std::getline(lines, line);) {
      if (line.rfind("# expect ", 0) != 0) continue;
      size_t colon = line.find(": ", 9);
      std::string where = line.substr(9, colon - 9);
      expected += path + (where == "-" ? "" : ":" + where) + ": " + line.substr(colon + 2) + "\n";
    }
    ASSERT_FALSE(expected.empty()) << path << " has no expectation";
    TempDir out;
    bool needsOut = entry.path().filename().string().rfind("missing-runtime", 0) == 0;
    Outcome run = Schemagen(path + (needsOut ? " --out " + out.Path() : " --check"));
    EXPECT_EQ(run.Verdict(), "1 " + expected) << path;
    EXPECT_FALSE(fs::exists(out.Path() + "/schema")) << "a refused schema writes nothing";
    ++cases;
  }
  EXPECT_GE(cases, 40);
}

TEST(Schemagen, LimitsOfTheRecordFormats) {
  TempDir dir;
  auto schema = [&](int n, const char* field) {
    std::string text = "type wide 10\n";
    for (int i = 1; i <= n; ++i) text += "  " + std::to_string(i) + " f" + std::to_string(i) + " " + field + "\n";
    return dir.Write("wide.schema", text + "end\n");
  };
  // Flag offsets have 9 bits: 488 flag bytes fit after the 24-byte header, 489 do not.
  EXPECT_EQ(Schemagen(schema(488, "bool optional") + " --check").Verdict(), "0 ");
  EXPECT_EQ(Schemagen(schema(489, "bool optional") + " --check").Verdict(),
            "1 " + dir.Path() + "/wide.schema:1: type 'wide' has 489 presence flags; at most 488 fit\n");
  // Value offsets have 16 bits: 2729 arrays of 24 bytes end at 65520, one more passes 65528.
  EXPECT_EQ(Schemagen(schema(2729, "s32 multi") + " --check").Verdict(), "0 ");
  EXPECT_EQ(Schemagen(schema(2730, "s32 multi") + " --check").Verdict(),
            "1 " + dir.Path() + "/wide.schema:1: type 'wide' needs 65544 bytes; objects are limited to 65528\n");
  // Versions are one byte; field numbers fit 16 bits with the table length.
  EXPECT_EQ(Schemagen(dir.Write("v.schema", "type a 1\n  65534 x s32 optional 0-255\nend\n") + " --check").status, 0);
  EXPECT_EQ(Schemagen(dir.Write("v.schema", "type a 65535\n  1 x s32 optional\nend\nenum e 1\n  65535 last\nend\n") +
                      " --check").status,
            0);
}

TEST(Schemagen, OutputIsDeterministicAndRewritesNothingUnchanged) {
  std::string user = SourceDir() + "/tests/generator/userschema/user.schema";
  TempDir first, second;
  ASSERT_TRUE(Schemagen(user + " --out " + first.Path() + " --units 3").status == 0 &&
              Schemagen(user + " --out " + second.Path() + " --units 3 --stamp " + second.Path() + "/stamp").status == 0);
  std::vector<std::string> names;
  for (const auto& entry : fs::directory_iterator(first.Path() + "/schema")) {
    std::string name = entry.path().filename().string();
    names.push_back(name);
    std::string a, b;
    ASSERT_TRUE(sarntest::ReadFile(entry.path().string(), a) && sarntest::ReadFile(second.Path() + "/schema/" + name, b));
    EXPECT_EQ(a, b) << name;
    EXPECT_EQ(a.rfind("// generated: do not edit", 0), 0u) << name;
  }
  std::sort(names.begin(), names.end());
  EXPECT_EQ(names, (std::vector<std::string>{"Error.h", "Greeting.h", "KernoRpcCancel.h", "KernoRpcHello.h",
                                             "KernoRpcRequest.h", "KernoRpcRequestUpdate.h", "KernoRpcResponse.h",
                                             "Person.h", "sarn-schema.h", "schema-enums.cpp", "schema-registry.cpp",
                                             "schema-types-0.cpp", "schema-types-1.cpp", "schema-types-2.cpp"}));
  EXPECT_TRUE(fs::exists(second.Path() + "/stamp"));

  auto before = fs::last_write_time(first.Path() + "/schema/Greeting.h");
  fs::last_write_time(first.Path() + "/schema/Greeting.h", before - std::chrono::hours(1));
  ASSERT_EQ(Schemagen(user + " --out " + first.Path() + " --units 3").status, 0);
  EXPECT_EQ(fs::last_write_time(first.Path() + "/schema/Greeting.h"), before - std::chrono::hours(1))
      << "an unchanged file is left alone so nothing recompiles";
}

TEST(Schemagen, CommandLine) {
  for (const std::string args : {"", " --frobnicate", " --out /tmp --units 0"}) {
    EXPECT_EQ(Schemagen(args.empty() ? args : DataDir() + "/fixture.schema" + args).status, 2) << args;
  }
  EXPECT_EQ(Schemagen("/nonexistent/x.schema --check").Verdict(), "1 /nonexistent/x.schema: cannot read the schema description\n");
}
