// See errors.h. The table from kinds to builtins is here, and the class optpgen.ParseError.
#include "bindings/errors.h"

#include <cstring>
#include <string>
#include <typeinfo>

#include "bindings/convert.h"
#include "bindings/line_class.h"
#include "bindings/signals.h"

namespace quillet::host {
namespace {

// Written in the host's language, since it is an ordinary exception of the host's with four
// attributes; the core's own ParseError has no behaviour of the host's to keep.
constexpr const char* kParseErrorSource = R"(
class ParseError(Exception):
    """A token that the grammar does not accept where it stands.

    `context` says where: the context with which the token was fed, usually its index in the line.
    """

    def __init__(self, msg, type, value, context):
        Exception.__init__(self, f"{msg}: type={type!r}, value={value!r}, context={context!r}")
        self.msg = msg
        self.type = type
        self.value = value
        self.context = context

    def __reduce__(self):
        return (self.__class__, (self.msg, self.type, self.value, self.context))
)";

PyObject* g_parse_error = nullptr;
// Between a host's raise and the end of the operation of the core that it ended.
thread_local PyObject* g_host_syntax_error = nullptr;

PyObject* BuiltinFor(ErrorKind kind) {
  switch (kind) {
    case ErrorKind::kTypeError:
      return PyExc_TypeError;
    case ErrorKind::kValueError:
    case ErrorKind::kGrammarError:
      return PyExc_ValueError;
    case ErrorKind::kIndexError:
      return PyExc_IndexError;
    case ErrorKind::kKeyError:
      return PyExc_KeyError;
    case ErrorKind::kAttributeError:
      return PyExc_AttributeError;
    case ErrorKind::kAssertionError:
      return PyExc_AssertionError;
    case ErrorKind::kOverflowError:
      return PyExc_OverflowError;
    case ErrorKind::kNotImplementedError:
      return PyExc_NotImplementedError;
    case ErrorKind::kOSError:
      return PyExc_OSError;
    case ErrorKind::kRuntimeError:
      return PyExc_RuntimeError;
    case ErrorKind::kRecursionError:
      return PyExc_RecursionError;
    case ErrorKind::kParseError:
      return g_parse_error;
    case ErrorKind::kSyntaxError:
      return PyExc_SyntaxError;
  }
  return PyExc_RuntimeError;
}

void SetError(PyObject* cls, const std::string& message) {
  if (message.empty()) {
    PyErr_SetNone(cls);
    return;
  }
  PyErr_SetObject(cls, StrOf(message).ptr());
}

void SetNativeError(const std::exception_ptr& exception, void*) {
  try {
    std::rethrow_exception(exception);
  } catch (const HostParseError& error) {
    error.original->restore();
  } catch (const ParseError& error) {
    nb::object object = ExceptionFor(error);
    PyErr_SetObject(g_parse_error, object.ptr());
  } catch (const SyntaxError& error) {
    nb::object original = TakeHostSyntaxError(error);
    nb::object object = original.is_valid() ? original : ExceptionFor(error);
    PyErr_SetObject((PyObject*)Py_TYPE(object.ptr()), object.ptr());
  } catch (const HostRuntimeError& error) {
    error.original->restore();
  } catch (const Error& error) {
    SetError(BuiltinFor(error.kind()), error.message());
  } catch (const std::bad_cast&) {
    // An instance of a host's class whose __init__ did not call that of its base.
    PyErr_SetString(PyExc_TypeError, "the object was not initialised");
  }
}

Context ErrorContextOrNone(nb::handle context) {
  // An error's context that the core has no form for points nowhere; the core only reads it to
  // place the error.
  try {
    return ErrorContext(context);
  } catch (const Error&) {
    return Context::None();
  } catch (nb::python_error&) {
    return Context::None();
  }
}

}  // namespace

nb::handle ParseErrorClass() { return g_parse_error; }

