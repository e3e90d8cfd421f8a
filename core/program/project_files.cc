// The stamps of all folders and files of rules that a walk has read say whether another one would find something else.
#include "program/project_files.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <functional>
#include <memory>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "foundations/stop.h"
#include "program/indexed_words.h"
#include "program/possible_symbols.h"
#include "program/two_threads.h"
#include "project/file_system.h"
#include "project/find_files.h"
#include "project/word_filters.h"
#include "project/word_search.h"

namespace quillet {

namespace {

// Fewer files than this are searched before another thread has begun.
constexpr size_t kFilesWorthAThread = 64;

// What a walk read besides sources, as it was in front of the reading.
struct Watched {
  std::string path;
  FileStamp stamp;
};
using WatchList = std::vector<Watched>;

void Watch(const std::string& path, WatchList& watched) { watched.push_back({path, SettledStamp(StampOf(path))}); }

// The files below the roots. One that lies below two of them by different names counts once.
std::vector<std::string> PathsBelow(const std::vector<std::string>& roots, Text exclude, WatchList& watched) {
  std::vector<std::string> real_roots;
  for (const std::string& root : roots) {
    real_roots.push_back(RealPath(root));
    if (!StampOf(root).is_folder()) Watch(root, watched);
  }
  const auto watch = [&](const std::string& path) { Watch(path, watched); };
  std::vector<std::string> paths;
  std::unordered_set<std::string> met;
  for (FoundFile& file : FindFiles(roots, {.exclude = exclude, .is_program = true, .watch = watch})) {
    if (!file.problem.empty() || (file.below == 0 && !StampOf(file.path).is_file())) continue;
    if (roots.size() > 1) {
      const std::string& root = real_roots[file.argument];
      if (!met.insert(file.below == 0 ? root : Join(root, Text(file.path).substr(file.below))).second) continue;
    }
    paths.push_back(std::move(file.path));
  }
  return paths;
}

}  // namespace

class ProjectFiles::Impl {
 public:
  Impl(Files& files, std::vector<std::string> roots, Text exclude, Text index_maker)
      : files_(files), roots_(std::move(roots)), exclude_(exclude), index_maker_(index_maker) {
    for (std::string& root : roots_) root = NormalPath(root);
  }

  const std::vector<FileId>& All() {
    if (!has_walked_ || (is_doubtful_ && HasChanged())) Walk();
    is_doubtful_ = false;
    return all_;
  }

  // What asks a filter for words.
  auto HasWords(const std::vector<Text>& words) const {
    std::vector<WordKey> keys;
    for (const Text word : words) {
      if (IsInFilters(word)) keys.push_back(KeyOfWord(word));
    }
    return [this, keys = std::move(keys)](const Filter& filter) {
      const uint64_t* bits = bits_.data() + filter.begin;
      return std::ranges::all_of(keys, [&](WordKey key) { return MayHold(bits, filter.size, key); });
    };
  }

  // What asks a filter whether a name may be defined as a member.
  auto DefinesMember(Text name) const {
    return [this, word = KeyOfWord(name), definition = KeyOfDefinition(name),
            member = KeyOfMember(name)](const Filter& filter) {
      const WordKey key = filter.tells_members ? member : filter.tells_definitions ? definition : word;
      return MayHold(bits_.data() + filter.begin, filter.size, key);
    };
  }

  std::vector<FileId> WithWords(std::vector<Text> words) {
    // The longest is most likely the one that is not there.
    std::ranges::stable_sort(words, std::greater(), &Text::size);
    return Candidates(words, HasWords(words));
  }

  void EachWithWord(Text word, const std::function<bool(FileId)>& take) {
    const std::vector<Text> words = {word};
    std::string memory;
    for (const Candidate& candidate : CandidatesFor(words, HasWords(words))) {
      const FileId file = all_[candidate.index];
      if ((!candidate.is_searched || Holds(file, words, memory)) && !take(file)) return;
    }
  }

  std::vector<FileId> DefiningMember(Text name) {
    if (!HasWordKey(name)) return {};
    if (!IsInFilters(name)) return WithWords({name});
    // Who asks looks into the text anyway.
    return Candidates({name}, DefinesMember(name), false);
  }

  std::vector<FileId> DefiningMember(Text name, Text word) {
    if (!IsInFilters(name)) return WithWords({name, word});
    const auto has_words = HasWords({name, word});
    const auto has_slots = HasWords({"__slots__"});
    const auto may_define = [&, defines = DefinesMember(name)](const Filter& filter) {
      return has_words(filter) && (defines(filter) || has_slots(filter));
    };
    return Candidates({name, word}, may_define, false);
  }

  bool Refresh() {
    are_filters_fresh_ = false;
    if (!has_walked_ || !HasChanged()) return false;
    const std::vector<FileId> before = all_;
    Walk();
    return all_ != before;
  }

