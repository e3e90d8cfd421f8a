// The parameters of a definition and of a lambda, as one flat list.
//
// The order of the groups is judged as the list is read: those in front of "/", the plain ones, those behind
// "*", the one behind "**". Tuples of names are parameters of 2 alone.
#include <utility>

#include "parser/complete_depth.h"
#include "parser/complete_parser.h"

namespace quillet {

void CompleteParser::AddParameterName(size_t at) {
  const Text name = TokenAt(at).view();
  const bool is_new = names_.Add(name);
  if (!is_new) Postpone(at, "duplicate argument '" + std::string(name) + "' in function definition");
  if (name == "__debug__") Postpone(at, "cannot assign to __debug__", kCompiler);
  if (!python3_ && name == "None") FailAt(at, "cannot assign to None");
}

// A name, with its annotation where it may have one.
void CompleteParser::Parameter(bool is_lambda, bool is_starred) {
  const size_t mark = Mark();
  if (Code() == tok::LPAR) {
    if (!python3_ && !is_starred) return TupleParameter();
    if (!is_starred && python3_ && IsNamesInBrackets()) {
      FailAt(at_, is_lambda ? "Lambda expression parameters cannot be parenthesized"
                            : "Function parameters cannot be parenthesized");
    }
  }
  if (!IsName(Code())) FailHere();
  AddParameterName(at_);
  PushLeaf();
  if (is_lambda || Code() != tok::COLON) return;
  if (!python3_) FailHere();
  PushLeaf();
  InTypeScope(AnnotationScope(), [&] {
    if (Code() != tok::STAR || !is_starred) return Test();
    if (!Since(11)) FailHere();
    TestOrStar();
  });
  Finish(symbols_.tfpdef, mark);
}

// `(a, b)`
bool CompleteParser::IsNamesInBrackets() const {
  size_t at = at_ + 1;
  while (IsName(code_[at])) {
    ++at;
    if (code_[at] != tok::COMMA) break;
    ++at;
  }
  return at > at_ + 1 && code_[at] == tok::RPAR;
}

// `(a, (b, c))`, in 2.
void CompleteParser::TupleParameter() {
  const Deeper deeper(*this);
  const size_t mark = Mark();
  PushLeaf();
  const size_t inner = Mark();
  for (;;) {
    if (Code() == tok::LPAR) {
      TupleParameter();
    } else {
      if (!IsName(Code())) FailHere();
      AddParameterName(at_);
      PushLeaf();
    }
    if (Code() != tok::COMMA) break;
    PushLeaf();
    if (Code() == tok::RPAR) break;
  }
  if (Mark() - inner > 1) FinishBare<CDefiningArglistNode>(inner);
  Expect(tok::RPAR, nullptr);
  FinishBare<CFunctionParameterDef>(mark);
}

void CompleteParser::Parameters(bool is_lambda, TokenCode end) {
  const size_t mark = Mark();
  DistinctNames outer_names = std::exchange(names_, {});
  bool has_slash = false;
  bool has_star = false;
  bool has_default = false;
  bool needs_name = false;  // behind a bare "*"
  size_t bare_star = 0;
  while (Code() != end) {
    const size_t start = at_;
    if (Code() == tok::SLASH) {
      if (Mark() == mark) Fail(python3_ ? "at least one parameter must precede /" : "invalid syntax");
      if (!Since(8)) RequireAt(at_, 8, "Positional-only parameters are");
      if (has_slash) Fail("/ may appear only once");
      if (has_star) Fail("/ must be ahead of *");
      has_slash = true;
      PushLeaf();
    } else if (Code() == tok::STAR) {
      if (has_star) Fail("* may appear only once");
      has_star = true;
      PushLeaf();
      if (Code() == tok::COMMA && python3_) {
        needs_name = true;
        bare_star = start;
      } else if (Code() == end && python3_) {
        FailAt(start, "named arguments must follow bare *");
      } else {
        Parameter(is_lambda, /*is_starred=*/true);
        if (Code() == tok::EQUAL) Fail("var-positional parameter cannot have default value");
      }
    } else if (Code() == tok::DOUBLESTAR) {
      if (needs_name) FailAt(bare_star, "named arguments must follow bare *");
      PushLeaf();
      Parameter(is_lambda, /*is_starred=*/false);
      if (Code() == tok::EQUAL) Fail("var-keyword parameter cannot have default value");
      if (Code() == tok::COMMA && (is_lambda ? Since(6) : Since(6))) PushLeaf();
      if (Code() != end && IsParameterStart()) Fail("parameters cannot follow var-keyword parameter");
      break;
    } else {
      if (!python3_ && has_star) FailHere();
      Parameter(is_lambda, /*is_starred=*/false);
      needs_name = false;
      if (Code() == tok::EQUAL) {
        has_default = true;
        PushLeaf();
        if (Code() == tok::COMMA || Code() == end) {
          if (python3_) FailAt(at_ - 1, "expected default value expression");
          FailHere();
        }
        Test();
      } else if (has_default && !has_star && (Code() == tok::COMMA || Code() == end)) {
        FailAt(start, "parameter without a default follows parameter with a default");
      }
    }
    if (Code() != tok::COMMA) break;
    const bool was_star = has_star;
    PushLeaf();
    if (Code() == end && was_star && (!Since(6))) FailHere();
  }
  if (needs_name) FailAt(bare_star, "named arguments must follow bare *");
  names_ = std::move(outer_names);
  Finish(is_lambda ? symbols_.varargslist : symbols_.typedargslist, mark);
}

bool CompleteParser::IsParameterStart() const {
  return IsName(Code()) || Code() == tok::STAR || Code() == tok::DOUBLESTAR || Code() == tok::SLASH;
}

}  // namespace quillet
