// The names of a source: every occurrence, the scopes and their symbols, bound without the interpreter
// lock and held as the core's numbers until Python reads them.
#include <nanobind/nanobind.h>
#include <nanobind/stl/unique_ptr.h>

#include <algorithm>
#include <string>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "bindings/names_object.h"
#include "bindings/signals.h"
#include "names/binder.h"

namespace quillet::host {

namespace {

// The questions in the order of their bits.
struct Question {
  const char* name;
  bool (Bindings::*answer)(const NameSymbol&) const;
};
constexpr Question kQuestions[] = {
    {"is_parameter", &Bindings::IsParameter},
    {"is_global", &Bindings::IsGlobal},
    {"is_declared_global", &Bindings::IsDeclaredGlobal},
    {"is_nonlocal", &Bindings::IsNonlocal},
    {"is_local", &Bindings::IsLocal},
    {"is_free", &Bindings::IsFree},
    {"is_imported", &Bindings::IsImported},
    {"is_assigned", &Bindings::IsAssigned},
    {"is_referenced", &Bindings::IsReferenced},
    {"is_annotated", &Bindings::IsAnnotated},
    {"is_namespace", &Bindings::IsNamespace},
};

size_t AnswersOf(const Bindings& bindings, const NameSymbol& symbol) {
  size_t answers = 0;
  for (size_t i = 0; i < std::size(kQuestions); ++i) answers |= size_t{(bindings.*kQuestions[i].answer)(symbol)} << i;
  return answers;
}

nb::object TruthOf(bool truth) { return nb::borrow(truth ? Py_True : Py_False); }

// An index, or None.
nb::object IndexOf(uint32_t index) {
  return index == kNoIndex ? nb::object(nb::none()) : nb::steal(PyLong_FromUnsignedLong(index));
}

// The host's code, which may run whenever an object is made, may have shortened the list.
nb::object ItemOf(const nb::list& list, size_t i) {
  if (i >= list.size()) ThrowError(ErrorKind::kValueError, "an object a symbol is needed");
  return nb::borrow(PyList_GET_ITEM(list.ptr(), static_cast<Py_ssize_t>(i)));
}

void CheckSymbols(const Bindings& bindings, const nb::list& symbols) {
  if (symbols.size() != bindings.symbols.size()) ThrowError(ErrorKind::kValueError, "an object a symbol is needed");
}

// Lines and columns of offsets that grow: one walk along the lines.
class Places {
 public:
  Places(const Bindings& bindings, uint32_t first_offset)
      : starts_(bindings.line_starts), line_(static_cast<size_t>(bindings.PositionOf(first_offset).line)) {}

  // From 1.
  Position Of(uint32_t offset) {
    while (line_ + 1 < starts_.size() && starts_[line_ + 1] <= offset) ++line_;
    const uint32_t start = line_ < starts_.size() ? std::min(starts_[line_], offset) : 0;
    return {static_cast<int32_t>(line_) + 1, static_cast<int32_t>(offset - start) + 1};
  }

