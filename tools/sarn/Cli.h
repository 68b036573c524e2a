// The command framework of the `sarn` tool: argument parsing, the one-line diagnostics, exit
// statuses, reading inputs and writing results.
//
// The command line is an interface that scripts rely on, so its shapes are fixed here once:
// - exit status 0 when every input was read and is valid (and for --help), 1 when an input was
//   refused or invalid, 2 for a usage or I/O error; a later input never lowers the status;
// - standard output carries results only, byte for byte; every diagnostic is one line on
//   standard error, "sarn: COMMAND: INPUT: message", the library's texts unchanged (but for
//   line breaks inside a message, which become blanks); a usage
//   error adds the line "Try 'sarn COMMAND --help'.";
// - "-" names standard input;
// - a closed output pipe ends the tool at once and quietly, with the status reached so far, as
//   a reader that stops early (`sarn schema | head`) wants.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "sarn/Sarn.h"

namespace sarncli {

enum Status { STATUS_OK = 0, STATUS_INVALID = 1, STATUS_USAGE = 2 };

// `convert` and `validate` read a whole input into memory; past this they refuse it.
constexpr size_t kMaxInputBytes = 64u << 20;
extern const char kInputLimitMessage[];  // "input exceeds the limit of 67108864 bytes (64 MiB)"

// Where results go: standard output, or the file of -o. Also a byte sink, so that the library
// writes straight into it.
class Output : public wynbaselib::Bytesink {
 public:
  Output() : fdM(1) {}
  ~Output() override;
  // Opens `path` for writing ("" and "-" keep standard output); false with `error` set.
  bool Open(const std::string& path, std::string& error);
  bool Write(const char* data, size_t size) override;
  bool Write(const std::string& text) { return Write(text.data(), text.size()); }
  bool Flush() override { return true; }
  int Fd() const { return fdM; }

 private:
  int fdM;
};

class Context;
typedef int (*CommandMain)(Context& context);

// One command of the tool: its name, the text --help prints, and its body.
struct Command {
  const char* pName;
  const char* pSummary;  // one line for `sarn --help`
  const char* pHelp;     // the whole text of `sarn NAME --help`
  CommandMain pMain;
};

// The state of one command's run: its parsed arguments, its status, its output.
class Context {
 public:
  Context(const Command& command, int argc, char** argv);

  // Declares the options before Parse: `valued` ones take the next argument (or "=VALUE"); a
  // repeatable option keeps every value. "-o FILE" is always valid.
  void Flag(const char* name) { flagsM.push_back(name); }
  void Valued(const char* name) { valuedM.push_back(name); }
  // Parses the arguments; false (after the usage error has been reported) on an unknown option
  // or a missing value. --help prints the command's text and ends the parse with `isHelpM`.
  bool Parse();

  bool Has(const char* name) const;
  // The last value of an option, or `fallback`.
  std::string Value(const char* name, const std::string& fallback = "") const;
  std::vector<std::string> Values(const char* name) const;
  // A decimal option value within [low, high]; false after a usage error otherwise.
  bool Number(const char* name, long long low, long long high, long long fallback, long long& out);
  // The value of an option that takes one of `choices` (the first is the default); false after
  // a usage error naming them.
  bool Choice(const char* name, const std::vector<const char*>& choices, std::string& out);

  // "sarn: COMMAND: message" and "Try 'sarn COMMAND --help'."; returns STATUS_USAGE.
  int UsageError(const std::string& message);
  // "sarn: COMMAND: INPUT: message"; raises the status to `status`.
  void Report(const std::string& input, const std::string& message, int status);
  void Raise(int status) {
    if (status > statusM) statusM = status;
  }
  int GetStatus() const { return statusM; }

  // Opens the output named by -o; false after reporting an I/O error.
  bool OpenOutput();
  // Writes a result. Results are collected in a buffer of 64 KiB, written when it is full, before
  // each diagnostic (so that the two streams keep their order on a terminal) and by Finish; a
  // closed pipe ends the process quietly with the status so far.
  void Write(const char* data, size_t size);
  void Write(const std::string& text) { Write(text.data(), text.size()); }
  // Writes what is buffered; returns the status.
  int Finish();

  // Reads a whole input ("-": standard input) of at most `limit` bytes; false after reporting
  // the failure (an I/O error, status 2; an input past the limit, status 1).
  bool ReadInput(const std::string& path, std::string& out, size_t limit = kMaxInputBytes);

  const Command& commandM;
  std::vector<std::string> positionalM;
  bool isHelpM;
  VekMempool poolM;

 private:
  int argcM;
  char** argvM;
  std::vector<std::string> flagsM, valuedM;
  std::vector<std::pair<std::string, std::string>> givenM;
  int statusM;
  Output outputM;
  std::string bufferM;
  static constexpr size_t kBufferBytes = 65536;
  void WriteNow(const char* data, size_t size);
};

// The commands, each in a file of its own.
extern const Command kSchemaCommand;
extern const Command kConvertCommand;
extern const Command kDecodeCommand;
extern const Command kEncodeCommand;
extern const Command kValidateCommand;

// Names of the data types and arities as the schema tool prints them ("STRING", "optional").
const char* DataTypeName(unsigned dataType);
const char* ArityName(unsigned arity);

}  // namespace sarncli
