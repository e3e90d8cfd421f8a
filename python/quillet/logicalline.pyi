from collections.abc import Iterable
from typing import Final

Position = tuple[int, int]
Records = list[tuple[bytes, bytes]]

class CLogicalLine:
    def __init__(
        self,
        type: str = ...,
        toks: Iterable[str | None] = ...,
        positions: Iterable[Position] = ...,
        tok_types: list[int] | None = ...,
        parsed: bool = ...,
        first_line: int = ...,
        token_count: int | None = ...,
    ) -> None: ...
    @property
    def fType(self) -> str: ...
    @fType.setter
    def fType(self, value: str) -> None: ...
    @property
    def fToks(self) -> tuple[str | None, ...]: ...
    @fToks.setter
    def fToks(self, value: Iterable[str | None]) -> None: ...
    @property
    def fTokTypes(self) -> list[int]: ...
    @fTokTypes.setter
    def fTokTypes(self, value: list[int]) -> None: ...
    @property
    def fPositions(self) -> tuple[Position, ...]: ...
    @fPositions.setter
    def fPositions(self, value: Iterable[Position]) -> None: ...
    @property
    def fParsed(self) -> bool: ...
    @fParsed.setter
    def fParsed(self, value: bool) -> None: ...
    @property
    def fFirstLine(self) -> int: ...
    @fFirstLine.setter
    def fFirstLine(self, value: int) -> None: ...
    @property
    def fTokenCount(self) -> int: ...
    @fTokenCount.setter
    def fTokenCount(self, value: int) -> None: ...
    @property
    def fTypeEquivs(self) -> Records | None: ...
    @fTypeEquivs.setter
    def fTypeEquivs(self, value: Records | None) -> None: ...
    @property
    def fArgTypeEquivs(self) -> Records | None: ...
    @fArgTypeEquivs.setter
    def fArgTypeEquivs(self, value: Records | None) -> None: ...
    def GetTokType(self, i: int) -> int: ...
    def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None: ...
    def AppendArgTypeEquiv(self, name: bytes, info: bytes) -> None: ...
    def SetParsed(self, parsed: bool) -> None: ...
    def ClearDerivedInfo(self) -> None: ...
    def GetExpLogicals(self) -> tuple[CLogicalLine, ...]: ...

def GetLogicalsFromText(
    text: str | bytes, version_triple: tuple[int, ...] | None = ...
) -> tuple[CLogicalLine, ...]: ...
def FindMatchOrCaseType(toks: Iterable[str | None], start: int, end: int) -> str: ...
def IsScopeStartLogical(logical: CLogicalLine) -> bool: ...

kAssert: Final[str]
kAssignment: Final[str]
kBlankLine: Final[str]
kBreak: Final[str]
kCase: Final[str]
kClassDef: Final[str]
kComment: Final[str]
kCommentedTypeHint: Final[str]
kContinue: Final[str]
kDelete: Final[str]
kElifBeginning: Final[str]
kElseBeginning: Final[str]
kErrorTokenPrefix: Final[str]
kExcept: Final[str]
kFinally: Final[str]
kForBeginning: Final[str]
kFromImport: Final[str]
kFstringFieldExp: Final[str]
kFunctionDef: Final[str]
kIfBeginning: Final[str]
kImport: Final[str]
kMatch: Final[str]
kPass: Final[str]
kPrint: Final[str]
kRaise: Final[str]
kReturn: Final[str]
kStringExpression: Final[str]
kStringifiedTypeHint: Final[str]
kTry: Final[str]
kTypeStatement: Final[str]
kUnknown: Final[str]
kWhileBeginning: Final[str]
kWith: Final[str]
