#include <dirent.h>

#include <algorithm>
#include <ctime>
#include <fstream>
#include <sstream>

#include "Mock.h"

namespace sarnmock {
namespace {

// Checks one canned body as a client would read it; false with the library's message.
bool CheckBody(const std::string& text, std::string& error) {
  VekMempool pool("canned");
  VekString message;
  ref<sarn::Dictionary> dictionary =
      sarn::Dictionary::FromJson(reinterpret_cast<const unsigned char*>(text.data()), text.size(), message, &pool);
  ref<sarn::SarnObject> object;
  sarn::DictionarySarnObject converter(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
  if (dictionary && converter.DictionaryToSarnObject(dictionary, 0, object, message)) return true;
  error = message.Utf8();
  return false;
}

}  // namespace

bool CannedTable::Load(const std::string& dir, std::string& error) {
  DIR* folder = opendir(dir.c_str());
  if (folder == nullptr) return error = dir + ": cannot open the folder", false;
  std::vector<std::string> names;
  while (dirent* entry = readdir(folder)) {
    std::string name = entry->d_name;
    if (name.size() > 5 && name.compare(name.size() - 5, 5, ".json") == 0) names.push_back(name);
  }
  closedir(folder);
  std::sort(names.begin(), names.end());
  for (const std::string& name : names) {
    std::string path = dir + "/" + name, stem = name.substr(0, name.size() - 5);
    std::ifstream file(path, std::ios::binary);
    std::stringstream text;
    text << file.rdbuf();
    std::string message;
    if (!file || !CheckBody(text.str(), message)) return error = path + ": " + (file ? message : "cannot read"), false;
    // T.json is the one body of T; T.N.json is body N of T.
    unsigned number = 0;
    size_t dot = stem.rfind('.');
    if (dot != std::string::npos && dot + 1 < stem.size() &&
        stem.find_first_not_of("0123456789", dot + 1) == std::string::npos && stem.size() - dot <= 6) {
      number = static_cast<unsigned>(std::stoul(stem.substr(dot + 1)));
      stem.resize(dot);
    }
    bodiesByNumberM[stem][number] = text.str();
  }
  for (const auto& type : bodiesByNumberM) {
    std::vector<std::string>& bodies = bodiesM[type.first];
    for (const auto& body : type.second) bodies.push_back(body.second);
  }
  return true;
}

const std::vector<std::string>* CannedTable::Find(const std::string& requestType) const {
  auto found = bodiesM.find(requestType);
  return found == bodiesM.end() ? nullptr : &found->second;
}

Log::~Log() {
  if (pFileM != stderr) std::fclose(pFileM);
}

bool Log::Open(const std::string& path, bool isTimestamps) {
  isTimestampsM = isTimestamps;
  if (path.empty()) return true;
  FILE* file = std::fopen(path.c_str(), "w");
  if (file == nullptr) return false;
  pFileM = file;
  return true;
}

void Log::Line(unsigned connection, const char* event, const std::string& text) {
  std::lock_guard<std::mutex> hold(lockM);
  if (isTimestampsM) {
    timespec now;
    clock_gettime(CLOCK_REALTIME, &now);
    tm utc;
    gmtime_r(&now.tv_sec, &utc);
    char stamp[32];
    std::strftime(stamp, sizeof stamp, "%Y-%m-%dT%H:%M:%S", &utc);
    std::fprintf(pFileM, "%s.%03ldZ ", stamp, now.tv_nsec / 1000000);
  }
  std::fprintf(pFileM, "%u %s%s%s\n", connection, event, text.empty() ? "" : " ", text.c_str());
  std::fflush(pFileM);
}

}  // namespace sarnmock
