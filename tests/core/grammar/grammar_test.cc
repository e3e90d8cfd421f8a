// The table generator and the parser engine.
//
// Trees are written as text: "rule(child child)", a leaf by its text, a token without text by its
// name. The engine is held against a plain driver that takes one frame a step, on the real grammars
// and on random ones.
#include "grammar/grammar.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <optional>
#include <random>
#include <set>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "grammar/engine.h"

namespace quillet {
namespace {

const Grammar& RealGrammar(const std::string& version) {
  static const std::string folder = std::string(QUILLET_SOURCE_DIR) + "/resources/pgen-grammars/Python-Grammar-";
  static const Grammar newer = Grammar::Load(folder + "3.8");
  static const Grammar older = Grammar::Load(folder + "2.7");
  return version == "2.7" ? older : newer;
}

// ---- tokens: texts apart by blanks, and the names of tokens that have none ----

struct FedToken {
  std::string text;
  int type;
};

std::vector<FedToken> Tokens(const std::string& line) {
  static const std::vector<FedToken> named = {{"NEWLINE", tok::NEWLINE}, {"INDENT", tok::INDENT},
                                              {"DEDENT", tok::DEDENT},   {"END", tok::ENDMARKER},
                                              {"async", tok::ASYNC},     {"await", tok::AWAIT}};
  std::vector<FedToken> tokens;
  std::istringstream words(line);
  for (std::string word; words >> word;) {
    const auto known = std::find_if(named.begin(), named.end(), [&](const FedToken& t) { return t.text == word; });
    tokens.push_back(known != named.end() ? *known : FedToken{word, GetTokenType(word)});
  }
  return tokens;
}

// ---- a builder of plain trees that counts what lives ----

struct RawNode {
  std::string label;
  int32_t context;
  bool leaf;
  std::vector<RawNode*> children;
};

struct RawCounts {
  int64_t live = 0;
  int64_t made = 0;
  int64_t throw_at = -1;  // the number of the node whose making fails
};

struct RawBuilder {
  using Node = RawNode*;
  const Grammar* grammar;
  RawCounts* counts;

