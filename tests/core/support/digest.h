// What the core says of sources, as one number a stage: two builds that give the same numbers tell nobody apart by
// these sources.
//
// What is said of a file does not depend on other files that were asked about, and no path of this machine, no
// address, time or order of a table is part of it. The text behind a number can be kept and shown.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <memory>
#include <span>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "analysis/record_table.h"
#include "corpus/shard_writer.h"
#include "foundations/console.h"
#include "index/answer_lines.h"
#include "index/counts.h"
#include "index/question.h"
#include "index/words.h"
#include "names/binder.h"
#include "names/scope_rules.h"
#include "output/json_lines.h"
#include "output/record_rows.h"
#include "output/text_lines.h"
#include "project/ignore_rules.h"
#include "project/word_filters.h"
#include "site/pages.h"
#include "site/site_index.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/names_helper.h"
#include "tests/core/support/small_library.h"
#include "tests/core/support/syntax_text.h"
#include "tests/core/support/temporary_folder.h"
#include "tests/core/support/tree_text.h"
#include "workspace/questions.h"

namespace quillet::testing {

class Digest {
 public:
  void Add(Text text) {
    for (const char byte : text) AddByte(static_cast<uint8_t>(byte));
    AddByte(0xFF);
    AddByte(IsNone(text));
    if (shown_ != nullptr) shown_->append(text.empty() ? "-" : text).append("\n");
  }
  void Add(int64_t number) {
    for (int i = 0; i < 8; ++i) AddByte(static_cast<uint8_t>(number >> (8 * i)));
    if (shown_ != nullptr) shown_->append(std::to_string(number)).append("\n");
  }
  void AddNumbers(std::initializer_list<int64_t> numbers) {
    std::string* const shown = std::exchange(shown_, nullptr);
    for (const int64_t number : numbers) {
      Add(number);
      if (shown != nullptr) shown->append(std::to_string(number)).append(" ");
    }
    if ((shown_ = shown) != nullptr) shown_->append("\n");
  }
  // Of bytes, their number alone is shown.
  void AddBytes(Text bytes) {
    std::string* const shown = std::exchange(shown_, nullptr);
    Add(bytes);
    if ((shown_ = shown) != nullptr) shown_->append(std::to_string(value_)).append("\n");
  }
  // What comes behind is about this. Counts for nothing.
  void Head(const std::string& head) {
    if (shown_ != nullptr) shown_->append("==== " + head + "\n");
  }

  uint64_t value() const { return value_; }
  void ShowIn(std::string& shown) { shown_ = &shown; }

 private:
  void AddByte(uint8_t byte) { value_ = (value_ ^ byte) * 1099511628211u; }

  uint64_t value_ = 14695981039346656037u;
  std::string* shown_ = nullptr;
};

struct Digests {
  Digest tokens, trees, records, complete, output, rows, names, syntax, index, project, site, answers;

  using Stage = std::pair<const char*, Digest*>;
  std::array<Stage, 12> Stages() {
    return {{{"tokens", &tokens},
             {"trees", &trees},
             {"records", &records},
             {"complete", &complete},
             {"output", &output},
             {"rows", &rows},
             {"names", &names},
             {"syntax", &syntax},
             {"index", &index},
             {"project", &project},
             {"site", &site},
             {"answers", &answers}}};
  }
  void Head(const std::string& head) {
    for (const auto& [name, digest] : Stages()) digest->Head(head);
  }
};

inline std::string BytesOf(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), {}};
}

