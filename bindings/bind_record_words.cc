// Records in words, for the host API.
#include <algorithm>
#include <string>

#include "analysis/record_words.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "foundations/shown_text.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

// str of a record's text; what is no UTF-8 is shown by escapes.
nb::object Shown(Text text) {
  std::string shown;
  AppendShown(text, shown);
  return StrOf(shown);
}

nb::object DecodeRecord(Any name, Any info) {
  const HostText name_text = HostText::FromBytes(name);
  const HostText info_text = HostText::FromBytes(info);
  std::string buffer;
  const RecordInWords record = DecodeInfo(info_text.text(), buffer);
  const nb::object detail = Shown(record.detail);
  std::string shown(name_text.text());
  if (name_text.text().starts_with(kArgPrefix)) {
    shown.clear();
    AppendArgumentPlace(name_text.text(), shown);
  }
  return nb::make_tuple(Shown(shown), static_cast<int>(record.kind), detail);
}

nb::object DescribeRecord(Any kind, Any detail, bool is_parameter) {
  const HostText word = HostText::FromStr(kind);
  const HostText detail_text = HostText::FromStr(detail);
  const std::span<const Text> words = RecordKindWords();
  const auto found = std::find(words.begin(), words.end(), word.text());
  if (found == words.end()) ThrowError(ErrorKind::kValueError, "no kind of record");
  std::string phrase;
  AppendDescription({static_cast<RecordKind>(found - words.begin()), detail_text.text()}, is_parameter, phrase);
  return StrOf(phrase);
}

}  // namespace

void BindRecordWords(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::list words;
  for (const Text word : RecordKindWords()) words.append(StrOf(word));
  host.attr("RECORD_KIND_WORDS") = nb::tuple(words);
  host.def(
      "DecodeRecord", &DecodeRecord, nb::arg("name"), nb::arg("info"),
      "A record's name, the index of its kind in RECORD_KIND_WORDS and its detail, from the two halves as written.");
  host.def("DescribeRecord", &DescribeRecord, nb::arg("kind"), nb::arg("detail"), nb::arg("is_parameter"),
           "Kind and detail as a phrase that follows the name.");
}

}  // namespace quillet::host
