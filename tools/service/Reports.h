#pragma once

#include "Installation.h"

namespace service {

// What the shell extension has asked for.
void printRequests(const Installation& installation);
void printManifest(const Installation& installation);

} // namespace service
