// The site of a few sources: what a survey hands to the index, what a page makes of it, and what neither takes.
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "site/html_text.h"
#include "site/pages.h"
#include "site/site_index.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using testing::kPy3;
using Strings = std::vector<std::string>;

std::string Html(Text text) {
  std::string out;
  AppendHtml(text, out);
  return out;
}

// A site of sources that are called a.py, b.py and so on.
class Site {
 public:
  explicit Site(Strings sources, Strings builtin_attributes = {}) {
    Strings names;
    for (size_t i = 0; i < sources.size(); ++i) {
      names.push_back(std::string(1, static_cast<char>('a' + i)) + ".py");
      inputs_.push_back({names.back(), std::move(sources[i]), {}});
    }
    index = std::make_shared<SiteIndex>(names, builtin_attributes);
    for (const std::string& survey : Run([] { return MakeSiteSurveyWriter(kPy3); }))
      index->Add(static_cast<uint32_t>(&survey - outputs_.data()), survey);
  }

  // The page of the first source, without its head.
  std::string Page() {
    const auto make = [this] { return MakeSitePageWriter(index, kPy3); };
    return Run(make).at(0).substr(kSitePageHeadSize);
  }
  std::string Head() { return Page().empty() ? "" : outputs_.at(0).substr(0, kSitePageHeadSize); }
  // The addresses of the links with this text.
  Strings Links(Text text) {
    const std::string page = Page();
    Strings links;
    const std::string end = "\">" + std::string(text) + "</a>";
    for (size_t at = page.find(end); at != std::string::npos; at = page.find(end, at + 1)) {
      const size_t link = page.rfind("<a ", at);
      const size_t begin = page.find("href=\"", link) + 6;
      links.push_back(page.substr(begin, page.find('"', begin) - begin));
    }
    return links;
  }
  std::string Places() {
    std::string all;
    for (size_t i = 0; i < SiteIndex::kBuckets; ++i) all += index->TakeBucket(i);
    return index->PlacesScript(all);
  }

  std::shared_ptr<SiteIndex> index;

 private:
  const Strings& Run(std::function<std::unique_ptr<FileWriter>()> make_writer) {
    BatchAnalyzer::Options options;
    static_cast<CPGenAnalyzerImpl::Options&>(options.analyzer) = AnalyzerOptions(kPy3);
    options.jobs = 1;
    options.make_writer = std::move(make_writer);
    BatchAnalyzer batch(std::move(options), inputs_);
    outputs_.clear();
    BatchResult result;
    while (batch.Next(result)) outputs_.push_back(std::move(result.output));
    return outputs_;
  }

  std::vector<BatchInput> inputs_;
  Strings outputs_;
};

TEST(HtmlText, NothingIsMarkupAndEverythingIsSeen) {
  EXPECT_EQ(Html("a<b>&\"'c\td"), "a&lt;b&gt;&amp;&quot;&#x27;c\td");
  EXPECT_EQ(Html("\x01|\x1F|\x7F"), "\u2401|\u241F|\u2421");
  EXPECT_EQ(Html("\u00E9\u4E2D\U0001F600"), "\u00E9\u4E2D\U0001F600");
  EXPECT_EQ(Html("\u202E|\u2066|\u2069|\u200F|\u061C|\u2028"), "\\u202e|\\u2066|\\u2069|\\u200f|\\u061c|\\u2028");
  EXPECT_EQ(Html("\u2027|\u202F|\u2065|\u206A|\u200D"), "\u2027|\u202F|\u2065|\u206A|\u200D");
  EXPECT_EQ(Html("\xC2\x80|\xC2\x9F|\xC2\xA0"), "\\u0080|\\u009f|\xC2\xA0");
  EXPECT_EQ(Html("\xFF|\xC3"), "\uFFFD|\uFFFD");
}

