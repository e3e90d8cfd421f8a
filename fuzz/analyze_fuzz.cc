// Statements through the analyzer: bytes to lines, each line as it was cut and once more with its
// token list mutated, under both grammars.
//
// Each line is read twice more by analyzers that read completely, recycled and nearly fresh.
//
// Oracles: trees, free lists, embedded lines and records hold what they have to; a line analysed
// with recycled nodes gives the same records and the same error as with an analyzer that is nearly
// fresh; what is reported as an internal failure is one of the kinds that are documented, never a
// broken assertion. The first byte chooses version and place of the lines, the second how tokens are
// mutated.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "analysis/analyzer.h"
#include "foundations/console.h"
#include "lines/cutter.h"
#include "tests/core/support/verify_trees.h"

namespace quillet {
namespace {

// Long inputs find nothing that short ones do not, slowly.
constexpr size_t kMaxInput = 4096;
// Building an analyzer takes as long as some hundred inputs.
constexpr int kRunsOfAFreshAnalyzer = 500;
constexpr int kRunsBetweenListChecks = 50;

void Check(const std::string& wrong, Text about) {
  if (wrong.empty()) return;
  std::fprintf(stderr, "%s\n%.*s\n", wrong.c_str(), static_cast<int>(about.size()), about.data());
  std::abort();
}

void Report(const std::exception_ptr& failure, bool) {
  const std::string shown = ReprOfException(failure);
  if (shown.empty() || shown.find("AssertionError") != std::string::npos) Check("an assertion failed", shown);
}

std::unique_ptr<CPGenAnalyzerImpl> NewAnalyzer(bool py3, bool reads_completely) {
  const std::string folder = std::string(QUILLET_SOURCE_DIR) + "/resources/pgen-grammars/";
  CPGenAnalyzerImpl::Options options;
  options.version = py3 ? Version::Of(3, 12) : Version::Of(2, 7);
  options.py3_grammar = py3;
  options.reads_completely = reads_completely;
  options.grammar_file = folder + (py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
  options.hint_grammar_file = folder + kPy3DefaultGrammar;
  for (const Text keyword : py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(keyword);
  for (const Text keyword : Py3Keywords()) options.hint_keywords.emplace_back(keyword);
  return std::make_unique<CPGenAnalyzerImpl>(options);
}

// One analyzer for all inputs, and one that is built anew now and then.
struct Analyzers {
  explicit Analyzers(bool is_py3)
      : py3(is_py3), recycled(NewAnalyzer(is_py3, false)), complete(NewAnalyzer(is_py3, true)) {}

  CPGenAnalyzerImpl& Fresh() {
    if (runs++ % kRunsOfAFreshAnalyzer == 0) {
      fresh = NewAnalyzer(py3, false);
      fresh_complete = NewAnalyzer(py3, true);
    }
    return *fresh;
  }

  bool py3;
  int runs = 0;
  std::unique_ptr<CPGenAnalyzerImpl> recycled;
  std::unique_ptr<CPGenAnalyzerImpl> fresh;
  std::unique_ptr<CPGenAnalyzerImpl> complete;
  std::unique_ptr<CPGenAnalyzerImpl> fresh_complete;
};

std::string ShowResult(const LogicalLine& line, const std::optional<SyntaxError>& error, bool may_have_both = false) {
  std::string shown;
  const auto show = [&shown](Text name, Text info) { shown.append(name).append("\t").append(info).append("\n"); };
  for (const Record& record : line.type_equivs()) show(record.name(), record.info());
  for (const Record& record : line.arg_type_equivs()) show(record.name(), record.info());
  if (error) {
    shown += "error " + std::to_string(error->lineno) + ":" + std::to_string(error->offset) + " " + error->message();
    if (error->lineno < 1) Check("an error in front of its line", error->text);
    if (!may_have_both && (!line.type_equivs().empty() || !line.arg_type_equivs().empty()))
      Check("records of a failed line", error->text);
  }
  return shown;
}

struct Place {
  bool in_async_def;
  bool first_in_def;
};

void CheckLine(Analyzers& analyzers, LogicalLine& line, Place place) {
  const std::string text = TextFromTokens(line);
  CPGenParserImpl& parser = analyzers.recycled->logical_parser();
  try {
    if (CNode* tree = parser.ParseToNode(line, place.in_async_def)) {
      Check(VerifyTree(tree, parser.factory(), static_cast<int32_t>(line.toks.size())), text);
      parser.DiscardNode(tree);
    }
  } catch (const ParseError& error) {
    if (error.context.IsIndex() &&
        (error.context.value < 0 || static_cast<size_t>(error.context.value) > line.toks.size()))
      Check("a rejected token outside the line", text);
  } catch (const Error& error) {
    // A removed token where a special case looks for text.
    if (error.kind() != ErrorKind::kTypeError) Check(error.message(), text);
  }
  for (const LogicalLine* exp : line.GetExpLogicals().lines) Check(VerifyEmbedded(line, *exp), text);

  const auto analyze = [&](CPGenAnalyzerImpl& analyzer) {
    line.parsed = false;
    try {
      const auto error = analyzer.AnalyzeSingleLogical(line, place.in_async_def, place.first_in_def);
      return ShowResult(line, error);
    } catch (const Error& error) {
      // The place of an error behind a last token that was removed.
      if (line.toks.empty() || !line.toks.back().removed()) Check(error.message(), text);
      return error.message();
    }
  };
  const std::string recycled = analyze(*analyzers.recycled);
  const std::string fresh = analyze(analyzers.Fresh());
  if (recycled != fresh) Check("recycled nodes tell something else:\n" + recycled + "\n-- fresh:\n" + fresh, text);

  // Lines of a host that removed tokens are none of those that are read completely.
  for (const Token& token : line.toks)
    if (token.removed()) return;
  LinePlace complete_place;
  complete_place.in_async_def = place.in_async_def;
  complete_place.in_def = place.in_async_def || place.first_in_def;
  complete_place.first_in_def = place.first_in_def;
  const TypingNames typing;
  const auto analyze_completely = [&](CPGenAnalyzerImpl& analyzer) {
    line.parsed = false;
    const auto error =
        analyzer.AnalyzeCompletely(line, complete_place, typing, analyzer.IsDoubtful(line, complete_place));
    return ShowResult(line, error, /*may_have_both=*/true);
  };
  const std::string once = analyze_completely(*analyzers.complete);
  const std::string again = analyze_completely(*analyzers.fresh_complete);
  if (once != again) Check("a complete reading tells something else:\n" + once + "\n-- fresh:\n" + again, text);
}

// Removes, repeats, exchanges and cuts off tokens, by a sequence that follows from `seed`.
std::vector<Token> Mutate(TokenSpan toks, uint32_t seed) {
  std::vector<Token> mutated(toks.begin(), toks.end());
  for (int step = 0; step < 3 && !mutated.empty(); ++step) {
    seed = seed * 1664525u + 1013904223u;
    const size_t at = (seed >> 8) % mutated.size();
    const size_t other = (seed >> 20) % mutated.size();
    switch (seed >> 30) {
      case 0:
        mutated[at] = Token{};
        break;
      case 1:
        mutated.insert(mutated.begin() + static_cast<ptrdiff_t>(at), mutated[other]);
        break;
      case 2:
        std::swap(mutated[at], mutated[other]);
        break;
      default:
        mutated.resize(at);
        break;
    }
  }
  return mutated;
}

}  // namespace
}  // namespace quillet

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  quillet::TheConsole().print_line = [](quillet::Text) {};
  quillet::TheConsole().report_exception = quillet::Report;
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  if (size < 2 || size > kMaxInput) return 0;
  static Analyzers analyzers[] = {Analyzers(false), Analyzers(true)};
  static int runs = 0;