// Some lines of a file spoilt: a byte left out, said twice, or put in; always the same ones in the same way.
inline std::string Spoilt(const std::string& bytes, uint32_t round) {
  static constexpr Text kInserted = "()[]{}:,;=\\'\"#.*@ \n\r\t0a-f|!";
  uint32_t seed = round * 7919 + static_cast<uint32_t>(bytes.size());
  std::string spoilt;
  size_t begin = 0;
  while (begin < bytes.size()) {
    const size_t end = std::min(bytes.find('\n', begin), bytes.size() - 1) + 1;
    std::string line = bytes.substr(begin, end - begin);
    seed = seed * 1664525u + 1013904223u;
    if ((seed >> 28) % 4 == 0) {
      const size_t at = (seed >> 8) % line.size();
      switch ((seed >> 26) % 3) {
        case 0:
          line.erase(at, 1);
          break;
        case 1:
          line.insert(at, 1, line[at]);
          break;
        default:
          line.insert(at, 1, kInserted[(seed >> 12) % kInserted.size()]);
          break;
      }
    }
    spoilt += line;
    begin = end;
  }
  return spoilt;
}

// What is said of a source by itself, as one version of Python reads it.
class AnalysisDigest {
 public:
  AnalysisDigest(Version version, Digests& digests)
      : version_(version),
        digests_(digests),
        file_(OptionsOf(version)),
        complete_file_(CompletelyOf(version)),
        parser_(OptionsOf(version)) {}

  void Add(const std::string& bytes) {
    file_.Analyze(bytes);
    complete_file_.Analyze(bytes);
    LogicalLine line;
    const Ref<SourceText> source = SourceText::Copy(bytes);
    std::vector<LineRow> rows;
    CutLines(*source, version_, rows);
    for (const Token& token : source->tokens) {
      digests_.tokens.Add(token.view());
      digests_.tokens.Add(token.code);
    }
    for (size_t i = 0; i < rows.size(); ++i) {
      const LineRow& row = rows[i];
      digests_.tokens.AddNumbers({row.token_count, row.first_line, row.last_line, row.indent,
                                  static_cast<int64_t>(row.kind), row.continues_physical_line, row.has_inline_body,
                                  row.is_async, row.no_embedded});
      SetFromRow(line, source, row);
      AddTree(parser_.logical_parser(), line, file_.results()[i].in_async_def);
    }
    AddRecords(file_, digests_.records);
    AddRecords(complete_file_, digests_.complete);
    AddOutput();
    AddNames(bytes);
    AddSyntax(*source, rows);
    AddIndex();
    AddSite();
  }

  Version version() const { return version_; }
  std::string Name() const { return std::to_string(version_.parts[0]) + "." + std::to_string(version_.parts[1]); }

  static FileAnalyzer::Options OptionsOf(Version version) {
    FileAnalyzer::Options options;
    static_cast<CPGenAnalyzerImpl::Options&>(options) = AnalyzerOptions(version);
    if (!version.AtLeast(3, 0)) options.print_function_grammar_file = options.grammar_file + "-print-function";
    return options;
  }
  static FileAnalyzer::Options CompletelyOf(Version version) {
    FileAnalyzer::Options options = OptionsOf(version);
    options.reads_completely = true;
    options.make_name_rules = MakeScopeRules;
    return options;
  }

 private:
  void AddTree(CPGenParserImpl& parser, LogicalLine& line, bool in_async_def) {
    CNode* tree = nullptr;
    try {
      for (const LogicalLine* exp : line.GetExpLogicals().lines) {
        digests_.tokens.AddNumbers({static_cast<int64_t>(exp->kind), exp->first_line});
        for (size_t i = 0; i < exp->toks.size(); ++i) {
          digests_.tokens.Add(exp->toks[i].view());
          digests_.tokens.Add(exp->positions()[i].col);
        }
      }
      tree = parser.ParseToNode(line, in_async_def);
      digests_.trees.Add(ShowTree(tree));
      if (tree == nullptr) return;
      digests_.trees.Add(ShowContexts(tree));
      CNodeToTextConverter all(true, true, true), names(false, false, false);
      digests_.trees.Add(all.TextForNode(tree));
      digests_.trees.Add(names.TextForNode(tree));
    } catch (const Error& error) {
      digests_.trees.Add(error.message());
    }
    if (tree != nullptr) parser.DiscardNode(tree);
  }

