// Which file an import names: packages of all sorts, stubs, the standard library by version, relative imports, and
// where the library of an environment lies.
#include "program/modules.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/core/support/temporary_folder.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;

// A workspace of the folders `project`, `library` (in the environment) and `typeshed`.
class World {
 public:
  explicit World(const TemporaryFolder& folder, Version version = Version::Of(3, 12),
                 std::vector<std::string> libraries = {"library"})
      : folder_(folder), files_(version), modules_(files_, SettingsOf(folder, libraries)) {}

  // "project/a.py", with the stub behind "|" where there is one, "/" for a package without source, "-" for none.
  std::string Find(Text name) { return Say(modules_.Find(name)); }
  std::string From(const std::string& importer, int level, Text name) {
    return Say(modules_.FindFrom(files_.NumberOf(folder_ / importer), level, name));
  }
  std::string NameOf(const std::string& path) {
    return modules_[modules_.OfFile(files_.NumberOf(folder_ / path))].name;
  }
  std::vector<std::string> Names(Text package) {
    return modules_.ChildNames(package.empty() ? kNoModule : modules_.Find(package));
  }
  Modules& modules() { return modules_; }
  Files& files() { return files_; }

 private:
  static Modules::Settings SettingsOf(const TemporaryFolder& folder, const std::vector<std::string>& libraries) {
    Modules::Settings settings;
    settings.roots = {folder / "project"};
    for (const std::string& library : libraries) settings.libraries.push_back(folder / library);
    settings.typeshed = folder / "typeshed";
    return settings;
  }
  std::string Below(FileId file) const { return files_.PathOf(file).substr(folder_.path().size() + 1); }
  std::string Say(ModuleId number) const {
    if (number == kNoModule) return "-";
    const Module& module = modules_[number];
    std::string said = module.file == kNoFile ? (module.is_package ? "/" : "") : Below(module.file);
    if (module.stub != kNoFile) said += "|" + Below(module.stub);
    return said;
  }

  const TemporaryFolder& folder_;
  Files files_;
  Modules modules_;
};

TEST(Modules, FindModulesPackagesAndNamespaces) {
  const TemporaryFolder folder = {
      {"project/shop.py", ""},        {"project/pack/__init__.py", ""}, {"project/pack/a.py", ""},
      {"project/pack.py", ""},        {"project/spread/one.py", ""},    {"library/spread/two.py", ""},
      {"project/data/notes.txt", ""}, {"library/data/__init__.py", ""}, {"library/shop.py", ""},
      {"library/pack/b.py", ""},
  };
  World world(folder);
  EXPECT_EQ(world.Find("shop"), "project/shop.py");
  EXPECT_EQ(world.Find("pack"), "project/pack/__init__.py");
  EXPECT_EQ(world.Find("pack.a"), "project/pack/a.py");
  EXPECT_EQ(world.Find("pack.b"), "-");
  EXPECT_EQ(world.Find("pack.a.c"), "-");
  EXPECT_EQ(world.Find("spread"), "/");
  EXPECT_EQ(world.Find("spread.one"), "project/spread/one.py");
  EXPECT_EQ(world.Find("spread.two"), "library/spread/two.py");
  EXPECT_EQ(world.Find("data"), "library/data/__init__.py");
  for (const Text nothing : {"", ".", "shop.", "nothing", "nothing.at.all", "..", "pack..a", "pack/a"})
    EXPECT_EQ(world.Find(nothing), "-") << nothing;
}

TEST(Modules, GoOnInLaterFoldersWhereAPackageSaysSo) {
  const TemporaryFolder folder = {
      {"project/old/__init__.py", "__path__ = __import__('pkgutil').extend_path(__path__, __name__)\n"},
      {"project/old/here.py", ""},
      {"library/old/__init__.py", ""},
      {"library/old/there.py", ""},
  };
  World world(folder);
  EXPECT_EQ(world.Find("old.here"), "project/old/here.py");
  EXPECT_EQ(world.Find("old.there"), "library/old/there.py");
}

