// The accessors of the node classes, and the free operations over nodes.
//
// An accessor is bound by naming it: what it takes and gives follows from its type. A node comes out
// as its wrapper, with the source of the wrapper it was asked of.
#include <span>
#include <string>
#include <type_traits>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/arg_info.h"
#include "tree/nodes.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

// ---- results ----

using Source = Ref<SourceText>;

nb::object ToHost(CNode* node, const Source& source) { return Wrap(node, source); }
nb::object ToHost(bool value, const Source&) { return nb::bool_(value); }
nb::object ToHost(int32_t value, const Source&) { return nb::int_(value); }
nb::object ToHost(int64_t value, const Source&) { return nb::int_(value); }
nb::object ToHost(Text value, const Source&) { return StrOf(value); }
nb::object ToHost(const NodeList& nodes, const Source& source) { return WrapList(nodes, source); }
nb::object ToHost(const UsedArgList& args, const Source& source) { return WrapUsedArgs(args, source); }
nb::object ToHost(const std::vector<Text>& texts, const Source&) {
  nb::list list;
  for (Text text : texts) list.append(StrOf(text));
  return list;
}
nb::object ToHost(const std::vector<CAsName>& names, const Source&) {
  nb::list list;
  for (const CAsName& name : names) list.append(WrapAsName(name));
  return list;
}

// ---- arguments ----

template <class T>
struct FromHost;
template <>
struct FromHost<int32_t> {
  static int32_t Get(nb::handle value) { return Int32Of(value); }
};
template <>
struct FromHost<int64_t> {
  static int64_t Get(nb::handle value) { return Int64Of(value); }
};

// ---- accessors ----

template <class T>
using Handle = NodeHandle<T>;

template <class T>
const T* NodeAs(nb::handle self, Source& source) {
  NodeRef& ref = RefOf(self, NodeKindRange<T>::kFirst);
  source = ref.source();
  return static_cast<const T*>(ref.node());
}

template <auto Accessor>
struct Bound;
template <class T, class R, R (T::*Accessor)() const>
struct Bound<Accessor> {
  using Class = T;
  template <class Self>
  static nb::object Call(nb::handle self) {
    Source source;
    const T* node = NodeAs<Self>(self, source);
    return ToHost((node->*Accessor)(), source);
  }
};
template <class T, class R, class A, R (T::*Accessor)(A) const>
struct Bound<Accessor> {
  using Class = T;
  template <class Self>
  static nb::object Call(nb::handle self, Any argument) {
    Source source;
    const T* node = NodeAs<Self>(self, source);
    return ToHost((node->*Accessor)(FromHost<A>::Get(argument)), source);
  }
};

// Defines accessors on the class of `T`.
template <class T>
class Accessors {
 public:
  Accessors() : cls_(nb::borrow<nb::class_<NodeHandle<T>>>(ClassOfKind(NodeKindRange<T>::kFirst))) {}

  template <auto Accessor>
  Accessors& Def(const char* name) {
    DefOperation(cls_, name, &Bound<Accessor>::template Call<T>);
    return *this;
  }
  // One with an argument.
  template <auto Accessor>
  Accessors& Def(const char* name, const char* argument) {
    DefOperation(cls_, name, &Bound<Accessor>::template Call<T>, nb::arg(argument));
    return *this;
  }
  template <class Function>
  Accessors& DefFunction(const char* name, Function function) {
    DefOperation(cls_, name, function);
    return *this;
  }

 private:
  nb::class_<NodeHandle<T>> cls_;
};