nb::object ExceptionFor(const SyntaxError& error) {
  nb::object details = nb::make_tuple(StrOf(error.filename), error.lineno, error.offset, StrOf(error.text));
  using Kind = SyntaxError::Kind;
  PyObject* const type = error.error_class == Kind::kIndentation ? PyExc_IndentationError
                         : error.error_class == Kind::kTab       ? PyExc_TabError
                                                                 : PyExc_SyntaxError;
  return nb::handle(type)(StrOf(error.message()), details);
}

nb::object ExceptionFor(const ParseError& error) {
  nb::object type = error.type < 0 ? nb::none() : nb::object(nb::int_(error.type));
  nb::object value = error.has_value ? nb::object(StrOf(error.value)) : nb::none();
  return nb::handle(g_parse_error)(StrOf(error.message()), type, value, HostContext(error.context));
}

void RethrowForCore(nb::python_error& error) {
  if (error.matches(g_parse_error)) {
    const nb::object context = nb::getattr(error.value(), "context", nb::none());
    std::string message = nb::str(error.value()).c_str();
    throw HostParseError(std::move(message), ErrorContextOrNone(context),
                         std::make_shared<nb::python_error>(std::move(error)));
  }
  if (error.matches(PyExc_SyntaxError)) {
    ForgetHostSyntaxError();
    g_host_syntax_error = nb::borrow(error.value()).release().ptr();
    // The message tells this error from any other of the walk, see TakeHostSyntaxError.
    throw SyntaxError(nb::str(error.value()).c_str(), "", -1, -1, "");
  }
  if (error.matches(PyExc_RuntimeError)) {
    std::string message = nb::str(error.value()).c_str();
    throw HostRuntimeError(std::move(message), std::make_shared<nb::python_error>(std::move(error)));
  }
  throw std::move(error);
}

nb::object TakeHostSyntaxError(const SyntaxError& error) {
  nb::object taken = nb::steal(g_host_syntax_error);
  g_host_syntax_error = nullptr;
  return error.lineno == -1 && error.offset == -1 ? taken : nb::object();
}

void ForgetHostSyntaxError() { Py_CLEAR(g_host_syntax_error); }

void SetHostError(const std::exception_ptr& exception) {
  try {
    std::rethrow_exception(exception);
  } catch (nb::python_error& error) {
    error.restore();
  } catch (const Stopped&) {
    SetStopped(exception);
  } catch (const Error&) {
    SetNativeError(exception, nullptr);
  } catch (const std::bad_cast&) {
    SetNativeError(exception, nullptr);
  } catch (const std::bad_alloc&) {
    PyErr_NoMemory();
  } catch (const std::exception& error) {
    PyErr_SetString(PyExc_RuntimeError, error.what());
  } catch (...) {
    PyErr_SetString(PyExc_RuntimeError, "unknown failure");
  }
}

void ThrowExpected(const char* want, nb::handle got) {
  const char* name = Py_TYPE(got.ptr())->tp_name;
  // A bound class has its module's name in front with some versions of the interpreter only.
  const bool is_bound = nb::type_check(got.type()) || Py_TYPE(got.ptr()) == g_line_class.line_type;
  if (const char* dot = std::strrchr(name, '.'); dot != nullptr && is_bound) name = dot + 1;
  PyErr_Format(PyExc_TypeError, "Expected %s, got %.200s", want, name);
  throw nb::python_error();
}

void BindErrors(nb::module_& tarvex) {
  nb::module_ optpgen = SiblingModule(tarvex, "optpgen");
  nb::dict scope;
  scope["__name__"] = "quillet.optpgen";
  scope["__builtins__"] = nb::borrow(PyEval_GetBuiltins());
  nb::object code = nb::steal(Py_CompileString(kParseErrorSource, "<quillet.optpgen>", Py_file_input));
  if (!code.is_valid() || !nb::steal(PyEval_EvalCode(code.ptr(), scope.ptr(), scope.ptr())).is_valid())
    throw nb::python_error();
  nb::object cls = scope["ParseError"];
  g_parse_error = nb::object(cls).release().ptr();
  optpgen.attr("ParseError") = cls;
  nb::register_exception_translator(SetNativeError);
}

}  // namespace quillet::host