TEST(Modules, FindStubsWhereverTheyLie) {
  const TemporaryFolder folder = {
      {"library/beside.py", ""},
      {"library/beside.pyi", ""},
      {"library/stubbed/__init__.py", ""},
      {"library/stubbed/a.py", ""},
      {"library/stubbed/b.py", ""},
      {"library/stubbed-stubs/__init__.pyi", ""},
      {"library/stubbed-stubs/a.pyi", ""},
      {"library/stubbed-stubs/only.pyi", ""},
      {"library/fast.cpython-312-x86_64-linux-gnu.so", ""},
      {"library/typed.cpython-312-x86_64-linux-gnu.so", ""},
      {"project/typings/typed.pyi", ""},
      {"project/typings/beside/__init__.pyi", ""},
  };
  World world(folder);
  EXPECT_EQ(world.Find("stubbed"), "library/stubbed/__init__.py|library/stubbed-stubs/__init__.pyi");
  EXPECT_EQ(world.Find("stubbed.a"), "library/stubbed/a.py|library/stubbed-stubs/a.pyi");
  EXPECT_EQ(world.Find("stubbed.b"), "library/stubbed/b.py");
  EXPECT_EQ(world.Find("stubbed.only"), "|library/stubbed-stubs/only.pyi");
  EXPECT_EQ(world.Find("fast"), "-");
  EXPECT_EQ(world.Find("typed"), "|project/typings/typed.pyi");
  EXPECT_EQ(world.Find("beside"), "library/beside.py|project/typings/beside/__init__.pyi");
  EXPECT_EQ(world.NameOf("library/stubbed-stubs/a.pyi"), "stubbed.a");
  EXPECT_EQ(world.From("library/stubbed-stubs/a.pyi", 1, "only"), "|library/stubbed-stubs/only.pyi");
  EXPECT_EQ(world.Names("stubbed"), (std::vector<std::string>{"a", "b", "only"}));
}

const TemporaryFolder& StandardLibrary() {
  static const TemporaryFolder folder = {
      {"typeshed/VERSIONS",
       "# words\n\nbuiltins: 3.0-\nsys: 3.0-\nos: 3.0-\nimp: 3.0-3.11\nasyncio: 3.4-\nasyncio.taskgroups: 3.11-\n"
       "queue: 3.0-  # said\nhttp: 3.0-\nsocket: 3.0-\n"},
      {"typeshed/builtins.pyi", ""},
      {"typeshed/sys/__init__.pyi", ""},
      {"typeshed/os/__init__.pyi", ""},
      {"typeshed/os/path.pyi", ""},
      {"typeshed/imp.pyi", ""},
      {"typeshed/asyncio/__init__.pyi", ""},
      {"typeshed/asyncio/taskgroups.pyi", ""},
      {"typeshed/queue.pyi", ""},
      {"typeshed/http/__init__.pyi", ""},
      {"typeshed/http/client.pyi", ""},
      {"typeshed/socket.pyi", ""},
      {"python/os.py", ""},
      {"python/site.py", ""},
      {"python/imp.py", ""},
      {"python/queue.py", ""},
      {"python/asyncio/__init__.py", ""},
      {"python/asyncio/events.py", ""},
      {"project/builtins.py", ""},
      {"project/socket.py", ""},
      {"library/queue.py", ""},
  };
  return folder;
}

