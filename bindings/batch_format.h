// A format of a batch that another subsystem defines: what makes the writers of its threads.
#pragma once

#include <functional>
#include <memory>

#include "analysis/batch.h"

namespace quillet::host {

struct BatchFormat {
  std::function<std::unique_ptr<FileWriter>(Version version)> make;
};

}  // namespace quillet::host
