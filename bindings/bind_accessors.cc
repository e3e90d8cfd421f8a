// The accessors of the node classes.
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

}  // namespace

void BindAccessors(nb::module_&) {
  BindExpressionAccessors();
  BindStatementAccessors();
  BindArgumentAccessors();
  BindLiteralAccessors();
}

}  // namespace quillet::host
