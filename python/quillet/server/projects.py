"""Which workspace a file belongs to.

The folders that the editor has open are the programs; those that are read alike (by the same environment, version and
rules) are one, so that questions go from one to the other. A file outside of all of them is asked about in the program
that led there, and where none is open in that of the project that it lies in.
"""

from __future__ import annotations

import os

from quillet.settings import Settings, SettingsError, load_settings

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable, Iterable, Mapping
    from typing import Any

    from quillet._workspace import Columns, Workspace

CLIENT = "the editor's settings"


class Project:
    """Folders that are one program, and their workspace."""

    def __init__(self, settings: Settings, columns: Columns) -> None:
        self.settings = settings
        self.workspace = settings.workspace(columns=columns)

    def holds(self, path: str) -> int:
        """How much of a path is that of a root that it lies in; 0 where it lies in none."""
        return max((len(root) for root in self.settings.roots if _is_within(path, root)), default=0)


class Projects:
    """All of them. `complain` is told what is wrong with settings, `is_changed` called where workspaces are new."""

    def __init__(self, complain: Callable[[str], None], is_changed: Callable[[Workspace], None]) -> None:
        self.columns: Columns = "utf-16"
        self._complain = complain
        self._is_changed = is_changed
        self._folders: list[str] = []
        # What the client said first holds wherever its settings say nothing else later.
        self._first: Mapping[str, Any] = {}
        self._client: Mapping[str, Any] = {}
        self._projects: list[Project] = []
        self._last: Project | None = None
        self._last_path: str | None = None  # of a file that was found in that

    # ---- what there is ----

    @property
    def workspaces(self) -> list[Workspace]:
        return [project.workspace for project in self._projects]

    def holds(self, path: str) -> bool:
        """Whether a file lies in a program, and not in a library."""
        return any(project.holds(path) for project in self._projects)

    def of(self, path: str) -> Project:
        """The one to be asked about a file."""
        if self._last is not None and path == self._last_path:
            return self._last
        best = max(self._projects, key=lambda project: project.holds(path), default=None)
        if best is None or not best.holds(path):
            if self._last is not None and self._last in self._projects:
                return self._last
            if best is None:
                best = self._add_project_of(path)
        self._last, self._last_path = best, path
        return best

    def _add_project_of(self, path: str) -> Project:
        from quillet.cli.questions import project_of

        folder = project_of(path)
        while not os.path.isdir(folder):
            folder = os.path.dirname(folder)
        self._folders.append(folder)
        self.reload()
        return self._projects[0]

    # ---- changes ----

    def start(self, folders: Iterable[str], client: Mapping[str, Any]) -> None:
        self._folders = list(dict.fromkeys(folders))
        self._first = self._client = client
        self.reload()

    def change_folders(self, added: Iterable[str], removed: Iterable[str]) -> None:
        gone = set(removed)
        self._folders = [folder for folder in dict.fromkeys((*self._folders, *added)) if folder not in gone]
        self.reload()

    def change_client(self, client: Mapping[str, Any]) -> None:
        client = {**self._first, **client}
        if client != self._client:
            self._client = client
            self.reload()

    def reload(self) -> None:
        """Reads all settings again; workspaces that are to be read as before stay."""
        found: dict[Settings, list[str]] = {}
        for folder in self._folders:
            settings = self._settings_of(folder)
            found.setdefault(settings._replace(roots=(), file=None), []).extend(settings.roots)
        kept = {project.settings: project for project in self._projects}
        projects = []
        for settings, roots in found.items():
            whole = settings._replace(roots=tuple(dict.fromkeys(roots)))
            project = kept.get(whole)
            if project is None:
                project = self._make(whole)
                if project is None:
                    continue
                self._is_changed(project.workspace)
            projects.append(project)
        self._projects = projects
        self._last_path = None

    def _make(self, settings: Settings) -> Project | None:
        for attempt in (settings, settings._replace(environment=None, version=None)):
            present = tuple(root for root in attempt.roots if os.path.exists(root))
            if not present:
                return None
            try:
                return Project(attempt._replace(roots=present), self.columns)
            except (OSError, ValueError) as problem:
                self._complain(str(problem))
        return None

    def _settings_of(self, folder: str) -> Settings:
        settings = Settings((folder,))
        try:
            settings = load_settings(folder)
        except (SettingsError, OSError) as problem:
            self._complain(str(problem))
        try:
            settings = settings.updated(self._client, folder, CLIENT)
        except SettingsError as problem:
            self._complain(str(problem))
        return settings


def _is_within(path: str, root: str) -> bool:
    return path == root or path.startswith(root if root.endswith(os.sep) else root + os.sep)
