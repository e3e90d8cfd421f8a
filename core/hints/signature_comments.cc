// Types of a function in comments: one for the whole signature, "# type: (int, str) -> bool", behind
// the head or on the first line of the body, or one behind each parameter of a head of many rows.
//
// A signature is no expression. It is rewritten into the head of a function whose parameters have
// dummy names, "def function (a: int, a: str) -> bool:", and parsed by the hint parser; for each
// token of the rewritten list its offset in the hint is kept, which maps an error back. Types are
// paired with the real parameters strictly by position.
#include "foundations/errors.h"
#include "hints/hint_walker.h"
#include "tokens/string_tokenizer.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

constexpr Text kSignatureFront = "def function ";
constexpr Token kDummyName{"a", 1, tok::NAME};
constexpr Token kDummyColon{":", 1, tok::COLON};

std::string SignatureText(Text hint) { return std::string(kSignatureFront).append(hint).append(1, ':'); }

using CopiedRecords = std::vector<std::pair<std::string, std::string>>;

// Names of the real function's parameters, in order, as the general walker recorded them; false
// where the host sees no list of parameters at all. A host may clear its line before the names are
// used, so they are those of copies in `copied`; otherwise they tell where they stand in the source.
bool ParameterNames(LogicalLine& logical, CopiedRecords& copied, std::vector<Text>& names) {
  const auto add = [&names](Text name, Text info) {
    if (info == kSetPrefix) names.push_back(name);
  };
  if (logical.hooks == nullptr) {
    for (const Record& record : logical.arg_type_equivs()) add(record.name(), record.info());
    return !logical.arg_type_equivs().empty();
  }
  const bool is_host_list = logical.hooks->GetHostArgRecords(logical, copied);
  if (!is_host_list)
    for (const Record& record : logical.arg_type_equivs()) copied.emplace_back(record.name(), record.info());
  for (const auto& [name, info] : copied) add(name, info);
  return is_host_list || !copied.empty();
}

// Whether a list of parameters can hold an annotation: only annotated parameters (and tuples of the
// older grammar) are nodes of this class.
bool MayHaveAnnotations(const CParametersNode* parameters) {
  for (const CNode* child : parameters->fChildren()) {
    if (isa<CFunctionParameterDef>(child)) return true;
    if (!isa<CDefiningArglistNode>(child)) continue;
    for (const CNode* parameter : child->fChildren())
      if (isa<CFunctionParameterDef>(parameter)) return true;
  }
  return false;
}

}  // namespace

bool CTypeHintWalker::VisitFuncdefStmt(CNode* node) {
  const CFuncdefStmt* funcdef = cast<CFuncdefStmt>(node);
  CParametersNode* parameters = funcdef->GetParameters();
  if (fCommentHintCount != 0 || MayHaveAnnotations(parameters)) {
    for (const ArgEntry& entry : GetDefiningArgInfoList(parameters)) {
      if (entry.is_list) continue;
      if (entry.arg.type_expr != nullptr)
        ProcessNameAndHintNodes(entry.arg.name, entry.arg.type_expr, true);
      else if (entry.arg.name != nullptr)
        ProcessArgSpecificComment(entry.arg);
    }
  }
  if (CNode* returned = funcdef->GetReturnType(); returned != nullptr && GetHintInfoStr(returned, info_buffer_))
    AddSymInfo("return", info_buffer_, true);
  // After the annotations, so that a comment adds to what they gave.
  const Hint hint = FindEndingTypeComment(node);
  if (hint.found) ProcessFuncdefComment(hint.text, hint.tok_i, fLogical, true);
  return false;
}

// The comment right behind a parameter, or behind the comma that follows it.
void CTypeHintWalker::ProcessArgSpecificComment(const CArgInfo& arg) {
  if (arg.name == nullptr || fCommentHintCount == 0) return;
  LogicalLine& logical = RequireLogical();
  const int64_t count = static_cast<int64_t>(logical.toks.size());
  int64_t i = GetTokenEndIndex(arg.value != nullptr ? arg.value : arg.type_expr != nullptr ? arg.type_expr : arg.name);
  if (i >= count) return;
  if (logical.GetTokType(i) == tok::COMMA && ++i >= count) return;
  if (logical.GetTokType(i) != tok::COMMENT) return;
  std::string hint;
  if (!GetHintFromComment(logical.toks[static_cast<size_t>(i)].view(), hint)) return;
  CNode* hint_node = ParseHint(hint, static_cast<int32_t>(i), true);
  if (hint_node == nullptr) return;
  UseHintTree(hint_node, [&] { ProcessNameAndHintNodes(arg.name, hint_node, true); });
}

