"""What the answers of one client are made of: its documents, its projects, and what it understands."""

from __future__ import annotations

from quillet._workspace import Stopped
from quillet.server import log
from quillet.server.documents import Document, Documents
from quillet.server.positions import place_of
from quillet.server.projects import Projects
from quillet.server.work import Work

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from typing import Any, NamedTuple

    from quillet._workspace import Workspace
    from quillet.server.protocol import Protocol
    from quillet.settings import Settings
else:
    from quillet._named import NamedTuple

# Above so many characters a document is not read.
MOST_TEXT = 1 << 25
# As the protocol numbers kinds of messages.
_ERROR = 1


class Place(NamedTuple):
    """Where a question is asked."""

    workspace: Workspace
    settings: Settings
    path: str
    line: int
    column: int

    @property
    def at(self) -> tuple[str, int, int]:
        return self.path, self.line, self.column


class Server:
    """The server of one client."""

    def __init__(self, protocol: Protocol) -> None:
        self.protocol = protocol
        self.documents = Documents()
        self.projects = Projects(self.complain, self._open_all)
        self.work = Work(self._stop)
        # Where names were offered last, of which more may be asked: the document, its version, the place.
        self.completed: tuple[str, int | None, int, int] | None = None
        self.completion_number = 0
        # What the client understands, as the answers need it.
        self.has_markdown = True
        self.has_hierarchy = False
        self.has_versions = False
        self.pulls_diagnostics = False
        self.refreshes_diagnostics = False
        self.has_watchers = False
        self.has_configuration = False

    # ---- what answers need ----

    def place(self, params: Any) -> Place:
        """Where a request with a document and a position asks."""
        path = self.documents.path_of(params.text_document.uri)
        project = self.projects.of(path)
        return Place(project.workspace, project.settings, path, *place_of(params.position))

    def file(self, uri: str) -> tuple[Workspace, Settings, str]:
        """What a request about a whole document asks."""
        path = self.documents.path_of(uri)
        project = self.projects.of(path)
        return project.workspace, project.settings, path

    def version_of(self, uri: str) -> int | None:
        """That of a document that is open."""
        document = self.documents.get(uri)
        return None if document is None else document.version

    def markup(self, text: str) -> Any:
        """A text for people, in the form that the client shows."""
        return {"kind": "markdown" if self.has_markdown else "plaintext", "value": text}

    def when_idle(self, key: str, action: Callable[[], None], delay: float = 0) -> None:
        """Does something once there is nothing else to do; what comes in between ends it, and it begins anew."""

        def act() -> None:
            try:
                action()
            except Stopped:
                self.when_idle(key, action, delay)
            except Exception:
                log.exception("%s failed", key)

        self.work.later(key, act, delay)

    def complain(self, text: str) -> None:
        """Tells the user what is wrong."""
        log.warning("%s", text)
        self.protocol.tell("window/showMessage", {"type": _ERROR, "message": f"quillet: {text}"})

    # ---- texts ----

    def open_document(self, document: Document, text: str) -> None:
        """An editor's text counts from now on."""
        if len(text) > MOST_TEXT:
            self.complain(
                f"{document.path} is not read: it has {len(text):,} characters, and {MOST_TEXT:,} are the most"
            )
            document.is_read, text = False, ""
        self.documents.add(document)
        self.projects.of(document.path)  # which may be a new one
        for workspace in self.projects.workspaces:
            workspace.open(document.path, text)

    def _open_all(self, workspace: Workspace) -> None:
        """A new workspace gets what is open, as the others have it."""
        for document in self.documents:
            for other in self.projects.workspaces:
                workspace.open(document.path, other.source(document.path))
                break

    def _stop(self, patience: float) -> None:
        for workspace in self.projects.workspaces:
            workspace.stop(patience=patience)

    def proceed(self) -> None:
        """Questions may be asked again."""
        for workspace in self.projects.workspaces:
            workspace.proceed()