  void Forget() {
    is_doubtful_ = true;
    are_filters_fresh_ = false;
  }

  size_t ByteSize() const {
    return bits_.capacity() * sizeof(bits_[0]) + filters_.capacity() * sizeof(filters_[0]) +
           stamps_.capacity() * sizeof(stamps_[0]);
  }
  size_t read_count() const { return read_count_; }

 private:
  // Where the filter of a file lies among the bits.
  struct Filter {
    uint32_t begin = 0;
    uint32_t size = 0;
    bool tells_definitions = false;
    bool tells_members = false;  // which no index does
  };
  // What a thread needs to make filters, and what it made: their places among its own bits.
  struct FilterMaker {
    WordKeys words;
    PossibleSymbols lines;
    std::vector<WordKey> keys;
    std::string source;
    std::vector<uint64_t> bits;
    struct Made {
      size_t index;
      FileStamp stamp;
      Filter filter;
    };
    std::vector<Made> made;
  };

  static constexpr size_t kBytesOfAStep = 64;
  // Searching a hundred files costs what analysing one does. So many are searched to spare the few in which nothing
  // is, or this share of a large project; short words are everywhere.
  static constexpr size_t kMostFilesSearched = 64;
  static constexpr size_t kShareSearched = 16;
  static constexpr size_t kLongestWordNotSearched = 3;

  // Whether filters tell of a word, those made of an index among them.
  static bool IsInFilters(Text word) { return HasWordKey(word) && word.size() < IndexedWords::kLongestWord; }

  bool IsBelowRoots(const std::string& path) const {
    return std::ranges::any_of(roots_, [&](const std::string& root) { return IsWithin(path, root); });
  }

  bool HasChanged() const {
    return buffers_ != files_.Buffers() ||
           std::ranges::any_of(watched_, [](const Watched& at) { return StampOf(at.path) != at.stamp; });
  }

  void Walk() {
    WatchList watched;
    std::vector<std::string> paths = PathsBelow(roots_, exclude_, watched);
    buffers_ = files_.Buffers();
    for (const FileId buffer : buffers_) {
      if (const std::string& path = files_.PathOf(buffer); IsBelowRoots(path)) paths.push_back(path);
    }
    std::ranges::sort(paths);
    paths.erase(std::unique(paths.begin(), paths.end()), paths.end());
    std::vector<FileId> all;
    all.reserve(paths.size());
    for (const std::string& path : paths) all.push_back(files_.NumberOf(path));
    if (all != all_) KeepFilters(all);
    all_ = std::move(all);
    watched_ = std::move(watched);
    has_walked_ = true;
  }

  // The filters of the files that were there before.
  void KeepFilters(const std::vector<FileId>& all) {
    std::unordered_map<FileId, size_t> old_indexes;
    for (size_t i = 0; i < all_.size(); ++i) old_indexes.emplace(all_[i], i);
    std::vector<Filter> filters(all.size());
    std::vector<FileStamp> stamps(all.size());
    used_ = 0;
    for (size_t i = 0; i < all.size(); ++i) {
      const auto found = old_indexes.find(all[i]);
      if (found == old_indexes.end()) continue;
      filters[i] = filters_[found->second];
      stamps[i] = stamps_[found->second];
      used_ += filters[i].size;
    }
    filters_ = std::move(filters);
    stamps_ = std::move(stamps);
    are_filters_fresh_ = false;
  }

  // Makes the filters of files that have none or have changed. Those of buffers are not asked.
  void UpdateFilters() {
    if (are_filters_fresh_) return;
    std::array<FilterMaker, 2> makers;
    ForEachByThreads(all_.size(), kFilesWorthAThread, makers, [&](size_t i, FilterMaker& maker) {
      if (files_.IsOpen(all_[i])) return;
      const FileStamp stamp = StampOf(files_.PathOf(all_[i]));
      if (stamp != stamps_[i]) MakeFilter(i, stamp, maker);
    });
    TakeFilters(makers);
    are_filters_fresh_ = true;
  }

  void MakeFilter(size_t i, const FileStamp& stamp, FilterMaker& maker) const {
    ++read_count_;
    files_.ReadSource(all_[i], stamp, maker.source);
    maker.words.Read(maker.source);
    Filter filter;
    filter.tells_definitions = !maker.words.may_define_any();
    filter.tells_members = filter.tells_definitions && FindMembers(files_.VersionOf(all_[i]), maker);
    if (!filter.tells_members) maker.keys.clear();
    maker.keys.insert(maker.keys.end(), maker.words.keys().begin(), maker.words.keys().end());
    AddFilter(i, stamp, filter, maker);
  }

