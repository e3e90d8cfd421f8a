// A file's source as the body of its page, and its lines as a script for the pages that show places in it.
//
// Input: a file that was analysed, and the index of the site, which stands still. A name that the file defines
// links to its definition; one that other files may mean links to the one definition of that name where there
// is one, and otherwise to its own line: the script of the site lists all that are spelled alike. The path of an
// import leads to the page of that module. A builtin or a name that nothing defines is no link.
// Output: kSitePageHeadSize bytes that hold the size of the body in decimal digits and what it shows ("whole",
// "cut-lines" where some lines are cut, "first-lines" where lines are left out), then the body, then the script.
// Both are linear in the source, and of an endless line or file a part is shown.
#pragma once

#include <memory>

#include "analysis/batch.h"
#include "site/site_index.h"

namespace quillet {

inline constexpr size_t kSitePageHeadSize = 32;

std::unique_ptr<FileWriter> MakeSitePageWriter(std::shared_ptr<const SiteIndex> index, Version version);

}  // namespace quillet
