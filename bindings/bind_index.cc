// The index of a repository: questions as formats of a batch, and the bytes that say which files to ask.
//
// Everything here takes bytes that Python read or that a batch wrote; no file is touched.
#include <nanobind/stl/string.h>
#include <nanobind/stl/vector.h>

#include <new>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "bindings/batch_format.h"
#include "bindings/bindings.h"
#include "bindings/buffer_text.h"
#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "bindings/signals.h"
#include "foundations/errors.h"
#include "foundations/stop.h"
#include "index/answer_lines.h"
#include "index/counts.h"
#include "index/current_files.h"
#include "index/name_index.h"
#include "index/places.h"
#include "index/question.h"
#include "index/words.h"

namespace quillet::host {

namespace {

// ---- questions ----

struct QuestionObject : BatchFormat {
  Question question;
};

QuestionObject MakeQuestion(const std::string& match, nb::handle name, Uses uses, bool returns, nb::handle scope,
                            bool with_lines) {
  QuestionObject made;
  Question& question = made.question;
  question.match = match == "exact"    ? Question::Match::kExact
                   : match == "suffix" ? Question::Match::kSuffix
                   : match == "glob"   ? Question::Match::kGlob
                                       : Question::Match::kEverything;
  question.name = HostText::FromStr(name).text();
  question.uses = uses;
  question.returns = returns;
  question.has_scope = !scope.is_none();
  if (question.has_scope) question.scope = HostText::FromStr(scope).text();
  made.make = [question, with_lines](Version version) {
    return MakeQuestionWriter(question, version, MakeAnswerBytes(with_lines));
  };
  return made;
}

BatchFormat MakeLinesFormat(const QuestionObject& asked, const std::string& form, bool colours, nb::handle folder) {
  using Form = AnswerLinesOptions::Form;
  AnswerLinesOptions options;
  options.form = form == "places" ? Form::kPlaces
                 : form == "long" ? Form::kLong
                 : form == "json" ? Form::kJson
                                  : Form::kNone;
  options.colours = colours;
  options.folder = HostText::FromBytes(folder).text();
  return {[question = asked.question, options](Version version) {
    return MakeQuestionWriter(question, version, MakeAnswerLines(options));
  }};
}

// The number of places, and the bytes.
nb::tuple LinesOf(nb::handle written) {
  const BufferText buffer(written);
  const std::optional<AnswerLines> lines = ReadAnswerLines(buffer.text());
  if (!lines) ThrowError(ErrorKind::kValueError, "these are no lines of answers");
  return nb::make_tuple(lines->place_count, BytesOf(lines->lines));
}

nb::object Checked(PyObject* made) {
  if (made == nullptr) throw nb::python_error();
  return nb::steal(made);
}

// str of a text, the object of the text before where it is the same one: answers of a file repeat theirs.
class ShownText {
 public:
  const nb::object& operator()(Text text) {
    if (!object_.is_valid() || text != text_) {
      object_ = Checked(PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "backslashreplace"));
      text_ = text;
    }
    return object_;
  }

 private:
  Text text_;
  nb::object object_;
};

// The answers of a file as tuples (path, line, column, scope, name, kind, detail, is_parameter, opens, role,
// flags), and
// for each of them its source line as bytes where lines were asked for.
nb::object KindOf(const Answer& answer, const nb::tuple& kinds) {
  if (answer.is_record || answer.kind != RecordKind::kOther) return kinds[static_cast<size_t>(answer.kind)];
  return StrOf(KindWordOf(answer));
}

nb::object RoleOf(const Answer& answer) {
  return answer.role == 0 ? nb::object(nb::none()) : StrOf(NameRoleWords()[answer.role - 1u]);
}

nb::tuple Answers(nb::handle written, nb::object path, const nb::tuple& kinds) {
  if (kinds.size() != RecordKindWords().size()) ThrowError(ErrorKind::kValueError, "an object a kind is needed");
  const BufferText buffer(written);
  nb::list rows;
  nb::list lines;
  ShownText scopes, names, details;
  Text line_text;
  nb::object line_object;
  const bool done = ReadAnswers(buffer.text(), [&](const Answer& answer, Text line) {
    rows.append(nb::make_tuple(path, answer.line, answer.column, scopes(answer.scope), names(answer.name),
                               KindOf(answer, kinds), details(answer.detail), answer.is_parameter, answer.opens,
                               RoleOf(answer), answer.flags));
    if (line.data() == nullptr) return;
    if (!line_object.is_valid() || line.data() != line_text.data()) {
      line_text = line;
      line_object = Checked(PyBytes_FromStringAndSize(line.data(), static_cast<Py_ssize_t>(line.size())));
    }
    lines.append(line_object);
  });
  if (!done) ThrowError(ErrorKind::kValueError, "these are no answers");
  return nb::make_tuple(rows, lines);
}

// ---- the index ----

struct IndexObject {
  nb::bytes bytes;
  NameIndex index;

