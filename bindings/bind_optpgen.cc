// The sibling module optpgen: the generator, its grammar object, and the engine over host objects.
//
// A parser of this module makes what the host asks for: raw tuples, or what a NodeConverter's
// convert gives. CPGenParserImpl has an engine of its own that makes nodes without a call.
#include <nanobind/stl/unique_ptr.h>

#include <memory>
#include <string>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/optpgen_host.h"
#include "grammar/engine.h"
#include "grammar/grammar.h"

namespace quillet::host {
namespace {

nb::object Checked(PyObject* made) {
  if (made == nullptr) throw nb::python_error();
  return nb::steal(made);
}

// ---- grammars ----

// The pairs of a dict as they are now: a number among them may be an object of the host's whose conversion changes it.
nb::list ItemsOf(nb::handle object) {
  if (!PyDict_Check(object.ptr())) ThrowExpected("dict", object);
  return nb::borrow<nb::list>(Checked(PyDict_Items(object.ptr())));
}

TokenNames TokenNamesOf(nb::handle tok_number2name, nb::handle op_text2number) {
  TokenNames names = TokenNames::Default();
  if (!tok_number2name.is_none()) {
    names.name2number.clear();
    for (nb::handle item : ItemsOf(tok_number2name))
      names.name2number[std::string(HostText::FromStr(item[1]).text())] = Int32Of(item[0]);
  }
  if (!op_text2number.is_none()) {
    names.op2number.clear();
    for (nb::handle item : ItemsOf(op_text2number))
      names.op2number[std::string(HostText::FromStr(item[0]).text())] = Int32Of(item[1]);
  }
  return names;
}

struct ParserGenerator {
  std::shared_ptr<const Grammar> grammar;
};

ParserGenerator Generate(nb::handle filename, nb::handle tok_number2name, nb::handle op_text2number) {
  const nb::object path = Checked(PyOS_FSPath(filename.ptr()));
  const HostText name = HostText::FromStrOrBytes(path);
  const TokenNames names = TokenNamesOf(tok_number2name, op_text2number);
  return {std::make_shared<const Grammar>(Grammar::Load(std::string(name.text()), names))};
}

nb::object Symbol2Number(GrammarObject& self) {
  if (!self.symbol2number.is_valid()) {
    nb::dict made;
    for (size_t i = 0; i < self.grammar->symbol_names.size(); ++i) {
      made[StrOf(self.grammar->symbol_names[i])] = Grammar::kFirstSymbol + static_cast<int>(i);
    }
    self.symbol2number = made;
  }
  return self.symbol2number;
}

nb::object Number2Symbol(GrammarObject& self) {
  if (!self.number2symbol.is_valid()) {
    nb::dict made;
    for (size_t i = 0; i < self.grammar->symbol_names.size(); ++i) {
      made[nb::int_(Grammar::kFirstSymbol + static_cast<int>(i))] = StrOf(self.grammar->symbol_names[i]);
    }
    self.number2symbol = made;
  }
  return self.number2symbol;
}

nb::list Labels(const GrammarObject& self) {
  nb::list labels;
  for (const Grammar::Label& label : self.grammar->labels) {
    labels.append(nb::make_tuple(label.token_type, label.keyword.empty() ? nb::none() : StrOf(label.keyword)));
  }
  return labels;
}

nb::dict Dfas(const GrammarObject& self) {
  nb::dict dfas;
  for (size_t i = 0; i < self.grammar->rules.size(); ++i) {
    nb::list states;
    for (const Grammar::State& state : self.grammar->rules[i].states) {
      nb::list arcs;
      for (const Grammar::Arc& arc : state.arcs) arcs.append(nb::make_tuple(arc.label, arc.target));
      states.append(nb::make_tuple(arcs, state.accepting));
    }
    dfas[nb::int_(Grammar::kFirstSymbol + static_cast<int>(i))] = states;
  }
  return dfas;
}

// ---- the engine over host objects ----

// What the builder has from the parser that it works for.
struct Conversion {
  PyObject* converter = nullptr;  // null: raw tuples
  PyObject* convert_name = nullptr;
  PyObject* value = nullptr;  // of the token being fed, as the host gave it
};

struct HostBuilder {
  struct Node {
    PyObject* object;
    int32_t context;  // of its first token, which an object of the host's need not tell
  };

  const Conversion* conversion;

  Node Leaf(int type, const Token&, int32_t context) { return Make(type, conversion->value, context, nb::none()); }

  Node Rule(int symbol, Node* children, uint32_t count) {
    const nb::object list = nb::steal(PyList_New(count));
    for (uint32_t i = 0; i < count; ++i) {
      if (list.is_valid()) {
        PyList_SET_ITEM(list.ptr(), i, children[i].object);
      } else {
        Py_DECREF(children[i].object);
      }
    }
    if (!list.is_valid()) throw nb::python_error();
    return Make(symbol, Py_None, children[0].context, list);
  }

  void Drop(Node node) { Py_DECREF(node.object); }

 private:
  Node Make(int type, PyObject* value, int32_t context, nb::handle children) {
    const nb::object number = Checked(PyLong_FromLong(type));
    const nb::object place = Checked(PyLong_FromLong(context));
    PyObject* made;
    if (conversion->converter == nullptr) {
      made = PyTuple_Pack(4, number.ptr(), value, place.ptr(), children.ptr());
    } else {
      PyObject* const arguments[] = {conversion->converter, number.ptr(), value, place.ptr(), children.ptr()};
      made = PyObject_VectorcallMethod(conversion->convert_name, arguments, std::size(arguments), nullptr);
    }
    return {Checked(made).release().ptr(), context};
  }
};

class HostParser {
 public:
  HostParser(std::shared_ptr<const Grammar> grammar, nb::handle converter, bool promote_single_child)
      : grammar_(std::move(grammar)), engine_(*grammar_, HostBuilder{&conversion_}, promote_single_child) {
    conversion_.convert_name = Checked(PyUnicode_InternFromString("convert")).release().ptr();
    if (!converter.is_none()) conversion_.converter = nb::borrow(converter).release().ptr();
  }
  HostParser(const HostParser&) = delete;
  HostParser& operator=(const HostParser&) = delete;
  ~HostParser() {
    ForgetConverter();
    Py_DECREF(conversion_.convert_name);
  }