void BindExpressionAccessors() {
  Accessors<CExpression>()
      .Def<&CExpression::GetSubExpr>("GetSubExpr", "index")
      .Def<&CExpression::GetSubExprCount>("GetSubExprCount");
  Accessors<CAtom>()
      .Def<&CAtom::GetSubExpr>("GetSubExpr", "index")
      .Def<&CAtom::GetSubExprCount>("GetSubExprCount")
      .Def<&CAtom::GetInitialBracket>("GetInitialBracket")
      .Def<&CAtom::IsLiteral>("IsLiteral")
      .Def<&CAtom::IsComprehension>("IsComprehension")
      .Def<&CAtom::IsTwoPlusStringLiterals>("IsTwoPlusStringLiterals");
  Accessors<COperatorExpression>()
      .Def<&COperatorExpression::GetOperatorStr>("GetOperatorStr", "i")
      .Def<&COperatorExpression::GetTermCount>("GetTermCount")
      .Def<&COperatorExpression::GetTerm>("GetTerm", "i");
  Accessors<CStarExpression>().Def<&CStarExpression::GetStarredExpression>("GetStarredExpression");
  Accessors<CTestListStarExpr>()
      .Def<&CTestListStarExpr::GetSubExpr>("GetSubExpr", "index")
      .Def<&CTestListStarExpr::GetSubExprCount>("GetSubExprCount")
      .Def<&CTestListStarExpr::IsTuple>("IsTuple")
      .Def<&CTestListStarExpr::IsGenExpr>("IsGenExpr");
  Accessors<CYieldExpr>().Def<&CYieldExpr::GetValue>("GetValue").Def<&CYieldExpr::IsYieldFrom>("IsYieldFrom");
  Accessors<CYieldArg>().Def<&CYieldArg::GetValue>("GetValue").Def<&CYieldArg::IsYieldFrom>("IsYieldFrom");
  Accessors<CLambdaExpr>()
      .Def<&CLambdaExpr::GetArgumentsNode>("GetArgumentsNode")
      .Def<&CLambdaExpr::GetBodyExpr>("GetBodyExpr");
  Accessors<CCompForNode>()
      .Def<&CCompForNode::IsAsync>("IsAsync")
      .Def<&CCompForNode::GetTargetNode>("GetTargetNode")
      .Def<&CCompForNode::GetInNode>("GetInNode")
      .Def<&CCompForNode::GetCompIterNode>("GetCompIterNode");
  Accessors<CListmakerNode>()
      .Def<&CListmakerNode::GetSubExprCount>("GetSubExprCount")
      .Def<&CListmakerNode::GetSubExpr>("GetSubExpr", "index");
  Accessors<CTrailer>()
      .Def<&CTrailer::GetDotName>("GetDotName")
      .Def<&CTrailer::GetNestedNode>("GetNestedNode")
      .Def<&CTrailer::GetInitialToken>("GetInitialToken");
  Accessors<CAtomExpr>()
      .Def<&CAtomExpr::GetPrefix>("GetPrefix")
      .Def<&CAtomExpr::GetAtom>("GetAtom")
      .Def<&CAtomExpr::GetTrailers>("GetTrailers");
  Accessors<CPower>()
      .Def<&CPower::GetAtom>("GetAtom")
      .Def<&CPower::GetTrailers>("GetTrailers")
      .Def<&CPower::GetExponentNode>("GetExponentNode");
  Accessors<CFactorExpr>().Def<&CFactorExpr::GetUnaryOperator>("GetUnaryOperator");
  Accessors<CNamedExpr>()
      .Def<&CNamedExpr::GetAssignedName>("GetAssignedName")
      .Def<&CNamedExpr::GetRightHandExpression>("GetRightHandExpression");
}

// Tuples of the accessors whose result is of a class of its own.
template <class T, auto Accessor>
nb::object NodeOf(nb::handle self) {
  Source source;
  const T* node = NodeAs<T>(self, source);
  return Wrap((node->*Accessor)(), source);
}