 private:
  const std::vector<uint32_t>& starts_;
  size_t line_;
};

// NFKC by the host's own tables, which are those that the language goes by.
bool NormalFormOf(Text name, std::string& normal_form) {
  const Locked lock;
  try {
    const nb::object text = nb::steal(PyUnicode_DecodeUTF8(name.data(), static_cast<Py_ssize_t>(name.size()), nullptr));
    if (!text.is_valid()) throw nb::python_error();
    const nb::object normal = nb::module_::import_("unicodedata").attr("normalize")("NFKC", text);
    normal_form = HostText::FromStr(normal).text();
    return true;
  } catch (nb::python_error&) {
    return false;  // no UTF-8: such a name is what it is spelled
  }
}

std::unique_ptr<FileNames> BoundNames(nb::handle version, nb::handle source) {
  const HostText text = HostText::FromBytes(source);
  const Version language = VersionOf(version);
  if (text.text().size() > SourceText::kMaxSize) ThrowError(ErrorKind::kValueError, "the source is too large");
  std::shared_ptr<const Bindings> bindings;
  {
    const Unlocked unlocked;
    const ThreadStopQuestion signals(HandlesSignals());
    bindings = std::make_shared<Bindings>(NameBinder(language).Bind(text.text()));
  }
  return std::make_unique<FileNames>(std::move(bindings));
}

nb::tuple WordsOf(std::span<const Text> words) {
  nb::list list;
  for (const Text word : words) list.append(nb::steal(PyUnicode_InternFromString(std::string(word).c_str())));
  return nb::tuple(list);
}

}  // namespace

nb::list FileNames::Occurrences(size_t begin, size_t end, nb::handle row_class, const nb::tuple& roles,
                                const nb::tuple& kinds, const nb::tuple& flags, const nb::list& symbols) {
  CheckRowClass(row_class);
  if (roles.size() != NameRoleWords().size() || kinds.size() != NameKindWords().size() + 1 ||
      flags.size() != size_t{1} << NameFlagWords().size())
    ThrowError(ErrorKind::kValueError, "an object a role, a kind and a set of flags is needed");
  CheckSymbols(*bindings_, symbols);
  end = std::min(end, bindings_->occurrences.size());
  begin = std::min(begin, end);
  nb::list rows;
  if (begin == end) return rows;
  Places places(*bindings_, bindings_->occurrences[begin].begin);
  for (size_t i = begin; i < end; ++i) {
    const Occurrence& occurrence = bindings_->occurrences[i];
    const Position place = places.Of(occurrence.begin);
    const auto line = static_cast<size_t>(place.line), column = static_cast<size_t>(place.col);
    const uint32_t variable = bindings_->VariableOf(occurrence);
    TupleFiller row(row_class, 11);
    row.Add(texts_[occurrence.text]);
    row.Add(line);
    row.Add(column);
    row.Add(column + bindings_->TextOf(occurrence).size());
    row.Add(nb::borrow(roles[static_cast<size_t>(occurrence.role)]));
    row.Add(nb::borrow(kinds[static_cast<size_t>(occurrence.kind)]));
    row.Add(nb::borrow(flags[occurrence.flags]));
    row.Add(IndexOf(bindings_->ReceiverOf(static_cast<uint32_t>(i))));
    row.Add(TruthOf(occurrence.is_attribute));
    row.Add(size_t{bindings_->ScopeOf(occurrence)});
    row.Add(variable == kNoIndex ? nb::object(nb::none()) : ItemOf(symbols, variable));
    rows.append(row.Take());
  }
  return rows;
}

nb::list FileNames::Symbols() {
  nb::list rows;
  for (const NameSymbol& symbol : bindings_->symbols) {
    rows.append(nb::make_tuple(TextOf(symbol.name), symbol.scope, AnswersOf(*bindings_, symbol), symbol.is_listed,
                               symbol.variable));
  }
  return rows;
}

nb::list FileNames::Scopes(nb::handle row_class, const nb::tuple& kinds, const nb::list& symbols) {
  CheckRowClass(row_class);
  if (kinds.size() != NameScopeKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
  CheckSymbols(*bindings_, symbols);
  nb::list rows;
  for (const NameScope& scope : bindings_->scopes) {
    nb::list own;
    for (uint32_t i = scope.first_symbol; i != kNoIndex; i = bindings_->symbols[i].next) {
      if (bindings_->symbols[i].is_listed) own.append(ItemOf(symbols, i));
    }
    const Position first = bindings_->PositionOf(scope.begin);
    const Position last = bindings_->PositionOf(std::max(scope.end, scope.begin + 1) - 1);
    TupleFiller row(row_class, 10);
    row.Add(nb::borrow(kinds[static_cast<size_t>(scope.kind)]));
    row.Add(TextOf(scope.name));
    row.Add(IndexOf(scope.parent));
    row.Add(static_cast<size_t>(first.line) + 1);
    row.Add(static_cast<size_t>(last.line) + 1);
    row.Add(nb::tuple(own));
    row.Add(static_cast<size_t>(first.col) + 1);
    row.Add(static_cast<size_t>(last.col) + 2);
    row.Add(TruthOf(scope.has_star_import));
    row.Add(TruthOf(scope.is_listed));
    rows.append(row.Take());
  }
  return rows;
}

nb::tuple FileNames::OccurrencesOf(size_t symbol) {
  if (symbol >= bindings_->symbols.size()) ThrowError(ErrorKind::kIndexError, "no such symbol");
  if (!of_symbols_) of_symbols_.emplace(*bindings_);
  const std::span<const uint32_t> indices = of_symbols_->Of(static_cast<uint32_t>(symbol));
  TupleFiller tuple(&PyTuple_Type, static_cast<Py_ssize_t>(indices.size()));
  for (const uint32_t index : indices) tuple.Add(size_t{index});
  return nb::borrow<nb::tuple>(tuple.Take());
}

void BindNames(nb::module_& tarvex) {
  SetNameNormalizer(NormalFormOf);
  nb::module_ host = nb::borrow<nb::module_>(tarvex.attr("_host"));
  host.attr("NAME_ROLE_WORDS") = WordsOf(NameRoleWords());
  host.attr("NAME_KIND_WORDS") = WordsOf(NameKindWords());
  host.attr("NAME_SCOPE_KIND_WORDS") = WordsOf(NameScopeKindWords());
  host.attr("NAME_FLAG_WORDS") = WordsOf(NameFlagWords());
  nb::list questions;
  for (const Question& question : kQuestions) questions.append(question.name);
  host.attr("SYMBOL_QUESTIONS") = nb::tuple(questions);
  nb::class_<FileNames>(host, "FileNames", "The names of a source, as numbers.")
      .def_prop_ro("occurrence_count", [](const FileNames& self) { return self.bindings().occurrences.size(); })
      .def_prop_ro("byte_count", [](const FileNames& self) { return self.bindings().ByteSize(); })
      .def("Occurrences", &FileNames::Occurrences, nb::arg("begin"), nb::arg("end"), nb::arg("row_class"),
           nb::arg("roles"), nb::arg("kinds"), nb::arg("flags"), nb::arg("symbols"),
           "Occurrences from `begin` up to `end` as instances of a class that derives from tuple.")
      .def("Symbols", &FileNames::Symbols, "A tuple (name, scope, answers, is_listed, variable) a symbol.")
      .def("Scopes", &FileNames::Scopes, nb::arg("row_class"), nb::arg("kinds"), nb::arg("symbols"),
           "Scopes as instances of a class that derives from tuple.")
      .def("OccurrencesOf", &FileNames::OccurrencesOf, nb::arg("symbol"), "The indices of a symbol's occurrences.");
  host.def("bind_names", &BoundNames, nb::arg("version_triple"), nb::arg("source"),
           "Binds the names of a UTF-8 source, without the interpreter lock.");
}

}  // namespace quillet::host