TEST(Modules, TakeTheStandardLibraryOfTheVersionAskedFor) {
  World world(StandardLibrary(), Version::Of(3, 12), {"python", "library"});
  EXPECT_EQ(world.Find("os"), "python/os.py|typeshed/os/__init__.pyi");
  EXPECT_EQ(world.Find("os.path"), "|typeshed/os/path.pyi");
  EXPECT_EQ(world.Find("asyncio.events"), "python/asyncio/events.py");
  EXPECT_EQ(world.Find("asyncio.taskgroups"), "|typeshed/asyncio/taskgroups.pyi");
  EXPECT_EQ(world.Find("sys"), "/|typeshed/sys/__init__.pyi");
  EXPECT_EQ(world.Find("imp"), "python/imp.py");
  EXPECT_EQ(world.Find("queue"), "python/queue.py|typeshed/queue.pyi");
  // Nothing takes the place of what is built in; anything else a project may have itself.
  EXPECT_EQ(world.Find("builtins"), "|typeshed/builtins.pyi");
  EXPECT_EQ(world.Find("socket"), "project/socket.py");
  EXPECT_EQ(world.NameOf("typeshed/asyncio/__init__.pyi"), "asyncio");
  EXPECT_EQ(world.From("typeshed/asyncio/__init__.pyi", 1, "events"), "python/asyncio/events.py");

  World old(StandardLibrary(), Version::Of(3, 9), {"python"});
  EXPECT_EQ(old.Find("imp"), "python/imp.py|typeshed/imp.pyi");
  EXPECT_EQ(old.Find("asyncio.taskgroups"), "-");
  World without(StandardLibrary(), Version::Of(3, 12), {});
  EXPECT_EQ(without.Find("os"), "/|typeshed/os/__init__.pyi");
  EXPECT_EQ(without.Find("imp"), "-");
  EXPECT_EQ(without.Names(""),
            (std::vector<std::string>{"asyncio", "builtins", "http", "os", "queue", "socket", "sys"}));
}

TEST(Modules, KnowWhatPython2CallsTheStandardLibrary) {
  World world(StandardLibrary(), Version::Of(2, 7), {"python"});
  EXPECT_EQ(world.Find("builtins"), "|typeshed/builtins.pyi");
  EXPECT_EQ(world.Find("__builtin__"), "|typeshed/builtins.pyi");
  EXPECT_EQ(world.Find("Queue"), "|typeshed/queue.pyi");
  EXPECT_EQ(world.Find("httplib"), "|typeshed/http/client.pyi");
  EXPECT_EQ(world.Find("os"), "python/os.py");
  EXPECT_EQ(world.Find("sys"), "/|typeshed/sys/__init__.pyi");
}

TEST(Modules, FollowRelativeImports) {
  const TemporaryFolder folder = {
      {"project/pack/__init__.py", ""},     {"project/pack/a.py", ""},       {"project/pack/inner/__init__.py", ""},
      {"project/pack/inner/b.py", ""},      {"project/tests/test_a.py", ""}, {"project/tests/helper.py", ""},
      {"project/tests/deep/test_b.py", ""}, {"elsewhere/loose.py", ""},      {"elsewhere/friend.py", ""},
      {"elsewhere/of/__init__.py", ""},     {"elsewhere/of/it.py", ""},      {"project/top.py", ""},
      {"project/odd-name/c.py", ""},        {"project/odd-name/d.py", ""},
  };
  World world(folder);
  EXPECT_EQ(world.From("project/pack/inner/b.py", 1, ""), "project/pack/inner/__init__.py");
  EXPECT_EQ(world.From("project/pack/inner/b.py", 2, ""), "project/pack/__init__.py");
  EXPECT_EQ(world.From("project/pack/inner/b.py", 2, "a"), "project/pack/a.py");
  EXPECT_EQ(world.From("project/pack/inner/__init__.py", 1, "b"), "project/pack/inner/b.py");
  EXPECT_EQ(world.From("project/pack/__init__.py", 1, "inner.b"), "project/pack/inner/b.py");
  EXPECT_EQ(world.From("project/pack/a.py", 0, "pack.inner"), "project/pack/inner/__init__.py");
  EXPECT_EQ(world.From("project/pack/a.py", 1, "nothing"), "-");
  EXPECT_EQ(world.From("project/pack/a.py", 99, "pack"), "-");
  EXPECT_EQ(world.From("project/top.py", 1, "pack.a"), "project/pack/a.py");
  EXPECT_EQ(world.From("project/odd-name/c.py", 1, "d"), "project/odd-name/d.py");
  // Beside the importing file, and the folders around it up to the root.
  EXPECT_EQ(world.From("project/tests/test_a.py", 0, "helper"), "project/tests/helper.py");
  EXPECT_EQ(world.From("project/tests/deep/test_b.py", 0, "helper"), "project/tests/helper.py");
  EXPECT_EQ(world.From("elsewhere/loose.py", 0, "friend"), "elsewhere/friend.py");
  EXPECT_EQ(world.From("elsewhere/loose.py", 1, "friend"), "elsewhere/friend.py");
  EXPECT_EQ(world.From("elsewhere/of/__init__.py", 1, "it"), "elsewhere/of/it.py");
  EXPECT_EQ(world.From("elsewhere/of/it.py", 1, ""), "elsewhere/of/__init__.py");
  EXPECT_EQ(world.Find("friend"), "-");
  EXPECT_EQ(world.NameOf("project/pack/inner/b.py"), "pack.inner.b");
  EXPECT_EQ(world.NameOf("project/pack/__init__.py"), "pack");
  EXPECT_EQ(world.NameOf("project/tests/deep/test_b.py"), "tests.deep.test_b");
  EXPECT_EQ(world.NameOf("elsewhere/loose.py"), "loose");
  EXPECT_EQ(world.NameOf("elsewhere/of/__init__.py"), "of");
  // One module, however it is come by.
  EXPECT_EQ(world.modules().FindFrom(world.files().NumberOf(folder / "project/top.py"), 1, "pack.a"),
            world.modules().Find("pack.a"));
}