  const bool py3 = (data[0] & 1) != 0;
  const Place place{(data[0] & 2) != 0, (data[0] & 4) != 0};
  Analyzers& chosen = analyzers[py3];
  const Ref<SourceText> source = SourceText::Copy(Text(reinterpret_cast<const char*>(data + 2), size - 2));
  std::vector<LineRow> rows;
  CutLines(*source, py3 ? Version::Of(3, 12) : Version::Of(2, 7), rows);
  for (const LineRow& row : rows) {
    LogicalLine line;
    SetFromRow(line, source, row);
    CheckLine(chosen, line, place);

    const std::vector<Token> mutated = Mutate(line.toks, data[1] * 2654435761u + row.first_token);
    std::vector<Position> positions;
    for (size_t i = 0; i < mutated.size(); ++i)
      positions.push_back({static_cast<int32_t>(i / 8), static_cast<int32_t>(i % 8)});
    line.toks = mutated;
    line.token_count = static_cast<int32_t>(mutated.size());
    line.no_embedded = false;
    line.SetPositions(positions);
    CheckLine(chosen, line, place);
  }
  if (++runs % kRunsBetweenListChecks == 0) {
    for (const Analyzers& pair : analyzers) {
      Check(VerifyFreeLists(pair.recycled->logical_parser().factory()), "");
      Check(VerifyFreeLists(pair.recycled->type_hint_walker().hint_parser().factory()), "");
      Check(VerifyFreeLists(pair.complete->logical_parser().factory()), "");
      Check(VerifyFreeLists(pair.complete->type_hint_walker().hint_parser().factory()), "");
    }
  }
  return 0;
}