  Node Make(RawNode node) {
    if (counts->made++ == counts->throw_at) {
      for (RawNode* child : node.children) Drop(child);
      throw std::runtime_error("no more nodes");
    }
    ++counts->live;
    return new RawNode(std::move(node));
  }
  Node Leaf(int, const Token& token, int32_t context) { return Make({std::string(token.view()), context, true, {}}); }
  Node Rule(int symbol, Node* children, uint32_t count) {
    return Make({grammar->symbol_names[static_cast<size_t>(symbol - Grammar::kFirstSymbol)],
                 children[0]->context,
                 false,
                 {children, children + count}});
  }
  void Drop(Node node) {
    std::vector<Node> todo{node};
    while (!todo.empty()) {
      Node next = todo.back();
      todo.pop_back();
      todo.insert(todo.end(), next->children.begin(), next->children.end());
      --counts->live;
      delete next;
    }
  }
};

using RawEngine = Engine<RawBuilder>;

std::string Written(const RawNode* node) {
  if (node->leaf) return node->label;
  std::string text = node->label + "(";
  for (size_t i = 0; i < node->children.size(); ++i) text += (i ? " " : "") + Written(node->children[i]);
  return text + ")";
}

void Feed(RawEngine& engine, const Grammar& grammar, const std::vector<FedToken>& tokens) {
  for (size_t i = 0; i < tokens.size(); ++i) {
    const Token token{tokens[i].text.data(), static_cast<uint32_t>(tokens[i].text.size()), tok::NAME};
    engine.AddToken(grammar.Classify(tokens[i].type, token.view()), tokens[i].type, token, static_cast<int32_t>(i));
  }
}

// The tree, or "message @context" of the error.
std::string Parse(const Grammar& grammar, const std::string& start, const std::vector<FedToken>& tokens,
                  bool promote = true) {
  RawCounts counts;
  std::string result;
  {
    RawBuilder builder{&grammar, &counts};
    RawEngine engine(grammar, builder, promote);
    engine.Setup(grammar.symbol2number.at(start));
    try {
      Feed(engine, grammar, tokens);
      RawNode* root = engine.Finish();
      result = Written(root);
      builder.Drop(root);
    } catch (const ParseError& error) {
      result = error.message() + " @" + (error.context.IsNone() ? "none" : std::to_string(error.context.value));
    }
  }
  EXPECT_EQ(counts.live, 0) << "nodes of a failed parse are dropped with the engine";
  return result;
}

// One statement, with its line end and the end of the file, and without their wrappers.
std::string Statement(const std::string& version, const std::string& line) {
  std::vector<FedToken> tokens = Tokens(line);
  tokens.push_back({"NEWLINE", tok::NEWLINE});
  tokens.push_back({"END", tok::ENDMARKER});
  std::string written = Parse(RealGrammar(version), "file_input", tokens);
  const std::string head = "file_input(";
  const std::string tail = " END)";
  if (!written.starts_with(head)) return written;
  written = written.substr(head.size(), written.size() - head.size() - tail.size());
  const std::string simple = "simple_stmt(";
  const std::string end_of_line = " NEWLINE)";
  if (written.starts_with(simple) && written.ends_with(end_of_line)) {
    written = written.substr(simple.size(), written.size() - simple.size() - end_of_line.size());
  }
  return written;
}

// ---- grammar texts ----

std::string ErrorOf(const std::string& text) {
  try {
    Grammar::Parse(text, "g");
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kGrammarError);
    return error.message();
  }
  return "no error";
}

TEST(GrammarText, ErrorsNameFileLineAndRule) {
  const std::pair<const char*, const char*> cases[] = {
      {"", "g:1: no rule in the grammar"},
      {"# nothing\n\n", "g:3: no rule in the grammar"},
      {"a: NAME\nb NAME\n", "g:2: rule 'b': expected ':' after the name, not 'NAME'"},
      {"'a': NAME\n", "g:1: expected the name of a rule, not 'a'"},
      {"a: NAME\n\n: NAME\n", "g:3: expected the name of a rule, not ':'"},
      {"a:\n", "g:1: rule 'a': expected a name, a quoted text, '(' or '[', not the end of the line"},
      {"a:", "g:1: rule 'a': expected a name, a quoted text, '(' or '[', not the end of the file"},
      {"a: NAME |\n", "g:1: rule 'a': expected a name, a quoted text, '(' or '[', not the end of the line"},
      {"a: ()\n", "g:1: rule 'a': expected a name, a quoted text, '(' or '[', not ')'"},
      {"a: NAME )\n", "g:1: rule 'a': expected the end of the rule, not ')'"},
      {"a: NAME ** NAME\n", "g:1: rule 'a': expected the end of the rule, not '*'"},
      {"a: * NAME\n", "g:1: rule 'a': expected a name, a quoted text, '(' or '[', not '*'"},
      {"a: NAME\nb: (NAME\n  NAME\n", "g:2: rule 'b': '(' is never closed"},
      {"a: [NAME (NUMBER]\n", "g:1: rule 'a': expected ')' for the '(' of line 1, not ']'"},
      {"a: (\n\nNAME ]\n", "g:3: rule 'a': expected ')' for the '(' of line 1, not ']'"},
      {"a: 'if\nb: NAME\n", "g:1: rule 'a': the quote before 'if' is never closed"},
      {"a: ''\n", "g:1: rule 'a': a quoted text is empty"},
      {"a: NAME ; NAME\n", "g:1: rule 'a': ';' has no meaning in a grammar"},
      {"a: NAME\n# between\na: NUMBER\n", "g:3: rule 'a' is already defined in line 1"},
      {"a: NAME\nb: (NAME |\n    missing)\n", "g:3: rule 'b': there is no rule 'missing'"},
      {"a: NAMES\n", "g:1: rule 'a': no token is named 'NAMES'"},
      {"a: '=?='\n", "g:1: rule 'a': no operator is written '=?='"},
      {"a: 'if-not'\n", "g:1: rule 'a': no operator is written 'if-not'"},
      {"a: [NAME]\n", "g:1: rule 'a' can match nothing"},
      {"a: NAME\nb: NAME* [a]\n", "g:2: rule 'b' can match nothing"},
  };
  for (const auto& [text, message] : cases) EXPECT_EQ(ErrorOf(text), message) << text;
}

TEST(GrammarText, ConflictsNameTheTokenAndBothAlternatives) {
  const std::pair<const char*, const char*> cases[] = {
      {"s: a | b\na: NAME '+'\nb: NAME '-'\n", "g:1: rule 's' is not LL(1): NAME begins both a and b"},
      {"s: NAME '=' | b\nb: NAME\n", "g:1: rule 's' is not LL(1): NAME begins both NAME and b"},
      {"t: s\ns: 'x' (a | b)\na: 'if' NAME\nb: c\nc: ('if' | 'while') NUMBER\n",
       "g:2: rule 's' is not LL(1): 'if' begins both a and b"},
      {"s: a* b\na: '+' NAME\nb: '+'\n", "g:1: rule 's' is not LL(1): '+' begins both a and b"},
      // One number serves both spellings.
      {"s: a | b\na: '@=' NAME\nb: '->' NAME\n", "g:1: rule 's' is not LL(1): '@=' begins both a and b"},
  };
  for (const auto& [text, message] : cases) EXPECT_EQ(ErrorOf(text), message) << text;
}

TEST(GrammarText, LeftRecursionNamesTheWayRound) {
  EXPECT_EQ(ErrorOf("a: a '+' NAME | NAME\n"), "g:1: rule 'a' begins with itself: a -> a");
  EXPECT_EQ(ErrorOf("s: x\nx: y '+'\ny: z | NUMBER\nz: x NAME\n"),
            "g:2: rule 'x' begins with itself: x -> y -> z -> x");
}

TEST(GrammarText, RightRecursionIsNoConflict) {
  const Grammar grammar = Grammar::Parse("a: NAME ['+' a]\n", "g");
  EXPECT_EQ(Parse(grammar, "a", Tokens("x + y + z")), "a(x + a(y + z))");
}

TEST(GrammarText, HostileTextsAreErrorsAndNoCrash) {
  EXPECT_EQ(ErrorOf("a: " + std::string(100000, '(')), "g:1: rule 'a': brackets are nested too deep");
  EXPECT_EQ(ErrorOf("a: " + std::string(50, '(') + "NAME" + std::string(50, ')') + "\n"), "no error");
  // The states of this one double with every item behind the loop.
  std::string doubling = "a: (NAME | NUMBER)* NAME";
  for (int i = 0; i < 20; ++i) doubling += " (NAME | NUMBER)";
  EXPECT_EQ(ErrorOf(doubling + "\n"), "g:1: rule 'a' is too large");
  // Each of many states can be followed by each of many rules that begin with a word of their own.
  std::string paths = "a:", rules = "b:";
  for (int i = 0; i < 400; ++i) paths += " b";
  for (int i = 0; i < 200; ++i) {
    rules += (i > 0 ? " | c" : " c") + std::to_string(i);
  }
  for (int i = 0; i < 200; ++i) rules += "\nc" + std::to_string(i) + ": 'k" + std::to_string(i) + "' NAME";
  EXPECT_EQ(ErrorOf(paths + "\n" + rules + "\n"), "g:1: the grammar is too large for its tables");
  std::string keywords = "a: 'k0'";
  for (int i = 1; i < 256; ++i) keywords += " | 'k" + std::to_string(i) + "'";
  EXPECT_EQ(ErrorOf(keywords + "\n"), "g:1: too many kinds of tokens");
  EXPECT_EQ(ErrorOf(std::string("a: NAME\0\n", 9)), "g:1: rule 'a': '\\x00' has no meaning in a grammar");
  EXPECT_EQ(ErrorOf("a: NAME \xC3\xA9\n"), "g:1: rule 'a': '\xC3\xA9' has no meaning in a grammar");
  std::mt19937 random(20);
  const std::string alphabet = "ab:|()[]*+'\" \n#NAME";
  for (int round = 0; round < 20000; ++round) {
    std::string text = "a: ";
    for (size_t i = random() % 30; i > 0; --i) text += alphabet[random() % alphabet.size()];
    try {
      Grammar::Parse(text, "g");
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kGrammarError) << text;
      EXPECT_TRUE(error.message().starts_with("g:")) << text;
    }
  }
}

TEST(GrammarText, AMissingFileIsNamed) {
  const std::string name = std::string(QUILLET_SOURCE_DIR) + "/no-such-grammar";
  for (const std::string& unreadable : {name, std::string(QUILLET_SOURCE_DIR)}) {
    try {
      Grammar::Load(unreadable);
      ADD_FAILURE() << unreadable;
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kOSError);
      EXPECT_NE(error.message().find("'" + unreadable + "'"), std::string::npos) << error.message();
    }
  }
}

TEST(GrammarText, WindowsLineEndsByteOrderMarkAndCommentsAreNoMatter) {
  const Grammar grammar = Grammar::Parse("\xEF\xBB\xBF# head\r\na: (NAME # one\r\n  # two\r\n  | \"x\" )\r\nb: a", "g");
  ASSERT_EQ(grammar.rules.size(), 2u);
  EXPECT_EQ(grammar.rules[0].line, 2);
  EXPECT_EQ(grammar.rules[1].line, 5);
  EXPECT_EQ(grammar.labels[1].keyword, "x");
}

TEST(GrammarTables, AreMadeOfRulesThatGoRoundBehindTheirBeginning) {
  const Grammar grammar = Grammar::Parse("a: ['y'] ('x' 'z')* 'c'\n", "g");
  EXPECT_EQ(Parse(grammar, "a", {{"x", 1}, {"z", 1}, {"x", 1}, {"z", 1}, {"c", 1}}), "a(x z x z c)");
}

TEST(GrammarTables, SymbolsAreNumberedInTheOrderOfTheFile) {
  const Grammar grammar = Grammar::Parse("zeta: alpha\nalpha: NAME\n", "g");
  EXPECT_EQ(grammar.symbol2number.at("zeta"), 256);
  EXPECT_EQ(grammar.symbol2number.at("alpha"), 257);
  EXPECT_EQ(grammar.symbol_names, (std::vector<std::string>{"zeta", "alpha"}));
}