  // The keys of what may be members in the source that was read for words; false where it does not tell.
  static bool FindMembers(Version version, FilterMaker& maker) {
    maker.keys = maker.words.attributes();
    if (HoldsWord(maker.source, "class")) {
      if (!maker.lines.Read(maker.source, version)) return false;
      for (const PossibleSymbols::Symbol& symbol : maker.lines.symbols())
        if (symbol.may_be_member) maker.keys.push_back(KeyOfMember(symbol.name));
    }
    std::ranges::sort(maker.keys);
    maker.keys.erase(std::unique(maker.keys.begin(), maker.keys.end()), maker.keys.end());
    return true;
  }

  // Of the keys.
  static void AddFilter(size_t i, const FileStamp& stamp, Filter filter, FilterMaker& maker) {
    filter.begin = static_cast<uint32_t>(maker.bits.size());
    AppendFilter(maker.keys, maker.bits);
    filter.size = static_cast<uint32_t>(maker.bits.size() - filter.begin);
    maker.made.push_back({i, SettledStamp(stamp), filter});
  }

  // Makes filters of what the indexes in the roots say. Those of other versions know other names.
  void MakeFiltersOfIndexes() {
    for (const std::string& root : roots_) {
      const std::unique_ptr<IndexedWords> index =
          index_maker_.empty() ? nullptr : IndexedWords::Read(root, index_maker_);
      if (index == nullptr) continue;
      std::array<FilterMaker, 2> makers;
      ForEachByThreads(all_.size(), kFilesWorthAThread, makers, [&](size_t i, FilterMaker& maker) {
        const Version version = files_.VersionOf(all_[i]);
        const std::string& path = files_.PathOf(all_[i]);
        if (stamps_[i] != FileStamp() || version.parts[0] != index->version().parts[0] ||
            version.parts[1] != index->version().parts[1] || files_.IsOpen(all_[i]) || !IsWithin(path, root) ||
            path.size() <= root.size() + 1)
          return;
        const FileStamp stamp = StampOf(path);
        const std::optional<uint32_t> known = index->Find(Text(path).substr(root.size() + 1), stamp);
        if (!known) return;
        index->KeysOf(*known, maker.keys);
        AddFilter(i, stamp, {.tells_definitions = true}, maker);
      });
      TakeFilters(makers);
    }
  }

  void TakeFilters(const std::array<FilterMaker, 2>& makers) {
    // A vector that grew as vectors do would take twice the memory.
    const size_t size = bits_.size() + makers[0].bits.size() + makers[1].bits.size();
    if (size > bits_.capacity()) bits_.reserve(bits_.empty() ? size : size + size / 8);
    for (const FilterMaker& maker : makers) AddFilters(maker);
    if (bits_.size() > 2 * used_) DropUnusedBits();
  }

  // One that fits in the place of the old one takes it.
  void AddFilters(const FilterMaker& maker) {
    for (const auto& [i, stamp, made] : maker.made) {
      Filter& filter = filters_[i];
      const auto from = maker.bits.begin() + made.begin;
      used_ = used_ - filter.size + made.size;
      if (made.size <= filter.size) {
        std::copy(from, from + made.size, bits_.begin() + filter.begin);
      } else {
        filter.begin = static_cast<uint32_t>(bits_.size());
        bits_.insert(bits_.end(), from, from + made.size);
      }
      filter.size = made.size;
      filter.tells_definitions = made.tells_definitions;
      filter.tells_members = made.tells_members;
      stamps_[i] = stamp;
    }
  }

  void DropUnusedBits() {
    std::vector<uint64_t> bits;
    bits.reserve(used_);
    for (Filter& filter : filters_) {
      const auto from = bits_.begin() + filter.begin;
      filter.begin = static_cast<uint32_t>(bits.size());
      bits.insert(bits.end(), from, from + filter.size);
    }
    bits_ = std::move(bits);
  }

  // A file that may hold what is asked for, and whether its text is to be searched first.
  struct Candidate {
    uint32_t index;
    bool is_searched;
  };
  // Those whose filters hold what is asked for; the bytes of buffers are searched, and of all that are left where
  // these are few and that narrows the answer for who wants it narrow, or filters do not know a word. To make all
  // filters takes five times as long as to search all files, so the first question, whose answer somebody waits for,
  // does without those that no index says.
  template <class Question>
  std::vector<Candidate> CandidatesFor(const std::vector<Text>& words, Question&& may_be, bool is_narrowed = true) {
    All();
    const bool is_first = !std::exchange(was_asked_, true);
    if (is_first) {
      MakeFiltersOfIndexes();
    } else {
      UpdateFilters();
    }
    std::vector<Candidate> candidates;
    const std::vector<uint32_t> open = OpenFiles();
    size_t filtered = 0;
    for (uint32_t i = 0; i < all_.size(); ++i) {
      const bool is_unknown = (is_first && stamps_[i] == FileStamp()) || std::ranges::binary_search(open, i);
      if (!is_unknown && !may_be(filters_[i])) continue;
      if (!is_unknown) ++filtered;
      candidates.push_back({i, is_unknown});
    }
    const bool are_known = std::ranges::all_of(words, IsInFilters);
    const bool is_cheap = filtered <= std::max(kMostFilesSearched, all_.size() / kShareSearched);
    if (!are_known || (is_narrowed && is_cheap && !words.empty() && words.front().size() > kLongestWordNotSearched))
      for (Candidate& candidate : candidates) candidate.is_searched = true;
    return candidates;
  }

