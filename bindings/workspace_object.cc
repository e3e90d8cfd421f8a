// Taking turns, and what the core asks of the host while it reads files.
#include "bindings/workspace_object.h"

#include <chrono>

#include "bindings/convert.h"
#include "program/files.h"
#include "program/modules.h"

namespace quillet::host {

namespace {

std::vector<std::string> PathsOf(nb::handle sequence) {
  std::vector<std::string> paths;
  for (nb::handle path : nb::borrow<nb::tuple>(TupleOf(sequence))) paths.emplace_back(HostText::FromBytes(path).text());
  return paths;
}

// Sources that name an encoding of their own are decoded as they are everywhere else.
bool DecodeByHost(Text bytes, std::string& utf8) {
  const Locked lock;
  try {
    const nb::object decode = nb::module_::import_("quillet._languages").attr("decode_source");
    const nb::object answer = TupleOf(decode(BytesOf(bytes)));
    const nb::handle source = PyTuple_GET_ITEM(answer.ptr(), 0);
    if (source.is_none()) return false;
    utf8 = HostText::FromBytes(source).text();
    return true;
  } catch (nb::python_error&) {
    return false;
  }
}

nb::object PathText(Text path) {
  return nb::steal(PyUnicode_DecodeFSDefaultAndSize(path.data(), static_cast<Py_ssize_t>(path.size())));
}

// The folders of libraries, and the version or None.
nb::tuple EnvironmentOf(nb::handle path) {
  const std::string given(HostText::FromBytes(path).text());
  Environment environment;
  {
    const Unlocked unlocked;
    environment = FindEnvironment(given);
  }
  nb::list libraries;
  for (const std::string& library : environment.libraries) libraries.append(PathText(library));
  const Version& version = environment.version;
  nb::object found = nb::none();
  if (version.count >= 2) found = nb::make_tuple(version.parts[0], version.parts[1]);
  return nb::make_tuple(libraries, found);
}

}  // namespace

WorkspaceObject::WorkspaceObject(nb::handle roots, nb::handle libraries, nb::handle typeshed, nb::handle version,
                                 nb::handle exclude, nb::handle index_maker, const Language& language) {
  Workspace::Settings settings;
  settings.roots = PathsOf(roots);
  settings.libraries = PathsOf(libraries);
  settings.typeshed = HostText::FromBytes(typeshed).text();
  settings.version = VersionOf(version);
  settings.exclude = HostText::FromBytes(exclude).text();
  settings.index_maker = HostText::FromBytes(index_maker).text();
  settings.analyzer = std::make_shared<FileAnalyzer::Options>(language.options());
  const Unlocked unlocked;
  workspace_ = std::make_unique<Workspace>(std::move(settings));
}

void WorkspaceObject::CheckNotAsking() const {
  if (asking_ == ThreadUse::ThisThread())
    ThrowError(ErrorKind::kRuntimeError, "the workspace is in the middle of an answer");
}

void WorkspaceObject::Stop(double patience) {
  const auto least = std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(patience));
  stops_at_ = proceeded_.load() + least;
}

void WorkspaceObject::Proceed() {
  proceeded_ = Clock::now();
  stops_at_ = Clock::time_point::max();
}

void WorkspaceObject::SetColumnUnit(nb::handle name) {
  const HostText word = HostText::FromBytes(name);
  const ColumnUnit unit = word.text() == "utf-16"   ? ColumnUnit::kUtf16
                          : word.text() == "utf-32" ? ColumnUnit::kUtf32
                                                    : ColumnUnit::kUtf8;
  Asked([&](Workspace& workspace) { workspace.set_column_unit(unit); });
}

void WorkspaceObject::CheckStop() const {
  if (const Clock::time_point at = stops_at_; at == Clock::time_point::max() || Clock::now() < at) return;
  const Locked lock;
  const nb::object stopped = nb::module_::import_("quillet._workspace").attr("Stopped");
  PyErr_SetString(stopped.ptr(), "the question was stopped");
  nb::python_error error;
  throw StoppedByHost(error);
}

std::unique_lock<std::timed_mutex> WorkspaceObject::TakeTurn() {
  constexpr std::chrono::milliseconds kPatience(100);
  std::unique_lock turn(mutex_, std::defer_lock);
  while (!turn.try_lock_for(kPatience)) HandleSignals();
  return turn;
}

void BindEnvironment(nb::module_& host) {
  SetSourceDecoder(DecodeByHost);
  host.def("find_environment", &EnvironmentOf, nb::arg("path"),
           "The folders of an environment's libraries and its version, or None where that is not known.");
}

}  // namespace quillet::host