  explicit IndexObject(nb::bytes given) : bytes(std::move(given)), index(Text(bytes.c_str(), bytes.size())) {}
};

const char* WordOf(NameIndex::State state) {
  switch (state) {
    case NameIndex::State::kFine:
      return "fine";
    case NameIndex::State::kForeign:
      return "foreign";
    case NameIndex::State::kOtherSchema:
      return "other schema";
    case NameIndex::State::kDamaged:
      break;
  }
  return "damaged";
}

nb::tuple FileOf(const IndexObject& self, size_t number, uint64_t size) {
  const IndexedFile& file = self.index[number];
  return nb::make_tuple(number, BytesOf(file.path), size, file.time, file.hash, file.lines, file.records, file.errors,
                        file.problem.empty() ? nb::object(nb::none()) : StrOf(file.problem));
}

nb::list FilesOf(const IndexObject& self) {
  nb::list files;
  for (size_t i = 0; i < self.index.size(); ++i) files.append(FileOf(self, i, self.index[i].size));
  return files;
}

Places MakePlaces(nb::handle base, nb::handle roots) {
  std::vector<std::string> texts;
  for (nb::handle root : nb::borrow<nb::tuple>(TupleOf(roots))) texts.emplace_back(HostText::FromBytes(root).text());
  return {std::string(HostText::FromBytes(base).text()), std::move(texts)};
}

nb::list FilesIn(const IndexObject& self, Places& places) {
  nb::list files;
  for (size_t i = 0; i < self.index.size(); ++i) {
    const std::optional<std::string> path = places.PathOf(self.index[i].path);
    if (path && places.Holds(*path)) files.append(FileOf(self, i, self.index[i].size));
  }
  return files;
}

size_t CountOutside(const IndexObject& self, const Places& places) {
  size_t outside = 0;
  for (size_t i = 0; i < self.index.size(); ++i) outside += !places.PathOf(self.index[i].path);
  return outside;
}

CurrentFiles WalkRoots(nb::handle roots, bool gitignore, nb::handle exclude) {
  std::vector<IndexRoot> walked;
  for (nb::handle pair : nb::borrow<nb::tuple>(TupleOf(roots))) {
    const auto texts = nb::borrow<nb::tuple>(TupleOf(pair));
    if (texts.size() != 2) ThrowError(ErrorKind::kValueError, "a root is a path and what the index has for it");
    walked.push_back(
        {std::string(HostText::FromBytes(texts[0]).text()), std::string(HostText::FromBytes(texts[1]).text())});
  }
  const std::string patterns(HostText::FromBytes(exclude).text());
  const Unlocked unlocked;
  const ThreadStopQuestion signals(HandlesSignals());
  return {walked, gitignore, patterns};
}

nb::list CandidatesIn(const IndexObject& self, const QuestionObject& question, const CurrentFiles& current,
                      Places& places) {
  nb::list files;
  for (const CandidateFile& file : CandidatesFor(self.index, WordsNeededBy(question.question), current, places)) {
    files.append(file.number != CandidateFile::kUnknown
                     ? FileOf(self, file.number, file.size)
                     : nb::make_tuple(self.index.size(), BytesOf(file.stored), file.size, 0, 0, 0, 0, 0, nb::none()));
  }
  return files;
}

// The number of its records.
uint32_t AddFile(NameIndexWriter& self, nb::handle path, uint64_t size, int64_t time, uint32_t lines, uint32_t errors,
                 nb::handle problem, nb::handle words) {
  IndexedFile file;
  file.path = HostText::FromBytes(path).text();
  file.size = size;
  file.time = time;
  file.lines = lines;
  file.errors = errors;
  if (!problem.is_none()) file.problem = HostText::FromStr(problem).text();
  const BufferText buffer(words);
  const std::optional<uint32_t> records = self.Add(std::move(file), buffer.text());
  if (!records) ThrowError(ErrorKind::kValueError, "these are no words of a file");
  return *records;
}

}  // namespace