TEST(Modules, OutsideOfAllFoldersArePackagesOfTheirOwn) {
  const TemporaryFolder folder = {
      {"project/a.py", ""}, {"aside/pack/__init__.py", ""}, {"aside/pack/b.py", ""}, {"aside/stubs/__init__.pyi", ""}};
  for (const bool is_file_first : {false, true}) {
    World world(folder);
    const FileId file = world.files().NumberOf(folder / "aside/pack/__init__.py");
    const ModuleId by_file = is_file_first ? world.modules().OfFile(file) : kNoModule;
    EXPECT_EQ(world.From("aside/pack/b.py", 1, ""), "aside/pack/__init__.py");
    const ModuleId package = world.modules().FindFrom(world.files().NumberOf(folder / "aside/pack/b.py"), 1, "");
    EXPECT_EQ(world.modules().OfFile(file), package);
    if (is_file_first) {
      EXPECT_EQ(by_file, package);
    }
    EXPECT_EQ(world.NameOf("aside/pack/__init__.py"), "pack");
    EXPECT_EQ(world.modules().ChildNames(package), std::vector<std::string>{"b"});
    EXPECT_NE(world.modules().Child(package, "b"), kNoModule);
    EXPECT_EQ(world.NameOf("aside/stubs/__init__.pyi"), "stubs");
  }
}

TEST(Modules, LookBesideTheFileFirstInPython2) {
  const TemporaryFolder folder = {
      {"project/pack/__init__.py", ""},
      {"project/pack/json.py", ""},
      {"project/pack/a.py", "import json\n"},
      {"project/pack/b.py", "'words'\nfrom __future__ import division, absolute_import\nimport json\n"},
      {"project/json.py", ""},
  };
  World world(folder, Version::Of(2, 7));
  EXPECT_EQ(world.From("project/pack/a.py", 0, "json"), "project/pack/json.py");
  EXPECT_EQ(world.From("project/pack/b.py", 0, "json"), "project/json.py");
  World newer(folder, Version::Of(3, 7));
  EXPECT_EQ(newer.From("project/pack/a.py", 0, "json"), "project/json.py");
}

TEST(Modules, CountBuffersThatAreNotSaved) {
  const TemporaryFolder folder = {{"project/a.py", ""}};
  World world(folder);
  EXPECT_EQ(world.Find("fresh.b"), "-");
  world.files().Open(world.files().NumberOf(folder / "project/fresh/b.py"), "x = 1\n");
  world.modules().Forget();
  EXPECT_EQ(world.Find("fresh.b"), "project/fresh/b.py");
}