  static void AddRecords(const FileAnalyzer& file, Digest& digest) {
    for (const auto* rows : {&file.store().rows, &file.store().arg_rows}) {
      for (const Record& record : *rows) {
        digest.Add(record.name());
        digest.Add(record.info());
      }
    }
    for (size_t i = 0; i < file.results().size(); ++i) {
      const FileAnalyzer::LineResult& result = file.results()[i];
      digest.AddNumbers({result.record_end, result.arg_record_end, result.in_async_def + 2 * result.first_in_def});
      if (result.error < 0) continue;
      digest.Add(file.errors()[static_cast<size_t>(result.error)].message());
      digest.AddNumbers({file.ErrorPosition(i).line, file.ErrorPosition(i).col});
    }
  }

  void AddOutput() {
    ScopeNames scopes;
    scopes.Build(file_);
    PlacedRecords placed;
    JsonLinesOptions json;
    TextLinesOptions text;
    text.width_of = [](uint32_t code_point) { return code_point < 0x2000 ? 1u : 2u; };
    for (const bool is_other : {false, true}) {
      json.errors_only = text.errors_only = text.colours = is_other;
      for (const auto& writer : {MakeTextLinesWriter(text), MakeJsonLinesWriter(json)}) {
        std::string out;
        writer->Write({"a.py", {}, {}}, file_, scopes, placed, out);
        digests_.output.Add(out);
      }
    }
    const RecordTable table = RecordTableMaker().Make(file_, scopes, placed);
    for (size_t i = 0; i < table.size(); ++i) {
      digests_.output.Add(table.NameAt(i));
      digests_.output.Add(table.DetailAt(i));
      digests_.output.Add(static_cast<int64_t>(table.opens[i]));
    }
    for (const RecordTable::Definition& definition : table.definitions) {
      digests_.output.Add(table.scope_texts[definition.scope]);
      digests_.output.AddNumbers({definition.line, definition.last_line});
    }
    AddPages(table);
  }

  // As rows of a database, twice, in pages that hold few.
  void AddPages(const RecordTable& table) {
    std::string head(DatabasePages::kHeadSize, '\0');
    head.replace(0, 15, "SQLite format 3");
    head[16] = 2;  // pages of 512 bytes
    head[31] = 3;
    head[47] = 4;
    RecordRows rows(head);
    rows.Add(table, 1);
    rows.Add(table, table.size() + 7);
    digests_.output.AddBytes(rows.FinishTable());
    while (rows.AddToIndex()) {
    }
    digests_.output.AddBytes(rows.FinishIndex());
    digests_.output.AddBytes(rows.pages().Take());
    digests_.output.AddNumbers({int64_t{rows.pages().page_count()}, static_cast<int64_t>(rows.names().size()),
                                static_cast<int64_t>(rows.details().size())});
  }

  void AddNames(const std::string& bytes) {
    const Bindings& bindings = binder_.Bind(bytes);
    digests_.names.Add(NamesOf(bindings));
    for (const Occurrence& occurrence : bindings.occurrences) digests_.names.Add(occurrence.begin);
    for (uint32_t i = 0; i < bindings.scopes.size(); ++i) {
      const NameScope& scope = bindings.scopes[i];
      digests_.names.Add(ScopeWord(bindings, i));
      digests_.names.Add(SymbolsOf(bindings, i));
      digests_.names.AddNumbers({int64_t{scope.parent}, int64_t{scope.begin}, int64_t{scope.end}, scope.is_listed,
                                 scope.is_async, scope.has_star_import, scope.is_generator, scope.sees_class});
    }
    for (const NameSymbol& symbol : bindings.symbols) digests_.names.AddNumbers({symbol.variable, symbol.uses});
  }

  void AddSyntax(const SourceText& source, const std::vector<LineRow>& rows) {
    FileSyntax file;
    syntax_.Read(source, rows, file);
    std::string text;
    AppendBlockText(file, kModuleStmt, 0, text);
    digests_.syntax.Add(text);
    for (const Expr& expr : file.exprs) digests_.syntax.AddNumbers({int64_t{expr.begin}, int64_t{expr.end}});
  }

