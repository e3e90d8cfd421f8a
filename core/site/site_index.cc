// A survey is a list of the file's shared names, their places, and its definitions, in integers of seven
// bits a byte; a bucket is places with the number of their file.
#include "site/site_index.h"

#include <algorithm>
#include <bit>

#include "foundations/errors.h"
#include "output/json_lines.h"
#include "site/html_text.h"

namespace quillet {

namespace {

// Scripts grow to so many places before there are more of them.
constexpr size_t kPlacesOfScript = 4000;

void Put(uint64_t value, std::string& out) {
  for (; value >= 0x80; value >>= 7) out += static_cast<char>(value | 0x80);
  out += static_cast<char>(value);
}

void PutText(Text text, std::string& out) {
  Put(text.size(), out);
  out += text;
}

class Reader {
 public:
  explicit Reader(Text bytes) : bytes_(bytes) {}

  bool at_end() const { return at_ == bytes_.size(); }

  uint32_t Take() {
    uint64_t value = 0;
    for (int shift = 0; shift < 35; shift += 7) {
      if (at_ == bytes_.size()) break;
      const auto byte = static_cast<uint8_t>(bytes_[at_++]);
      value |= uint64_t{byte & 0x7Fu} << shift;
      if (byte < 0x80 && value <= UINT32_MAX) return static_cast<uint32_t>(value);
    }
    ThrowError(ErrorKind::kValueError, "these bytes are no survey of a file");
  }

  Text TakeText() {
    const uint32_t size = Take();
    if (size > bytes_.size() - at_) ThrowError(ErrorKind::kValueError, "these bytes are no survey of a file");
    at_ += size;
    return bytes_.substr(at_ - size, size);
  }

  // A number below `limit`.
  uint32_t TakeBelow(size_t limit) {
    const uint32_t value = Take();
    if (value >= limit) ThrowError(ErrorKind::kValueError, "these bytes are no survey of a file");
    return value;
  }

 private:
  Text bytes_;
  size_t at_ = 0;
};

// A role, whether the name is an attribute, and what is defined, as one number. The script of the pages takes
// it apart.
constexpr uint32_t kAttributeBit = 8;
constexpr uint32_t kKindShift = 4;
constexpr uint32_t kCodeLimit = 256;

uint32_t CodeOf(const SiteOccurrence& occurrence) {
  return static_cast<uint32_t>(occurrence.role) | (occurrence.is_attribute ? kAttributeBit : 0) |
         static_cast<uint32_t>(occurrence.kind) << kKindShift;
}

// What of a name's counts a place adds to: that of its role, and behind those that of parameters.
size_t CountOf(uint32_t code) {
  constexpr uint32_t kParameterDefinition =
      static_cast<uint32_t>(NameRole::kDefinition) | static_cast<uint32_t>(NameKind::kParameter) << kKindShift;
  return code == kParameterDefinition ? kNameRoleCount : code % kNameRoleCount;
}

// What a definition defines: a NameKind, or behind them an attribute.
constexpr uint32_t kAttributeDefinition = static_cast<uint32_t>(NameKind::kImport) + 1;

bool Opens(uint8_t kind) {
  constexpr NameKind kOpening[] = {NameKind::kClass, NameKind::kFunction, NameKind::kTypeAlias};
  return std::any_of(std::begin(kOpening), std::end(kOpening),
                     [kind](NameKind opening) { return kind == static_cast<uint8_t>(opening); });
}

// ---- the first round ----

class SiteSurveyWriter : public FileWriter {
 public:
  explicit SiteSurveyWriter(Version version) : names_(version) {}

  void Write(const BatchInput&, const FileAnalyzer& file, const ScopeNames&, PlacedRecords&,
             std::string& out) override {
    const ShownPart shown(file.source());
    names_.Collect(file, shown);
    texts_.clear();
    numbers_.clear();
    places_.clear();
    for (const SiteOccurrence& occurrence : names_.occurrences()) {
      if (!names_.IsShared(occurrence)) continue;
      Put(NumberOf(TextOf(file, occurrence)), places_);
      Put(occurrence.line, places_);
      Put(occurrence.begin - shown.BeginOf(occurrence.line) + 1, places_);
      Put(CodeOf(occurrence), places_);
    }
    definitions_.clear();
    for (const SiteDefinition& definition : names_.definitions()) {
      const SiteOccurrence& occurrence = names_.occurrences()[definition.occurrence];
      Put(NumberOf(TextOf(file, occurrence)), definitions_);
      PutText(definition.scope, definitions_);
      Put(occurrence.line, definitions_);
      Put(occurrence.is_attribute ? kAttributeDefinition : static_cast<uint32_t>(occurrence.kind), definitions_);
    }
    Put(texts_.size(), out);
    for (const Text text : texts_) PutText(text, out);
    PutText(places_, out);
    PutText(definitions_, out);
  }

