// Expressions, parameters and targets: the loop over the tokens and the stack of what is open.
//
// A frame is a bracket, a lambda, or the expression's own base at the bottom. Lambdas have no bracket
// that closes them: whatever cannot stand in a lambda's body ends it.
#include <algorithm>

#include "lines/token_search.h"
#include "names/reader.h"

namespace quillet {

namespace {

// Makes what stands in front of it a part of a longer chain.
constexpr bool IsTrailer(TokenCode code) { return code == tok::DOT || code == tok::LPAR || code == tok::LSQB; }

}  // namespace

void NameReader::BeginBase() {
  base_ = frames_.size();
  Frame base;
  base.outer = scope_;
  base.flags = flags_;
  base.quiet = quiet_;
  base.candidates = base.target = static_cast<uint32_t>(candidates_.size());
  frames_.push_back(base);
  front_ = Front::kOperator;
  operand_ = kNoIndex;
}

// What is still open ends with the expression.
void NameReader::EndBase() {
  while (frames_.size() > base_ + 1) {
    if (frames_.back().part == Frame::Part::kTarget) EndTarget();
    PopFrame();
  }
  if (frames_.back().part == Frame::Part::kTarget) EndTarget();
  MakeReads(frames_.back().candidates);
  PopFrame();
}

// Restores what the frame found. Its scope, if it opened one, ends with the last token.
void NameReader::PopFrame() {
  const Frame& frame = frames_.back();
  if (frame.inner != kNoIndex && frame.inner != frame.outer) {
    // A lambda ends in front of what ended it, a comprehension with its bracket.
    const Token* last = at_ < end_ ? at_ : end_ - 1;
    const bool is_in = at_ >= end_ || frame.kind != Frame::Kind::kLambda;
    EndOfScope(frame.inner, OffsetOf(*last) + (is_in ? last->length : 0));
  }
  scope_ = frame.outer;
  flags_ = frame.flags;
  quiet_ = frame.quiet;
  frames_.pop_back();
}

void NameReader::PopLambdas() {
  while (frames_.back().kind == Frame::Kind::kLambda) {
    PopFrame();
    front_ = Front::kValue;
    operand_ = kNoIndex;
  }
}

void NameReader::PopLambdaBodies() {
  while (frames_.back().kind == Frame::Kind::kLambda && frames_.back().in_body) {
    PopFrame();
    front_ = Front::kValue;
    operand_ = kNoIndex;
  }
}

void NameReader::ReadTokens(bool stops_at_colon) {
  const auto operation = [this] {
    front_ = Front::kOperator;
    operand_ = kNoIndex;
    frames_.back().is_plain = false;
  };
  for (; at_ < end_; ++at_) {
    const Token& token = *at_;
    switch (MarkOf(token)) {
      case Mark::kName:
        Name(token);
        break;
      case Mark::kConstant:
        front_ = Front::kValue;
        operand_ = kNoIndex;
        break;
      case Mark::kString:
        String(token);
        break;
      case Mark::kOpen:
        Open(token.code);
        break;
      case Mark::kClose:
        Close();
        break;
      case Mark::kDot:
        front_ = Front::kDot;
        break;
      case Mark::kComma:
        Comma();
        operation();
        break;
      case Mark::kColon:
        if (Colon(stops_at_colon)) return;
        break;
      case Mark::kEqual:
        Equal();
        operation();
        break;
      case Mark::kAssign:
        Assign(token);
        operation();
        break;
      case Mark::kLambda:
        operation();
        Lambda();
        break;
      case Mark::kFor:
        For();
        operation();
        break;
      case Mark::kIn:
        In();
        operation();
        break;
      case Mark::kIf:
        if (frames_.back().ends_at_if && frames_.back().in_body) PopLambdas();
        if (frames_.back().part == Frame::Part::kFirstIterable) {
          frames_.back().part = Frame::Part::kRest;
          scope_ = frames_.back().inner;
        }
        operation();
        break;
      case Mark::kAs:
        As();
        operation();
        break;
      case Mark::kAsync: {
        const TokenCode next = NextCode();
        if (next == word::kFor || next == word::kDef || next == word::kWith)
          operation();
        else
          Name(token);
        break;
      }
      case Mark::kAwait:
        if (!open_.empty() && out_.scopes[open_.back().scope].is_async)
          operation();
        else
          Name(token);
        break;
      case Mark::kDoubleStar:
        if (front_ == Front::kOperator && frames_.back().kind == Frame::Kind::kBases) frames_.back().position = 0;
        operation();
        break;
      case Mark::kBackquote:
        Backquote();
        break;
      case Mark::kDefinition:
        // A head in the middle of broken code begins a statement.
        if (frames_.size() == base_ + 1 && in_row_ && at_ != statement_begin_) return;
        operation();
        break;
      case Mark::kOperator:
        operation();
        break;
      case Mark::kSkip:
        if (embeds_) Comment(token);
        break;
    }
  }
}

// ---- names ----

void NameReader::Name(const Token& token) {
  const TokenCode next = NextCode();
  const Frame& frame = frames_.back();
  const uint32_t text = NumberOf(token);
  const uint32_t flags = flags_ | (next != tok::DOT ? frame.position : 0u);
  const NameRole role = next == tok::LPAR ? NameRole::kCall : NameRole::kRead;
  const bool is_candidate = frame.collects && !IsTrailer(next);
  if (front_ == Front::kDot) {
    operand_ = AddAttribute(token, text, role, flags, operand_);
    if (is_candidate) candidates_.push_back(operand_);
    front_ = Front::kValue;
    return;
  }
  if (frame.names != Frame::Names::kValues && SpecialName(token, text, next)) return;
  if (next == tok::COLONEQUAL) [[unlikely]]
    return Walrus(token, text);
  if (next == tok::STRING && IsTemplatePrefix(token)) [[unlikely]]
    return Template(token);
  const uint32_t symbol = symbols_.SymbolOf(scope_, text);
  operand_ = Add(token, text, role, NameKind::kNone, flags, symbol);
  if (is_candidate)
    candidates_.push_back(operand_);
  else
    MarkRead(symbol, text);
  front_ = Front::kValue;
}

// A name in a place of its own: a parameter, or the keyword of an argument. False for any other.
bool NameReader::SpecialName(const Token& token, uint32_t text, TokenCode next) {
  const Frame& frame = frames_.back();
  switch (frame.names) {
    case Frame::Names::kValues:
      return false;
    case Frame::Names::kArguments:
      if (next != tok::EQUAL || front_ != Front::kOperator) return false;
      AddWithoutSymbol(token, text, NameRole::kKeyword);
      front_ = Front::kValue;
      operand_ = kNoIndex;
      return true;
    case Frame::Names::kParameters:
      operand_ =
          AddBound(token, text, NameRole::kDefinition, NameKind::kParameter, NameSymbol::kParameter, frame.inner);
      break;
    case Frame::Names::kTypeParameters: {
      constexpr uint16_t kUse = NameSymbol::kTypeParameter | NameSymbol::kBound;
      head_.parameter = text;
      symbols_.TypeParameterOf(frame.inner, text);
      operand_ = AddBound(token, text, NameRole::kDefinition, NameKind::kTypeParameter, kUse, frame.inner);
      break;
    }
  }
  front_ = Front::kValue;
  return true;
}

// The target of ":=" is bound outside of the comprehensions around it, which have a symbol for it all
// the same.
void NameReader::Walrus(const Token& token, uint32_t text) {
  const uint32_t binding = symbols_.WalrusScope(scope_);
  uint16_t use = NameSymbol::kBound;
  if (binding != scope_ && out_.scopes[binding].kind != NameScopeKind::kClass) {
    const uint32_t bound = symbols_.SymbolOf(binding, text);
    const bool is_global = binding == 0 || (symbols_.symbol(bound).uses & NameSymbol::kGlobalStatement) != 0;
    if (binding != quiet_)
      symbols_.symbol(bound).uses |= binding == 0 ? NameSymbol::kGlobalStatement : NameSymbol::kBound;
    use |= is_global ? NameSymbol::kGlobalStatement : NameSymbol::kNonlocalStatement;
  }
  operand_ = AddBound(token, text, NameRole::kWrite, NameKind::kVariable, use, scope_);
  front_ = Front::kValue;
}

// ---- brackets ----

void NameReader::Open(TokenCode code) {
  const bool is_call = front_ == Front::kValue;
  Frame& around = frames_.back();
  if (head_.kind != Head::Kind::kNone && in_row_ && frames_.size() == base_ + 1 && OpenInHead(code)) return;
  Frame frame;
  switch (code) {
    case tok::LPAR:
      frame.kind = is_call ? Frame::Kind::kCall : Frame::Kind::kGroup;
      if (is_call) frame.names = Frame::Names::kArguments;
      break;
    case tok::LSQB:
      frame.kind = is_call ? Frame::Kind::kSubscript : Frame::Kind::kList;
      break;
    default:
      frame.kind = Frame::Kind::kBrace;
      break;
  }
  if (frame.kind == Frame::Kind::kGroup && around.names == Frame::Names::kParameters) {
    frame.kind = Frame::Kind::kParameterTuple;
    frame.names = Frame::Names::kParameters;
    frame.inner = around.inner;
  } else if (frame.kind == Frame::Kind::kGroup || frame.kind == Frame::Kind::kList) {
    if (frame.kind == Frame::Kind::kGroup) frame.position = around.position;
    frame.collects = around.collects;
  }
  frame.outer = scope_;
  frame.flags = flags_;
  frame.quiet = quiet_;
  frame.candidates = frame.target = static_cast<uint32_t>(candidates_.size());
  if (!knows_comprehensions_) {
    knows_comprehensions_ = true;
    FindComprehensions({at_, end_});
  }
  if (next_comprehension_ < comprehensions_.size() && comprehensions_[next_comprehension_] == at_) [[unlikely]] {
    ++next_comprehension_;
    frame.is_comprehension = true;
    frame.part = Frame::Part::kElement;
    frame.names = Frame::Names::kValues;
    frame.position = 0;
    frame.collects = false;
    frame.inner = scope_;
    // The list comprehension of 2.7 is no scope.
    if (!is_python2_ || code != tok::LSQB) {
      frame.inner = OpenScopeAt(NameScopeKind::kComprehension, kNoIndex, *at_);
      symbols_[frame.inner].is_generator = code == tok::LPAR;
      scope_ = frame.inner;
    }
  }
  frames_.push_back(frame);
  front_ = Front::kOperator;
  operand_ = kNoIndex;
}

void NameReader::Close() {
  PopLambdas();
  if (frames_.size() == base_ + 1) {
    // It closes nothing.
    front_ = Front::kValue;
    operand_ = kNoIndex;
    return;
  }
  const Frame frame = frames_.back();
  if (frame.part == Frame::Part::kTarget) EndTarget();
  PopFrame();
  const TokenCode next = NextCode();
  if (frames_.back().collects && candidates_.size() > frame.candidates && IsTrailer(next)) MakeReads(frame.candidates);
  front_ = Front::kValue;
  if (frame.kind != Frame::Kind::kGroup || !frame.is_plain || frame.is_comprehension) operand_ = kNoIndex;
  // What parentheses hold alone is called as without them.
  if (next == tok::LPAR && operand_ != kNoIndex && out_.occurrences[operand_].role == NameRole::kRead)
    out_.occurrences[operand_].role = NameRole::kCall;
}

void NameReader::Backquote() {
  const bool closes = front_ == Front::kValue;
  front_ = closes ? Front::kValue : Front::kOperator;
  operand_ = kNoIndex;
  frames_.back().is_plain = false;
}

// ---- what separates ----

bool NameReader::Colon(bool stops) {
  while (frames_.back().kind == Frame::Kind::kLambda) {
    Frame& lambda = frames_.back();
    if (!lambda.in_body) {
      lambda.in_body = true;
      lambda.names = Frame::Names::kValues;
      scope_ = lambda.inner;
      front_ = Front::kOperator;
      operand_ = kNoIndex;
      return false;
    }
    PopFrame();
    front_ = Front::kValue;
    operand_ = kNoIndex;
  }
  Frame& top = frames_.back();
  switch (top.kind) {
    case Frame::Kind::kBase:
      if (stops) return true;
      if (top.is_statement && top.collects) BeginVariableAnnotation();
      break;
    case Frame::Kind::kParameters:
      if (top.names == Frame::Names::kParameters) {
        top.names = Frame::Names::kValues;
        BeginHeadAnnotation();
      }
      break;
    case Frame::Kind::kTypeParameters:
      if (top.names == Frame::Names::kTypeParameters) {
        top.names = Frame::Names::kValues;
        OpenTypeParameterScope();
      }
      break;
    default:
      break;
  }
  front_ = Front::kOperator;
  operand_ = kNoIndex;
  frames_.back().is_plain = false;
  return false;
}

void NameReader::Equal() {
  PopLambdaBodies();
  Frame& top = frames_.back();
  const auto restore = [this, &top] {
    scope_ = top.outer;
    flags_ = top.flags;
    quiet_ = top.quiet;
  };
  switch (top.kind) {
    case Frame::Kind::kBase:
      if (top.in_annotation && top.is_statement) {
        restore();
        EndVariableAnnotation(true);
        top.in_annotation = false;
      } else if (top.collects && top.is_statement) {
        MakeWrites(top.candidates, NameRole::kWrite, 0);
      } else if (head_.kind == Head::Kind::kAlias && in_row_) {
        BeginHeadAnnotation();
      } else if (operand_ != kNoIndex && out_.occurrences[operand_].role == NameRole::kRead) {
        // Where no assignment may stand, as in the condition of a statement. A candidate ("del x = 1") is one no
        // longer, or its role would change twice.
        if (candidates_.empty() || candidates_.back() != operand_) candidates_.push_back(operand_);
        MakeWrites(static_cast<uint32_t>(candidates_.size()) - 1, NameRole::kWrite, 0);
      }
      break;
    case Frame::Kind::kLambda:
    case Frame::Kind::kParameterTuple:
      top.names = Frame::Names::kValues;
      break;
    case Frame::Kind::kParameters:
      top.names = Frame::Names::kValues;
      restore();
      break;
    case Frame::Kind::kTypeParameters:
      top.names = Frame::Names::kValues;
      OpenTypeParameterScope();
      break;
    case Frame::Kind::kBases:
      top.position = 0;
      break;
    default:
      break;
  }
}

// An assignment with an operation, or "->".
void NameReader::Assign(const Token& token) {
  PopLambdaBodies();
  Frame& top = frames_.back();
  if (top.kind != Frame::Kind::kBase) return;
  if (token.code == tok::RARROW && *token.text == '-') {
    if (head_.kind == Head::Kind::kFunction && in_row_) BeginHeadAnnotation();
  } else if (top.is_statement && top.collects) {
    MakeWrites(top.candidates, NameRole::kWrite, kNameAugmented);
    top.collects = false;
  }
}

void NameReader::Comma() {
  PopLambdaBodies();
  Frame& top = frames_.back();
  const auto restore = [this, &top] {
    scope_ = top.outer;
    flags_ = top.flags;
    quiet_ = top.quiet;
  };
  if (top.is_as_target) EndTarget();
  switch (top.kind) {
    case Frame::Kind::kLambda:
    case Frame::Kind::kParameterTuple:
      top.names = Frame::Names::kParameters;
      break;
    case Frame::Kind::kParameters:
      top.names = Frame::Names::kParameters;
      restore();
      break;
    case Frame::Kind::kTypeParameters:
      top.names = Frame::Names::kTypeParameters;
      scope_ = top.inner;
      break;
    case Frame::Kind::kBases:
      top.position = kNameBase;
      break;
    case Frame::Kind::kBase:
      // "except E, e" of 2.7 is what "except E as e" is.
      if (top.comma_is_as) {
        top.comma_is_as = false;
        As();
      }
      break;
    default:
      break;
  }
}

void NameReader::Lambda() {
  Frame frame;
  const Frame& around = frames_.back();
  frame.ends_at_if = around.kind == Frame::Kind::kLambda
                         ? around.ends_at_if
                         : around.part == Frame::Part::kFirstIterable || around.part == Frame::Part::kRest;
  frame.kind = Frame::Kind::kLambda;
  frame.names = Frame::Names::kParameters;
  frame.inner = OpenScopeAt(NameScopeKind::kLambda, kNoIndex, *at_);
  frame.outer = scope_;
  frame.flags = flags_;
  frame.quiet = quiet_;
  frame.candidates = frame.target = static_cast<uint32_t>(candidates_.size());
  frames_.push_back(frame);
}

// ---- loops and targets ----

void NameReader::For() {
  PopLambdas();
  Frame& top = frames_.back();
  if (top.part == Frame::Part::kTarget) EndTarget();
  if (top.is_comprehension) scope_ = top.inner;
  if (top.kind != Frame::Kind::kBase && !top.is_comprehension) return;
  top.target = static_cast<uint32_t>(candidates_.size());
  top.is_first_loop = top.is_comprehension && top.part == Frame::Part::kElement;
  top.part = Frame::Part::kTarget;
  top.collects = true;
}

void NameReader::In() {
  Frame& top = frames_.back();
  if (top.part != Frame::Part::kTarget || top.is_as_target) return;
  EndTarget();
  if (!top.is_comprehension) return;
  top.part = top.is_first_loop ? Frame::Part::kFirstIterable : Frame::Part::kRest;
  if (top.is_first_loop) scope_ = top.outer;
}

void NameReader::As() {
  PopLambdaBodies();
  Frame& top = frames_.back();
  if (top.part != Frame::Part::kNone || top.is_statement) return;
  top.part = Frame::Part::kTarget;
  top.is_as_target = true;
  top.collects = true;
  top.target = static_cast<uint32_t>(candidates_.size());
}

void NameReader::EndTarget() {
  Frame& top = frames_.back();
  MakeWrites(top.target, NameRole::kWrite, 0);
  top.part = Frame::Part::kNone;
  top.is_as_target = false;
  top.collects = false;
}

void NameReader::MakeWrites(uint32_t from, NameRole role, uint8_t flags) {
  for (size_t i = from; i < candidates_.size(); ++i) {
    Occurrence& target = out_.occurrences[candidates_[i]];
    target.role = role;
    target.flags |= flags;
    if (!target.has_symbol) continue;
    if (role == NameRole::kWrite) target.kind = NameKind::kVariable;
    Use(target.place, NameSymbol::kBound);
  }
  candidates_.resize(std::min<size_t>(from, candidates_.size()));
}

void NameReader::MakeReads(uint32_t from) {
  for (size_t i = from; i < candidates_.size(); ++i) {
    const Occurrence& read = out_.occurrences[candidates_[i]];
    if (read.has_symbol) MarkRead(read.place, read.text);
  }
  candidates_.resize(std::min<size_t>(from, candidates_.size()));
}

// ---- annotations ----

// Annotations that the version never evaluates say nothing of the scope they stand in; those of newer
// versions have a scope of their own.
void NameReader::BeginVariableAnnotation() {
  Frame& base = frames_.back();
  if (candidates_.size() == base.candidates + 1 && operand_ == candidates_.back()) {
    annotated_ = operand_;
    candidates_.pop_back();
  } else {
    MakeWrites(base.candidates, NameRole::kWrite, 0);
  }
  base.collects = false;
  base.in_annotation = true;
  flags_ |= kNameAnnotation;
  if ((has_future_annotations_ && version_.AtLeast(3, 10)) ||
      (version_.AtLeast(3, 14) && symbols_.IsFunctionLike(scope_))) {
    quiet_ = scope_;
  } else if (version_.AtLeast(3, 14)) {
    const uint32_t around = scope_;
    if (symbols_.AnnotationScope(around) == kNoIndex) {
      const uint32_t opened = OpenScopeAt(NameScopeKind::kAnnotation, kNoIndex, *at_);
      symbols_[opened].sees_class = out_.scopes[around].kind == NameScopeKind::kClass;
      symbols_.AnnotationScope(around) = opened;
    }
    scope_ = symbols_.AnnotationScope(around);
  }
}

void NameReader::EndVariableAnnotation(bool has_value) {
  if (annotated_ == kNoIndex) return;
  Occurrence& target = out_.occurrences[annotated_];
  annotated_ = kNoIndex;
  target.role = has_value ? NameRole::kWrite : NameRole::kDefinition;
  if (!target.has_symbol) return;
  target.kind = NameKind::kVariable;
  // A name in parentheses is an expression, and evaluated alone.
  const bool is_simple = target.begin == OffsetOf(*statement_begin_);
  if (is_simple) Use(target.place, NameSymbol::kBound | NameSymbol::kAnnotated);
  if (has_value) Use(target.place, NameSymbol::kBound);
}

// Of a parameter or of what a function returns, or the value of a type alias.
void NameReader::BeginHeadAnnotation() {
  const uint32_t around = head_.type_scope != kNoIndex ? head_.type_scope : head_.outer;
  const auto open_scope = [&] {
    scope_ = around;
    const uint32_t opened = OpenScopeAt(NameScopeKind::kAnnotation, head_.name, *at_);
    symbols_[opened].sees_class = out_.scopes[around].kind == NameScopeKind::kClass || out_.scopes[around].sees_class;
    head_.annotation_scope = opened;
  };
  if (head_.kind == Head::Kind::kAlias) {
    if (head_.annotation_scope == kNoIndex) open_scope();
    scope_ = head_.annotation_scope;
    return;
  }
  flags_ |= kNameAnnotation;
  if (has_future_annotations_ && version_.AtLeast(3, 10)) {
    quiet_ = scope_ = around;
  } else if (version_.AtLeast(3, 14)) {
    if (head_.annotation_scope == kNoIndex) open_scope();
    scope_ = head_.annotation_scope;
  } else {
    scope_ = around;
  }
}

// The bound of a type parameter, and its default, are evaluated late: each in a scope of its own.
void NameReader::OpenTypeParameterScope() {
  const uint32_t around = frames_.back().inner;
  scope_ = around;
  scope_ = OpenScopeAt(NameScopeKind::kAnnotation, head_.parameter, *at_);
  symbols_[scope_].sees_class = out_.scopes[around].sees_class;
  if (head_.parameter != kNoIndex) Use(symbols_.SymbolOf(around, head_.parameter), NameSymbol::kNamespace);
}

// ---- occurrences ----

uint32_t NameReader::OpenScopeAt(NameScopeKind kind, uint32_t name, const Token& token) {
  const bool is_listed = out_.scopes[scope_].is_listed && scope_ != quiet_;
  return symbols_.Open({kind, scope_, name, OffsetOf(token), is_listed});
}

uint32_t NameReader::Add(const Token& token, uint32_t text, NameRole role, NameKind kind, uint32_t flags,
                         uint32_t symbol) {
  Occurrence added{};
  added.begin = OffsetOf(token);
  added.text = text;
  added.place = symbol;
  added.role = role;
  added.kind = kind;
  added.flags = flags;
  added.has_symbol = 1;
  return Append(added);
}

uint32_t NameReader::AddWithoutSymbol(const Token& token, uint32_t text, NameRole role) {
  Occurrence added{};
  added.begin = OffsetOf(token);
  added.text = text;
  added.place = scope_;
  added.role = role;
  added.flags = flags_;
  return Append(added);
}

uint32_t NameReader::AddAttribute(const Token& token, uint32_t text, NameRole role, uint32_t flags, uint32_t receiver) {
  const auto index = static_cast<uint32_t>(out_.occurrences.size());
  const uint32_t distance = receiver != kNoIndex ? index - receiver : 0;
  Occurrence added{};
  added.begin = OffsetOf(token);
  added.text = text;
  added.place = scope_;
  added.role = role;
  added.flags = flags;
  added.is_attribute = 1;
  added.receiver_distance = distance <= Occurrence::kMaxReceiverDistance ? distance : 0;
  return Append(added);
}

uint32_t NameReader::AddBound(const Token& token, uint32_t text, NameRole role, NameKind kind, uint16_t use,
                              uint32_t scope) {
  const uint32_t symbol = symbols_.SymbolOf(scope, text);
  Use(symbol, use);
  return Add(token, text, role, kind, flags_, symbol);
}

void NameReader::MarkSuper() {
  if (is_python2_ || !symbols_.IsFunctionLike(scope_) || IsQuiet()) return;
  Use(symbols_.SymbolOf(scope_, texts_.NumberOf("__class__")), NameSymbol::kRead);
}

}  // namespace quillet