void BindStatementAccessors() {
  Accessors<CClassdefStmt>()
      .Def<&CClassdefStmt::GetClassName>("GetClassName")
      .Def<&CClassdefStmt::GetBaseClassList>("GetBaseClassList");
  Accessors<CFuncdefStmt>()
      .Def<&CFuncdefStmt::GetFunctionName>("GetFunctionName")
      .DefFunction("GetParameters", &NodeOf<CFuncdefStmt, &CFuncdefStmt::GetParameters>)
      .Def<&CFuncdefStmt::GetReturnType>("GetReturnType")
      .Def<&CFuncdefStmt::GetSuite>("GetSuite");
  Accessors<CIfStmt>().Def<&CIfStmt::GetTestExpression>("GetTestExpression");
  Accessors<CMatchStmt>().Def<&CMatchStmt::GetTestExpression>("GetTestExpression");
  Accessors<CCaseStmt>()
      .Def<&CCaseStmt::GetPattern>("GetPattern")
      .Def<&CCaseStmt::GetGuard>("GetGuard")
      .Def<&CCaseStmt::GetBody>("GetBody");
  Accessors<CDelStmt>().Def<&CDelStmt::GetExpressions>("GetExpressions");
  Accessors<CSingleDecorator>()
      .Def<&CSingleDecorator::GetDottedName>("GetDottedName")
      .Def<&CSingleDecorator::GetUsedArgList>("GetUsedArgList");
  Accessors<CGlobalStmt>().Def<&CGlobalStmt::GetUtf8NameList>("GetUtf8NameList");
  Accessors<CNonlocalStmt>().Def<&CNonlocalStmt::GetUtf8NameList>("GetUtf8NameList");
  Accessors<CForStmt>()
      .Def<&CForStmt::GetTarget>("GetTarget")
      .Def<&CForStmt::GetInExpression>("GetInExpression")
      .Def<&CForStmt::GetBody>("GetBody")
      .Def<&CForStmt::GetElseBody>("GetElseBody");
  Accessors<CWithStmt>().Def<&CWithStmt::GetWithItems>("GetWithItems");
  Accessors<CWithItem>().Def<&CWithItem::GetExpression>("GetExpression").Def<&CWithItem::GetTarget>("GetTarget");
  Accessors<CExceptClause>()
      .Def<&CExceptClause::GetExceptionType>("GetExceptionType")
      .Def<&CExceptClause::GetTarget>("GetTarget");
  Accessors<CExprStmt>()
      .Def<&CExprStmt::GetEqualCount>("GetEqualCount")
      .DefFunction("GetAnnotatedAssignNode", &NodeOf<CExprStmt, &CExprStmt::GetAnnotatedAssignNode>)
      .Def<&CExprStmt::GetInitialTestExpr>("GetInitialTestExpr")
      .Def<&CExprStmt::GetPostEqualsTestExpr>("GetPostEqualsTestExpr", "equal_num")
      .Def<&CExprStmt::GetAugAssignOp>("GetAugAssignOp");
  Accessors<CAnnotatedAssignNode>()
      .Def<&CAnnotatedAssignNode::GetTypeHintNode>("GetTypeHintNode")
      .Def<&CAnnotatedAssignNode::GetPostEqualsTestExpr>("GetPostEqualsTestExpr");
  Accessors<CReturnStmt>().Def<&CReturnStmt::GetValue>("GetValue");
  Accessors<CTypeParameter>()
      .Def<&CTypeParameter::GetName>("GetName")
      .Def<&CTypeParameter::GetPrefix>("GetPrefix")
      .Def<&CTypeParameter::GetSpecNode>("GetSpecNode");
  Accessors<CWithTypeParameters>()
      .Def<&CWithTypeParameters::GetTypeParameters>("GetTypeParameters")
      .Def<&CWithTypeParameters::GetTypeParameterScopedStatement>("GetTypeParameterScopedStatement");
}