TEST(Modules, EndInRingsOfLinks) {
  const TemporaryFolder folder = {{"project/a/__init__.py", ""}};
  folder.Link("..", "project/a/a");
  folder.Link("loop", "project/loop");
  World world(folder);
  std::string name = "a";
  for (int i = 0; i < 10000; ++i) name += ".a";
  world.Find(name);
  EXPECT_EQ(world.Find("loop"), "-");
  EXPECT_EQ(world.Find("a.a.a"), "project/a/a/a/__init__.py");
}

// ---- environments ----

std::vector<std::string> Below(const TemporaryFolder& folder, const Environment& environment) {
  std::vector<std::string> below;
  for (const std::string& library : environment.libraries) {
    if (library.starts_with(folder.path())) below.push_back(library.substr(folder.path().size() + 1));
  }
  return below;
}

TEST(Environments, ReadTheSettingsOfAVirtualOne) {
  const TemporaryFolder folder = {
      {"base/bin/python3.11", ""},
      {"base/lib/python3.11/os.py", ""},
      {"base/lib/python3.11/lib-dynload/_x.so", ""},
      {"base/lib/python3.11/site-packages/system.py", ""},
      {"venv/lib/python3.11/site-packages/own.py", ""},
      {"venv/lib/python3.11/site-packages/b.pth", "# words\n\nimport sys; run()\n../../../../extra\nnot_there\n"},
      {"extra/more.py", ""},
      {"venv/bin/activate", ""},
  };
  const auto settings = [&](const std::string& system) {
    folder.Write("venv/pyvenv.cfg", "home = " + folder / "base/bin" + "\nInclude-System-Site-Packages = " + system +
                                        "\nprompt = 2.7 of old\nversion = 3.11.7\nversion_info = 3.9.1\n");
  };
  settings("false");
  folder.Link(folder / "base/bin/python3.11", "venv/bin/python");
  folder.Link("lib", "venv/lib64");
  const std::vector<std::string> own = {"base/lib/python3.11", "base/lib/python3.11/lib-dynload",
                                        "venv/lib/python3.11/site-packages", "extra"};
  for (const char* path : {"venv", "venv/bin/python", "venv/bin", "venv/"}) {
    const Environment environment = FindEnvironment(folder / path);
    EXPECT_EQ(Below(folder, environment), own) << path;
    EXPECT_EQ(environment.version.count, 3) << path;
    EXPECT_TRUE(environment.version.AtLeast(3, 11) && !environment.version.AtLeast(3, 12)) << path;
  }
  settings("true");
  std::vector<std::string> all = own;
  all.push_back("base/lib/python3.11/site-packages");
  EXPECT_EQ(Below(folder, FindEnvironment(folder / "venv")), all);
  // The base itself, by its folder, by its interpreter and by a link to that.
  const std::vector<std::string> base = {"base/lib/python3.11", "base/lib/python3.11/lib-dynload",
                                         "base/lib/python3.11/site-packages"};
  folder.Link(folder / "base/bin/python3.11", "links/python");
  for (const char* path : {"base", "base/bin/python3.11", "links/python"})
    EXPECT_EQ(Below(folder, FindEnvironment(folder / path)), base) << path;
}

TEST(Environments, KnowTheFoldersOfPython2) {
  const TemporaryFolder folder = {
      {"bin/python2.7", ""},
      {"lib/python2.7/os.py", ""},
      {"lib/python2.7/lib-tk/Tkinter.py", ""},
      {"lib/python2.7/plat-linux2/DLFCN.py", ""},
      {"lib/python3.9/site-packages/other.py", ""},
  };
  const Environment environment = FindEnvironment(folder / "bin/python2.7");
  std::vector<std::string> below = Below(folder, environment);
  std::ranges::sort(below);
  EXPECT_EQ(below, (std::vector<std::string>{"lib/python2.7", "lib/python2.7/lib-tk", "lib/python2.7/plat-linux2"}));
  EXPECT_EQ(environment.version.parts[0], 2);
}

