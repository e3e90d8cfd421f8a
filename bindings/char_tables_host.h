// Classifies characters as the interpreter does that this process runs. Part of the extension alone.
#pragma once

namespace quillet {

// Installs the page loader that asks the interpreter. Call with the interpreter lock held.
void InstallHostCharTables();

}  // namespace quillet