TEST(GrammarTables, AutomataAreMinimal) {
  const auto shape = [](const std::string& text) {
    const Grammar grammar = Grammar::Parse(text, "g");
    std::string written;
    for (const Grammar::State& state : grammar.rules[0].states) {
      for (const Grammar::Arc& arc : state.arcs) {
        written += std::to_string(arc.label) + ">" + std::to_string(arc.target) + " ";
      }
      written += state.accepting ? "end;" : ";";
    }
    return written;
  };
  EXPECT_EQ(shape("a: NAME\n"), "0>1 ;end;");
  EXPECT_EQ(shape("a: NAME '+' | NUMBER '+'\n"), "0>1 2>1 ;1>2 ;end;");
  EXPECT_EQ(shape("a: NAME+\n"), "0>1 ;0>1 end;");
  EXPECT_EQ(shape("a: NAME NAME*\n"), "0>1 ;0>1 end;");
  EXPECT_EQ(shape("a: NAME (',' NAME)* [',']\n"), "0>1 ;1>2 end;0>1 end;");
  EXPECT_EQ(shape("a: NAME [NUMBER] | NAME NUMBER\n"), "0>1 ;1>2 end;end;");
}

TEST(GrammarTables, TokensAreClassifiedByKeywordThenType) {
  const Grammar grammar = Grammar::Parse("a: 'if' | 'frobnicate' | NAME | '!=' | ASYNC\n", "g");
  const auto spelling = [&](Grammar::LabelId label) {
    return label == Grammar::kNoLabel ? "none" : grammar.labels[label].spelling;
  };
  EXPECT_EQ(spelling(grammar.Classify(tok::NAME, "if")), "'if'");
  EXPECT_EQ(spelling(grammar.Classify(tok::NAME, "frobnicate")), "'frobnicate'");
  EXPECT_EQ(spelling(grammar.Classify(tok::NAME, "while")), "NAME");
  EXPECT_EQ(spelling(grammar.Classify(tok::NAME, kNoText)), "NAME");
  EXPECT_EQ(spelling(grammar.Classify(tok::STRING, "if")), "none");
  EXPECT_EQ(spelling(grammar.Classify(12345, "if")), "none");
  EXPECT_EQ(spelling(grammar.Classify(-1, kNoText)), "none");
  EXPECT_EQ(spelling(grammar.label_of_code[word::kIf]), "'if'");
  EXPECT_EQ(spelling(grammar.label_of_code[word::kWhile]), "NAME");
  EXPECT_EQ(spelling(grammar.label_of_code[tok::NAME]), "NAME");
  EXPECT_EQ(spelling(grammar.label_of_code[tok::ASYNC]), "ASYNC");
  EXPECT_EQ(spelling(grammar.label_of_code[tok::NOTEQUAL]), "'!='");
  EXPECT_EQ(spelling(grammar.label_of_code[tok::NUMBER]), "none");
  EXPECT_EQ(spelling(grammar.label_of_code[tok::REMOVED]), "none");
  EXPECT_EQ(grammar.other_keywords.size(), 1u);
  const std::string other = "frobnicate";
  EXPECT_EQ(spelling(grammar.Classify(Token{other.data(), 10, tok::NAME})), "'frobnicate'");
  EXPECT_EQ(spelling(grammar.Classify(Token{other.data(), 4, tok::NAME})), "NAME");
}

TEST(GrammarTables, AHostMayNumberTokensItself) {
  TokenNames names;
  names.name2number = {{"NAME", 70}, {"WORD", 90}};
  names.op2number = {{"=?=", 200}};
  const Grammar grammar = Grammar::Parse("a: NAME 'if' WORD '=?='\n", "g", names);
  EXPECT_EQ(Parse(grammar, "a", {{"x", 70}, {"if", 70}, {"y", 90}, {"=?=", 200}}), "a(x if y =?=)");
  EXPECT_EQ(Parse(grammar, "a", {{"x", 1}}), "bad token @0");
}

// ---- the grammars of Python ----

TEST(PythonGrammars, HoldTheRulesThatTheTreeReadersKnow) {
  const char* const common[] = {
      "file_input",    "with_stmt",   "with_item",   "pass_stmt",     "expr_stmt",  "return_stmt", "power",
      "trailer",       "atom",        "funcdef",     "global_stmt",   "factor",     "lambdef",     "parameters",
      "varargslist",   "arglist",     "argument",    "classdef",      "for_stmt",   "import_name", "import_from",
      "comp_for",      "test",        "or_test",     "and_test",      "not_test",   "comparison",  "expr",
      "xor_expr",      "and_expr",    "shift_expr",  "arith_expr",    "term",       "if_stmt",     "del_stmt",
      "decorator",     "dotted_name", "decorators",  "except_clause", "yield_expr", "exprlist",    "testlist",
      "testlist_comp", "stmt",        "simple_stmt", "suite",         "subscript",
  };
  const char* const older[] = {"print_stmt", "exec_stmt",     "fpdef",         "fplist",   "listmaker",
                               "list_for",   "list_if",       "list_iter",     "old_test", "old_lambdef",
                               "testlist1",  "testlist_safe", "dictorsetmaker"};
  const char* const newer[] = {
      "nonlocal_stmt", "typedargslist", "lambdef_nocond", "sync_comp_for",     "star_expr",
      "tfpdef",        "annassign",     "yield_arg",      "atom_expr",         "namedexpr_test",
      "async_stmt",    "async_funcdef", "vfpdef",         "testlist_star_expr"};
  for (const char* rule : common) {
    EXPECT_TRUE(RealGrammar("2.7").symbol2number.contains(rule)) << rule;
    EXPECT_TRUE(RealGrammar("3.8").symbol2number.contains(rule)) << rule;
  }
  for (const char* rule : older) {
    EXPECT_TRUE(RealGrammar("2.7").symbol2number.contains(rule)) << rule;
  }
  for (const char* rule : newer) {
    EXPECT_TRUE(RealGrammar("3.8").symbol2number.contains(rule)) << rule;
    EXPECT_FALSE(RealGrammar("2.7").symbol2number.contains(rule)) << rule;
  }
}

TEST(PythonGrammars, TablesFitTheSecondLevelCache) {
  for (const char* version : {"2.7", "3.8"}) {
    const Grammar::Tables& tables = *RealGrammar(version).tables();
    EXPECT_LT(tables.cells.size() * sizeof(tables.cells[0]), 200u * 1024) << version;
    EXPECT_LT(tables.moves.size() * sizeof(tables.moves[0]), 40u * 1024) << version;
  }
}

TEST(PythonGrammars, EveryRuleIsReachable) {
  for (const char* version : {"2.7", "3.8"}) {
    const Grammar& grammar = RealGrammar(version);
    std::set<int> reached{grammar.symbol2number.at("file_input")};
    std::vector<int> todo(reached.begin(), reached.end());
    while (!todo.empty()) {
      const Grammar::Rule& rule = grammar.rules[static_cast<size_t>(todo.back() - Grammar::kFirstSymbol)];
      todo.pop_back();
      for (const Grammar::State& state : rule.states) {
        for (const Grammar::Arc& arc : state.arcs) {
          if (arc.label >= Grammar::kFirstSymbol && reached.insert(arc.label).second) todo.push_back(arc.label);
        }
      }
    }
    EXPECT_EQ(reached.size(), grammar.rules.size()) << version;
  }
}