TEST(Environments, KnowTheLayoutOfWindows) {
  const TemporaryFolder folder = {
      {"base/python.exe", ""},
      {"base/Lib/os.py", ""},
      {"base/Lib/site-packages/a.py", ""},
      {"venv/Scripts/python.exe", ""},
      {"venv/Lib/site-packages/b.py", ""},
  };
  folder.Write("venv/pyvenv.cfg", "home = " + folder / "base" + "\nversion_info = 3.12.1.final.0\n");
  const Environment environment = FindEnvironment(folder / "venv/Scripts/python.exe");
  EXPECT_EQ(Below(folder, environment), (std::vector<std::string>{"base/Lib", "venv/Lib/site-packages"}));
  EXPECT_TRUE(environment.version.AtLeast(3, 12));
  EXPECT_EQ(Below(folder, FindEnvironment(folder / "base/python.exe")),
            (std::vector<std::string>{"base/Lib", "base/Lib/site-packages"}));
}

TEST(Environments, ReadWherePackagesLieThatAreInstalledForEditing) {
  const TemporaryFolder folder = {
      {"venv/pyvenv.cfg", "version = 3.10.2\n"},
      {"venv/lib/python3.10/site-packages/__editable__.shop-1.0.pth",
       "import __editable___shop_1_0_finder; __editable___shop_1_0_finder.install()\n"},
      {"work/shop/__init__.py", ""},
  };
  folder.Write("venv/lib/python3.10/site-packages/__editable___shop_1_0_finder.py",
               "import sys\nMAPPING: dict[str, str] = {'shop': '" + folder / "work/shop" + "'}\n");
  EXPECT_EQ(Below(folder, FindEnvironment(folder / "venv")),
            (std::vector<std::string>{"venv/lib/python3.10/site-packages", "work"}));
}

TEST(Environments, SayNothingOfWhatIsNone) {
  const TemporaryFolder folder = {{"empty/notes.txt", ""}};
  for (const char* path : {"empty", "nothing", "nothing/bin/python"}) {
    const Environment environment = FindEnvironment(folder / path);
    EXPECT_TRUE(Below(folder, environment).empty()) << path;
    EXPECT_EQ(environment.version.count, 0) << path;
  }
}

TEST(SourceRoots, AreTheFolderSrcAndWhatHoldsAPackage) {
  const TemporaryFolder folder = {
      {"a/src/shop/__init__.py", ""},
      {"b/src/__init__.py", ""},
      {"c/pack/inner/__init__.py", ""},
      {"c/pack/__init__.py", ""},
  };
  using Paths = std::vector<std::string>;
  EXPECT_EQ(SourceRootsOf(folder / "a"), (Paths{folder / "a", folder / "a/src"}));
  EXPECT_EQ(SourceRootsOf(folder / "b"), (Paths{folder / "b"}));
  EXPECT_EQ(SourceRootsOf(folder / "c/pack/inner"), (Paths{folder / "c"}));
}

TEST(Modules, SeeWhatComesAndGoes) {
  const TemporaryFolder folder = {{"a.py", ""}, {"pack/__init__.py", ""}};
  Files files(Version::Of(3, 12));
  Modules modules(files, {.roots = {folder.path()}, .libraries = {}, .typeshed = ""});
  EXPECT_NE(modules.Find("a"), kNoModule);
  EXPECT_EQ(modules.Find("pack.b"), kNoModule);
  EXPECT_FALSE(modules.Refresh());
  folder.Write("pack/b.py", "");
  EXPECT_TRUE(modules.Refresh());
  EXPECT_NE(modules.Find("pack.b"), kNoModule);
  // What says nothing about modules.
  folder.Write("pack/__pycache__/b.cpython-312.pyc", "");
  folder.Write("pack/notes.txt", "");
  EXPECT_FALSE(modules.Refresh());
  folder.Remove("pack/b.py");
  EXPECT_TRUE(modules.Refresh());
  EXPECT_EQ(modules.Find("pack.b"), kNoModule);
}

}  // namespace
}  // namespace quillet