TEST(Pages, AnOutlineGoesInWithTheScopesOfItsDefinitions) {
  std::string source = "class A:\n def m(self):\n  def g(): pass\ndef f(): pass\n";
  std::string indent;
  for (int i = 0; i < 8; ++i, indent += ' ') source += indent + "class D" + std::to_string(i) + ":\n";
  const std::string page = Site({source + indent + "x = 1\n"}).Page();
  Strings outline;
  const std::string begin = "<li class=\"d";
  for (size_t at = page.find(begin); at != std::string::npos; at = page.find(begin, at + 1)) {
    const size_t name = page.find("</i> ", at) + 5;
    outline.push_back(page.substr(at + begin.size(), 1) + " " + page.substr(name, page.find('<', name) - name));
  }
  EXPECT_EQ(outline,
            (Strings{"0 A", "1 m", "2 g", "0 f", "0 D0", "1 D1", "2 D2", "3 D3", "4 D4", "5 D5", "6 D6", "6 D7"}));
}

TEST(Pages, ALinkLeadsToTheDefinitionOfItsOwnScope) {
  Site site({"def f(n):\n    return n\n\ndef g(n):\n    return [n for n in n]\n"});
  EXPECT_EQ(site.Links("n"), (Strings{"#L1", "#L1", "#L4", "#L5", "#L5", "#L4"}));
}

TEST(Pages, AFunctionIsTheDefinitionOfANameThatIsSetBeforeIt) {
  Site site({"f = None\nf()\ndef f(): pass\n"});
  EXPECT_EQ(site.Links("f"), (Strings{"#L3", "#L3", "#L3"}));
}

TEST(Pages, WhatIsDefinedOnceElsewhereIsLedTo) {
  EXPECT_EQ(Site({"x.run()\n", "class A:\n    def run(self): pass\n"}).Links("run"), (Strings{"1.html#L2"}));
  EXPECT_EQ(Site({"x.run()\n", "def run(): pass\nclass A:\n    run = 1\n"}).Links("run"), (Strings{"1.html#L1"}));
  EXPECT_EQ(Site({"x.run()\n", "class A:\n    run = 1\n"}).Links("run"), (Strings{"1.html#L2"}));
  EXPECT_EQ(Site({"x.run()\n", "def run(): pass\n", "def run(): pass\n"}).Links("run"), (Strings{"#L1"}));
  EXPECT_EQ(Site({"x.run()\n", "def run(): pass\n"}, {"run"}).Links("run"), (Strings{"#L1"}));
}

TEST(Pages, AnImportLeadsIntoItsOwnModuleAlone) {
  EXPECT_EQ(Site({"from b import run\n", "def run(): pass\n"}).Links("run"), (Strings{"1.html#L1"}));
  EXPECT_EQ(Site({"from far.b import run\n", "def run(): pass\n"}).Links("run"), (Strings{"1.html#L1"}));
  EXPECT_EQ(Site({"from c import run\n", "def run(): pass\n"}).Links("run"), (Strings{"#L1"}));
  EXPECT_EQ(Site({"from . import run\n", "def run(): pass\n"}).Links("run"), (Strings{"1.html#L1"}));
  EXPECT_EQ(Site({"import c\nc.run\n", "def run(): pass\n"}).Links("run"), (Strings{"#L2"}));
  EXPECT_EQ(Site({"import b\nb.run\n", "def run(): pass\n"}).Links("run"), (Strings{"1.html#L1"}));
}

TEST(Pages, ThePathOfAnImportLeadsToItsModule) {
  const Strings modules = {"from b import b\n", "x = 1\n"};
  EXPECT_EQ(Site(modules).Links("b"), (Strings{"1.html", "#L1"}));
  EXPECT_EQ(Site({"import b, c\nb\n", ""}).Links("b"), (Strings{"1.html", "#L1"}));
  EXPECT_EQ(Site({"import b as d\n", ""}).Links("b"), (Strings{"1.html"}));
  EXPECT_EQ(Site({"from .b import (d,\n b)\n", ""}).Links("b"), (Strings{"1.html", "#L2"}));
  EXPECT_EQ(Site({"from far.b.d import e\n", ""}).Links("b"), (Strings{"#L1"}));
  EXPECT_EQ(Site({"from c import b as d\n", ""}).Links("b"), (Strings{"#L1"}));
}

