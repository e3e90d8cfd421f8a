// The index of a site as Python holds it. Pages share it, and from then on it stands still.
#pragma once

#include <memory>

#include "foundations/errors.h"
#include "site/pages.h"
#include "site/site_index.h"

namespace quillet::host {

struct SiteObject {
  std::shared_ptr<SiteIndex> index;
  bool is_shared = false;

  SiteIndex& Changing() const {
    if (is_shared) ThrowError(ErrorKind::kRuntimeError, "pages are written from this index; it stands still");
    return *index;
  }
};

}  // namespace quillet::host