  // What a writer makes of the file.
  std::string Written(FileWriter& writer) {
    ScopeNames scopes;
    scopes.Build(file_);
    PlacedRecords placed;
    std::string out;
    writer.Write({"a.py", {}, {}}, file_, scopes, placed, out);
    return out;
  }

  void AddIndex() {
    digests_.index.AddBytes(Written(*MakeWordsWriter(version_)));
    AnswerLinesOptions options;
    options.form = AnswerLinesOptions::Form::kJson;
    Question question;
    for (const auto& [match, name] : {std::pair(Question::Match::kEverything, ""),
                                      {Question::Match::kExact, "a"},
                                      {Question::Match::kSuffix, ".b"},
                                      {Question::Match::kGlob, "*e?"}}) {
      question.match = match;
      question.name = name;
      digests_.index.Add(Written(*MakeQuestionWriter(question, version_, MakeAnswerLines(options))));
      options.form = AnswerLinesOptions::Form::kLong;
    }
    RecordCounts counts;
    counts.Add(Written(*MakeCountsWriter()));
    for (const uint64_t count : counts.kinds()) digests_.index.Add(static_cast<int64_t>(count));
    for (const auto& [name, count] : counts.MostUsed(5)) {
      digests_.index.Add(name);
      digests_.index.Add(static_cast<int64_t>(count));
    }
  }

  void AddSite() {
    const std::string survey = Written(*MakeSiteSurveyWriter(version_));
    digests_.site.AddBytes(survey);
    const auto index = std::make_shared<SiteIndex>(std::vector<std::string>{"a.py"}, std::vector<std::string>{});
    index->Add(0, survey);
    digests_.site.Add(Written(*MakeSitePageWriter(index, version_)));
  }

  Version version_;
  Digests& digests_;
  FileAnalyzer file_;
  FileAnalyzer complete_file_;
  CPGenAnalyzerImpl parser_;
  NameBinder binder_{version_};
  SyntaxReader syntax_{version_};
};

// What a workspace answers about the files of a program, which lie in a folder of their own.
class AnswersDigest {
 public:
  // With little memory, what was found is forgotten all the time, and found again.
  enum class Memory : uint8_t { kPlenty, kLittle };
  AnswersDigest(Version version, Digest& digest, Memory memory = Memory::kPlenty)
      : digest_(digest), workspace_(SettingsFor(version, memory)) {}

  // Before anything is asked.
  void Write(const std::string& path, const std::string& bytes) { folder_.Write(kRoot + path, bytes); }

  void Open(const std::string& path, const std::string& bytes) { workspace_.Open(File(path), bytes); }
  // So many places of a kind are asked about, the last name among them, and each fifth of them about all files.
  void AddFile(const std::string& path, size_t most_places) {
    const FileId file = File(path);
    AddWhole(file);
    const std::vector<ColouredName> names = workspace_.Colours(file);
    const size_t step = names.size() / most_places + 1;
    for (size_t i = 0; i < names.size(); i += step) AddName(file, names[i].begin, i % (5 * step) == 0);
    if (!names.empty()) AddName(file, names.back().begin, false);
    AddPlacesBetween(file, most_places);
  }
  // Of a buffer that is edited here and there, and closed.
  void AddEdits(const std::string& path) {
    const FileId file = File(path);
    const std::string before(workspace_.SourceOf(file));
    workspace_.Open(file, before);
    uint32_t at = 0;
    for (const Text inserted : {Text("."), Text("("), Text("\n"), Text("x = "), Text("\"\"\""), Text("")}) {
      const auto size = static_cast<uint32_t>(workspace_.SourceOf(file).size());
      at = static_cast<uint32_t>((uint64_t{at} + size / 7 + 3) % (size + 1));
      const std::vector<ColouredName> names = workspace_.Colours(file, at);
      if (!names.empty()) at = names.front().end;
      const uint32_t end = std::min(size, at + (inserted.empty() ? 9 : 1));
      digest_.Head("edited at " + std::to_string(at));
      workspace_.Change(file, at, inserted == Text("\n") ? end : at, inserted);
      AddWhole(file);
      AddPlace(file, at + 1);
      if (!names.empty()) AddName(file, names.front().begin, false);
    }
    workspace_.Close(file);
    workspace_.Refresh();
    digest_.Head("closed");
    AddPlace(file, at);
  }
  // Of all files together.
  void AddProgram() {
    for (const Text query : {Text(""), Text("e"), Text("Or"), Text("shop.o"), Text("__init__")}) {
      for (const size_t most : {size_t{3}, size_t{200}}) {
        for (const SymbolInfo& symbol : workspace_.Symbols(query, most)) {
          for (const Text text : {Text(symbol.name), Text(symbol.kind), Text(symbol.container)}) digest_.Add(text);
          digest_.Add(PathOf(symbol.file));
          digest_.AddNumbers({symbol.begin, symbol.end, symbol.place.line, symbol.place.col, symbol.end_column});
        }
      }
    }
    for (const Text name : {Text("Order"), Text("Good.take"), Text("shop.goods.Good.price"), Text("a.b")})
      Add(workspace_.Named(name));
  }