struct Shape {
  const char* line;
  const char* tree;
};

TEST(PythonGrammars, TreeShapesOfBoth) {
  const Shape shapes[] = {
      {"x", "x"},
      {"a = b = c", "expr_stmt(a = b = c)"},
      {"a += 1", "expr_stmt(a += 1)"},
      {"a , b = 1 , 2 ,", nullptr},
      {"not a in b", "not_test(not comparison(a in b))"},
      {"a not in b is not c", "comparison(a comp_op(not in) b comp_op(is not) c)"},
      {"a or b and not c", "or_test(a or and_test(b and not_test(not c)))"},
      {"a if b else c", "test(a if b else c)"},
      {"a | b ^ c & d << e + f * - g",
       "expr(a | xor_expr(b ^ and_expr(c & shift_expr(d << arith_expr(e + term(f * factor(- g)))))))"},
      {"lambda : 0", "lambdef(lambda : 0)"},
      {"lambda x , * y , ** z : 0", nullptr},
      {"f ( )", nullptr},
      {"del a , b", "del_stmt(del exprlist(a , b))"},
      {"pass", "pass"},
      {"return", "return"},
      {"return x", "return_stmt(return x)"},
      {"raise", "raise"},
      {"assert a , b", "assert_stmt(assert a , b)"},
      {"global a , b", "global_stmt(global a , b)"},
      {"import a . b as c , d", "import_name(import dotted_as_names(dotted_as_name(dotted_name(a . b) as c) , d))"},
      {"import a", "import_name(import a)"},
      {"from . . a . b import c as d , e",
       "import_from(from . . dotted_name(a . b) import import_as_names(import_as_name(c as d) , e))"},
      {"from . import ( a , b , )", "import_from(from . import ( import_as_names(a , b ,) ))"},
      {"from x import *", "import_from(from x import *)"},
      {"if a : pass", "if_stmt(if a : simple_stmt(pass NEWLINE))"},
      {"while a : pass", "while_stmt(while a : simple_stmt(pass NEWLINE))"},
      {"for a , b in c : pass", "for_stmt(for exprlist(a , b) in c : simple_stmt(pass NEWLINE))"},
      {"with a , b as c : pass", "with_stmt(with a , with_item(b as c) : simple_stmt(pass NEWLINE))"},
      {"class A : pass", "classdef(class A : simple_stmt(pass NEWLINE))"},
      {"class A ( ) : pass", "classdef(class A ( ) : simple_stmt(pass NEWLINE))"},
      {"class A ( B ) : pass", "classdef(class A ( B ) : simple_stmt(pass NEWLINE))"},
      {"def f ( ) : pass", "funcdef(def f parameters(( )) : simple_stmt(pass NEWLINE))"},
      {"def f ( a ) : pass", "funcdef(def f parameters(( a )) : simple_stmt(pass NEWLINE))"},
      {"@ a . b NEWLINE def f ( ) : pass",
       "decorated(decorator(@ dotted_name(a . b) NEWLINE) funcdef(def f parameters(( )) : simple_stmt(pass NEWLINE)))"},
      {"@ a ( b ) NEWLINE @ c NEWLINE class D : pass",
       "decorated(decorators(decorator(@ a ( b ) NEWLINE) decorator(@ c NEWLINE)) classdef(class D : simple_stmt(pass "
       "NEWLINE)))"},
      {"try : pass NEWLINE finally : pass",
       "try_stmt(try : simple_stmt(pass NEWLINE) finally : simple_stmt(pass NEWLINE))"},
      {"try : pass NEWLINE except : pass",
       "try_stmt(try : simple_stmt(pass NEWLINE) except : simple_stmt(pass NEWLINE))"},
      {"try : pass NEWLINE except X as e : pass",
       "try_stmt(try : simple_stmt(pass NEWLINE) except_clause(except X as e) : simple_stmt(pass NEWLINE))"},
      {"a ; b", "a ; b"},
      {"a ;", "a ;"},
      {"( )", "atom(( ))"},
      {"( a )", "atom(( a ))"},
      {"( a , )", "atom(( testlist_comp(a ,) ))"},
      {"[ ]", "atom([ ])"},
      {"[ a ]", "atom([ a ])"},
      {"{ }", "atom({ })"},
      {"{ a : b , c : d }", "atom({ dictorsetmaker(a : b , c : d) })"},
      {"{ a }", "atom({ a })"},
      {"'s' 't'", "atom('s' 't')"},
      {"a [ b : c : d , e ]", nullptr},
      {"yield", "yield"},
      {"x = yield y", "expr_stmt(x = yield_expr(yield y))"},
  };
  for (const Shape& shape : shapes) {
    for (const char* version : {"2.7", "3.8"}) {
      const std::string tree = Statement(version, shape.line);
      if (shape.tree != nullptr) {
        EXPECT_EQ(tree, shape.tree) << version << ": " << shape.line;
      } else {
        EXPECT_EQ(tree.find('@'), std::string::npos) << version << ": " << shape.line << ": " << tree;
      }
    }
  }
}

TEST(PythonGrammars, TreeShapesOfTheOlder) {
  const Shape shapes[] = {
      {"print", "print"},
      {"print a , b ,", "print_stmt(print a , b ,)"},
      {"print >> f , a", "print_stmt(print >> f , a)"},
      {"exec a in b , c", "exec_stmt(exec a in b , c)"},
      {"a <> b", "comparison(a <> b)"},
      {"` a , b `", "atom(` testlist1(a , b) `)"},
      {"f ( a , * b , ** c )", "power(f trailer(( arglist(a , * b , ** c) )))"},
      {"f ( * a )", "power(f trailer(( arglist(* a) )))"},
      {"f ( a = 1 , b )", "power(f trailer(( arglist(argument(a = 1) , b) )))"},
      {"f ( i for i in r )", "power(f trailer(( argument(i comp_for(for i in r)) )))"},
      {"a . b ** c", "power(a trailer(. b) ** c)"},
      {"[ a , b , ]", "atom([ listmaker(a , b ,) ])"},
      {"[ a for b in c , d if e ]", "atom([ listmaker(a list_for(for b in testlist_safe(c , d) list_if(if e))) ])"},
      {"{ a : b for c in d }", "atom({ dictorsetmaker(a : b comp_for(for c in d)) })"},
      {"a [ . . . ]", "power(a trailer([ subscript(. . .) ]))"},
      {"a [ : , b : ]", "power(a trailer([ subscriptlist(: , subscript(b :)) ]))"},
      {"def f ( ( a , b ) , c = 1 , * d , ** e ) : pass",
       "funcdef(def f parameters(( varargslist(fpdef(( fplist(a , b) )) , c = 1 , * d , ** e) )) : simple_stmt(pass "
       "NEWLINE))"},
      {"try : pass NEWLINE except X , ( a , b ) : pass",
       "try_stmt(try : simple_stmt(pass NEWLINE) except_clause(except X , atom(( testlist_comp(a , b) ))) : "
       "simple_stmt(pass NEWLINE))"},
      {"class A ( B , C ) : pass", "classdef(class A ( testlist(B , C) ) : simple_stmt(pass NEWLINE))"},
      {"raise E , v , t", "raise_stmt(raise E , v , t)"},
      {"a , b = 1 , 2 ,", "expr_stmt(testlist(a , b) = testlist(1 , 2 ,))"},
      {"[ x for x in lambda : y , 1 ]",
       "atom([ listmaker(x list_for(for x in testlist_safe(old_lambdef(lambda : y) , 1))) ])"},
      {"x = yield a , b", "expr_stmt(x = yield_expr(yield testlist(a , b)))"},
      {"lambda x , * y , ** z : 0", "lambdef(lambda varargslist(x , * y , ** z) : 0)"},
      // What only the newer one has.
      {"nonlocal a", "bad input @1"},
      {"a : int = 1", "bad input @1"},
      {"print ( a , file = f )", "bad input @5"},
      {"def f ( a : int ) : pass", "bad input @4"},
      {"async def f ( ) : pass", "bad token @0"},
      {"a := b", "bad token @1"},
      {"f ( ** a , b )", "bad input @4"},
      {"yield from a", "bad input @1"},
      {"raise a from b", "bad input @2"},
      {"f ( a , , b )", "bad input @4"},
  };
  for (const Shape& shape : shapes) EXPECT_EQ(Statement("2.7", shape.line), shape.tree) << shape.line;
}