 private:
  static Text TextOf(const FileAnalyzer& file, const SiteOccurrence& occurrence) {
    return file.source().text().substr(occurrence.begin, occurrence.size);
  }

  uint32_t NumberOf(Text name) {
    const auto [entry, is_new] = numbers_.emplace(name, static_cast<uint32_t>(texts_.size()));
    if (is_new) texts_.push_back(name);
    return entry->second;
  }

  SiteOccurrences names_;
  std::vector<Text> texts_;
  std::unordered_map<Text, uint32_t> numbers_;
  std::string places_;
  std::string definitions_;
};

}  // namespace

std::unique_ptr<FileWriter> MakeSiteSurveyWriter(Version version) {
  return std::make_unique<SiteSurveyWriter>(version);
}

SiteIndex::SiteIndex(const std::vector<std::string>& files, const std::vector<std::string>& builtin_attributes)
    : files_(files), builtin_attributes_(builtin_attributes.begin(), builtin_attributes.end()) {
  for (uint32_t file = 0; file < files_.size(); ++file) AddModule(file);
}

void SiteIndex::AddModule(uint32_t file) {
  constexpr Text kPackage = "/__init__";
  Text path = files_[file];
  path = path.substr(0, path.rfind('.'));
  if (path.ends_with(kPackage)) path.remove_suffix(kPackage.size());
  for (bool is_whole = true;; is_whole = false) {
    const auto [entry, is_new] = modules_.emplace(path, Module{file, is_whole});
    if (!is_new && is_whole == entry->second.is_whole)
      entry->second.file = kNone;
    else if (!is_new && is_whole)
      entry->second = {file, true};
    const size_t slash = path.find('/');
    if (slash == Text::npos) return;
    path.remove_prefix(slash + 1);
  }
}

uint32_t SiteIndex::FileOfModule(Text dotted) const {
  std::string path(dotted);
  std::replace(path.begin(), path.end(), '.', '/');
  const auto entry = modules_.find(path);
  return entry != modules_.end() ? entry->second.file : kNone;
}

uint32_t SiteIndex::NumberOf(Text name) {
  if (const auto entry = name_index_.find(name); entry != name_index_.end()) return entry->second;
  const auto number = static_cast<uint32_t>(names_.size());
  names_.emplace_back().text = texts_.Copy(name);
  name_index_.emplace(names_.back().text, number);
  return number;
}

uint32_t SiteIndex::NumberOfScope(Text scope) {
  if (const auto entry = scope_index_.find(scope); entry != scope_index_.end()) return entry->second;
  const auto number = static_cast<uint32_t>(scope_texts_.size());
  scope_texts_.push_back(texts_.Copy(scope));
  scope_index_.emplace(scope_texts_.back(), number);
  return number;
}

void SiteIndex::Add(uint32_t file, Text survey) {
  if (file >= files_.size()) ThrowError(ErrorKind::kIndexError, "there is no file of this number");
  Reader reader(survey);
  std::vector<uint32_t> numbers(reader.TakeBelow(survey.size() + 1));
  for (uint32_t& number : numbers) number = NumberOf(reader.TakeText());
  for (Reader places(reader.TakeText()); !places.at_end();) {
    const uint32_t number = numbers[places.TakeBelow(numbers.size())];
    const uint32_t line = places.Take();
    const uint32_t column = places.Take();
    const uint32_t code = places.TakeBelow(kCodeLimit);
    if (++names_[number].counts[CountOf(code)] > kMostPlaces) continue;
    std::string& bucket = buckets_[number % kBuckets];
    const size_t before = bucket.size();
    for (const uint32_t value : {number, file, line, column, code}) Put(value, bucket);
    waiting_bytes_ += bucket.size() - before;
    ++place_count_;
  }
  for (Reader definitions(reader.TakeText()); !definitions.at_end();) {
    const uint32_t number = numbers[definitions.TakeBelow(numbers.size())];
    const uint32_t scope = NumberOfScope(definitions.TakeText());
    const uint32_t line = definitions.Take();
    const auto kind = static_cast<uint8_t>(definitions.TakeBelow(kAttributeDefinition + 1));
    Name& name = names_[number];
    const auto index = static_cast<uint32_t>(definitions_.size());
    (name.last_definition == kNone ? name.first_definition : definitions_[name.last_definition].next) = index;
    name.last_definition = index;
    definitions_.push_back({scope, file, line, kNone, kind});
    ++name.definitions;
    const bool is_first_opened = Opens(kind) && ++name.opened == 1;
    if (name.file != kNone && !is_first_opened) continue;
    name.file = file;
    name.line = line;
  }
}

std::string SiteIndex::TakeBucket(size_t bucket) {
  std::string bytes = std::move(buckets_[bucket]);
  buckets_[bucket].clear();
  waiting_bytes_ -= bytes.size();
  return bytes;
}

uint32_t SiteIndex::Find(Text name) const {
  const auto entry = name_index_.find(name);
  return entry != name_index_.end() ? entry->second : kNone;
}

const SiteIndex::Name* SiteIndex::OnlyDefinition(uint32_t number, Text module, bool is_attribute) const {
  const Name& found = names_[number];
  if (found.opened != 1 && found.definitions != 1) return nullptr;
  if (!module.empty()) return IsOfModule(found.file, module) ? &found : nullptr;
  return is_attribute && builtin_attributes_.contains(std::string(found.text)) ? nullptr : &found;
}

// Whether the last part of a module's path is one of a file's: a package may hand on what its modules define.
bool SiteIndex::IsOfModule(uint32_t file, Text module) const {
  const Text part = module.substr(module.rfind('.') + 1);
  if (part.empty()) return true;  // relative to the file's own package
  Text path = files_[file];
  path = path.substr(0, path.rfind('.'));
  for (size_t begin = 0; begin <= path.size();) {
    const size_t end = std::min(path.find('/', begin), path.size());
    if (path.substr(begin, end - begin) == part) return true;
    begin = end + 1;
  }
  return false;
}

// ---- scripts ----

size_t SiteIndex::ScriptCount() const {
  return std::min(std::bit_ceil(std::max<size_t>(place_count_ / kPlacesOfScript, 1)), kBuckets);
}

std::string SiteIndex::PlacesScript(Text buckets) const {
  struct Place {
    uint32_t name, file, line, column, code;
  };
  std::vector<Place> places;
  for (Reader reader(buckets); !reader.at_end();) {
    Place& place = places.emplace_back();
    place.name = reader.TakeBelow(names_.size());
    for (uint32_t* value : {&place.file, &place.line, &place.column, &place.code}) *value = reader.Take();
  }
  std::stable_sort(places.begin(), places.end(),
                   [](const Place& one, const Place& two) { return one.name < two.name; });

  std::string out = "quillet.take({";
  for (size_t i = 0; i < places.size(); ++i) {
    const Place& place = places[i];
    const bool is_new_name = i == 0 || places[i - 1].name != place.name;
    const bool is_new_file = is_new_name || places[i - 1].file != place.file;
    if (is_new_file && i != 0) out += is_new_name ? "]]],\n" : "],";
    if (is_new_name) {
      AppendDigits(place.name, out);
      out += ":[";
      AppendJsonString(names_[place.name].text, out);
      out += ",[";
      for (const uint32_t count : names_[place.name].counts) {
        AppendDigits(count, out);
        out += ',';
      }
      out.back() = ']';
      out += ",[";
      AppendScopes(names_[place.name], out);
      out += "],[";
    }
    if (is_new_file) {
      out += '[';
      AppendDigits(place.file, out);
    }
    for (const uint32_t value : {place.line + 1, place.column, place.code}) {
      out += ',';
      AppendDigits(value, out);
    }
  }
  out += places.empty() ? "});\n" : "]]]});\n";
  return out;
}

// File, line and dotted scope of the definitions that stand in one.
void SiteIndex::AppendScopes(const Name& name, std::string& out) const {
  uint32_t count = 0;
  ForEachDefinition(name, [&](const Definition& definition) {
    if (scope_texts_[definition.scope].empty() || ++count > kMostPlaces) return;
    if (count > 1) out += ',';
    AppendDigits(definition.file, out);
    out += ',';
    AppendDigits(definition.line + 1, out);
    out += ',';
    AppendJsonString(scope_texts_[definition.scope], out);
  });
}

std::string SiteIndex::DefinitionsScript() const {
  // By NameKind, and behind them an attribute.
  static constexpr char kLetters[] = "?cfpvqtia";
  std::string out = "quillet.take([";
  for (const Text scope : scope_texts_) {
    AppendJsonString(scope, out);
    out += ',';
  }
  if (!scope_texts_.empty()) out.pop_back();
  out += "],[\n";
  bool is_first = true;
  for (const Name& name : names_) {
    if (name.first_definition == kNone) continue;
    out += is_first ? "[" : ",\n[";
    is_first = false;
    AppendJsonString(name.text, out);
    out += ",\"";
    ForEachDefinition(name, [&out](const Definition& definition) { out += kLetters[definition.kind]; });
    out += '"';
    ForEachDefinition(name, [&out](const Definition& definition) {
      for (const uint32_t value : {definition.scope, definition.file, definition.line + 1}) {
        out += ',';
        AppendDigits(value, out);
      }
    });
    out += ']';
  }
  return out + "]);\n";
}

}  // namespace quillet