 private:
  Workspace::Settings SettingsFor(Version version, Memory memory) const {
    Workspace::Settings settings;
    if (memory == Memory::kLittle) settings.most_held = settings.most_visited = settings.most_remembered = 1000;
    settings.roots = {folder_ / kRoot};
    settings.libraries = {folder_ / kRoot + "site-packages"};
    settings.typeshed = SmallLibrary();
    settings.version = version;
    settings.analyzer = std::make_shared<FileAnalyzer::Options>(AnalysisDigest::CompletelyOf(version));
    return settings;
  }
  FileId File(const std::string& path) { return workspace_.FileOf(folder_ / kRoot + path); }

  // Without the folders, whose names are others in each run.
  std::string Shown(std::string text) const {
    for (const std::string& folder : {folder_.path(), SmallLibrary()})
      for (size_t at; (at = text.find(folder)) != std::string::npos;) text.erase(at, folder.size());
    return text;
  }
  std::string PathOf(FileId file) const { return Shown(workspace_.PathOf(file)); }

  void Add(const std::vector<Location>& locations) {
    for (const Location& location : locations) {
      digest_.Add(PathOf(location.file));
      digest_.AddNumbers({location.begin, location.end, int64_t(location.certainty)});
      digest_.Add(location.role);
      digest_.Add(location.kind);
    }
  }

  void Add(const std::vector<Call>& calls) {
    for (const Call& call : calls) {
      digest_.Add(call.name);
      Add({call.function});
      Add(call.calls);
    }
  }
  void Add(const Hover& hover) {
    digest_.Add(Shown(hover.text));
    digest_.Add(hover.documentation);
    for (const std::string& type : hover.types) digest_.Add(type);
    digest_.AddNumbers({int64_t(hover.certainty), hover.begin, hover.end});
  }
  void Add(const Rename& rename) {
    digest_.Add(Shown(rename.problem));
    for (const TextEdit& edit : rename.edits) {
      digest_.Add(PathOf(edit.file));
      digest_.AddNumbers({edit.begin, edit.end});
      digest_.Add(edit.text);
    }
  }

  // What is said of a file without a place.
  void AddWhole(FileId file) {
    for (const ColouredName& name : workspace_.Colours(file))
      digest_.AddNumbers({name.begin, name.end, int64_t(name.kind), name.modifiers});
    for (const InlineHint& hint : workspace_.Hints(file)) {
      digest_.Add(hint.text);
      digest_.AddNumbers({hint.offset, hint.is_type, int64_t(hint.certainty)});
    }
    for (const OutlineItem& item : workspace_.Outline(file)) {
      for (const Text text : {Text(item.name), Text(item.kind), Text(item.detail)}) digest_.Add(text);
      digest_.AddNumbers({item.begin, item.end, item.name_begin, item.name_end, item.parent});
    }
    for (const Problem& problem : workspace_.Problems(file)) {
      digest_.Add(problem.code);
      digest_.Add(problem.message);
      digest_.AddNumbers({problem.begin, problem.end});
    }
    for (const Fold& fold : workspace_.Folds(file)) {
      digest_.AddNumbers({fold.first_line, fold.last_line});
      digest_.Add(fold.kind);
    }
  }

