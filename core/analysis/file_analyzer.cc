// The loop over the lines of a source. Everything that costs is below: cutting, parsing, walking.
#include "analysis/file_analyzer.h"

#include <algorithm>
#include <cassert>
#include <cstring>
#include <utility>

#include "analysis/closer_look.h"
#include "analysis/name_doubts.h"
#include "lines/future_imports.h"
#include "parser/complete_parser.h"
#include "tokens/byte_scan.h"

namespace quillet {

namespace {

// Memory that one source took beyond this goes back before the next one.
constexpr size_t kKeptMemory = size_t{16} << 20;
// A tree has about a node a token, most of them without a list of children.
constexpr size_t kMemoryPerTreeToken = sizeof(CNode) + 2 * sizeof(CNode*);
// A token of an expression in a string or a comment is held itself, with what tells its place.
constexpr size_t kMemoryPerInnerToken = kMemoryPerTreeToken + sizeof(Token) + sizeof(EmbeddedExpressions::Found);
// A statement that is shorter than this takes too little for a closer look.
constexpr size_t kSmallStatement = size_t{1} << 20;

// The most tokens that a text can hold: a run of letters is one at least.
size_t MostTokensIn(Text text) {
  size_t count = 0;
  bool in_word = false;
  for (const char c : text) {
    const bool is_word = IsAsciiIdentifierByte(c) || static_cast<unsigned char>(c) >= 0x80;
    count += !is_word || !in_word;
    in_word = is_word;
  }
  return count;
}

template <class T>
size_t SizeOf(const std::vector<T>& items) {
  return items.size() * sizeof(T);
}

// The text of a statement, as an error in it shows it.
std::string TextOfRow(const FileAnalyzer::Found& found, size_t row) {
  LogicalLine line;
  SetFromRow(line, found.source, found.rows[row]);
  return TextFromTokens(line);
}

template <class T>
void DropIfHuge(std::vector<T>& items) {
  if (items.capacity() * sizeof(T) > kKeptMemory) std::vector<T>().swap(items);
  items.clear();
}

}  // namespace

FileAnalyzer::FileAnalyzer(const Options& options) : options_(options), analyzer_(options, options.frequent_shape) {
  found_.source = SourceText::Copy(Text(""));
}

FileAnalyzer::Found FileAnalyzer::TakeFound() {
  Found fresh;
  fresh.source = SourceText::Copy(Text(""));
  return std::exchange(found_, std::move(fresh));
}

SyntaxError FileAnalyzer::Found::WholeErrorOf(size_t row) const {
  if (const auto whole = whole_errors.find(row); whole != whole_errors.end()) return whole->second;
  const Failure& failure = errors[static_cast<size_t>(results[row].error)];
  SyntaxError error(failure.message(), "<string>", failure.place.line, failure.place.col, TextOfRow(*this, row));
  error.error_class = failure.error_class;
  return error;
}

FileAnalyzer::Analyzer& FileAnalyzer::AnalyzerForSource() {
  if (options_.print_function_grammar_file.empty() || !ImportsPrintFunction(*found_.source, found_.rows))
    return analyzer_;
  if (print_function_analyzer_ == nullptr) {
    CPGenAnalyzerImpl::Options options = options_;
    options.grammar_file = options_.print_function_grammar_file;
    std::erase(options.keywords, "print");
    print_function_analyzer_ = std::make_unique<Analyzer>(options, options_.frequent_shape);
  }
  return *print_function_analyzer_;
}

void FileAnalyzer::Analyze(Text bytes, RowFilter* filter) {
  Reset(bytes);
  Cut();
  FindPlaces();
  if (options_.reads_completely) typing_.Read(*found_.source, found_.rows, block_rules_.imports());
  Analyzer& analyzer_and_shapes = AnalyzerForSource();
  CPGenAnalyzerImpl& analyzer = analyzer_and_shapes.analyzer;
  analyzer.set_spells_error_texts(false);
  analyzer.set_explains_errors(true);
  const NodePool& pool = analyzer.logical_parser().factory().pool();
  const NodePool& other_pool = analyzer.type_hint_walker().hint_parser().factory().pool();
  const auto node_count = [&] { return pool.node_count() + other_pool.node_count(); };
  const size_t nodes_before = node_count();
  // The text, and the copy of it that the caller has.
  held_before_ = 2 * found_.source->size() + SizeOf(found_.source->tokens) + SizeOf(found_.source->line_starts) +
                 SizeOf(found_.rows) + SizeOf(found_.results);
  CountMemory();
  wanted_.assign(filter != nullptr ? found_.rows.size() : 0, false);
  const bool is_filtered = filter != nullptr && filter->Choose(*found_.source, found_.rows, wanted_);
  const bool has_rules = options_.reads_completely && !is_filtered;
  LogicalLine line;
  uint32_t record_end = 0, arg_record_end = 0;
  for (size_t i = 0; i < found_.rows.size(); ++i) {
    const LineRow& row = found_.rows[i];
    LineResult& result = found_.results[i];
    result.record_begin = result.record_end = record_end;
    result.arg_record_begin = result.arg_record_end = arg_record_end;
    // A comment says nothing but types.
    const bool is_silent = row.token_count == 0 || (row.kind == LineKind::kComment && row.no_embedded);
    if (is_silent || (is_filtered && !wanted_[i])) continue;
    CheckMemory(std::max(MostMemoryOf(row), sizeof(CNode) * (node_count() - nodes_before)));
    row_under_way_ = i;
    result.error = AnalyzeRow(analyzer_and_shapes, i, line);
    result.record_end = record_end = static_cast<uint32_t>(found_.store.rows.size());
    result.arg_record_end = arg_record_end = static_cast<uint32_t>(found_.store.arg_rows.size());
    CountMemory();
  }
  row_under_way_ = found_.rows.size();
  CountMemory();
  if (has_rules) {
    if (!readings_.tell_nothing())
      block_rules_.Check(*found_.source, found_.rows, options_.version, readings_, found_.results);
    AddFindings(analyzer);
    ApplyNameRules();
    AddFindings(analyzer);
  }
  CheckMemory(0);
}

void FileAnalyzer::Reset(Text bytes) {
  DropIfHuge(found_.rows);
  DropIfHuge(found_.results);
  DropIfHuge(found_.errors);
  found_.whole_errors.clear();
  DropIfHuge(found_.store.rows);
  DropIfHuge(found_.store.arg_rows);
  DropIfHuge(found_.source->tokens);
  DropIfHuge(found_.source->line_starts);
  if (found_.store.texts.byte_size() > kKeptMemory) found_.store.texts = TextArena();
  found_.store.Reset();
  readings_.Clear();
  row_under_way_ = 0;
  found_.source->Assign(bytes);
  memory_limit_ = std::max(options_.least_memory_limit, kMemoryPerSourceByte * bytes.size());
  held_ = 0;
}

// While tokens and rows grow they are there twice for a moment.
void FileAnalyzer::Cut() {
  try {
    const auto cut = options_.reads_completely ? CutLinesCompletely : CutLines;
    cut(*found_.source, options_.version, found_.rows, memory_limit_ / 3);
  } catch (const Error& error) {
    if (error.kind() != ErrorKind::kOverflowError) throw;
    ThrowTooLarge();
  }
}

void FileAnalyzer::FindPlaces() {
  found_.results.resize(found_.rows.size());
  if (options_.reads_completely)
    return block_rules_.Check(*found_.source, found_.rows, options_.version, readings_, found_.results);
  ScopeTracker scopes;
  LineResult* result = found_.results.data();
  for (const LineRow& row : found_.rows) scopes.Next(row, *result++);
}

int32_t FileAnalyzer::AnalyzeRow(Analyzer& analyzer, size_t row, LogicalLine& line) {
  const LinePlace& place = found_.results[row];
  SetFromRow(line, found_.source, found_.rows[row]);
  line.parsed = false;
  line.WriteTo(&found_.store);
  const bool is_doubtful =
      CloserLook::MayBeDoubtful(found_.rows[row].unusual, place) && analyzer.analyzer.IsDoubtful(line, place);
  assert(is_doubtful || !options_.reads_completely || line.kind == LineKind::kComment ||
         !analyzer.analyzer.IsDoubtful(line, place));
  if (!is_doubtful && analyzer.shapes.Tell(line, place, typing_)) return -1;
  return AnalyzeLine(analyzer.analyzer, row, line, is_doubtful);
}

int32_t FileAnalyzer::AnalyzeLine(CPGenAnalyzerImpl& analyzer, size_t row, LogicalLine& line, bool is_doubtful) {
  const LinePlace& place = found_.results[row];
  if (!options_.reads_completely) {
    const auto error = analyzer.AnalyzeSingleLogical(line, place.in_async_def, place.first_in_def);
    return error ? AddError(row, *error) : -1;
  }
  const auto error = analyzer.AnalyzeCompletely(line, place, typing_, is_doubtful);
  if (analyzer.was_rejected() || line.kind == LineKind::kCase) [[unlikely]]
    Note(analyzer, row);
  return error ? AddError(row, *error) : -1;
}

void FileAnalyzer::Note(const CPGenAnalyzerImpl& analyzer, size_t row) {
  if (analyzer.was_rejected()) return readings_.rejected.push_back(row);
  const CompleteParser& parser = analyzer.complete_parser();
  if (found_.rows[row].kind == LineKind::kCase && !parser.irrefutable().empty())
    readings_.irrefutable.push_back({row, parser.irrefutable_at(), parser.irrefutable()});
}

void FileAnalyzer::AddFindings(CPGenAnalyzerImpl& analyzer) {
  for (const BlockRules::Finding& finding : block_rules_.findings()) {
    int32_t& index = found_.results[finding.row].error;
    if (index >= 0 && !finding.comes_first) continue;
    LogicalLine line;
    SetFromRow(line, found_.source, found_.rows[finding.row]);
    SyntaxError error = analyzer.ErrorAt(finding.message, line, finding.place);
    error.error_class = finding.kind;
    const int32_t added = AddError(finding.row, error);
    if (index < 0) {
      index = added;
      continue;
    }
    // In the place of what was found before.
    found_.errors[static_cast<size_t>(index)] = found_.errors.back();
    found_.errors.pop_back();
  }
  block_rules_.findings().clear();
}

void FileAnalyzer::ApplyNameRules() {
  if (options_.make_name_rules == nullptr) return;
  const auto& declarations = block_rules_.declarations();
  const bool has_async_definitions = block_rules_.has_async_definitions();
  if (declarations.empty() && !has_async_definitions && options_.version.AtLeast(3, 0)) return;
  if (!MayMisuseNames(*this, options_.version, declarations, has_async_definitions)) return;
  if (name_rules_ == nullptr) name_rules_ = options_.make_name_rules(options_.version);
  name_rules_->Check(*found_.source, found_.rows, block_rules_.findings());
}

int32_t FileAnalyzer::AddError(size_t row, const SyntaxError& error) {
  const std::string& text = *found_.error_texts.insert(error.message()).first;
  const auto from_1 = [](int64_t number) { return static_cast<int32_t>(std::max<int64_t>(number, 1)); };
  found_.errors.push_back({&text, {from_1(error.lineno), from_1(error.offset)}, error.error_class});
  if (options_.keeps_whole_errors) {
    found_.whole_errors.erase(row);
    if (!error.text.empty() && error.text != TextOfRow(found_, row)) found_.whole_errors.emplace(row, error);
  }
  return static_cast<int32_t>(found_.errors.size()) - 1;
}

size_t FileAnalyzer::MostMemoryOf(const LineRow& row) const {
  size_t memory = kMemoryPerTreeToken * row.token_count;
  if (row.no_embedded || row.token_count == 0) return memory;
  const TokenSpan toks = TokenSpan(found_.source->tokens).subspan(row.first_token, row.token_count);
  if (static_cast<size_t>(toks.back().end() - toks.front().text) < kSmallStatement) return memory;
  for (const Token& token : toks) {
    if (token.code == tok::STRING || token.code == tok::COMMENT)
      memory += kMemoryPerInnerToken * MostTokensIn(token.view());
  }
  return memory;
}

void FileAnalyzer::CountMemory() {
  held_ = held_before_ + SizeOf(found_.errors) + SizeOf(found_.store.rows) + SizeOf(found_.store.arg_rows) +
          found_.store.texts.byte_size();
}

void FileAnalyzer::ThrowTooLarge() const {
  ThrowError(ErrorKind::kOverflowError,
             "too large to analyse within " + std::to_string(memory_limit_ >> 20) + " MiB of memory");
}

Position FileAnalyzer::ErrorPosition(size_t row) const {
  // An error's own line and offset count from 1, from the first line of its statement.
  const Position place = found_.errors[static_cast<size_t>(found_.results[row].error)].place;
  return {static_cast<int32_t>(found_.rows[row].first_line) + place.line - 1, place.col - 1};
}

size_t FileAnalyzer::LineCount() const {
  const std::vector<uint32_t>& starts = found_.source->line_starts;
  // A line end at the end of the source begins no line.
  return starts.size() - (!starts.empty() && starts.back() == found_.source->size() ? 1 : 0);
}

}  // namespace quillet