  template <class Question>
  std::vector<FileId> Candidates(const std::vector<Text>& words, Question&& may_be, bool is_narrowed = true) {
    const std::vector<Candidate> candidates = CandidatesFor(words, may_be, is_narrowed);
    std::vector<uint32_t> searched;
    for (const Candidate& candidate : candidates)
      if (candidate.is_searched) searched.push_back(candidate.index);
    Search(words, searched);
    auto next = searched.begin();
    std::vector<FileId> files;
    for (const Candidate& candidate : candidates) {
      if (!candidate.is_searched) {
        files.push_back(all_[candidate.index]);
      } else if (next != searched.end() && *next == candidate.index) {
        files.push_back(all_[*next++]);
      }
    }
    return files;
  }

  // The indexes of the files that buffers hold, sorted.
  std::vector<uint32_t> OpenFiles() const {
    std::vector<uint32_t> open;
    for (const FileId buffer : files_.Buffers()) {
      const auto at = std::ranges::lower_bound(all_, files_.PathOf(buffer), {},
                                               [&](FileId file) -> const std::string& { return files_.PathOf(file); });
      if (at != all_.end() && *at == buffer) open.push_back(static_cast<uint32_t>(at - all_.begin()));
    }
    std::ranges::sort(open);
    return open;
  }

  bool Holds(FileId file, const std::vector<Text>& words, std::string& memory) const {
    ++read_count_;
    const Text source = files_.SourceOf(file, memory);
    CountSteps(static_cast<int64_t>(source.size() / kBytesOfAStep));
    return std::ranges::all_of(words, [&](Text word) { return HoldsWord(source, word); });
  }

  // Leaves those in which all words occur.
  void Search(const std::vector<Text>& words, std::vector<uint32_t>& files) const {
    std::vector<char> holds(files.size());
    std::array<std::string, 2> memories;
    ForEachByThreads(files.size(), kFilesWorthAThread, memories,
                     [&](size_t i, std::string& memory) { holds[i] = Holds(all_[files[i]], words, memory); });
    size_t kept = 0;
    for (size_t i = 0; i < files.size(); ++i) {
      if (holds[i] != 0) files[kept++] = files[i];
    }
    files.resize(kept);
  }

  Files& files_;
  std::vector<std::string> roots_;
  const std::string exclude_;
  const std::string index_maker_;
  std::vector<FileId> all_;
  // Of the walk.
  WatchList watched_;
  std::vector<FileId> buffers_;
  bool has_walked_ = false;
  bool is_doubtful_ = false;
  bool was_asked_ = false;  // for words
  // Of each file, and whether they have been compared with the files.
  std::vector<Filter> filters_;
  std::vector<FileStamp> stamps_;
  std::vector<uint64_t> bits_;
  size_t used_ = 0;  // of the bits
  bool are_filters_fresh_ = false;
  mutable std::atomic<size_t> read_count_{0};
};

ProjectFiles::ProjectFiles(Files& files, std::vector<std::string> roots, Text exclude, Text index_maker)
    : impl_(std::make_unique<Impl>(files, std::move(roots), exclude, index_maker)) {}
ProjectFiles::~ProjectFiles() = default;

const std::vector<FileId>& ProjectFiles::All() { return impl_->All(); }
std::vector<FileId> ProjectFiles::WithWords(const std::vector<Text>& words) { return impl_->WithWords(words); }
void ProjectFiles::EachWithWord(Text word, const std::function<bool(FileId)>& take) { impl_->EachWithWord(word, take); }
std::vector<FileId> ProjectFiles::DefiningMember(Text name) { return impl_->DefiningMember(name); }
std::vector<FileId> ProjectFiles::DefiningMember(Text name, Text word) { return impl_->DefiningMember(name, word); }
bool ProjectFiles::Refresh() { return impl_->Refresh(); }
void ProjectFiles::Forget() { impl_->Forget(); }
size_t ProjectFiles::ByteSize() const { return impl_->ByteSize(); }
size_t ProjectFiles::read_count() const { return impl_->read_count(); }

}  // namespace quillet
