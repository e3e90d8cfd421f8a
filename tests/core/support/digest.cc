// quillet_digest: what the core says of a corpus, as one number a stage.
//
//   quillet_digest PATH...    files, and folders with all that lies below them
//
// Each file is taken as it is and with some of its lines spoilt, always the same ones in the same way, as
// 2.7, 3.8 and 3.12: tokens and rows, trees with their contexts and texts, records and errors, those of a complete
// reading, too, what is printed and reported, the lines of each format, names and what they are bound to, statements
// and expressions, the words of an index, answers to questions, and the page of a site; as 3.12, what a workspace with
// a small library answers at some of its names. Two builds that print the same numbers tell nobody apart by this
// corpus. scripts/mutate.py asks it about changes that no test noticed.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "analysis/record_table.h"
#include "index/answer_lines.h"
#include "index/question.h"
#include "index/words.h"
#include "names/binder.h"
#include "names/scope_rules.h"
#include "output/json_lines.h"
#include "output/text_lines.h"
#include "site/pages.h"
#include "site/site_index.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/names_helper.h"
#include "tests/core/support/small_library.h"
#include "tests/core/support/syntax_text.h"
#include "tests/core/support/temporary_folder.h"
#include "tests/core/support/tree_text.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

class Digest {
 public:
  void Add(Text text) {
    for (const char byte : text) AddByte(static_cast<uint8_t>(byte));
    AddByte(0xFF);
    AddByte(IsNone(text));
  }
  void Add(int64_t number) {
    for (int i = 0; i < 8; ++i) AddByte(static_cast<uint8_t>(number >> (8 * i)));
  }
  uint64_t value() const { return value_; }

 private:
  void AddByte(uint8_t byte) { value_ = (value_ ^ byte) * 1099511628211u; }

  uint64_t value_ = 14695981039346656037u;
};

struct Digests {
  Digest tokens, trees, records, complete, output, names, syntax, index, site, answers;
};

Digests digests;