TEST(Index, AModuleIsFoundByTheEndOfItsPath) {
  const SiteIndex index({"src/pkg/__init__.py", "src/pkg/one.py", "lib/one.py", "two.py", "lib/two.py"}, {});
  EXPECT_EQ(index.FileOfModule("pkg"), 0u);
  EXPECT_EQ(index.FileOfModule("src.pkg"), 0u);
  EXPECT_EQ(index.FileOfModule("pkg.one"), 1u);
  EXPECT_EQ(index.FileOfModule("one"), SiteIndex::kNone);
  EXPECT_EQ(index.FileOfModule("two"), 3u);
  EXPECT_EQ(index.FileOfModule("lib.two"), 4u);
  EXPECT_EQ(index.FileOfModule("three"), SiteIndex::kNone);
  EXPECT_EQ(index.FileOfModule(""), SiteIndex::kNone);
}

TEST(Pages, BuiltinsAreNoLinks) {
  EXPECT_EQ(Site({"len(x)\n"}).Links("len"), Strings{});
  EXPECT_EQ(Site({"len(x)\nlen = 1\n"}).Links("len"), (Strings{"#L2", "#L2"}));
  EXPECT_EQ(Site({"from b import *\nlen(run)\n", "def run(): pass\n"}).Links("len"), Strings{});
  EXPECT_EQ(Site({"from b import *\nlen(run)\n", "def run(): pass\n"}).Links("run"), (Strings{"1.html#L1"}));
}

TEST(Pages, AnAttributeOfWhatIsNoNameLeadsToThoseOfItsName) {
  Site site({"def f(): pass\nf()[0].x = 1\n[f].y\nclass A:\n  def m(self): pass\nf().m()\n"});
  EXPECT_EQ(site.Links("m"), (Strings{"#L5", "0.html#L5"}));
}

TEST(Pages, ANameThatIsCutIsNoLink) {
  std::string line = "x = [";
  while (line.size() + 5 < ShownPart::kMostBytesOfLine) line += "0,";
  line += std::string(ShownPart::kMostBytesOfLine - 3 - line.size(), ' ') + "total]\n";
  Site site({"total = 1\n" + line});
  EXPECT_EQ(site.Links("total"), (Strings{"#L1"}));
  EXPECT_NE(site.Page().find("tot<em> \u2026 and 3 more bytes</em></p>"), std::string::npos);
  EXPECT_EQ(Site({"total = 1\n" + line.substr(0, line.find("total") - 2) + "total]\n"}).Links("total").size(), 2u);
}

TEST(Pages, ALineIsCutAtACharacter) {
  const std::string tail = "\u00E9";
  const std::string line(ShownPart::kMostBytesOfLine - 1, '#');
  Site whole({line + "x\n"});
  EXPECT_NE(whole.Head().find(" whole "), std::string::npos);
  EXPECT_EQ(whole.Page().find("more bytes"), std::string::npos);
  Site cut({line + tail + "\n"});
  EXPECT_NE(cut.Head().find(" cut-lines "), std::string::npos);
  EXPECT_NE(cut.Page().find("#</b><em> \u2026 and 2 more bytes</em></p>"), std::string::npos);
}

TEST(Pages, AFileIsShownUpToALimit) {
  std::string source;
  while (source.size() <= ShownPart::kMostBytes) source += "# " + std::string(998, '-') + "\n";
  const size_t lines = source.size() / 1001;
  Site site({source + "x = 1\n"});
  EXPECT_NE(site.Head().find(" first-lines "), std::string::npos);
  EXPECT_NE(site.Page().find("id=\"L" + std::to_string(lines) + "\""), std::string::npos);
  EXPECT_NE(site.Page().find("and 1 more lines"), std::string::npos);
  EXPECT_EQ(site.index->definition_count(), 0u);
}