TEST(PythonGrammars, TreeShapesOfTheNewer) {
  const Shape shapes[] = {
      {"print ( a , file = f )", "atom_expr(print trailer(( arglist(a , argument(file = f)) )))"},
      {"f ( * a )", "atom_expr(f trailer(( argument(* a) )))"},
      {"f ( a , ** b , )", "atom_expr(f trailer(( arglist(a , argument(** b) ,) )))"},
      {"f ( i for i in r )", "atom_expr(f trailer(( argument(i sync_comp_for(for i in r)) )))"},
      {"f ( a := b )", "atom_expr(f trailer(( argument(a := b) )))"},
      {"a . b ** c", "power(atom_expr(a trailer(. b)) ** c)"},
      {"await a . b ( )", "atom_expr(await a trailer(. b) trailer(( )))"},
      {"- a ** - b", "factor(- power(a ** factor(- b)))"},
      {"a : int", "expr_stmt(a annassign(: int))"},
      {"a : int = 1 , 2", "expr_stmt(a annassign(: int = testlist_star_expr(1 , 2)))"},
      {"a , * b = c", "expr_stmt(testlist_star_expr(a , star_expr(* b)) = c)"},
      {"( a := b )", "atom(( namedexpr_test(a := b) ))"},
      {"[ a for b in c if d ]", "atom([ testlist_comp(a sync_comp_for(for b in c comp_if(if d))) ])"},
      {"[ a async for b in c ]", "atom([ testlist_comp(a comp_for(async sync_comp_for(for b in c))) ])"},
      {"{ ** a , b : c }", "atom({ dictorsetmaker(** a , b : c) })"},
      {"{ * a , b }", "atom({ dictorsetmaker(star_expr(* a) , b) })"},
      {"a [ ... ]", "atom_expr(a trailer([ ... ]))"},
      {"a [ : , b : : c , ]", "atom_expr(a trailer([ subscriptlist(: , subscript(b : sliceop(: c)) ,) ]))"},
      {"None", "None"},
      {"from ... import a", "import_from(from ... import a)"},
      {"from ... . a import b", "import_from(from ... . a import b)"},
      {"nonlocal a , b", "nonlocal_stmt(nonlocal a , b)"},
      {"raise a from b", "raise_stmt(raise a from b)"},
      {"yield from a", "yield_expr(yield yield_arg(from a))"},
      {"yield a , * b", "yield_expr(yield testlist_star_expr(a , star_expr(* b)))"},
      {"return a , * b", "return_stmt(return testlist_star_expr(a , star_expr(* b)))"},
      {"def f ( a , / , b : int = 1 , * , c , ** d , ) -> x : pass",
       "funcdef(def f parameters(( typedargslist(a , / , tfpdef(b : int) = 1 , * , c , ** d ,) )) -> x : "
       "simple_stmt(pass NEWLINE))"},
      {"def f ( * args , k = 1 ) : pass",
       "funcdef(def f parameters(( typedargslist(* args , k = 1) )) : simple_stmt(pass NEWLINE))"},
      {"def f ( a : int ) : pass", "funcdef(def f parameters(( tfpdef(a : int) )) : simple_stmt(pass NEWLINE))"},
      {"lambda a , / , b = 1 , * c , ** d : 0", "lambdef(lambda varargslist(a , / , b = 1 , * c , ** d) : 0)"},
      {"class A ( B , metaclass = M ) : pass",
       "classdef(class A ( arglist(B , argument(metaclass = M)) ) : simple_stmt(pass NEWLINE))"},
      {"async def f ( ) : pass", "async_stmt(async funcdef(def f parameters(( )) : simple_stmt(pass NEWLINE)))"},
      {"async with a as b : pass", "async_stmt(async with_stmt(with with_item(a as b) : simple_stmt(pass NEWLINE)))"},
      {"async for a in b : pass", "async_stmt(async for_stmt(for a in b : simple_stmt(pass NEWLINE)))"},
      {"@ a NEWLINE async def f ( ) : pass",
       "decorated(decorator(@ a NEWLINE) async_funcdef(async funcdef(def f parameters(( )) : simple_stmt(pass "
       "NEWLINE))))"},
      {"if a := b : pass", "if_stmt(if namedexpr_test(a := b) : simple_stmt(pass NEWLINE))"},
      {"a @= b", "expr_stmt(a @= b)"},
      {"a @ b", "term(a @ b)"},
      {"a != b", "comparison(a != b)"},
      // Newer than 3.8, and of no matter to other statements.
      {"for a in * b , c : pass",
       "for_stmt(for a in testlist_star_expr(star_expr(* b) , c) : simple_stmt(pass NEWLINE))"},
      {"a [ * b , c ]", "atom_expr(a trailer([ subscriptlist(star_expr(* b) , c) ]))"},
      {"a [ b := 1 ]", "atom_expr(a trailer([ namedexpr_test(b := 1) ]))"},
      // What only the older one has.
      {"print a", "bad input @1"},
      {"exec a in b", "bad input @1"},
      {"` a `", "bad token @0"},
      {"raise E , v", "bad input @2"},
      {"def f ( ( a , b ) ) : pass", "bad input @3"},
      {"try : pass NEWLINE except X , e : pass", "bad input @6"},
      // Not in this order.
      {"def f ( ** a , b ) : pass", "bad input @6"},
      {"def f ( / ) : pass", "bad input @3"},
      {"def f ( * , * a ) : pass", "bad input @5"},
      {"f ( a , , b )", "bad input @4"},
      {"a . None", "bad input @2"},
  };
  for (const Shape& shape : shapes) EXPECT_EQ(Statement("3.8", shape.line), shape.tree) << shape.line;
}