  // What is there, and with `all` also what is asked of all files.
  void AddName(FileId file, uint32_t offset, bool all) {
    digest_.Head(std::to_string(offset) + ": " + workspace_.LineOf(file, offset));
    for (const std::string& type : workspace_.Types(file, offset)) digest_.Add(type);
    Add(workspace_.Definitions(file, offset));
    Add(workspace_.HoverAt(file, offset));
    Add(workspace_.TypeDefinitions(file, offset));
    if (!all) return;
    for (const bool everywhere : {false, true}) Add(workspace_.References(file, offset, everywhere));
    for (const bool only_certain : {false, true}) Add(workspace_.RenameTo(file, offset, "another_name", only_certain));
    Add(workspace_.RenameTo(file, offset, "self"));
    Add(workspace_.RenameTo(file, offset, "no name"));
    Add(workspace_.Declarations(file, offset));
    Add(workspace_.Implementations(file, offset));
    Add(workspace_.Callers(file, offset));
    Add(workspace_.Callees(file, offset));
    Add(workspace_.Supertypes(file, offset));
    Add(workspace_.Subtypes(file, offset));
    AddPlace(file, offset);
  }
  // What may be written at a place, and what is around it.
  void AddPlace(FileId file, uint32_t offset) {
    digest_.Head(std::to_string(offset) + " in " + workspace_.LineOf(file, offset));
    for (const Signature& signature : workspace_.Signatures(file, offset)) {
      digest_.Add(signature.label);
      digest_.Add(signature.documentation);
      digest_.AddNumbers({signature.active, int64_t(signature.certainty)});
      for (const Parameter& parameter : signature.parameters) digest_.Add(parameter.label);
    }
    const std::vector<Completion> completions = workspace_.Complete(file, offset);
    for (const Completion& completion : completions) {
      for (const Text text :
           {Text(completion.name), Text(completion.kind), Text(completion.detail), Text(completion.documentation)})
        digest_.Add(text);
      digest_.Add(static_cast<int64_t>(completion.certainty));
    }
    if (!completions.empty())
      Add(workspace_.DescribeCompletion(file, offset, completions[offset % completions.size()].name));
    for (const Span& span : workspace_.Selections(file, offset)) digest_.AddNumbers({span.begin, span.end});
    Add(workspace_.Definitions(file, offset));
    digest_.Add(static_cast<int64_t>(workspace_.was_bounded()));
    for (const ColumnUnit unit : {ColumnUnit::kUtf16, ColumnUnit::kUtf8}) {
      workspace_.set_column_unit(unit);
      const Position place = workspace_.PlaceOf(file, offset);
      digest_.AddNumbers({place.line, place.col, workspace_.OffsetOf(file, place.line, place.col + 1),
                          workspace_.OffsetOf(file, place.line + 1, 3)});
    }
  }
  // Behind brackets, commas and points, where an editor asks by itself, and anywhere.
  void AddPlacesBetween(FileId file, size_t most_places) {
    const std::string source(workspace_.SourceOf(file));
    std::vector<uint32_t> places;
    for (uint32_t at = 1; at <= source.size(); ++at)
      if (Text("(,.=@[{ \n\"'").find(source[at - 1]) != Text::npos) places.push_back(at);
    for (size_t i = 0; i < places.size(); i += places.size() / most_places + 1) AddPlace(file, places[i]);
    for (size_t at = 0; at <= source.size(); at += source.size() / 8 + 1)
      AddName(file, static_cast<uint32_t>(at), false);
  }

  // The program lies two folders down, so that what it imports from above it is not what else lies on this machine.
  static constexpr const char* kRoot = "above/program/";

  Digest& digest_;
  // Before that of the library, since answers are in the order of paths.
  TemporaryFolder folder_{"answers-"};
  Workspace workspace_;
};

