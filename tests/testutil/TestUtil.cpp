#include "testutil/TestUtil.h"

#include <pthread.h>

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <cstdlib>

namespace sarntest {

void ForEachSplit(std::string_view input,
                  const std::function<void(const std::vector<std::string_view>& chunks, const std::string& label)>& feed) {
  feed({input}, "whole");
  feed(FixedChunks(input, 1), "byte by byte");
  for (size_t at = 0; at <= input.size(); ++at) {
    feed({input.substr(0, at), input.substr(at)}, "split at " + std::to_string(at));
  }
}

void RunOnStack(size_t bytes, const std::function<void()>& work) {
#if defined(__SANITIZE_ADDRESS__) || !defined(__OPTIMIZE__)
  bytes *= 8;
#endif
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, bytes);
  pthread_t thread;
  auto call = [](void* argument) -> void* {
    (*static_cast<const std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, call, const_cast<std::function<void()>*>(&work)), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

bool ReadFile(const std::string& path, std::string& out) {
  FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) return false;
  out.clear();
  char block[65536];
  size_t n;
  while ((n = std::fread(block, 1, sizeof block, file)) > 0) out.append(block, n);
  std::fclose(file);
  return true;
}

namespace {

std::string Unescape(const std::string& text) {
  static const std::string kFrom = "\\nrt0", kTo = std::string("\\\n\r\t\0", 5);
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    size_t k = i + 1 < text.size() && text[i] == '\\' ? kFrom.find(text[i + 1]) : std::string::npos;
    if (k != std::string::npos) {
      out += kTo[k], ++i;
    } else if (text.compare(i, 2, "\\x") == 0 && i + 3 < text.size() && std::isxdigit(text[i + 2]) &&
               std::isxdigit(text[i + 3])) {
      out += static_cast<char>(std::stoi(text.substr(i + 2, 2), nullptr, 16)), i += 3;
    } else {
      out += text[i];
    }
  }
  return out;
}

}  // namespace

std::vector<std::vector<std::string>> ReadTable(const std::string& name, size_t nFields) {
  const char* root = std::getenv("SARN_SOURCE_DIR");
  std::string text;
  std::vector<std::vector<std::string>> rows;
  if (!ReadFile(std::string(root != nullptr ? root : ".") + "/tests/data/" + name, text)) {
    ADD_FAILURE() << "cannot read tests/data/" << name;
    return rows;
  }
  size_t lineNumber = 0;
  for (size_t at = 0; at < text.size(); ++lineNumber) {
    size_t end = std::min(text.find('\n', at), text.size());
    std::string line = text.substr(at, end - at);
    at = end + 1;
    if (line.empty() || line[0] == '#') continue;
    std::vector<std::string> fields;
    for (size_t from = 0;;) {
      size_t cut = line.find(" => ", from);
      fields.push_back(Unescape(line.substr(from, cut - from)));
      if (cut == std::string::npos) break;
      from = cut + 4;
    }
    if (fields.size() != nFields) ADD_FAILURE() << name << ":" << lineNumber + 1 << ": " << fields.size() << " fields";
    else rows.push_back(std::move(fields));
  }
  if (rows.empty()) ADD_FAILURE() << "no cases in tests/data/" << name;
  return rows;
}

}  // namespace sarntest