TEST(Pages, WhatIsOpenedIsClosed) {
  for (const char* source : {"", "\n", "x = 1\n", "x = 1\r\ry\n\r\nz\r", "\r\r\n\n\r"}) {
    const std::string page = Site({source}).Page();
    const auto count = [&](const std::string& text) {
      size_t found = 0;
      for (size_t at = page.find(text); at != std::string::npos; at = page.find(text, at + 1)) ++found;
      return found;
    };
    for (const char* name : {"div", "main", "p", "b", "em", "ol", "ul", "nav"})
      EXPECT_EQ(count("<" + std::string(name) + ">") + count("<" + std::string(name) + " "),
                count("</" + std::string(name) + ">"))
          << name << " in the page of " << source;
  }
}

TEST(Pages, AnErrorStandsBelowItsLineWithItsColumn) {
  EXPECT_NE(Site({"x = 1\n\u00E9\t= = 2\n"}).Page().find("</p>\n<p class=\"error\"> \t  ^ invalid syntax</p>"),
            std::string::npos);
}

TEST(Index, PlacesStandByNameAndFile) {
  Site site({"x.a()\nx.a\n", "x.a = 1\n"});
  EXPECT_EQ(site.Places(), "quillet.take({0:[\"a\",[0,1,1,1,0,0,0,0,0],[],[[0,1,3,11,2,3,10],[1,1,3,9]]]});\n");
}

TEST(Index, DefinitionsStandByNameWithTheirScopes) {
  Site site({"class A:\n    def f(self): self.b = self.b = 1\nb = 1\ndef f(): pass\n"});
  EXPECT_EQ(site.index->DefinitionsScript(),
            "quillet.take([\"\",\"A\"],[\n[\"A\",\"c\",0,0,1],\n[\"f\",\"ff\",1,0,2,0,0,4],\n[\"b\",\"av\",1,0,2,0,0,3]"
            "]);\n");
  EXPECT_NE(site.Places().find("1:[\"f\",[2,0,0,0,0,0,0,0,0],[0,2,\"A\"],"), std::string::npos);
}

TEST(Index, AttributesOfAFileAreToldFromThoseOfTheFileInFront) {
  // The same names, met in another order.
  const Site site({"class A:\n  def f(self): self.c = self.c = self.d = 1\n",
                   "class B:\n  def f(self): self.d = self.c = self.e = self.e = 1\n"});
  EXPECT_EQ(site.index->DefinitionsScript(),
            "quillet.take([\"\",\"A\",\"B\"],[\n[\"A\",\"c\",0,0,1],\n[\"f\",\"ff\",1,0,2,2,1,2],\n[\"c\",\"aa\",1,0,2,"
            "2,1,2],"
            "\n[\"d\",\"aa\",1,0,2,2,1,2],\n[\"B\",\"c\",0,1,1],\n[\"e\",\"a\",2,1,2]]);\n");
}

TEST(Index, AnAttributeIsDefinedInMethodsAlone) {
  EXPECT_EQ(Site({"def f(self): self.x = 1\n"}).index->DefinitionsScript(),
            "quillet.take([\"\"],[\n[\"f\",\"f\",0,0,1]]);\n");
  EXPECT_EQ(Site({"class A:\n  def f[T](self): self.x = 1\n"}).index->DefinitionsScript().substr(0, 21),
            "quillet.take([\"\",\"A\"]");
}

TEST(Index, WhatIsNoSurveyIsToldAndDoesNoHarm) {
  SiteIndex index({"a.py"}, {});
  for (const char* survey : {"\xFF", "\x05",
                             "\x01\x05"
                             "a",
                             "\x01\x01"
                             "a\x01",
                             "\x01\x01"
                             "a\x04\x07\x01\x01\x01"})
    EXPECT_THROW(index.Add(0, survey), Error) << survey;
  EXPECT_THROW(index.Add(1, Text("\0\0\0", 3)), Error);
  EXPECT_THROW(static_cast<void>(index.PlacesScript("\x01\x01\x01\x01\x01")), Error);
  EXPECT_EQ(index.PlacesScript(""), "quillet.take({});\n");
  EXPECT_EQ(index.DefinitionsScript(), "quillet.take([],[\n]);\n");
}

}  // namespace
}  // namespace quillet