TEST(PythonGrammars, WholeFilesHaveBlocks) {
  EXPECT_EQ(Parse(RealGrammar("3.8"), "file_input",
                  Tokens("NEWLINE if a : NEWLINE INDENT b NEWLINE c NEWLINE DEDENT else : d NEWLINE e NEWLINE END")),
            "file_input(NEWLINE if_stmt(if a : suite(NEWLINE INDENT simple_stmt(b NEWLINE) simple_stmt(c NEWLINE) "
            "DEDENT) else : simple_stmt(d NEWLINE)) simple_stmt(e NEWLINE) END)");
  EXPECT_EQ(Parse(RealGrammar("3.8"), "file_input", Tokens("END")), "END");
}

// ---- the engine ----

TEST(Engine, ErrorsCarryTokenAndContext) {
  const Grammar& grammar = RealGrammar("3.8");
  RawCounts counts;
  RawEngine engine(grammar, RawBuilder{&grammar, &counts});
  engine.Setup(grammar.symbol2number.at("file_input"));
  Feed(engine, grammar, Tokens("if x"));
  const std::string text = "pass";
  const Token token{text.data(), 4, word::kPass};
  try {
    engine.AddToken(grammar.Classify(token), tok::NAME, token, 17);
    FAIL();
  } catch (const ParseError& error) {
    EXPECT_EQ(error.message(), "bad input");
    EXPECT_EQ(error.type, tok::NAME);
    EXPECT_TRUE(error.has_value);
    EXPECT_EQ(error.value, "pass");
    EXPECT_EQ(error.context, Context::Index(17));
  }
  engine.Setup(grammar.symbol2number.at("file_input"));
  EXPECT_EQ(counts.live, 0);
  try {
    engine.AddToken(grammar.Classify(tok::DEDENT, kNoText), tok::DEDENT, Token{}, 3);
    FAIL();
  } catch (const ParseError& error) {
    EXPECT_FALSE(error.has_value);
    EXPECT_EQ(error.type, tok::DEDENT);
    EXPECT_EQ(error.context, Context::Index(3));
  }
}

TEST(Engine, EndsOfInput) {
  const Grammar& grammar = RealGrammar("3.8");
  EXPECT_EQ(Parse(grammar, "file_input", {}), "incomplete input @none");
  EXPECT_EQ(Parse(grammar, "file_input", Tokens("x NEWLINE")), "incomplete input @none");
  EXPECT_EQ(Parse(grammar, "file_input", Tokens("x NEWLINE END END")), "too much input @3");
  EXPECT_EQ(Parse(grammar, "testlist", Tokens("x , y")), "testlist(x , y)");
  EXPECT_EQ(Parse(grammar, "testlist", Tokens("x")), "x");
  EXPECT_EQ(Parse(grammar, "testlist", Tokens("x +")), "incomplete input @none");
  EXPECT_EQ(Parse(grammar, "testlist", Tokens("x NEWLINE")), "too much input @1");
  EXPECT_EQ(Parse(grammar, "testlist", Tokens("x , y y")), "too much input @3");
}

TEST(Engine, AnUnknownStartIsAValueError) {
  const Grammar& grammar = RealGrammar("3.8");
  RawCounts counts;
  RawEngine engine(grammar, RawBuilder{&grammar, &counts});
  for (const int start : {0, 1, 255, -1, 256 + static_cast<int>(grammar.rules.size())}) {
    try {
      engine.Setup(start);
      ADD_FAILURE() << start;
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kValueError);
    }
  }
}

TEST(Engine, TakesNothingBeforeSetupOrAfterAnError) {
  const Grammar& grammar = RealGrammar("3.8");
  RawCounts counts;
  RawEngine engine(grammar, RawBuilder{&grammar, &counts});
  EXPECT_THROW(Feed(engine, grammar, Tokens("x")), ParseError);
  EXPECT_THROW(engine.Finish(), ParseError);
  engine.Setup(grammar.symbol2number.at("file_input"));
  EXPECT_THROW(Feed(engine, grammar, Tokens("x y")), ParseError);
  EXPECT_THROW(Feed(engine, grammar, Tokens("NEWLINE")), ParseError);
  EXPECT_THROW(engine.Finish(), ParseError);
  engine.Setup(grammar.symbol2number.at("testlist"));
  Feed(engine, grammar, Tokens("x"));
  RawNode* root = engine.Finish();
  EXPECT_EQ(Written(root), "x");
  EXPECT_THROW(engine.Finish(), ParseError) << "the root has left";
  RawBuilder{&grammar, &counts}.Drop(root);
  EXPECT_EQ(counts.live, 0);
}

TEST(Engine, InteriorNodesMayTakeTheContextOfTheirFirstToken) {
  const Grammar& grammar = RealGrammar("3.8");
  RawCounts counts;
  RawBuilder builder{&grammar, &counts};
  RawEngine engine(grammar, builder);
  engine.Setup(grammar.symbol2number.at("testlist"));
  Feed(engine, grammar, Tokens("a , b + c"));
  RawNode* root = engine.Finish();
  EXPECT_EQ(root->context, 0);
  EXPECT_EQ(root->children[2]->label, "arith_expr");
  EXPECT_EQ(root->children[2]->context, 2);
  builder.Drop(root);
}

TEST(Engine, WithoutPromotionEveryRuleIsANode) {
  const Grammar grammar = Grammar::Parse("s: t (',' t)*\nt: f ('+' f)*\nf: NAME\n", "g");
  EXPECT_EQ(Parse(grammar, "s", Tokens("a"), false), "s(t(f(a)))");
  EXPECT_EQ(Parse(grammar, "s", Tokens("a , b + c"), false), "s(t(f(a)) , t(f(b) + f(c)))");
  EXPECT_EQ(Parse(grammar, "s", Tokens("a + b , c"), false), "s(t(f(a) + f(b)) , t(f(c)))");
  EXPECT_EQ(Parse(grammar, "f", Tokens("a"), false), "f(a)");
  EXPECT_EQ(Parse(grammar, "s", Tokens("a +"), false), "incomplete input @none");
  EXPECT_EQ(Parse(grammar, "s", Tokens("a + ,"), false), "bad input @2");
}

TEST(Engine, AThrowingBuilderLeavesNothingBehindAndSetupRecovers) {
  const Grammar& grammar = RealGrammar("3.8");
  const int start = grammar.symbol2number.at("file_input");
  const std::vector<FedToken> tokens = Tokens("x = f ( a + b , [ c , d ] ) ** 2 NEWLINE END");
  for (const bool promote : {true, false}) {
    RawCounts counts;
    RawBuilder builder{&grammar, &counts};
    RawEngine engine(grammar, builder, promote);
    engine.Setup(start);
    Feed(engine, grammar, tokens);
    RawNode* root = engine.Finish();
    const std::string expected = Written(root);
    builder.Drop(root);
    const int64_t nodes = counts.made;
    ASSERT_GT(nodes, 20);
    for (int64_t failing = 0; failing < nodes; ++failing) {
      counts.made = 0;
      counts.throw_at = failing;
      engine.Setup(start);
      EXPECT_THROW(
          {
            Feed(engine, grammar, tokens);
            builder.Drop(engine.Finish());
          },
          std::runtime_error);
      EXPECT_THROW(Feed(engine, grammar, Tokens("y")), ParseError);
      counts.throw_at = -1;
      engine.Setup(start);
      EXPECT_EQ(counts.live, 0) << "failing at node " << failing;
      Feed(engine, grammar, tokens);
      root = engine.Finish();
      EXPECT_EQ(Written(root), expected);
      builder.Drop(root);
    }
    EXPECT_EQ(counts.live, 0);
  }
}

