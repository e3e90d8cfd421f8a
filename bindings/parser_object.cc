// What parsers and analyzers are made from, and the arguments that their operations share. See parser_object.h.
#include "bindings/parser_object.h"

#include "bindings/errors.h"
#include "bindings/node_ref.h"

namespace quillet::host {

std::string ResolveGrammarFile(nb::handle grammar_file) {
  nb::object path = nb::borrow(grammar_file);
  if (!nb::cast<bool>(nb::module_::import_("os.path").attr("isabs")(path))) {
    path = nb::module_::import_("quillet.config").attr("GetNorvaFilename")(nb::str("resources/pgen-grammars/") + path);
  }
  nb::object bytes = nb::module_::import_("os").attr("fsencode")(path);
  return std::string(HostText::FromBytes(bytes).text());
}

TokenNames HostTokenNames() {
  constexpr Text kPrefix = "kTokenId_";
  TokenNames names = TokenNames::Default();
  for (auto [key, value] : nb::borrow<nb::dict>(nb::module_::import_("quillet._fastaccess").attr("__dict__"))) {
    const HostText name = HostText::FromStr(key);
    if (name.text().starts_with(kPrefix))
      names.name2number[std::string(name.text().substr(kPrefix.size()))] = Int32Of(value);
  }
  return names;
}

KindsByName HostKindsByState() {
  KindsByName kinds;
  const nb::object table = nb::type<ParserObject>().attr("kClsForState");
  if (!PyDict_Check(table.ptr())) ThrowExpected("dict", table);
  for (auto [name, cls] : nb::borrow<nb::dict>(table)) {
    const NodeKind kind = cls.is_none() ? NodeKind::kCExpression : KindOfClass(cls);
    kinds.emplace_back(std::string(HostText::FromStr(name).text()), kind);
  }
  return kinds;
}

std::vector<std::string> KeywordList(nb::handle keyword_seq, nb::object& dict) {
  nb::object sequence =
      keyword_seq.is_none() ? nb::object(nb::module_::import_("keyword").attr("kwlist")) : nb::borrow(keyword_seq);
  nb::dict words;
  std::vector<std::string> keywords;
  for (nb::handle word : nb::iter(sequence)) {
    const HostText text = HostText::FromStrOrBytes(word);
    keywords.emplace_back(text.text());
    words[StrOf(text.text())] = nb::none();
  }
  dict = words;
  return keywords;
}

nb::object NewParserObject(std::shared_ptr<CPGenParserImpl> parser, nb::object version_triple, nb::object keywords) {
  ParserObject object;
  object.parser = std::move(parser);
  object.version_triple = std::move(version_triple);
  object.keywords = std::move(keywords);
  return nb::cast(std::move(object));
}

TokensArg::TokensArg(nb::handle toks) : source(SourceOfTokens(TupleOf(toks))) {}

PositionsArg::PositionsArg(nb::handle positions) : is_none(positions.is_none()) {
  if (is_none) return;
  positions_ = PositionsOf(TupleOf(positions));
  view_ = PositionView(positions_);
}

const PositionView& PositionsArg::Required() const {
  if (is_none) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
  return view_;
}

}  // namespace quillet::host
