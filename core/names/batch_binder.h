// The binder of a batch's thread: what each of its results says about names.
#pragma once

#include <memory>

#include "analysis/batch.h"
#include "names/binder.h"

namespace quillet {

// What a batch makes one of for each of its threads, for sources of a version.
std::unique_ptr<FileBinder> MakeFileBinder(Version version);

}  // namespace quillet