// Some lines of a file spoilt: a byte left out, said twice, or put in.
std::string Spoilt(const std::string& bytes, uint32_t seed) {
  static constexpr Text kInserted = "()[]{}:,;=\\'\"#.*@ \n\r\t0a-f|!";
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

void AddTree(CPGenParserImpl& parser, LogicalLine& line, bool in_async_def) {
  CNode* tree = nullptr;
  try {
    for (const LogicalLine* exp : line.GetExpLogicals().lines) {
      digests.tokens.Add(static_cast<int64_t>(exp->kind));
      digests.tokens.Add(exp->first_line);
      for (size_t i = 0; i < exp->toks.size(); ++i) {
        digests.tokens.Add(exp->toks[i].view());
        digests.tokens.Add(exp->positions()[i].col);
      }
    }
    tree = parser.ParseToNode(line, in_async_def);
    digests.trees.Add(testing::ShowTree(tree));
    if (tree == nullptr) return;
    digests.trees.Add(testing::ShowContexts(tree));
    CNodeToTextConverter all(true, true, true), names(false, false, false);
    digests.trees.Add(all.TextForNode(tree));
    digests.trees.Add(names.TextForNode(tree));
  } catch (const Error& error) {
    digests.trees.Add(error.message());
  }
  if (tree != nullptr) parser.DiscardNode(tree);
}

class Analysis {
 public:
  explicit Analysis(Version version)
      : version_(version),
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
      digests.tokens.Add(token.view());
      digests.tokens.Add(token.code);
    }
    for (size_t i = 0; i < rows.size(); ++i) {
      const LineRow& row = rows[i];
      for (const int64_t number :
           {int64_t{row.token_count}, int64_t{row.first_line}, int64_t{row.last_line}, int64_t{row.indent},
            static_cast<int64_t>(row.kind), int64_t{row.continues_physical_line}, int64_t{row.has_inline_body},
            int64_t{row.is_async}, int64_t{row.no_embedded}})
        digests.tokens.Add(number);
      SetFromRow(line, source, row);
      AddTree(parser_.logical_parser(), line, file_.results()[i].in_async_def);
    }
    AddRecords(file_, digests.records);
    AddRecords(complete_file_, digests.complete);
    AddOutput();
    AddNames(bytes);
    AddSyntax(*source, rows);
    AddIndex();
    AddSite();
  }

 private:
  static FileAnalyzer::Options OptionsOf(Version version) {
    FileAnalyzer::Options options;
    static_cast<CPGenAnalyzerImpl::Options&>(options) = testing::AnalyzerOptions(version);
    if (!version.AtLeast(3, 0)) options.print_function_grammar_file = options.grammar_file + "-print-function";
    return options;
  }

  static FileAnalyzer::Options CompletelyOf(Version version) {
    FileAnalyzer::Options options = OptionsOf(version);
    options.reads_completely = true;
    options.make_name_rules = MakeScopeRules;
    return options;
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
      digest.Add(result.record_end);
      digest.Add(result.arg_record_end);
      digest.Add(result.in_async_def + 2 * result.first_in_def);
      if (result.error < 0) continue;
      digest.Add(file.errors()[static_cast<size_t>(result.error)].message());
      digest.Add(file.ErrorPosition(i).line);
      digest.Add(file.ErrorPosition(i).col);
    }
  }

  void AddOutput() {
    ScopeNames scopes;
    scopes.Build(file_);
    PlacedRecords placed;
    for (const bool json : {false, true}) {
      std::string out;
      const std::unique_ptr<FileWriter> writer = json ? MakeJsonLinesWriter({}) : MakeTextLinesWriter({});
      writer->Write({"a.py", {}, {}}, file_, scopes, placed, out);
      digests.output.Add(out);
    }
    const RecordTable table = RecordTableMaker().Make(file_, scopes, placed);
    for (size_t i = 0; i < table.size(); ++i) {
      digests.output.Add(table.NameAt(i));
      digests.output.Add(table.DetailAt(i));
      digests.output.Add(static_cast<int64_t>(table.opens[i]));
    }
    for (const RecordTable::Definition& definition : table.definitions) {
      digests.output.Add(table.scope_texts[definition.scope]);
      digests.output.Add(definition.line);
      digests.output.Add(definition.last_line);
    }
  }

  void AddNames(const std::string& bytes) {
    const Bindings& bindings = binder_.Bind(bytes);
    digests.names.Add(testing::NamesOf(bindings));
    for (const Occurrence& occurrence : bindings.occurrences) digests.names.Add(occurrence.begin);
    for (uint32_t i = 0; i < bindings.scopes.size(); ++i) {
      const NameScope& scope = bindings.scopes[i];
      digests.names.Add(testing::ScopeWord(bindings, i));
      digests.names.Add(testing::SymbolsOf(bindings, i));
      for (const int64_t number : {int64_t{scope.parent}, int64_t{scope.begin}, int64_t{scope.end},
                                   int64_t{scope.is_listed}, int64_t{scope.is_async}, int64_t{scope.has_star_import},
                                   int64_t{scope.is_generator}, int64_t{scope.sees_class}})
        digests.names.Add(number);
    }
    for (const NameSymbol& symbol : bindings.symbols) {
      digests.names.Add(symbol.variable);
      digests.names.Add(symbol.uses);
    }
  }

  void AddSyntax(const SourceText& source, const std::vector<LineRow>& rows) {
    FileSyntax file;
    syntax_.Read(source, rows, file);
    std::string text;
    testing::AppendBlockText(file, kModuleStmt, 0, text);
    digests.syntax.Add(text);
    for (const Expr& expr : file.exprs) {
      digests.syntax.Add(expr.begin);
      digests.syntax.Add(expr.end);
    }
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
    digests.index.Add(Written(*MakeWordsWriter(version_)));
    AnswerLinesOptions options;
    options.form = AnswerLinesOptions::Form::kJson;
    Question question;
    for (const auto& [match, name] : {std::pair(Question::Match::kEverything, ""),
                                      {Question::Match::kExact, "a"},
                                      {Question::Match::kSuffix, ".b"},
                                      {Question::Match::kGlob, "*e?"}}) {
      question.match = match;
      question.name = name;
      digests.index.Add(Written(*MakeQuestionWriter(question, version_, MakeAnswerLines(options))));
      options.form = AnswerLinesOptions::Form::kLong;
    }
  }

  void AddSite() {
    const std::string survey = Written(*MakeSiteSurveyWriter(version_));
    digests.site.Add(survey);
    const auto index = std::make_shared<SiteIndex>(std::vector<std::string>{"a.py"}, std::vector<std::string>{});
    index->Add(0, survey);
    digests.site.Add(Written(*MakeSitePageWriter(index, version_)));
  }

  Version version_;
  FileAnalyzer file_;
  FileAnalyzer complete_file_;
  CPGenAnalyzerImpl parser_;
  NameBinder binder_{version_};
  SyntaxReader syntax_{version_};
};

// What is answered about a text that an editor has open, all of it by one workspace.
class Answers {
 public:
  Answers() : workspace_(SettingsFor(folder_.path())) {
    folder_.Write("b.py", "class B:\n  x = 1\n  def f(self, y: int = 2) -> str: ...\n");
  }

  void Add(const std::string& bytes) {
    const FileId file = workspace_.FileOf(folder_ / "a.py");
    workspace_.Open(file, bytes);
    const std::vector<ColouredName> names = workspace_.Colours(file);
    for (const ColouredName& name : names) AddNumbers({name.begin, int64_t(name.kind), name.modifiers});
    const size_t step = names.size() / kPlaces + 1;
    for (size_t i = 0; i < names.size(); i += step) AddPlace(file, names[i].begin, i % (7 * step) == 0);
    for (const InlineHint& hint : workspace_.Hints(file)) {
      digests.answers.Add(hint.text);
      AddNumbers({hint.offset, int64_t(hint.certainty)});
    }
    for (const OutlineItem& item : workspace_.Outline(file)) {
      for (const Text text : {Text(item.name), Text(item.kind), Text(item.detail)}) digests.answers.Add(text);
      AddNumbers({item.begin, item.end, item.name_begin, item.name_end, item.parent});
    }
    for (const Problem& problem : workspace_.Problems(file)) {
      digests.answers.Add(problem.message);
      AddNumbers({problem.begin, problem.end});
    }
    for (const Fold& fold : workspace_.Folds(file)) AddNumbers({fold.first_line, fold.last_line});
  }

