// Broken code by the thousand: sources with a token taken out, doubled or put elsewhere, and sources that end anywhere.
//
// Each function hands what it makes to `check`, which says whether all is right, and ends with the first that is not:
// it says so, too.
#pragma once

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <sstream>
#include <string>
#include <vector>

#include "lines/cutter.h"

namespace quillet {

// The sources of folders of the fuzz corpus, in the order of their paths.
inline std::vector<std::string> CorpusSources(std::initializer_list<const char*> folders) {
  std::vector<std::string> paths;
  for (const char* folder : folders) {
    for (const auto& entry :
         std::filesystem::directory_iterator(QUILLET_SOURCE_DIR "/fuzz/corpus/" + std::string(folder)))
      paths.push_back(entry.path().string());
  }
  std::sort(paths.begin(), paths.end());
  std::vector<std::string> sources;
  for (const std::string& path : paths) {
    std::ifstream file(path, std::ios::binary);
    std::stringstream bytes;
    bytes << file.rdbuf();
    sources.push_back(bytes.str());
  }
  return sources;
}

// Where the tokens of a source stand, as 3.12 reads it.
struct TokenPlaces {
  struct Place {
    size_t begin;
    std::string text;
  };
  std::vector<Place> tokens;

  explicit TokenPlaces(const std::string& bytes) {
    const Ref<SourceText> source = SourceText::Copy(bytes);
    TokenizeOnly(*source, Version::Of(3, 12));
    for (const Token& token : source->tokens)
      tokens.push_back({static_cast<size_t>(token.text - source->begin()), std::string(token.view())});
  }
};

template <class Check>
bool TokensTakenOutOrDoubled(const std::vector<std::string>& sources, const Check& check) {
  for (const std::string& bytes : sources) {
    for (const TokenPlaces::Place& token : TokenPlaces(bytes).tokens) {
      std::string changed = bytes;
      if (!check(changed.erase(token.begin, token.text.size()))) return false;
      changed = bytes;
      if (!check(changed.insert(token.begin, token.text + " "))) return false;
    }
  }
  return true;
}

// Up to three tokens of another source at a time, two hundred times for each source.
template <class Check>
bool TokensOfElsewherePutIn(const std::vector<std::string>& sources, const Check& check) {
  uint32_t state = 1;
  const auto random = [&state](size_t below) {
    state = state * 1664525u + 1013904223u;
    return (state >> 8) % below;
  };
  for (const std::string& bytes : sources) {
    const auto tokens = TokenPlaces(bytes).tokens;
    const auto others = TokenPlaces(sources[random(sources.size())]).tokens;
    if (tokens.empty() || others.empty()) continue;
    for (int i = 0; i < 200; ++i) {
      std::string changed = bytes;
      for (int j = 0; j < 1 + i % 3; ++j) {
        const size_t at = tokens[random(tokens.size())].begin;
        changed.insert(at, " " + others[random(others.size())].text + " ");
      }
      if (!check(changed)) return false;
    }
  }
  return true;
}

template <class Check>
bool SourcesEndEarly(const std::vector<std::string>& sources, const Check& check) {
  for (const std::string& bytes : sources)
    for (size_t size = 0; size < bytes.size(); size += 3)
      if (!check(bytes.substr(0, size))) return false;
  return true;
}

}  // namespace quillet
