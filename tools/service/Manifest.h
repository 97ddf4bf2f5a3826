#pragma once

#include "History.h"
#include "Installation.h"

namespace service {

// Writes the manifest of all versions into the state database and tells the shell extension that it has changed.
void publishManifest(const Installation& installation, History& history);

} // namespace service