 private:
  static constexpr Version kVersion = Version::Of(3, 12);
  static constexpr size_t kPlaces = 30;

  static Workspace::Settings SettingsFor(const std::string& root) {
    Workspace::Settings settings;
    settings.roots = {root};
    settings.typeshed = testing::SmallLibrary();
    settings.version = kVersion;
    return settings;
  }
  static void AddNumbers(std::initializer_list<int64_t> numbers) {
    for (const int64_t number : numbers) digests.answers.Add(number);
  }
  void AddAll(const std::vector<Location>& locations) {
    for (const Location& location : locations) {
      AddNumbers({location.file, location.begin, location.end, int64_t(location.certainty)});
      digests.answers.Add(location.role);
      digests.answers.Add(location.kind);
    }
  }
  void AddPlace(FileId file, uint32_t offset, bool all) {
    for (const std::string& type : workspace_.Types(file, offset)) digests.answers.Add(type);
    AddAll(workspace_.Definitions(file, offset));
    const Hover hover = workspace_.HoverAt(file, offset);
    digests.answers.Add(hover.text);
    digests.answers.Add(hover.documentation);
    for (const Signature& signature : workspace_.Signatures(file, offset)) {
      digests.answers.Add(signature.label);
      AddNumbers({signature.active, int64_t(signature.certainty)});
    }
    if (!all) return;
    AddAll(workspace_.References(file, offset));
    AddAll(workspace_.TypeDefinitions(file, offset));
    for (const Completion& completion : workspace_.Complete(file, offset)) {
      for (const Text text : {Text(completion.name), Text(completion.kind), Text(completion.detail)})
        digests.answers.Add(text);
    }
    const Rename rename = workspace_.RenameTo(file, offset, "another_name");
    digests.answers.Add(WithoutFolders(rename.problem));
    for (const TextEdit& edit : rename.edits) AddNumbers({edit.file, edit.begin, edit.end});
    for (const Span& span : workspace_.Selections(file, offset)) AddNumbers({span.begin, span.end});
  }

  // Whose names are others in each run.
  std::string WithoutFolders(std::string text) const {
    for (const std::string& folder : {folder_.path(), testing::SmallLibrary()})
      for (size_t at; (at = text.find(folder)) != std::string::npos;) text.erase(at, folder.size());
    return text;
  }

  // Before that of the library, since answers are in the order of paths.
  testing::TemporaryFolder folder_{"answers-"};
  Workspace workspace_;
};

std::vector<std::filesystem::path> FilesOf(int argc, char** argv) {
  std::vector<std::filesystem::path> files;
  for (int i = 1; i < argc; ++i) {
    if (!std::filesystem::is_directory(argv[i])) {
      files.emplace_back(argv[i]);
      continue;
    }
    for (const auto& entry : std::filesystem::recursive_directory_iterator(argv[i]))
      if (entry.is_regular_file()) files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  return files;
}

}  // namespace
}  // namespace quillet

int main(int argc, char** argv) {
  using namespace quillet;
  TheConsole().print_line = [](Text line) { digests.records.Add(line); };
  TheConsole().report_exception = [](const std::exception_ptr& failure, bool) {
    digests.records.Add(ReprOfException(failure));
  };
  Analysis analyses[] = {Analysis(Version::Of(2, 7)), Analysis(Version::Of(3, 8)), Analysis(Version::Of(3, 12))};
  Answers answers;
  size_t count = 0;
  for (const std::filesystem::path& path : FilesOf(argc, argv)) {
    std::ifstream in(path, std::ios::binary);
    const std::string bytes{std::istreambuf_iterator<char>(in), {}};
    ++count;
    for (uint32_t seed = 0; seed < 3; ++seed) {
      const std::string text = seed == 0 ? bytes : Spoilt(bytes, seed * 7919 + static_cast<uint32_t>(bytes.size()));
      for (Analysis& analysis : analyses) analysis.Add(text);
      if (seed < 2) answers.Add(text);
    }
  }
  std::printf("%zu files", count);
  for (const auto& [name, digest] : {std::pair("tokens", &digests.tokens),
                                     {"trees", &digests.trees},
                                     {"records", &digests.records},
                                     {"complete", &digests.complete},
                                     {"output", &digests.output},
                                     {"names", &digests.names},
                                     {"syntax", &digests.syntax},
                                     {"index", &digests.index},
                                     {"site", &digests.site},
                                     {"answers", &digests.answers}})
    std::printf("  %s %016llx", name, static_cast<unsigned long long>(digest->value()));
  std::printf("\n");
  return 0;
}