void BindArgumentAccessors() {
  Accessors<CImportNamesStmt>().Def<&CImportNamesStmt::GetAsNameList>("GetAsNameList");
  Accessors<CFromImportStmt>()
      .DefFunction("GetFromString",
                   [](nb::handle self) {
                     Source source;
                     const auto* node = NodeAs<CFromImportStmt>(self, source);
                     return node->HasFromString() ? StrOf(node->GetFromString()) : nb::object(nb::none());
                   })
      .Def<&CFromImportStmt::GetImportStar>("GetImportStar")
      .Def<&CFromImportStmt::GetAsNameList>("GetAsNameList")
      .Def<&CFromImportStmt::GetImportIndex>("_GetImportIndex");
  Accessors<CSingleUsedArgumentNode>()
      .Def<&CSingleUsedArgumentNode::GetPrefix>("GetPrefix")
      .Def<&CSingleUsedArgumentNode::GetName>("GetName")
      .Def<&CSingleUsedArgumentNode::GetValue>("GetValue")
      .Def<&CSingleUsedArgumentNode::IsUnparenthesizedGenExpr>("IsUnparenthesizedGenExpr")
      .Def<&CSingleUsedArgumentNode::GetNameAssigned>("GetNameAssigned")
      .Def<&CSingleUsedArgumentNode::GetNamedRightHandExpression>("GetNamedRightHandExpression");
  Accessors<CFunctionParameterDef>()
      .Def<&CFunctionParameterDef::GetNestedListNode>("GetNestedListNode")
      .Def<&CFunctionParameterDef::GetName>("GetName")
      .Def<&CFunctionParameterDef::GetTypeExpr>("GetTypeExpr");
}

// The host's conversion of a token's text to a number; None where it fails.
nb::object NumericValue(nb::handle self) {
  Source source;
  const auto* node = NodeAs<CNumberLiteral>(self, source);
  nb::object text = StrOf(node->fText());
  PyObject* value = node->IsFloat() ? PyFloat_FromString(text.ptr()) : PyLong_FromUnicodeObject(text.ptr(), 10);
  if (value == nullptr) {
    PyErr_Clear();
    return nb::none();
  }
  return nb::steal(value);
}

nb::object StringValue(nb::handle self) {
  Source source;
  const auto* node = NodeAs<CStringLiteral>(self, source);
  if (node->IsFormatted()) return nb::none();
  // The sibling's operation, as the host has it.
  return nb::module_::import_("quillet.symbolinfo").attr("ObjectForStringLiteral")(StrOf(node->fText()));
}

void BindLiteralAccessors() {
  Accessors<CNumberLiteral>().Def<&CNumberLiteral::IsFloat>("IsFloat").DefFunction("GetNumericValue", &NumericValue);
  Accessors<CStringLiteral>()
      .Def<&CStringLiteral::IsUnicode>("IsUnicode")
      .Def<&CStringLiteral::IsBytes>("IsBytes")
      .Def<&CStringLiteral::GetStringContents>("GetStringContents")
      .DefFunction("GetStringValue", &StringValue);
}

template <class T>
T* ArgumentAs(nb::handle node, Source& source) {
  NodeRef& ref = RefOf(node, NodeKindRange<T>::kFirst);
  source = ref.source();
  return static_cast<T*>(ref.node());
}

