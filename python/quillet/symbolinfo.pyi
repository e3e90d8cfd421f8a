from collections.abc import Iterable, Sequence
from typing import Any, overload

kSetPrefix: bytes
kSetKind: int
kGetPrefix: bytes
kGetKind: int
kWithinExprPrefix: bytes
kWithinExprKind: int
kCalledPrefix: bytes
kCalledKind: int
kImportPrefix: bytes
kImportKind: int
kFromImportPrefix: bytes
kFromImportKind: int
kImportAsNamePrefix: bytes
kImportAsNameKind: int
kGlobalPrefix: bytes
kGlobalKind: int
kNonlocalPrefix: bytes
kNonlocalKind: int
kTypeParameterPrefix: bytes
kTypeParameterKind: int
kExpressionEquivPrefix: bytes
kExpressionEquivKind: int
kTypedLiteralPrefix: bytes
kTypedLiteralKind: int
kTypeHintPrefix: bytes
kTypeHintKind: int
kConditionalPrefix: bytes
kConditionalKind: int
kInferredTypeHintPrefix: bytes
kInferredTypeHintKind: int
kModulePrefix: bytes
kModuleKind: int
kInstancePrefix: bytes
kInstanceKind: int
kSelfPrefix: bytes
kSelfKind: int
kClassPrefix: bytes
kClassKind: int
kFunctionPrefix: bytes
kFunctionKind: int
kUnboundMethodPrefix: bytes
kUnboundMethodKind: int
kMethodPrefix: bytes
kMethodKind: int
kArgPrefix: bytes
kArgKind: int
kBuiltinClassPrefix: bytes
kBuiltinClassKind: int
kTypingModulePrefix: bytes
kTypingModuleKind: int
kBuiltinModulePrefix: bytes
kBuiltinModuleKind: int
kSpecificUrlPrefix: bytes
kSpecificUrlKind: int
kSpecificScopePrefix: bytes
kSpecificScopeKind: int
kDecoratorPrefix: bytes
kDecoratorKind: int
kSetTypeHintPrefix: bytes
kSetTypeHintKind: int
kDefLineScopePrefix: bytes
kDefLineScopeKind: int
kGenericTypeAliasPrefix: bytes
kGenericTypeAliasKind: int
kPlainEquivKind: int
kPlainEquivSpec: bytes
kPrefixLen: int
kIterationSubscript: bytes
kClassInstanceSuffix: str
kScopeIndexSep: str
kModuleScopeName: str
kWildcardScope: str
kDefLineScopeName: str
_kDotLineScopeName: str
kTypingModuleSymbol: bytes
kTypingModuleSymbolDot: bytes
kTypingModuleSymbolDotAny: bytes
kTypingModuleSymbolStr: str
kTypingModuleSymbolDotStr: str
kTypingModuleSymbolDotAnyStr: str

def BuildLiteralInfo(cls_name: str | bytes, literal: str | bytes | None) -> bytes: ...
@overload
def GetInstanceNameForClass(cls_name: str) -> str: ...
@overload
def GetInstanceNameForClass(cls_name: bytes) -> bytes: ...
def EnsureScopeNameIndicies(name: str) -> str: ...
def EncodeStringLiteral(text: str | bytes) -> bytes: ...
def ObjectForStringLiteral(text: str) -> str | bytes: ...
def BuildArgInfo(index: int, info: bytes | None) -> bytes: ...
def JoinTokens(tokens: Sequence[str | bytes]) -> bytes: ...

class CInfoBytesBuilder:
    def __init__(self) -> None: ...
    def Clear(self) -> None: ...
    def Append(self, piece: str | bytes) -> None: ...
    def AppendInteger(self, number: int) -> None: ...
    def GetBytes(self) -> bytes: ...

gInfoBytesBuilder: CInfoBytesBuilder

def GetInfoBytesKind(ibytes_ptr: bytes) -> int: ...
def DecodeInfo(info: bytes) -> tuple[str, Any]: ...
def IsDefKind(kind: int) -> bool: ...
def IsDefLineScope(scope: str) -> bool: ...
def IsParentOfDefLineScope(maybe_parent: str, def_line_scope: str) -> bool: ...
def IsTopLevelModuleScope(scope: str) -> bool: ...

class CKindFilter:
    def __init__(self, kinds: Iterable[int] = ()) -> None: ...
    def KindMatches(self, kind: int) -> bool: ...

class CLocationCache:
    _fBuiltinLoc: Any
    def __init__(self) -> None: ...
    def GetBuiltinLoc(self) -> Any: ...
    def _LoadBuiltinLoc(self) -> None: ...
