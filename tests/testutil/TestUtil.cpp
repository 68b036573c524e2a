#include "testutil/TestUtil.h"

#include <pthread.h>
#include <sys/stat.h>

#include <cstdio>
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

std::vector<std::string_view> FixedChunks(std::string_view input, size_t size) {
  std::vector<std::string_view> chunks;
  for (size_t at = 0; at < input.size(); at += size) chunks.push_back(input.substr(at, size));
  return chunks;
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

std::string CorpusDir(const std::string& name) {
  const char* root = std::getenv("SARN_CORPORA_DIR");
  if (root == nullptr) return "";
  std::string path = std::string(root) + "/" + name;
  struct stat info;
  if (stat(path.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) return "";
  return path;
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

}  // namespace sarntest