void BindFreeOperations(nb::module_& m) {
  DefOperation(
      m, "GetDefiningArgInfoList",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        try {
          return WrapArgList(GetDefiningArgInfoList(root), source);
        } catch (const NotANameError& error) {
          nb::object what = nb::make_tuple(Wrap(error.node, source), StrOf(error.node->fText()));
          PyErr_SetObject(PyExc_AssertionError, nb::make_tuple(what).ptr());
          throw nb::python_error();
        }
      },
      nb::arg("node"),
      "The parameters of the node behind `def name` or `lambda`: a list of CArgInfo, nested for tuple parameters.");
  DefOperation(
      m, "GetUsedArgInfoList",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        return WrapUsedArgs(GetUsedArgInfoList(root), source);
      },
      nb::arg("node"), "The arguments of the inside of `value(...)`, as a list of CArgInfo.");
  DefOperation(
      m, "GetTokenEndIndex",
      [](Any node) {
        Source source;
        const CNode* leaf = LastLeaf(ArgumentAs<CNode>(node, source));
        if (leaf->fContext.IsIndex()) return GetTokenEndIndex(leaf);
        // Whatever a host put there, as far as one can be added to it.
        nb::object end = nb::steal(PyNumber_Add(HostContext(leaf->fContext).ptr(), nb::int_(1).ptr()));
        if (!end.is_valid()) throw nb::python_error();
        return Int64Of(end);
      },
      nb::arg("node"), "The token index just past a node.");
  DefOperation(
      m, "_TextForImportName",
      [](Any nodes) { return StrOf(TextForImportName(NodesOf(nodes, NodeKind::kCNode, true))); }, nb::arg("nodes"));
  DefOperation(
      m, "_ProcessAsNamesList",
      [](Any node) {
        Source source;
        return ToHost(ProcessAsNamesList(ArgumentAs<CNode>(node, source)), source);
      },
      nb::arg("node"));
  DefOperation(
      m, "_ProcessSingleModuleNameAs",
      [](Any node) {
        Source source;
        return WrapAsName(ProcessSingleModuleNameAs(ArgumentAs<CNode>(node, source)));
      },
      nb::arg("node"));
  DefOperation(
      m, "_GetMatchingChildToken",
      [](Any node, Any text) {
        Source source;
        const HostText wanted = HostText::FromStr(text);
        return GetMatchingChildToken(ArgumentAs<CNode>(node, source), wanted.text());
      },
      nb::arg("node"), nb::arg("text"));

  DefOperation(
      m, "DropSimpleParens",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        return Wrap(DropSimpleParens(root), source);
      },
      nb::arg("node"), "The inside of `( test )`, however deep; any other node as it is.");
  DefOperation(
      m, "ExpandSeqLiteral",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        NodeList elements;
        return ExpandSeqLiteral(root, elements) ? WrapList(elements, source) : nb::object(nb::none());
      },
      nb::arg("node"), "The elements of a parenthesised tuple; None for anything else.");
  DefOperation(
      m, "IsSetLiteral",
      [](Any node) {
        Source source;
        return IsSetLiteral(ArgumentAs<CAtom>(node, source));
      },
      nb::arg("node"), "True for an atom that is clearly a set display.");
  DefOperation(
      m, "IsGenExpression",
      [](Any atom_node) {
        Source source;
        return IsGenExpression(ArgumentAs<CAtom>(atom_node, source));
      },
      nb::arg("atom_node"), "True for a parenthesised atom with a direct child `for`.");
  DefOperation(
      m, "IsTupleLiteralNode",
      [](Any node) {
        Source source;
        return IsTupleLiteralNode(ArgumentAs<CNode>(node, source));
      },
      nb::arg("node"), "True for a tuple, bare or in any number of parentheses.");
}

void BindInstanceNames(nb::module_& m) {
  m.attr("kListInstanceName") = BytesOf(kListInstanceName);
  m.attr("kDictInstanceName") = BytesOf(kDictInstanceName);
  m.attr("kSetInstanceName") = BytesOf(kSetInstanceName);
  m.attr("kTupleInstanceName") = BytesOf(kTupleInstanceName);
  m.attr("kStringInstanceName") = BytesOf(kStringInstanceName);
  m.attr("kUnicodeInstanceName") = BytesOf(kUnicodeInstanceName);
  m.attr("kBytesInstanceName") = BytesOf(kBytesInstanceName);
  m.attr("kIntLiteralName") = BytesOf(kIntLiteralName);
  m.attr("kFloatLiteralName") = BytesOf(kFloatLiteralName);
  DefOperation(
      m, "_GetBuiltinInstanceName",
      [](Any cls_name) {
        const HostText name = HostText::FromStr(cls_name);
        std::string info(kTypedLiteralPrefix);
        AppendInstanceNameForClass(EnsureScopeNameIndicies(name.text()), info);
        return BytesOf(info);
      },
      nb::arg("cls_name"), "The info text of a literal of a builtin class.");
}

}  // namespace

void BindAccessors(nb::module_& tarvex) {
  BindExpressionAccessors();
  BindStatementAccessors();
  BindArgumentAccessors();
  BindLiteralAccessors();
  BindFreeOperations(tarvex);
  BindInstanceNames(tarvex);
}

}  // namespace quillet::host
