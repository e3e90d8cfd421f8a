// Lines such as `asyncio.taskgroups: 3.11-` and `imp: 3.0-3.11`.
#include "program/typeshed.h"

#include <algorithm>
#include <charconv>
#include <climits>
#include <utility>

#include "project/file_system.h"

namespace quillet {

namespace {

constexpr int kOldest = 300;
constexpr int kNewest = 399;

// What Python 3 calls modules of Python 2 that are the same in essence.
constexpr std::pair<Text, Text> kRenamed[] = {
    {"BaseHTTPServer", "http.server"},
    {"ConfigParser", "configparser"},
    {"Cookie", "http.cookies"},
    {"HTMLParser", "html.parser"},
    {"Queue", "queue"},
    {"SocketServer", "socketserver"},
    {"StringIO", "io"},
    {"Tkinter", "tkinter"},
    {"UserDict", "collections"},
    {"__builtin__", "builtins"},
    {"_winreg", "winreg"},
    {"anydbm", "dbm"},
    {"cPickle", "pickle"},
    {"cStringIO", "io"},
    {"cookielib", "http.cookiejar"},
    {"copy_reg", "copyreg"},
    {"dummy_thread", "_thread"},
    {"exceptions", "builtins"},
    {"httplib", "http.client"},
    {"robotparser", "urllib.robotparser"},
    {"thread", "_thread"},
    {"urllib2", "urllib.request"},
    {"urlparse", "urllib.parse"},
    {"xmlrpclib", "xmlrpc.client"},
};

Text WithoutSpaces(Text text) {
  const size_t begin = text.find_first_not_of(" \t\r");
  if (begin == Text::npos) return {};
  return text.substr(begin, text.find_last_not_of(" \t\r") - begin + 1);
}

// "3.11" as 311; 0 for what is no version.
int NumberOfVersion(Text text) {
  int major = 0;
  int minor = 0;
  const char* const end = text.data() + text.size();
  const auto [dot, error] = std::from_chars(text.data(), end, major);
  if (error != std::errc() || dot == end || *dot != '.') return 0;
  const auto [rest, minor_error] = std::from_chars(dot + 1, end, minor);
  return minor_error == std::errc() && rest == end ? 100 * major + minor : 0;
}

}  // namespace

Typeshed::Typeshed(const std::string& folder, Version version)
    : is_python2_(version.count > 0 && version.parts[0] < 3),
      version_(is_python2_         ? kOldest
               : version.count < 2 ? kNewest
                                   : 100 * version.parts[0] + version.parts[1]) {
  if (folder.empty()) return;
  for (const std::string& candidate : {folder, Join(folder, "stdlib")}) {
    const std::string text = ReadSmallFile(Join(candidate, "VERSIONS"));
    if (text.empty()) continue;
    folder_ = candidate;
    for (size_t at = 0; at < text.size();) {
      const size_t end = std::min(text.find('\n', at), text.size());
      Read(Text(text).substr(at, end - at));
      at = end + 1;
    }
    return;
  }
}

void Typeshed::Read(Text line) {
  line = line.substr(0, line.find('#'));
  const size_t colon = line.find(':');
  if (colon == Text::npos) return;
  const Text range = WithoutSpaces(line.substr(colon + 1));
  const size_t dash = range.find('-');
  if (dash == Text::npos) return;
  const int last = NumberOfVersion(WithoutSpaces(range.substr(dash + 1)));
  ranges_[std::string(WithoutSpaces(line.substr(0, colon)))] = {NumberOfVersion(WithoutSpaces(range.substr(0, dash))),
                                                                last == 0 ? INT_MAX : last};
}

bool Typeshed::Has(Text module) const {
  bool is_listed = false;
  for (size_t end = module.size();; end = module.rfind('.', end - 1)) {
    if (const auto found = ranges_.find(std::string(module.substr(0, end))); found != ranges_.end()) {
      is_listed = true;
      if (!found->second.Holds(version_)) return false;
    }
    if (module.substr(0, end).find('.') == Text::npos) return is_listed;
  }
}

Text Typeshed::NameOf(Text module) const {
  if (!is_python2_) return module;
  for (const auto& [old_name, new_name] : kRenamed) {
    if (module == old_name) return new_name;
  }
  return module;
}

std::vector<std::string> Typeshed::TopNames() const {
  std::vector<std::string> names;
  for (const auto& [name, range] : ranges_) {
    if (range.Holds(version_) && name.find('.') == std::string::npos) names.push_back(name);
  }
  if (is_python2_) {
    for (const auto& renamed : kRenamed) names.emplace_back(renamed.first);
  }
  return names;
}

}  // namespace quillet