void BindIndex(nb::module_& tarvex) {
  nb::module_ host = SiblingModule(tarvex, "host");
  nb::class_<BatchFormat>(host, "Format", "What a batch writes of its files.");
  nb::class_<QuestionObject, BatchFormat>(host, "Question", "A question for a name, as a format of a batch.");
  host.def("MakeQuestion", &MakeQuestion, nb::arg("match"), nb::arg("name"), nb::arg("uses"), nb::arg("returns"),
           nb::arg("scope").none(), nb::arg("with_lines"));
  host.def("LinesFormat", &MakeLinesFormat, nb::arg("question"), nb::arg("form"), nb::arg("colours"), nb::arg("folder"),
           "The answers of a question as places, long, json, or none at all.");
  host.def("LinesOf", &LinesOf, nb::arg("written"), "The number of places, and the lines of them.");
  host.def("WordsFormat", [] { return BatchFormat{MakeWordsWriter}; });
  host.def("Answers", &Answers, nb::arg("written"), nb::arg("path"), nb::arg("kinds"),
           "The answers that a question wrote of a file, and their source lines.");
  nb::class_<Places>(host, "Places", "The folders whose files may be shown, by absolute paths.")
      .def(
          "__init__",
          [](Places* self, nb::handle base, nb::handle roots) { new (self) Places(MakePlaces(base, roots)); },
          nb::arg("base"), nb::arg("roots"));
  nb::class_<CurrentFiles>(host, "CurrentFiles", "The files of an index as they are now.")
      .def(
          "__init__",
          [](CurrentFiles* self, nb::handle roots, bool gitignore, nb::handle exclude) {
            new (self) CurrentFiles(WalkRoots(roots, gitignore, exclude));
          },
          nb::arg("roots"), nb::arg("gitignore"), nb::arg("exclude"),
          "Walks. Roots are tuples of a path and what the index has for it, or in front of what is below it.");
  host.def(
      "HashOfSource", [](nb::handle source) { return HashOfBytes(BufferText(source).text()); }, nb::arg("source"));
  nb::dict bits;
  for (size_t i = 0; i < RecordKindWords().size(); ++i)
    bits[StrOf(RecordKindWords()[i])] = UseOfKind(static_cast<RecordKind>(i));
  nb::dict role_bits;
  for (size_t i = 0; i < NameRoleWords().size(); ++i)
    role_bits[StrOf(NameRoleWords()[i])] = UseOfRole(static_cast<NameRole>(i));
  bits["parameter"] = kParameterUse;
  bits["decorator"] = kDecoratorUse;
  bits["base"] = kBaseUse;
  bits["annotation"] = kAnnotationUse;
  bits["raise"] = kRaiseUse;
  bits["define"] = kDefineUse;
  bits["all"] = kAllUses;
  host.attr("USES") = bits;
  host.attr("ROLE_USES") = role_bits;

  host.def("CountsFormat", [] { return BatchFormat{[](Version) { return MakeCountsWriter(); }}; });
  nb::class_<RecordCounts>(host, "RecordCounts", "The sum of what the counts format wrote of files.")
      .def(nb::init<>())
      .def(
          "Add",
          [](RecordCounts& self, nb::handle written) {
            const BufferText buffer(written);
            if (!self.Add(buffer.text())) ThrowError(ErrorKind::kValueError, "these are no counts of a file");
          },
          nb::arg("written"))
      .def_prop_ro("kinds", [](const RecordCounts& self) { return self.kinds(); })
      .def(
          "MostUsed",
          [](const RecordCounts& self, size_t count) {
            nb::list found;
            for (const auto& [name, number] : self.MostUsed(count)) found.append(nb::make_tuple(StrOf(name), number));
            return found;
          },
          nb::arg("count"));

  nb::class_<IndexObject>(host, "NameIndex", "The bytes of an index. ValueError for what is none, or damaged.")
      .def(nb::init<nb::bytes>(), nb::arg("data"))
      .def_static(
          "StateOf",
          [](const nb::bytes& data) {
            return WordOf(NameIndex::StateOf({data.c_str(), data.size()}));
          },
          nb::arg("data"), "fine, foreign, other schema or damaged.")
      .def_prop_ro("settings", [](const IndexObject& self) { return BytesOf(self.index.settings()); })
      .def("Files", &FilesOf, "Tuples (number, path, size, time, hash, lines, records, errors, problem) by path.")
      .def("FilesIn", &FilesIn, nb::arg("places"), "The files that may be shown.")
      .def("Outside", &CountOutside, nb::arg("places"), "How many files have paths that lead elsewhere.")
      .def(
          "CandidatesIn", &CandidatesIn, nb::arg("question"), nb::arg("current"), nb::arg("places"),
          "The files that may answer as they are now, each with its size of now; the number of one that the index does "
          "not know is that of its files.")
      .def(
          "WordsOf",
          [](const IndexObject& self, size_t number) {
            if (number >= self.index.size()) ThrowError(ErrorKind::kIndexError, "there is no such file");
            nb::list words;
            self.index.ForEachWordOf(number, [&](uint32_t word, Uses uses) {
              words.append(nb::make_tuple(StrOf(self.index.words()[word].word), uses));
            });
            return words;
          },
          nb::arg("number"), "The words of a file, each with its uses.")
      .def(
          "FilesFor",
          [](const IndexObject& self, const QuestionObject& question) {
            return self.index.FilesFor(WordsNeededBy(question.question));
          },
          nb::arg("question"), "The numbers of the files that may hold an answer.")
      .def(
          "WordsAlike",
          [](const IndexObject& self, nb::handle text) {
            const HostText wanted = HostText::FromStr(text);
            nb::list found;
            for (const Text word : WordsAlike(self.index.words(), wanted.text())) found.append(StrOf(word));
            return found;
          },
          nb::arg("pattern"), "The words that differ from it by the case of letters alone; it may have * and ?.");

  nb::class_<NameIndexWriter>(host, "NameIndexWriter", "Makes the bytes of an index from files in any order.")
      .def(nb::init<>())
      .def("Add", &AddFile, nb::arg("path"), nb::arg("size"), nb::arg("time"), nb::arg("lines"), nb::arg("errors"),
           nb::arg("problem").none(), nb::arg("words"))
      .def(
          "Keep",
          [](NameIndexWriter& self, const IndexObject& index, size_t number, uint64_t size, int64_t time) {
            if (number >= index.index.size()) ThrowError(ErrorKind::kIndexError, "there is no such file");
            self.Keep(index.index, number, size, time);
          },
          nb::arg("index"), nb::arg("number"), nb::arg("size"), nb::arg("time"), nb::keep_alive<1, 2>(),
          "Takes over a file of an index.")
      .def(
          "KeepAll",
          [](NameIndexWriter& self, const IndexObject& index, nb::handle files) {
            for (nb::handle file : nb::borrow<nb::tuple>(TupleOf(files))) {
              const nb::tuple row(nb::borrow<nb::tuple>(TupleOf(file)));
              if (row.size() != 3) ThrowError(ErrorKind::kValueError, "a file is its number, size and time");
              const auto number = nb::cast<size_t>(row[0]);
              if (number >= index.index.size()) ThrowError(ErrorKind::kIndexError, "there is no such file");
              self.Keep(index.index, number, nb::cast<uint64_t>(row[1]), nb::cast<int64_t>(row[2]));
            }
          },
          nb::arg("index"), nb::arg("files"), nb::keep_alive<1, 2>(),
          "Takes over files of an index: tuples of a number, a size and a time.")
      .def(
          "Finish",
          [](NameIndexWriter& self, nb::handle settings) {
            return BytesOf(self.Finish(HostText::FromBytes(settings).text()));
          },
          nb::arg("settings"), "The bytes of the index, with some bytes of the caller's.");
}

}  // namespace quillet::host