// A module beside a file by itself, which may import it.
inline constexpr const char* kOtherModule = "class B:\n  x = 1\n  def f(self, y: int = 2) -> str: ...\n";

// What is said of sources by themselves, as each of some versions, the newest first: as they are, and spoilt in so many
// ways.
class SourcesDigest {
 public:
  SourcesDigest(std::span<const Version> versions, Digests& digests) : digests_(digests) {
    for (const Version version : versions) analyses_.push_back(std::make_unique<AnalysisDigest>(version, digests));
  }

  void Add(const std::string& bytes, uint32_t spoilt) {
    // What goes wrong within counts for records.
    static Digest* records;
    const Console before = TheConsole();
    records = &digests_.records;
    TheConsole().print_line = [](Text line) { records->Add(line); };
    TheConsole().report_exception = [](const std::exception_ptr& failure, bool) {
      records->Add(ReprOfException(failure));
    };
    for (uint32_t round = 0; round <= spoilt; ++round) {
      const std::string text = round == 0 ? bytes : Spoilt(bytes, round);
      for (const auto& analysis : analyses_) {
        digests_.Head(analysis->Name() + (round == 0 ? "" : ", spoilt " + std::to_string(round)));
        analysis->Add(text);
      }
    }
    TheConsole() = before;
  }

  // The words that it may hold and define; and as rules of an ignore file, what it says of paths, which are its own
  // lines.
  void AddProject(const std::string& bytes) {
    WordKeys words;
    std::string source = bytes;
    words.Read(source);
    for (const WordKey key : words.keys()) digests_.project.Add(static_cast<int64_t>(key));
    std::vector<uint64_t> filter;
    AppendFilter(words.keys(), filter);
    for (const uint64_t bits : filter) digests_.project.Add(static_cast<int64_t>(bits));
    digests_.project.AddNumbers({words.may_define_any(), HasWordKey(bytes)});
    IgnoreRules rules(bytes);
    std::istringstream lines(bytes);
    std::string path, before;
    for (int i = 0; i < 100 && std::getline(lines, path); ++i) {
      for (const std::string& asked : {path, before + "/" + path, path + before})
        digests_.project.AddNumbers({int64_t(rules.Of(asked, false)), int64_t(rules.Of(asked, true))});
      before = path;
    }
  }

  // As the rows of a corpus, in runs and groups that are small, of the version that it shows itself to be.
  void AddRows(const std::vector<std::string>& sources) {
    for (const RowForm form : {RowForm::kRecords, RowForm::kOccurrences}) {
      ShardWriter::Options options;
      options.form = form;
      for (const auto& analysis : analyses_) options.versions.push_back(AnalysisDigest::OptionsOf(analysis->version()));
      options.compress = [](Text raw, std::string& compressed) { compressed = raw; };
      options.decode = [](Text, std::string& utf8) {
        utf8 = "unknown";
        return false;
      };
      options.run_rows = 100;
      options.group_rows = 30;
      ShardWriter writer(std::move(options));
      for (const std::string& bytes : sources) {
        writer.Add({"p", "a", "a.py", bytes, /*is_text=*/false, {}});
        writer.Add({"p", "", "b.py", bytes, /*is_text=*/true, {}});
      }
      writer.Add({"p", "a", "c.py", {}, false, "gone"});
      writer.WorkToTheEnd();
      writer.Finish("key", "value");
      std::string taken;
      writer.TakeRows(taken);
      digests_.rows.AddBytes(taken);
      writer.TakeFiles(taken);
      digests_.rows.AddBytes(taken);
      const ShardWriter::Totals totals = writer.totals();
      for (const size_t number :
           {totals.files, totals.bytes, totals.lines, totals.rows, totals.errors, totals.problems})
        digests_.rows.Add(static_cast<int64_t>(number));
    }
  }

 private:
  Digests& digests_;
  std::vector<std::unique_ptr<AnalysisDigest>> analyses_;
};

}  // namespace quillet::testing