CTypeHintWalker::Signature CTypeHintWalker::RewriteSignature(Text text) {
  Signature signature;
  const auto add = [&signature](const Token& token, int64_t offset) {
    signature.tokens.push_back(token);
    signature.utf8_offsets.push_back(offset);
  };
  CStringTokenizer tokenizer(text);
  int64_t paren_depth = 0;
  int64_t tok_count = 0;
  TokenCode prev_code = tok::REMOVED;
  for (; !tokenizer.AtEnd(); tokenizer.Advance(), ++tok_count) {
    const TokenCode code = tokenizer.CurrentCode();
    const Token token{text.data() + tokenizer.Offset(), static_cast<uint32_t>(tokenizer.Current().size()), code};
    const int64_t offset = tokenizer.Offset() - static_cast<int64_t>(kSignatureFront.size());
    bool is_kept = true;
    if (code == tok::LPAR) {
      ++paren_depth;
    } else if (code == tok::RPAR) {
      --paren_depth;
    } else if (paren_depth == 1 && tokenizer.BracketDepth() == 1) {
      // The form "(...)": parameters that the hint says nothing of.
      is_kept = !(code == tok::ELLIPSIS && prev_code == tok::LPAR && tok_count == 3);
      if (is_kept && (prev_code == tok::LPAR || prev_code == tok::COMMA)) {
        add(kDummyName, offset);
        add(kDummyColon, offset);
      }
    }
    if (is_kept) add(token, offset);
    prev_code = code;
  }
  return signature;
}

CTypeHintWalker::RewrittenHint CTypeHintWalker::RewriteFuncdefCommentHint(Text hint) {
  const std::string text = SignatureText(hint);
  const Signature signature = RewriteSignature(text);
  RewrittenHint rewritten;
  rewritten.utf8_offsets = signature.utf8_offsets;
  for (const Token& token : signature.tokens) rewritten.tokens.emplace_back(token.view());
  return rewritten;
}

// The tree is not walked as a whole, since it holds the dummy names.
CNode* CTypeHintWalker::ParseFuncdefCommentHint(Text hint, int32_t tok_i) {
  const Signature signature = RewriteSignature(KeepText(SignatureText(hint)));
  try {
    return hint_parser_->ParseTokenListToNode(signature.tokens, false);
  } catch (const ParseError& error) {
    const int64_t last = static_cast<int64_t>(signature.utf8_offsets.size()) - 1;
    const int64_t index = std::max<int64_t>(std::min<int64_t>(last, error.context.value), 0);
    RaiseHintSyntaxError(tok_i, signature.utf8_offsets.at(static_cast<size_t>(index)));
  }
}

void CTypeHintWalker::ProcessFuncdefComment(Text hint, int32_t tok_i, LogicalLine* funcdef_logical, bool is_arg) {
  if (complete_parser_ != nullptr) return ProcessSignatureCompletely(hint, tok_i, funcdef_logical, is_arg);
  CNode* node = ParseFuncdefCommentHint(hint, tok_i);
  if (node == nullptr) return;
  if (!isa<CFuncdefStmt>(node)) return hint_parser_->DiscardNode(node);
  UseHintTree(node, [&] {
    const CFuncdefStmt* signature = cast<CFuncdefStmt>(node);
    CopiedRecords copied;
    std::vector<Text> real_names;
    const bool has_parameter_list = funcdef_logical == nullptr || ParameterNames(*funcdef_logical, copied, real_names);
    const auto record = [&](Text name, CNode* type_expr) {
      if (GetHintInfoStr(type_expr, info_buffer_)) AddSymInfo(name, info_buffer_, is_arg);
    };

    size_t i = 0;
    std::string dummy;
    for (const ArgEntry& entry : GetDefiningArgInfoList(signature->GetParameters())) {
      if (entry.is_list) continue;
      CNode* type_expr = entry.arg.type_expr;
      const size_t index = i++;
      if (type_expr == nullptr) continue;
      RequireGeneralWalker().Walk(type_expr, fLogical);
      if (!has_parameter_list) ThrowError(ErrorKind::kTypeError, "object of type 'NoneType' has no len()");
      if (index < real_names.size()) {
        record(real_names[index], type_expr);
      } else {
        dummy.clear();
        AppendArgInfo(static_cast<int64_t>(index), kNoText, dummy);
        record(dummy, type_expr);
      }
    }
    if (CNode* returned = signature->GetReturnType()) {
      RequireGeneralWalker().Walk(returned, fLogical);
      record("return", returned);
    }
  });
}

}  // namespace quillet