  void Setup(nb::handle start) {
    const Busy busy(*this);
    engine_.Setup(Int32Of(start));
  }

  void AddToken(nb::handle type, nb::handle value, nb::handle context) {
    const Busy busy(*this);
    const int32_t number = Int32Of(type);
    const HostText text = HostText::FromStr(value, true);
    const Token token{text.text().data(), static_cast<uint32_t>(text.text().size()), tok::NAME};
    conversion_.value = value.ptr();
    engine_.AddToken(grammar_->Classify(number, text.text()), number, token, Int32Of(context));
  }

  nb::object Finish() {
    const Busy busy(*this);
    return nb::steal(engine_.Finish().object);
  }

  // A converter often has the parser it works for as a field.
  int Traverse(visitproc visit, void* arg) {
    Py_VISIT(conversion_.converter);
    return 0;
  }
  void ForgetConverter() { Py_CLEAR(conversion_.converter); }

 private:
  // One call at a time: a converter that calls the parser back, or another thread while it runs.
  class Busy {
   public:
    explicit Busy(HostParser& parser) : parser_(parser) {
      if (parser.busy_) ThrowError(ErrorKind::kRuntimeError, "the parser is in use");
      parser.busy_ = true;
    }
    ~Busy() { parser_.busy_ = false; }

   private:
    HostParser& parser_;
  };

  std::shared_ptr<const Grammar> grammar_;
  Conversion conversion_;
  bool busy_ = false;
  Engine<HostBuilder> engine_;
};

int TraverseEngine(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  return nb::inst_ready(self) ? nb::inst_ptr<HostParser>(self)->Traverse(visit, arg) : 0;
}

int ClearEngine(PyObject* self) {
  if (nb::inst_ready(self)) nb::inst_ptr<HostParser>(self)->ForgetConverter();
  return 0;
}

const PyType_Slot kEngineSlots[] = {
    {Py_tp_traverse, reinterpret_cast<void*>(TraverseEngine)},
    {Py_tp_clear, reinterpret_cast<void*>(ClearEngine)},
    {0, nullptr},
};

std::unique_ptr<HostParser> CreateParser(nb::handle grammar, nb::handle converter, Truth promote_single_child) {
  GrammarObject* tables;
  if (!nb::try_cast(grammar, tables) || tables == nullptr) ThrowExpected("Grammar", grammar);
  if (!converter.is_none() && !nb::isinstance<NodeConverter>(converter)) ThrowExpected("NodeConverter", converter);
  return std::make_unique<HostParser>(tables->grammar, converter, promote_single_child);
}

}  // namespace

void BindOptpgen(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "optpgen");

  nb::class_<GrammarObject>(m, "Grammar", "The tables of a grammar file.")
      .def_prop_ro("symbol2number", &Symbol2Number, "Rule name to number; rules are numbered from 256 on.")
      .def_prop_ro("number2symbol", &Number2Symbol, "The same the other way.")
      .def_prop_ro("labels", &Labels, "The terminals: (token type, keyword or None), by label number.")
      .def_prop_ro("dfas", &Dfas,
                   "By rule number the states of the rule: ([(label or rule number, next state)...], may end here).");

  nb::class_<ParserGenerator>(m, "ParserGenerator", "Reads a grammar file in pgen notation.")
      .def(
          "__init__",
          [](ParserGenerator* self, nb::handle filename, nb::handle tok_number2name, nb::handle op_text2number) {
            new (self) ParserGenerator(Generate(filename, tok_number2name, op_text2number));
          },
          nb::arg("filename"), nb::arg("tok_number2name") = nb::none(), nb::arg("op_text2number") = nb::none())
      .def(
          "make_grammar",
          [](const ParserGenerator& self) {
            return GrammarObject{self.grammar, {}, {}};
          },
          "The grammar object for CreateParser.");

  nb::class_<NodeConverter>(m, "NodeConverter", "Makes a node of each token and each rule of a parse.")
      .def(nb::init<>())
      .def(
          "convert",
          [](NodeConverter&, nb::handle, nb::handle, nb::handle, nb::handle) {
            ThrowError(ErrorKind::kNotImplementedError, "");
          },
          nb::arg("type"), nb::arg("value").none(), nb::arg("context").none(), nb::arg("children").none(),
          "The node of a token (children None) or of a rule (value None); a subclass says what that is.");

  nb::class_<HostParser>(m, "Parser", nb::type_slots(kEngineSlots), "Parses one input after the other.")
      .def("setup", &HostParser::Setup, nb::arg("start"), "Starts a new input at the rule with this number.")
      .def("addtoken", &HostParser::AddToken, nb::arg("type"), nb::arg("value").none(), nb::arg("context"),
           "Feeds one token; ParseError where it is not acceptable.")
      .def("finish", &HostParser::Finish, "The root; ParseError where the input is not complete.");

  m.def("CreateParser", &CreateParser, nb::arg("grammar").none(), nb::arg("converter").none(),
        nb::arg("promotesinglechild") = Truth{true},
        "A parser whose nodes the converter makes; without one they are tuples (type, value, context, children). "
        "With promotesinglechild a rule with a single child makes no node.");
}

}  // namespace quillet::host