// Nodes that are numbers, so that a tree of any depth needs no memory.
struct CountingBuilder {
  using Node = int64_t;
  int64_t* rules;

  Node Leaf(int, const Token&, int32_t context) { return context; }
  Node Rule(int, Node* children, uint32_t) {
    ++*rules;
    return children[0];
  }
  void Drop(Node) {}
};

TEST(Engine, AMillionBracketsNeedNoMachineStack) {
  const Grammar& grammar = RealGrammar("3.8");
  constexpr int kDepth = 1'000'000;
  const auto add = [&](auto& engine, const char* text, TokenCode code, int times) {
    const Token token{text, 1, code};
    for (int i = 0; i < times; ++i) engine.AddToken(grammar.Classify(token), TypeOfCode(code), token, i);
  };
  for (const bool promote : {true, false}) {
    int64_t rules = 0;
    Engine<CountingBuilder> engine(grammar, CountingBuilder{&rules}, promote);
    engine.Setup(grammar.symbol2number.at("file_input"));
    add(engine, "(", tok::LPAR, kDepth);
    add(engine, "x", tok::NAME, 1);
    add(engine, ")", tok::RPAR, kDepth);
    add(engine, "\n", tok::NEWLINE, 1);
    add(engine, "", tok::ENDMARKER, 1);
    EXPECT_EQ(engine.Finish(), 0);
    EXPECT_GE(rules, kDepth);
    rules = 0;
    engine.Setup(grammar.symbol2number.at("file_input"));
    add(engine, "-", tok::MINUS, kDepth);
    EXPECT_THROW(add(engine, ")", tok::RPAR, 1), ParseError);
    engine.Setup(grammar.symbol2number.at("file_input"));
    add(engine, "x", tok::NAME, 1);
    add(engine, "\n", tok::NEWLINE, 1);
    add(engine, "", tok::ENDMARKER, 1);
    EXPECT_EQ(engine.Finish(), 0) << "an ordinary statement after a huge one";
  }
}

TEST(Engine, AMillionTermsAreOneNode) {
  const Grammar& grammar = RealGrammar("3.8");
  int64_t rules = 0;
  Engine<CountingBuilder> engine(grammar, CountingBuilder{&rules});
  engine.Setup(grammar.symbol2number.at("testlist"));
  const Token name{"x", 1, tok::NAME};
  const Token plus{"+", 1, tok::PLUS};
  for (int i = 0; i < 1'000'000; ++i) {
    engine.AddToken(grammar.Classify(name), tok::NAME, name, i);
    engine.AddToken(grammar.Classify(plus), tok::PLUS, plus, i);
  }
  engine.AddToken(grammar.Classify(name), tok::NAME, name, 0);
  engine.Finish();
  EXPECT_EQ(rules, 1);
}

TEST(Engine, OneGrammarServesManyThreadsAndOutlivesItsName) {
  std::vector<std::thread> threads;
  std::vector<std::string> results(4);
  {
    std::optional<Grammar> grammar = Grammar::Parse("s: t (',' t)*\nt: NAME ('+' NAME)*\n", "g");
    for (std::string& result : results) {
      threads.emplace_back([copy = *grammar, &result] {
        for (int round = 0; round < 2000; ++round) result = Parse(copy, "s", Tokens("a + b , c , d + e"));
      });
    }
    grammar.reset();
  }
  for (std::thread& thread : threads) thread.join();
  for (const std::string& result : results) EXPECT_EQ(result, "s(t(a + b) , c , t(d + e))");
}

// ---- the engine against a driver that takes one frame a step ----

class PlainDriver {
 public:
  PlainDriver(const Grammar& grammar, bool promote)
      : grammar_(grammar), promote_(promote), first_sets_(grammar.rules.size()) {
    for (size_t rule = 0; rule < grammar.rules.size(); ++rule) FirstSet(rule);
  }

  std::string Parse(const std::string& start, const std::vector<FedToken>& tokens) {
    const size_t root = static_cast<size_t>(grammar_.symbol2number.at(start) - Grammar::kFirstSymbol);
    std::vector<Frame> frames{{root, 0, {}}};
    std::string result;
    for (size_t i = 0; i < tokens.size(); ++i) {
      const int label = grammar_.Classify(tokens[i].type, tokens[i].text);
      const std::string where = " @" + std::to_string(i);
      if (label == Grammar::kNoLabel) return "bad token" + where;
      for (bool taken = false; !taken;) {
        if (frames.empty()) return "too much input" + where;
        Frame& top = frames.back();
        const Grammar::State& state = grammar_.rules[top.rule].states[top.state];
        const Grammar::Arc* way = nullptr;
        for (const Grammar::Arc& arc : state.arcs) {
          if (Begins(arc.label, label)) way = &arc;
        }
        if (way == nullptr) {
          if (!state.accepting) return "bad input" + where;
          Pop(frames, result);
        } else {
          top.state = static_cast<size_t>(way->target);
          if (way->label < Grammar::kFirstSymbol) {
            top.children.push_back(tokens[i].text);
            taken = true;
          } else {
            frames.push_back({static_cast<size_t>(way->label - Grammar::kFirstSymbol), 0, {}});
          }
        }
      }
    }
    while (!frames.empty()) {
      if (!grammar_.rules[frames.back().rule].states[frames.back().state].accepting) return "incomplete input @none";
      Pop(frames, result);
    }
    return result;
  }

 private:
  struct Frame {
    size_t rule;
    size_t state;
    std::vector<std::string> children;
  };

  const std::set<int>& FirstSet(size_t rule) {
    std::set<int>& set = first_sets_[rule];
    if (!set.empty()) return set;
    for (const Grammar::Arc& arc : grammar_.rules[rule].states[0].arcs) {
      if (arc.label < Grammar::kFirstSymbol) {
        set.insert(arc.label);
      } else {
        const std::set<int>& inner = FirstSet(static_cast<size_t>(arc.label - Grammar::kFirstSymbol));
        set.insert(inner.begin(), inner.end());
      }
    }
    return set;
  }

  bool Begins(int arc_label, int label) const {
    if (arc_label < Grammar::kFirstSymbol) return arc_label == label;
    return first_sets_[static_cast<size_t>(arc_label - Grammar::kFirstSymbol)].contains(label);
  }

  void Pop(std::vector<Frame>& frames, std::string& result) const {
    const Frame frame = std::move(frames.back());
    frames.pop_back();
    std::string node;
    if (frame.children.size() == 1 && promote_) {
      node = frame.children[0];
    } else {
      node = grammar_.rules[frame.rule].name + "(";
      for (size_t i = 0; i < frame.children.size(); ++i) node += (i ? " " : "") + frame.children[i];
      node += ")";
    }
    if (frames.empty()) {
      result = node;
    } else {
      frames.back().children.push_back(node);
    }
  }

