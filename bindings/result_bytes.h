// What became of a file as bytes, to be handed to another process of the same build: whole, or refused.
#pragma once

#include <string>

#include "analysis/file_worker.h"

namespace quillet::host {

std::string BytesOfResult(const BatchResult& result);
// ValueError for bytes of another build, and for those that were damaged: what is given back is safe to read.
void ReadResult(Text bytes, BatchResult& result);

}  // namespace quillet::host
