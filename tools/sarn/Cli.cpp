#include "Cli.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace sarncli {

const char kInputLimitMessage[] = "input exceeds the limit of 67108864 bytes (64 MiB)";

Output::~Output() {
  if (fdM > 2) close(fdM);
}

bool Output::Open(const std::string& path, std::string& error) {
  if (path.empty() || path == "-") return true;
  int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
  if (fd < 0) {
    error = std::strerror(errno);
    return false;
  }
  fdM = fd;
  return true;
}

bool Output::Write(const char* data, size_t size) {
  while (size > 0) {
    ssize_t n = write(fdM, data, size);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    data += n;
    size -= static_cast<size_t>(n);
  }
  return true;
}

Context::Context(const Command& command, int argc, char** argv)
    : commandM(command), isHelpM(false), poolM("sarn"), argcM(argc), argvM(argv), statusM(STATUS_OK) {
  valuedM.push_back("-o");
}

bool Context::Parse() {
  auto known = [](const std::vector<std::string>& names, const std::string& name) {
    for (const std::string& known : names) {
      if (known == name) return true;
    }
    return false;
  };
  bool isOptionsEnd = false;
  for (int i = 0; i < argcM; ++i) {
    std::string argument = argvM[i];
    if (isOptionsEnd || argument == "-" || argument.empty() || argument[0] != '-') {
      positionalM.push_back(argument);
      continue;
    }
    if (argument == "--") {
      isOptionsEnd = true;
      continue;
    }
    if (argument == "--help") {
      std::fputs(commandM.pHelp, stdout);
      std::fflush(stdout);
      isHelpM = true;
      return true;
    }
    size_t equals = argument.find('=');
    std::string name = argument.substr(0, equals);
    if (known(flagsM, name)) {
      if (equals != std::string::npos) return UsageError("option '" + name + "' takes no value"), false;
      givenM.emplace_back(name, "");
    } else if (known(valuedM, name)) {
      if (equals != std::string::npos) {
        givenM.emplace_back(name, argument.substr(equals + 1));
      } else if (i + 1 < argcM) {
        givenM.emplace_back(name, argvM[++i]);
      } else {
        return UsageError("option '" + name + "' needs a value"), false;
      }
    } else {
      return UsageError("unknown option '" + name + "'"), false;
    }
  }
  return true;
}

bool Context::Has(const char* name) const {
  for (const auto& given : givenM) {
    if (given.first == name) return true;
  }
  return false;
}

std::string Context::Value(const char* name, const std::string& fallback) const {
  std::string value = fallback;
  for (const auto& given : givenM) {
    if (given.first == name) value = given.second;
  }
  return value;
}

std::vector<std::string> Context::Values(const char* name) const {
  std::vector<std::string> values;
  for (const auto& given : givenM) {
    if (given.first == name) values.push_back(given.second);
  }
  return values;
}

bool Context::Number(const char* name, long long low, long long high, long long fallback, long long& out) {
  out = fallback;
  if (!Has(name)) return true;
  std::string text = Value(name);
  char* end = nullptr;
  errno = 0;
  long long value = std::strtoll(text.c_str(), &end, 10);
  bool isDigits = !text.empty() && text.find_first_not_of("0123456789") == std::string::npos;
  if (!isDigits || errno != 0 || *end != '\0' || value < low || value > high) {
    UsageError("invalid value '" + text + "' for " + name + " (a number from " + std::to_string(low) + " to " +
               std::to_string(high) + ")");
    return false;
  }
  out = value;
  return true;
}

bool Context::Choice(const char* name, const std::vector<const char*>& choices, std::string& out) {
  out = Value(name, choices[0]);
  std::string list;
  for (const char* choice : choices) {
    if (out == choice) return true;
    list += list.empty() ? choice : std::string(", ") + choice;
  }
  UsageError("invalid value '" + out + "' for " + name + " (one of " + list + ")");
  return false;
}

int Context::UsageError(const std::string& message) {
  std::fprintf(stderr, "sarn: %s: %s\nTry 'sarn %s --help'.\n", commandM.pName, message.c_str(), commandM.pName);
  Raise(STATUS_USAGE);
  return STATUS_USAGE;
}

void Context::Report(const std::string& input, const std::string& message, int status) {
  if (!bufferM.empty()) Finish();
  // One line per diagnostic: a message that ends in line breaks loses them, and one that spans
  // lines (the streaming JSON parser's) has them turned into blanks.
  std::string line = message.substr(0, message.find_last_not_of("\r\n") + 1);
  for (char& c : line) c = c == '\n' || c == '\r' ? ' ' : c;
  std::fprintf(stderr, "sarn: %s: %s: %s\n", commandM.pName, input.c_str(), line.c_str());
  Raise(status);
}

bool Context::OpenOutput() {
  std::string error, path = Value("-o");
  if (outputM.Open(path, error)) return true;
  Report(path, error, STATUS_USAGE);
  return false;
}

void Context::Write(const char* data, size_t size) {
  if (bufferM.size() + size > kBufferBytes) Finish();
  if (size > kBufferBytes) return WriteNow(data, size);
  bufferM.append(data, size);
}

int Context::Finish() {
  std::string pending;
  pending.swap(bufferM);
  WriteNow(pending.data(), pending.size());
  return statusM;
}

void Context::WriteNow(const char* data, size_t size) {
  if (outputM.Write(data, size)) return;
  if (errno == EPIPE) std::_Exit(statusM);
  Report(Value("-o", "-"), std::strerror(errno), STATUS_USAGE);
  std::_Exit(statusM);
}

bool Context::ReadInput(const std::string& path, std::string& out, size_t limit) {
  int fd = path == "-" ? 0 : open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    Report(path, std::strerror(errno), STATUS_USAGE);
    return false;
  }
  out.clear();
  char block[65536];
  bool isOk = true;
  for (;;) {
    ssize_t n = read(fd, block, sizeof block);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) {
      Report(path, std::strerror(errno), STATUS_USAGE);
      isOk = false;
      break;
    }
    if (n == 0) break;
    if (out.size() + static_cast<size_t>(n) > limit) {
      Report(path, kInputLimitMessage, STATUS_INVALID);
      isOk = false;
      break;
    }
    out.append(block, static_cast<size_t>(n));
  }
  if (fd != 0) close(fd);
  return isOk;
}

const char* DataTypeName(unsigned dataType) {
  static const char* const kNames[] = {
      "BOOL",   "BYTESTRING", "CHANNEL_NUMBER", "CURRENCY",   "DATE",        "DATETIME",
      "ANY_DICT", "ENUM",     "FLOAT",          "INT_ID",     "LONG_ID",     "STRING_ID",
      "KNOWN_DICT", "KNOWN_DICT_AS_LAZY", "SUBDICT", "S64",   "S32",         "STRING",
      "TIME",   "U32",        "U64",            "PLACEHOLDER"};
  return dataType < sizeof kNames / sizeof kNames[0] ? kNames[dataType] : "?";
}

const char* ArityName(unsigned arity) {
  static const char* const kNames[] = {"optional", "required", "multi", "none"};
  return arity < 4 ? kNames[arity] : "?";
}

}  // namespace sarncli