  const Grammar& grammar_;
  const bool promote_;
  std::vector<std::set<int>> first_sets_;
};

// A walk through the automata that mostly does what the grammar allows.
std::vector<FedToken> RandomSentence(const Grammar& grammar, std::mt19937& random, size_t start) {
  std::vector<FedToken> tokens;
  struct Place {
    size_t rule;
    size_t state;
  };
  std::vector<Place> places{{start, 0}};
  while (!places.empty() && tokens.size() < 60) {
    Place& place = places.back();
    const Grammar::State& state = grammar.rules[place.rule].states[place.state];
    if (state.arcs.empty() || (state.accepting && random() % 3 != 0)) {
      places.pop_back();
      continue;
    }
    const Grammar::Arc arc = state.arcs[random() % state.arcs.size()];
    place.state = static_cast<size_t>(arc.target);
    if (arc.label >= Grammar::kFirstSymbol) {
      places.push_back({static_cast<size_t>(arc.label - Grammar::kFirstSymbol), 0});
    } else {
      const Grammar::Label& label = grammar.labels[static_cast<size_t>(arc.label)];
      tokens.push_back({label.keyword.empty() ? label.spelling : label.keyword, label.token_type});
    }
  }
  return tokens;
}

void Mutate(std::vector<FedToken>& tokens, const std::vector<FedToken>& pool, std::mt19937& random) {
  for (size_t changes = random() % 3; changes > 0 && !tokens.empty(); --changes) {
    const size_t at = random() % tokens.size();
    switch (random() % 3) {
      case 0:
        tokens.erase(tokens.begin() + static_cast<std::ptrdiff_t>(at));
        break;
      case 1:
        tokens[at] = pool[random() % pool.size()];
        break;
      default:
        tokens.insert(tokens.begin() + static_cast<std::ptrdiff_t>(at), pool[random() % pool.size()]);
    }
  }
}

// Returns how many of the sentences were accepted.
int CompareOnRandomSentences(const Grammar& grammar, std::mt19937& random, int rounds) {
  std::vector<FedToken> pool{{"?", tok::ERRORTOKEN}};
  for (const Grammar::Label& label : grammar.labels) {
    pool.push_back({label.keyword.empty() ? label.spelling : label.keyword, label.token_type});
  }
  PlainDriver promoting(grammar, true);
  PlainDriver keeping(grammar, false);
  int accepted = 0;
  for (int round = 0; round < rounds; ++round) {
    const size_t start = random() % grammar.rules.size();
    std::vector<FedToken> tokens = RandomSentence(grammar, random, start);
    Mutate(tokens, pool, random);
    const std::string& name = grammar.rules[start].name;
    const std::string tree = Parse(grammar, name, tokens, true);
    EXPECT_EQ(tree, promoting.Parse(name, tokens));
    EXPECT_EQ(Parse(grammar, name, tokens, false), keeping.Parse(name, tokens));
    accepted += tree.find('@') == std::string::npos;
  }
  return accepted;
}

TEST(EngineAgainstPlainDriver, OnThePythonGrammars) {
  std::mt19937 random(8);
  for (const char* version : {"2.7", "3.8"}) {
    EXPECT_GT(CompareOnRandomSentences(RealGrammar(version), random, 4000), 400) << version;
  }
}

void AppendRandomExpression(std::string& text, std::mt19937& random, size_t rules, int depth) {
  static const char* const terminals[] = {"NAME", "NUMBER", "'+'", "','", "'if'", "'is'", "'('", "')'"};
  for (size_t i = 1 + random() % 3; i > 0; --i) {
    const size_t kind = random() % 10;
    if (kind < 4 || depth == 0) {
      text += terminals[random() % std::size(terminals)];
    } else if (kind < 7) {
      text += "r";
      text += std::to_string(random() % rules);
    } else {
      text += kind == 8 ? "[" : "(";
      AppendRandomExpression(text, random, rules, depth - 1);
      if (kind == 7) {
        text += "| ";
        AppendRandomExpression(text, random, rules, depth - 1);
      }
      text += kind == 7 ? ")" : kind == 8 ? "]" : random() % 2 ? ")*" : ")+";
    }
    text += " ";
  }
}

TEST(EngineAgainstPlainDriver, OnRandomGrammars) {
  std::mt19937 random(3);
  int grammars = 0;
  int accepted = 0;
  for (int round = 0; round < 6000; ++round) {
    const size_t rules = 2 + random() % 5;
    std::string text;
    for (size_t rule = 0; rule < rules; ++rule) {
      text += "r";
      text += std::to_string(rule);
      text += ": ";
      AppendRandomExpression(text, random, rules, 2);
      text += "\n";
    }
    std::optional<Grammar> grammar;
    try {
      grammar = Grammar::Parse(text, "g");
    } catch (const Error& error) {
      ASSERT_EQ(error.kind(), ErrorKind::kGrammarError) << text;
      continue;
    }
    SCOPED_TRACE(text);
    ++grammars;
    accepted += CompareOnRandomSentences(*grammar, random, 20);
    if (HasFailure()) return;
  }
  EXPECT_GT(grammars, 200);
  EXPECT_GT(accepted, 500);
}

// ---- grammars that all share ----

TEST(SharedGrammar, IsOneObjectForOneText) {
  const std::string filename = std::string(QUILLET_SOURCE_DIR) + "/resources/pgen-grammars/Python-Grammar-3.8";
  std::vector<std::shared_ptr<const Grammar>> found(8);
  std::vector<std::thread> threads;
  for (auto& grammar : found) threads.emplace_back([&] { grammar = Grammar::Shared(filename, TokenNames::Default()); });
  for (std::thread& thread : threads) thread.join();
  const auto kept = Grammar::Shared(filename, TokenNames::Default());
  EXPECT_EQ(Grammar::Shared(filename, TokenNames::Default()), kept);
  for (const auto& grammar : found) EXPECT_EQ(grammar->symbol_names, kept->symbol_names);

  TokenNames other = TokenNames::Default();
  other.op2number["+"] = tok::MINUS;
  EXPECT_NE(Grammar::Shared(filename, other), kept);
}

TEST(SharedGrammar, IsReadAnewWhenItsFileChanges) {
  const std::string filename = ::testing::TempDir() + "/quillet_changing_grammar";
  const auto symbols_of = [&](const std::string& text) {
    std::ofstream(filename) << text;
    return Grammar::Shared(filename, TokenNames::Default())->symbol_names;
  };
  // More often than grammars are kept.
  for (int i = 0; i < 20; ++i) {
    const std::string name = "rule" + std::to_string(i);
    EXPECT_EQ(symbols_of(name + ": NAME\n"), (std::vector<std::string>{name}));
  }
  EXPECT_THROW(symbols_of("a: b\n"), Error);
  std::remove(filename.c_str());
  EXPECT_THROW(Grammar::Shared(filename, TokenNames::Default()), Error);
}

}  // namespace
}  // namespace quillet
